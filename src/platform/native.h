// The operating system under the platform folder: the real clock, kernel
// events, the thread's window messages and window timers, and shared
// libraries. One implementation per system (posix/, win32/), chosen by the
// build; everything above calls these and nothing of the system.
#pragma once

#include <cstdint>
#include <span>
#include <string>

namespace varnel::detail {

// Runs the ticks of the thread's timer `id` (a window timer calls it; errors are kept, see message_pump.h).
void tickWindowTimer(std::uintptr_t id) noexcept;

namespace native {

// The system's millisecond tick count, wrapping at 2^32, and a plain sleep.
std::uint32_t tickCount();
void sleep(std::uint32_t ms);

// True when the system has a message queue per thread (Windows): waits on the
// real clock then wait on it, and timers are window timers.
bool hasMessageQueue();

// A manual-reset kernel event, not signalled (null where the system has none).
void* createEvent();
void closeEvent(void* event);
// Releases the threads waiting on the event now and leaves it unsignalled.
void pulseEvent(void* event);

// What ended one round of waitEventsOrMessage besides a signalled event.
inline constexpr std::int32_t messageArrived = -2;
inline constexpr std::int32_t timedOut = -1;

// Waits until one of the events is signalled (its index), a message arrives
// for the thread (messageArrived) or ms pass (timedOut); a negative ms waits
// without a limit.
std::int32_t waitEventsOrMessage(std::span<void* const> events, std::int32_t ms);

// Lets the thread's pending window messages run once (nothing without a queue).
void runPendingMessages();

// Starts the thread's window timer `id`, calling tickWindowTimer(id) every
// interval ms while the thread pumps; false where there are no window timers.
bool startWindowTimer(std::uintptr_t id, std::uint32_t interval);
void stopWindowTimer(std::uintptr_t id);

// A shared library by path (UTF-8); null with the system's reason in error.
void* openLibrary(const std::string& path, std::string& error);
// A function of the library by its exported name; null with the reason in error.
void* librarySymbol(void* library, const char* name, std::string& error);
void closeLibrary(void* library);

// The absolute directory of the module (program or library) holding this
// code, without a trailing separator; empty when the system cannot tell.
std::string ownModuleDirectory();
// The separator of path components.
char pathSeparator();
// True when the path names an existing regular file.
bool isFile(const std::string& path);

}  // namespace native
}  // namespace varnel::detail
