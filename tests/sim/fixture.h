// A fresh default meter on a virtual clock for every test.
#pragma once

#include <gtest/gtest.h>

#include <cstring>
#include <functional>
#include <memory>
#include <string>

#include "contracts/transport.h"
#include "simulator.h"
#include "varnel/clock.h"
#include "varnel/vantrix32.h"

namespace simtest {

// A byte field of a transport record up to its first zero.
template <std::size_t N>
std::string text(const std::uint8_t (&bytes)[N]) {
    return std::string(reinterpret_cast<const char*>(bytes), strnlen(reinterpret_cast<const char*>(bytes), N));
}

struct SimTest : ::testing::Test {
    std::shared_ptr<varnel::ManualClock> clock = std::make_shared<varnel::ManualClock>(1000);
    METER_REC rec{};
    std::int32_t found[11] = {};
    std::int16_t ports[11] = {1};
    std::function<void()> yielded;

    void SetUp() override {
        varnel::setThreadClock(clock);
        varnel::detail::lendThreadClock(&vx_set_clock_hook);
        varnel::sim::reset();
    }
    void TearDown() override {
        vx_set_yield_hook(nullptr, nullptr);
        varnel::sim::reset();
        vx_set_clock_hook(nullptr, nullptr, nullptr);
        varnel::setThreadClock(nullptr);
    }
    // Selects the default meter of a type and finds it on port 1.
    void connect(int type = 7) {
        varnel::sim::selectType(type);
        initialize_meter_structure(&rec);
        ASSERT_EQ(find_meter(&rec, found, ports), ME_SUCCESS);
    }
    // Runs f whenever a long operation hands the caller its turn.
    void onYield(std::function<void()> f) {
        yielded = std::move(f);
        vx_set_yield_hook([](void* self) { static_cast<SimTest*>(self)->yielded(); }, this);
    }
};

}  // namespace simtest
