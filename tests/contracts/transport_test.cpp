#include <gtest/gtest.h>

#include <dlfcn.h>

#include <algorithm>
#include <cstring>
#include <functional>
#include <stdexcept>
#include <string>

#include "contracts/transport.h"
#include "platform/message_pump.h"
#include "simulator.h"
#include "support/sim_transport.h"
#include "varnel/clock.h"
#include "varnel/component_error.h"

using namespace varnel;
using namespace varnel::detail;

namespace {

// What the recording library saw last; it is the same loaded copy the transport uses.
struct Recorder {
    void* handle = dlopen(RECORDING_TRANSPORT_FULL, RTLD_NOW);
    ~Recorder() { dlclose(handle); }
    std::string lastName() const {
        return reinterpret_cast<const char* (*)()>(dlsym(handle, "recording_transport_last_name"))();
    }
    std::int32_t lastValue(int i) const {
        return reinterpret_cast<std::int32_t (*)(int)>(dlsym(handle, "recording_transport_last_value"))(i);
    }
};

ComponentError failureOf(const std::function<void()>& call) {
    try {
        call();
    } catch (const ComponentError& e) {
        return e;
    }
    throw std::logic_error("no error raised");
}

TEST(TransportLoading, EveryFunctionIsReachedByNameWithItsArguments) {
    auto t = loadTransport(RECORDING_TRANSPORT_FULL);
    Recorder recorder;
    METER_REC rec{};
    SETTINGS_REC settings{};
    TIME_REC time{};
    INSULIN_OR_ORAL_MED_NAME_TYPE name{};
    PREDEFINED_INSULINS_TYPE insulins{};
    PREDEFINED_ORAL_MEDS_TYPE meds{};
    MEAL_SEGMENTS_TYPE segments{};
    METER_BIN_DATALOG bin{};
    RECORD_DATA data{};
    static METER_DATALOG datalog{};
    std::int32_t found[11]{}, seconds = 0;
    std::int16_t ports[11]{3}, flag = 0, t1 = 0, t2 = 0, t3 = 0, t4 = 0, t5 = 0;

    struct Case {
        const char* name;
        std::function<std::int32_t()> call;
    };
    const Case cases[] = {
        {"initialize_meter_structure", [&] { return t->initialize_meter_structure(rec); }},
        {"find_meter", [&] { return t->find_meter(rec, found, ports); }},
        {"initialize_meter_type_structure", [&] { return t->initialize_meter_type_structure(rec, 7); }},
        {"vb_Chk4Meter", [&] { return t->vb_Chk4Meter(rec); }},
        {"vb_Get_Meter_Firmware", [&] { return t->vb_Get_Meter_Firmware(rec); }},
        {"vb_Tickle_Meter", [&] { return t->vb_Tickle_Meter(rec); }},
        {"close_meter", [&] { return t->close_meter(rec); }},
        {"vb_Clear_Meter_Datalog", [&] { return t->vb_Clear_Meter_Datalog(rec); }},
        {"vb_Read_Meter_Options", [&] { return t->vb_Read_Meter_Options(rec); }},
        {"vb_Read_Meter_Option", [&] { return t->vb_Read_Meter_Option(rec, 4); }},
        {"vb_Set_Meter_Option", [&] { return t->vb_Set_Meter_Option(rec, 4, 9); }},
        {"vb_Set_Meter_Options", [&] { return t->vb_Set_Meter_Options(rec, settings); }},
        {"vb_Read_Meter_Clock", [&] { return t->vb_Read_Meter_Clock(rec, seconds); }},
        {"vb_Set_Meter_Clock", [&] { return t->vb_Set_Meter_Clock(rec, 86400); }},
        {"convert_to_seconds", [&] { return t->convert_to_seconds(time); }},
        {"convert_from_seconds", [&] { return t->convert_from_seconds(125, time); }},
        {"GetInitializedFlag", [&] { return t->GetInitializedFlag(rec, flag); }},
        {"SetInitializedFlag", [&] { return t->SetInitializedFlag(rec, 1); }},
        {"GetInsulinName", [&] { return t->GetInsulinName(rec, name); }},
        {"SetInsulinName", [&] { return t->SetInsulinName(rec, name); }},
        {"GetOralMedicationName", [&] { return t->GetOralMedicationName(rec, name); }},
        {"SetOralMedicationName", [&] { return t->SetOralMedicationName(rec, name); }},
        {"GetPredefinedInsulins", [&] { return t->GetPredefinedInsulins(rec, insulins); }},
        {"SetPredefinedInsulins", [&] { return t->SetPredefinedInsulins(rec, insulins); }},
        {"GetPredefinedOralMeds", [&] { return t->GetPredefinedOralMeds(rec, meds); }},
        {"SetPredefinedOralMeds", [&] { return t->SetPredefinedOralMeds(rec, meds); }},
        {"GetMealSegments", [&] { return t->GetMealSegments(rec, segments); }},
        {"SetMealSegments", [&] { return t->SetMealSegments(rec, segments); }},
        {"GetScheduleSelection", [&] { return t->GetScheduleSelection(rec, flag); }},
        {"SetScheduleSelection", [&] { return t->SetScheduleSelection(rec, 2); }},
        {"GetTargetRange", [&] { return t->GetTargetRange(rec, t1, t2, t3, t4, t5); }},
        {"SetTargetRange", [&] { return t->SetTargetRange(rec, 70, 140, 80, 180, 60); }},
        {"GetMeterDatalog", [&] { return t->GetMeterDatalog(rec, bin, 5000); }},
        {"GetMeterDatalogRecordData", [&] { return t->GetMeterDatalogRecordData(bin, 12, data); }},
        {"vb_Upload_Meter_Datalog", [&] { return t->vb_Upload_Meter_Datalog(rec, datalog); }},
    };
    std::int32_t code = -101;
    for (const Case& c : cases) {
        const std::int32_t result = c.call();
        EXPECT_EQ(recorder.lastName(), c.name);
        if (std::strcmp(c.name, "convert_to_seconds") == 0)
            EXPECT_EQ(result, 100000 + time.sec);
        else
            EXPECT_EQ(result, code) << c.name;
        --code;
    }
    // Arguments arrive in order and results come back through the references.
    cases[33].call();
    EXPECT_EQ(recorder.lastValue(0), 12);
    cases[1].call();
    EXPECT_EQ(recorder.lastValue(0), 3);
    cases[10].call();
    EXPECT_EQ(recorder.lastValue(1), 9);
    cases[31].call();
    EXPECT_EQ(recorder.lastValue(3), 180);
    EXPECT_EQ(recorder.lastValue(4), 60);
    EXPECT_EQ(seconds, 123456789);
    EXPECT_EQ(time.sec, 5);
    EXPECT_EQ(t5, 5);
    EXPECT_STREQ(reinterpret_cast<const char*>(name.nameStr), "Rapid");
}

TEST(TransportLoading, WhatIsMissingIsNamedOnFirstUse) {
    const std::string nowhere = "/nonexistent/libvantrix_nowhere.so";
    auto absent = loadTransport(nowhere);  // nothing is opened yet
    METER_REC rec{};
    for (int attempt = 0; attempt < 2; ++attempt) {
        ComponentError e = failureOf([&] { absent->vb_Chk4Meter(rec); });
        EXPECT_EQ(e.number(), errc::transport_unavailable);
        EXPECT_NE(e.description().find(nowhere), std::string::npos) << e.description();
        EXPECT_NE(e.description().find("No such file"), std::string::npos) << e.description();
    }

    auto partial = loadTransport(RECORDING_TRANSPORT_NO_CHK4METER);
    ComponentError e = failureOf([&] { partial->close_meter(rec); });
    EXPECT_EQ(e.number(), errc::transport_unavailable);
    EXPECT_NE(e.description().find("\"vb_Chk4Meter\""), std::string::npos) << e.description();

    TransportFunctions table{};
    table.initialize_meter_structure = [](METER_REC*) -> std::int16_t { return 0; };
    e = failureOf([&] { makeTransport(table)->initialize_meter_structure(rec); });
    EXPECT_NE(e.description().find("\"find_meter\""), std::string::npos) << e.description();

    auto hookless = loadTransport(RECORDING_TRANSPORT_NO_YIELD_HOOK);  // the hook is optional
    EXPECT_EQ(hookless->vb_Clear_Meter_Datalog(rec), -108);
}

struct TransportYield : ::testing::Test {
    std::shared_ptr<ManualClock> clock = std::make_shared<ManualClock>();
    void SetUp() override { setThreadClock(clock); }
    void TearDown() override {
        frmTimer().disableTimer();
        setThreadClock(nullptr);
    }
};

TEST_F(TransportYield, DueTicksRunWhileTheLibraryYieldsAndTheirErrorsFollowTheCall) {
    auto t = loadTransport(RECORDING_TRANSPORT_FULL);
    METER_REC rec{};
    std::vector<int> seen;  // Percent_done as each tick saw it
    auto connection = frmTimer().tmrStatus().onTick([&] { seen.push_back(rec.Percent_done); });
    frmTimer().enableTimer();
    clock->advance(500);
    EXPECT_EQ(t->vb_Clear_Meter_Datalog(rec), -108);
    EXPECT_EQ(seen, std::vector<int>{50});  // two yields at one instant: one tick

    auto failing = frmTimer().tmrStatus().onTick([] { throw std::runtime_error("progress handler failed"); });
    clock->advance(500);
    EXPECT_THROW(t->vb_Clear_Meter_Datalog(rec), std::runtime_error);
    EXPECT_EQ(rec.Percent_done, 100);  // the call itself ran to its end
    EXPECT_EQ(seen.size(), 2u);
    failing.disconnect();
    clock->advance(500);
    EXPECT_EQ(t->vb_Clear_Meter_Datalog(rec), -108);  // the error was reported once
}

}  // namespace

TEST_F(TransportYield, TheSimulatorsLongOperationsDriveTheTimerThroughTheHook) {
    varnel::sim::reset();
    varnel::sim::selectType(7);
    auto t = test::simTransport();
    METER_REC rec{};
    std::int32_t found[11]{};
    std::int16_t ports[11]{1};
    t->initialize_meter_structure(rec);
    ASSERT_EQ(t->find_meter(rec, found, ports), ME_SUCCESS);

    std::vector<int> seen;
    auto connection = frmTimer().tmrStatus().onTick([&] { seen.push_back(rec.Percent_done); });
    frmTimer().enableTimer();
    const std::uint32_t start = clock->tickCount();
    METER_BIN_DATALOG datalog{};
    EXPECT_EQ(t->GetMeterDatalog(rec, datalog, 0), ME_SUCCESS);
    const std::uint32_t took = clock->tickCount() - start;
    ASSERT_GE(took, 800u);
    EXPECT_NEAR(double(seen.size()), took / 400.0, 1.0);
    EXPECT_TRUE(std::is_sorted(seen.begin(), seen.end()));
    vx_set_yield_hook(nullptr, nullptr);
    varnel::sim::reset();
}
