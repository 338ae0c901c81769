// A DllWrapper over the statically linked simulator on a virtual clock, with
// the documents a client passes in and readers for what the requests wrote.
#pragma once

#include <gtest/gtest.h>

#include <pugixml.hpp>

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "simulator.h"
#include "support/sim_transport.h"
#include "util/helpers.h"
#include "varnel/clock.h"
#include "varnel/dll_wrapper.h"
#include "varnel/vantrix32.h"
#include "varnel/xml_wrapper.h"

namespace varnel::test {

// One ErrCode/ErrDesc group of a status document.
struct StatusGroup {
    std::string major, minor, desc, trace;  // trace: the VBTrace text, or "none"
    bool operator==(const StatusGroup&) const = default;
};

inline void PrintTo(const StatusGroup& g, std::ostream* os) {
    *os << "{" << g.major << ", " << g.minor << ", \"" << g.desc << "\", " << g.trace << "}";
}

// The groups of a status document, in order.
inline std::vector<StatusGroup> statusGroups(const XMLWrapper& status) {
    pugi::xml_document doc;
    doc.load_string(status.XML().c_str());
    std::vector<StatusGroup> groups;
    for (pugi::xml_node n : doc.document_element().children()) {
        const std::string name = n.name();
        if (name == "ErrCode")
            groups.push_back({n.child_value("Major"), n.child_value("Minor"), "", "none"});
        else if (name == "ErrDesc" && !groups.empty())
            groups.back().desc = n.child_value();
        else if (name == "VBTrace" && !groups.empty())
            groups.back().trace = n.child_value();
    }
    return groups;
}

// A document as a pugixml tree, for reading back what a request wrote.
inline std::unique_ptr<pugi::xml_document> parsed(const XMLWrapper& doc) {
    auto tree = std::make_unique<pugi::xml_document>();
    tree->load_string(doc.XML().c_str());
    return tree;
}

inline XMLWrapper connectionDoc(const std::string& ports, const std::string& kind = "COM") {
    XMLWrapper doc;
    doc.InitDocument(doc_kind::connection_info);
    doc.SelectElement("Ports");
    doc.AddElement(kind);
    doc.AddChildElement("PortsToSearch", "", ports);
    return doc;
}

inline XMLWrapper deviceDoc(const std::string& port, const std::string& sn, const std::string& type) {
    XMLWrapper doc;
    doc.InitDocument(doc_kind::device_info);
    doc.SelectElement("DeviceInfo");
    doc.AddElement("SN", sn);
    doc.AddElement("TypeID", type);
    doc.SelectElement("PortInfo");
    doc.AddElement("PortID", port);
    doc.MoveToRoot();
    return doc;
}

inline XMLWrapper newDoc(std::int32_t kind) {
    XMLWrapper doc;
    doc.InitDocument(kind);
    return doc;
}

struct WrapperTest : ::testing::Test {
    std::shared_ptr<ManualClock> clock = std::make_shared<ManualClock>(1000);
    std::unique_ptr<DllWrapper> wrapper;
    METER_REC rec{};
    XMLWrapper status = newDoc(doc_kind::status);
    XMLWrapper device = newDoc(doc_kind::device_info);
    std::vector<int> progress;
    int completions = 0;

    void SetUp() override {
        setThreadClock(clock);
        sim::reset();
        detail::SetContinueFlag(true);
        wrapper = std::make_unique<DllWrapper>(simTransport());
        wrapper->setOnProgress([this](std::int16_t& p) { progress.push_back(p); });
        wrapper->setOnComplete([this] { ++completions; });
    }
    void TearDown() override {
        wrapper.reset();
        vx_set_yield_hook(nullptr, nullptr);
        sim::reset();
        setThreadClock(nullptr);
    }

    // Attaches the default meter of a type and discovers it on its port.
    void discover(int type) {
        sim::selectType(type);
        discoverLoaded();
    }
    void discoverLoaded() {
        device = newDoc(doc_kind::device_info);
        XMLWrapper conn = connectionDoc(std::to_string(sim::meter().port));
        ASSERT_EQ(wrapper->discoverDevice(rec, device, conn, status), ME_SUCCESS);
        status = newDoc(doc_kind::status);
        progress.clear();
        completions = 0;
    }
    int closes() const { return sim::callCount("close_meter"); }
};

}  // namespace varnel::test
