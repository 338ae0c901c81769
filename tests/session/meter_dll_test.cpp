#include <gtest/gtest.h>

#include "session/meter_dll.h"
#include "support/fake_transport.h"
#include "support/wrapper_fixture.h"

using namespace varnel;
using namespace varnel::detail;
using test::FakeArgs;

namespace {

struct Session : ::testing::Test {
    std::shared_ptr<ManualClock> clock = std::make_shared<ManualClock>(5000);
    std::shared_ptr<test::FakeTransport> fake = std::make_shared<test::FakeTransport>();
    MeterDll session{fake};
    METER_REC rec{};
    std::vector<std::int16_t> ports;  // what find_meter was asked to search

    void SetUp() override { setThreadClock(clock); }
    void TearDown() override { setThreadClock(nullptr); }
    // The meter on port 3 identifies itself with this type and serial number.
    void meterAnswers(std::int16_t type, const char* serial) {
        auto identify = [=](FakeArgs& a) {
            a.rec->M_Type = type;
            TextToBytes(a.rec->Serial_number, serial);
            a.rec->port.com_number = 3;
        };
        fake->does("vb_Chk4Meter", identify).does("find_meter", [=, this](FakeArgs& a) {
            ports.assign(&a.ref<std::int16_t>(), &a.ref<std::int16_t>() + 11);
            identify(a);
        });
        fake->does("vb_Get_Meter_Firmware", [](FakeArgs& a) { a.rec->Firmware_number[0] = 'F'; });
    }
};

TEST_F(Session, FindChecksAndRebuildsTheMeterKeepingTheLastOneOnFailure) {
    meterAnswers(eDunmark, "DNM42");
    session.setCOMPort_Pref(3);
    EXPECT_EQ(session.findmeter(rec), 0);
    EXPECT_EQ(ports, (std::vector<std::int16_t>{3, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0}));
    EXPECT_EQ(session.LastMeterSerialNo(), "DNM42");
    // The caller's copy was taken before the firmware was read into the stored one.
    EXPECT_EQ(session.storedRecord().Firmware_number[0], 'F');
    EXPECT_EQ(rec.Firmware_number[0], 0);

    fake->returns("find_meter", {ME_NO_DEVICE});
    EXPECT_EQ(session.findmeter(rec), ME_NO_DEVICE);
    EXPECT_TRUE(session.isInitialised());
    EXPECT_FALSE(session.Meter());
    EXPECT_EQ(session.LastMeterSerialNo(), "DNM42");

    // A rebuild gives the firmware read's code.
    fake->returns("vb_Get_Meter_Firmware", {ME_TIME_OUT});
    rec.M_Type = eParvix;
    EXPECT_EQ(session.initMeter(rec), ME_TIME_OUT);
}

TEST_F(Session, CloseActsOnTheCallersRecord) {
    TextToBytes(rec.Serial_number, "A1");
    session.initMeter(rec);
    const std::uint32_t start = clock->tickCount();
    EXPECT_TRUE(session.MeterClose(rec));
    EXPECT_EQ(rec.Error_code, ME_QUIT);
    EXPECT_EQ(fake->calls().end()[-2].rec->Error_code, ME_QUIT);  // the tickle before the close
    EXPECT_EQ(clock->tickCount() - start, 3000u);
    EXPECT_FALSE(session.Meter());
    EXPECT_FALSE(session.isInitialised());
    EXPECT_EQ(session.storedRecord().Error_code, 0);
}

TEST_F(Session, EraseRelaysTheWorkingRecordsProgressAndStopsTheTimerOnEveryExit) {
    std::vector<int> raised;
    session.onProgress = [&](std::int16_t& p) { raised.push_back(p); };
    fake->does("vb_Clear_Meter_Datalog", [&](FakeArgs& a) {
        for (std::int16_t p : {30, 60, 100}) {
            a.rec->Percent_done = p;
            clock->advance(400);
            doEvents();
        }
    });
    EXPECT_TRUE(session.clearMeter());
    EXPECT_EQ(raised, (std::vector<int>{30, 60, 100}));
    fake->returns("vb_Clear_Meter_Datalog", {ME_TIME_OUT});
    EXPECT_FALSE(session.clearMeter());
    fake->does("vb_Clear_Meter_Datalog", [](FakeArgs&) { raise(errc::overflow, "Overflow"); });
    EXPECT_EQ(test::unexpectedTrace([&] { session.clearMeter(); }), "6 clearMeter --> ");
    EXPECT_FALSE(frmTimer().tmrStatus().enabled());

    session.onProgress = [](std::int16_t&) { raise(errc::internal, "handler"); };
    EXPECT_EQ(test::unexpectedTrace([&] { session.meterFns().updateProgress(5); }), "51 mobjMeterFns_onProgress --> ");
}

// On the simulated meter, whose long calls let the timer tick.
struct SessionOnSimulator : test::WrapperTest {
    MeterDll session{test::simTransport()};
};

TEST_F(SessionOnSimulator, SerialNumber00IsRepairedAndTickErrorsAreNotLost) {
    sim::selectType(eDunmark);
    sim::setIdentitySerial("00");
    session.setCOMPort_Pref(1);
    EXPECT_EQ(session.findmeter(rec), 0);
    EXPECT_EQ(session.LastMeterSerialNo(), sim::meter().serial);

    session.onProgress = [](std::int16_t&) { raise(errc::internal, "tick"); };
    EXPECT_EQ(test::unexpectedTrace([&] { session.clearMeter(); }), "51 clearMeter --> ");
}

}  // namespace
