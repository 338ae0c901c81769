// The C interface on the shipped simulated transport library, loaded the way
// a C client loads it (varnel_new(NULL)), on a virtual clock.
#include <dlfcn.h>
#include <gtest/gtest.h>

#include <pugixml.hpp>

#include <memory>
#include <new>
#include <stdexcept>
#include <string>
#include <vector>

#include "varnel/clock.h"
#include "varnel/component_error.h"
#include "varnel/dll_wrapper.h"
#include "varnel/varnel.h"
#include "varnel/xml_wrapper.h"

namespace {

using DocPtr = std::unique_ptr<varnel_doc, decltype(&varnel_doc_free)>;

DocPtr doc(std::int32_t kind) { return DocPtr(varnel_doc_new_kind(kind), &varnel_doc_free); }

std::string text(const varnel_doc* d) {
    char* xml = varnel_doc_xml(d);
    std::string out = xml ? xml : "(null)";
    varnel_free(xml);
    return out;
}

pugi::xml_document parse(const varnel_doc* d) {
    pugi::xml_document tree;
    tree.load_string(text(d).c_str());
    return tree;
}

// "Major/Minor" of each report in a status document.
std::vector<std::string> reports(const varnel_doc* status) {
    std::vector<std::string> out;
    for (pugi::xml_node n : parse(status).document_element().children("ErrCode"))
        out.push_back(std::string(n.child_value("Major")) + "/" + n.child_value("Minor"));
    return out;
}

DocPtr loaded(const char* xml) {
    DocPtr d(varnel_doc_new(), &varnel_doc_free);
    EXPECT_EQ(varnel_doc_load(d.get(), xml), 0) << xml;
    return d;
}

// The control functions of the transport library the component loaded (the same instance).
struct Simulator {
    void* library = dlopen(VARNEL_TEST_TRANSPORT_PATH, RTLD_NOW | RTLD_LOCAL);
    ~Simulator() {
        if (library) dlclose(library);
    }
    int call(const char* name, int arg) {
        auto fn = reinterpret_cast<int (*)(int)>(dlsym(library, name));
        return fn ? fn(arg) : -999;
    }
    int reset() { return reinterpret_cast<int (*)()>(dlsym(library, "vxsim_reset"))(); }
    int detach() { return reinterpret_cast<int (*)()>(dlsym(library, "vxsim_detach"))(); }
};

struct Events {
    std::vector<int> progress;
    int completions = 0;
};

struct CInterface : ::testing::Test {
    std::shared_ptr<varnel::ManualClock> clock = std::make_shared<varnel::ManualClock>(1000);
    varnel_component* c = nullptr;
    Simulator sim;
    METER_REC rec{};
    Events events;
    DocPtr device = doc(varnel::doc_kind::device_info);
    DocPtr status = doc(varnel::doc_kind::status);

    void SetUp() override {
        varnel::setThreadClock(clock);
        c = varnel_new(nullptr);
        ASSERT_NE(c, nullptr);
        varnel_on_progress(c, [](int16_t* p, void* user) { static_cast<Events*>(user)->progress.push_back(*p); },
                           &events);
        varnel_on_complete(c, [](void* user) { ++static_cast<Events*>(user)->completions; }, &events);
    }
    void TearDown() override {
        varnel_delete(c);
        if (sim.library) sim.reset();
        varnel::setThreadClock(nullptr);
    }
    std::int32_t discover(int port = 1) {
        const std::string xml = "<ConnectionInfo><Ports><COM><PortsToSearch>" + std::to_string(port) +
                                "</PortsToSearch></COM></Ports></ConnectionInfo>";
        DocPtr conn = loaded(xml.c_str());
        return varnel_discover_device(c, &rec, device.get(), conn.get(), status.get());
    }
    void fresh() {
        status = doc(varnel::doc_kind::status);
        events = Events{};
    }
};

TEST(CDocuments, KindsLoadingAndText) {
    struct Case { std::int32_t kind; const char* root; };
    for (const Case& k : {Case{1, "Device"}, Case{2, "DeviceSettings"}, Case{3, "ConnectionInfo"},
                          Case{4, "DeviceCaps"}, Case{5, "Datalog"}, Case{6, "Filter"}, Case{7, "Status"}}) {
        DocPtr d = doc(k.kind);
        ASSERT_NE(d, nullptr) << k.kind;
        EXPECT_STREQ(parse(d.get()).document_element().name(), k.root);
    }
    EXPECT_EQ(varnel_doc_new_kind(99), nullptr);  // refused, not an empty document
    EXPECT_EQ(varnel_doc_new_kind(-1), nullptr);

    DocPtr empty(varnel_doc_new(), &varnel_doc_free);
    EXPECT_EQ(text(empty.get()), "");
    EXPECT_EQ(text(nullptr), "(null)");

    // A malformed text leaves the document as it was.
    DocPtr d = loaded("<A><B x=\"1\">t</B></A>");
    const std::string before = text(d.get());
    for (const char* bad : {"", "<A>", "<A></B>", "<A x='1' x='2'/>", "<A>&undeclared;</A>", "<A/><B/>",
                            "<A>\x01</A>", "<!DOCTYPE A [<!ENTITY e \"x\">]><A>&e;</A>"}) {
        EXPECT_NE(varnel_doc_load(d.get(), bad), 0) << bad;
        EXPECT_EQ(text(d.get()), before) << bad;
    }
    EXPECT_NE(varnel_doc_load(d.get(), nullptr), 0);
    EXPECT_NE(varnel_doc_load(nullptr, "<A/>"), 0);
    EXPECT_EQ(text(d.get()), before);

    // Releasing nothing is allowed.
    varnel_doc_free(nullptr);
    varnel_free(nullptr);
    varnel_delete(nullptr);
}

TEST_F(CInterface, EveryRequestOnTheSimulator) {
    ASSERT_NE(sim.library, nullptr);
    ASSERT_EQ(sim.call("vxsim_select_type", 4), 0);
    ASSERT_EQ(discover(), ME_SUCCESS);
    EXPECT_EQ(rec.M_Type, 4);
    EXPECT_TRUE(reports(status.get()).empty()) << text(status.get());
    pugi::xml_document info = parse(device.get());
    EXPECT_STREQ(info.child("Device").child("DeviceInfo").child_value("TypeID"), "4");
    EXPECT_STREQ(info.child("Device").child("PortInfo").child_value("PortID"), "1");

    fresh();
    DocPtr settings = doc(varnel::doc_kind::device_settings);
    int check = -1;
    ASSERT_EQ(varnel_get_device_settings(c, &rec, device.get(), settings.get(), 1, status.get(), &check),
              ME_SUCCESS) << text(status.get());
    EXPECT_TRUE(check == 0 || check == 1) << check;  // written, as a C truth value
    EXPECT_FALSE(parse(settings.get()).child("DeviceSettings").child("Settings").child("Clock").empty());
    EXPECT_EQ(events.completions, 1);

    // Listing mode: only the items asked for come back.
    fresh();
    DocPtr listed = loaded("<DeviceSettings><DeviceInfo/><Settings><Clock/></Settings></DeviceSettings>");
    ASSERT_EQ(varnel_get_device_settings(c, &rec, device.get(), listed.get(), 0, status.get(), nullptr),
              ME_SUCCESS) << text(status.get());
    pugi::xml_node items = parse(listed.get()).child("DeviceSettings").child("Settings");
    EXPECT_FALSE(items.child("Clock").empty());
    EXPECT_EQ(std::distance(items.begin(), items.end()), 1);

    fresh();
    DocPtr caps = doc(varnel::doc_kind::device_caps);
    ASSERT_EQ(varnel_get_device_caps(c, &rec, device.get(), caps.get(), 1, status.get(), &check), ME_SUCCESS)
        << text(status.get());
    EXPECT_FALSE(parse(caps.get()).child("DeviceCaps").child("Records").first_child().empty());

    // The settings as read go back unchanged.
    fresh();
    EXPECT_EQ(varnel_set_device_settings(c, &rec, device.get(), settings.get(), status.get()), ME_SUCCESS)
        << text(status.get());

    fresh();
    DocPtr datalog = doc(varnel::doc_kind::datalog);
    ASSERT_EQ(varnel_get_readings(c, &rec, device.get(), datalog.get(), nullptr, status.get(), &check), ME_SUCCESS)
        << text(status.get());
    pugi::xml_node records = parse(datalog.get()).child("Datalog").child("Records");
    const auto uploaded = std::distance(records.begin(), records.end());
    EXPECT_GT(uploaded, 0);
    EXPECT_EQ(events.completions, 1);
    ASSERT_FALSE(events.progress.empty());
    EXPECT_TRUE(std::is_sorted(events.progress.begin(), events.progress.end()));
    EXPECT_LE(events.progress.back(), 100);

    fresh();
    EXPECT_EQ(varnel_clear_meter(c, &rec, device.get(), status.get()), ME_SUCCESS) << text(status.get());
    fresh();
    DocPtr after = doc(varnel::doc_kind::datalog);
    DocPtr filter = doc(varnel::doc_kind::filter);
    EXPECT_EQ(varnel_get_readings(c, &rec, device.get(), after.get(), filter.get(), status.get(), nullptr),
              ME_SUCCESS);
    pugi::xml_node left = parse(after.get()).child("Datalog").child("Records");
    EXPECT_EQ(std::distance(left.begin(), left.end()), 0) << "erased meter still has " << uploaded << " records";

    fresh();
    EXPECT_EQ(varnel_close_meter(c, &rec), ME_SUCCESS);
    EXPECT_EQ(events.completions, 0);  // closing raises no completion
    EXPECT_EQ(varnel_error_number(c), 0);
    EXPECT_EQ(varnel_error_text(c), nullptr);
}

TEST_F(CInterface, ProgressHandlerMayChangeThePercentAndHandlersCanBeRemoved) {
    ASSERT_EQ(sim.call("vxsim_select_type", 4), 0);
    ASSERT_EQ(discover(), ME_SUCCESS);
    struct Seen { std::vector<int> raw; } seen;
    varnel_on_progress(
        c,
        [](int16_t* p, void* user) {
            static_cast<Seen*>(user)->raw.push_back(*p);
            *p = 0;  // the handler's change must not disturb the request's own count
        },
        &seen);
    fresh();
    DocPtr datalog = doc(varnel::doc_kind::datalog);
    ASSERT_EQ(varnel_get_readings(c, &rec, device.get(), datalog.get(), nullptr, status.get(), nullptr), ME_SUCCESS);
    ASSERT_GE(seen.raw.size(), 2u);
    EXPECT_GT(seen.raw.back(), seen.raw.front());

    varnel_on_progress(c, nullptr, nullptr);
    varnel_on_complete(c, nullptr, nullptr);
    fresh();
    seen.raw.clear();
    DocPtr again = doc(varnel::doc_kind::datalog);
    EXPECT_EQ(varnel_get_readings(c, &rec, device.get(), again.get(), nullptr, status.get(), nullptr), ME_SUCCESS);
    EXPECT_TRUE(seen.raw.empty());
    EXPECT_EQ(events.completions, 0);
    varnel_on_progress(nullptr, nullptr, nullptr);  // nothing to attach to: no effect
    varnel_on_complete(nullptr, nullptr, nullptr);
}

TEST_F(CInterface, MissingArgumentsAreRefusedWithoutTouchingAnything) {
    DocPtr conn = loaded("<ConnectionInfo><Ports><COM><PortsToSearch>1</PortsToSearch></COM></Ports></ConnectionInfo>");
    DocPtr d = doc(varnel::doc_kind::datalog);
    varnel_doc* dv = device.get();
    varnel_doc* st = status.get();
    const std::string statusBefore = text(st), deviceBefore = text(dv);
    struct Case { const char* what; std::int32_t got; };
    for (const Case& k : {
             Case{"component", varnel_discover_device(nullptr, &rec, dv, conn.get(), st)},
             Case{"record", varnel_discover_device(c, nullptr, dv, conn.get(), st)},
             Case{"device", varnel_discover_device(c, &rec, nullptr, conn.get(), st)},
             Case{"connection", varnel_discover_device(c, &rec, dv, nullptr, st)},
             Case{"status", varnel_discover_device(c, &rec, dv, conn.get(), nullptr)},
             Case{"settings", varnel_set_device_settings(c, &rec, dv, nullptr, st)},
             Case{"read settings", varnel_get_device_settings(c, &rec, dv, nullptr, 1, st, nullptr)},
             Case{"caps", varnel_get_device_caps(c, &rec, nullptr, d.get(), 1, st, nullptr)},
             Case{"datalog", varnel_get_readings(c, &rec, dv, nullptr, nullptr, st, nullptr)},
             Case{"readings status", varnel_get_readings(c, &rec, dv, d.get(), nullptr, nullptr, nullptr)},
             Case{"clear", varnel_clear_meter(c, &rec, nullptr, st)},
             Case{"close", varnel_close_meter(c, nullptr)},
             Case{"close component", varnel_close_meter(nullptr, &rec)},
         }) {
        EXPECT_EQ(k.got, ME_BAD_PARAMETER) << k.what;
    }
    EXPECT_EQ(text(st), statusBefore);
    EXPECT_EQ(text(dv), deviceBefore);
    EXPECT_EQ(events.completions, 0);
    EXPECT_EQ(varnel_error_number(nullptr), 0);
    EXPECT_EQ(varnel_error_text(nullptr), nullptr);
    EXPECT_EQ(varnel_error_text(c), nullptr);
}

TEST_F(CInterface, UnexpectedErrorsReachTheClientWithTheirTraceUntilTheNextRequest) {
    ASSERT_EQ(sim.call("vxsim_select_type", 4), 0);
    ASSERT_EQ(discover(), ME_SUCCESS);
    fresh();
    // A device document without PortInfo: the request fails where it reads it.
    DocPtr noPortInfo = doc(varnel::doc_kind::status);
    const std::int32_t got = varnel_clear_meter(c, &rec, noPortInfo.get(), status.get());
    EXPECT_EQ(got, ME_UNKNOWN);
    EXPECT_EQ(reports(status.get()), std::vector<std::string>{"-17/-16"});  // the code the status carries
    EXPECT_EQ(events.completions, 1);
    EXPECT_EQ(varnel_error_number(c), varnel::errc::missing_object);
    ASSERT_NE(varnel_error_text(c), nullptr);
    const std::string what = varnel_error_text(c);
    EXPECT_EQ(what.rfind("doAction --> ", 0), 0u) << what;
    EXPECT_GT(what.size(), std::string("doAction --> ").size()) << "the reason is missing: " << what;

    // The next request starts afresh.
    ASSERT_EQ(discover(), ME_SUCCESS);
    EXPECT_EQ(varnel_error_number(c), 0);
    EXPECT_EQ(varnel_error_text(c), nullptr);

    // Whatever a handler raises stays on this side of the boundary.
    struct Thrower {
        static void badAlloc(void*) { throw std::bad_alloc(); }
        static void runtime(void*) { throw std::runtime_error("handler failed"); }
    };
    struct Raised { void (*handler)(void*); const char* reason; };
    for (const Raised& r : {Raised{&Thrower::badAlloc, "Out of memory"}, Raised{&Thrower::runtime, "handler failed"}}) {
        varnel_on_complete(c, r.handler, nullptr);
        fresh();
        DocPtr settings = doc(varnel::doc_kind::device_settings);
        EXPECT_NE(varnel_get_device_settings(c, &rec, device.get(), settings.get(), 1, status.get(), nullptr),
                  ME_SUCCESS);
        EXPECT_EQ(varnel_error_number(c), varnel::errc::internal);
        const std::string said = varnel_error_text(c) ? varnel_error_text(c) : "(null)";
        EXPECT_TRUE(said.ends_with(r.reason)) << said;
    }
}

// A transport library that cannot be loaded: the client learns the path and the loader's reason.
TEST(MissingTransport, NamesThePathAndTheLoadersReason) {
    const std::string path = "/nonexistent/varnel-test/libnotransport.so";
    auto clock = std::make_shared<varnel::ManualClock>(1000);
    varnel::setThreadClock(clock);
    METER_REC rec{};

    varnel_component* c = varnel_new(path.c_str());
    ASSERT_NE(c, nullptr);
    DocPtr device = doc(varnel::doc_kind::device_info), status = doc(varnel::doc_kind::status);
    DocPtr conn = loaded("<ConnectionInfo><Ports><COM><PortsToSearch>1</PortsToSearch></COM></Ports></ConnectionInfo>");
    EXPECT_EQ(varnel_discover_device(c, &rec, device.get(), conn.get(), status.get()), ME_UNKNOWN);
    EXPECT_EQ(varnel_error_number(c), varnel::errc::transport_unavailable);
    const std::string text = varnel_error_text(c) ? varnel_error_text(c) : "";
    EXPECT_EQ(text.rfind("discoverDevice --> MeterInit --> ", 0), 0u) << text;
    EXPECT_NE(text.find(path), std::string::npos) << text;
    EXPECT_NE(text.find("No such file or directory"), std::string::npos) << text;  // dlerror's own words
    varnel_delete(c);

    // The same reason in C++, in what() and description().
    varnel::DllWrapper wrapper(path);
    varnel::XMLWrapper info, connection, report;
    info.InitDocument(varnel::doc_kind::device_info);
    report.InitDocument(varnel::doc_kind::status);
    connection.LoadXML("<ConnectionInfo><Ports><COM><PortsToSearch>1</PortsToSearch></COM></Ports></ConnectionInfo>");
    try {
        wrapper.discoverDevice(rec, info, connection, report);
        ADD_FAILURE() << "no error";
    } catch (const varnel::ComponentError& e) {
        EXPECT_EQ(std::string(e.what()), e.description());
        EXPECT_EQ(e.description().rfind("discoverDevice --> MeterInit --> Cannot load the transport library", 0), 0u)
            << e.description();
        EXPECT_NE(e.description().find(path), std::string::npos) << e.description();
    }
    varnel::setThreadClock(nullptr);
}

}  // namespace
