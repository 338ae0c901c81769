#include <gtest/gtest.h>

#include "readings/meter_fns.h"
#include "simulator.h"
#include "support/fake_transport.h"
#include "support/sim_transport.h"
#include "util/helpers.h"
#include "varnel/clock.h"

using namespace varnel;
using namespace varnel::detail;

namespace {

struct Progress : ::testing::Test {
    std::shared_ptr<ManualClock> clock = std::make_shared<ManualClock>();
    std::shared_ptr<test::FakeTransport> fake = std::make_shared<test::FakeTransport>();
    clsMeterFns fns{fake};
    std::vector<int> raised;

    void SetUp() override {
        setThreadClock(clock);
        SetContinueFlag(true);
        fns.onProgress = [this](std::int16_t& p) { raised.push_back(p); };
        frmTimer().enableTimer();
    }
    void TearDown() override {
        frmTimer().disableTimer();
        setThreadClock(nullptr);
        sim::reset();
    }
    // The transport fills the binary datalog in ten steps, pumping messages as it goes.
    void uploadInSteps(std::int16_t capacity) {
        fake->does("GetMeterDatalog", [this, capacity](test::FakeArgs& a) {
            a.ref<METER_BIN_DATALOG>().maxRecordsForMeter = capacity;
            for (std::int16_t k = 1; k <= 10; ++k) {
                a.ref<METER_BIN_DATALOG>().recordCount = static_cast<std::int16_t>(k * 10);
                clock->advance(400);
                doEvents();
            }
        });
    }
};

}  // namespace

TEST_F(Progress, UploadFailuresNeverReadAsSuccessAndAStopMakesNoCall) {
    std::int16_t errorCode = -2;
    fake->does("GetMeterDatalog", [&](test::FakeArgs& a) { a.rec->Error_code = errorCode; });
    fake->returns("GetMeterDatalog", {-2, -3});
    EXPECT_EQ(fns.GetFastmeterReading(), -2);
    errorCode = 0;
    EXPECT_EQ(fns.GetFastmeterReading(), -3);
    fake->does("vb_Upload_Meter_Datalog", [](test::FakeArgs& a) { a.rec->Error_code = -13; });
    fake->returns("vb_Upload_Meter_Datalog", {-1});
    EXPECT_EQ(fns.GetNonFastMeterReading(), -13);

    SetContinueFlag(false);
    fake->clearLog();
    EXPECT_EQ(fns.GetFastmeterReading(), 0);
    EXPECT_EQ(fns.GetNonFastMeterReading(), 0);
    EXPECT_TRUE(fake->calls().empty());
}

TEST_F(Progress, TimerReportsTenPercentStepsAboveWhatTheSessionReached) {
    uploadInSteps(0);  // a datalog without a capacity makes no measurable progress
    EXPECT_EQ(fns.GetFastmeterReading(), 0);
    EXPECT_TRUE(raised.empty());
    fns.MeterRec.Percent_done = 35;  // outside uploads the timer follows the record
    clock->advance(400);
    doEvents();
    uploadInSteps(100);
    EXPECT_EQ(fns.GetFastmeterReading(), 0);
    EXPECT_EQ(fns.GetFastmeterReading(), 0);  // a second upload of the session reports nothing
    fns.updateProgress(0);                    // model set-up reports only values above 0
    fns.updateProgress(50);
    EXPECT_EQ(raised, (std::vector<int>{35, 50, 60, 70, 80, 90, 100, 50}));
}

TEST_F(Progress, SimulatedMeterUploadFrom2000OnTheManualClock) {
    sim::MeterProfile meter = sim::defaultProfile(eMorvex);
    meter.binaryDatalog.assign(201, RECORD_DATA{});
    for (auto& r : meter.binaryDatalog) r.timeStamp = sim::secondsOf(2004, 5, 6), r.reading = 101;
    meter.binaryDatalog[0].timeStamp = sim::secondsOf(1999, 12, 31, 23, 59, 59);  // before the upload's start
    meter.binaryDatalog[1].timeStamp = sim::secondsOf(2000, 1, 1);
    meter.maxRecords = 201;
    sim::loadProfile(meter);
    clsMeterFns session(test::simTransport());
    session.MeterRec.port.com_number = meter.port;
    session.onProgress = fns.onProgress;
    ASSERT_EQ(session.GetFastmeterReading(), 0);
    EXPECT_EQ(session.binaryDatalog().recordCount, 200);
    ASSERT_GE(raised.size(), 3u);
    for (std::size_t i = 1; i < raised.size(); ++i) EXPECT_GE(raised[i], raised[i - 1] + 10);
}
