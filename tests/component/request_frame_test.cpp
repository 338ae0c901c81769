#include <gtest/gtest.h>

#include "component/dll_impl.h"
#include "component/request_frame.h"
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

TEST(StatusReport, GeneralSettingsFailureExtendsTheErrorText) {
    auto fake = std::make_shared<FakeTransport>();
    fake->returns("vb_Read_Meter_Options", {ME_TIME_OUT});
    detail::MeterDll session(fake);
    XMLWrapper status = newDoc(doc_kind::status);
    METER_REC rec{};
    std::string error = "earlier";
    EXPECT_EQ(detail::GetAllGeneralSettings(session, rec, status, error), ME_TIME_OUT);
    EXPECT_EQ(error, "Operation failed;earlier ; GetAllGeneralSettings failed. Error is : Timeout error");
    EXPECT_EQ(statusGroups(status), std::vector<std::string>{"-17/-2/" + error});
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
    const std::string other = "-8/-8/Different device detected ; Device ";
    struct Case {
        std::string port, sn, type;
        std::int32_t result;
        std::string group;  // "" for none
    };
    for (const Case& c : {
             Case{"abc", sn, "3", 0, ""},
             Case{"", "dnm3001296", "3.0", 0, ""},
             Case{"-1", sn, "3", ME_BAD_PARAMETER, bad + "Port number from XML file is invalid"},
             Case{"1", "", "3", ME_BAD_PARAMETER, bad + "Device SN from Device Info XML is invalid"},
             Case{"1", sn, "0", ME_BAD_PARAMETER, bad + "Device Type from Device Info XML is invalid"},
             Case{"1", sn, "9", ME_BAD_PARAMETER, bad + "Device Type from Device Info XML is invalid"},
             Case{"1", "ABC123", "3", ME_DIFFERENT_DEVICE,
                  other + "SN from Device Info XML - ABC123 Device SN from device - " + sn + " do not match"},
             Case{"1", sn, "8", ME_FAIL, other + "Type from Device Info XML - 8 Device Type from device - 3 do not match"},
             Case{"1", sn, "3.5", ME_FAIL,
                  other + "Type from Device Info XML - 3.5 Device Type from device - 3 do not match"},
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
        EXPECT_EQ(statusGroups(status)[0].substr(statusGroups(status)[0].size() - 2), "/0");
        EXPECT_EQ(completions, 1);
        EXPECT_EQ(closed(), keep != -50);
    }
}

TEST(FrameTrace, ErrorsBelowTheRequestKeepTheirChain) {
    setThreadClock(std::make_shared<ManualClock>());
    auto fake = std::make_shared<FakeTransport>();
    fake->does("vb_Chk4Meter", [](FakeArgs& a) { a.rec->M_Type = 3; });
    fake->does("vb_Clear_Meter_Datalog", [](FakeArgs&) { detail::raise(errc::overflow, "Overflow"); });
    DllWrapper wrapper(fake);
    METER_REC rec{};
    rec.Serial_number[0] = 'S';
    XMLWrapper doc = deviceDoc("1", "S", "3"), status = newDoc(doc_kind::status);
    EXPECT_EQ(unexpectedTrace([&] { wrapper.clearMeter(rec, doc, status); }), "6 doAction --> clearMeter --> ");
    EXPECT_EQ(statusGroups(status),
              std::vector<std::string>{"-17/-16/Unknown status;Error number = 6 Error description = clearMeter --> /0"});
    setThreadClock(nullptr);
}

}  // namespace
