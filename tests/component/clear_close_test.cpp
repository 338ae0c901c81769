#include <gtest/gtest.h>

#include <algorithm>

#include "component/err_propagator.h"
#include "platform/message_pump.h"
#include "support/fake_transport.h"
#include "support/wrapper_fixture.h"

using namespace varnel;
using namespace varnel::test;

namespace {

struct ClearClose : WrapperTest {
    std::int32_t clear() {
        XMLWrapper doc = deviceDoc(std::to_string(sim::meter().port), sim::meter().serial,
                                   std::to_string(sim::meter().type));
        return wrapper->clearMeter(rec, doc, status);
    }
};

TEST_F(ClearClose, EraseEmptiesTheMeterWithProgressAndOneCompletion) {
    discover(eCVPellis);
    ASSERT_FALSE(sim::meter().datalog.empty());
    const int closed = closes();

    EXPECT_EQ(clear(), ME_SUCCESS);
    EXPECT_TRUE(sim::meter().datalog.empty());
    EXPECT_TRUE(statusGroups(status).empty());
    EXPECT_EQ(completions, 1);
    EXPECT_EQ(closes(), closed);
    EXPECT_FALSE(detail::frmTimer().tmrStatus().enabled());
    // The erase takes 1.5 s: ticks every 0.4 s report the meter's own progress over 0-100.
    ASSERT_GE(progress.size(), 3u);
    EXPECT_TRUE(std::is_sorted(progress.begin(), progress.end()));
    // A fresh DllWrapper's first erase starts at 0, not at the end of an earlier stage.
    EXPECT_GT(progress.front(), 0);
    EXPECT_LT(progress.front(), 50);
    EXPECT_LE(progress.back(), 100);
}

TEST_F(ClearClose, FailedEraseReportsClosesAndCompletesUnlessToldToKeepTheMeter) {
    discover(eDunmark);
    for (std::int16_t keep : {0, -50}) {
        sim::injectFault("vb_Clear_Meter_Datalog", 1, ME_TIME_OUT, false);
        status = newDoc(doc_kind::status);
        completions = 0;
        rec.Error_code = keep;
        const int closed = closes();

        EXPECT_EQ(clear(), ME_TIME_OUT);
        EXPECT_EQ(statusGroups(status), (std::vector<StatusGroup>{{"-17", "-2", "Timeout error", "none"}}));
        EXPECT_EQ(completions, 1);
        EXPECT_EQ(closes(), closed + (keep == -50 ? 0 : 1)) << keep;
        EXPECT_EQ(rec.Error_code, keep == -50 ? -50 : ME_QUIT);
        EXPECT_FALSE(detail::frmTimer().tmrStatus().enabled());
        EXPECT_FALSE(sim::meter().datalog.empty());
    }
}

TEST_F(ClearClose, FailedEraseWithoutACodeIsStillAFailure) {
    auto fake = std::make_shared<FakeTransport>();
    fake->does("vb_Chk4Meter", [](FakeArgs& a) {
        a.rec->M_Type = 3;
        a.rec->Serial_number[0] = 'S';
    });
    fake->returns("vb_Clear_Meter_Datalog", {ME_FAIL});  // and leaves Error_code at 0
    DllWrapper own(fake);
    int done = 0;
    own.setOnComplete([&] { ++done; });
    METER_REC r{};
    r.M_Type = 3;
    r.Serial_number[0] = 'S';
    XMLWrapper doc = deviceDoc("1", "S", "3");
    EXPECT_EQ(own.clearMeter(r, doc, status), ME_FAIL);
    EXPECT_EQ(statusGroups(status), (std::vector<StatusGroup>{{"-17", "-17", "Operation failed", "none"}}));
    EXPECT_EQ(done, 1);
    EXPECT_EQ(fake->count("close_meter"), 1);
}

TEST_F(ClearClose, CloseReleasesThePortWithoutReportsOrEvents) {
    discover(eCorviaZenta);
    ASSERT_TRUE(sim::portOpen());
    const std::uint32_t start = clock->tickCount();

    EXPECT_EQ(wrapper->closeMeter(rec), ME_SUCCESS);
    EXPECT_FALSE(sim::portOpen());
    EXPECT_EQ(rec.Error_code, ME_QUIT);
    EXPECT_EQ(sim::callCount("vb_Tickle_Meter"), 1);
    EXPECT_EQ(clock->tickCount() - start, 3000u);
    EXPECT_EQ(completions, 0);
    EXPECT_TRUE(progress.empty());

    // Closing a meter that was never found is harmless.
    DllWrapper fresh(simTransport());
    METER_REC empty{};
    EXPECT_EQ(fresh.closeMeter(empty), ME_SUCCESS);
}

TEST_F(ClearClose, CloseFailureCompletesAndCarriesTheTrace) {
    auto fake = std::make_shared<FakeTransport>();
    fake->does("close_meter", [](FakeArgs&) { detail::raise(errc::internal, "port stuck"); });
    DllWrapper own(fake);
    int done = 0;
    own.setOnComplete([&] { ++done; });
    METER_REC r{};
    r.Error_code = -50;  // closeMeter closes whatever the record says
    try {
        own.closeMeter(r);
        FAIL() << "no error";
    } catch (const ComponentError& e) {
        EXPECT_EQ(e.number(), errc::internal);
        EXPECT_EQ(e.description(), "doAction --> MeterClose --> ");
    }
    EXPECT_EQ(done, 1);
    EXPECT_EQ(fake->count("close_meter"), 2);
}

}  // namespace
