#include <gtest/gtest.h>

#include <algorithm>

#include "support/fake_transport.h"
#include "support/wrapper_fixture.h"

using namespace varnel;
using namespace varnel::test;

namespace {

struct ClearClose : WrapperTest {
    std::int32_t clear() {
        XMLWrapper doc = deviceDoc("1", sim::meter().serial, std::to_string(sim::meter().type));
        return wrapper->clearMeter(rec, doc, status);
    }
};

TEST_F(ClearClose, EraseEmptiesTheMeterReportingItsOwnStage) {
    discover(eCVPellis);
    EXPECT_EQ(clear(), ME_SUCCESS);
    EXPECT_TRUE(sim::meter().datalog.empty());
    EXPECT_TRUE(statusGroups(status).empty());
    EXPECT_EQ(completions, 1);
    EXPECT_FALSE(closed());
    EXPECT_FALSE(detail::frmTimer().tmrStatus().enabled());
    // 1.5 s of erasing, ticks every 0.4 s; a fresh DllWrapper's first stage starts at 0.
    ASSERT_GE(progress.size(), 3u);
    EXPECT_TRUE(std::is_sorted(progress.begin(), progress.end()));
    EXPECT_GT(progress.front(), 0);
    EXPECT_LT(progress.front(), 50);
}

TEST_F(ClearClose, FailedEraseClosesUnlessToldToKeepTheMeter) {
    discover(eDunmark);
    for (std::int16_t keep : {0, -50}) {
        sim::injectFault("vb_Clear_Meter_Datalog", 1, ME_TIME_OUT, false);
        fresh();
        rec.Error_code = keep;
        EXPECT_EQ(clear(), ME_TIME_OUT);
        EXPECT_EQ(statusGroups(status), std::vector<std::string>{"-17/-2/Timeout error"});
        EXPECT_EQ(completions, 1);
        EXPECT_EQ(closed(), keep != -50);
        EXPECT_FALSE(detail::frmTimer().tmrStatus().enabled());
    }
    EXPECT_FALSE(sim::meter().datalog.empty());
}

TEST_F(ClearClose, ErasesThatFailWithoutACodeOrRaiseAreFailures) {
    auto fake = std::make_shared<FakeTransport>();
    fake->does("vb_Chk4Meter", [](FakeArgs& a) { a.rec->M_Type = 3; });
    fake->returns("vb_Clear_Meter_Datalog", {ME_FAIL});  // Error_code stays 0
    DllWrapper own(fake);
    rec.Serial_number[0] = 'S';
    XMLWrapper doc = deviceDoc("1", "S", "3");
    EXPECT_EQ(own.clearMeter(rec, doc, status), ME_FAIL);
    EXPECT_EQ(statusGroups(status), std::vector<std::string>{"-17/-17/Operation failed"});

    // An error below the request keeps its chain of routines.
    fresh();
    fake->does("vb_Clear_Meter_Datalog", [](FakeArgs&) { detail::raise(errc::overflow, "Overflow"); });
    EXPECT_EQ(unexpectedTrace([&] { own.clearMeter(rec, doc, status); }), "6 doAction --> clearMeter --> ");
    EXPECT_EQ(statusGroups(status),
              std::vector<std::string>{"-17/-16/Unknown status;Error number = 6 Error description = clearMeter --> /0"});
}

TEST_F(ClearClose, CloseReleasesThePortQuietly) {
    discover(eCorviaZenta);
    const std::uint32_t start = clock->tickCount();
    EXPECT_EQ(wrapper->closeMeter(rec), ME_SUCCESS);
    EXPECT_FALSE(sim::portOpen());
    EXPECT_EQ(rec.Error_code, ME_QUIT);
    EXPECT_EQ(clock->tickCount() - start, 3000u);
    EXPECT_EQ(completions, 0);

    auto fake = std::make_shared<FakeTransport>();
    fake->does("close_meter", [](FakeArgs&) { detail::raise(errc::internal, "port stuck"); });
    DllWrapper own(fake);
    own.setOnComplete([this] { ++completions; });
    rec.Error_code = -50;  // closeMeter closes whatever the record says
    EXPECT_EQ(unexpectedTrace([&] { own.closeMeter(rec); }), "51 doAction --> MeterClose --> ");
    EXPECT_EQ(completions, 1);
    EXPECT_EQ(std::ranges::count(fake->names(), "close_meter"), 2);  // tried again by the handler
}

}  // namespace
