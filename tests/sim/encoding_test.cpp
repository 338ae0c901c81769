// Time conversion and the binary datalog encoding.
#include <gmock/gmock.h>

#include "fixture.h"

using namespace varnel::sim;
using ::testing::AllOf;
using ::testing::HasSubstr;

namespace {

TIME_REC timeRec(int y, int mo, int d, int h = 0, int mi = 0, int s = 0) {
    using I = std::int16_t;
    return TIME_REC{I(s), I(mi), I(h), I(d), I(mo), I(y), 0, 0, 0};
}

// CRC-16/CCITT (polynomial 0x1021, start 0xFFFF) bit by bit, as another reader of the layout computes it.
std::uint16_t bitwiseCrc(const std::uint8_t* p, std::size_t n) {
    std::uint16_t crc = 0xFFFF;
    while (n--) {
        crc ^= static_cast<std::uint16_t>(*p++ << 8);
        for (int bit = 0; bit < 8; ++bit) crc = static_cast<std::uint16_t>(crc & 0x8000 ? (crc << 1) ^ 0x1021 : crc << 1);
    }
    return crc;
}

bool same(const RECORD_DATA& a, const RECORD_DATA& b) { return std::memcmp(&a, &b, sizeof a) == 0; }

RECORD_DATA glucose(std::int16_t reading, std::int16_t ordinal) {
    RECORD_DATA r{};
    r.timeStamp = secondsOf(2008, 1, 1) + ordinal, r.Ordinal = ordinal, r.reading = reading;
    return r;
}

}  // namespace

TEST(TimeConversion, ExactInversesWithWeekdayAndYearDayWithinTheValidRange) {
    for (std::int32_t s = secondsOf(1990, 1, 1); s <= secondsOf(2026, 12, 31, 23, 59, 59); s += 86400 / 4 + 7) {
        TIME_REC t{};
        ASSERT_EQ(convert_from_seconds(s, &t), ME_SUCCESS);
        ASSERT_EQ(convert_to_seconds(&t), s);
    }
    const std::tuple<TIME_REC, int, int> days[] = {{timeRec(2000, 1, 1), 6, 0},  // a Saturday
                                                   {timeRec(2004, 12, 31, 23, 59, 59), 5, 365}};
    for (auto [t, wday, yday] : days) {
        TIME_REC back{};
        back.isdst = 1;
        ASSERT_EQ(convert_from_seconds(convert_to_seconds(&t), &back), ME_SUCCESS);
        EXPECT_EQ(std::tuple(back.wday, back.yday, back.isdst), std::tuple(wday, yday, 0)) << t.year;
    }

    // Invalid records and negative seconds are refused.
    for (TIME_REC t : {timeRec(2005, 2, 29), timeRec(2005, 13, 1), timeRec(2005, 1, 1, 24), timeRec(2005, 1, 1, 0, 60),
                       timeRec(1969, 12, 31), timeRec(2038, 12, 31)})
        EXPECT_EQ(convert_to_seconds(&t), -1) << t.year << "-" << t.mon << "-" << t.mday;
    TIME_REC t = timeRec(2004, 2, 29);
    EXPECT_NE(convert_to_seconds(&t), -1);
    EXPECT_EQ(convert_from_seconds(-5, &t), ME_BAD_PARAMETER);
    EXPECT_EQ(t.mday, 29);  // untouched
}

// Each record decodes as written and carries its checksum over index..payload.
TEST(BinaryDatalog, DefaultMeterLogDecodesRecordByRecord) {
    const std::uint8_t check[] = {'1', '2', '3', '4', '5', '6', '7', '8', '9'};
    ASSERT_EQ(bitwiseCrc(check, sizeof check), 0x29B1);  // the reference value of this CRC
    const MeterProfile p = defaultProfile(7);
    auto log = std::make_unique<METER_BIN_DATALOG>();
    encodeBinaryDatalog(p.binaryDatalog, *log);
    ASSERT_EQ(log->recordCount, std::int16_t(p.binaryDatalog.size()));
    const std::uint8_t* table = log->binBuf + 4;
    for (int i = 0; i < log->recordCount; ++i) {
        RECORD_DATA r{};
        ASSERT_EQ(GetMeterDatalogRecordData(log.get(), std::int16_t(i), &r), ME_SUCCESS) << i;
        ASSERT_TRUE(same(r, p.binaryDatalog[std::size_t(i)])) << "record " << i;
        const std::uint8_t* start = log->binBuf + (table[2 * i] | (table[2 * i + 1] << 8));
        const std::size_t covered = 10 + start[3];  // index, type, length, time, ordinal, payload
        EXPECT_EQ(start[covered] | (start[covered + 1] << 8), bitwiseCrc(start, covered)) << "record " << i;
    }
}

TEST(BinaryDatalog, FillsTheWholeBufferAndRefusesWhatItCannotHold) {
    std::vector<RECORD_DATA> records;
    const std::size_t one = encodedSize({glucose(0, 0)}) - encodedSize({});
    while (encodedSize(records) + one <= sizeof(METER_BIN_DATALOG::binBuf))
        records.push_back(glucose(std::int16_t(40 + records.size() % 500), std::int16_t(records.size())));
    auto log = std::make_unique<METER_BIN_DATALOG>();
    encodeBinaryDatalog(records, *log);
    RECORD_DATA last{};
    ASSERT_EQ(decodeBinaryRecord(*log, log->recordCount - 1, last), ME_SUCCESS);
    EXPECT_TRUE(same(last, records.back()));
    records.push_back(glucose(99, 0));
    EXPECT_THROW(encodeBinaryDatalog(records, *log), std::length_error);

    // Values it cannot hold exactly are refused, naming the record.
    RECORD_DATA flagged = glucose(100, 1), fraction{}, foreign{}, missing{};
    flagged.stressFlag = 300;                                           // beyond one byte
    fraction.recType = VX_REC_INSULIN, fraction.insulinDosage = 2.125;  // more than two decimals
    foreign.recType = VX_REC_INSULIN, foreign.carbs = 5;                // not carried by this type
    missing.recType = VX_REC_INSULIN, missing.insulinDosage = -1.0;     // held: a missing value
    for (const RECORD_DATA& r : {fraction, foreign})
        EXPECT_THROW(encodeBinaryDatalog({r}, *log), std::invalid_argument);
    EXPECT_THAT(
        [&] {
            encodeBinaryDatalog({glucose(1, 1), flagged}, *log);
        },
        ::testing::ThrowsMessage<std::invalid_argument>(AllOf(HasSubstr("record 1"), HasSubstr("stressFlag"))));
    EXPECT_NO_THROW(encodeBinaryDatalog({missing}, *log));
}

TEST(BinaryDatalog, CorruptedRecordFailsAloneAndBadIndexesAreRefused) {
    RECORD_DATA unknown{};
    unknown.recType = 99;  // a type the table does not know keeps its time and ordinal
    unknown.timeStamp = 123456;
    unknown.Ordinal = 4;
    const std::vector<RECORD_DATA> records{glucose(101, 1), glucose(102, 2), glucose(103, 3), unknown};
    auto log = std::make_unique<METER_BIN_DATALOG>();
    encodeBinaryDatalog(records, *log);
    corruptBinaryRecord(*log, 1);
    RECORD_DATA r{};
    r.reading = 777;
    EXPECT_EQ(GetMeterDatalogRecordData(log.get(), 1, &r), ME_CHKSUM_ERROR);
    EXPECT_EQ(r.reading, 777);  // nothing decoded
    for (int i : {0, 2, 3}) {
        ASSERT_EQ(decodeBinaryRecord(*log, i, r), ME_SUCCESS);
        EXPECT_TRUE(same(r, records[std::size_t(i)])) << i;
    }
    for (int i : {4, -1}) EXPECT_EQ(decodeBinaryRecord(*log, i, r), ME_BAD_PARAMETER) << i;
    EXPECT_EQ(GetMeterDatalogRecordData(nullptr, 0, &r), ME_BAD_PARAMETER);

    // An offset pointing at another sound record is caught too, and so is a buffer without a header.
    std::swap(log->binBuf[4], log->binBuf[8]);
    std::swap(log->binBuf[5], log->binBuf[9]);
    EXPECT_EQ(decodeBinaryRecord(*log, 0, r), ME_VALIDATION_ERROR);
    auto empty = std::make_unique<METER_BIN_DATALOG>();
    empty->recordCount = 1;
    EXPECT_EQ(decodeBinaryRecord(*empty, 0, r), ME_VALIDATION_ERROR);
}
