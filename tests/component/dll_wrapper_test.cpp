#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <regex>
#include <utility>

#include "contracts/xml_document.h"
#include "requests/request_context.h"
#include "support/fake_transport.h"
#include "support/wrapper_fixture.h"

using namespace varnel;
using namespace varnel::test;

namespace {

TEST(ProgressStage, StagesHalvesToEvenAndDroppedEvents) {
    detail::RequestContext impl{std::make_shared<FakeTransport>()};
    std::vector<int> raised;
    impl.onProgress = [&](std::int16_t& p) { raised.push_back(p); };
    auto raise = [&](std::initializer_list<std::int16_t> values) {
        for (std::int16_t v : values) impl.RaiseProgress(v);
        return std::exchange(raised, {});
    };
    impl.PercentLimit(0);  // changes nothing
    EXPECT_EQ(impl.PercentLimit(), 100);
    impl.resetPercentage();
    impl.PercentLimit(25);
    EXPECT_EQ(raise({50, 54, 0, -5}), (std::vector<int>{12, 14}));
    impl.PercentLimit(100);
    EXPECT_EQ(raise({1, 50, 100}), (std::vector<int>{26, 63, 100}));
    impl.resetPercentage();
    impl.PercentLimit(100);
    EXPECT_EQ(raise({327, 328}), std::vector<int>{327});  // 100 x 328 overflows 16 bits
    impl.onProgress = [](std::int16_t&) { throw std::runtime_error("client"); };
    EXPECT_NO_THROW(impl.RaiseProgress(10));
}

struct Requests : WrapperTest {
    // clearMeter on the meter as discovered.
    std::int32_t clear() {
        XMLWrapper doc = deviceDoc("1", sim::meter().serial, std::to_string(sim::meter().type));
        return wrapper->clearMeter(rec, doc, status);
    }
};

// A failed erase: the fault sweep; keeping the meter open: device_info_test.
TEST_F(Requests, AnEraseReportsItsOwnStageToAHandlerThatCannotChangeIt) {
    discover(eDunmark);
    const auto erase = [&](bool meddle) {
        wrapper->setOnProgress([&, meddle](std::int16_t& p) {
            progress.push_back(p);
            if (meddle) p = 100;
        });
        fresh();
        EXPECT_EQ(clear(), ME_SUCCESS);
        return progress;
    };
    const std::vector<int> plain = erase(false);
    EXPECT_TRUE(sim::meter().datalog.empty());
    EXPECT_TRUE(statusGroups(status).empty());
    EXPECT_EQ(completions, 1);
    EXPECT_FALSE(closed());
    EXPECT_FALSE(detail::frmTimer().tmrStatus().enabled());
    // 1.5 s of erasing, ticks every 0.4 s, in one stage from 0 whatever an earlier request left.
    ASSERT_GE(plain.size(), 3u);
    EXPECT_TRUE(std::is_sorted(plain.begin(), plain.end()));
    EXPECT_GT(plain.front(), 0);
    EXPECT_LT(plain.front(), 50);
    // A handler that changes the value it is given changes nothing that follows.
    EXPECT_EQ(erase(true), plain);
}

TEST_F(Requests, ErasesThatFailWithoutACodeOrRaiseAreFailures) {
    auto fake = std::make_shared<FakeTransport>();
    fake->does("vb_Chk4Meter", [](FakeArgs& a) { a.rec->M_Type = 3; });
    fake->returns("vb_Clear_Meter_Datalog", {ME_FAIL});  // Error_code stays 0
    DllWrapper own = detail::wrapperOver(fake);
    rec.Serial_number[0] = 'S';
    XMLWrapper doc = deviceDoc("1", "S", "3");
    EXPECT_EQ(own.clearMeter(rec, doc, status), ME_FAIL);
    EXPECT_EQ(statusGroups(status), std::vector<std::string>{"-17/-17/Operation failed"});

    // An error below the request keeps its chain of routines.
    fresh();
    fake->does("vb_Clear_Meter_Datalog", [](FakeArgs&) { detail::raise(errc::overflow, "Overflow"); });
    EXPECT_EQ(unexpectedTrace([&] { own.clearMeter(rec, doc, status); }), "6 doAction --> clearMeter --> ");
    EXPECT_EQ(statusGroups(status), std::vector<std::string>{"-17/-16/Unknown status;Error number = 6 "
                                                             "Error description = clearMeter --> /0"});
}

// closeMeter returns without onComplete, released or not, unless it fails unexpectedly.
TEST_F(Requests, CloseReleasesThePortQuietly) {
    discover(eCorviaZenta);
    sim::injectFault("close_meter", 1, ME_TIME_OUT, false);
    EXPECT_NE(wrapper->closeMeter(rec), ME_SUCCESS);
    EXPECT_EQ(wrapper->closeMeter(rec), ME_SUCCESS);
    EXPECT_FALSE(sim::portOpen());
    EXPECT_EQ(completions, 0);

    auto fake = std::make_shared<FakeTransport>();
    fake->does("close_meter", [](FakeArgs&) { detail::raise(errc::internal, "port stuck"); });
    DllWrapper own = detail::wrapperOver(fake);
    own.setOnComplete([this] { ++completions; });
    rec.Error_code = -50;  // closeMeter closes whatever the record says
    EXPECT_EQ(unexpectedTrace([&] { own.closeMeter(rec); }), "51 doAction --> MeterClose --> ");
    EXPECT_EQ(completions, 1);
    EXPECT_EQ(std::ranges::count(fake->names(), "close_meter"), 2);  // tried again by the handler
}

// The device information checks themselves: requests/device_info_test.cpp.
TEST_F(Requests, AMissingMeterAndUnexpectedErrors) {
    discover(eDunmark);
    // A meter that does not answer ends the request without onComplete.
    sim::detach();
    fresh();
    EXPECT_EQ(clear(), ME_NO_DEVICE);
    EXPECT_EQ(statusGroups(status), std::vector<std::string>{"-17/-13/No device found"});
    EXPECT_EQ(completions, 0);

    // Unexpected errors are reported, close, complete and reach the client.
    XMLWrapper noPortInfo = newDoc(doc_kind::status);
    for (std::int16_t keep : {0, -50}) {
        fresh();
        rec.Error_code = keep;
        EXPECT_EQ(unexpectedTrace([&] { wrapper->clearMeter(rec, noPortInfo, status); }), "91 doAction --> ");
        // One report, without a line number.
        // std::regex: GoogleTest's own regex on Windows has no bracket expressions.
        const std::regex unexpected("-17/-16/Unknown status;Error number = 91 Error description = [^|]*/0");
        EXPECT_TRUE(std::regex_match(report(), unexpected)) << report();
        EXPECT_EQ(completions, 1);
        EXPECT_EQ(closed(), keep != -50);
    }
}

// Documents of another XML component, reached through the sixteen operations alone
// (here a document of ours behind that interface, counting its calls).
struct OtherComponentDoc : detail::XmlDocument {
    XMLWrapper doc;
    int calls = 0;
    std::string failing;  // an operation that fails, as that component reports it
    void call(const char* op) {
        ++calls;
        if (failing == op) throw ComponentError(1004, std::string(op) + ": refused by the other component");
    }
    void AddElement(const std::string& n, const std::string& t) override { call("AddElement"), doc.AddElement(n, t); }
    std::int32_t GetChildCount() override { return call("GetChildCount"), doc.GetChildCount(); }
    void SetAttribute(const std::string& n, const std::string& v) override {
        call("SetAttribute"), doc.SetAttribute(n, v);
    }
    void AddChildElement(const std::string& n, const std::string& p, const std::string& t) override {
        call("AddChildElement"), doc.AddChildElement(n, p, t);
    }
    void MoveToRoot() override { call("MoveToRoot"), doc.MoveToRoot(); }
    void MoveToChild(const std::string& n) override { call("MoveToChild"), doc.MoveToChild(n); }
    std::string GetChildAttribute(const std::string& c, const std::string& a) override {
        return call("GetChildAttribute"), doc.GetChildAttribute(c, a);
    }
    std::string GetChildAttributeAt(std::int32_t i, const std::string& a) override {
        return call("GetChildAttributeAt"), doc.GetChildAttributeAt(i, a);
    }
    std::string GetChildValue(const std::string& n) override { return call("GetChildValue"), doc.GetChildValue(n); }
    std::string GetChildValueAt(std::int32_t i) override { return call("GetChildValueAt"), doc.GetChildValueAt(i); }
    std::string GetChildName(std::int32_t i) override { return call("GetChildName"), doc.GetChildName(i); }
    void InitDocument(std::int32_t k) override { call("InitDocument"), doc.InitDocument(k); }
    std::int32_t CountElements(const std::string& n) override { return call("CountElements"), doc.CountElements(n); }
    void SetChildAttribute(const std::string& n, const std::string& v) override {
        call("SetChildAttribute"), doc.SetChildAttribute(n, v);
    }
    void SelectElement(const std::string& n) override { call("SelectElement"), doc.SelectElement(n); }
    std::string GetRootName() override { return call("GetRootName"), doc.GetRootName(); }
};

// Every request writes the same documents into another component's objects as
// into ours, using nothing but the sixteen operations (the text operations of
// such a document raise); a failing operation is an unexpected error.
TEST_F(Requests, DocumentsOfAnotherComponentGetTheSameContent) {
    discover(eParvix);
    auto other = [](std::int32_t kind) {
        auto d = std::make_shared<OtherComponentDoc>();
        d->doc.InitDocument(kind);
        return d;
    };
    auto dev = other(doc_kind::device_info), log = other(doc_kind::datalog), st = other(doc_kind::status);
    auto conn = other(doc_kind::connection_info);
    conn->doc = connectionDoc(std::to_string(sim::meter().port));
    XMLWrapper devDoc = detail::documentOver(dev), logDoc = detail::documentOver(log);
    XMLWrapper stDoc = detail::documentOver(st), connDoc = detail::documentOver(conn);
    EXPECT_THROW(logDoc.XML(), ComponentError);
    ASSERT_EQ(wrapper->discoverDevice(rec, devDoc, connDoc, stDoc), ME_SUCCESS);
    EXPECT_EQ(dev->doc.XML(), device.XML());

    bool checked = false;
    XMLWrapper ours = newDoc(doc_kind::datalog), filter = newDoc(doc_kind::filter);
    ASSERT_EQ(wrapper->getReadings(rec, device, ours, filter, status, checked), ME_SUCCESS);
    ASSERT_EQ(wrapper->getReadings(rec, devDoc, logDoc, filter, stDoc, checked), ME_SUCCESS);
    EXPECT_EQ(log->doc.XML(), ours.XML());
    EXPECT_GT(log->calls, 100);

    fresh();
    log->doc.InitDocument(doc_kind::datalog);
    log->failing = "SetAttribute";
    EXPECT_EQ(unexpectedTrace([&] {
                  wrapper->getReadings(rec, devDoc, logDoc, filter, stDoc, checked);
              }).rfind("1004 getReadings --> ", 0),
              0u);
    ASSERT_EQ(statusGroups(st->doc).size(), 1u);
    EXPECT_TRUE(statusGroups(st->doc)[0].starts_with("-17/-16/Unknown status;Error number = 1004 "))
        << statusGroups(st->doc)[0];
    EXPECT_EQ(completions, 1);
}

}  // namespace
