// One component per thread, any number of threads: two components on two
// threads, through C++ and through the C interface, see exactly what one of
// them sees alone. scripts/tsan.sh runs this under ThreadSanitizer with more
// sessions (VARNEL_THREAD_SESSIONS).
#include <dlfcn.h>
#include <gtest/gtest.h>

#include <cstdlib>
#include <functional>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "component/wrapper_access.h"
#include "support/sim_transport.h"
#include "varnel/clock.h"
#include "varnel/dll_wrapper.h"
#include "varnel/varnel.h"
#include "varnel/vxsim.h"
#include "varnel/xml_wrapper.h"

namespace {

using varnel::XMLWrapper;
using Seen = std::vector<std::string>;
using Session = std::function<Seen()>;

int sessions() {
    const char* n = std::getenv("VARNEL_THREAD_SESSIONS");
    return n && std::atoi(n) > 0 ? std::atoi(n) : 10;
}

XMLWrapper doc(std::int32_t kind) {
    XMLWrapper d;
    d.InitDocument(kind);
    return d;
}

// A document without the meter clock's reading, which runs on from session to session.
std::string withoutClock(std::string xml) {
    for (std::size_t at = 0; (at = xml.find("<Clock", at)) != std::string::npos;) {
        const std::size_t end = xml.find("</Clock>", at);
        if (end == std::string::npos) break;
        xml.erase(at, end - at);
        at += 1;
    }
    return xml;
}

// A whole session through C++ (discover, settings, capabilities, readings, release),
// on a fresh virtual clock of this thread: every code and document the client sees.
Seen cppSession(varnel::DllWrapper& w) {
    varnel::setThreadClock(std::make_shared<varnel::ManualClock>(1000));
    Seen seen;
    METER_REC rec{};
    XMLWrapper device = doc(varnel::doc_kind::device_info), conn = doc(varnel::doc_kind::connection_info);
    conn.SelectElement("Ports");
    conn.AddElement("COM");
    conn.AddChildElement("PortsToSearch", "", "1");
    XMLWrapper status = doc(varnel::doc_kind::status), settings, caps = doc(varnel::doc_kind::device_caps),
               datalog = doc(varnel::doc_kind::datalog), filter = doc(varnel::doc_kind::filter);
    bool check = false;
    seen.push_back(std::to_string(w.discoverDevice(rec, device, conn, status)));
    seen.push_back(std::to_string(w.getDeviceSettings(rec, device, settings, true, status, check)));
    seen.push_back(std::to_string(w.getDeviceCaps(rec, device, caps, true, status, check)));
    seen.push_back(std::to_string(w.getReadings(rec, device, datalog, filter, status, check)));
    seen.push_back(std::to_string(w.closeMeter(rec)));
    for (const XMLWrapper* d : {&device, &settings, &caps, &datalog, &status}) seen.push_back(withoutClock(d->XML()));
    return seen;
}

// The same session through the C interface.
Seen cSession(varnel_component* c) {
    varnel::setThreadClock(std::make_shared<varnel::ManualClock>(1000));
    using Doc = std::unique_ptr<varnel_doc, decltype(&varnel_doc_free)>;
    auto make = [](std::int32_t kind) { return Doc(varnel_doc_new_kind(kind), &varnel_doc_free); };
    Doc device = make(1), conn = Doc(varnel_doc_new(), &varnel_doc_free), settings = make(2), caps = make(4),
        datalog = make(5), status = make(7);
    varnel_doc_load(conn.get(),
                    "<ConnectionInfo><Ports><COM><PortsToSearch>1</PortsToSearch></COM></Ports></ConnectionInfo>");
    METER_REC rec{};
    int check = 0;
    Seen seen;
    seen.push_back(std::to_string(varnel_discover_device(c, &rec, device.get(), conn.get(), status.get())));
    seen.push_back(std::to_string(varnel_get_device_settings(c, &rec, device.get(), settings.get(), 1, status.get(), &check)));
    seen.push_back(std::to_string(varnel_get_device_caps(c, &rec, device.get(), caps.get(), 1, status.get(), &check)));
    seen.push_back(std::to_string(varnel_get_readings(c, &rec, device.get(), datalog.get(), nullptr, status.get(), &check)));
    seen.push_back(std::to_string(varnel_close_meter(c, &rec)));
    for (const Doc* d : {&device, &settings, &caps, &datalog, &status}) {
        char* text = varnel_doc_xml(d->get());
        seen.push_back(withoutClock(text ? text : ""));
        varnel_free(text);
    }
    return seen;
}

// Runs each session once alone, then all of them on threads of their own, `rounds` times each:
// every round must see what the session saw alone.
void runTogether(const std::vector<Session>& clients) {
    std::vector<Seen> alone;
    for (const Session& s : clients) alone.push_back(s());
    for (const Seen& a : alone) ASSERT_EQ(a[0], "0") << "discovery failed alone";
    std::vector<int> differing(clients.size(), 0);
    std::vector<std::thread> threads;
    const int rounds = sessions();
    for (std::size_t i = 0; i < clients.size(); ++i)
        threads.emplace_back([&, i] {
            for (int r = 0; r < rounds; ++r)
                if (clients[i]() != alone[i]) ++differing[i];
            varnel::setThreadClock(nullptr);
        });
    for (std::thread& t : threads) t.join();
    for (std::size_t i = 0; i < clients.size(); ++i) EXPECT_EQ(differing[i], 0) << "client " << i;
}

struct Threads : ::testing::Test {
    void* library = dlopen(VARNEL_TEST_TRANSPORT_PATH, RTLD_NOW | RTLD_LOCAL);
    void select(int type) { reinterpret_cast<int (*)(int)>(dlsym(library, "vxsim_select_type"))(type); }
    void SetUp() override { ASSERT_NE(library, nullptr) << dlerror(); }
    void TearDown() override {
        if (!library) return;
        reinterpret_cast<int (*)()>(dlsym(library, "vxsim_reset"))();
        ::vxsim_reset();
        dlclose(library);
        varnel::setThreadClock(nullptr);
    }
};

// Two meter types on two simulators: C++ over the statically linked one, C over the library.
TEST_F(Threads, TwoMeterTypesOnTwoThreadsSeeWhatEachSeesAlone) {
    ::vxsim_select_type(3);
    select(7);
    varnel::DllWrapper cpp = varnel::detail::wrapperOver(varnel::test::simTransport());
    varnel_component* c = varnel_new(VARNEL_TEST_TRANSPORT_PATH);
    runTogether({[&] { return cppSession(cpp); }, [&] { return cSession(c); }});
    varnel_delete(c);
}

// Both components on the one simulated meter of the library, one through C++, one through C.
TEST_F(Threads, TwoComponentsOnOneSimulatedMeterSeeWhatEachSeesAlone) {
    select(5);
    varnel::DllWrapper cpp{std::string(VARNEL_TEST_TRANSPORT_PATH)};
    varnel_component* c = varnel_new(VARNEL_TEST_TRANSPORT_PATH);
    runTogether({[&] { return cppSession(cpp); }, [&] { return cSession(c); }});
    varnel_delete(c);
}

}  // namespace
