#include "window_recorder.h"

using namespace ostrand;

// Each wait runs its time out; another thread's signal cuts it short with the wait's name and 1223.
TEST(SleepTest, RunsOutOrIsCancelledFromAnotherThread)
{
    const std::pair<std::function<void(DWORD, CEvent&)>, const wchar_t*> waits[] = {
        {[](DWORD ms, CEvent& e) { ostrand::Sleep(ms, e); }, L"ostrand::Sleep 1223 Misc"},
        {[](DWORD ms, CEvent& e) { MsgSleep(ms, e); }, L"ostrand::MsgSleep 1223 Misc"}};
    for (const auto& w : waits)
    {
        CEvent cancel;
        const ULONGLONG start = ::GetTickCount64();
        w.first(60, cancel);
        EXPECT_GE(::GetTickCount64() - start, 44u); // one tick of the coarse counter below 60
        for (DWORD time : {DWORD(10000), DWORD(INFINITE)})
        {
            std::thread canceller([&] { ::Sleep(50), cancel.Set(); });
            EXPECT_EQ(w.second, threadtests::Thrown([&] { w.first(time, cancel); }));
            canceller.join();
        }
    }
}

TEST(MsgSleepTest, DropsKeysDeliversTheRepaintAndKeepsTheQuit)
{
    threadtests::RecordingWindow window;
    ::PostMessageW(window.hwnd, WM_KEYDOWN, 'A', 0);
    ::PostMessageW(window.hwnd, WM_USER + 1, 0, 0);
    ::InvalidateRect(window.hwnd, NULL, FALSE);
    ::PostQuitMessage(4);
    MsgSleep(300);
    EXPECT_EQ(0, window.count[WM_KEYDOWN] + window.count[WM_USER + 1]);
    window.ExpectPaintedQuitKeptAndDropped(true, 4, WM_KEYDOWN, WM_USER + 1);
}
