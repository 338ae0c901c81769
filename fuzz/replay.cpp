// The replay transport on any capture file: a whole session (discovery,
// settings, capabilities, readings, release) answered from the input on a
// virtual clock that keeps the recorded times. The replay must refuse what it
// cannot use with a printable reason, never crash, and stay within its
// limits: no line or file past them accepted, no call waited on for more than
// its bound.
#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <string>
#include <string_view>

#include "capture_format.h"
#include "component/wrapper_access.h"
#include "support/sim_transport.h"
#include "varnel/clock.h"
#include "varnel/component_error.h"
#include "varnel/dll_wrapper.h"
#include "varnel/vxcapture.h"
#include "varnel/xml_wrapper.h"

namespace {

namespace cap = varnel::capture;

// A virtual clock that adds up every wait.
struct CountingClock : varnel::ManualClock {
    std::uint64_t slept = 0;
    CountingClock() : ManualClock(1000) {}
    void sleep(std::uint32_t ms) override {
        slept += ms;
        ManualClock::sleep(ms);
    }
};

[[noreturn]] void broken(const std::string& what) {
    std::fprintf(stderr, "%s\n", what.c_str());
    std::abort();
}

std::string capturePath() {
    static const std::string path = [] {
        char tmpl[] = "/tmp/varnel-fuzz-replay-XXXXXX";
        if (!mkdtemp(tmpl)) std::abort();
        ::setenv("VARNEL_REPLAY_TIMING", "recorded", 1);
        return std::string(tmpl) + "/capture.jsonl";
    }();
    return path;
}

varnel::XMLWrapper doc(std::int32_t kind) {
    varnel::XMLWrapper d;
    d.InitDocument(kind);
    return d;
}

// A whole session as a client runs it; failures end it early.
void session(varnel::DllWrapper& w) {
    METER_REC rec{};
    varnel::XMLWrapper device = doc(varnel::doc_kind::device_info), conn = doc(varnel::doc_kind::connection_info),
                       status = doc(varnel::doc_kind::status), settings, caps = doc(varnel::doc_kind::device_caps),
                       datalog = doc(varnel::doc_kind::datalog), filter = doc(varnel::doc_kind::filter);
    conn.SelectElement("Ports");
    conn.AddElement("COM");
    conn.AddChildElement("PortsToSearch", "", "1");
    bool check = false;
    try {
        if (w.discoverDevice(rec, device, conn, status) != 0) return;
        w.getDeviceSettings(rec, device, settings, true, status, check);
        w.getDeviceCaps(rec, device, caps, true, status, check);
        w.getReadings(rec, device, datalog, filter, status, check);
        w.closeMeter(rec);
    } catch (const varnel::ComponentError&) {
        // An unexpected error is the component's to report; the replay under test kept its promises.
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string path = capturePath();
    std::FILE* f = std::fopen(path.c_str(), "wb");
    if (!f || std::fwrite(data, 1, size, f) != size || std::fclose(f) != 0) std::abort();
    const std::string_view input(reinterpret_cast<const char*>(data), size);

    auto clock = std::make_shared<CountingClock>();
    varnel::setThreadClock(clock);
    const bool started = vxcap_replay_start(path.c_str()) == 0;
    if (started) {
        if (size > cap::kMaxFileBytes) broken("a capture past the file limit was accepted");
        std::size_t from = 0, lines = 0;
        for (std::size_t nl; from <= input.size(); from = nl + 1, ++lines) {
            nl = input.find('\n', from);
            if (nl == std::string_view::npos) nl = input.size();
            if (nl - from > cap::kMaxLineBytes) broken("a line past the line limit was accepted");
        }
        varnel::DllWrapper w = varnel::detail::wrapperOver(varnel::detail::makeTransport(varnel::test::simFunctions()));
        session(w);
        vxcap_replay_finish();
        if (clock->slept > static_cast<std::uint64_t>(lines) * cap::kMaxReplayedWaitMs)
            broken("the replay waited longer than its bound: " + std::to_string(clock->slept) + " ms");
    }
    for (const char c : std::string(vxcap_last_error()))
        if (static_cast<unsigned char>(c) < 0x20 || c == 0x7f) broken("a reason with a raw control character");
    varnel::setThreadClock(nullptr);
    return 0;
}
