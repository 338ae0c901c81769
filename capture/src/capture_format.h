// The capture file: a header line, then one JSON line per transport call with
// every argument going in and coming out. Shared by the recorder and the replayer.
#pragma once

#include <cstddef>
#include <cstdint>
#include <limits>
#include <map>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <type_traits>
#include <vector>

#include <nlohmann/json.hpp>

#include "varnel/vantrix32.h"

namespace varnel::capture {

// Key order kept as written, so a capture reads (and diffs) in a fixed order.
using Json = nlohmann::ordered_json;
using Bytes = std::vector<std::uint8_t>;

inline constexpr const char* kFormatName = "varnel-capture";
inline constexpr int kFormatVersion = 1;

// What a replay reads at most. The largest kept session is 175 KB with lines
// of at most 19 KB nesting 5 levels; the largest object a call carries is a
// binary datalog, 61 KB as hex, written at most a few times on one line. A
// full meter's session is about 1.2 MB.
inline constexpr std::size_t kMaxLineBytes = std::size_t(1) << 20;
inline constexpr std::uintmax_t kMaxFileBytes = std::uintmax_t(16) << 20;
inline constexpr int kMaxDepth = 16;
// The longest a replay waits for one call when it keeps the recorded times.
inline constexpr std::uint32_t kMaxReplayedWaitMs = 60'000;

// How an argument crosses the boundary (the kinds of vantrix32_functions.h).
enum class Kind { REC, VALUE, IN, OUT, INOUT, IN_LIST, OUT_LIST };

// What the capture needs to know of an argument's type.
struct TypeInfo {
    const char* name;
    std::size_t size;
    bool number;  // a signed integer, written as a JSON number
    // Adds the fields a person looks for; the bytes alone are what replay uses.
    void (*readable)(const std::uint8_t* object, Json& out);
};

// One argument of a call, as the library received it.
struct ArgRef {
    Kind kind;
    const char* name;
    void* data;  // nullptr when the caller passed none
    std::size_t count;
    const TypeInfo* type;

    std::size_t bytes() const { return type->size * count; }
    bool goesIn() const { return kind != Kind::OUT && kind != Kind::OUT_LIST; }
    bool comesOut() const { return kind != Kind::VALUE && kind != Kind::IN && kind != Kind::IN_LIST; }
};

const TypeInfo& typeInfo(const METER_REC*);
const TypeInfo& typeInfo(const SETTINGS_REC*);
const TypeInfo& typeInfo(const TIME_REC*);
const TypeInfo& typeInfo(const INSULIN_OR_ORAL_MED_NAME_TYPE*);
const TypeInfo& typeInfo(const PREDEFINED_INSULINS_TYPE*);
const TypeInfo& typeInfo(const PREDEFINED_ORAL_MEDS_TYPE*);
const TypeInfo& typeInfo(const MEAL_SEGMENTS_TYPE*);
const TypeInfo& typeInfo(const METER_DATALOG*);
const TypeInfo& typeInfo(const METER_BIN_DATALOG*);
const TypeInfo& typeInfo(const RECORD_DATA*);
const TypeInfo& typeInfo(const std::int16_t*);
const TypeInfo& typeInfo(const std::int32_t*);

template <class T>
ArgRef arg(Kind kind, const char* name, T* data, std::size_t count) {
    return {kind, name, data, count, &typeInfo(static_cast<const T*>(nullptr))};
}

// An argument list from the function list's tuples: ARGS(tuples...) gives std::array<ArgRef, N>.
#define VARNEL_CAP_ARG(kind, type, name)                                                               \
    , ::varnel::capture::arg<type>(::varnel::capture::Kind::kind, #name, VARNEL_CAP_ADDR_##kind(name), \
                                   VARNEL_CAP_COUNT_##kind)
#define VARNEL_CAP_ADDR_REC(name) name
#define VARNEL_CAP_ADDR_VALUE(name) &name
#define VARNEL_CAP_ADDR_IN(name) name
#define VARNEL_CAP_ADDR_OUT(name) name
#define VARNEL_CAP_ADDR_INOUT(name) name
#define VARNEL_CAP_ADDR_IN_LIST(name) name
#define VARNEL_CAP_ADDR_OUT_LIST(name) name
#define VARNEL_CAP_COUNT_REC 1
#define VARNEL_CAP_COUNT_VALUE 1
#define VARNEL_CAP_COUNT_IN 1
#define VARNEL_CAP_COUNT_OUT 1
#define VARNEL_CAP_COUNT_INOUT 1
#define VARNEL_CAP_COUNT_IN_LIST VX_LIST_LENGTH
#define VARNEL_CAP_COUNT_OUT_LIST VX_LIST_LENGTH
#define VARNEL_CAP_ARGS(...) \
    std::array { VX_COMMA_LIST(VX_EACH(VARNEL_CAP_ARG, __VA_ARGS__)) }

// Fails a call for a reason of the capture: -17, left in the record's Error_code as a transport does.
std::int32_t failCall(std::span<const ArgRef> args);

// The bytes of an argument as they are now.
Bytes bytesOf(const ArgRef& a);

// The last object of each type that came out of a call, so a large object
// handed back in unchanged (a binary datalog) is written as a reference.
class OutMemory {
public:
    void remember(int call, const ArgRef& a, Bytes bytes);
    // The call whose output these bytes are, if any.
    std::optional<int> find(const ArgRef& a, const Bytes& bytes) const;
    const Bytes* recall(int call, const ArgRef& a) const;
    void clear() { last_.clear(); }

private:
    std::map<std::string, std::pair<int, Bytes>> last_;
};

// An argument going in: its value; records also with readable fields, and
// large ones handed back as an earlier call left them as {"fromCall": n}.
Json encodeIn(const ArgRef& a, int call, const OutMemory& memory);
// An argument coming out; the meter record as its changes against `in`.
Json encodeOut(const ArgRef& a, const Bytes& in);

// What changed from one image of an object to the next, as [offset, hex] runs.
Json changesBetween(const Bytes& before, const Bytes& after);
// Applies such runs; false when they are malformed or run past the end.
bool applyChanges(const Json& changes, Bytes& target);

// The bytes a capture holds for an argument; nullopt with `why` set when it cannot be read.
std::optional<Bytes> decodeIn(const ArgRef& a, const Json& value, const OutMemory& memory, std::string& why);
std::optional<Bytes> decodeOut(const ArgRef& a, const Json& value, const Bytes& in, std::string& why);

// Where two images of an argument first differ, in words: "byte 318 (Percent_done)", "entry 2".
std::string firstDifference(const ArgRef& a, const Bytes& expected, const Bytes& came);
// A value for a message: a number as it is, an object by its type.
std::string describe(const ArgRef& a, const Bytes& bytes);

// A line of a capture, or nullopt with `why` set: no JSON, or nested deeper than kMaxDepth.
std::optional<Json> parseLine(const std::string& text, std::string& why);
// Why a call line cannot be replayed ("" when it can): a field missing, of the
// wrong type, or a number that does not fit its field.
std::string checkCall(const Json& call);
// A JSON integer that fits `T`, else nullopt (never narrowed, never wrapped).
template <class T>
std::optional<T> integerAs(const Json& value) {
    if (value.is_number_unsigned()) {
        const auto n = value.get<std::uint64_t>();
        if (n <= static_cast<std::uint64_t>(std::numeric_limits<T>::max())) return static_cast<T>(n);
    } else if (value.is_number_integer()) {
        const auto n = value.get<std::int64_t>();
        if constexpr (std::is_signed_v<T>)
            if (n >= std::numeric_limits<T>::min() && n <= std::numeric_limits<T>::max()) return static_cast<T>(n);
    }
    return std::nullopt;
}
// Text taken from a capture, fit for a terminal: control characters and
// bytes that are not UTF-8 written as \xNN.
std::string printable(std::string_view text);

Json headerLine(const std::string& transportPath);
// A line as written: text that is not UTF-8 (a path) is replaced, never refused.
std::string lineText(const Json& line);
// Empty when the header is one this code reads; else why not.
std::string checkHeader(const Json& header);

}  // namespace varnel::capture
