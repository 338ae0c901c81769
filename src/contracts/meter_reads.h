// Reads from the transport that change nothing on the meter and may be asked
// twice: a datalog record's decoding and the meter's time conversion.
#pragma once

#include <cstdint>

#include "contracts/transport.h"
#include "varnel/records.h"

namespace varnel::detail {

// A failure code for a call that failed: its own code when it is one, ME_FAIL otherwise.
constexpr std::int16_t failureCode(std::int16_t returned) {
    return returned < 0 ? returned : static_cast<std::int16_t>(ME_FAIL);
}

// Runs read, and once more when it fails: 0, or the failure code of the second try.
template <class F>
std::int16_t readTwice(F&& read) {
    std::int16_t code = read();
    if (code != 0) code = read();
    return code == 0 ? std::int16_t{0} : failureCode(code);
}

// The transport's time record for meter seconds, asked twice: 0, or the failure code.
std::int16_t meterTimeOf(Transport& transport, std::int32_t seconds, TIME_REC& time);

}  // namespace varnel::detail
