// Calling through a transport library loaded by path: what is missing, and the
// caller's messages and clock while the library yields. (The forwarding itself is
// generated from the one function list, and every request runs through it.)
#include <gtest/gtest.h>

#include <functional>
#include <initializer_list>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include "contracts/transport.h"
#include "platform/message_pump.h"
#include "support/expect_error.h"
#include "support/loaded_library.h"
#include "varnel/clock.h"
#include "varnel/component_error.h"

using namespace varnel;
using namespace varnel::detail;

namespace {

// Expects `call` to raise transport_unavailable with a description naming each of `mentions`.
// A table entry: the library's calling convention, which a lambda cannot have on 32-bit Windows.
std::int16_t VX_CALL initializeNothing(METER_REC*) { return 0; }

void expectUnavailable(const std::function<void()>& call, std::initializer_list<std::string> mentions) {
    for (const std::string& m : mentions) test::expectError(call, errc::transport_unavailable, m);
}

TEST(TransportLoading, WhatIsMissingIsNamedOnFirstUseAndCandidatesAreTriedInOrder) {
    METER_REC rec{};
    const std::string first = "/nonexistent/a/libvantrix_nowhere.so", second = "/nonexistent/b/libvantrix_nowhere.so";
    auto absent = loadTransport(first);  // nothing is opened yet; a failed load is tried again on every call
    expectUnavailable([&] { absent->vb_Chk4Meter(rec); }, {first, test::LoadedLibrary(first.c_str()).error});
    expectUnavailable([&] { loadTransport({first, second})->vb_Chk4Meter(rec); }, {first, second});
    EXPECT_EQ(loadTransport({first, RECORDING_TRANSPORT_FULL})->vb_Clear_Meter_Datalog(rec), -108);
    auto partial = loadTransport(RECORDING_TRANSPORT_NO_CHK4METER);
    expectUnavailable([&] { partial->close_meter(rec); }, {RECORDING_TRANSPORT_NO_CHK4METER, "\"vb_Chk4Meter\""});
    TransportFunctions table{};
    table.initialize_meter_structure = &initializeNothing;
    expectUnavailable([&] { makeTransport(table)->initialize_meter_structure(rec); }, {"\"find_meter\""});
    auto hookless = loadTransport(RECORDING_TRANSPORT_NO_HOOKS);  // the hooks are optional
    EXPECT_EQ(hookless->vb_Clear_Meter_Datalog(rec), -108);
}

// A virtual clock, and Percent_done as each tick of the progress timer saw it.
struct TransportYield : ::testing::Test {
    std::shared_ptr<ManualClock> clock = std::make_shared<ManualClock>();
    METER_REC rec{};
    std::vector<int> seen;
    TimerConnection noting = frmTimer().tmrStatus().onTick([this] { seen.push_back(rec.Percent_done); });
    void SetUp() override { setThreadClock(clock); }
    void TearDown() override {
        frmTimer().disableTimer();
        setThreadClock(nullptr);
    }
};

TEST_F(TransportYield, DueTicksRunWhileTheLibraryYieldsItsErrorsFollowTheCallAndItUsesTheCallersClock) {
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

    // A library that exports a clock hook runs on the caller's thread clock once it is first used:
    // the recording library's own view of the caller's clock, in the same loaded copy the transport uses.
    const test::LoadedLibrary recorder{RECORDING_TRANSPORT_FULL};
    auto now = recorder.function<std::uint32_t (*)()>("library_now");
    auto sleep = recorder.function<void (*)(std::uint32_t)>("library_sleep");
    EXPECT_EQ(now(), 1500u);
    sleep(250);  // the library's wait is the caller's clock moving
    EXPECT_EQ(clock->tickCount(), 1750u);
    auto later = std::make_shared<ManualClock>(90000);
    setThreadClock(later);  // a clock set later is followed too
    EXPECT_EQ(now(), 90000u);
}

}  // namespace
