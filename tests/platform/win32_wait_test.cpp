// The waits and the progress timer on Windows' own clock (GetTickCount),
// message queue and window timer: the thread keeps the real clock here.
#include <gtest/gtest.h>
#include <windows.h>

#include <atomic>
#include <stdexcept>
#include <thread>

#include "platform/message_pump.h"
#include "platform/wait.h"

using namespace varnel::detail;

namespace {

// A hidden window of the test's own that counts the messages posted to it.
struct CountingWindow {
    static inline int received = 0;
    static LRESULT CALLBACK proc(HWND window, UINT message, WPARAM wParam, LPARAM lParam) {
        if (message == WM_APP) {
            ++received;
            return 0;
        }
        return DefWindowProcW(window, message, wParam, lParam);
    }
    HWND handle = nullptr;
    CountingWindow() {
        WNDCLASSW windowClass{};
        windowClass.lpfnWndProc = &proc;
        windowClass.hInstance = GetModuleHandleW(nullptr);
        windowClass.lpszClassName = L"VarnelTestWindow";
        RegisterClassW(&windowClass);
        handle = CreateWindowExW(0, L"VarnelTestWindow", L"", 0, 0, 0, 0, 0, HWND_MESSAGE, nullptr,
                                 windowClass.hInstance, nullptr);
        received = 0;
    }
    ~CountingWindow() { DestroyWindow(handle); }
};

struct Win32WaitTest : ::testing::Test {
    clsWait wait;
    void SetUp() override { ASSERT_TRUE(onSystemQueue()); }
    void TearDown() override { frmTimer().disableTimer(); }
};

TEST_F(Win32WaitTest, SleepRunsItsTimeWhileMessagesRunWithoutEndingIt) {
    CountingWindow window;
    for (int i = 0; i < 3; ++i) PostMessageW(window.handle, WM_APP, 0, 0);
    const DWORD start = GetTickCount();
    wait.SleepForSeconds(0.1);
    const DWORD elapsed = GetTickCount() - start;
    EXPECT_EQ(CountingWindow::received, 3);
    EXPECT_GE(elapsed, 90u);  // the tick count moves in steps of about 16 ms
    EXPECT_LT(elapsed, 5000u);
}

TEST_F(Win32WaitTest, APulseFromAnotherThreadEndsAWaitAtOnce) {
    std::atomic<bool> done = false;
    WaitEvent event;
    // A pulse finds only the waits in progress, so it is repeated until one was found.
    std::thread pulser([&] {
        while (!done) {
            Sleep(20);
            event.pulse();
        }
    });
    WaitEvent* objects[] = {&event};
    const DWORD start = GetTickCount();
    EXPECT_EQ(wait.MsgWaitObj(noTimeLimit, objects), 0);  // blocks: another thread may pulse
    EXPECT_EQ(wait.MsgWaitObj(20000, objects), 0);
    done = true;
    pulser.join();
    EXPECT_LT(GetTickCount() - start, 10000u);
}

TEST_F(Win32WaitTest, ProgressTicksComeFromAWindowTimerInAnyMessageLoop) {
    int ticks = 0;
    TimerConnection counting = frmTimer().tmrStatus().onTick([&] { ++ticks; });
    frmTimer().enableTimer();
    // A message loop that is not ours, as a transport call that pumps messages runs one.
    const DWORD start = GetTickCount();
    while (GetTickCount() - start < 1000) {
        MsgWaitForMultipleObjects(0, nullptr, FALSE, 50, QS_ALLINPUT);
        MSG message;
        while (PeekMessageW(&message, nullptr, 0, 0, PM_REMOVE)) DispatchMessageW(&message);
    }
    EXPECT_GE(ticks, 1);
    EXPECT_LE(ticks, 3);

    ticks = 0;
    wait.SleepForSeconds(0.9);
    EXPECT_GE(ticks, 1);
    frmTimer().disableTimer();
    ticks = 0;
    wait.SleepForSeconds(0.5);
    EXPECT_EQ(ticks, 0);

    // A handler's error cannot cross the system's dispatch; the wait raises it.
    TimerConnection failing = frmTimer().tmrStatus().onTick([] { throw std::runtime_error("tick failed"); });
    frmTimer().enableTimer();
    EXPECT_THROW(wait.SleepForSeconds(5.0), std::runtime_error);
}

}  // namespace
