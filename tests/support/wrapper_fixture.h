// A DllWrapper over the statically linked simulator on a virtual clock, the
// documents a client passes in, and readers for what the requests wrote.
#pragma once

#include <gtest/gtest.h>

#include <pugixml.hpp>

#include <memory>
#include <string>
#include <vector>

#include "component/wrapper_access.h"
#include "errors/err_propagator.h"
#include "platform/message_pump.h"
#include "simulator.h"
#include "support/client_session.h"
#include "support/kept_documents.h"
#include "support/sim_transport.h"
#include "util/helpers.h"
#include "varnel/clock.h"
#include "varnel/dll_wrapper.h"
#include "varnel/xml_wrapper.h"

namespace varnel::test {

using Names = std::vector<std::string>;

// The one report of a request that went well.
inline const std::string kReportOk = "0/0/Operation completed successfully";

// The status document's groups, each as "Major/Minor/ErrDesc", with "/VBTrace" when present.
inline std::vector<std::string> statusGroups(const XMLWrapper& status) {
    pugi::xml_document doc;
    doc.load_string(status.XML().c_str());
    std::vector<std::string> groups;
    for (pugi::xml_node n : doc.document_element().children()) {
        const std::string name = n.name();
        if (name == "ErrCode")
            groups.push_back(std::string(n.child_value("Major")) + "/" + n.child_value("Minor"));
        else if (!groups.empty() && (name == "ErrDesc" || name == "VBTrace"))
            groups.back() += "/" + std::string(n.child_value());
    }
    return groups;
}

// The status groups joined by " | "; a single group reads as it is.
inline std::string statusText(const XMLWrapper& status) {
    std::string text;
    for (const std::string& g : statusGroups(status)) text += (text.empty() ? "" : " | ") + g;
    return text;
}

// A node's attributes as "name=value " each, then its text.
inline std::string nodeText(pugi::xml_node n) {
    std::string out;
    for (pugi::xml_attribute a : n.attributes()) out += std::string(a.name()) + "=" + a.value() + " ";
    return out + n.child_value();
}

// The names of a node's children, each followed by a blank.
inline std::string childNames(pugi::xml_node n) {
    std::string names;
    for (pugi::xml_node c : n.children()) names += c.name() + std::string(" ");
    return names;
}

inline std::vector<std::string> childTexts(pugi::xml_node n) {
    std::vector<std::string> out;
    for (pugi::xml_node c : n.children()) out.push_back(nodeText(c));
    return out;
}

inline std::shared_ptr<pugi::xml_document> parsed(const XMLWrapper& doc) {
    auto tree = std::make_shared<pugi::xml_document>();
    tree->load_string(doc.XML().c_str());
    return tree;
}

inline XMLWrapper deviceDoc(const std::string& port, const std::string& sn, const std::string& type) {
    XMLWrapper doc = newDoc(doc_kind::device_info);
    doc.SelectElement("DeviceInfo");
    doc.AddElement("SN", sn);
    doc.AddElement("TypeID", type);
    doc.SelectElement("PortInfo");
    doc.AddElement("PortID", port);
    return doc;
}

// A settings document as a client writes it: the meter it is for, then the items; empty when it does not load.
inline XMLWrapper settingsDoc(const std::string& sn, const std::string& type, const std::string& settings,
                              const std::string& root = "DeviceSettings") {
    XMLWrapper doc;
    doc.LoadXML("<" + root + "><DeviceInfo><SN>" + sn + "</SN><TypeID>" + type + "</TypeID></DeviceInfo><Settings>" +
                settings + "</Settings></" + root + ">");
    return doc;
}

// Runs a request (or a routine, with the trace started afresh) that must
// fail unexpectedly; the error's number and trace.
template <class F>
std::string unexpectedTrace(F&& request) {
    detail::errPropagator().reset();
    try {
        request();
    } catch (const ComponentError& e) {
        return std::to_string(e.number()) + " " + e.description();
    }
    return "no error";
}

struct WrapperTest : ::testing::Test {
    std::shared_ptr<ManualClock> clock = std::make_shared<ManualClock>(1000);
    std::unique_ptr<RecordingWrapper> wrapper;
    METER_REC rec{};
    XMLWrapper status = newDoc(doc_kind::status);
    XMLWrapper device;
    std::vector<int> progress;
    int completions = 0;
    int closedBefore = 0;

    void SetUp() override {
        setThreadClock(clock);
        sim::reset();
        detail::SetContinueFlag(true);
        wrapper = std::make_unique<RecordingWrapper>(simTransport());
        wrapper->setOnProgress([this](std::int16_t& p) { progress.push_back(p); });
        wrapper->setOnComplete([this] { ++completions; });
    }
    void TearDown() override {
        wrapper.reset();
        vx_set_yield_hook(nullptr, nullptr);
        sim::reset();
        setThreadClock(nullptr);
    }
    // Attaches the default meter of a type, or this meter, and discovers it on its port.
    void discover(int type) {
        sim::selectType(type);
        attach();
    }
    void discover(const sim::MeterProfile& profile) {
        sim::loadProfile(profile);
        attach();
    }
    void attach() {
        device = newDoc(doc_kind::device_info);
        XMLWrapper conn = connectionDoc(std::to_string(sim::meter().port));
        ASSERT_EQ(wrapper->discoverDevice(rec, device, conn, status), ME_SUCCESS);
        fresh();
    }
    // Every setting the discovered meter reports, parsed.
    std::shared_ptr<pugi::xml_document> readSettings() {
        XMLWrapper cfg = newDoc(doc_kind::device_settings);
        bool checked = false;
        fresh();
        EXPECT_EQ(wrapper->getDeviceSettings(rec, device, cfg, true, status, checked), ME_SUCCESS);
        return parsed(cfg);
    }
    // A new status document, and counting of events and closes from now on.
    void fresh() {
        status = newDoc(doc_kind::status);
        progress.clear();
        completions = 0;
        closedBefore = sim::callCount("close_meter");
    }
    bool closed() const { return sim::callCount("close_meter") > closedBefore; }
    std::string report() const { return statusText(status); }
    // An exit of a request: its result, its one report, whether it closed the meter, how often onComplete came.
    void expectExit(std::int32_t got, std::int32_t result, const std::string& text, bool closes,
                    int completed = 1) const {
        EXPECT_EQ(got, result);
        EXPECT_EQ(report(), text);
        EXPECT_EQ(closed(), closes);
        EXPECT_EQ(completions, completed);
    }
    // The unexpected-error handler's exit: one -17/-16 report beginning with start, the meter closed, onComplete.
    void expectUnexpected(const std::string& start) const {
        EXPECT_EQ(report().rfind("-17/-16/" + start, 0), 0u) << report();
        EXPECT_EQ(report().find(" | "), std::string::npos) << report();
        EXPECT_TRUE(closed());
        EXPECT_EQ(completions, 1);
    }
};

}  // namespace varnel::test
