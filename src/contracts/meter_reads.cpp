#include "contracts/meter_reads.h"

namespace varnel::detail {

std::int16_t meterTimeOf(Transport& transport, std::int32_t seconds, TIME_REC& time) {
    return readTwice([&] {
        // A failed conversion may leave anything behind; each try starts from nothing.
        time = TIME_REC{};
        return transport.convert_from_seconds(seconds, time);
    });
}

}  // namespace varnel::detail
