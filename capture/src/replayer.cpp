// libvarnel_replay: a transport library that answers from a capture file, call
// by call, on the caller's clock, and refuses once the calls leave the capture.
#include <sys/stat.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <mutex>
#include <optional>
#include <string>

#include "caller_hooks.h"
#include "capture_format.h"
#include "varnel/vxcapture.h"

using namespace varnel::capture;

namespace {

// How a replay spends the recorded time of each call.
enum class Timing {
    none,      // not at all: the caller's clock is left alone
    recorded,  // the recorded times on the caller's clock, at most kMaxReplayedWaitMs a call
};

struct Replayer {
    std::recursive_mutex mutex;
    bool configured = false;
    std::string path;
    // Read a line at a time as the calls come, so memory holds one call whatever the file's size.
    std::ifstream file;
    std::size_t total = 0;  // calls in the capture
    std::size_t next = 0;   // calls answered
    int line = 0;           // the file line last read
    Timing timing = Timing::none;
    OutMemory memory;
    // Why the replay stopped; every later call fails with it.
    std::string error;
};

Replayer& replayer() {
    static Replayer r;
    return r;
}

int fail(Replayer& r, const std::string& why) {
    r.error = "replay of " + printable(r.path) + ": " + why;
    return ME_FAIL;
}

std::string lineLabel(int number) { return "line " + std::to_string(number); }

// The next line of the file, within the line limit; false with `why` at the end or past the limit.
bool nextLine(Replayer& r, std::string& text, std::string& why) {
    if (!std::getline(r.file, text)) {
        why = "the capture file ends after line " + std::to_string(r.line);
        return false;
    }
    ++r.line;
    if (text.size() <= kMaxLineBytes) return true;
    why = lineLabel(r.line) + " is longer than " + std::to_string(kMaxLineBytes >> 20) + " MiB, more than a capture holds";
    return false;
}

int read(Replayer& r, const std::string& path) {
    r.configured = true;
    r.path = path;
    r.file = std::ifstream();
    r.total = r.next = 0;
    r.line = 0;
    r.memory.clear();
    r.error.clear();
    const char* timing = std::getenv("VARNEL_REPLAY_TIMING");
    r.timing = timing && std::string(timing) == "recorded" ? Timing::recorded : Timing::none;
    // Only a regular file of bounded size: a device or a pipe could be endless.
    struct stat st {};
    if (::stat(path.c_str(), &st) != 0) return fail(r, std::string("cannot read the capture file: ") + std::strerror(errno));
    if (!S_ISREG(st.st_mode)) return fail(r, "the capture is no regular file");
    if (static_cast<std::uintmax_t>(st.st_size) > kMaxFileBytes)
        return fail(r, "the capture file is larger than " + std::to_string(kMaxFileBytes >> 20) +
                           " MiB, more than a capture holds");
    r.file.open(path, std::ios::binary);
    if (!r.file) return fail(r, "cannot read the capture file");
    // Counts the calls and checks every line's length; the calls are read as they come.
    std::string text, why;
    std::uintmax_t bytes = 0;
    while (nextLine(r, text, why)) {
        bytes += text.size() + 1;
        if (bytes > kMaxFileBytes + 1) return fail(r, "the capture file grew past its limit while it was read");
    }
    if (text.size() > kMaxLineBytes) return fail(r, why);
    if (r.file.bad()) return fail(r, "cannot read the capture file");
    if (r.line == 0) return fail(r, "the capture file is empty");
    r.total = static_cast<std::size_t>(r.line - 1);
    r.file.clear();
    r.file.seekg(0);
    r.line = 0;
    if (!nextLine(r, text, why)) return fail(r, why);
    const auto header = parseLine(text, why);
    if (!header) return fail(r, lineLabel(1) + " " + why);
    if (std::string wrong = checkHeader(*header); !wrong.empty()) return fail(r, wrong);
    return ME_SUCCESS;
}

// Reads a capture; nothing escapes to the caller.
int start(Replayer& r, const std::string& path) {
    try {
        return read(r, path);
    } catch (const std::exception& e) {
        r.file = std::ifstream();
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

// The next call of the capture, checked; nullopt with `why` naming its line.
std::optional<Json> nextCall(Replayer& r, std::string& why) {
    std::string text;
    if (!nextLine(r, text, why)) return std::nullopt;
    auto call = parseLine(text, why);
    if (call) why = checkCall(*call);
    if (call && why.empty()) return call;
    why = lineLabel(r.line) + " " + why;
    return std::nullopt;
}

std::string where(const Replayer& r) {
    return "call " + std::to_string(r.next + 1) + " (" + lineLabel(r.line) + ")";
}

// Waits on the caller's clock as the capture says, when asked to, at most
// kMaxReplayedWaitMs a call; long stretches run the caller's pump between them.
void replayWait(const Replayer& r, std::uint32_t ms, std::uint32_t& spent) {
    if (r.timing == Timing::none) return;
    ms = std::min(ms, kMaxReplayedWaitMs - spent);
    spent += ms;
    constexpr std::uint32_t kSlice = 500;
    while (ms > kSlice) {
        callerSleep(kSlice);
        callerYield();
        ms -= kSlice;
    }
    callerSleep(ms);
}

// Checks the call against the capture's next one and answers it; a failure code when they differ.
template <std::size_t N>
std::int32_t answer(Replayer& r, const char* function, const std::array<ArgRef, N>& args) {
    auto refuse = [&](const std::string& why) {
        if (r.error.empty()) fail(r, why);
        return failCall(args);
    };
    if (!r.error.empty()) return refuse(r.error);
    if (r.next >= r.total)
        return refuse("expected the end of the capture (" + std::to_string(r.total) + " calls), came " + function);
    const std::size_t index = r.next;
    std::string why;
    const std::optional<Json> call = nextCall(r, why);
    if (!call) return refuse(why);
    const Json& c = *call;
    const std::string at = where(r);
    if (c["fn"] != function)
        return refuse(at + ": expected " + printable(c["fn"].get<std::string>()) + ", came " + function);

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
        bool ok = true;
        for (std::size_t i = 0; ok && i < N; ++i) {
            Bytes scratch(args[i].bytes());
            ok = !y.contains(args[i].name) || (args[i].comesOut() && applyChanges(y[args[i].name], scratch));
        }
        if (!ok) return refuse(at + " " + function + ": a yield of the capture is unreadable");
    }
    r.next++;

    // The call's time on the caller's clock, with what the recorded library had written at each yield.
    std::uint32_t elapsed = 0, spent = 0;
    for (const Json& y : yields) {
        const auto at = *integerAs<std::uint32_t>(y["at"]);
        replayWait(r, at > elapsed ? at - elapsed : 0, spent);
        elapsed = std::max(elapsed, at);
        for (std::size_t i = 0; i < N; ++i) {
            if (!y.contains(args[i].name) || !args[i].data) continue;
            Bytes now = bytesOf(args[i]);
            applyChanges(y[args[i].name], now);
            std::copy(now.begin(), now.end(), static_cast<std::uint8_t*>(args[i].data));
        }
        callerYield();
    }
    const auto ms = *integerAs<std::uint32_t>(c["ms"]);
    replayWait(r, ms > elapsed ? ms - elapsed : 0, spent);

    for (std::size_t i = 0; i < N; ++i) {
        if (!args[i].comesOut() || out[i].empty()) continue;
        std::copy(out[i].begin(), out[i].end(), static_cast<std::uint8_t*>(args[i].data));
        if (!args[i].type->number) r.memory.remember(int(index) + 1, args[i], std::move(out[i]));
    }
    return *integerAs<std::int32_t>(c["result"]);
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
    if (r.next >= r.total) return ME_SUCCESS;
    std::string why;
    const std::optional<Json> call = nextCall(r, why);
    const std::string expected = call ? printable(call->at("fn").get<std::string>()) + " (" + where(r) + ")" : where(r);
    return fail(r, "expected " + expected + ", came the end of the session after " + std::to_string(r.next) + " of " +
                       std::to_string(r.total) + " calls");
}

extern "C" VX_API const char* vxcap_last_error(void) {
    Replayer& r = replayer();
    std::lock_guard lock(r.mutex);
    return r.error.c_str();
}
