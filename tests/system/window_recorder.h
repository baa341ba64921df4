// Shared by the thread tests: a window that counts its messages, and a check of CWinException.
#pragma once

#include <ostrand/errors/Exception.h>
#include <ostrand/system/APC.h>
#include <ostrand/system/Misc.h>
#include <ostrand/system/Thread.h>

#include <gtest/gtest.h>

#include <atomic>
#include <cstring>
#include <functional>
#include <stdexcept>
#include <thread>
#include <tuple>

namespace threadtests
{

// What `f` throws: "function code file" of a CWinException, "runtime_error what" of a runtime_error.
inline std::wstring Thrown(const std::function<void()>& f)
{
    try
    {
        f();
    }
    catch (const ostrand::CWinException& e)
    {
        return std::wstring(e.GetFunction()) + L" " + std::to_wstring(e.GetErrorCode()) + L" " +
               std::wstring(e.GetFileName());
    }
    catch (const std::runtime_error& e)
    {
        return L"runtime_error " + std::wstring(e.what(), e.what() + std::strlen(e.what()));
    }
    return L"nothing";
}

// A visible popup that counts the messages its procedure receives, read from any thread; paints validate.
struct RecordingWindow
{
    RecordingWindow()
    {
        WNDCLASSW wc = {0,    &Proc, 0,    0,    ::GetModuleHandleW(NULL),
                        NULL, NULL,  NULL, NULL, L"OstrandRecording"};
        ::RegisterClassW(&wc); // fails harmlessly once registered
        hwnd = ::CreateWindowExW(0, wc.lpszClassName, L"recording", WS_POPUP, 10, 10, 200, 150, NULL, NULL,
                                 wc.hInstance, NULL);
        // Unactivated, Wine leaves it unmanaged: destroying it does not wait for a window manager.
        ::ShowWindow(hwnd, SW_SHOWNOACTIVATE);
        for (ULONGLONG end = ::GetTickCount64() + 200; ::GetTickCount64() < end; ::Sleep(5))
            Pump(); // creation and the first paint are not counted
        ::SetWindowLongPtrW(hwnd, GWLP_USERDATA, reinterpret_cast<LONG_PTR>(this));
    }
    ~RecordingWindow() { ::DestroyWindow(hwnd), Pump(); }
    bool WaitFor(UINT message) const // at most 5 s
    {
        for (int i = 0; i < 5000 && count[message] == 0; ++i)
            ::Sleep(1);
        return count[message] > 0;
    }
    // The repaint is done, the queued WM_QUIT kept with its code, nothing of first..last held back.
    void ExpectPaintedQuitKeptAndDropped(bool painted, WPARAM quit, UINT first, UINT last) const
    {
        EXPECT_EQ(painted, count[WM_PAINT] > 0);
        EXPECT_EQ(painted, ::GetUpdateRect(hwnd, NULL, FALSE) == FALSE);
        MSG msg; // the WM_QUIT first: a peek with any filter returns it
        ASSERT_TRUE(::PeekMessageW(&msg, NULL, WM_QUIT, WM_QUIT, PM_REMOVE));
        EXPECT_EQ(quit, msg.wParam);
        EXPECT_FALSE(::PeekMessageW(&msg, hwnd, first, last, PM_NOREMOVE));
    }
    static void Pump()
    {
        for (MSG msg; ::PeekMessageW(&msg, NULL, 0, 0, PM_REMOVE);)
            ::DispatchMessageW(&msg);
    }
    static LRESULT CALLBACK Proc(HWND hwnd, UINT message, WPARAM wParam, LPARAM lParam)
    {
        auto* self = reinterpret_cast<RecordingWindow*>(::GetWindowLongPtrW(hwnd, GWLP_USERDATA));
        if (self != NULL && message < WM_USER + 16)
            ++self->count[message];
        return message == WM_PAINT ? !::ValidateRect(hwnd, NULL)
                                   : ::DefWindowProcW(hwnd, message, wParam, lParam);
    }
    HWND hwnd;
    std::atomic<int> count[WM_USER + 16] = {};
};

} // namespace threadtests
