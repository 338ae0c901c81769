// One component per thread, any number of threads: two components on two
// threads, through C++ and through the C interface, see exactly what one of
// them sees alone. scripts/tsan.sh runs this under ThreadSanitizer with more
// sessions (VARNEL_THREAD_SESSIONS).
#include <gtest/gtest.h>

#include <cstdlib>
#include <functional>
#include <memory>
#include <regex>
#include <string>
#include <thread>
#include <vector>

#include "support/client_session.h"
#include "support/loaded_library.h"
#include "support/wrapper_fixture.h"
#include "varnel/varnel.h"
#include "varnel/vxsim.h"

namespace {

using namespace varnel::test;
using Seen = std::vector<std::string>;
using Session = std::function<Seen()>;

int sessions() {
    const char* n = std::getenv("VARNEL_THREAD_SESSIONS");
    return n && std::atoi(n) > 0 ? std::atoi(n) : 10;
}

// A document without the meter clock's reading, which runs on from session to session.
std::string withoutClock(const std::string& xml) {
    return std::regex_replace(xml, std::regex(R"(<Clock[\s\S]*?</Clock>)"), "");
}

// A whole session through C++ (discover, settings, capabilities, readings, release),
// on a fresh virtual clock of this thread: every code and document the client sees.
Seen cppSession(varnel::DllWrapper& w) {
    varnel::setThreadClock(std::make_shared<varnel::ManualClock>(1000));
    Seen seen;
    METER_REC rec{};
    varnel::XMLWrapper device = newDoc(varnel::doc_kind::device_info), status = newDoc(varnel::doc_kind::status), out;
    for (Call c : {Call::discover, Call::settings, Call::caps, Call::readings, Call::close}) {
        seen.push_back(std::to_string(makeCall(w, c, rec, device, status, out)));
        seen.push_back(withoutClock(out.IsEmpty() ? "" : out.XML()));
    }
    seen.push_back(status.XML());
    return seen;
}

// The same session through the C interface.
Seen cSession(varnel_component* c) {
    varnel::setThreadClock(std::make_shared<varnel::ManualClock>(1000));
    using Doc = std::unique_ptr<varnel_doc, decltype(&varnel_doc_free)>;
    auto make = [](std::int32_t kind) { return Doc(varnel_doc_new_kind(kind), &varnel_doc_free); };
    Doc device = make(1), conn = make(3), settings = make(2), caps = make(4), datalog = make(5), status = make(7);
    varnel_doc_load(conn.get(), connectionDoc("1").XML().c_str());
    METER_REC rec{};
    int check = 0;
    Seen seen{
        std::to_string(varnel_discover_device(c, &rec, device.get(), conn.get(), status.get())),
        std::to_string(varnel_get_device_settings(c, &rec, device.get(), settings.get(), 1, status.get(), &check)),
        std::to_string(varnel_get_device_caps(c, &rec, device.get(), caps.get(), 1, status.get(), &check)),
        std::to_string(varnel_get_readings(c, &rec, device.get(), datalog.get(), nullptr, status.get(), &check)),
        std::to_string(varnel_close_meter(c, &rec))};
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
    varnel::test::LoadedLibrary library{VARNEL_TEST_TRANSPORT_PATH};
    void select(int type) { library.function<int (*)(int)>("vxsim_select_type")(type); }
    void SetUp() override { ASSERT_NE(library.handle, nullptr) << library.error; }
    void TearDown() override {
        if (!library.handle) return;
        library.function<int (*)()>("vxsim_reset")();
        ::vxsim_reset();
        varnel::setThreadClock(nullptr);
    }
};

// Two meter types on two simulators (C++ over the statically linked one, C over the library),
// then both components on the one simulated meter of the library.
TEST_F(Threads, TwoComponentsOnTwoThreadsSeeWhatEachSeesAlone) {
    ::vxsim_select_type(3);
    select(7);
    varnel_component* c = varnel_new(VARNEL_TEST_TRANSPORT_PATH);
    for (bool oneMeter : {false, true}) {
        if (oneMeter) select(5);
        varnel::DllWrapper cpp = oneMeter ? varnel::DllWrapper{std::string(VARNEL_TEST_TRANSPORT_PATH)}
                                          : varnel::detail::wrapperOver(simTransport());
        runTogether({[&] { return cppSession(cpp); }, [&] { return cSession(c); }});
    }
    varnel_delete(c);
}

}  // namespace
