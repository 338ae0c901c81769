// Calling through a transport library loaded by path: every function with its
// arguments, what is missing, and the caller's messages while the library yields.
#include <gtest/gtest.h>

#include <dlfcn.h>

#include <algorithm>
#include <array>
#include <filesystem>
#include <functional>
#include <initializer_list>
#include <stdexcept>
#include <string>
#include <vector>

#include "contracts/transport.h"
#include "platform/message_pump.h"
#include "simulator.h"
#include "support/sim_transport.h"
#include "varnel/clock.h"
#include "varnel/component_error.h"
#include "varnel/dll_wrapper.h"

using namespace varnel;
using namespace varnel::detail;

namespace {

// What the recording library saw last; it is the same loaded copy the transport uses.
struct Recorder {
    void* handle = dlopen(RECORDING_TRANSPORT_FULL, RTLD_NOW);
    ~Recorder() { dlclose(handle); }
    const char* const& name = *static_cast<const char**>(dlsym(handle, "last_name"));
    const std::int32_t* values = static_cast<const std::int32_t*>(dlsym(handle, "last_values"));
};

// Expects `call` to raise transport_unavailable with a description naming each of `mentions`.
void expectUnavailable(const std::function<void()>& call, std::initializer_list<std::string> mentions) {
    try {
        call();
        ADD_FAILURE() << "no error";
    } catch (const ComponentError& e) {
        EXPECT_EQ(e.number(), errc::transport_unavailable);
        for (const std::string& m : mentions) EXPECT_NE(e.description().find(m), std::string::npos) << e.description();
    }
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
    std::int16_t ports[11]{3, 4}, flag = 0, selection = 0;
    std::array<std::int16_t, 5> range{};
    time.sec = 7, time.min = 8, name.index = 6;  // for the library to read

    // In the library's order, so the codes run from -101 down.
    struct Case {
        const char* name;
        std::function<std::int32_t()> call;
        std::array<std::int32_t, 5> args;
    };
    const Case cases[] = {
        {"initialize_meter_structure", [&] { return t->initialize_meter_structure(rec); }, {}},
        {"find_meter", [&] { return t->find_meter(rec, found, ports); }, {3, 4}},
        {"initialize_meter_type_structure", [&] { return t->initialize_meter_type_structure(rec, 7); }, {7}},
        {"vb_Chk4Meter", [&] { return t->vb_Chk4Meter(rec); }, {}},
        {"vb_Get_Meter_Firmware", [&] { return t->vb_Get_Meter_Firmware(rec); }, {}},
        {"vb_Tickle_Meter", [&] { return t->vb_Tickle_Meter(rec); }, {}},
        {"close_meter", [&] { return t->close_meter(rec); }, {}},
        {"vb_Clear_Meter_Datalog", [&] { return t->vb_Clear_Meter_Datalog(rec); }, {}},
        {"vb_Read_Meter_Options", [&] { return t->vb_Read_Meter_Options(rec); }, {}},
        {"vb_Read_Meter_Option", [&] { return t->vb_Read_Meter_Option(rec, 4); }, {4}},
        {"vb_Set_Meter_Option", [&] { return t->vb_Set_Meter_Option(rec, 4, 9); }, {4, 9}},
        {"vb_Set_Meter_Options", [&] { return t->vb_Set_Meter_Options(rec, settings); }, {}},
        {"vb_Read_Meter_Clock", [&] { return t->vb_Read_Meter_Clock(rec, seconds); }, {}},
        {"vb_Set_Meter_Clock", [&] { return t->vb_Set_Meter_Clock(rec, 86400); }, {86400}},
        {"convert_to_seconds", [&] { return t->convert_to_seconds(time); }, {7, 8}},
        {"convert_from_seconds", [&] { return t->convert_from_seconds(125, time); }, {125}},
        {"GetInitializedFlag", [&] { return t->GetInitializedFlag(rec, flag); }, {}},
        {"SetInitializedFlag", [&] { return t->SetInitializedFlag(rec, 5); }, {5}},
        {"GetInsulinName", [&] { return t->GetInsulinName(rec, name); }, {}},
        {"SetInsulinName", [&] { return t->SetInsulinName(rec, name); }, {6}},
        {"GetOralMedicationName", [&] { return t->GetOralMedicationName(rec, name); }, {}},
        {"SetOralMedicationName", [&] { return t->SetOralMedicationName(rec, name); }, {6}},
        {"GetPredefinedInsulins", [&] { return t->GetPredefinedInsulins(rec, insulins); }, {}},
        {"SetPredefinedInsulins", [&] { return t->SetPredefinedInsulins(rec, insulins); }, {}},
        {"GetPredefinedOralMeds", [&] { return t->GetPredefinedOralMeds(rec, meds); }, {}},
        {"SetPredefinedOralMeds", [&] { return t->SetPredefinedOralMeds(rec, meds); }, {}},
        {"GetMealSegments", [&] { return t->GetMealSegments(rec, segments); }, {}},
        {"SetMealSegments", [&] { return t->SetMealSegments(rec, segments); }, {}},
        {"GetScheduleSelection", [&] { return t->GetScheduleSelection(rec, selection); }, {}},
        {"SetScheduleSelection", [&] { return t->SetScheduleSelection(rec, 3); }, {3}},
        {"GetTargetRange",
         [&] { return t->GetTargetRange(rec, range[0], range[1], range[2], range[3], range[4]); }, {}},
        {"SetTargetRange", [&] { return t->SetTargetRange(rec, 70, 140, 80, 180, 60); }, {70, 140, 80, 180, 60}},
        {"GetMeterDatalog", [&] { return t->GetMeterDatalog(rec, bin, 5000); }, {5000}},
        {"GetMeterDatalogRecordData", [&] { return t->GetMeterDatalogRecordData(bin, 12, data); }, {12}},
        {"vb_Upload_Meter_Datalog", [&] { return t->vb_Upload_Meter_Datalog(rec, datalog); }, {}},
    };
    std::int32_t code = -101;
    for (const Case& c : cases) {
        SCOPED_TRACE(c.name);
        EXPECT_EQ(c.call(), code--);
        EXPECT_STREQ(recorder.name, c.name);
        for (int i = 0; i < 5; ++i) EXPECT_EQ(recorder.values[i], c.args[i]) << "argument " << i;
    }
    // Results come back through the references.
    EXPECT_EQ(seconds, 123456789);
    EXPECT_EQ(time.sec, 5);
    EXPECT_EQ(flag, 1);
    EXPECT_EQ(selection, 2);
    EXPECT_EQ(range, (std::array<std::int16_t, 5>{1, 2, 3, 4, 5}));
    EXPECT_STREQ(reinterpret_cast<const char*>(name.nameStr), "Rapid");
}

TEST(TransportLoading, WhatIsMissingIsNamedOnFirstUse) {
    const std::string nowhere = "/nonexistent/libvantrix_nowhere.so";
    auto absent = loadTransport(nowhere);  // nothing is opened yet
    METER_REC rec{};
    for (int attempt = 0; attempt < 2; ++attempt)  // a failed load is tried again
        expectUnavailable([&] { absent->vb_Chk4Meter(rec); }, {nowhere, "No such file"});
    auto partial = loadTransport(RECORDING_TRANSPORT_NO_CHK4METER);
    expectUnavailable([&] { partial->close_meter(rec); }, {RECORDING_TRANSPORT_NO_CHK4METER, "\"vb_Chk4Meter\""});
    TransportFunctions table{};
    table.initialize_meter_structure = [](METER_REC*) -> std::int16_t { return 0; };
    expectUnavailable([&] { makeTransport(table)->initialize_meter_structure(rec); }, {"\"find_meter\""});
    auto hookless = loadTransport(RECORDING_TRANSPORT_NO_YIELD_HOOK);  // the hook is optional
    EXPECT_EQ(hookless->vb_Clear_Meter_Datalog(rec), -108);
}

TEST(TransportLoading, CandidatesAreTriedInOrderAndAllNamedWhenNoneLoads) {
    METER_REC rec{};
    const std::string first = "/nonexistent/a/libvantrix_nowhere.so", second = "/nonexistent/b/libvantrix_nowhere.so";
    expectUnavailable([&] { loadTransport({first, second})->vb_Chk4Meter(rec); }, {first, second});
    EXPECT_EQ(loadTransport({first, RECORDING_TRANSPORT_FULL})->vb_Clear_Meter_Datalog(rec), -108);
}

// The default library is the one built beside libvarnel, found from libvarnel's
// own place whatever the program's run path (sanitizer runtimes ignore it).
TEST(TransportLoading, TheDefaultLibraryIsFoundBesideTheComponent) {
    const std::string path = DllWrapper::defaultTransportPath();
    ASSERT_EQ(path.front(), '/') << path;
    EXPECT_TRUE(std::filesystem::equivalent(path, VARNEL_TEST_TRANSPORT_PATH)) << path;
}

// A virtual clock, and Percent_done as each tick of the progress timer saw it.
struct TransportYield : ::testing::Test {
    std::shared_ptr<ManualClock> clock = std::make_shared<ManualClock>();
    METER_REC rec{};
    std::vector<int> seen;
    TimerConnection noting = frmTimer().tmrStatus().onTick([this] { seen.push_back(rec.Percent_done); });
    void SetUp() override {
        setThreadClock(clock);
        varnel::sim::reset();
    }
    void TearDown() override {
        vx_set_yield_hook(nullptr, nullptr);  // the simulator's
        varnel::sim::reset();
        frmTimer().disableTimer();
        setThreadClock(nullptr);
    }
};

TEST_F(TransportYield, DueTicksRunWhileTheLibraryYieldsAndTheirErrorsFollowTheCall) {
    auto t = loadTransport(RECORDING_TRANSPORT_FULL);
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

TEST_F(TransportYield, TheSimulatorsLongOperationsDriveTheTimerThroughTheHook) {
    varnel::sim::selectType(7);
    auto t = test::simTransport();
    std::int32_t found[11]{};
    std::int16_t ports[11]{1};
    t->initialize_meter_structure(rec);
    ASSERT_EQ(t->find_meter(rec, found, ports), ME_SUCCESS);
    frmTimer().enableTimer();
    const std::uint32_t start = clock->tickCount();
    METER_BIN_DATALOG datalog{};
    EXPECT_EQ(t->GetMeterDatalog(rec, datalog, 0), ME_SUCCESS);
    const std::uint32_t took = clock->tickCount() - start;
    ASSERT_GE(took, 800u);
    EXPECT_NEAR(double(seen.size()), took / 400.0, 1.0);
    EXPECT_TRUE(std::is_sorted(seen.begin(), seen.end()));
}

}  // namespace
