// POSIX: no message queue and no window timers, so waits and timers run on the
// thread clock alone (see wait.cpp); libraries through dlopen.
#include "platform/native.h"

#include <dlfcn.h>

#include <chrono>
#include <filesystem>
#include <thread>

namespace varnel::detail::native {

std::uint32_t tickCount() {
    using namespace std::chrono;
    return static_cast<std::uint32_t>(duration_cast<milliseconds>(steady_clock::now().time_since_epoch()).count());
}

void sleep(std::uint32_t ms) { std::this_thread::sleep_for(std::chrono::milliseconds(ms)); }

bool hasMessageQueue() { return false; }

void* createEvent() { return nullptr; }
void closeEvent(void*) {}
void pulseEvent(void*) {}

// Never reached without a message queue; a plain timed wait if it were.
std::int32_t waitEventsOrMessage(std::span<void* const>, std::int32_t ms) {
    if (ms >= 0) sleep(static_cast<std::uint32_t>(ms));
    return timedOut;
}

void runPendingMessages() {}

bool startWindowTimer(std::uintptr_t, std::uint32_t) { return false; }
void stopWindowTimer(std::uintptr_t) {}

namespace {
std::string lastError() {
    const char* text = dlerror();
    return text ? text : "unknown reason";
}
}  // namespace

void* openLibrary(const std::string& path, std::string& error) {
    dlerror();
    void* handle = dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);
    if (!handle) error = lastError();
    return handle;
}

void* librarySymbol(void* library, const char* name, std::string& error) {
    dlerror();
    void* address = dlsym(library, name);
    if (!address) error = lastError();
    return address;
}

void closeLibrary(void* library) {
    if (library) dlclose(library);
}

// Found through one of this module's own functions, so sanitizer runtimes that
// stand in for the loader's caller do not move it.
std::string ownModuleDirectory() {
    Dl_info info{};
    if (!dladdr(reinterpret_cast<void*>(&ownModuleDirectory), &info) || !info.dli_fname) return {};
    std::error_code ec;
    std::filesystem::path dir = std::filesystem::path(info.dli_fname).parent_path();
    const std::filesystem::path absolute = std::filesystem::absolute(dir, ec);
    return (ec ? dir : absolute).string();
}

char pathSeparator() { return '/'; }

bool isFile(const std::string& path) {
    std::error_code ec;
    return std::filesystem::is_regular_file(path, ec);
}

}  // namespace varnel::detail::native
