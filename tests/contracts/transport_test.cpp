// Calling through a transport library loaded by path: every function with its
// arguments, what is missing, and the caller's messages while the library yields.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <filesystem>
#include <functional>
#include <initializer_list>
#include <map>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include "contracts/transport.h"
#include "platform/message_pump.h"
#include "simulator.h"
#include "support/loaded_library.h"
#include "varnel/clock.h"
#include "varnel/component_error.h"
#include "varnel/dll_wrapper.h"

using namespace varnel;
using namespace varnel::detail;

namespace {

// What the recording library saw last; it is the same loaded copy the transport uses.
struct Recorder {
    test::LoadedLibrary library{RECORDING_TRANSPORT_FULL};
    const char* const& name = library.variable<const char*>("last_name");
    const std::intptr_t* args = &library.variable<std::intptr_t>("last_args");
    const int& count = library.variable<int>("last_count");
};

// The arguments of one call, made fresh per parameter: what the library must
// see of each (its number, or the caller's own object) and which objects it fills.
struct Arguments {
    METER_REC rec{};
    std::map<std::string, std::intptr_t> expected;
    std::vector<std::pair<const void*, std::size_t>> filled;
    std::vector<std::shared_ptr<void>> objects;
    std::int32_t next = 1000;

    METER_REC& record(const char* name) {
        expected[name] = reinterpret_cast<std::intptr_t>(&rec);
        return rec;
    }
    template <class T>
    T value(const char* name) {
        expected[name] = next;
        return static_cast<T>(next++);
    }
    template <class T>
    T* objects_of(const char* name, std::size_t count, bool fills) {
        auto block = std::shared_ptr<T[]>(new T[count]{});
        objects.push_back(block);
        expected[name] = reinterpret_cast<std::intptr_t>(block.get());
        if (fills) filled.emplace_back(block.get(), count * sizeof(T));
        return block.get();
    }
};

#define VARNEL_TEST_ARG(kind, type, name) , VARNEL_TEST_ARG_##kind(type, #name)
#define VARNEL_TEST_ARG_REC(type, name) a.record(name)
#define VARNEL_TEST_ARG_VALUE(type, name) a.value<type>(name)
#define VARNEL_TEST_ARG_IN(type, name) *a.objects_of<type>(name, 1, false)
#define VARNEL_TEST_ARG_INOUT(type, name) *a.objects_of<type>(name, 1, false)
#define VARNEL_TEST_ARG_OUT(type, name) *a.objects_of<type>(name, 1, true)
#define VARNEL_TEST_ARG_IN_LIST(type, name) a.objects_of<type>(name, VX_LIST_LENGTH, false)
#define VARNEL_TEST_ARG_OUT_LIST(type, name) a.objects_of<type>(name, VX_LIST_LENGTH, true)
#define VARNEL_TEST_PARAM_NAME(kind, type, name) , #name

// Each meter function: its name, its parameters in order and a call through a transport.
struct Case {
    const char* name;
    std::vector<std::string> params;
    std::function<std::int32_t(Transport&, Arguments&)> call;
};
const std::vector<Case>& everyFunction() {
#define VARNEL_TEST_CASE(ret, fn, ...)                                      \
    {#fn,                                                                   \
     {VX_COMMA_LIST(VX_EACH(VARNEL_TEST_PARAM_NAME, __VA_ARGS__))},         \
     [](Transport& t, Arguments& a) -> std::int32_t {                       \
         return t.fn(VX_COMMA_LIST(VX_EACH(VARNEL_TEST_ARG, __VA_ARGS__))); \
     }},
    static const std::vector<Case> cases = {VX_METER_FUNCTIONS(VARNEL_TEST_CASE)};
#undef VARNEL_TEST_CASE
    return cases;
}

// Expects `call` to raise transport_unavailable with a description naming each of `mentions`.
// A table entry: the library's calling convention, which a lambda cannot have on 32-bit Windows.
std::int16_t VX_CALL initializeNothing(METER_REC*) { return 0; }

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
    // In the list's order, so the codes run from -101 down.
    std::int32_t code = -101;
    ASSERT_EQ(everyFunction().size(), 35u);
    for (const Case& c : everyFunction()) {
        SCOPED_TRACE(c.name);
        Arguments a;
        EXPECT_EQ(c.call(*t, a), code--);
        EXPECT_STREQ(recorder.name, c.name);
        // Every argument arrives in its place: numbers as given, objects as the caller's own.
        ASSERT_EQ(recorder.count, int(c.params.size()));
        for (std::size_t i = 0; i < c.params.size(); ++i)
            EXPECT_EQ(recorder.args[i], a.expected.at(c.params[i])) << c.params[i];
        // What the library fills comes back to the caller.
        for (const auto& [object, size] : a.filled) {
            const auto* bytes = static_cast<const unsigned char*>(object);
            EXPECT_EQ(std::count(bytes, bytes + size, 0x5A), std::ptrdiff_t(size));
        }
    }
}

TEST(TransportLoading, WhatIsMissingIsNamedOnFirstUse) {
    const std::string nowhere = "/nonexistent/libvantrix_nowhere.so";
    auto absent = loadTransport(nowhere);  // nothing is opened yet
    METER_REC rec{};
    for (int attempt = 0; attempt < 2; ++attempt)  // a failed load is tried again
        expectUnavailable([&] { absent->vb_Chk4Meter(rec); }, {nowhere, test::LoadedLibrary(nowhere.c_str()).error});
    auto partial = loadTransport(RECORDING_TRANSPORT_NO_CHK4METER);
    expectUnavailable([&] { partial->close_meter(rec); }, {RECORDING_TRANSPORT_NO_CHK4METER, "\"vb_Chk4Meter\""});
    TransportFunctions table{};
    table.initialize_meter_structure = &initializeNothing;
    expectUnavailable([&] { makeTransport(table)->initialize_meter_structure(rec); }, {"\"find_meter\""});
    auto hookless = loadTransport(RECORDING_TRANSPORT_NO_HOOKS);  // the hooks are optional
    EXPECT_EQ(hookless->vb_Clear_Meter_Datalog(rec), -108);
}

TEST(TransportLoading, CandidatesAreTriedInOrderAndAllNamedWhenNoneLoads) {
    METER_REC rec{};
    const std::string first = "/nonexistent/a/libvantrix_nowhere.so", second = "/nonexistent/b/libvantrix_nowhere.so";
    expectUnavailable([&] { loadTransport({first, second})->vb_Chk4Meter(rec); }, {first, second});
    EXPECT_EQ(loadTransport({first, RECORDING_TRANSPORT_FULL})->vb_Clear_Meter_Datalog(rec), -108);
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

// A library that exports a clock hook runs on the caller's thread clock once it is first used.
TEST_F(TransportYield, ALoadedLibraryTakesTheCallersClock) {
    auto t = loadTransport(RECORDING_TRANSPORT_FULL);
    Recorder recorder;
    auto now = recorder.library.function<std::uint32_t (*)()>("library_now");
    auto sleep = recorder.library.function<void (*)(std::uint32_t)>("library_sleep");
    clock->advance(4321);
    t->vb_Tickle_Meter(rec);
    EXPECT_EQ(now(), 4321u);
    sleep(250);  // the library's wait is the caller's clock moving
    EXPECT_EQ(clock->tickCount(), 4571u);
    auto later = std::make_shared<ManualClock>(90000);
    setThreadClock(later);  // a clock set later is followed too
    EXPECT_EQ(now(), 90000u);
}

}  // namespace
