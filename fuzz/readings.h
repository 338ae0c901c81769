// The input of the readings target: a header, then the bytes the transport answers.
#pragma once

#include <cstdint>

namespace varnel::fuzz {

// byte 0: meter type (1 + value % 8); bytes 1-2 and 3-4: the datalog's two
// counts as the transport reports them (little-endian, any value); byte 5:
// bit 0 set makes the binary datalog's record reader answer records straight
// from the payload instead of decoding binBuf. The payload follows: the record
// datalog's entries, or binBuf, or the records answered one after another.
struct ReadingsHeader {
    std::uint8_t type;
    std::uint8_t count[2];
    std::uint8_t second[2];
    std::uint8_t flags;
};
static_assert(sizeof(ReadingsHeader) == 6);

}  // namespace varnel::fuzz
