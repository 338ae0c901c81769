// Time conversion and the binary datalog encoding.
#include <cstring>
#include <set>

#include "fixture.h"

using namespace varnel::sim;

namespace {

TIME_REC timeRec(int y, int mo, int d, int h = 0, int mi = 0, int s = 0) {
    TIME_REC t{};
    t.year = std::int16_t(y), t.mon = std::int16_t(mo), t.mday = std::int16_t(d);
    t.hour = std::int16_t(h), t.min = std::int16_t(mi), t.sec = std::int16_t(s);
    return t;
}

bool sameRecord(const RECORD_DATA& a, const RECORD_DATA& b) { return std::memcmp(&a, &b, sizeof a) == 0; }

RECORD_DATA glucose(std::int16_t reading, std::int16_t ordinal) {
    RECORD_DATA r{};
    r.timeStamp = secondsOf(2008, 1, 1) + ordinal;
    r.Ordinal = ordinal;
    r.reading = reading;
    return r;
}

}  // namespace

TEST(TimeConversion, ExactInversesAcrossTheMetersRange) {
    std::int32_t previous = -1;
    for (std::int32_t s = secondsOf(1990, 1, 1); s <= secondsOf(2026, 12, 31, 23, 59, 59); s += 86400 / 4 + 7) {
        TIME_REC t{};
        ASSERT_EQ(convert_from_seconds(s, &t), ME_SUCCESS);
        ASSERT_EQ(convert_to_seconds(&t), s);
        ASSERT_GT(s, previous);
        previous = s;
    }
}

TEST(TimeConversion, FillsWeekdayAndYearDay) {
    TIME_REC t = timeRec(2000, 1, 1);
    ASSERT_EQ(convert_from_seconds(convert_to_seconds(&t), &t), ME_SUCCESS);
    EXPECT_EQ(t.wday, 6);  // a Saturday
    EXPECT_EQ(t.yday, 0);
    t = timeRec(2004, 12, 31, 23, 59, 59);
    ASSERT_EQ(convert_from_seconds(convert_to_seconds(&t), &t), ME_SUCCESS);
    EXPECT_EQ(t.yday, 365);  // leap year
    EXPECT_EQ(t.wday, 5);
    EXPECT_EQ(t.hour, 23);
    EXPECT_EQ(t.isdst, 0);
}

TEST(TimeConversion, RejectsInvalidRecordsAndNegativeSeconds) {
    for (TIME_REC t : {timeRec(2005, 2, 29), timeRec(2005, 13, 1), timeRec(2005, 1, 1, 24),
                       timeRec(2005, 1, 1, 0, 60), timeRec(1969, 12, 31), timeRec(2038, 12, 31)})
        EXPECT_EQ(convert_to_seconds(&t), -1) << t.year << "-" << t.mon << "-" << t.mday;
    TIME_REC t = timeRec(2004, 2, 29);
    EXPECT_NE(convert_to_seconds(&t), -1);
    EXPECT_EQ(convert_from_seconds(-5, &t), ME_BAD_PARAMETER);
    EXPECT_EQ(t.mday, 29);  // untouched
}

TEST(BinaryDatalog, DefaultMeterLogDecodesRecordByRecordWithEveryKnownType) {
    const MeterProfile p = defaultProfile(7);
    auto log = std::make_unique<METER_BIN_DATALOG>();
    encodeBinaryDatalog(p.binaryDatalog, *log);
    ASSERT_EQ(log->recordCount, std::int16_t(p.binaryDatalog.size()));
    std::set<int> types;
    for (int i = 0; i < log->recordCount; ++i) {
        RECORD_DATA r{};
        ASSERT_EQ(GetMeterDatalogRecordData(log.get(), std::int16_t(i), &r), ME_SUCCESS) << i;
        ASSERT_TRUE(sameRecord(r, p.binaryDatalog[std::size_t(i)])) << "record " << i;
        types.insert(r.recType);
        if (r.recType == 20 && r.mealSegment == 4) types.insert(-4);  // alcohol
        if (r.recType == 36 && r.height == -1.0) types.insert(-36);   // missing height
    }
    EXPECT_EQ(types, (std::set<int>{-36, -4, 0, 10, 11, 12, 13, 20, 21, 30, 31, 32, 33, 34, 35, 36, 37, 38, 45, 52}));
}

TEST(BinaryDatalog, FillsTheWholeBufferAndRefusesOneRecordMore) {
    std::vector<RECORD_DATA> records;
    while (encodedSize(records) + encodedSize({glucose(0, 0)}) - encodedSize({}) <= sizeof(METER_BIN_DATALOG::binBuf))
        records.push_back(glucose(std::int16_t(40 + records.size() % 500), std::int16_t(records.size())));
    auto log = std::make_unique<METER_BIN_DATALOG>();
    encodeBinaryDatalog(records, *log);
    EXPECT_GT(encodedSize(records), sizeof(log->binBuf) - 30);
    RECORD_DATA last{};
    ASSERT_EQ(decodeBinaryRecord(*log, log->recordCount - 1, last), ME_SUCCESS);
    EXPECT_TRUE(sameRecord(last, records.back()));

    records.push_back(glucose(99, 0));
    EXPECT_THROW(encodeBinaryDatalog(records, *log), std::length_error);
}

TEST(BinaryDatalog, RefusesValuesItCannotHoldExactly) {
    RECORD_DATA flagged = glucose(100, 1);
    flagged.stressFlag = 300;
    RECORD_DATA dose{};
    dose.recType = 11;
    dose.insulinDosage = 2.125;
    auto log = std::make_unique<METER_BIN_DATALOG>();
    try {
        encodeBinaryDatalog({glucose(1, 1), flagged}, *log);
        FAIL();
    } catch (const std::invalid_argument& e) {
        EXPECT_NE(std::string(e.what()).find("record 1"), std::string::npos) << e.what();
        EXPECT_NE(std::string(e.what()).find("stressFlag"), std::string::npos) << e.what();
    }
    EXPECT_THROW(encodeBinaryDatalog({dose}, *log), std::invalid_argument);
    dose.insulinDosage = -1.0;  // a missing value is held
    dose.carbs = 5;             // but not a value the type does not carry
    EXPECT_THROW(encodeBinaryDatalog({dose}, *log), std::invalid_argument);
    dose.carbs = 0;
    EXPECT_NO_THROW(encodeBinaryDatalog({dose}, *log));
}

TEST(BinaryDatalog, CorruptedRecordFailsAloneAndBadIndexesAreRefused) {
    RECORD_DATA unknown{};
    unknown.recType = 99;  // a type the table does not know keeps its time and ordinal
    unknown.timeStamp = 123456;
    unknown.Ordinal = 4;
    std::vector<RECORD_DATA> records{glucose(101, 1), glucose(102, 2), glucose(103, 3), unknown};
    auto log = std::make_unique<METER_BIN_DATALOG>();
    encodeBinaryDatalog(records, *log);
    corruptBinaryRecord(*log, 1);
    RECORD_DATA r{};
    r.reading = 777;
    EXPECT_EQ(GetMeterDatalogRecordData(log.get(), 1, &r), ME_CHKSUM_ERROR);
    EXPECT_EQ(r.reading, 777);  // nothing decoded
    for (int i : {0, 2, 3}) {
        ASSERT_EQ(decodeBinaryRecord(*log, i, r), ME_SUCCESS);
        EXPECT_TRUE(sameRecord(r, records[std::size_t(i)]));
    }
    EXPECT_EQ(decodeBinaryRecord(*log, 4, r), ME_BAD_PARAMETER);
    EXPECT_EQ(decodeBinaryRecord(*log, -1, r), ME_BAD_PARAMETER);
    EXPECT_EQ(GetMeterDatalogRecordData(nullptr, 0, &r), ME_BAD_PARAMETER);

    // An offset pointing at another sound record is caught too.
    std::swap(log->binBuf[4], log->binBuf[8]);
    std::swap(log->binBuf[5], log->binBuf[9]);
    EXPECT_EQ(decodeBinaryRecord(*log, 0, r), ME_VALIDATION_ERROR);
    auto empty = std::make_unique<METER_BIN_DATALOG>();
    empty->recordCount = 1;
    EXPECT_EQ(decodeBinaryRecord(*empty, 0, r), ME_VALIDATION_ERROR);
}
