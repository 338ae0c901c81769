// The default meter of each type, and what any meter profile must satisfy.
#include <algorithm>
#include <set>
#include <string>
#include <tuple>

#include "meter_state.h"
#include "record_fields.h"

namespace varnel::sim {
namespace {

// One general option: index, availability, value, min, max.
struct OptionRow {
    std::int16_t index, availability, value, min, max;
};

struct TypeSpec {
    std::int16_t type;
    const char* serial;
    const char* firmware;
    const char* name;
    std::int16_t maxRecords;
    std::int32_t wireBaud;
    int clock[6];  // year, month, day, hour, minute, second
    std::int16_t plasma;
    std::int16_t checkStrip[3];  // low, high, approx
    std::int16_t glucose[4];     // report low, high; error low, high
    std::vector<std::int16_t> languages, events, insulinKinds;
    std::vector<OptionRow> options;
    int records;  // entries of the default datalog
};

// Options shared by the configurable meters.
constexpr OptionRow kCode{eStripCalCode, 2, 4, 1, 16};
constexpr OptionRow kBeep{eBeepStatus, 2, 0, 0, 1};
constexpr OptionRow kUnits{eUnits, 2, 0, 0, 1};
constexpr OptionRow kFixedUnits{eUnits, 1, 0, 0, 1};
constexpr OptionRow kDecimal{eNumericSeparator, 2, 0, 0, 1};
constexpr OptionRow kDate{eDateFormat, 2, 0, 0, 1};
constexpr OptionRow kTime{eTimeFormat, 2, 0, 0, 1};
constexpr OptionRow kCommMode{eCommunicationMode, 2, 0, 0, 3};
constexpr OptionRow kNewLang{eTranslateNewLang, 2, 0, 0, 1};
constexpr OptionRow kOnOff(std::int16_t index, std::int16_t value = 0) { return {index, 2, value, 0, 1}; }
constexpr OptionRow kLanguage(std::int16_t max) { return {eLanguage, 2, 0, 0, max}; }

// clang-format off
const TypeSpec kTypes[] = {
    {eCVTarnConsumerMeter, "TRN1000482", "TR0412 11/20/98", "Corvia Tarn", 250, 9600,
     {2004, 6, 15, 9, 30, 0}, 0, {87, 137, 0}, {20, 600, -1, 1023},
     {0, 1, 2, 3, 4, 5, 7}, {0, 1, 2, 3, 4}, {},
     {kCode, kBeep, kUnits, kDecimal, kDate, kTime, kLanguage(7), kCommMode,
      {eCommunicationRate, 2, 0, 0, 3}, kNewLang},
     80},
    {eCVPellis, "PLS2004417", "PL0930 03/14/01", "Corvia Pellis", 255, 9600,
     {2005, 2, 10, 18, 45, 0}, 0, {90, 140, 0}, {20, 600, -1, 1023},
     {0, 1, 2, 3, 4, 5, 6, 7, 9, 10, 11}, {0, 1, 2, 3, 4, 5, 6, 7, 8, 9},
     {0, 1, 2, 4, 5, 6, 7, 8, 9, 10},
     {kCode, kBeep, kUnits, kDecimal, kDate, kTime, kLanguage(11), kOnOff(eEvevtAveraging, 1),
      kOnOff(eInsulinPrompt, 1)},
     120},
    {eDunmark, "DNM3001296", "DM2215 09/02/99", "Corvia Dunmark", 255, 9600,
     {2004, 11, 3, 7, 10, 0}, 0, {0, 0, 0}, {10, 600, -1, 768},
     {0, 1, 2, 3, 7}, {0, 1, 2}, {},
     {kCode, kBeep, kUnits, kDate, kTime, kLanguage(7), kOnOff(eDisplayLastTest),
      kOnOff(eDayAverage, 1)},
     90},
    {eQuillaandBremo, "QLB4008830", "QB0107 06/18/02", "Corvia Quilla", 120, 9600,
     {2006, 1, 20, 12, 0, 0}, 1, {0, 0, 0}, {20, 500, -1, 1023},
     {}, {}, {}, {kFixedUnits}, 60},
    {eCVTolvoMeter, "TLV5002317", "TV1043 01/27/04", "Corvia Tolvo", 255, 9600,
     {2007, 4, 2, 21, 15, 30}, 1, {95, 145, 1}, {20, 600, -1, 1023},
     {0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15, 16, 17}, {0, 1, 2, 3, 4, 5, 6, 7}, {},
     {kCode, kBeep, kUnits, kDecimal, {eDateFormat, 2, 1, 0, 1}, {eTimeFormat, 2, 1, 0, 1},
      kLanguage(17), kCommMode, {eCommunicationRate, 1, 0, 0, 0}, kNewLang, kOnOff(eDisplayClock),
      kOnOff(eDaylightSavings, 1)},
     150},
    {eCorviaZenta, "ZNT6005521", "ZN0305 10/05/05", "Corvia Zenta", 255, 9600,
     {2008, 9, 12, 8, 20, 0}, 1, {0, 0, 0}, {20, 600, -1, 1023},
     {}, {}, {}, {kFixedUnits, kTime}, 100},
    {eMorvex, "MVX7001184", "MX2210 05/07/03", "Corvia Morvex", 1000, 19200,
     {2008, 3, 7, 14, 5, 9}, 1, {0, 0, 0}, {20, 600, -1, 1023},
     {0, 1, 2, 3, 4, 5, 7, 9, 10, 11, 19}, {}, {},
     {kCode, kBeep, kUnits, kDate, kTime, kLanguage(19), {eEvevtAveraging, 2, 1, 0, 4},
      kOnOff(eWeekStartDay, 1), kOnOff(eCholestrolUnits), kOnOff(eInsulinPumpUse, 1)},
     0},
    {eParvix, "PVX8003075", "PX0118 08/30/06", "Parvix", 255, 9600,
     {2009, 5, 22, 19, 40, 0}, 1, {0, 0, 0}, {20, 600, -1, 1023},
     {}, {}, {}, {kFixedUnits, {eTimeFormat, 2, 1, 0, 1}}, 100},
};
// clang-format on

// Earliest and latest clock value each type accepts.
struct ClockRange {
    int firstYear, lastYear;
};
ClockRange clockRange(int type) {
    switch (type) {
    case 1:
        return {1990, 2014};
    case 2:
    case 3:
        return {1992, 2022};
    case 4:
        return {1997, 2015};
    case 5:
        return {1996, 2026};
    default:
        return {2000, 2020};
    }
}

// A small deterministic generator, so every default meter holds the same data.
struct Lcg {
    std::uint32_t state;
    int next(int lo, int hi) {
        state = state * 1103515245u + 12345u;
        return lo + static_cast<int>((state >> 16) % std::uint32_t(hi - lo + 1));
    }
};

data_rec bloodTest(std::int32_t time, std::int16_t result, std::int16_t tType) {
    data_rec e{};
    e.D_Type = 1;
    e.D_Time = time;
    e.Test.Result = result;
    e.Test.T_Type = tType;
    return e;
}

// Blood tests of every kind, control and check-strip tests, errors, invalid
// entries and, on the insulin-logging meter, medication entries.
std::vector<data_rec> recordDatalog(const TypeSpec& s, std::int32_t clock) {
    Lcg rng{std::uint32_t(s.type) * 7919u};
    const bool strips = s.checkStrip[1] > 0;
    const bool medication = !s.insulinKinds.empty();
    std::vector<data_rec> log;
    for (int i = 0; i < s.records; ++i) {
        const std::int32_t t = clock - (s.records - i) * 6 * 3600 - rng.next(0, 3599);
        data_rec e = bloodTest(t, static_cast<std::int16_t>(rng.next(62, 245)), 0);
        switch (i % 20) {
        case 3:  // above the reportable range
            e.Test.Result = s.glucose[1];
            e.Test.Flags = 1;
            e.ResultApproximated = 1;
            break;
        case 7:  // below it
            e.Test.Result = s.glucose[0];
            e.Test.Flags = 2;
            e.ResultApproximated = 1;
            break;
        case 9:  // control solution
            e.Test.T_Type = 5;
            e.Test.Result = static_cast<std::int16_t>(rng.next(100, 130));
            break;
        case 11:
            if (strips) {
                e.Test.T_Type = 2;
                e.Test.Result = static_cast<std::int16_t>(rng.next(s.checkStrip[0], s.checkStrip[1]));
            }
            break;
        case 13:  // meter error code
            e.Test.Flags = 3;
            e.Test.Result = static_cast<std::int16_t>(rng.next(1, 6));
            break;
        case 16:
            e.Valid = 1;
            break;
        case 18:
            e.Test.Sample_detected = 1;
            break;
        default:
            break;
        }
        if (!s.events.empty() && i % 4 == 1)
            e.Test.Event_code = s.events[std::size_t(rng.next(0, int(s.events.size()) - 1))];
        if (medication && i % 3 == 2) {
            // Insulin kinds, pump boluses (12) and carbohydrates (13).
            static constexpr std::int16_t kinds[] = {0, 1, 2, 4, 5, 6, 7, 8, 9, 10, 12, 13};
            e = data_rec{};
            e.D_Type = 2;
            e.D_Time = t;
            e.Test.T_Type = kinds[(i / 3) % std::size(kinds)];
            e.Test.Medication = e.Test.T_Type == 13   ? rng.next(15, 90)
                                : e.Test.T_Type == 12 ? rng.next(10, 80) / 10.0
                                                      : rng.next(4, 40) / 2.0;
        }
        log.push_back(e);
    }
    return log;
}

RECORD_DATA binary(RecordType_Enum type, std::int32_t time) {
    RECORD_DATA r{};
    r.recType = type;
    r.timeStamp = time;
    return r;
}

// Three weeks of a type-7 meter's life: every record type it knows.
std::vector<RECORD_DATA> binaryDatalog(std::int32_t clock) {
    Lcg rng{7u * 7919u};
    std::vector<RECORD_DATA> log;
    const int days = 21;
    for (int d = 0; d < days; ++d) {
        const std::int32_t day = clock - (days - d) * 86400 - 14 * 3600;  // 00:05 of that day
        auto glucose = [&](int minutes, std::int16_t diet) {
            RECORD_DATA r = binary(VX_REC_GLUCOSE, day + minutes * 60);
            r.reading = static_cast<std::int16_t>(rng.next(68, 240));
            r.dietLabel = diet;
            r.exerciseLabel = static_cast<std::int16_t>(d % 4);
            if (d % 5 == 1) r.stressFlag = 1;
            if (d % 7 == 2) r.feelHypoFlag = 1;
            if (d % 9 == 3) r.illnessFlag = 1;
            if (d % 11 == 4) r.mensesFlag = 1;
            if (d % 13 == 5) r.vacationFlag = 1;
            if (d % 6 == 0) r.otherFlag = 1;
            if (d % 8 == 6) r.alternateSiteFlag = 1;
            log.push_back(r);
        };
        auto food = [&](int minutes, std::int16_t segment) {
            RECORD_DATA a = binary(VX_REC_CARBS_FATS, day + minutes * 60);
            a.mealSegment = segment;
            a.carbs = static_cast<std::int16_t>(rng.next(20, 120));
            a.fats = d % 4 == 0 ? -1 : static_cast<std::int16_t>(rng.next(5, 40));
            RECORD_DATA b = a;
            b.recType = VX_REC_CALORIES_PROTEIN;
            b.carbs = b.fats = 0;
            b.calories = static_cast<std::int16_t>(rng.next(200, 900));
            b.protein = d % 3 == 0 ? -1 : static_cast<std::int16_t>(rng.next(5, 60));
            log.push_back(a);
            log.push_back(b);
        };
        glucose(7 * 60, 1);
        RECORD_DATA ins = binary(VX_REC_INSULIN, day + 7 * 60 * 60 + 300);
        ins.InsulinType = static_cast<std::int16_t>(1 + d % 12);  // fixed kinds and a custom one
        ins.insulinDosage = rng.next(8, 30) / 2.0;
        log.push_back(ins);
        food(7 * 60 + 10, static_cast<std::int16_t>(d % 4));  // breakfast, lunch, dinner, snack
        glucose(9 * 60, 2);
        if (d % 2 == 0) {
            RECORD_DATA oral = binary(VX_REC_ORAL_MEDICATION, day + 12 * 3600);
            oral.oralMedType = static_cast<std::int16_t>(1 + d % 7);
            oral.oralMedDosage = d % 4 == 0 ? 0.5 : 1.0;
            log.push_back(oral);
        }
        if (d % 3 == 0) {
            RECORD_DATA bolus = binary(VX_REC_PUMP_BOLUS, day + 12 * 3600 + 600);
            bolus.bolusSetting = rng.next(10, 90) / 10.0;
            log.push_back(bolus);
            RECORD_DATA total = binary(VX_REC_PUMP_DAILY_TOTAL, day + 23 * 3600);
            total.dailyTotalSetting = rng.next(200, 600) / 10.0;
            log.push_back(total);
        }
        if (d % 7 == 5) {  // an evening out
            RECORD_DATA drink = binary(VX_REC_CARBS_FATS, day + 20 * 3600);
            drink.mealSegment = 4;
            log.push_back(drink);
            RECORD_DATA drinkCalories = drink;
            drinkCalories.recType = VX_REC_CALORIES_PROTEIN;
            drinkCalories.calories = 180;
            log.push_back(drinkCalories);
        }
        if (d % 4 == 1) {
            RECORD_DATA ex = binary(VX_REC_EXERCISE, day + 17 * 3600);
            ex.ExerciseLevel = static_cast<std::int16_t>(d % 3);
            ex.exerciseDuration = static_cast<std::int16_t>(20 + 15 * (d % 9));
            log.push_back(ex);
        }
        switch (d) {
        case 2: {
            RECORD_DATA k = binary(VX_REC_KETONES, day + 8 * 3600);
            for (std::int16_t v = 0; v <= 4; ++v, k.timeStamp += 3600) {
                k.ketones = v;
                log.push_back(k);
            }
            break;
        }
        case 4: {
            RECORD_DATA a1c = binary(VX_REC_HBA1C, day + 10 * 3600);
            a1c.hbA1C = 6.8;
            log.push_back(a1c);
            RECORD_DATA visit = binary(VX_REC_LAST_VISIT, day + 10 * 3600 + 60);
            for (std::int16_t v = 0; v <= 2; ++v, visit.timeStamp += 60) {
                visit.visit = v;
                log.push_back(visit);
            }
            RECORD_DATA micro = binary(VX_REC_MICROALBUMIN, day + 10 * 3600 + 600);
            for (std::int16_t v : {std::int16_t(-1), std::int16_t(0), std::int16_t(-2), std::int16_t(28)}) {
                micro.microalbumin = v;
                log.push_back(micro);
                micro.timeStamp += 60;
            }
            break;
        }
        case 6:
        case 15: {
            RECORD_DATA ldl = binary(VX_REC_CHOLESTEROL_LDL_HDL, day + 11 * 3600);
            ldl.cholesterolLDL = d == 6 ? 118 : -1;
            ldl.cholesterolHDL = 52;
            log.push_back(ldl);
            RECORD_DATA total = binary(VX_REC_CHOLESTEROL_TOTAL_TRIG, ldl.timeStamp);
            total.cholesterolTotal = 196;
            total.cholesterolTriglyceride = d == 6 ? 141 : -1;
            log.push_back(total);
            break;
        }
        case 8:
        case 16: {
            RECORD_DATA bp = binary(VX_REC_BLOOD_PRESSURE, day + 9 * 3600 + 1800);
            bp.bloodPressureSystole = static_cast<std::int16_t>(rng.next(112, 145));
            bp.bloodPressureDiastole = d == 16 ? -1 : static_cast<std::int16_t>(rng.next(70, 92));
            log.push_back(bp);
            RECORD_DATA body = binary(VX_REC_WEIGHT_HEIGHT, day + 7 * 3600 + 120);
            body.weight = d == 8 ? 182.4 : 180.6;
            body.height = d == 8 ? 69.5 : -1.0;
            log.push_back(body);
            break;
        }
        case 10: {
            RECORD_DATA notes = binary(VX_REC_HEALTH_NOTES, day + 21 * 3600);
            notes.stressFlag = notes.illnessFlag = notes.otherFlag = 1;
            log.push_back(notes);
            RECORD_DATA more = binary(VX_REC_HEALTH_NOTES, day + 22 * 3600);
            more.feelHypoFlag = more.mensesFlag = more.vacationFlag = 1;
            log.push_back(more);
            break;
        }
        case 12: {
            RECORD_DATA code = binary(VX_REC_CAL_CODE, day + 6 * 3600);
            code.oldCalCode = 4;
            code.newCalCode = 11;
            log.push_back(code);
            RECORD_DATA control = binary(VX_REC_GLUCOSE, day + 6 * 3600 + 120);
            control.reading = 121;
            control.controlFlag = 1;
            log.push_back(control);
            break;
        }
        default:
            break;
        }
    }
    for (std::size_t i = 0; i < log.size(); ++i) log[i].Ordinal = static_cast<std::int16_t>(i + 1);
    return log;
}

std::vector<NameSlot> names(std::initializer_list<const char*> fixed, std::initializer_list<const char*> custom,
                            int slots) {
    std::vector<NameSlot> v;
    for (const char* n : fixed) v.push_back({n, true});
    for (const char* n : custom) v.push_back({n, false});
    v.resize(std::size_t(slots));
    return v;
}

[[noreturn]] void invalid(const std::string& what) { throw std::invalid_argument(what); }

void checkRange(const std::string& what, long v, long lo, long hi) {
    if (v < lo || v > hi)
        invalid(what + " " + std::to_string(v) + " is outside " + std::to_string(lo) + ".." + std::to_string(hi));
}

void checkText(const std::string& what, const std::string& text, std::size_t max, bool required) {
    if (required && text.empty()) invalid(what + " is empty");
    if (text.size() > max) invalid(what + " is longer than " + std::to_string(max) + " characters");
    if (text.find('\0') != std::string::npos) invalid(what + " holds a zero byte");
}

void checkNames(const char* what, const std::vector<NameSlot>& slots, std::size_t count, std::size_t fixed) {
    if (slots.size() != count)
        invalid(std::string(what) + " table has " + std::to_string(slots.size()) + " positions, not " +
                std::to_string(count));
    for (std::size_t i = 0; i < count; ++i) {
        checkText(std::string(what) + " name " + std::to_string(i + 1), slots[i].bytes, 10, false);
        if (slots[i].fixed != (i < fixed))
            invalid(std::string(what) + " position " + std::to_string(i + 1) +
                    (i < fixed ? " must be fixed" : " cannot be fixed"));
    }
}

bool sameEntry(const data_rec& a, const data_rec& b) {
    const TEST_REC &x = a.Test, &y = b.Test;
    return a.D_Type == b.D_Type && a.Valid == b.Valid && a.ResultApproximated == b.ResultApproximated &&
           a.D_Time == b.D_Time && x.Result == y.Result && x.Sample_detected == y.Sample_detected &&
           x.Medication == y.Medication && x.Event_code == y.Event_code && x.Flags == y.Flags && x.T_Type == y.T_Type;
}

}  // namespace

bool MeterProfile::operator==(const MeterProfile& o) const {
    auto key = [](const MeterProfile& p) {
        return std::tie(p.type, p.port, p.serial, p.identitySerial, p.firmware, p.name, p.wireBaud, p.options,
                        p.languages, p.events, p.insulinKinds, p.checkStripLow, p.checkStripHigh, p.checkStripApprox,
                        p.glucoseLow, p.glucoseHigh, p.glucoseErrorLow, p.glucoseErrorHigh, p.plasmaCalibrated, p.clock,
                        p.initializedFlag, p.maxRecords, p.corruptedRecords, p.insulinNames, p.oralMedNames,
                        p.favoriteInsulins, p.favoriteOralMeds, p.scheduleSelection, p.mealSegments, p.targets,
                        p.attached);
    };
    return key(*this) == key(o) &&
           std::equal(datalog.begin(), datalog.end(), o.datalog.begin(), o.datalog.end(), sameEntry) &&
           std::equal(binaryDatalog.begin(), binaryDatalog.end(), o.binaryDatalog.begin(), o.binaryDatalog.end(),
                      detail::sameRecord);
}

MeterProfile defaultProfile(int type) {
    if (type < 1 || type > 8) invalid("no meter type " + std::to_string(type) + "; types are 1 to 8");
    const TypeSpec& s = kTypes[type - 1];
    MeterProfile p;
    p.type = s.type;
    p.serial = s.serial;
    p.firmware = s.firmware;
    p.name = s.name;
    p.wireBaud = s.wireBaud;
    p.maxRecords = s.maxRecords;
    p.clock = secondsOf(s.clock[0], s.clock[1], s.clock[2], s.clock[3], s.clock[4], s.clock[5]);
    p.plasmaCalibrated = s.plasma;
    p.checkStripLow = s.checkStrip[0];
    p.checkStripHigh = s.checkStrip[1];
    p.checkStripApprox = s.checkStrip[2];
    p.glucoseLow = s.glucose[0];
    p.glucoseHigh = s.glucose[1];
    p.glucoseErrorLow = s.glucose[2];
    p.glucoseErrorHigh = s.glucose[3];
    p.languages = s.languages;
    p.events = s.events;
    p.insulinKinds = s.insulinKinds;
    for (const OptionRow& o : s.options) p.options[std::size_t(o.index)] = {o.availability, o.value, o.min, o.max};
    if (p.usesBinaryDatalog()) {
        p.binaryDatalog = binaryDatalog(p.clock);
        p.initializedFlag = 1;
        p.insulinNames =
            names({"Regular", "NPH", "Lente", "UltraLnt", "70/30", "75/25", "50/50", "Rapid", "LongAct", "Premix"},
                  {"MyBasal", "Pen 2"}, kInsulinSlots);
        p.oralMedNames = names({"Metformn", "Sulfonyl", "Glinide", "TZD", "DPP4"}, {"Evening"}, kOralMedSlots);
        p.favoriteInsulins = {8, 2, 11};
        p.favoriteOralMeds = {1, 6, 0, 0, 0};
        p.scheduleSelection = 1;
        p.mealSegments = {24, 36, 46, 54, 70, 80, 88};  // 06:00 09:00 11:30 13:30 17:30 20:00 22:00
        p.targets = {70, 130, 80, 180, 60};
    } else {
        p.datalog = recordDatalog(s, p.clock);
    }
    return p;
}

namespace detail {
std::int32_t clockMin(int type) { return secondsOf(clockRange(type).firstYear, 1, 1); }
std::int32_t clockMax(int type) { return secondsOf(clockRange(type).lastYear, 12, 31, 23, 59, 59); }
bool targetsValid(const TargetLimits& t) {
    auto in = [](int v, int lo, int hi) { return v >= lo && v <= hi; };
    return in(t.beforeLow, 60, 200) && in(t.beforeHigh, 60, 200) && in(t.afterLow, 60, 200) &&
           in(t.afterHigh, 60, 200) && in(t.hypo, 50, 90) && t.beforeLow <= t.beforeHigh && t.afterLow <= t.afterHigh;
}
}  // namespace detail

using detail::clockMax;
using detail::clockMin;

void validateProfile(const MeterProfile& p) {
    checkRange("meter type", p.type, 1, 8);
    checkRange("port", p.port, 1, 255);
    checkText("serial number", p.serial, 20, true);
    checkText("identification serial number", p.identitySerial, 20, false);
    checkText("firmware", p.firmware, 20, true);
    checkText("meter name", p.name, 40, false);
    static constexpr std::int32_t rates[] = {300, 600, 1200, 2400, 4800, 9600, 19200};
    if (std::find(std::begin(rates), std::end(rates), p.wireBaud) == std::end(rates))
        invalid("wire speed " + std::to_string(p.wireBaud) + " is not one of 300, 600, 1200, 2400, 4800, 9600, 19200");
    if (p.languages.size() > 20) invalid("more than 20 languages");
    if (p.events.size() > 16) invalid("more than 16 event codes");
    if (p.insulinKinds.size() > 14) invalid("more than 14 insulin kinds");
    for (int i = 0; i < kOptionCount; ++i) {
        const OptionEntry& o = p.options[std::size_t(i)];
        const std::string what = "option " + std::to_string(i);
        checkRange(what + " availability", o.availability, 0, 2);
        if (o.availability == 0) continue;
        if (o.min > o.max) invalid(what + " has its minimum above its maximum");
        checkRange(what + " value", o.value, o.min, o.max);
        if (i == eLanguage && std::find(p.languages.begin(), p.languages.end(), o.value) == p.languages.end())
            invalid("language " + std::to_string(o.value) + " is not in the language map");
    }
    checkRange("plasma calibration flag", p.plasmaCalibrated, 0, 1);
    checkRange("meter clock", p.clock, clockMin(p.type), clockMax(p.type));
    checkRange("initialised flag", p.initializedFlag, 0, 1);
    const bool binary = p.usesBinaryDatalog();
    checkRange("memory size", p.maxRecords, 1, binary ? 32767 : 255);
    if (binary && !p.datalog.empty()) invalid("a type-7 meter keeps a binary datalog, not datalog entries");
    if (!binary && !p.binaryDatalog.empty()) invalid("only a type-7 meter keeps a binary datalog");
    const std::size_t held = binary ? p.binaryDatalog.size() : p.datalog.size();
    if (held > std::size_t(p.maxRecords))
        invalid(std::to_string(held) + " records exceed the memory of " + std::to_string(p.maxRecords));
    if (binary) {
        METER_BIN_DATALOG probe{};
        try {
            encodeBinaryDatalog(p.binaryDatalog, probe);
        } catch (const std::exception& e) {
            invalid(e.what());
        }
    }
    std::set<int> damaged;
    for (int i : p.corruptedRecords) {
        checkRange("corrupted record", i, 0, int(p.binaryDatalog.size()) - 1);
        if (!damaged.insert(i).second) invalid("corrupted record " + std::to_string(i) + " listed twice");
    }
    if (!binary) {
        if (!p.insulinNames.empty() || !p.oralMedNames.empty()) invalid("only a type-7 meter keeps medication names");
        return;
    }
    checkNames("insulin", p.insulinNames, kInsulinSlots, kFirstCustomInsulin - 1);
    checkNames("oral-medication", p.oralMedNames, kOralMedSlots, kFirstCustomOralMed - 1);
    for (std::int16_t f : p.favoriteInsulins) checkRange("favourite insulin", f, 0, kInsulinSlots);
    for (std::int16_t f : p.favoriteOralMeds) checkRange("favourite oral medication", f, 0, kOralMedSlots);
    checkRange("schedule selection", p.scheduleSelection, 0, 1);
    for (std::int16_t q : p.mealSegments) checkRange("meal segment start", q, 0, 95);
    if (!detail::targetsValid(p.targets))
        invalid("target limits must lie in 60..200 (hypo level 50..90), each low at most its high");
}

}  // namespace varnel::sim
