// libvarnel_record: a transport library that forwards every call to another
// one and appends each call, with all it carried both ways, to a capture file.
#include <dlfcn.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <mutex>
#include <span>
#include <string>
#include <vector>

#include "caller_hooks.h"
#include "capture_format.h"
#include "varnel/vxcapture.h"

using namespace varnel::capture;

namespace {

// The recorded library's functions.
struct Inner {
#define VARNEL_CAP_POINTER(ret, name, ...) decltype(&::name) name = nullptr;
    VX_TRANSPORT_FUNCTIONS(VARNEL_CAP_POINTER)
#undef VARNEL_CAP_POINTER
};

struct Recorder {
    std::recursive_mutex mutex;
    bool configured = false;
    void* library = nullptr;
    Inner inner;
    std::string capturePath;
    int file = -1;
    int calls = 0;
    unsigned starts = 0;
    OutMemory memory;
    // Why recording stopped; every later call fails with it, but the release of the meter.
    std::string error;
    bool releasedUnrecorded = false;
};

Recorder& recorder() {
    static Recorder r;
    return r;
}

// A call under way: what its arguments held when the recorded library last
// yielded, so each yield notes what the library had written by then.
struct CallUnderWay {
    std::span<const ArgRef> args;
    std::vector<Bytes> seen;
    std::uint32_t start = 0;
    Json yields = Json::array();
};
thread_local CallUnderWay* t_call = nullptr;
// Which hooks this thread last handed on, and to which start's library.
thread_local unsigned t_handedGeneration = 0;
thread_local unsigned t_handedStart = 0;

// The recorded library's yield hook: notes the call's progress, then lets the caller's pump run.
void yieldFromInner(void*) {
    // Nothing may escape into the recorded library; a yield that cannot be noted is left out.
    if (CallUnderWay* c = t_call) try {
            Json y{{"at", callerTicks() - c->start}};
            for (std::size_t i = 0; i < c->args.size(); ++i) {
                const ArgRef& a = c->args[i];
                if (!a.comesOut() || !a.data) continue;
                Bytes now = bytesOf(a);
                if (now == c->seen[i]) continue;
                y[a.name] = changesBetween(c->seen[i], now);
                c->seen[i] = std::move(now);
            }
            c->yields.push_back(std::move(y));
        } catch (const std::exception&) {}
    callerYield();
}

// The simulated transport beside this library.
std::string defaultTransport() {
    Dl_info info{};
    if (dladdr(reinterpret_cast<void*>(&vxcap_record_start), &info) && info.dli_fname) {
        std::string self = info.dli_fname;
        const auto slash = self.rfind('/');
        if (slash != std::string::npos) return self.substr(0, slash + 1) + VARNEL_TRANSPORT_NAME;
    }
    return VARNEL_TRANSPORT_NAME;
}

int fail(Recorder& r, std::string why) {
    r.error = std::move(why);
    return ME_FAIL;
}

// Appends one line; false when not all of it reached the file.
bool writeLine(int fd, const std::string& text) {
    const std::string line = text + '\n';
    for (std::size_t done = 0; done < line.size();) {
        const ssize_t n = ::write(fd, line.data() + done, line.size() - done);
        if (n < 0 && errno == EINTR) continue;
        if (n <= 0) return false;
        done += static_cast<std::size_t>(n);
    }
    return true;
}

// A capture holds health data: only its owner reads it. A FIFO without a reader is
// refused at once rather than waited on. Returns the descriptor, or -1 with errno.
int openCapture(const std::string& path) {
    const int fd = ::open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_NONBLOCK | O_CLOEXEC, 0600);
    if (fd < 0) return -1;
    struct stat st {};
    if (::fstat(fd, &st) == 0 && S_ISREG(st.st_mode)) (void)::fchmod(fd, 0600);
    ::fcntl(fd, F_SETFL, ::fcntl(fd, F_GETFL) & ~O_NONBLOCK);
    return fd;
}

void closeCapture(Recorder& r) {
    if (r.file >= 0) ::close(r.file);
    r.file = -1;
}

// The capture libraries answer or record themselves; recording one would recurse.
bool isCaptureLibrary(void* library) {
    return dlsym(library, "vxcap_record_start") || dlsym(library, "vxcap_replay_start");
}

int start(Recorder& r, const std::string& transport, const std::string& capture) {
    r.configured = true;
    r.error.clear();
    r.releasedUnrecorded = false;
    closeCapture(r);
    if (r.library) dlclose(r.library);
    r.library = nullptr;
    r.inner = {};
    r.calls = 0;
    r.memory.clear();
    ++r.starts;
    void* library = dlopen(transport.c_str(), RTLD_NOW | RTLD_LOCAL);
    if (!library) {
        const char* why = dlerror();
        return fail(r, "cannot load the transport library " + transport + ": " + (why ? why : "unknown reason"));
    }
    if (isCaptureLibrary(library)) {
        dlclose(library);
        return fail(r, "the transport library " + transport +
                           " is a capture library itself; name the transport library it should record");
    }
    Inner inner;
#define VARNEL_CAP_RESOLVE(ret, name, ...) inner.name = reinterpret_cast<decltype(inner.name)>(dlsym(library, #name));
    VX_TRANSPORT_FUNCTIONS(VARNEL_CAP_RESOLVE)
#undef VARNEL_CAP_RESOLVE
#define VARNEL_CAP_REQUIRE(ret, name, ...)                                                       \
    if (!inner.name) {                                                                           \
        dlclose(library);                                                                        \
        return fail(r, "the transport library " + transport + " has no function \"" #name "\""); \
    }
    VX_METER_FUNCTIONS(VARNEL_CAP_REQUIRE)
#undef VARNEL_CAP_REQUIRE
    r.file = openCapture(capture);
    const int error = errno;
    if (r.file < 0 || !writeLine(r.file, lineText(headerLine(transport)))) {
        const int why = r.file < 0 ? error : errno;
        closeCapture(r);
        dlclose(library);
        return fail(r, "cannot write the capture file " + capture + ": " + std::strerror(why));
    }
    r.library = library;
    r.inner = inner;
    r.capturePath = capture;
    return ME_SUCCESS;
}

// Configures from the environment when no control function did.
void configure(Recorder& r) {
    if (r.configured) return;
    const char* file = std::getenv("VARNEL_RECORD_FILE");
    const char* transport = std::getenv("VARNEL_RECORD_TRANSPORT");
    if (!file || !*file) {
        r.configured = true;
        fail(r, "no capture file: set VARNEL_RECORD_FILE or call vxcap_record_start");
        return;
    }
    start(r, transport && *transport ? transport : defaultTransport(), file);
}

// Hands this thread's hooks to the recorded library: the caller's clock as it
// is, and the recorder's yield hook in front of the caller's pump.
void handHooks(const Recorder& r) {
    const Inner& inner = r.inner;
    const CallerHooks& h = callerHooks();
    if (t_handedGeneration == h.generation && t_handedStart == r.starts) return;
    if (inner.vx_set_yield_hook) inner.vx_set_yield_hook(&yieldFromInner, nullptr);
    if (inner.vx_set_clock_hook) inner.vx_set_clock_hook(h.tick, h.sleep, h.clockContext);
    t_handedGeneration = h.generation;
    t_handedStart = r.starts;
}

template <std::size_t N>
std::int32_t recordCall(const char* function, const std::array<ArgRef, N>& args,
                        const std::function<std::int32_t(const Inner&)>& forward) {
    Recorder& r = recorder();
    std::lock_guard lock(r.mutex);
    configure(r);
    if (!r.error.empty()) {
        // Nothing more is recorded, but a meter that was found must still be released.
        if (std::strcmp(function, "close_meter") != 0 || !r.library) return failCall(args);
        handHooks(r);
        if (!r.releasedUnrecorded) r.error += "; close_meter was passed on to release the meter, unrecorded";
        r.releasedUnrecorded = true;
        return forward(r.inner);
    }
    const int call = r.calls + 1;
    Json line;
    std::array<Bytes, N> in;
    try {
        line = Json{{"call", call}, {"fn", function}, {"in", Json::object()}};
        for (std::size_t i = 0; i < N; ++i) {
            in[i] = bytesOf(args[i]);
            if (args[i].goesIn()) line["in"][args[i].name] = encodeIn(args[i], call, r.memory);
        }
    } catch (const std::exception& e) {
        fail(r, std::string("cannot record call ") + std::to_string(call) + ": " + e.what());
        return failCall(args);
    }
    r.calls = call;
    handHooks(r);
    CallUnderWay under{args, std::vector<Bytes>(in.begin(), in.end()), callerTicks()};
    t_call = &under;
    const std::int32_t result = forward(r.inner);
    t_call = nullptr;
    // The call happened: its answer stands, but a session that cannot be recorded stops here.
    try {
        const std::uint32_t ms = callerTicks() - under.start;
        line["out"] = Json::object();
        for (std::size_t i = 0; i < N; ++i) {
            if (!args[i].comesOut()) continue;
            line["out"][args[i].name] = encodeOut(args[i], in[i]);
            if (args[i].data && !args[i].type->number) r.memory.remember(call, args[i], bytesOf(args[i]));
        }
        line["result"] = result;
        line["ms"] = ms;
        if (!under.yields.empty()) line["yields"] = std::move(under.yields);
        if (!writeLine(r.file, lineText(line)))
            fail(r, "cannot write the capture file " + r.capturePath + " after call " + std::to_string(call) + ": " +
                        std::strerror(errno));
    } catch (const std::exception& e) {
        fail(r, "cannot record call " + std::to_string(call) + ": " + e.what());
    }
    return result;
}

}  // namespace

#define VARNEL_CAP_PASS(kind, type, name) , name
#define VARNEL_CAP_RECORD(ret, name, ...)                                                                       \
    extern "C" VX_API ret name(VX_C_PARAMS(__VA_ARGS__)) {                                                      \
        return static_cast<ret>(recordCall(#name, VARNEL_CAP_ARGS(__VA_ARGS__), [&](const Inner& inner) {       \
            return static_cast<std::int32_t>(inner.name(VX_COMMA_LIST(VX_EACH(VARNEL_CAP_PASS, __VA_ARGS__)))); \
        }));                                                                                                    \
    }
VX_METER_FUNCTIONS(VARNEL_CAP_RECORD)
#undef VARNEL_CAP_RECORD

extern "C" VX_API int vxcap_record_start(const char* transport_path, const char* capture_path) {
    Recorder& r = recorder();
    std::lock_guard lock(r.mutex);
    if (!capture_path || !*capture_path) {
        r.configured = true;
        return fail(r, "no capture file named");
    }
    return start(r, transport_path && *transport_path ? transport_path : defaultTransport(), capture_path);
}

extern "C" VX_API const char* vxcap_last_error(void) {
    Recorder& r = recorder();
    std::lock_guard lock(r.mutex);
    return r.error.c_str();
}
