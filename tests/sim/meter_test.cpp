// The simulated meter as the component meets it: identification, options,
// clock, refusals and the datalogs (the type-7 tables are met through the
// settings groups and the settings requests).
#include <algorithm>

#include "fixture.h"

using namespace varnel::sim;
using simtest::SimTest;
using simtest::text;

using MeterIdentification = SimTest;

TEST_F(MeterIdentification, AnswersOnItsPortWhileAttachedAndCloseReleasesThePort) {
    std::int16_t elsewhere[11] = {2, 3}, afterEnd[11] = {0, 1}, listed[11] = {4, 1};
    EXPECT_EQ(find_meter(&rec, found, elsewhere), ME_NO_DEVICE);
    EXPECT_EQ(find_meter(&rec, found, afterEnd), ME_NO_DEVICE);  // the list ends at its first 0
    EXPECT_EQ(rec.M_Type, 0);
    EXPECT_FALSE(portOpen());
    ASSERT_EQ(find_meter(&rec, found, listed), ME_SUCCESS);
    EXPECT_EQ(std::tuple(rec.M_Type, found[0], portOpen()), std::tuple(eMorvex, 1, true));

    rec.Error_code = ME_QUIT;  // an exit code the caller left there survives successes
    EXPECT_EQ(vb_Tickle_Meter(&rec), ME_SUCCESS);
    EXPECT_EQ(rec.Error_code, ME_QUIT);
    EXPECT_EQ(close_meter(&rec), ME_SUCCESS);
    EXPECT_LE(rec.port.Id, 0);
    EXPECT_FALSE(portOpen());
    detach();
    EXPECT_EQ(vb_Chk4Meter(&rec), ME_NO_DEVICE);
    attach();
    METER_REC other = rec;
    other.port.com_number = 2;
    EXPECT_EQ(vb_Chk4Meter(&other), ME_NO_DEVICE);
    rec.M_Type = 3;
    ASSERT_EQ(vb_Chk4Meter(&rec), ME_SUCCESS);
    EXPECT_EQ(rec.M_Type, eMorvex);  // the meter says what it is
    EXPECT_TRUE(rec.port.Id > 0 && portOpen());
}

using MeterSettings = SimTest;

// Every option of every type: a writable one reads back what was set, through the single
// and the bulk read; a read-only one refuses the write; one the meter lacks refuses the read.
TEST_F(MeterSettings, EveryOptionSetThenReadBack) {
    for (int type = 1; type <= 8; ++type) {
        connect(type);
        const MeterProfile p = meter();
        for (std::int16_t o = 0; o < kOptionCount; ++o) {
            SCOPED_TRACE(std::to_string(type) + " option " + std::to_string(o));
            const OptionEntry& e = p.options[std::size_t(o)];
            std::int16_t v = e.value == e.max ? e.min : e.max;
            if (o == eLanguage && e.availability == 2) v = p.languages[p.languages.front() == e.value ? 1 : 0];
            const std::int16_t set = vb_Set_Meter_Option(&rec, o, v);
            METER_REC single = rec, bulk = rec;
            std::memset(&single.Setting, 0, sizeof single.Setting);
            std::memset(&bulk.Setting, 0, sizeof bulk.Setting);
            EXPECT_EQ(vb_Read_Meter_Option(&single, o), e.availability ? ME_SUCCESS : ME_NOT_SUPPORTED);
            ASSERT_EQ(vb_Read_Meter_Options(&bulk), ME_SUCCESS);
            EXPECT_EQ(set, e.availability == 2 ? ME_SUCCESS : ME_NOT_SUPPORTED);
            const std::int16_t now = e.availability == 2 ? v : e.value;
            if (e.availability) {
                EXPECT_EQ(std::tuple(single.Setting.nValue[o], bulk.Setting.nValue[o]), std::tuple(now, now));
                EXPECT_EQ(meter().options[std::size_t(o)].value, now);
            }
        }
    }

    // Several at once: all or none.
    connect(7);
    SETTINGS_REC s{};
    s.Availability[eBeepStatus] = 2, s.nValue[eBeepStatus] = 1;
    s.Availability[eEvevtAveraging] = 2, s.nValue[eEvevtAveraging] = 9;  // beyond 0..4
    s.Availability[eUnits] = 1, s.nValue[eUnits] = 1;                    // left as the meter has it
    EXPECT_EQ(vb_Set_Meter_Options(&rec, &s), ME_BAD_PARAMETER);
    EXPECT_EQ(meter().options[eBeepStatus].value, 0);
    s.nValue[eEvevtAveraging] = 4;
    ASSERT_EQ(vb_Set_Meter_Options(&rec, &s), ME_SUCCESS);
    const auto o = meter().options;
    EXPECT_EQ(std::tuple(o[eBeepStatus].value, o[eEvevtAveraging].value, o[eUnits].value), std::tuple(1, 4, 0));
}

// The clock hook is the library's only time source: another clock handed over
// continues the meter clock from the time last read, and half a hook is no clock at all.
TEST_F(MeterSettings, TheMeterClockFollowsWhicheverClockTheCallerHandsOver) {
    connect(7);
    const std::int32_t t = secondsOf(2010, 7, 4, 12, 0, 0);
    ASSERT_EQ(vb_Set_Meter_Clock(&rec, t), ME_SUCCESS);
    const auto read = [&] {
        std::int32_t seconds = 0;
        EXPECT_EQ(vb_Read_Meter_Clock(&rec, &seconds), ME_SUCCESS);
        return seconds - t;
    };
    clock->advance(2000);
    EXPECT_EQ(read(), 2);
    std::uint32_t other = 7'000'000;  // far ahead of the test's clock
    const vx_tick_fn tick = [](void* c) { return *static_cast<std::uint32_t*>(c); };
    const vx_sleep_fn sleep = [](void* c, std::uint32_t ms) { *static_cast<std::uint32_t*>(c) += ms; };
    vx_set_clock_hook(tick, sleep, &other);
    EXPECT_EQ(read(), 2);
    other += 3000;
    clock->advance(60000);  // no longer the library's clock
    EXPECT_EQ(read(), 5);
    const std::uint32_t before = other;
    EXPECT_EQ(vb_Clear_Meter_Datalog(&rec), ME_SUCCESS);  // waits on the hook's clock
    EXPECT_GE(other - before, 1500u);
    const std::int32_t held = read();
    vx_set_clock_hook(tick, nullptr, &other);  // refused: the library's own clock again
    other += 9000;
    EXPECT_EQ(read(), held);
}

TEST_F(MeterSettings, RefusalsChangeNothing) {
    connect(7);
    INSULIN_OR_ORAL_MED_NAME_TYPE fixed{10, 0, {'X'}}, pastInsulins{22, 0, {}}, fixedPill{5, 0, {'X'}}, none{0, 0, {}};
    PREDEFINED_INSULINS_TYPE beyondFavourites{{0, 0, 22}};
    MEAL_SEGMENTS_TYPE late{{0, 0, 0, 0, 0, 0, 96}};
    const MeterProfile before = meter();
    const std::vector<int> bad = {vb_Set_Meter_Option(&rec, eUnits, 2),
                                  vb_Set_Meter_Option(&rec, eLanguage, 6),  // not in its language map
                                  vb_Set_Meter_Option(&rec, 19, 0),
                                  vb_Set_Meter_Clock(&rec, secondsOf(2021, 1, 1)),
                                  vb_Read_Meter_Clock(&rec, nullptr),
                                  SetInsulinName(&rec, &fixed),
                                  GetInsulinName(&rec, &pastInsulins),
                                  SetOralMedicationName(&rec, &fixedPill),
                                  GetOralMedicationName(&rec, &none),
                                  SetPredefinedInsulins(&rec, &beyondFavourites),
                                  SetMealSegments(&rec, &late),
                                  SetTargetRange(&rec, 150, 140, 90, 200, 55),  // low above high
                                  SetTargetRange(&rec, 65, 140, 90, 200, 95),
                                  SetScheduleSelection(&rec, 2),
                                  SetInitializedFlag(&rec, 2)};
    EXPECT_EQ(bad, std::vector<int>(bad.size(), ME_BAD_PARAMETER));
    EXPECT_EQ(vb_Set_Meter_Option(&rec, eCommunicationRate, 0), ME_NOT_SUPPORTED);
    EXPECT_EQ(vb_Read_Meter_Option(&rec, eDayAverage), ME_NOT_SUPPORTED);
    EXPECT_EQ(rec.Error_code, ME_NOT_SUPPORTED);
    EXPECT_EQ(meter(), before);

    connect(4);  // its units are read-only; only the type-7 meter keeps medication tables
    std::int16_t v = 0;
    EXPECT_EQ((std::vector<int>{vb_Set_Meter_Option(&rec, eUnits, 1), GetScheduleSelection(&rec, &v),
                                GetInitializedFlag(&rec, &v)}),
              std::vector<int>(3, ME_NOT_SUPPORTED));
}

using MeterDatalog = SimTest;

TEST_F(MeterDatalog, FullRecordMemoryArrivesProgressivelyAndClearEmptiesIt) {
    MeterProfile p = defaultProfile(5);
    p.datalog.resize(255, p.datalog.back());
    p.identitySerial = "00";  // this meter tells its serial number only with an upload
    loadProfile(p);
    ASSERT_EQ(find_meter(&rec, found, ports), ME_SUCCESS);
    EXPECT_EQ(text(rec.Serial_number), "00");
    auto log = std::make_unique<METER_DATALOG>();
    std::vector<std::int16_t> valid;
    onYield([&] { valid.push_back(log->ValidRecordCount); });
    ASSERT_EQ(vb_Upload_Meter_Datalog(&rec, log.get()), ME_SUCCESS);
    ASSERT_GT(valid.size(), 20u);
    EXPECT_TRUE(std::is_sorted(valid.begin(), valid.end()));
    EXPECT_LT(valid[valid.size() / 2], log->ValidRecordCount);

    ASSERT_EQ(log->recordCount, 255);
    EXPECT_EQ(log->maxRecordsForMeter, p.maxRecords);
    EXPECT_EQ(log->ValidRecordCount,
              std::count_if(p.datalog.begin(), p.datalog.end(), [](const data_rec& e) { return e.Valid == 0; }));
    EXPECT_EQ(std::memcmp(log->DataLog, p.datalog.data(), 255 * sizeof(data_rec)), 0);
    EXPECT_EQ(text(rec.Serial_number), "TLV5002317");
    EXPECT_EQ(rec.Meter_upload_time, meter().clock);  // the meter clock when the upload ended

    // Clearing takes its own wire time and leaves nothing to upload.
    const std::uint32_t start = clock->tickCount();
    ASSERT_EQ(vb_Clear_Meter_Datalog(&rec), ME_SUCCESS);
    EXPECT_GE(clock->tickCount() - start, 1000u);
    EXPECT_EQ(rec.Percent_done, 100);
    ASSERT_EQ(vb_Upload_Meter_Datalog(&rec, log.get()), ME_SUCCESS);
    EXPECT_EQ(log->recordCount, 0);
    auto bin = std::make_unique<METER_BIN_DATALOG>();
    EXPECT_EQ(GetMeterDatalog(&rec, bin.get(), 0), ME_NOT_SUPPORTED);
    p.datalog.push_back(p.datalog.front());  // one more than the memory holds
    EXPECT_THROW(loadProfile(p), std::invalid_argument);
}

TEST_F(MeterDatalog, BinaryUploadOfTheDefaultMeterTakesAboutTwoSeconds) {
    connect(7);
    MeterProfile p = meter();
    p.corruptedRecords = {5};
    loadProfile(p);
    auto log = std::make_unique<METER_BIN_DATALOG>();
    const std::uint32_t start = clock->tickCount();
    ASSERT_EQ(GetMeterDatalog(&rec, log.get(), 0), ME_SUCCESS);
    const std::uint32_t ms = clock->tickCount() - start;
    EXPECT_TRUE(ms > 1500u && ms < 2500u) << ms;
    // The damaged record is counted, not delivered: the records after it move up.
    ASSERT_EQ(log->recordCount, std::int16_t(p.binaryDatalog.size() - 1));
    EXPECT_EQ(std::tuple(log->corruptedCount, log->maxRecordsForMeter), std::tuple(1, 1000));
    RECORD_DATA r4{}, r5{};
    ASSERT_EQ(GetMeterDatalogRecordData(log.get(), 4, &r4), ME_SUCCESS);
    ASSERT_EQ(GetMeterDatalogRecordData(log.get(), 5, &r5), ME_SUCCESS);
    EXPECT_EQ(std::tuple(r4.Ordinal, r5.Ordinal), std::tuple(5, 7));

    // Only the records from the start time on.
    const std::int32_t from = p.binaryDatalog[100].timeStamp;
    ASSERT_EQ(GetMeterDatalog(&rec, log.get(), from), ME_SUCCESS);
    EXPECT_EQ(log->recordCount, std::count_if(p.binaryDatalog.begin(), p.binaryDatalog.end(),
                                              [&](const RECORD_DATA& x) { return x.timeStamp >= from; }));
}
