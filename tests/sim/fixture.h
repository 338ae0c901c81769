// A fresh default meter on a virtual clock for every test.
#pragma once

#include <gtest/gtest.h>

#include <memory>

#include "simulator.h"
#include "varnel/clock.h"
#include "varnel/vantrix32.h"

namespace simtest {

struct SimTest : ::testing::Test {
    std::shared_ptr<varnel::ManualClock> clock = std::make_shared<varnel::ManualClock>(1000);
    METER_REC rec{};

    void SetUp() override {
        varnel::setThreadClock(clock);
        varnel::sim::reset();
    }
    void TearDown() override {
        vx_set_yield_hook(nullptr, nullptr);
        varnel::sim::reset();
        varnel::setThreadClock(nullptr);
    }

    // Selects the default meter of a type and finds it on its port.
    void connect(int type = 7) {
        varnel::sim::selectType(type);
        std::int32_t found[11] = {};
        std::int16_t ports[11] = {1};
        initialize_meter_structure(&rec);
        ASSERT_EQ(find_meter(&rec, found, ports), ME_SUCCESS);
    }
};

}  // namespace simtest
