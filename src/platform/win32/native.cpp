// Win32: waits on the thread's message queue (MsgWaitForMultipleObjects),
// timers as window timers of a hidden message-only window, so their ticks also
// arrive while another message loop runs (a transport call pumping messages
// itself), and libraries through LoadLibrary. Paths are UTF-8.
#include "platform/native.h"

#define WIN32_LEAN_AND_MEAN
#include <windows.h>

#include <string>
#include <vector>

#include "errors/err_propagator.h"

namespace varnel::detail::native {

namespace {

// Input, posted, sent, timer, paint and hot-key messages all end a round of a wait.
constexpr DWORD kWakeMask = 0xFF;

std::wstring wide(const std::string& text) {
    if (text.empty()) return {};
    const int n = MultiByteToWideChar(CP_UTF8, 0, text.data(), static_cast<int>(text.size()), nullptr, 0);
    std::wstring out(static_cast<std::size_t>(n), L'\0');
    MultiByteToWideChar(CP_UTF8, 0, text.data(), static_cast<int>(text.size()), out.data(), n);
    return out;
}

std::string narrow(const wchar_t* text, std::size_t length) {
    if (length == 0) return {};
    const int size = static_cast<int>(length);
    const int n = WideCharToMultiByte(CP_UTF8, 0, text, size, nullptr, 0, nullptr, nullptr);
    std::string out(static_cast<std::size_t>(n), '\0');
    WideCharToMultiByte(CP_UTF8, 0, text, size, out.data(), n, nullptr, nullptr);
    return out;
}

// The system's text for an error code, with the code.
std::string systemError(DWORD code) {
    wchar_t* text = nullptr;
    const DWORD length =
        FormatMessageW(FORMAT_MESSAGE_ALLOCATE_BUFFER | FORMAT_MESSAGE_FROM_SYSTEM | FORMAT_MESSAGE_IGNORE_INSERTS,
                       nullptr, code, 0, reinterpret_cast<wchar_t*>(&text), 0, nullptr);
    std::string message = length ? narrow(text, length) : std::string();
    if (text) LocalFree(text);
    while (!message.empty() && (message.back() == '\n' || message.back() == '\r' || message.back() == ' '))
        message.pop_back();
    return "error " + std::to_string(code) + (message.empty() ? "" : ": " + message);
}

HMODULE ownModule() {
    HMODULE module = nullptr;
    GetModuleHandleExW(GET_MODULE_HANDLE_EX_FLAG_FROM_ADDRESS | GET_MODULE_HANDLE_EX_FLAG_UNCHANGED_REFCOUNT,
                       reinterpret_cast<LPCWSTR>(&ownModule), &module);
    return module;
}

LRESULT CALLBACK timerWindowProc(HWND window, UINT message, WPARAM wParam, LPARAM lParam) {
    if (message == WM_TIMER) {
        tickWindowTimer(static_cast<std::uintptr_t>(wParam));
        return 0;
    }
    return DefWindowProcW(window, message, wParam, lParam);
}

// The window class of the hidden timer windows, registered once per module.
const wchar_t* timerWindowClass() {
    static const ATOM atom = [] {
        WNDCLASSW windowClass{};
        windowClass.lpfnWndProc = &timerWindowProc;
        windowClass.hInstance = ownModule();
        windowClass.lpszClassName = L"VarnelTimerWindow";
        return RegisterClassW(&windowClass);
    }();
    return atom ? reinterpret_cast<const wchar_t*>(static_cast<ULONG_PTR>(atom)) : nullptr;
}

// The thread's hidden window, created on first use and destroyed with the thread.
struct TimerWindow {
    HWND handle = nullptr;
    ~TimerWindow() {
        if (handle) DestroyWindow(handle);
        handle = nullptr;
    }
};
thread_local TimerWindow t_window;

HWND timerWindow() {
    if (!t_window.handle && timerWindowClass())
        t_window.handle =
            CreateWindowExW(0, timerWindowClass(), L"", 0, 0, 0, 0, 0, HWND_MESSAGE, nullptr, ownModule(), nullptr);
    return t_window.handle;
}

}  // namespace

std::uint32_t tickCount() { return GetTickCount(); }

void sleep(std::uint32_t ms) { Sleep(ms); }

bool hasMessageQueue() { return true; }

// Private to the process: a named event would be shared with every program on
// the machine, whose pulses would then end this one's waits (and an object of
// another kind under that name would make creating it fail).
void* createEvent() {
    HANDLE event = CreateEventA(nullptr, TRUE, FALSE, nullptr);
    if (!event) raise(errc::internal, "CreateEvent failed: " + systemError(GetLastError()));
    return event;
}

void closeEvent(void* event) {
    if (event) CloseHandle(event);
}

void pulseEvent(void* event) {
    if (event) PulseEvent(event);
}

std::int32_t waitEventsOrMessage(std::span<void* const> events, std::int32_t ms) {
    const auto count = static_cast<DWORD>(events.size());
    const DWORD result = MsgWaitForMultipleObjects(count, events.data(), FALSE,
                                                   ms < 0 ? INFINITE : static_cast<DWORD>(ms), kWakeMask);
    if (result == WAIT_TIMEOUT) return timedOut;
    if (result < WAIT_OBJECT_0 + count) return static_cast<std::int32_t>(result - WAIT_OBJECT_0);
    if (result == WAIT_OBJECT_0 + count) return messageArrived;
    raise(errc::internal, "MsgWaitForMultipleObjects failed: " + systemError(GetLastError()));
}

void runPendingMessages() {
    MSG message;
    while (PeekMessageW(&message, nullptr, 0, 0, PM_REMOVE)) {
        // The quit request belongs to the client's own message loop: leave it there.
        if (message.message == WM_QUIT) {
            PostQuitMessage(static_cast<int>(message.wParam));
            break;
        }
        TranslateMessage(&message);
        DispatchMessageW(&message);
    }
}

bool startWindowTimer(std::uintptr_t id, std::uint32_t interval) {
    const HWND window = timerWindow();
    return window && SetTimer(window, id, interval, nullptr) != 0;
}

void stopWindowTimer(std::uintptr_t id) {
    if (t_window.handle) KillTimer(t_window.handle, id);
}

void* openLibrary(const std::string& path, std::string& error) {
    const std::wstring name = wide(path);
    // A full path lets the library's own dependencies be found beside it too.
    const bool full = name.size() > 2 && (name[1] == L':' || (name[0] == L'\\' && name[1] == L'\\'));
    HMODULE module = LoadLibraryExW(name.c_str(), nullptr, full ? LOAD_WITH_ALTERED_SEARCH_PATH : 0);
    if (!module) error = systemError(GetLastError());
    return reinterpret_cast<void*>(module);
}

void* librarySymbol(void* library, const char* name, std::string& error) {
    const FARPROC address = GetProcAddress(static_cast<HMODULE>(library), name);
    if (!address) error = systemError(GetLastError());
    return reinterpret_cast<void*>(address);
}

void closeLibrary(void* library) {
    if (library) FreeLibrary(static_cast<HMODULE>(library));
}

std::string ownModuleDirectory() {
    std::vector<wchar_t> path(MAX_PATH);
    for (;;) {
        const DWORD n = GetModuleFileNameW(ownModule(), path.data(), static_cast<DWORD>(path.size()));
        if (n == 0) return {};
        if (n < path.size()) break;
        path.resize(path.size() * 2);
    }
    std::wstring full(path.data());
    const std::size_t slash = full.find_last_of(L"\\/");
    return slash == std::wstring::npos ? std::string() : narrow(full.data(), slash);
}

char pathSeparator() { return '\\'; }

bool isFile(const std::string& path) {
    const DWORD attributes = GetFileAttributesW(wide(path).c_str());
    return attributes != INVALID_FILE_ATTRIBUTES && !(attributes & FILE_ATTRIBUTE_DIRECTORY);
}

}  // namespace varnel::detail::native
