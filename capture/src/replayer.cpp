// libvarnel_replay: a transport library that answers from a capture file, call
// by call, on the caller's clock, and refuses once the calls leave the capture.
#include <array>
#include <cstdlib>
#include <fstream>
#include <mutex>
#include <string>
#include <vector>

#include "caller_hooks.h"
#include "capture_format.h"
#include "varnel/vxcapture.h"

using namespace varnel::capture;

namespace {

struct Replayer {
    std::recursive_mutex mutex;
    bool configured = false;
    std::string path;
    std::vector<Json> calls;
    std::vector<int> lines;  // the file line of each call
    std::size_t next = 0;
    OutMemory memory;
    // Why the replay stopped; every later call fails with it.
    std::string error;
};

Replayer& replayer() {
    static Replayer r;
    return r;
}

int fail(Replayer& r, const std::string& why) {
    r.error = "replay of " + r.path + ": " + why;
    return ME_FAIL;
}

// Why a call line cannot be replayed, or "".
std::string checkCall(const Json& c) {
    if (!c.is_object()) return "is no object";
    for (const char* key : {"fn", "in", "out", "result", "ms"})
        if (!c.contains(key)) return std::string("has no \"") + key + "\"";
    if (!c["fn"].is_string() || !c["in"].is_object() || !c["out"].is_object() || !c["result"].is_number_integer() ||
        !c["ms"].is_number_unsigned())
        return "has a field of the wrong type";
    if (c.contains("yields") && !c["yields"].is_array()) return "has yields that are no list";
    return {};
}

int read(Replayer& r, const std::string& path) {
    r.configured = true;
    r.path = path;
    r.calls.clear();
    r.lines.clear();
    r.next = 0;
    r.memory.clear();
    r.error.clear();
    std::ifstream file(path);
    if (!file) return fail(r, "cannot read the capture file");
    std::string text;
    int number = 0;
    while (std::getline(file, text)) {
        ++number;
        Json line = Json::parse(text, nullptr, false);
        if (line.is_discarded()) return fail(r, "line " + std::to_string(number) + " is not valid JSON");
        if (number == 1) {
            if (std::string why = checkHeader(line); !why.empty()) return fail(r, why);
            continue;
        }
        if (std::string why = checkCall(line); !why.empty())
            return fail(r, "line " + std::to_string(number) + " " + why);
        r.calls.push_back(std::move(line));
        r.lines.push_back(number);
    }
    if (number == 0) return fail(r, "the capture file is empty");
    return ME_SUCCESS;
}

// Reads a capture; nothing escapes to the caller (a file too large for memory is refused).
int start(Replayer& r, const std::string& path) {
    try {
        return read(r, path);
    } catch (const std::exception& e) {
        r.calls.clear();
        return fail(r, std::string("cannot read the capture file: ") + e.what());
    }
}

void configure(Replayer& r) {
    if (r.configured) return;
    const char* file = std::getenv("VARNEL_REPLAY_FILE");
    if (!file || !*file) {
        r.configured = true;
        r.error = "no capture to replay: set VARNEL_REPLAY_FILE or call vxcap_replay_start";
        return;
    }
    start(r, file);
}

std::string where(const Replayer& r, std::size_t index) {
    return "call " + std::to_string(index + 1) + " (line " + std::to_string(r.lines[index]) + ")";
}

// Checks the call against the capture's next one and answers it; a failure code when they differ.
template <std::size_t N>
std::int32_t answer(Replayer& r, const char* function, const std::array<ArgRef, N>& args) {
    auto refuse = [&](const std::string& why) {
        if (r.error.empty()) fail(r, why);
        return failCall(args);
    };
    if (!r.error.empty()) return refuse(r.error);
    if (r.next >= r.calls.size())
        return refuse("expected the end of the capture (" + std::to_string(r.calls.size()) + " calls), came " +
                      function);
    const std::size_t index = r.next;
    const Json& c = r.calls[index];
    const std::string at = where(r, index);
    if (c["fn"] != function) return refuse(at + ": expected " + c["fn"].get<std::string>() + ", came " + function);

    std::array<Bytes, N> in;
    std::array<Bytes, N> out;
    for (std::size_t i = 0; i < N; ++i) {
        const ArgRef& a = args[i];
        std::string why;
        const Bytes came = bytesOf(a);
        if (a.goesIn()) {
            const auto expected = decodeIn(a, c["in"].value(a.name, Json()), r.memory, why);
            if (!expected) return refuse(at + " " + function + ": " + why);
            if (*expected != came)
                return refuse(at + " " + function + ": expected " + a.name + " " + describe(a, *expected) + ", came " +
                              describe(a, came) + " differing at " + firstDifference(a, *expected, came));
            in[i] = *expected;
        }
        if (a.comesOut()) {
            const auto answer = decodeOut(a, c["out"].value(a.name, Json()), a.goesIn() ? in[i] : came, why);
            if (!answer || answer->size() != came.size())
                return refuse(at + " " + function + ": " + (why.empty() ? "the answer does not fit" : why));
            out[i] = *answer;
        }
    }
    // Yields are checked before any of them is played, so a bad one cannot stop a call halfway.
    const Json yields = c.value("yields", Json::array());
    for (const Json& y : yields) {
        bool ok = y.is_object() && y.contains("at") && y["at"].is_number_unsigned();
        for (std::size_t i = 0; ok && i < N; ++i) {
            Bytes scratch(args[i].bytes());
            ok = !y.contains(args[i].name) || (args[i].comesOut() && applyChanges(y[args[i].name], scratch));
        }
        if (!ok) return refuse(at + " " + function + ": a yield of the capture is unreadable");
    }
    r.next++;

    // The call's time on the caller's clock, with what the recorded library had written at each yield.
    std::uint32_t elapsed = 0;
    for (const Json& y : yields) {
        const auto at = y["at"].get<std::uint32_t>();
        callerSleep(at > elapsed ? at - elapsed : 0);
        elapsed = std::max(elapsed, at);
        for (std::size_t i = 0; i < N; ++i) {
            if (!y.contains(args[i].name) || !args[i].data) continue;
            Bytes now = bytesOf(args[i]);
            applyChanges(y[args[i].name], now);
            std::copy(now.begin(), now.end(), static_cast<std::uint8_t*>(args[i].data));
        }
        callerYield();
    }
    const auto ms = c["ms"].get<std::uint32_t>();
    callerSleep(ms > elapsed ? ms - elapsed : 0);

    for (std::size_t i = 0; i < N; ++i) {
        if (!args[i].comesOut() || out[i].empty()) continue;
        std::copy(out[i].begin(), out[i].end(), static_cast<std::uint8_t*>(args[i].data));
        if (!args[i].type->number) r.memory.remember(int(index) + 1, args[i], std::move(out[i]));
    }
    return c["result"].get<std::int32_t>();
}

template <std::size_t N>
std::int32_t replayCall(const char* function, const std::array<ArgRef, N>& args) {
    Replayer& r = replayer();
    std::lock_guard lock(r.mutex);
    configure(r);
    try {
        return answer(r, function, args);
    } catch (const std::exception& e) {
        if (r.error.empty()) fail(r, std::string("cannot answer ") + function + ": " + e.what());
        return failCall(args);
    }
}

}  // namespace

#define VARNEL_CAP_REPLAY(ret, name, ...)                                         \
    extern "C" VX_API ret name(VX_C_PARAMS(__VA_ARGS__)) {                        \
        return static_cast<ret>(replayCall(#name, VARNEL_CAP_ARGS(__VA_ARGS__))); \
    }
VX_METER_FUNCTIONS(VARNEL_CAP_REPLAY)
#undef VARNEL_CAP_REPLAY

extern "C" VX_API int vxcap_replay_start(const char* capture_path) {
    Replayer& r = replayer();
    std::lock_guard lock(r.mutex);
    return start(r, capture_path ? capture_path : "");
}

extern "C" VX_API int vxcap_replay_finish(void) {
    Replayer& r = replayer();
    std::lock_guard lock(r.mutex);
    configure(r);
    if (!r.error.empty()) return ME_FAIL;
    if (r.next >= r.calls.size()) return ME_SUCCESS;
    return fail(r, "expected " + r.calls[r.next]["fn"].get<std::string>() + " (" + where(r, r.next) +
                       "), came the end of the session after " + std::to_string(r.next) + " of " +
                       std::to_string(r.calls.size()) + " calls");
}

extern "C" VX_API const char* vxcap_last_error(void) {
    Replayer& r = replayer();
    std::lock_guard lock(r.mutex);
    return r.error.c_str();
}
