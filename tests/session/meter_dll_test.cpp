#include <gtest/gtest.h>

#include <cstring>

#include "component/err_propagator.h"
#include "platform/message_pump.h"
#include "session/meter_dll.h"
#include "simulator.h"
#include "support/fake_transport.h"
#include "support/sim_transport.h"
#include "util/helpers.h"
#include "varnel/clock.h"

using namespace varnel;
using namespace varnel::detail;

namespace {

void putSerial(METER_REC& rec, const char* text) {
    std::memset(rec.Serial_number, 0, sizeof rec.Serial_number);
    std::memcpy(rec.Serial_number, text, std::strlen(text));
}

struct Session : ::testing::Test {
    std::shared_ptr<ManualClock> clock = std::make_shared<ManualClock>(5000);
    std::shared_ptr<test::FakeTransport> fake = std::make_shared<test::FakeTransport>();
    MeterDll session{fake};
    METER_REC rec{};

    void SetUp() override {
        setThreadClock(clock);
        SetContinueFlag(true);
        errPropagator().reset();
    }
    void TearDown() override { setThreadClock(nullptr); }

    // The transport identifies a meter of that type and serial number.
    void meterAnswers(std::int16_t type, const char* serial) {
        auto identify = [type, serial](test::FakeArgs& a) {
            a.rec->M_Type = type;
            putSerial(*a.rec, serial);
            a.rec->port.com_number = 3;
        };
        fake->does("find_meter", identify);
        fake->does("vb_Chk4Meter", identify);
        fake->does("vb_Get_Meter_Firmware",
                   [](test::FakeArgs& a) { std::memcpy(a.rec->Firmware_number, "FW1 01/02/03", 12); });
    }
};

TEST_F(Session, FindFillsBothRecordCopiesAndTheCallersRecord) {
    meterAnswers(eDunmark, "DNM42");
    session.setCOMPort_Pref(3);
    rec.Error_code = 7;  // whatever the caller had travels with the record

    EXPECT_EQ(session.findmeter(rec), 0);
    const test::FakeCall& find = fake->calls().front();
    EXPECT_EQ(find.name, "find_meter");
    EXPECT_EQ(find.rec->Error_code, 7);
    EXPECT_EQ(fake->names(), (std::vector<std::string>{"find_meter", "vb_Get_Meter_Firmware"}));

    EXPECT_EQ(session.LastMeterSerialNo(), "DNM42");
    EXPECT_EQ(session.LastMeterType(), eDunmark);
    EXPECT_TRUE(session.isInitialised());
    EXPECT_FALSE(session.isProcessing());
    ASSERT_TRUE(session.Meter());
    EXPECT_STREQ(session.Meter()->className(), "clsDunmark");
    EXPECT_EQ(session.COMPort_Detected(), 3);
    // The firmware lands in the stored record only; the caller got the record before it was read.
    EXPECT_EQ(BytesToText(session.storedRecord().Firmware_number, 20), "FW1 01/02/03");
    EXPECT_EQ(BytesToText(rec.Firmware_number, 20), "");
    EXPECT_EQ(BytesToText(rec.Serial_number, 20), "DNM42");
}

TEST_F(Session, FindSearchesOnlyThePreferredPort) {
    std::vector<std::int16_t> ports;
    fake->does("find_meter", [&](test::FakeArgs& a) { ports.assign(a.ports, a.ports + 11); });
    session.setCOMPort_Pref(9);
    fake->returns("find_meter", {ME_NO_DEVICE});
    session.findmeter(rec);
    EXPECT_EQ(ports, (std::vector<std::int16_t>{9, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0}));
}

TEST_F(Session, FailedSearchDropsTheModelButKeepsTheLastMeter) {
    meterAnswers(eCVPellis, "PLS1");
    ASSERT_EQ(session.findmeter(rec), 0);
    fake->returns("find_meter", {ME_NO_DEVICE});
    fake->clearLog();

    EXPECT_EQ(session.findmeter(rec), ME_NO_DEVICE);
    EXPECT_TRUE(session.isInitialised());
    EXPECT_FALSE(session.Meter());
    EXPECT_EQ(session.LastMeterSerialNo(), "PLS1");
    EXPECT_EQ(session.LastMeterType(), eCVPellis);
    EXPECT_EQ(fake->count("vb_Get_Meter_Firmware"), 0);
}

TEST_F(Session, CheckAsksTheMeterAfterATenthOfASecondAndReadsNoFirmware) {
    meterAnswers(eMorvex, "MVX1");
    rec.M_Type = eMorvex;
    const std::uint32_t before = clock->tickCount();
    std::uint32_t askedAt = 0;
    fake->does("vb_Chk4Meter", [&](test::FakeArgs& a) {
        askedAt = clock->tickCount();
        a.rec->M_Type = eMorvex;
        putSerial(*a.rec, "MVX1");
    });

    EXPECT_EQ(session.checkmeter(rec), 0);
    EXPECT_EQ(fake->names(), (std::vector<std::string>{"initialize_meter_type_structure", "vb_Chk4Meter"}));
    EXPECT_EQ(fake->calls().front().values, std::vector<std::int32_t>{eMorvex});
    EXPECT_EQ(askedAt - before, 100u);
    EXPECT_STREQ(session.Meter()->className(), "clsCVMorvex");
}

TEST_F(Session, InitRebuildsFromTheCallersRecordAndReturnsTheFirmwareCode) {
    rec.M_Type = eParvix;
    putSerial(rec, "PVX8");
    fake->returns("vb_Get_Meter_Firmware", {ME_TIME_OUT});

    EXPECT_EQ(session.initMeter(rec), ME_TIME_OUT);
    EXPECT_EQ(fake->names(), std::vector<std::string>{"vb_Get_Meter_Firmware"});
    EXPECT_EQ(session.LastMeterSerialNo(), "PVX8");
    EXPECT_STREQ(session.Meter()->className(), "clsParvix");
}

TEST_F(Session, UnknownMeterTypesGetTheMorvexModel) {
    for (std::int16_t type : {0, 9}) {
        rec.M_Type = type;
        putSerial(rec, "X1");
        session.initMeter(rec);
        EXPECT_STREQ(session.Meter()->className(), "clsCVMorvex") << type;
    }
}

TEST_F(Session, SerialNumberOf00IsTakenFromAnUpload) {
    rec.M_Type = eDunmark;
    putSerial(rec, "00");
    fake->does("vb_Upload_Meter_Datalog", [](test::FakeArgs& a) { putSerial(*a.rec, "DNM777"); });

    session.initMeter(rec);
    EXPECT_EQ(fake->count("vb_Upload_Meter_Datalog"), 1);
    EXPECT_EQ(session.LastMeterSerialNo(), "DNM777");

    putSerial(rec, " 00 ");
    session.initMeter(rec);
    EXPECT_EQ(fake->count("vb_Upload_Meter_Datalog"), 2);
    putSerial(rec, "001");
    session.initMeter(rec);
    EXPECT_EQ(fake->count("vb_Upload_Meter_Datalog"), 2);
    EXPECT_EQ(session.LastMeterSerialNo(), "001");
}

TEST_F(Session, CloseUsesTheCallersRecordWaitsAndForgetsTheMeter) {
    rec.M_Type = eDunmark;
    putSerial(rec, "DNM1");
    session.initMeter(rec);
    fake->clearLog();
    std::vector<std::uint32_t> at;
    fake->does("vb_Tickle_Meter", [&](test::FakeArgs&) { at.push_back(clock->tickCount()); });
    fake->does("close_meter", [&](test::FakeArgs&) { at.push_back(clock->tickCount()); });
    const std::uint32_t start = clock->tickCount();

    EXPECT_TRUE(session.MeterClose(rec));
    EXPECT_EQ(rec.Error_code, ME_QUIT);
    EXPECT_EQ(fake->calls()[0].rec->Error_code, ME_QUIT);
    EXPECT_EQ(at, (std::vector<std::uint32_t>{start, start + 1000}));
    EXPECT_EQ(clock->tickCount(), start + 3000);
    EXPECT_FALSE(session.Meter());
    EXPECT_FALSE(session.isInitialised());
    // The stored record was not the one closed.
    EXPECT_NE(session.storedRecord().Error_code, ME_QUIT);
}

TEST_F(Session, RecordValuesAndHandleComeFromTheStoredRecord) {
    rec.Plasma_cal_flag = 1;
    rec.Checkstrip_range_lower_limit = 87;
    rec.Checkstrip_range_upper_limit = 137;
    rec.Error_code = -3;
    putSerial(rec, "A");
    session.initMeter(rec);
    EXPECT_EQ(session.Calibration(), 1);
    EXPECT_EQ(session.CheckStripLow(), 87);
    EXPECT_EQ(session.CheckStripHigh(), 137);
    EXPECT_EQ(session.LastError(), -3);

    for (auto [id, handle] : {std::pair{0, 0}, {-1, 0}, {1, 1}, {0x4003, 0x4003}}) {
        session.meterFns().MeterRec.port.Id = id;
        std::int32_t h = 99;
        session.GetHandle(h);
        EXPECT_EQ(h, handle) << id;
    }
}

TEST_F(Session, InitialisedFlagGoesThroughCopiesOfTheStoredRecord) {
    fake->does("GetInitializedFlag", [](test::FakeArgs& a) {
        *a.value = 1;
        a.rec->Error_code = -9;
    });
    EXPECT_EQ(session.DevInitialised(), 1);
    session.setDevInitialised(0);
    EXPECT_EQ(fake->calls().back().values, std::vector<std::int32_t>{0});
    EXPECT_EQ(session.storedRecord().Error_code, 0);
}

TEST_F(Session, SameMeterComparesTheSerialNumberExactly) {
    meterAnswers(eDunmark, "DNM42");
    session.findmeter(rec);
    EXPECT_TRUE(session.isSameMeterConnected());
    meterAnswers(eDunmark, "dnm42");
    EXPECT_FALSE(session.isSameMeterConnected());
}

TEST_F(Session, EraseRelaysTheTransportsProgressAndAlwaysStopsTheTimer) {
    std::vector<int> raised;
    session.onProgress = [&](std::int16_t& p) { raised.push_back(p); };
    fake->does("vb_Clear_Meter_Datalog", [&](test::FakeArgs& a) {
        for (std::int16_t p : {30, 60, 100}) {
            a.rec->Percent_done = p;
            clock->advance(400);
            doEvents();
        }
    });
    EXPECT_TRUE(session.clearMeter());
    EXPECT_EQ(raised, (std::vector<int>{30, 60, 100}));
    EXPECT_FALSE(frmTimer().tmrStatus().enabled());

    fake->returns("vb_Clear_Meter_Datalog", {ME_TIME_OUT});
    EXPECT_FALSE(session.clearMeter());

    fake->does("vb_Clear_Meter_Datalog", [](test::FakeArgs&) { raise(errc::overflow, "Overflow"); });
    try {
        session.clearMeter();
        FAIL() << "no error";
    } catch (const ComponentError& e) {
        EXPECT_EQ(e.number(), errc::overflow);
        EXPECT_EQ(e.description(), "clearMeter --> ");
    }
    EXPECT_FALSE(frmTimer().tmrStatus().enabled());
    // No tick reaches the session once the erase is over.
    frmTimer().enableTimer();
    clock->advance(400);
    raised.clear();
    doEvents();
    frmTimer().disableTimer();
    EXPECT_TRUE(raised.empty());
}

TEST_F(Session, MeterFunctionsProgressIsRelayedUnchanged) {
    std::vector<int> raised;
    session.onProgress = [&](std::int16_t& p) { raised.push_back(p); };
    session.meterFns().updateProgress(37);
    EXPECT_EQ(raised, std::vector<int>{37});

    session.onProgress = [](std::int16_t&) { raise(errc::internal, "handler"); };
    try {
        session.meterFns().updateProgress(5);
        FAIL() << "no error";
    } catch (const ComponentError& e) {
        EXPECT_EQ(e.description(), "mobjMeterFns_onProgress --> ");
    }
}

TEST_F(Session, ErrorsCarryTheRoutineTraceAndLeaveProcessingSet) {
    fake->does("find_meter", [](test::FakeArgs&) { raise(errc::missing_object, "gone"); });
    try {
        session.findmeter(rec);
        FAIL() << "no error";
    } catch (const ComponentError& e) {
        EXPECT_EQ(e.number(), errc::missing_object);
        EXPECT_EQ(e.description(), "findmeter --> ");
    }
    EXPECT_TRUE(session.isProcessing());

    errPropagator().reset();
    fake->does("initialize_meter_structure", [](test::FakeArgs&) { raise(errc::internal, "x"); });
    EXPECT_THROW(session.initialise(), ComponentError);
    EXPECT_EQ(errPropagator().error().ErrorTrace, "MeterInit --> ");
}

struct SessionOnSimulator : ::testing::Test {
    std::unique_ptr<MeterDll> session;
    METER_REC rec{};

    void SetUp() override {
        setThreadClock(std::make_shared<ManualClock>());
        sim::reset();
        SetContinueFlag(true);
        sim::selectType(eDunmark);
        session = std::make_unique<MeterDll>(test::simTransport());
        session->setCOMPort_Pref(sim::meter().port);
    }
    void TearDown() override {
        session.reset();
        vx_set_yield_hook(nullptr, nullptr);
        sim::reset();
        setThreadClock(nullptr);
    }
};

TEST_F(SessionOnSimulator, SerialNumberOf00IsRepairedDuringDiscovery) {
    sim::setIdentitySerial("00");
    EXPECT_EQ(session->findmeter(rec), 0);
    EXPECT_EQ(session->LastMeterSerialNo(), sim::meter().serial);
    EXPECT_EQ(sim::callCount("vb_Upload_Meter_Datalog"), 1);
}

TEST_F(SessionOnSimulator, AnErrorOfATickDuringTheEraseReachesTheCaller) {
    ASSERT_EQ(session->findmeter(rec), 0);
    session->onProgress = [](std::int16_t&) { raise(errc::internal, "tick"); };
    try {
        session->clearMeter();
        FAIL() << "no error";
    } catch (const ComponentError& e) {
        EXPECT_EQ(e.number(), errc::internal);
        EXPECT_EQ(e.description(), "clearMeter --> ");
    }
    EXPECT_FALSE(frmTimer().tmrStatus().enabled());
}

}  // namespace
