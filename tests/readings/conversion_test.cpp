#include <gtest/gtest.h>

#include "errors/err_propagator.h"
#include "readings/meter_fns.h"
#include "simulator.h"
#include "support/sim_transport.h"

using namespace varnel;
using namespace varnel::detail;

namespace {

// Conversions over the simulated meter's time conversion and binary record decoding.
struct Conversion : ::testing::Test {
    clsMeterFns fns{test::simTransport()};
    ResultCollection results;
    std::vector<std::string> oralMeds{"Metformin", "Glipizide"}, insulins{"Humalog"};
    std::vector<RECORD_DATA> records;

    void SetUp() override { errPropagator().reset(); }

    void add(std::int16_t recType, int day, auto fill) {
        RECORD_DATA& r = records.emplace_back();
        r.recType = recType, r.timeStamp = sim::secondsOf(2004, 3, day, 8, 30, 15);
        r.Ordinal = static_cast<std::int16_t>(records.size());
        fill(r);
    }
    bool convertBinary() {
        sim::encodeBinaryDatalog(records, fns.binaryDatalog());
        return fns.Fastmeterupload(results, oralMeds, insulins);
    }
    template <class R>
    R& at(int i) {
        return dynamic_cast<R&>(*results.Item(i));
    }
    // One property of every result, in order.
    std::vector<std::int32_t> column(std::int32_t (IResult::*property)() const = nullptr) {
        std::vector<std::int32_t> out;
        for (const auto& r : results)
            out.push_back(property ? ((*r).*property)() : dynamic_cast<Result&>(*r).ResultType());
        return out;
    }
};

using Types = std::vector<std::int32_t>;

data_rec entry(std::int16_t dType, std::int16_t tType) {
    data_rec r{};
    r.D_Type = dType, r.D_Time = sim::secondsOf(2005, 6, 7, 21, 5, 9);
    r.Test.T_Type = tType, r.Test.Result = 111;
    return r;
}

}  // namespace

TEST_F(Conversion, MissingValuesSnacksAndRanges) {
    add(VX_REC_CARBS_FATS, 1, [](auto& r) { r.mealSegment = 1, r.carbs = 45, r.fats = -1; });
    add(VX_REC_CARBS_FATS, 1, [](auto& r) { r.mealSegment = 3, r.carbs = 10, r.fats = 2; });
    add(VX_REC_CALORIES_PROTEIN, 1, [](auto& r) { r.mealSegment = 3, r.calories = -1, r.protein = 4; });
    add(VX_REC_WEIGHT_HEIGHT, 1, [](auto& r) { r.weight = -1.0, r.height = 170.5; });
    add(VX_REC_CHOLESTEROL_TOTAL_TRIG, 1, [](auto& r) { r.cholesterolTotal = 1001, r.cholesterolTriglyceride = 3000; });
    fns.binaryDatalog().corruptedCount = -3;  // from the transport: none damaged
    ASSERT_TRUE(convertBinary());
    EXPECT_EQ(fns.corruptedCount(), 0);
    EXPECT_EQ(column(), (Types{50, 55, 57, 58, 101, 140, 150}));
    EXPECT_EQ(std::tuple(at<Food>(1).MealSlot(), at<Food>(2).MealSlot()), std::tuple(3, 0));
    EXPECT_EQ(at<BodyDimensions>(5).Value(), 170.5);
    EXPECT_EQ(std::tuple(at<Cholestrol>(6).ValueInMeterRange(), at<Cholestrol>(7).ValueInMeterRange()),
              std::tuple(1, 3));
}

TEST_F(Conversion, MealsAndCholesterolOfOneDateShareAGroup) {
    add(VX_REC_CARBS_FATS, 1, [](auto& r) { r.carbs = 40, r.fats = 10; });
    add(VX_REC_CALORIES_PROTEIN, 1, [](auto& r) { r.calories = 400, r.protein = 20; });
    add(VX_REC_CARBS_FATS, 2, [](auto& r) { r.carbs = 30, r.fats = 5; });
    add(VX_REC_CALORIES_PROTEIN, 3, [](auto& r) { r.calories = 300, r.protein = 15; });  // a later date: a new group
    add(VX_REC_CALORIES_PROTEIN, 4,
        [](auto& r) { r.calories = 200, r.protein = 10; });               // after a closed group: its own
    add(VX_REC_CALORIES_PROTEIN, 4, [](auto& r) { r.mealSegment = 4; });  // no open group: not unmatched
    add(VX_REC_CHOLESTEROL_LDL_HDL, 5, [](auto& r) { r.cholesterolLDL = 100, r.cholesterolHDL = 50; });
    add(VX_REC_CHOLESTEROL_TOTAL_TRIG, 6, [](auto& r) { r.cholesterolTotal = 180, r.cholesterolTriglyceride = 120; });
    add(VX_REC_HEALTH_NOTES, 6, [](auto& r) { r.stressFlag = 1, r.illnessFlag = 1; });
    add(VX_REC_CARBS_FATS, 7, [](auto& r) { r.carbs = 5, r.fats = -1; });
    add(VX_REC_CALORIES_PROTEIN, 7, [](auto& r) { r.mealSegment = 4; });
    ASSERT_TRUE(convertBinary());
    EXPECT_EQ(column(&IResult::GroupId), (Types{1, 1, 1, 1, 2, 2, 3, 3, 4, 4, 5, 5, 6, 6, 7, 7, 8}));
    EXPECT_EQ(column(&IResult::MeterGroupId), (Types{1, 1, 2, 2, 3, 3, 4, 4, 5, 5, 6, 6, 7, 7, 8, 8, 9}));
    EXPECT_EQ(at<HealthNotes>(16).ResultType(), 172);
    EXPECT_EQ(fns.unmatchedCount(), 1);
}

// A record the meter marks invalid is not dated at all, so it is never counted twice (losing one
// record alone: the readings request's test).
TEST_F(Conversion, DamagedRecordsAreNeverCountedTwice) {
    METER_DATALOG& log = fns.recordDatalog();
    for (int i = 0; i < 3; ++i) log.DataLog[i] = entry(1, 0), log.DataLog[i].D_Time = sim::secondsOf(2005, 6, i + 1);
    log.DataLog[0].Valid = 1;
    log.recordCount = 3;
    log.ValidRecordCount = 2;
    sim::injectFault("convert_from_seconds", 1, ME_COM_ERROR, true);
    EXPECT_FALSE(fns.NonFastmeterUpload(results));
    sim::clearFaults();
    EXPECT_EQ(std::tuple(fns.corruptedCount(), fns.unreadableCount(), fns.unreadableCode()),
              std::tuple(1, 2, std::int16_t{ME_COM_ERROR}));
}

// A medication outside the names, a test type beyond the table, more records than the buffer holds.
TEST_F(Conversion, NothingIsReadPastATableOrTheBufferAndEarlierResultsAreKept) {
    add(VX_REC_GLUCOSE, 1, [](auto& r) { r.reading = 100; });
    add(VX_REC_ORAL_MEDICATION, 1, [](auto& r) { r.oralMedType = 3; });
    EXPECT_THROW(convertBinary(), ComponentError);
    const IError& e = errPropagator().error();
    EXPECT_EQ(std::tuple(e.ErrorNo, e.ErrorTrace, results.Count()),
              std::tuple(errc::subscript_out_of_range, "Fastmeterupload --> ", 1));

    METER_DATALOG& log = fns.recordDatalog();
    std::fill(std::begin(log.DataLog), std::end(log.DataLog), entry(1, 0));
    log.DataLog[3] = entry(1, 16);
    log.recordCount = 5;
    results = {};
    EXPECT_THROW(fns.NonFastmeterUpload(results), ComponentError);
    EXPECT_EQ(results.Count(), 3);

    results = {};
    log.DataLog[3] = entry(1, 0);
    log.recordCount = 300;
    errPropagator().reset();
    EXPECT_THROW(fns.NonFastmeterUpload(results), ComponentError);
    EXPECT_EQ(std::tuple(e.ErrorTrace, results.Count()), std::tuple("NonFastmeterUpload --> ", 255));

    results = {};
    log.recordCount = -4;
    EXPECT_TRUE(fns.NonFastmeterUpload(results));
    EXPECT_EQ(std::tuple(results.Count(), fns.corruptedCount()), std::tuple(0, 0));
}

TEST_F(Conversion, TwoDigitYearWindow) {
    METER_DATALOG& log = fns.recordDatalog();
    const int years[] = {2029, 2030, 1999};
    for (int i = 0; i < 3; ++i)
        log.DataLog[i] = entry(1, 0), log.DataLog[i].D_Time = sim::secondsOf(years[i], 12, 31, 23, 58, 59);
    log.recordCount = 3;
    ASSERT_TRUE(fns.NonFastmeterUpload(results));
    for (int i = 0; i < 3; ++i)
        EXPECT_EQ(results.Item(i + 1)->DateTime(), *DateTime::fromParts(i == 1 ? 1930 : years[i], 12, 31, 23, 58, 59));
}

// Codes a record carries: the exercise label as a comment on its glucose result
// (none past the three labels), microalbumin and the visit as result types.
TEST_F(Conversion, RecordCodesBecomeCommentsAndResultTypes) {
    for (std::int16_t label : {1, 3, 4}) add(VX_REC_GLUCOSE, 1, [&](auto& r) { r.reading = 120, r.exerciseLabel = label; });
    add(VX_REC_MICROALBUMIN, 2, [](auto& r) { r.microalbumin = 0; });
    add(VX_REC_LAST_VISIT, 3, [](auto& r) { r.visit = 2; });
    ASSERT_TRUE(convertBinary());
    EXPECT_EQ(column(), (Types{10, 10, 10, 121, 162}));
    auto comment = [&](int i) {
        const auto comments = at<Glucose>(i).Comments();
        return comments->Count() == 1 ? comments->Item(1)->Id() : comments->Count() == 0 ? 0 : -1;
    };
    EXPECT_EQ(std::tuple(comment(1), comment(2), comment(3)), std::tuple(11, 12, 0));
}
