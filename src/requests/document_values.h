// What every request document writes the same way: numbers as text, the
// two-digit month, the date attributes, and sets of meter types for the
// per-type item tables.
#pragma once

#include <array>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <string>

#include "util/date_time.h"

namespace varnel::detail {

// Meter types as bits: bit t for type t.
using TypeSet = std::uint16_t;

constexpr TypeSet types(std::initializer_list<int> list) {
    TypeSet set = 0;
    for (int t : list) set = static_cast<TypeSet>(set | (1u << t));
    return set;
}

inline constexpr TypeSet kAllTypes = types({1, 2, 3, 4, 5, 6, 7, 8});

constexpr bool has(TypeSet set, std::int32_t type) { return type >= 0 && type < 16 && ((set >> type) & 1u) != 0; }

// A whole number as decimal text.
template <std::integral T>
std::string NumberText(T v) {
    return std::to_string(v);
}

// A real number as decimal text with at most 15 significant digits, no
// exponent and no trailing zeros: 12.5, 3, 0.25.
std::string NumberText(double v);

// A number with at least two digits (the documents' "00" month format).
std::string TwoDigits(long long value);

// The attributes D, MM, Y (and with the time h, m, s) of a date-time, in document
// order, formatted into fixed buffers: a datalog writes them for every entry.
class DateAttributes {
public:
    struct Attribute {
        const char* name;
        char text[24];  // any 64-bit number, sign and terminating zero included
    };
    DateAttributes(const DateTime& t, bool withTime);
    const Attribute* begin() const { return items_.data(); }
    const Attribute* end() const { return items_.data() + count_; }

private:
    std::array<Attribute, 6> items_;
    std::size_t count_ = 0;
};

inline DateAttributes dateAttributes(const DateTime& t, bool withTime) { return DateAttributes(t, withTime); }

}  // namespace varnel::detail
