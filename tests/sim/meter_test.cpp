// The simulated meter as the component meets it: identification, options,
// clock, the type-7 tables and the datalogs.
#include <algorithm>
#include <cstring>
#include <regex>
#include <set>

#include "fixture.h"

using namespace varnel::sim;
using simtest::SimTest;

namespace {

std::string text(const std::uint8_t* bytes, std::size_t n) {
    return std::string(reinterpret_cast<const char*>(bytes), strnlen(reinterpret_cast<const char*>(bytes), n));
}

// Options each type offers, as its documents list them.
const std::set<int> kOffered[] = {
    {0, 1, 2, 3, 4, 5, 6, 7, 8, 9},  {0, 1, 2, 3, 4, 5, 6, 10, 11}, {0, 1, 2, 4, 5, 6, 12, 13}, {2},
    {0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 14, 15}, {2, 5}, {0, 1, 2, 4, 5, 6, 10, 16, 17, 18}, {2, 5},
};

}  // namespace

using MeterIdentification = SimTest;

TEST_F(MeterIdentification, FindsTheMeterOnlyOnItsPort) {
    std::int32_t found[11] = {};
    std::int16_t elsewhere[11] = {2, 3};
    EXPECT_EQ(find_meter(&rec, found, elsewhere), ME_NO_DEVICE);
    EXPECT_EQ(rec.Error_code, ME_NO_DEVICE);
    EXPECT_EQ(rec.M_Type, 0);
    std::int16_t afterEnd[11] = {0, 1};
    EXPECT_EQ(find_meter(&rec, found, afterEnd), ME_NO_DEVICE);
    EXPECT_FALSE(portOpen());

    std::int16_t ports[11] = {4, 1};
    ASSERT_EQ(find_meter(&rec, found, ports), ME_SUCCESS);
    EXPECT_EQ(rec.M_Type, eMorvex);
    EXPECT_EQ(text(rec.Serial_number, 20), "MVX7001184");
    EXPECT_EQ(rec.port.com_number, 1);
    EXPECT_GT(rec.port.Id, 0);
    EXPECT_EQ(found[0], 1);
    EXPECT_TRUE(portOpen());
}

TEST_F(MeterIdentification, PreparesTheRecordAsEachTypeHasIt) {
    const std::regex firmware(R"([A-Z0-9]+ (0[1-9]|1[0-2])/\d\d/\d\d)");
    for (int type = 1; type <= 8; ++type) {
        SCOPED_TRACE(type);
        connect(type);
        ASSERT_EQ(vb_Get_Meter_Firmware(&rec), ME_SUCCESS);
        EXPECT_TRUE(std::regex_match(text(rec.Firmware_number, 20), firmware)) << text(rec.Firmware_number, 20);
        EXPECT_GE(text(rec.Serial_number, 20).size(), 10u);
        for (int i = 0; i < 22; ++i) {
            EXPECT_EQ(rec.Setting.Availability[i] != 0, kOffered[type - 1].count(i) == 1) << "option " << i;
            if (rec.Setting.Availability[i]) {
                EXPECT_TRUE(rec.Setting.nValue[i] >= rec.Setting.nValue_min[i] &&
                            rec.Setting.nValue[i] <= rec.Setting.nValue_max[i]);
            }
        }
        EXPECT_EQ(rec.langMap.numLanguages > 0, kOffered[type - 1].count(eLanguage) == 1);
        EXPECT_EQ(rec.Checkstrip_range_upper_limit > 0, type == 1 || type == 2 || type == 5);
        EXPECT_LT(rec.Lower_glucose_report_level, rec.Upper_glucose_report_level);
        EXPECT_EQ(rec.Upper_glucose_error_level, type == 3 ? 768 : 1023);
        TIME_REC first{}, last{};
        convert_from_seconds(rec.Time_min, &first);
        convert_from_seconds(rec.Time_max, &last);
        const int years[][2] = {{1990, 2014}, {1992, 2022}, {1992, 2022}, {1997, 2015},
                                {1996, 2026}, {2000, 2020}, {2000, 2020}, {2000, 2020}};
        EXPECT_EQ(first.year, years[type - 1][0]);
        EXPECT_EQ(last.year, years[type - 1][1]);
    }
    // Preparing for another type gives that type's tables, not yet read from a meter.
    ASSERT_EQ(initialize_meter_type_structure(&rec, eCVTolvoMeter), ME_SUCCESS);
    EXPECT_EQ(rec.Setting.Availability[eDaylightSavings], 2);
    EXPECT_EQ(rec.Setting.Status[eUnits], 0);
    EXPECT_EQ(initialize_meter_type_structure(&rec, 9), ME_BAD_PARAMETER);
}

TEST_F(MeterIdentification, CheckAnswersOnlyWhileAttachedAndCloseReleasesThePort) {
    connect();
    rec.Error_code = ME_QUIT;  // an exit code the caller left there survives successes
    EXPECT_EQ(vb_Tickle_Meter(&rec), ME_SUCCESS);
    EXPECT_EQ(vb_Chk4Meter(&rec), ME_SUCCESS);
    EXPECT_EQ(rec.Error_code, ME_QUIT);
    EXPECT_EQ(close_meter(&rec), ME_SUCCESS);
    EXPECT_LE(rec.port.Id, 0);
    EXPECT_FALSE(portOpen());

    detach();
    EXPECT_EQ(vb_Chk4Meter(&rec), ME_NO_DEVICE);
    EXPECT_EQ(rec.Error_code, ME_NO_DEVICE);
    EXPECT_EQ(vb_Read_Meter_Options(&rec), ME_NO_DEVICE);
    attach();
    METER_REC other = rec;
    other.port.com_number = 2;
    EXPECT_EQ(vb_Chk4Meter(&other), ME_NO_DEVICE);
    rec.M_Type = 3;
    EXPECT_EQ(vb_Chk4Meter(&rec), ME_SUCCESS);
    EXPECT_EQ(rec.M_Type, eMorvex);  // the meter says what it is
    EXPECT_GT(rec.port.Id, 0);
}

using MeterSettings = SimTest;

TEST_F(MeterSettings, WrittenOptionReadsBackAndRefusalsChangeNothing) {
    connect(1);
    ASSERT_EQ(vb_Set_Meter_Option(&rec, eCommunicationRate, 3), ME_SUCCESS);
    METER_REC fresh = rec;
    std::memset(&fresh.Setting, 0, sizeof fresh.Setting);
    ASSERT_EQ(vb_Read_Meter_Options(&fresh), ME_SUCCESS);
    EXPECT_EQ(fresh.Setting.nValue[eCommunicationRate], 3);
    EXPECT_EQ(fresh.Setting.Status[eCommunicationRate], 1);
    ASSERT_EQ(vb_Read_Meter_Option(&fresh, eLanguage), ME_SUCCESS);

    const MeterProfile before = meter();
    EXPECT_EQ(vb_Set_Meter_Option(&rec, eUnits, 2), ME_BAD_PARAMETER);
    EXPECT_EQ(vb_Set_Meter_Option(&rec, eLanguage, 6), ME_BAD_PARAMETER);  // not in its language map
    EXPECT_EQ(vb_Set_Meter_Option(&rec, eInsulinPumpUse, 1), ME_NOT_SUPPORTED);
    EXPECT_EQ(vb_Set_Meter_Option(&rec, 19, 0), ME_BAD_PARAMETER);
    EXPECT_EQ(vb_Read_Meter_Option(&rec, eDayAverage), ME_NOT_SUPPORTED);
    EXPECT_EQ(rec.Error_code, ME_NOT_SUPPORTED);
    EXPECT_EQ(meter().options, before.options);

    connect(5);  // its baud rate is read-only
    EXPECT_EQ(vb_Set_Meter_Option(&rec, eCommunicationRate, 0), ME_NOT_SUPPORTED);
}

TEST_F(MeterSettings, SetOptionsWritesAllMarkedValuesOrNone) {
    connect(7);
    SETTINGS_REC s{};
    s.Availability[eBeepStatus] = 2, s.nValue[eBeepStatus] = 1;
    s.Availability[eEvevtAveraging] = 2, s.nValue[eEvevtAveraging] = 9;  // beyond 0..4
    s.Availability[eUnits] = 1, s.nValue[eUnits] = 1;                   // left as the meter has it
    EXPECT_EQ(vb_Set_Meter_Options(&rec, &s), ME_BAD_PARAMETER);
    EXPECT_EQ(meter().options[eBeepStatus].value, 0);

    s.nValue[eEvevtAveraging] = 4;
    ASSERT_EQ(vb_Set_Meter_Options(&rec, &s), ME_SUCCESS);
    EXPECT_EQ(meter().options[eBeepStatus].value, 1);
    EXPECT_EQ(meter().options[eEvevtAveraging].value, 4);
    EXPECT_EQ(meter().options[eUnits].value, 0);
    EXPECT_EQ(rec.Setting.nValue[eEvevtAveraging], 4);
}

TEST_F(MeterSettings, ClockIsSetWithinTheTypesRangeAndRuns) {
    connect(7);
    const std::int32_t t = secondsOf(2010, 7, 4, 12, 0, 0);
    ASSERT_EQ(vb_Set_Meter_Clock(&rec, t), ME_SUCCESS);
    clock->advance(5400);
    std::int32_t read = 0;
    ASSERT_EQ(vb_Read_Meter_Clock(&rec, &read), ME_SUCCESS);
    EXPECT_EQ(read, t + 5);
    EXPECT_EQ(vb_Set_Meter_Clock(&rec, secondsOf(2021, 1, 1)), ME_BAD_PARAMETER);
    EXPECT_EQ(vb_Read_Meter_Clock(&rec, nullptr), ME_BAD_PARAMETER);
}

TEST_F(MeterSettings, MedicationNamesAreHeldAsBytesAndFixedOnesStay) {
    connect(7);
    INSULIN_OR_ORAL_MED_NAME_TYPE n{};
    n.index = 1;
    ASSERT_EQ(GetInsulinName(&rec, &n), ME_SUCCESS);
    EXPECT_EQ(n.notChangeable, 1);
    EXPECT_EQ(text(n.nameStr, 10), "Regular");

    const std::uint8_t full[10] = {'B', 'a', 's', 'a', 'l', 0xE9, '1', '2', '3', '4'};  // no zero byte
    n = {};
    n.index = 21;
    std::memcpy(n.nameStr, full, 10);
    ASSERT_EQ(SetInsulinName(&rec, &n), ME_SUCCESS);
    INSULIN_OR_ORAL_MED_NAME_TYPE back{};
    back.index = 21;
    ASSERT_EQ(GetInsulinName(&rec, &back), ME_SUCCESS);
    EXPECT_EQ(std::memcmp(back.nameStr, full, 10), 0);
    EXPECT_EQ(back.notChangeable, 0);

    n.index = 10;
    EXPECT_EQ(SetInsulinName(&rec, &n), ME_BAD_PARAMETER);
    n.index = 22;
    EXPECT_EQ(GetInsulinName(&rec, &n), ME_BAD_PARAMETER);
    n.index = 5;
    EXPECT_EQ(SetOralMedicationName(&rec, &n), ME_BAD_PARAMETER);
    n.index = 15;
    EXPECT_EQ(SetOralMedicationName(&rec, &n), ME_SUCCESS);
    EXPECT_EQ(meter().oralMedNames[14].bytes, std::string(reinterpret_cast<const char*>(full), 10));
    EXPECT_EQ(meter().insulinNames[9].bytes, "Premix");
}

TEST_F(MeterSettings, FavouritesScheduleTargetsAndFlagReadBack) {
    connect(7);
    PREDEFINED_INSULINS_TYPE ins{{3, 21, 0}};
    ASSERT_EQ(SetPredefinedInsulins(&rec, &ins), ME_SUCCESS);
    PREDEFINED_ORAL_MEDS_TYPE meds{{15, 0, 0, 0, 2}};
    ASSERT_EQ(SetPredefinedOralMeds(&rec, &meds), ME_SUCCESS);
    ins = {{0, 0, 22}};
    EXPECT_EQ(SetPredefinedInsulins(&rec, &ins), ME_BAD_PARAMETER);
    PREDEFINED_INSULINS_TYPE insBack{};
    PREDEFINED_ORAL_MEDS_TYPE medsBack{};
    ASSERT_EQ(GetPredefinedInsulins(&rec, &insBack), ME_SUCCESS);
    ASSERT_EQ(GetPredefinedOralMeds(&rec, &medsBack), ME_SUCCESS);
    EXPECT_EQ(insBack.InsulinType[1], 21);
    EXPECT_EQ(medsBack.oralMedType[0], 15);
    EXPECT_EQ(medsBack.oralMedType[4], 2);

    // Only the segments sent (non-zero) change.
    MEAL_SEGMENTS_TYPE seg{{0, 0, 50, 0, 0, 0, 0}};
    ASSERT_EQ(SetMealSegments(&rec, &seg), ME_SUCCESS);
    MEAL_SEGMENTS_TYPE segBack{};
    ASSERT_EQ(GetMealSegments(&rec, &segBack), ME_SUCCESS);
    EXPECT_EQ(std::vector<std::int16_t>(segBack.mealSegments, segBack.mealSegments + 7),
              (std::vector<std::int16_t>{24, 36, 50, 54, 70, 80, 88}));
    seg.mealSegments[6] = 96;
    EXPECT_EQ(SetMealSegments(&rec, &seg), ME_BAD_PARAMETER);

    std::int16_t selection = -1;
    ASSERT_EQ(SetScheduleSelection(&rec, 0), ME_SUCCESS);
    ASSERT_EQ(GetScheduleSelection(&rec, &selection), ME_SUCCESS);
    EXPECT_EQ(selection, 0);
    EXPECT_EQ(SetScheduleSelection(&rec, 2), ME_BAD_PARAMETER);

    ASSERT_EQ(SetTargetRange(&rec, 65, 140, 90, 200, 55), ME_SUCCESS);
    std::int16_t v[5] = {};
    ASSERT_EQ(GetTargetRange(&rec, &v[0], &v[1], &v[2], &v[3], &v[4]), ME_SUCCESS);
    EXPECT_EQ(std::vector<std::int16_t>(v, v + 5), (std::vector<std::int16_t>{65, 140, 90, 200, 55}));
    EXPECT_EQ(SetTargetRange(&rec, 150, 140, 90, 200, 55), ME_BAD_PARAMETER);  // low above high
    EXPECT_EQ(SetTargetRange(&rec, 65, 140, 90, 200, 95), ME_BAD_PARAMETER);
    EXPECT_EQ(meter().targets, (TargetLimits{65, 140, 90, 200, 55}));

    std::int16_t flag = -1;
    ASSERT_EQ(SetInitializedFlag(&rec, 0), ME_SUCCESS);
    ASSERT_EQ(GetInitializedFlag(&rec, &flag), ME_SUCCESS);
    EXPECT_EQ(flag, 0);
    EXPECT_EQ(SetInitializedFlag(&rec, 2), ME_BAD_PARAMETER);

    connect(2);  // only the type-7 meter keeps these tables
    EXPECT_EQ(GetScheduleSelection(&rec, &selection), ME_NOT_SUPPORTED);
    EXPECT_EQ(GetInitializedFlag(&rec, &flag), ME_NOT_SUPPORTED);
}

using MeterDatalog = SimTest;

TEST_F(MeterDatalog, RecordUploadTakesWireTimeAndArrivesProgressively) {
    connect(5);
    setIdentitySerial("00");  // this meter tells its serial number only with an upload
    ASSERT_EQ(vb_Chk4Meter(&rec), ME_SUCCESS);
    EXPECT_EQ(text(rec.Serial_number, 20), "00");

    struct Seen {
        METER_REC* rec;
        METER_DATALOG* log;
        std::vector<std::int16_t> valid, percent;
    };
    auto log = std::make_unique<METER_DATALOG>();
    Seen seen{&rec, log.get(), {}, {}};
    vx_set_yield_hook([](void* c) {
        auto* s = static_cast<Seen*>(c);
        s->valid.push_back(s->log->ValidRecordCount);
        s->percent.push_back(s->rec->Percent_done);
    }, &seen);
    const std::uint32_t start = clock->tickCount();
    ASSERT_EQ(vb_Upload_Meter_Datalog(&rec, log.get()), ME_SUCCESS);

    const MeterProfile m = meter();
    const std::uint32_t expectedMs = std::uint32_t((32 + 16 * m.datalog.size()) * 10 * 1000 / 9600);
    EXPECT_EQ(clock->tickCount() - start, expectedMs);
    ASSERT_GT(seen.valid.size(), 20u);
    EXPECT_TRUE(std::is_sorted(seen.valid.begin(), seen.valid.end()));
    EXPECT_TRUE(std::is_sorted(seen.percent.begin(), seen.percent.end()));
    EXPECT_LT(seen.valid[seen.valid.size() / 2], log->ValidRecordCount);
    EXPECT_EQ(seen.percent.back(), 100);

    ASSERT_EQ(log->recordCount, std::int16_t(m.datalog.size()));
    EXPECT_EQ(log->maxRecordsForMeter, m.maxRecords);
    EXPECT_EQ(log->ValidRecordCount,
              std::count_if(m.datalog.begin(), m.datalog.end(), [](const data_rec& e) { return e.Valid == 0; }));
    EXPECT_LT(log->ValidRecordCount, log->recordCount);
    EXPECT_EQ(std::memcmp(log->DataLog, m.datalog.data(), m.datalog.size() * sizeof(data_rec)), 0);
    EXPECT_EQ(text(rec.Serial_number, 20), "TLV5002317");
    EXPECT_EQ(rec.Meter_upload_time, m.clock);
}

TEST_F(MeterDatalog, DefaultRecordDatalogsHoldEveryKindOfEntry) {
    for (int type : {1, 2, 3, 4, 5, 6, 8}) {
        SCOPED_TRACE(type);
        const MeterProfile p = defaultProfile(type);
        std::set<std::pair<int, int>> kinds;  // D_Type and blood-test type, errors as (1, -3)
        for (const data_rec& e : p.datalog)
            kinds.insert({e.D_Type, e.Test.Flags == 3 ? -3 : e.Test.T_Type});
        EXPECT_TRUE(kinds.count({1, 0}) && kinds.count({1, 5}) && kinds.count({1, -3}));
        EXPECT_EQ(kinds.count({1, 2}) == 1, p.checkStripHigh > 0);
        EXPECT_TRUE(std::any_of(p.datalog.begin(), p.datalog.end(), [](const data_rec& e) { return e.Valid; }));
        if (type == 2) {
            EXPECT_TRUE(kinds.count({2, 0}) && kinds.count({2, 12}) && kinds.count({2, 13}));
        }
    }
}

TEST_F(MeterDatalog, FullRecordMemoryUploads) {
    MeterProfile p = defaultProfile(6);
    p.datalog.resize(255, p.datalog.front());
    connect(6);
    loadProfile(p);
    auto log = std::make_unique<METER_DATALOG>();
    ASSERT_EQ(vb_Upload_Meter_Datalog(&rec, log.get()), ME_SUCCESS);
    EXPECT_EQ(log->recordCount, 255);
    p.datalog.push_back(p.datalog.front());
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
    EXPECT_GT(ms, 1500u);
    EXPECT_LT(ms, 2500u);
    // The damaged record is counted, not delivered: the records after it move up.
    ASSERT_EQ(log->recordCount, std::int16_t(p.binaryDatalog.size() - 1));
    EXPECT_EQ(log->corruptedCount, 1);
    EXPECT_EQ(log->maxRecordsForMeter, 1000);
    RECORD_DATA r{};
    EXPECT_EQ(GetMeterDatalogRecordData(log.get(), 4, &r), ME_SUCCESS);
    EXPECT_EQ(r.Ordinal, 5);
    EXPECT_EQ(GetMeterDatalogRecordData(log.get(), 5, &r), ME_SUCCESS);
    EXPECT_EQ(r.Ordinal, 7);

    // Only the records from the start time on.
    const std::int32_t from = p.binaryDatalog[100].timeStamp;
    ASSERT_EQ(GetMeterDatalog(&rec, log.get(), from), ME_SUCCESS);
    EXPECT_EQ(log->recordCount, std::count_if(p.binaryDatalog.begin(), p.binaryDatalog.end(),
                                              [&](const RECORD_DATA& x) { return x.timeStamp >= from; }));
    EXPECT_EQ(log->corruptedCount, 0);
    auto records = std::make_unique<METER_DATALOG>();
    EXPECT_EQ(vb_Upload_Meter_Datalog(&rec, records.get()), ME_NOT_SUPPORTED);
}

TEST_F(MeterDatalog, ClearEmptiesTheMemoryAfterItsWireTime) {
    connect(3);
    const std::uint32_t start = clock->tickCount();
    ASSERT_EQ(vb_Clear_Meter_Datalog(&rec), ME_SUCCESS);
    EXPECT_GE(clock->tickCount() - start, 1000u);
    EXPECT_EQ(rec.Percent_done, 100);
    EXPECT_TRUE(meter().datalog.empty());
    auto log = std::make_unique<METER_DATALOG>();
    log->recordCount = 9;
    ASSERT_EQ(vb_Upload_Meter_Datalog(&rec, log.get()), ME_SUCCESS);
    EXPECT_EQ(log->recordCount, 0);
    auto bin = std::make_unique<METER_BIN_DATALOG>();
    EXPECT_EQ(GetMeterDatalog(&rec, bin.get(), 0), ME_NOT_SUPPORTED);
}
