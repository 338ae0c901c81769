// The binary datalog's record checksum is CRC-16/CCITT (polynomial 0x1021,
// start 0xFFFF) over index..payload, so another reader of the layout agrees.
#include <gtest/gtest.h>

#include <memory>

#include "simulator.h"

namespace {

std::uint16_t bitwiseCrc(const std::uint8_t* p, std::size_t n) {
    std::uint16_t crc = 0xFFFF;
    while (n--) {
        crc ^= static_cast<std::uint16_t>(*p++ << 8);
        for (int bit = 0; bit < 8; ++bit) crc = static_cast<std::uint16_t>(crc & 0x8000 ? (crc << 1) ^ 0x1021 : crc << 1);
    }
    return crc;
}

TEST(BinaryDatalogCrc, EveryRecordCarriesTheCcittChecksum) {
    const std::uint8_t check[] = {'1', '2', '3', '4', '5', '6', '7', '8', '9'};
    ASSERT_EQ(bitwiseCrc(check, sizeof check), 0x29B1);  // the reference value of this CRC
    const auto records = varnel::sim::defaultProfile(7).binaryDatalog;
    auto log = std::make_unique<METER_BIN_DATALOG>();
    varnel::sim::encodeBinaryDatalog(records, *log);
    const std::uint8_t* table = log->binBuf + 4;
    for (std::size_t i = 0; i < records.size(); ++i) {
        const std::uint8_t* start = log->binBuf + (table[2 * i] | (table[2 * i + 1] << 8));
        const std::size_t covered = 10 + start[3];  // index, type, length, time, ordinal, payload
        EXPECT_EQ(start[covered] | (start[covered + 1] << 8), bitwiseCrc(start, covered)) << "record " << i;
    }
}

}  // namespace
