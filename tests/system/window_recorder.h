// Shared by the thread tests: a window that counts its messages, and a check of CWinException.
#pragma once

#include <ostrand/system/Thread.h>
#include <ostrand/errors/Exception.h>

#include <gtest/gtest.h>

#include <atomic>
#include <functional>

namespace threadtests
{

// Expects `f` to throw CWinException with this call name, code and source file.
inline void ExpectWinError(const std::function<void()>& f, const wchar_t* call, DWORD code,
                           const wchar_t* file)
{
    try
    {
        f();
        ADD_FAILURE() << "no exception from " << ostrand::ustring(call).c_str();
    }
    catch (const ostrand::CWinException& e)
    {
        EXPECT_EQ(ostrand::ustring(call), e.GetFunction());
        EXPECT_EQ(code, e.GetErrorCode()) << ostrand::ustring(call).c_str();
        EXPECT_EQ(ostrand::ustring(file), e.GetFileName());
    }
}

// A visible popup that counts the messages its procedure receives, read from any thread; paints validate.
class RecordingWindow
{
public:
    RecordingWindow()
    {
        WNDCLASSW wc = {};
        wc.lpfnWndProc = &Proc;
        wc.hInstance = ::GetModuleHandleW(NULL);
        wc.lpszClassName = L"OstrandRecordingWindow";
        ::RegisterClassW(&wc); // fails harmlessly once registered
        m_hWnd = ::CreateWindowExW(0, wc.lpszClassName, L"recording", WS_POPUP, 10, 10, 200, 150, NULL, NULL,
                                   wc.hInstance, NULL);
        // Unactivated, Wine leaves it unmanaged: destroying it does not wait for a window manager.
        ::ShowWindow(m_hWnd, SW_SHOWNOACTIVATE);
        // Creation and the first paint are not what the tests count.
        for (ULONGLONG end = ::GetTickCount64() + 200; ::GetTickCount64() < end; ::Sleep(5))
            Pump();
        ::SetWindowLongPtrW(m_hWnd, GWLP_USERDATA, reinterpret_cast<LONG_PTR>(this));
    }
    ~RecordingWindow()
    {
        ::DestroyWindow(m_hWnd);
        Pump();
    }

    HWND Handle() const { return m_hWnd; }
    int Count(UINT message) const { return m_aCount[message].load(); }
    // Polls until the window has received `message`; false after `timeoutMs`.
    bool WaitFor(UINT message, DWORD timeoutMs) const
    {
        for (const ULONGLONG end = ::GetTickCount64() + timeoutMs; Count(message) == 0; ::Sleep(1))
            if (::GetTickCount64() >= end)
                return false;
        return true;
    }
    bool HasQueued(UINT first, UINT last) const
    {
        MSG msg;
        return ::PeekMessageW(&msg, m_hWnd, first, last, PM_NOREMOVE) != FALSE;
    }

private:
    static void Pump()
    {
        MSG msg;
        while (::PeekMessageW(&msg, NULL, 0, 0, PM_REMOVE))
            ::DispatchMessageW(&msg);
    }
    static LRESULT CALLBACK Proc(HWND hwnd, UINT message, WPARAM wParam, LPARAM lParam)
    {
        auto* self = reinterpret_cast<RecordingWindow*>(::GetWindowLongPtrW(hwnd, GWLP_USERDATA));
        if (self != NULL && message < kTracked)
            ++self->m_aCount[message];
        if (message != WM_PAINT)
            return ::DefWindowProcW(hwnd, message, wParam, lParam);
        return ::ValidateRect(hwnd, NULL) ? 0 : 1;
    }

    static const UINT kTracked = WM_USER + 16;
    HWND m_hWnd;
    std::atomic<int> m_aCount[kTracked] = {};
};

} // namespace threadtests
