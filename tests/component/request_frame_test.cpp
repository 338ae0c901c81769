#include <gtest/gtest.h>

#include "component/dll_impl.h"
#include "component/err_propagator.h"
#include "component/request_frame.h"
#include "support/fake_transport.h"
#include "support/wrapper_fixture.h"

using namespace varnel;
using namespace varnel::test;

namespace {

struct ProgressStage : ::testing::Test {
    DllWrapper::Impl impl{std::make_shared<FakeTransport>()};
    std::vector<int> raised;

    void SetUp() override {
        impl.onProgress = [this](std::int16_t& p) { raised.push_back(p); };
    }
    std::vector<int> raise(std::initializer_list<int> values) {
        raised.clear();
        for (int v : values) impl.RaiseProgress(static_cast<std::int16_t>(v));
        return raised;
    }
};

TEST_F(ProgressStage, StagesFollowOneAnother) {
    impl.PercentLimit(0);
    EXPECT_EQ(impl.PercentLimit(), 100);
    EXPECT_EQ(impl.lowerLimit(), 0);

    impl.resetPercentage();
    impl.PercentLimit(40);
    EXPECT_EQ(raise({100}), std::vector<int>{40});
    impl.PercentLimit(100);
    EXPECT_EQ(raise({1, 50, 100}), (std::vector<int>{41, 70, 100}));
    impl.PercentLimit(0);
    EXPECT_EQ(raise({50}), std::vector<int>{70});
}

TEST_F(ProgressStage, HalvesGoToEvenAndNothingIsRaisedForNoProgress) {
    impl.resetPercentage();
    impl.PercentLimit(25);
    EXPECT_EQ(raise({50, 54, 2}), (std::vector<int>{12, 14, 0}));
    EXPECT_TRUE(raise({0, -5}).empty());
}

TEST_F(ProgressStage, OverflowAndFailingHandlersDropTheEventSilently) {
    impl.resetPercentage();
    impl.PercentLimit(100);
    // 100 x 327 fits 16 bits, 100 x 328 does not.
    EXPECT_EQ(raise({327, 328, 30000}), std::vector<int>{327});
    impl.onProgress = [](std::int16_t&) { throw std::runtime_error("client"); };
    EXPECT_NO_THROW(impl.RaiseProgress(10));
}

TEST(StatusReport, GroupAndGeneralSettingsFailure) {
    auto fake = std::make_shared<FakeTransport>();
    fake->returns("vb_Read_Meter_Options", {ME_TIME_OUT, 0});
    detail::MeterDll session(fake);
    XMLWrapper status = newDoc(doc_kind::status);
    METER_REC rec{};
    std::string error = "earlier";
    EXPECT_EQ(detail::GetAllGeneralSettings(session, rec, status, error), ME_TIME_OUT);
    EXPECT_EQ(error, "Operation failed;earlier ; GetAllGeneralSettings failed. Error is : Timeout error");
    EXPECT_EQ(statusGroups(status), (std::vector<StatusGroup>{{"-17", "-2", error, "none"}}));
    EXPECT_EQ(detail::GetAllGeneralSettings(session, rec, status, error), 0);
    EXPECT_EQ(statusGroups(status).size(), 1u);
}

// The frame's checks, seen through clearMeter on a discovered type-3 meter.
struct Frame : WrapperTest {
    void SetUp() override {
        WrapperTest::SetUp();
        discover(eDunmark);
    }
    std::int32_t clear(const std::string& port, const std::string& sn, const std::string& type) {
        XMLWrapper doc = deviceDoc(port, sn, type);
        return wrapper->clearMeter(rec, doc, status);
    }
    std::string serial() const { return sim::meter().serial; }
};

TEST_F(Frame, PortThatIsNotANumberIsPortZeroAndANegativeOneIsRefused) {
    for (const char* port : {"abc", ""}) {
        status = newDoc(doc_kind::status);
        EXPECT_EQ(clear(port, serial(), "3"), ME_SUCCESS) << port;
        EXPECT_TRUE(statusGroups(status).empty());
    }
    completions = 0;
    const int closed = closes();
    EXPECT_EQ(clear("-1", serial(), "3"), ME_BAD_PARAMETER);
    EXPECT_EQ(statusGroups(status),
              (std::vector<StatusGroup>{{"-17", "-19",
                                         "Bad parameter passed to the function ; Port number from XML file is invalid",
                                         "none"}}));
    EXPECT_EQ(completions, 1);
    EXPECT_EQ(closes(), closed);
}

TEST_F(Frame, SerialNumberAndTypeMustBePresentAndInRange) {
    struct Case {
        const char* sn;
        const char* type;
        const char* context;
    };
    for (Case c : {Case{"", "3", " ; Device SN from Device Info XML is invalid"},
                   Case{"X", "0", " ; Device Type from Device Info XML is invalid"},
                   Case{"X", "9", " ; Device Type from Device Info XML is invalid"},
                   Case{"X", "", " ; Device Type from Device Info XML is invalid"}}) {
        status = newDoc(doc_kind::status);
        completions = 0;
        EXPECT_EQ(clear("1", c.sn, c.type), ME_BAD_PARAMETER) << c.type;
        EXPECT_EQ(statusGroups(status),
                  (std::vector<StatusGroup>{
                      {"-17", "-19", std::string("Bad parameter passed to the function") + c.context, "none"}}));
        EXPECT_EQ(completions, 1);
    }
}

TEST_F(Frame, SerialNumbersCompareWithoutCaseAndTypesByValue) {
    std::string lower = serial();
    for (char& ch : lower) ch = static_cast<char>(std::tolower(static_cast<unsigned char>(ch)));
    EXPECT_EQ(clear("1", lower, "3.0"), ME_SUCCESS);
    EXPECT_TRUE(statusGroups(status).empty());
}

TEST_F(Frame, TypeMismatchWritesDifferentDeviceAndReturnsFail) {
    for (const char* type : {"8", "3.5"}) {
        status = newDoc(doc_kind::status);
        completions = 0;
        const int closed = closes();
        EXPECT_EQ(clear("1", serial(), type), ME_FAIL) << type;
        EXPECT_EQ(statusGroups(status),
                  (std::vector<StatusGroup>{{"-8", "-8",
                                             std::string("Different device detected ; Device Type from Device Info "
                                                         "XML - ") + type + " Device Type from device - 3 do not match",
                                             "none"}}));
        EXPECT_EQ(completions, 1);
        EXPECT_EQ(closes(), closed);
    }
    EXPECT_FALSE(sim::meter().datalog.empty());
}

TEST_F(Frame, SerialMismatchAndASilentMeter) {
    EXPECT_EQ(clear("1", "ABC123", "3"), ME_DIFFERENT_DEVICE);
    EXPECT_EQ(statusGroups(status),
              (std::vector<StatusGroup>{{"-8", "-8",
                                         "Different device detected ; Device SN from Device Info XML - ABC123 Device "
                                         "SN from device - " + serial() + " do not match",
                                         "none"}}));
    EXPECT_EQ(completions, 1);

    // A meter that does not answer ends the request without onComplete.
    sim::detach();
    status = newDoc(doc_kind::status);
    completions = 0;
    EXPECT_EQ(clear("1", serial(), "3"), ME_NO_DEVICE);
    EXPECT_EQ(statusGroups(status), (std::vector<StatusGroup>{{"-17", "-13", "No device found", "none"}}));
    EXPECT_EQ(completions, 0);
}

TEST_F(Frame, UnexpectedErrorIsReportedClosesCompletesAndReachesTheClient) {
    XMLWrapper noPortInfo = newDoc(doc_kind::status);
    const int closed = closes();
    try {
        wrapper->clearMeter(rec, noPortInfo, status);
        FAIL() << "no error";
    } catch (const ComponentError& e) {
        EXPECT_EQ(e.number(), errc::missing_object);
        EXPECT_EQ(e.description(), "doAction --> ");
    }
    const auto groups = statusGroups(status);
    ASSERT_EQ(groups.size(), 1u);
    EXPECT_EQ(groups[0].major, "-17");
    EXPECT_EQ(groups[0].minor, "-16");
    EXPECT_EQ(groups[0].desc.rfind("Unknown status;Error number = 91 Error description = ", 0), 0u) << groups[0].desc;
    EXPECT_EQ(groups[0].trace, "0");
    EXPECT_EQ(completions, 1);
    EXPECT_EQ(closes(), closed + 1);

    // -50 keeps the meter open; the next request's trace starts afresh.
    rec.Error_code = -50;
    try {
        wrapper->clearMeter(rec, noPortInfo, status);
        FAIL() << "no error";
    } catch (const ComponentError& e) {
        EXPECT_EQ(e.description(), "doAction --> ");
    }
    EXPECT_EQ(closes(), closed + 1);
    EXPECT_EQ(completions, 2);
}

TEST(FrameTrace, ErrorsBelowTheRequestKeepTheirChain) {
    setThreadClock(std::make_shared<ManualClock>());
    auto fake = std::make_shared<FakeTransport>();
    fake->does("vb_Chk4Meter", [](FakeArgs& a) {
        a.rec->M_Type = 3;
        a.rec->Serial_number[0] = 'S';
    });
    fake->does("vb_Clear_Meter_Datalog", [](FakeArgs&) { detail::raise(errc::overflow, "Overflow"); });
    DllWrapper wrapper(fake);
    METER_REC rec{};
    XMLWrapper doc = deviceDoc("1", "S", "3");
    XMLWrapper status = newDoc(doc_kind::status);
    try {
        wrapper.clearMeter(rec, doc, status);
        FAIL() << "no error";
    } catch (const ComponentError& e) {
        EXPECT_EQ(e.number(), errc::overflow);
        EXPECT_EQ(e.description(), "doAction --> clearMeter --> ");
    }
    EXPECT_EQ(statusGroups(status)[0].desc, "Unknown status;Error number = 6 Error description = clearMeter --> ");
    EXPECT_FALSE(detail::frmTimer().tmrStatus().enabled());
    setThreadClock(nullptr);
}

}  // namespace
