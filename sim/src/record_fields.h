// The value fields and the profile-file word of each binary record type, shared
// by the datalog encoding and the profile files. Types outside the table carry
// only their time stamp and ordinal.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <optional>
#include <span>
#include <string_view>

#include "varnel/records.h"

namespace varnel::sim::detail {

// How a field is stored: one signed byte, two bytes, or hundredths in four bytes.
enum class Width : std::uint8_t { I8, I16, Hundredths };

// A value field. Doubles sit on 4-byte boundaries in the packed record, so a
// real field is reached by its offset and copied, never through a double pointer.
struct Field {
    const char* name;
    Width width;
    std::int16_t RECORD_DATA::*integer;  // null for a real field
    std::size_t realOffset;

    bool isReal() const { return integer == nullptr; }
    double real(const RECORD_DATA& r) const {
        double v;
        std::memcpy(&v, reinterpret_cast<const unsigned char*>(&r) + realOffset, sizeof v);
        return v;
    }
    void setReal(RECORD_DATA& r, double v) const {
        std::memcpy(reinterpret_cast<unsigned char*>(&r) + realOffset, &v, sizeof v);
    }
};

// The fields of a record type in stored order; empty for a type outside the table.
std::span<const Field> fieldsOf(std::int16_t recType);
// The word a profile file uses for a record type; null for a type outside the table.
const char* recordTypeName(std::int16_t recType);
// The record type a profile file's word names, if the table has it.
std::optional<std::int16_t> recordTypeNamed(std::string_view name);
// Every value field of RECORD_DATA (all but recType, timeStamp and Ordinal).
std::span<const Field> allValueFields();
bool sameRecord(const RECORD_DATA& a, const RECORD_DATA& b);

}  // namespace varnel::sim::detail
