#include "window_recorder.h"

#include <ostrand/system/Misc.h>

#include <thread>

using namespace ostrand;
using threadtests::ExpectWinError;

// Each wait runs its time out; another thread's signal cuts it short with the wait's name and 1223.
TEST(SleepTest, RunsOutOrIsCancelledFromAnotherThread)
{
    const struct
    {
        std::function<void(DWORD, CEvent&)> wait;
        const wchar_t* name;
    } waits[] = {{[](DWORD ms, CEvent& e) { ostrand::Sleep(ms, e); }, L"ostrand::Sleep"},
                 {[](DWORD ms, CEvent& e) { MsgSleep(ms, e); }, L"ostrand::MsgSleep"}};
    for (const auto& w : waits)
    {
        CEvent cancel;
        const ULONGLONG start = ::GetTickCount64();
        w.wait(60, cancel);
        EXPECT_GE(::GetTickCount64() - start, 44u); // one tick of the coarse counter below 60
        for (DWORD time : {DWORD(10000), DWORD(INFINITE)})
        {
            std::thread canceller([&] { ::Sleep(50), cancel.Set(); });
            ExpectWinError([&] { w.wait(time, cancel); }, w.name, ERROR_CANCELLED, L"Misc");
            canceller.join();
        }
    }
}

TEST(MsgSleepTest, DropsKeysDeliversTheRepaintAndKeepsTheQuit)
{
    threadtests::RecordingWindow window;
    ::PostMessageW(window.Handle(), WM_KEYDOWN, 'A', 0);
    ::PostMessageW(window.Handle(), WM_USER + 1, 0, 0);
    ::InvalidateRect(window.Handle(), NULL, FALSE);
    ::PostQuitMessage(4);
    MsgSleep(300);
    EXPECT_GE(window.Count(WM_PAINT), 1);
    EXPECT_EQ(0, window.Count(WM_KEYDOWN));
    EXPECT_EQ(0, window.Count(WM_USER + 1));
    EXPECT_FALSE(::GetUpdateRect(window.Handle(), NULL, FALSE));
    MSG msg; // the WM_QUIT first: a peek with any filter returns it
    ASSERT_TRUE(::PeekMessageW(&msg, NULL, WM_QUIT, WM_QUIT, PM_REMOVE));
    EXPECT_EQ(4u, msg.wParam);
    EXPECT_FALSE(window.HasQueued(WM_KEYDOWN, WM_USER + 1));
}
