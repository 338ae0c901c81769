// The value fields each binary record type carries, shared by the datalog
// encoding and the profile files. Types outside the table carry only their
// time stamp and ordinal.
#pragma once

#include <cstdint>
#include <span>

#include "varnel/records.h"

namespace varnel::sim::detail {

// How a field is stored: one signed byte, two bytes, or hundredths in four bytes.
enum class Width : std::uint8_t { I8, I16, Hundredths };

struct Field {
    const char* name;
    Width width;
    std::int16_t RECORD_DATA::*integer;
    double RECORD_DATA::*real;
};

// The fields of a record type in stored order; empty for a type outside the table.
std::span<const Field> fieldsOf(std::int16_t recType);
// The record types of the table, in ascending order.
std::span<const std::int16_t> knownRecordTypes();
// Every value field of RECORD_DATA (all but recType, timeStamp and Ordinal).
std::span<const Field> allValueFields();
bool sameRecord(const RECORD_DATA& a, const RECORD_DATA& b);

}  // namespace varnel::sim::detail
