// The C interface on the shipped simulated transport library, loaded the way
// a C client loads it (varnel_new(NULL)), on a virtual clock.
#include <gtest/gtest.h>

#include <memory>
#include <new>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

#include "support/loaded_library.h"
#include "varnel/clock.h"
#include "varnel/component_error.h"
#include "varnel/dll_wrapper.h"
#include "varnel/varnel.h"

namespace {

using DocPtr = std::unique_ptr<varnel_doc, decltype(&varnel_doc_free)>;
const char* const kConnection =
    "<ConnectionInfo><Ports><COM><PortsToSearch>1</PortsToSearch></COM></Ports></ConnectionInfo>";
const std::string kMissing = "/nonexistent/varnel-test/libnotransport.so";

DocPtr doc(std::int32_t kind) { return DocPtr(varnel_doc_new_kind(kind), &varnel_doc_free); }
DocPtr loaded(const char* xml) {
    DocPtr d(varnel_doc_new(), &varnel_doc_free);
    EXPECT_EQ(varnel_doc_load(d.get(), xml), 0) << xml;
    return d;
}
std::string text(const varnel_doc* d) {
    char* xml = varnel_doc_xml(d);
    std::string out = xml ? xml : "(null)";
    varnel_free(xml);
    return out;
}

struct Events {
    std::vector<int> progress;
    int completions = 0;
};

struct CInterface : ::testing::Test {
    // The transport library the component loads, opened again: the same instance, for its control functions.
    varnel::test::LoadedLibrary sim{VARNEL_TEST_TRANSPORT_PATH};
    varnel_component* c = nullptr;
    METER_REC rec{};
    Events events;
    DocPtr device = doc(1), status = doc(7);

    void SetUp() override {
        ASSERT_NE(sim.handle, nullptr) << sim.error;
        varnel::setThreadClock(std::make_shared<varnel::ManualClock>(1000));
        ASSERT_NE(c = varnel_new(nullptr), nullptr);
        varnel_on_progress(
            c, [](int16_t* p, void* e) { static_cast<Events*>(e)->progress.push_back(*p); }, &events);
        varnel_on_complete(
            c, [](void* e) { ++static_cast<Events*>(e)->completions; }, &events);
        ASSERT_EQ(sim.function<int (*)(int)>("vxsim_select_type")(4), 0);
        DocPtr conn = loaded(kConnection);
        ASSERT_EQ(varnel_discover_device(c, &rec, device.get(), conn.get(), status.get()), ME_SUCCESS);
    }
    void TearDown() override {
        varnel_delete(c);
        sim.function<int (*)()>("vxsim_reset")();
        varnel::setThreadClock(nullptr);
    }
    void fresh() {
        status = doc(7);
        events = Events{};
    }
};

TEST(CDocuments, KindsAndMalformedText) {
    const char* roots[] = {"Device", "DeviceSettings", "ConnectionInfo", "DeviceCaps", "Datalog", "Filter", "Status"};
    for (int kind = 1; kind <= 7; ++kind)
        EXPECT_EQ(text(doc(kind).get()).find(std::string("<") + roots[kind - 1]), 0u) << kind;
    EXPECT_EQ(varnel_doc_new_kind(99), nullptr);  // refused, not an empty document
    EXPECT_EQ(text(DocPtr(varnel_doc_new(), &varnel_doc_free).get()), "");

    DocPtr d = loaded("<A><B x=\"1\">t</B></A>");
    const std::string before = text(d.get());
    for (const char* bad : {"", "<A>", "<A x='1' x='2'/>", static_cast<const char*>(nullptr)}) {
        EXPECT_NE(varnel_doc_load(d.get(), bad), 0) << (bad ? bad : "NULL");
        EXPECT_EQ(text(d.get()), before) << (bad ? bad : "NULL");
    }
    EXPECT_NE(varnel_doc_load(nullptr, "<A/>"), 0);
    varnel_doc_free(nullptr);
    varnel_delete(nullptr);
}

// Every request through the interface: python/tests drives a whole session; here, what C alone shows.
TEST_F(CInterface, FlagsAreCTruthValuesAndRemovedHandlersAreNotCalled) {
    DocPtr settings = doc(2);
    int check = -1;
    fresh();
    EXPECT_EQ(varnel_get_device_settings(c, &rec, device.get(), settings.get(), 1, status.get(), &check), ME_SUCCESS);
    EXPECT_TRUE(check == 0 || check == 1) << check;
    EXPECT_NE(text(settings.get()).find("<GlucUnit"), std::string::npos);
    EXPECT_EQ(events.completions, 1);
    EXPECT_FALSE(events.progress.empty());

    varnel_on_progress(c, nullptr, nullptr);
    varnel_on_complete(c, nullptr, nullptr);
    fresh();
    EXPECT_EQ(varnel_clear_meter(c, &rec, device.get(), status.get()), ME_SUCCESS);
    EXPECT_EQ(varnel_close_meter(c, &rec), ME_SUCCESS);
    EXPECT_TRUE(events.progress.empty());
    EXPECT_EQ(events.completions, 0);
    EXPECT_EQ(varnel_error_text(c), nullptr);
}

TEST_F(CInterface, MissingArgumentsAreRefusedWithoutTouchingAnything) {
    fresh();
    DocPtr conn = loaded(kConnection), d = doc(5);
    varnel_doc *dv = device.get(), *st = status.get();
    const std::string statusBefore = text(st), deviceBefore = text(dv);
    for (std::int32_t got :
         {varnel_discover_device(nullptr, &rec, dv, conn.get(), st),
          varnel_discover_device(c, nullptr, dv, conn.get(), st), varnel_discover_device(c, &rec, dv, nullptr, st),
          varnel_set_device_settings(c, &rec, dv, nullptr, st),
          varnel_get_device_settings(c, &rec, dv, nullptr, 1, st, nullptr),
          varnel_get_device_caps(c, &rec, nullptr, d.get(), 1, st, nullptr),
          varnel_get_readings(c, &rec, dv, nullptr, nullptr, st, nullptr),
          varnel_get_readings(c, &rec, dv, d.get(), nullptr, nullptr, nullptr),
          varnel_clear_meter(c, &rec, nullptr, st), varnel_close_meter(c, nullptr), varnel_close_meter(nullptr, &rec)})
        EXPECT_EQ(got, ME_BAD_PARAMETER);
    EXPECT_EQ(text(st), statusBefore);
    EXPECT_EQ(text(dv), deviceBefore);
    EXPECT_EQ(events.completions, 0);
    EXPECT_EQ(varnel_error_number(nullptr), 0);
    EXPECT_EQ(varnel_error_text(nullptr), nullptr);
    varnel_on_progress(nullptr, nullptr, nullptr);
}

TEST_F(CInterface, UnexpectedErrorsReachTheClientUntilTheNextRequest) {
    // A device document without PortInfo: the request fails where it reads it.
    fresh();
    DocPtr noPortInfo = doc(7);
    EXPECT_EQ(varnel_clear_meter(c, &rec, noPortInfo.get(), status.get()), ME_UNKNOWN);
    EXPECT_NE(text(status.get()).find("<Minor>-16</Minor>"), std::string::npos);  // the code the status carries
    EXPECT_EQ(events.completions, 1);
    EXPECT_EQ(varnel_error_number(c), varnel::errc::missing_object);
    const std::string what = varnel_error_text(c) ? varnel_error_text(c) : "";
    EXPECT_TRUE(what.starts_with("doAction --> ") && what.size() > 13) << "trace and reason: " << what;

    EXPECT_EQ(varnel_clear_meter(c, &rec, device.get(), status.get()), ME_SUCCESS);
    EXPECT_EQ(varnel_error_number(c), 0);
    EXPECT_EQ(varnel_error_text(c), nullptr);

    // Whatever a handler raises stays on this side of the boundary, with its own text.
    struct Raised {
        void (*handler)(void*);
        const char* reason;
    };
    for (const Raised& r : {Raised{[](void*) { throw std::bad_alloc(); }, "Out of memory"},
                            Raised{[](void*) { throw std::runtime_error("handler failed"); }, "handler failed"}}) {
        varnel_on_complete(c, r.handler, nullptr);
        EXPECT_EQ(varnel_clear_meter(c, &rec, device.get(), status.get()), ME_UNKNOWN);
        EXPECT_EQ(varnel_error_number(c), varnel::errc::internal);
        const std::string said = varnel_error_text(c) ? varnel_error_text(c) : "(null)";
        EXPECT_TRUE(said.ends_with(r.reason)) << said;
    }
}

// check_meter is left as the C++ flag is: untouched while the port is refused, 1 once it was
// accepted, also when the request then fails unexpectedly (one helper hands it out for every request).
TEST_F(CInterface, CheckMeterIsWrittenAsInCppOnRefusalsAndUnexpectedErrors) {
    std::string badPort = text(device.get());
    badPort.replace(badPort.find("<PortID>") + 8, 1, "-1");
    const DocPtr refused = loaded(badPort.c_str());
    DocPtr out = doc(5);
    int check = -7;
    varnel_on_complete(c, nullptr, nullptr);
    EXPECT_NE(varnel_get_readings(c, &rec, refused.get(), out.get(), nullptr, status.get(), &check), ME_SUCCESS);
    EXPECT_EQ(check, -7);
    varnel_on_complete(
        c, [](void*) { throw std::runtime_error("handler failed"); }, nullptr);
    EXPECT_EQ(varnel_get_readings(c, &rec, device.get(), out.get(), nullptr, status.get(), &check), ME_UNKNOWN);
    EXPECT_EQ(check, 1);
}

// A transport library that cannot be loaded: the path and the loader's reason, in C and in C++.
TEST(MissingTransport, NamesThePathAndTheLoadersReason) {
    varnel::setThreadClock(std::make_shared<varnel::ManualClock>(1000));
    METER_REC rec{};
    varnel_component* c = varnel_new(kMissing.c_str());
    DocPtr device = doc(1), status = doc(7), conn = loaded(kConnection);
    EXPECT_EQ(varnel_discover_device(c, &rec, device.get(), conn.get(), status.get()), ME_UNKNOWN);
    EXPECT_EQ(varnel_error_number(c), varnel::errc::transport_unavailable);
    const std::string text = varnel_error_text(c) ? varnel_error_text(c) : "";
    EXPECT_TRUE(text.starts_with("discoverDevice --> MeterInit --> ")) << text;
    std::string reason;  // the system loader's own
    EXPECT_EQ(varnel::detail::native::openLibrary(kMissing, reason), nullptr);
    EXPECT_NE(text.find("\"" + kMissing + "\": " + reason), std::string::npos) << text;
    varnel_delete(c);

    varnel::XMLWrapper info, connection, report;
    connection.LoadXML(kConnection);
    try {
        varnel::DllWrapper(kMissing).discoverDevice(rec, info, connection, report);
        ADD_FAILURE() << "no error";
    } catch (const varnel::ComponentError& e) {
        EXPECT_STREQ(e.what(), text.c_str());
    }
    varnel::setThreadClock(nullptr);
}

}  // namespace
