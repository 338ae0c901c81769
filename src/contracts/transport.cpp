#include "contracts/transport.h"

#include <exception>
#include <functional>
#include <optional>
#include <thread>
#include <type_traits>
#include <utility>
#include <vector>

#include "errors/err_propagator.h"
#include "platform/message_pump.h"
#include "platform/native.h"
#include "varnel/clock.h"

namespace varnel::detail {

namespace {

void requireComplete(const TransportFunctions& f) {
#define VARNEL_REQUIRE(ret, name, ...) \
    if (!f.name) raise(errc::transport_unavailable, "The transport has no function \"" #name "\"");
    VX_METER_FUNCTIONS(VARNEL_REQUIRE)
#undef VARNEL_REQUIRE
}

// The calling thread's clock, lent to a transport library. The context only
// tells threads apart: each thread's calls go to that thread's clock.
std::uint32_t tickFromTransport(void*) { return threadClock().tickCount(); }
void sleepFromTransport(void*, std::uint32_t ms) { threadClock().sleep(ms); }
thread_local char t_clockOwner;

// An argument as the table's C function takes it: single objects by address.
#define VARNEL_C_ARG(kind, type, name) , VARNEL_C_ARG_##kind(name)
#define VARNEL_C_ARG_REC(name) &name
#define VARNEL_C_ARG_VALUE(name) name
#define VARNEL_C_ARG_IN(name) &name
#define VARNEL_C_ARG_OUT(name) &name
#define VARNEL_C_ARG_INOUT(name) &name
#define VARNEL_C_ARG_IN_LIST(name) name
#define VARNEL_C_ARG_OUT_LIST(name) name

// A transport over a table of functions, obtained on first use.
class TableTransport final : public Transport {
public:
    explicit TableTransport(std::function<TransportFunctions()> load) : load_(std::move(load)) {}

#define VARNEL_FORWARD(ret, name, ...)                                             \
    ret name(VARNEL_CXX_PARAMS(__VA_ARGS__)) override {                            \
        return call(&TransportFunctions::name VX_EACH(VARNEL_C_ARG, __VA_ARGS__)); \
    }
    VX_METER_FUNCTIONS(VARNEL_FORWARD)
#undef VARNEL_FORWARD

private:
    // Runs one function; an error of a tick handler that ran while it yielded follows its return.
    // The member's type carries the library's calling convention (standard-call on 32-bit Windows).
    template <class F, class... A>
    std::invoke_result_t<F, A...> call(F TransportFunctions::*member, A... args) {
        const auto result = (functions().*member)(args...);
        if (auto error = takeYieldError()) std::rethrow_exception(error);
        return result;
    }

    const TransportFunctions& functions() {
        if (!table_) {
            TransportFunctions table = load_();
            requireComplete(table);
            table_ = table;
        }
        // The library keeps its hooks per thread: give it this thread's pump and clock.
        if (hookThread_ != std::this_thread::get_id()) {
            if (table_->vx_set_yield_hook) table_->vx_set_yield_hook(&pumpFromTransport, nullptr);
            if (table_->vx_set_clock_hook) lendThreadClock(table_->vx_set_clock_hook);
            hookThread_ = std::this_thread::get_id();
        }
        return *table_;
    }

    std::function<TransportFunctions()> load_;
    std::optional<TransportFunctions> table_;
    std::thread::id hookThread_;
};

// A library opened from the first of its candidate paths that loads; closed with the last transport over it.
class Library {
public:
    explicit Library(std::vector<std::string> paths) : paths_(std::move(paths)) {}
    ~Library() { close(); }
    Library(const Library&) = delete;
    Library& operator=(const Library&) = delete;

    // Opens the library and resolves every function; on failure it stays closed, so a later call retries.
    TransportFunctions open() {
        std::string tried;
        for (const std::string& path : paths_) {
            std::string reason;
            handle_ = native::openLibrary(path, reason);
            if (handle_) {
                path_ = path;
                break;
            }
            tried += (tried.empty() ? "\"" : "; \"") + path + "\": " + reason;
        }
        if (!handle_) {
            // One path reads as before; several name each place looked at.
            const std::string what =
                paths_.size() == 1 ? "Cannot load the transport library " : "Cannot find the transport library; tried ";
            raise(errc::transport_unavailable, what + tried);
        }
        TransportFunctions f{};
#define VARNEL_RESOLVE(ret, name, ...) f.name = reinterpret_cast<decltype(f.name)>(symbol(#name, true));
        VX_METER_FUNCTIONS(VARNEL_RESOLVE)
#undef VARNEL_RESOLVE
#define VARNEL_RESOLVE_HOOK(ret, name, ...) f.name = reinterpret_cast<decltype(f.name)>(symbol(#name, false));
        VX_HOOK_FUNCTIONS(VARNEL_RESOLVE_HOOK)
#undef VARNEL_RESOLVE_HOOK
        return f;
    }

private:
    void* symbol(const char* name, bool required) {
        std::string reason;
        void* address = native::librarySymbol(handle_, name, reason);
        if (!address && required) {
            close();
            raise(errc::transport_unavailable,
                  "The transport library \"" + path_ + "\" has no function \"" + name + "\": " + reason);
        }
        return address;
    }

    void close() {
        native::closeLibrary(handle_);
        handle_ = nullptr;
    }

    std::vector<std::string> paths_;
    std::string path_;  // the one opened
    void* handle_ = nullptr;
};

}  // namespace

std::shared_ptr<Transport> loadTransport(const std::string& path) {
    return loadTransport(std::vector<std::string>{path});
}

std::shared_ptr<Transport> loadTransport(std::vector<std::string> candidates) {
    auto library = std::make_shared<Library>(std::move(candidates));
    return std::make_shared<TableTransport>([library] { return library->open(); });
}

std::shared_ptr<Transport> makeTransport(const TransportFunctions& functions) {
    return std::make_shared<TableTransport>([functions] { return functions; });
}

void lendThreadClock(decltype(&::vx_set_clock_hook) setClockHook) {
    setClockHook(&tickFromTransport, &sleepFromTransport, &t_clockOwner);
}

}  // namespace varnel::detail
