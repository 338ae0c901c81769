#include <gtest/gtest.h>

#include "component/dll_impl.h"
#include "support/fake_transport.h"
#include "support/wrapper_fixture.h"

using namespace varnel;
using namespace varnel::test;

namespace {

TEST(ProgressStage, StagesHalvesToEvenAndDroppedEvents) {
    DllWrapper::Impl impl{std::make_shared<FakeTransport>()};
    std::vector<int> raised;
    impl.onProgress = [&](std::int16_t& p) { raised.push_back(p); };
    auto raise = [&](std::initializer_list<int> values) {
        raised.clear();
        for (int v : values) impl.RaiseProgress(static_cast<std::int16_t>(v));
        return raised;
    };
    impl.PercentLimit(0);
    EXPECT_EQ(impl.PercentLimit(), 100);
    impl.resetPercentage();
    impl.PercentLimit(25);
    EXPECT_EQ(raise({50, 54, 0, -5}), (std::vector<int>{12, 14}));
    impl.PercentLimit(100);
    EXPECT_EQ(raise({1, 50, 100}), (std::vector<int>{26, 63, 100}));
    impl.resetPercentage();
    impl.PercentLimit(100);
    // 100 x 327 fits 16 bits, 100 x 328 does not.
    EXPECT_EQ(raise({327, 328}), std::vector<int>{327});
    impl.onProgress = [](std::int16_t&) { throw std::runtime_error("client"); };
    EXPECT_NO_THROW(impl.RaiseProgress(10));
}

// The frame's checks, through clearMeter on a discovered type-3 meter.
struct Frame : WrapperTest {
    void SetUp() override {
        WrapperTest::SetUp();
        discover(eDunmark);
    }
    std::int32_t clear(const std::string& port, const std::string& sn, const std::string& type) {
        XMLWrapper doc = deviceDoc(port, sn, type);
        return wrapper->clearMeter(rec, doc, status);
    }
};

TEST_F(Frame, DocumentChecks) {
    const std::string sn = sim::meter().serial, bad = "-17/-19/Bad parameter passed to the function ; ";
    struct Case {
        std::string port, sn, type;
        std::int32_t result;
        std::string group;  // "" for none
    };
    for (const Case& c : {
             Case{"abc", "dnm3001296", "3.0", 0, ""},  // a port that is no number is port 0; case is ignored
             Case{"-1", sn, "3", ME_BAD_PARAMETER, bad + "Port number from XML file is invalid"},
             Case{"1", sn, "0", ME_BAD_PARAMETER, bad + "Device Type from Device Info XML is invalid"},
             // A type that is no whole number is compared as it is, not rounded.
             Case{"1", sn, "3.5", ME_FAIL, "-8/-8/Different device detected ; Device Type from Device Info XML - 3.5 "
                                           "Device Type from device - 3 do not match"},
         }) {
        SCOPED_TRACE(c.port + "|" + c.sn + "|" + c.type);
        fresh();
        EXPECT_EQ(clear(c.port, c.sn, c.type), c.result);
        EXPECT_EQ(statusGroups(status), c.group.empty() ? std::vector<std::string>{} : std::vector{c.group});
        EXPECT_EQ(completions, 1);
        EXPECT_FALSE(closed());
    }
    // A meter that does not answer ends the request without onComplete.
    sim::detach();
    fresh();
    EXPECT_EQ(clear("1", sn, "3"), ME_NO_DEVICE);
    EXPECT_EQ(statusGroups(status), std::vector<std::string>{"-17/-13/No device found"});
    EXPECT_EQ(completions, 0);
}

TEST_F(Frame, UnexpectedErrorsAreReportedCloseCompleteAndReachTheClient) {
    XMLWrapper noPortInfo = newDoc(doc_kind::status);
    for (std::int16_t keep : {0, -50}) {
        fresh();
        rec.Error_code = keep;
        EXPECT_EQ(unexpectedTrace([&] { wrapper->clearMeter(rec, noPortInfo, status); }), "91 doAction --> ");
        ASSERT_EQ(statusGroups(status).size(), 1u);
        EXPECT_EQ(statusGroups(status)[0].rfind("-17/-16/Unknown status;Error number = 91 Error description = ", 0), 0u);
        EXPECT_TRUE(statusGroups(status)[0].ends_with("/0"));
        EXPECT_EQ(completions, 1);
        EXPECT_EQ(closed(), keep != -50);
    }
}

}  // namespace
