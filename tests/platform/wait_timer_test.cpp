#include <gtest/gtest.h>

#include <cmath>
#include <stdexcept>
#include <thread>
#include <vector>

#include "platform/message_pump.h"
#include "platform/wait.h"
#include "varnel/clock.h"
#include "varnel/component_error.h"

using namespace varnel;
using namespace varnel::detail;

namespace {

struct WaitTimerTest : ::testing::Test {
    std::shared_ptr<ManualClock> clock = std::make_shared<ManualClock>(1000);
    std::vector<std::uint32_t> ticks;  // virtual times the handler ran at
    TimerConnection connection;
    clsWait wait;

    void SetUp() override { setThreadClock(clock); }
    void TearDown() override {
        connection.disconnect();
        frmTimer().disableTimer();
        setThreadClock(nullptr);
    }
    // Records every tick of the progress timer, runs also, and enables the timer (first tick 400 ms on).
    void recordTicks(std::function<void()> also = {}) {
        connection = frmTimer().tmrStatus().onTick([this, also] {
            ticks.push_back(clock->tickCount());
            if (also) also();
        });
        frmTimer().enableTimer();
    }
};

TEST_F(WaitTimerTest, SleepRunsItsFullTimeWithTicksDeliveredOnTheWay) {
    wait.SleepForSeconds(0.1);
    EXPECT_EQ(clock->tickCount(), 1100u);
    recordTicks();  // due at 1500, 1900
    clock->advance(350);
    wait.SleepForSeconds(1.0);  // a tick only restarts the wait with the time remaining
    EXPECT_EQ(clock->tickCount(), 2450u);
    EXPECT_EQ(ticks, (std::vector<std::uint32_t>{1500, 1900, 2300}));
}

TEST_F(WaitTimerTest, TickCountNearItsWrapStillGivesTheFullInterval) {
    clock = std::make_shared<ManualClock>(0xFFFFFFFFu - 50);
    setThreadClock(clock);
    recordTicks();
    EXPECT_EQ(wait.MsgWaitObj(1000), waitTimeout);
    EXPECT_EQ(clock->tickCount(), 949u);
    EXPECT_EQ(ticks, (std::vector<std::uint32_t>{349, 749}));
}

TEST_F(WaitTimerTest, TicksOnlyInsideAPumpOnePerPumpAndNextOneIntervalLater) {
    recordTicks();
    clock->advance(2000);
    std::thread([] { doEvents(); }).join();  // another thread's pump never sees our timer
    EXPECT_TRUE(ticks.empty());
    auto pumpAfter = [&](std::uint32_t ms) {
        clock->advance(ms);
        doEvents();
        return ticks.size();
    };
    EXPECT_EQ(pumpAfter(0), 1u);
    EXPECT_EQ(pumpAfter(0), 1u);  // a late pump gives one tick, not one per interval missed
    EXPECT_EQ(pumpAfter(399), 1u);
    EXPECT_EQ(pumpAfter(1), 2u);
    EXPECT_EQ(*msUntilNextTick(), 400u);
}

TEST_F(WaitTimerTest, DisablingOrDisconnectingStopsTicksHoldersShareThemAndNoneReenters) {
    int second = 0;
    auto other = frmTimer().tmrStatus().onTick([&] { ++second; });
    recordTicks([&] {
        if (ticks.size() == 2) connection.disconnect();
    });
    wait.SleepForSeconds(1.2);
    EXPECT_EQ(ticks.size(), 2u);
    EXPECT_EQ(second, 3);
    frmTimer().disableTimer();
    wait.SleepForSeconds(2);
    EXPECT_EQ(second, 3);
    EXPECT_FALSE(msUntilNextTick());

    // A handler that waits does not get the ticks due meanwhile.
    other.disconnect();
    ticks.clear();
    recordTicks([&] { wait.SleepForSeconds(1.0); });
    wait.SleepForSeconds(0.5);
    EXPECT_EQ(ticks.size(), 1u);
    EXPECT_EQ(clock->tickCount(), 5600u);
}

TEST_F(WaitTimerTest, OddIntervalsAndHandlerErrors) {
    wait.SleepForSeconds(-0.001);  // would otherwise mean "no limit"
    EXPECT_EQ(wait.MsgWaitObj(-500), waitTimeout);
    WaitSeconds(1e10f);
    WaitSeconds(NAN);
    EXPECT_EQ(clock->tickCount(), 1000u);
    EXPECT_THROW(wait.SleepForSeconds(NAN), ComponentError);

    recordTicks([] { throw std::runtime_error("handler failed"); });
    EXPECT_THROW(WaitSeconds(1.0f), std::runtime_error);
    EXPECT_EQ(clock->tickCount(), 1400u);
}

}  // namespace
