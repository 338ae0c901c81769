#include "capture_format.h"

#include <algorithm>
#include <chrono>
#include <cstring>
#include <ctime>
#include <limits>

#include "printable.h"

namespace varnel::capture {

namespace {

// Text from a fixed byte array: up to the first zero, anything unprintable as '?'.
template <std::size_t N>
std::string text(const std::uint8_t (&field)[N]) {
    std::string out;
    for (std::uint8_t c : field) {
        if (c == 0) break;
        out += (c >= 0x20 && c < 0x7f) ? char(c) : '?';
    }
    return out;
}

template <class T, std::size_t N>
Json list(const T (&values)[N], std::size_t count = N) {
    Json out = Json::array();
    for (std::size_t i = 0; i < std::min(count, N); ++i) out.push_back(values[i]);
    return out;
}

template <class T>
const T& as(const std::uint8_t* object) {
    return *reinterpret_cast<const T*>(object);
}

void meterRecFields(const std::uint8_t* p, Json& j) {
    const auto& r = as<METER_REC>(p);
    j["M_Type"] = r.M_Type;
    j["Error_code"] = r.Error_code;
    j["Serial_number"] = text(r.Serial_number);
    j["Firmware_number"] = text(r.Firmware_number);
    j["com_number"] = r.port.com_number;
    j["Percent_done"] = r.Percent_done;
}
void settingsFields(const std::uint8_t* p, Json& j) { j["nValue"] = list(as<SETTINGS_REC>(p).nValue); }
void timeFields(const std::uint8_t* p, Json& j) {
    const auto& t = as<TIME_REC>(p);
    j["year"] = t.year, j["mon"] = t.mon, j["mday"] = t.mday, j["hour"] = t.hour, j["min"] = t.min, j["sec"] = t.sec;
}
void nameFields(const std::uint8_t* p, Json& j) {
    const auto& n = as<INSULIN_OR_ORAL_MED_NAME_TYPE>(p);
    j["index"] = n.index;
    j["nameStr"] = text(n.nameStr);
}
void insulinsFields(const std::uint8_t* p, Json& j) {
    j["InsulinType"] = list(as<PREDEFINED_INSULINS_TYPE>(p).InsulinType);
}
void oralMedsFields(const std::uint8_t* p, Json& j) {
    j["oralMedType"] = list(as<PREDEFINED_ORAL_MEDS_TYPE>(p).oralMedType);
}
void segmentsFields(const std::uint8_t* p, Json& j) {
    j["mealSegments"] = list(as<MEAL_SEGMENTS_TYPE>(p).mealSegments);
}
void datalogFields(const std::uint8_t* p, Json& j) {
    const auto& d = as<METER_DATALOG>(p);
    j["recordCount"] = d.recordCount;
    j["ValidRecordCount"] = d.ValidRecordCount;
    j["maxRecordsForMeter"] = d.maxRecordsForMeter;
}
void binDatalogFields(const std::uint8_t* p, Json& j) {
    const auto& d = as<METER_BIN_DATALOG>(p);
    j["recordCount"] = d.recordCount;
    j["corruptedCount"] = d.corruptedCount;
    j["maxRecordsForMeter"] = d.maxRecordsForMeter;
}
void recordDataFields(const std::uint8_t* p, Json& j) {
    const auto& r = as<RECORD_DATA>(p);
    j["recType"] = r.recType;
    j["timeStamp"] = r.timeStamp;
    j["reading"] = r.reading;
}

// The meter record's fields by offset, to name where two records differ.
#define VARNEL_CAP_FIELD(f) {offsetof(METER_REC, f), #f},
const struct {
    std::size_t offset;
    const char* name;
} kMeterRecFields[] = {
    VARNEL_CAP_FIELD(M_Type) VARNEL_CAP_FIELD(Error_code) VARNEL_CAP_FIELD(Serial_number)
        VARNEL_CAP_FIELD(Firmware_number) VARNEL_CAP_FIELD(port) VARNEL_CAP_FIELD(Setting)
            VARNEL_CAP_FIELD(Meter_upload_time) VARNEL_CAP_FIELD(Computer_upload_time)
                VARNEL_CAP_FIELD(Checkstrip_range_lower_limit) VARNEL_CAP_FIELD(Percent_done) VARNEL_CAP_FIELD(Stage)
                    VARNEL_CAP_FIELD(Upper_glucose_report_level) VARNEL_CAP_FIELD(langMap) VARNEL_CAP_FIELD(eventMap)
                        VARNEL_CAP_FIELD(insulinMap) VARNEL_CAP_FIELD(Meter_name) VARNEL_CAP_FIELD(Plasma_cal_flag)
                            VARNEL_CAP_FIELD(Time_min) VARNEL_CAP_FIELD(Time_max) VARNEL_CAP_FIELD(FuncPtr_User_func)
                                VARNEL_CAP_FIELD(Raw_buff)};
#undef VARNEL_CAP_FIELD

const char kHex[] = "0123456789abcdef";

// Hex of the bytes, trailing zero bytes left out (the size is the type's).
std::string toHex(const std::uint8_t* p, std::size_t n) {
    while (n > 0 && p[n - 1] == 0) --n;
    std::string out;
    out.reserve(n * 2);
    for (std::size_t i = 0; i < n; ++i) out += {kHex[p[i] >> 4], kHex[p[i] & 15]};
    return out;
}

int hexDigit(char c) {
    if (c >= '0' && c <= '9') return c - '0';
    if (c >= 'a' && c <= 'f') return c - 'a' + 10;
    return -1;
}

// Writes hex at `at` in `out`; false when it is no hex or runs past the end.
bool fromHex(const Json& value, Bytes& out, std::size_t at) {
    if (!value.is_string()) return false;
    const auto& s = value.get_ref<const std::string&>();
    if (s.size() % 2 || at > out.size() || s.size() / 2 > out.size() - at) return false;
    for (std::size_t i = 0; i < s.size(); i += 2) {
        const int hi = hexDigit(s[i]), lo = hexDigit(s[i + 1]);
        if (hi < 0 || lo < 0) return false;
        out[at + i / 2] = static_cast<std::uint8_t>(hi * 16 + lo);
    }
    return true;
}

std::int64_t numberAt(const ArgRef& a, const Bytes& b, std::size_t i) {
    if (a.type->size == 2) {
        std::int16_t v;
        std::memcpy(&v, b.data() + i * 2, 2);
        return v;
    }
    std::int32_t v;
    std::memcpy(&v, b.data() + i * 4, 4);
    return v;
}

Json numbers(const ArgRef& a, const Bytes& b) {
    if (a.count == 1) return numberAt(a, b, 0);
    Json out = Json::array();
    for (std::size_t i = 0; i < a.count; ++i) out.push_back(numberAt(a, b, i));
    return out;
}

bool putNumber(const ArgRef& a, const Json& v, Bytes& out, std::size_t i) {
    if (a.type->size == 2) {
        const auto x = integerAs<std::int16_t>(v);
        if (x) std::memcpy(out.data() + i * 2, &*x, 2);
        return x.has_value();
    }
    const auto x = integerAs<std::int32_t>(v);
    if (x) std::memcpy(out.data() + i * 4, &*x, 4);
    return x.has_value();
}

std::optional<Bytes> decodeNumbers(const ArgRef& a, const Json& v, std::string& why) {
    Bytes out(a.bytes());
    bool ok = a.count == 1 ? putNumber(a, v, out, 0) : v.is_array() && v.size() == a.count;
    for (std::size_t i = 0; ok && a.count > 1 && i < a.count; ++i) ok = putNumber(a, v[i], out, i);
    if (ok) return out;
    why = "argument " + std::string(a.name) + " is not " + (a.count == 1 ? "a" : std::to_string(a.count)) + " " +
          a.type->name + (a.count == 1 ? "" : "s");
    return std::nullopt;
}

Json readableObject(const ArgRef& a, const Bytes& b) {
    Json out = Json::object();
    if (a.type->readable) a.type->readable(b.data(), out);
    return out;
}

}  // namespace

#define VARNEL_CAP_TYPE(T, fields)                                \
    const TypeInfo& typeInfo(const T*) {                          \
        static const TypeInfo info{#T, sizeof(T), false, fields}; \
        return info;                                              \
    }
VARNEL_CAP_TYPE(METER_REC, meterRecFields)
VARNEL_CAP_TYPE(SETTINGS_REC, settingsFields)
VARNEL_CAP_TYPE(TIME_REC, timeFields)
VARNEL_CAP_TYPE(INSULIN_OR_ORAL_MED_NAME_TYPE, nameFields)
VARNEL_CAP_TYPE(PREDEFINED_INSULINS_TYPE, insulinsFields)
VARNEL_CAP_TYPE(PREDEFINED_ORAL_MEDS_TYPE, oralMedsFields)
VARNEL_CAP_TYPE(MEAL_SEGMENTS_TYPE, segmentsFields)
VARNEL_CAP_TYPE(METER_DATALOG, datalogFields)
VARNEL_CAP_TYPE(METER_BIN_DATALOG, binDatalogFields)
VARNEL_CAP_TYPE(RECORD_DATA, recordDataFields)
#undef VARNEL_CAP_TYPE

const TypeInfo& typeInfo(const std::int16_t*) {
    static const TypeInfo info{"int16", 2, true, nullptr};
    return info;
}
const TypeInfo& typeInfo(const std::int32_t*) {
    static const TypeInfo info{"int32", 4, true, nullptr};
    return info;
}

std::int32_t failCall(std::span<const ArgRef> args) {
    for (const ArgRef& a : args)
        if (a.kind == Kind::REC && a.data) static_cast<METER_REC*>(a.data)->Error_code = ME_FAIL;
    return ME_FAIL;
}

Bytes bytesOf(const ArgRef& a) {
    if (!a.data) return {};
    const auto* p = static_cast<const std::uint8_t*>(a.data);
    return Bytes(p, p + a.bytes());
}

void OutMemory::remember(int call, const ArgRef& a, Bytes bytes) { last_[a.type->name] = {call, std::move(bytes)}; }

std::optional<int> OutMemory::find(const ArgRef& a, const Bytes& bytes) const {
    auto it = last_.find(a.type->name);
    if (it == last_.end() || it->second.second != bytes) return std::nullopt;
    return it->second.first;
}

const Bytes* OutMemory::recall(int call, const ArgRef& a) const {
    auto it = last_.find(a.type->name);
    return it != last_.end() && it->second.first == call ? &it->second.second : nullptr;
}

// Objects this large are written by reference when they are handed back unchanged.
constexpr std::size_t kReferenceSize = 256;

Json encodeIn(const ArgRef& a, int call, const OutMemory& memory) {
    if (!a.data) return nullptr;
    const Bytes b = bytesOf(a);
    if (a.type->number) return numbers(a, b);
    Json out = readableObject(a, b);
    if (a.bytes() >= kReferenceSize) {
        if (auto from = memory.find(a, b); from && *from < call) {
            out["fromCall"] = *from;
            return out;
        }
    }
    out["bytes"] = toHex(b.data(), b.size());
    return out;
}

Json encodeOut(const ArgRef& a, const Bytes& in) {
    if (!a.data) return nullptr;
    const Bytes b = bytesOf(a);
    if (a.type->number) return numbers(a, b);
    Json out = readableObject(a, b);
    if (a.kind == Kind::REC)
        out["changes"] = changesBetween(in, b);
    else
        out["bytes"] = toHex(b.data(), b.size());
    return out;
}

Json changesBetween(const Bytes& before, const Bytes& after) {
    // Runs of changed bytes as [offset, hex]; runs closer than a few bytes are joined.
    Json changes = Json::array();
    const std::size_t n = std::min(before.size(), after.size());
    for (std::size_t i = 0; i < n;) {
        if (after[i] == before[i]) {
            ++i;
            continue;
        }
        std::size_t end = i + 1, same = 0;
        for (std::size_t j = end; j < n && same < 4; ++j) {
            if (after[j] != before[j]) {
                end = j + 1;
                same = 0;
            } else {
                ++same;
            }
        }
        std::string hex;
        for (std::size_t k = i; k < end; ++k) hex += {kHex[after[k] >> 4], kHex[after[k] & 15]};
        changes.push_back(Json::array({i, hex}));
        i = end;
    }
    return changes;
}

bool applyChanges(const Json& changes, Bytes& target) {
    if (!changes.is_array()) return false;
    for (const Json& c : changes)
        if (!c.is_array() || c.size() != 2 || !c[0].is_number_unsigned() ||
            !fromHex(c[1], target, c[0].get<std::size_t>()))
            return false;
    return true;
}

std::optional<Bytes> decodeIn(const ArgRef& a, const Json& value, const OutMemory& memory, std::string& why) {
    if (value.is_null()) return Bytes{};
    if (a.type->number) return decodeNumbers(a, value, why);
    if (value.is_object() && value.contains("fromCall")) {
        const Json& from = value["fromCall"];
        const auto call = integerAs<int>(from);
        if (const Bytes* b = call ? memory.recall(*call, a) : nullptr) return *b;
        why = "argument " + std::string(a.name) + " refers to no earlier " + a.type->name + " of the capture";
        return std::nullopt;
    }
    Bytes out(a.bytes());
    if (value.is_object() && value.contains("bytes") && fromHex(value["bytes"], out, 0)) return out;
    why = "argument " + std::string(a.name) + " holds no " + a.type->name + " bytes";
    return std::nullopt;
}

std::optional<Bytes> decodeOut(const ArgRef& a, const Json& value, const Bytes& in, std::string& why) {
    if (a.kind != Kind::REC || value.is_null()) return decodeIn(a, value, OutMemory{}, why);
    Bytes out = in;
    const bool ok =
        value.is_object() && value.contains("changes") && in.size() == a.bytes() && applyChanges(value["changes"], out);
    if (ok) return out;
    why = "argument " + std::string(a.name) + " holds no readable changes";
    return std::nullopt;
}

std::string firstDifference(const ArgRef& a, const Bytes& expected, const Bytes& came) {
    if (expected.empty() != came.empty()) return expected.empty() ? "none expected, one came" : "none came";
    std::size_t i = 0;
    while (i < expected.size() && expected[i] == came[i]) ++i;
    if (a.type->number) return "entry " + std::to_string(i / a.type->size);
    std::string where = "byte " + std::to_string(i);
    if (a.type == &typeInfo(static_cast<const METER_REC*>(nullptr))) {
        const char* field = nullptr;
        for (const auto& f : kMeterRecFields)
            if (f.offset <= i) field = f.name;
        if (field) where += std::string(" (") + field + ")";
    }
    return where;
}

std::string describe(const ArgRef& a, const Bytes& bytes) {
    if (bytes.empty()) return "none";
    if (a.type->number) return numbers(a, bytes).dump();
    return std::string("a ") + a.type->name;
}

Json headerLine(const std::string& transportPath) {
    const std::time_t now = std::chrono::system_clock::to_time_t(std::chrono::system_clock::now());
    std::tm utc{};
    gmtime_r(&now, &utc);
    char when[32];
    std::strftime(when, sizeof when, "%Y-%m-%dT%H:%M:%SZ", &utc);
    return Json{{"format", kFormatName}, {"version", kFormatVersion}, {"transport", transportPath}, {"recorded", when}};
}

std::optional<Json> parseLine(const std::string& text, std::string& why) {
    // Refused while it is read: a deeper value would be copied and freed recursively later.
    struct TooDeep {};
    const auto bound = [](int depth, Json::parse_event_t event, Json&) {
        if (depth >= kMaxDepth && (event == Json::parse_event_t::object_start ||
                                   event == Json::parse_event_t::array_start))
            throw TooDeep{};
        return true;
    };
    try {
        Json line = Json::parse(text, bound, false);
        if (!line.is_discarded()) return line;
        why = "is not valid JSON";
    } catch (const TooDeep&) {
        why = "nests deeper than " + std::to_string(kMaxDepth) + " levels";
    }
    return std::nullopt;
}

std::string checkCall(const Json& c) {
    if (!c.is_object()) return "is no object";
    for (const char* key : {"fn", "in", "out", "result", "ms"})
        if (!c.contains(key)) return std::string("has no \"") + key + "\"";
    if (!c["fn"].is_string() || !c["in"].is_object() || !c["out"].is_object()) return "has a field of the wrong type";
    if (!integerAs<std::int32_t>(c["result"])) return "has a result that is no 32-bit integer";
    if (!integerAs<std::uint32_t>(c["ms"])) return "has a time (ms) that is no 32-bit count of milliseconds";
    if (!c.contains("yields")) return {};
    if (!c["yields"].is_array()) return "has yields that are no list";
    for (const Json& y : c["yields"])
        if (!y.is_object() || !y.contains("at") || !integerAs<std::uint32_t>(y["at"]))
            return "has a yield whose time (at) is no 32-bit count of milliseconds";
    return {};
}

std::string printable(std::string_view text) { return detail::printableText(text); }

std::string lineText(const Json& line) { return line.dump(-1, ' ', false, Json::error_handler_t::replace); }

std::string checkHeader(const Json& header) {
    if (!header.is_object() || !header.contains("format") || header["format"] != kFormatName)
        return std::string("the first line is no ") + kFormatName + " header";
    const Json version = header.contains("version") ? header["version"] : Json();
    if (!version.is_number_integer() || version.get<std::int64_t>() < 1)
        return "the header has no valid format version";
    if (version.get<std::int64_t>() > kFormatVersion)
        return "the capture is of format version " + version.dump() + ", newer than this replayer reads (" +
               std::to_string(kFormatVersion) + ")";
    return {};
}

}  // namespace varnel::capture
