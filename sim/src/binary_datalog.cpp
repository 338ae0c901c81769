// The binary datalog, as this simulator lays it out in binBuf:
//   header      'V' 'X' 0x01 0x00
//   offsets     recordCount little-endian 16-bit offsets of the records in binBuf
//   records     index:u16 recType:u8 length:u8 timeStamp:i32 Ordinal:i16
//               payload[length] crc:u16 (CRC-16/CCITT over index..payload)
// Each record is found through its own offset and checked on its own, so one
// damaged record never hides or garbles another.
#include <algorithm>
#include <array>
#include <cmath>
#include <cstring>
#include <string>

#include "record_fields.h"
#include "simulator.h"

namespace varnel::sim {
namespace detail {
namespace {

// clang-format off
#define I8(f) Field{#f, Width::I8, &RECORD_DATA::f, 0}
#define I16(f) Field{#f, Width::I16, &RECORD_DATA::f, 0}
#define H(f) Field{#f, Width::Hundredths, nullptr, offsetof(RECORD_DATA, f)}
// clang-format on

const Field kGlucose[] = {I16(reading),      I8(controlFlag),  I8(alternateSiteFlag), I8(dietLabel),
                          I8(exerciseLabel), I8(stressFlag),   I8(feelHypoFlag),      I8(illnessFlag),
                          I8(mensesFlag),    I8(vacationFlag), I8(otherFlag)};
const Field kOralMed[] = {I8(oralMedType), H(oralMedDosage)};
const Field kInsulin[] = {I8(InsulinType), H(insulinDosage)};
const Field kBolus[] = {H(bolusSetting)};
const Field kDailyTotal[] = {H(dailyTotalSetting)};
const Field kFoodCarbsFats[] = {I8(mealSegment), I16(carbs), I16(fats)};
const Field kFoodCaloriesProtein[] = {I8(mealSegment), I16(calories), I16(protein)};
const Field kKetones[] = {I8(ketones)};
const Field kHbA1c[] = {H(hbA1C)};
const Field kMicroalbumin[] = {I16(microalbumin)};
const Field kCholesterolLdlHdl[] = {I16(cholesterolLDL), I16(cholesterolHDL)};
const Field kCholesterolTotalTrig[] = {I16(cholesterolTotal), I16(cholesterolTriglyceride)};
const Field kBloodPressure[] = {I16(bloodPressureSystole), I16(bloodPressureDiastole)};
const Field kWeightHeight[] = {H(weight), H(height)};
const Field kHealthNotes[] = {I8(stressFlag), I8(feelHypoFlag), I8(illnessFlag),
                              I8(mensesFlag), I8(vacationFlag), I8(otherFlag)};
const Field kVisit[] = {I8(visit)};
const Field kExercise[] = {I8(ExerciseLevel), I16(exerciseDuration)};
const Field kCalCode[] = {I16(oldCalCode), I16(newCalCode)};

const Field kAll[] = {
    I16(reading),
    I16(controlFlag),
    I16(alternateSiteFlag),
    I16(dietLabel),
    I16(exerciseLabel),
    I16(stressFlag),
    I16(feelHypoFlag),
    I16(illnessFlag),
    I16(mensesFlag),
    I16(vacationFlag),
    I16(otherFlag),
    I16(mealSegment),
    I16(carbs),
    I16(fats),
    I16(calories),
    I16(protein),
    I16(ketones),
    H(hbA1C),
    I16(microalbumin),
    I16(cholesterolLDL),
    I16(cholesterolHDL),
    I16(cholesterolTotal),
    I16(cholesterolTriglyceride),
    I16(bloodPressureSystole),
    I16(bloodPressureDiastole),
    H(weight),
    H(height),
    I16(visit),
    I16(oralMedType),
    H(oralMedDosage),
    I16(InsulinType),
    H(insulinDosage),
    H(bolusSetting),
    H(dailyTotalSetting),
    I16(ExerciseLevel),
    I16(exerciseDuration),
    I16(oldCalCode),
    I16(newCalCode),
};

#undef I8
#undef I16
#undef H

struct Layout {
    RecordType_Enum recType;
    const char* name;
    std::span<const Field> fields;
};

const Layout kLayouts[] = {
    {VX_REC_GLUCOSE, "Glucose", kGlucose},
    {VX_REC_ORAL_MEDICATION, "OralMedication", kOralMed},
    {VX_REC_INSULIN, "Insulin", kInsulin},
    {VX_REC_PUMP_BOLUS, "PumpBolus", kBolus},
    {VX_REC_PUMP_DAILY_TOTAL, "PumpDailyTotal", kDailyTotal},
    {VX_REC_CARBS_FATS, "CarbsFats", kFoodCarbsFats},
    {VX_REC_CALORIES_PROTEIN, "CaloriesProtein", kFoodCaloriesProtein},
    {VX_REC_KETONES, "Ketones", kKetones},
    {VX_REC_HBA1C, "HbA1c", kHbA1c},
    {VX_REC_MICROALBUMIN, "Microalbumin", kMicroalbumin},
    {VX_REC_CHOLESTEROL_LDL_HDL, "CholesterolLdlHdl", kCholesterolLdlHdl},
    {VX_REC_CHOLESTEROL_TOTAL_TRIG, "CholesterolTotalTrig", kCholesterolTotalTrig},
    {VX_REC_BLOOD_PRESSURE, "BloodPressure", kBloodPressure},
    {VX_REC_WEIGHT_HEIGHT, "WeightHeight", kWeightHeight},
    {VX_REC_HEALTH_NOTES, "HealthNotes", kHealthNotes},
    {VX_REC_LAST_VISIT, "LastVisit", kVisit},
    {VX_REC_EXERCISE, "Exercise", kExercise},
    {VX_REC_CAL_CODE, "CalCode", kCalCode},
};

// The layout of each record type a byte can hold, looked up once per call.
const Layout* layoutOf(std::int16_t recType) {
    static const auto byType = [] {
        std::array<const Layout*, 256> table{};
        for (const Layout& l : kLayouts) table[std::size_t(l.recType)] = &l;
        return table;
    }();
    return recType >= 0 && recType < 256 ? byType[std::size_t(recType)] : nullptr;
}

}  // namespace

std::span<const Field> fieldsOf(std::int16_t recType) {
    const Layout* l = layoutOf(recType);
    return l ? l->fields : std::span<const Field>{};
}

const char* recordTypeName(std::int16_t recType) {
    const Layout* l = layoutOf(recType);
    return l ? l->name : nullptr;
}

std::optional<std::int16_t> recordTypeNamed(std::string_view name) {
    for (const Layout& l : kLayouts)
        if (name == l.name) return static_cast<std::int16_t>(l.recType);
    return std::nullopt;
}

std::span<const Field> allValueFields() { return kAll; }

bool sameRecord(const RECORD_DATA& a, const RECORD_DATA& b) {
    if (a.recType != b.recType || a.timeStamp != b.timeStamp || a.Ordinal != b.Ordinal) return false;
    return std::all_of(std::begin(kAll), std::end(kAll), [&](const Field& f) {
        return f.isReal() ? f.real(a) == f.real(b) : a.*f.integer == b.*f.integer;
    });
}

}  // namespace detail

namespace {

using detail::Field;
using detail::Width;

constexpr std::size_t kBufSize = sizeof(METER_BIN_DATALOG::binBuf);
constexpr std::size_t kHeaderSize = 4;
constexpr std::size_t kRecordFrame = 12;  // index, type, length, time, ordinal, crc
constexpr std::uint8_t kMagic[kHeaderSize] = {'V', 'X', 1, 0};

std::size_t widthOf(Width w) { return w == Width::I8 ? 1 : w == Width::I16 ? 2 : 4; }

std::size_t payloadSize(std::int16_t recType) {
    std::size_t n = 0;
    for (const Field& f : detail::fieldsOf(recType)) n += widthOf(f.width);
    return n;
}

// CRC-16/CCITT a byte at a time: the table holds the eight bit steps of every byte value.
constexpr std::array<std::uint16_t, 256> kCrcTable = [] {
    std::array<std::uint16_t, 256> table{};
    for (unsigned byte = 0; byte < 256; ++byte) {
        auto crc = static_cast<std::uint16_t>(byte << 8);
        for (int bit = 0; bit < 8; ++bit)
            crc = static_cast<std::uint16_t>(crc & 0x8000 ? (crc << 1) ^ 0x1021 : crc << 1);
        table[byte] = crc;
    }
    return table;
}();

std::uint16_t crc16(const std::uint8_t* p, std::size_t n) {
    std::uint16_t crc = 0xFFFF;
    while (n--) crc = static_cast<std::uint16_t>((crc << 8) ^ kCrcTable[((crc >> 8) ^ *p++) & 0xFF]);
    return crc;
}

void put(std::uint8_t*& p, std::int64_t v, std::size_t bytes) {
    for (std::size_t i = 0; i < bytes; ++i) *p++ = static_cast<std::uint8_t>(v >> (8 * i));
}

std::int64_t get(const std::uint8_t*& p, std::size_t bytes) {
    std::uint64_t v = 0;
    for (std::size_t i = 0; i < bytes; ++i) v |= std::uint64_t(*p++) << (8 * i);
    const unsigned shift = unsigned(64 - 8 * bytes);  // sign-extend
    return static_cast<std::int64_t>(v << shift) >> shift;
}

[[noreturn]] void refuse(std::size_t index, const RECORD_DATA& r, const char* field, const std::string& value,
                         const char* why) {
    throw std::invalid_argument("binary record " + std::to_string(index) + " (type " + std::to_string(r.recType) +
                                "): " + field + (value.empty() ? "" : " " + value) + " " + why);
}

// The stored form of one field, refusing what the width cannot hold exactly.
std::int64_t storedValue(std::size_t index, const RECORD_DATA& r, const Field& f) {
    if (f.width == Width::Hundredths) {
        const double v = f.real(r);
        const double scaled = v * 100.0;
        if (!std::isfinite(v) || std::fabs(scaled) > 2147483647.0)
            refuse(index, r, f.name, std::to_string(v), "is out of range");
        const double rounded = std::nearbyint(scaled);
        if (std::fabs(scaled - rounded) > 1e-6 * std::fmax(1.0, std::fabs(scaled)))
            refuse(index, r, f.name, std::to_string(v), "has more than two decimals");
        return static_cast<std::int64_t>(rounded);
    }
    const std::int16_t v = r.*f.integer;
    if (f.width == Width::I8 && (v < -128 || v > 127))
        refuse(index, r, f.name, std::to_string(v), "does not fit one byte");
    return v;
}

const std::uint8_t* recordAt(const METER_BIN_DATALOG& d, int index) {
    const std::uint8_t* table = d.binBuf + kHeaderSize + 2 * index;
    const std::size_t offset = table[0] | (table[1] << 8);
    if (offset < kHeaderSize + 2 * std::size_t(d.recordCount) || offset + kRecordFrame > kBufSize) return nullptr;
    return d.binBuf + offset;
}

}  // namespace

std::size_t encodedRecordSize(const RECORD_DATA& record) { return kRecordFrame + payloadSize(record.recType); }

std::size_t encodedSize(const std::vector<RECORD_DATA>& records) {
    std::size_t n = kHeaderSize;
    for (const RECORD_DATA& r : records) n += 2 + encodedRecordSize(r);
    return n;
}

namespace {

// The same field, whatever width a record type stores it in.
bool sameField(const Field& a, const Field& b) { return a.integer == b.integer && a.realOffset == b.realOffset; }

}  // namespace

void encodeBinaryDatalog(const std::vector<RECORD_DATA>& records, METER_BIN_DATALOG& datalog) {
    const std::size_t size = encodedSize(records);
    if (size > kBufSize || records.size() > 32767)
        throw std::length_error(std::to_string(records.size()) + " binary records need " + std::to_string(size) +
                                " bytes; the datalog holds " + std::to_string(kBufSize));
    std::uint8_t buf[kBufSize] = {};
    std::memcpy(buf, kMagic, kHeaderSize);
    std::uint8_t* table = buf + kHeaderSize;
    std::uint8_t* p = table + 2 * records.size();
    for (std::size_t i = 0; i < records.size(); ++i) {
        const RECORD_DATA& r = records[i];
        if (r.recType < 0 || r.recType > 255)
            refuse(i, r, "recType", std::to_string(r.recType), "does not fit one byte");
        const auto carried = detail::fieldsOf(r.recType);
        for (const Field& f : detail::allValueFields()) {
            const bool set = f.isReal() ? f.real(r) != 0.0 : r.*f.integer != 0;
            if (set && std::none_of(carried.begin(), carried.end(), [&](const Field& c) { return sameField(c, f); }))
                refuse(i, r, f.name, "", "is not carried by this record type");
        }
        put(table, p - buf, 2);
        std::uint8_t* start = p;
        put(p, std::int64_t(i), 2);
        put(p, r.recType, 1);
        put(p, std::int64_t(payloadSize(r.recType)), 1);
        put(p, r.timeStamp, 4);
        put(p, r.Ordinal, 2);
        for (const Field& f : detail::fieldsOf(r.recType)) put(p, storedValue(i, r, f), widthOf(f.width));
        put(p, crc16(start, std::size_t(p - start)), 2);
    }
    std::memcpy(datalog.binBuf, buf, kBufSize);
    datalog.recordCount = static_cast<std::int16_t>(records.size());
}

std::int16_t decodeBinaryRecord(const METER_BIN_DATALOG& d, int index, RECORD_DATA& record) {
    if (d.recordCount < 0 || std::size_t(d.recordCount) > (kBufSize - kHeaderSize) / 2 || index < 0 ||
        index >= d.recordCount)
        return ME_BAD_PARAMETER;
    if (std::memcmp(d.binBuf, kMagic, kHeaderSize) != 0) return ME_VALIDATION_ERROR;
    const std::uint8_t* start = recordAt(d, index);
    if (!start) return ME_VALIDATION_ERROR;
    const std::size_t length = start[3];
    const std::size_t covered = kRecordFrame - 2 + length;
    if (start + covered + 2 > d.binBuf + kBufSize) return ME_CHKSUM_ERROR;
    const std::uint8_t* tail = start + covered;
    if (crc16(start, covered) != std::uint16_t(get(tail, 2) & 0xFFFF)) return ME_CHKSUM_ERROR;

    const std::uint8_t* p = start;
    const std::int64_t storedIndex = get(p, 2) & 0xFFFF;
    const auto recType = static_cast<std::int16_t>(get(p, 1) & 0xFF);
    p++;  // length, read above
    // A sound checksum on the wrong record, or a length the type cannot have, is malformed.
    if (storedIndex != index || length != payloadSize(recType)) return ME_VALIDATION_ERROR;

    RECORD_DATA r{};
    r.recType = recType;
    r.timeStamp = static_cast<std::int32_t>(get(p, 4));
    r.Ordinal = static_cast<std::int16_t>(get(p, 2));
    for (const Field& f : detail::fieldsOf(recType)) {
        const std::int64_t v = get(p, widthOf(f.width));
        if (f.width == Width::Hundredths)
            f.setReal(r, static_cast<double>(v) / 100.0);
        else
            r.*f.integer = static_cast<std::int16_t>(v);
    }
    record = r;
    return ME_SUCCESS;
}

void corruptBinaryRecord(METER_BIN_DATALOG& d, int index) {
    if (index < 0 || index >= d.recordCount)
        throw std::out_of_range("no binary record " + std::to_string(index) + " to corrupt");
    const std::uint8_t* start = recordAt(d, index);
    if (!start) throw std::out_of_range("binary record " + std::to_string(index) + " is not laid out");
    // Flip bits of the time stamp: covered by the record's checksum only.
    d.binBuf[(start - d.binBuf) + 4] ^= 0x5A;
}

}  // namespace varnel::sim
