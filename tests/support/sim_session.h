// A meter-functions object connected to the statically linked simulator's
// meter, on a virtual clock, for tests of what sits on top of the session record.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <memory>

#include "readings/meter_fns.h"
#include "simulator.h"
#include "support/sim_transport.h"
#include "util/helpers.h"
#include "varnel/clock.h"

namespace varnel::test {

struct SimSession : ::testing::Test {
    std::shared_ptr<detail::clsMeterFns> fns;

    void SetUp() override {
        setThreadClock(std::make_shared<ManualClock>());
        detail::SetContinueFlag(true);
        sim::reset();
    }
    void TearDown() override {
        fns.reset();
        sim::reset();
        setThreadClock(nullptr);
    }
    // Loads the meter and finds it, as the session does before any group is used.
    void connect(const sim::MeterProfile& profile) {
        sim::loadProfile(profile);
        fns = std::make_shared<detail::clsMeterFns>(simTransport());
        std::int32_t found[11] = {};
        std::int16_t ports[11] = {profile.port, 0};
        ASSERT_EQ(fns->transport->find_meter(fns->MeterRec, found, ports), 0);
    }
    void connect(int type) { connect(sim::defaultProfile(type)); }
};

}  // namespace varnel::test
