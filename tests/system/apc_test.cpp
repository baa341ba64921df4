#include <ostrand/system/APC.h>
#include <ostrand/errors/Exception.h>

#include <gtest/gtest.h>

#include <atomic>
#include <stdexcept>

// A visible top-level popup that counts the messages its procedure receives (repaints are validated).
// The counts are read from other threads. sleep_test.cpp repeats this declaration.
namespace threadtests
{
class RecordingWindow
{
public:
    RecordingWindow();
    ~RecordingWindow();

    HWND Handle() const { return m_hWnd; }
    void Record(UINT message);
    int Count(UINT message) const;
    void Clear();
    // Polls until the window has received `message`; false after `timeoutMs`.
    bool WaitFor(UINT message, DWORD timeoutMs) const;
    // Whether a message in [first, last] waits in the queue for this window.
    bool HasQueued(UINT first, UINT last) const;

    RecordingWindow(const RecordingWindow&) = delete;
    RecordingWindow& operator=(const RecordingWindow&) = delete;

private:
    static const UINT kTracked = 0x500;
    HWND m_hWnd;
    std::atomic<int> m_aCount[kTracked];
};
} // namespace threadtests

using namespace ostrand;

// RecordingWindow --------------------------------------------------------------------------------------

namespace threadtests
{

namespace
{

const wchar_t kClassName[] = L"OstrandRecordingWindow";

LRESULT CALLBACK RecordingProc(HWND hwnd, UINT message, WPARAM wParam, LPARAM lParam)
{
    RecordingWindow* self = reinterpret_cast<RecordingWindow*>(::GetWindowLongPtrW(hwnd, GWLP_USERDATA));
    if (self != NULL)
        self->Record(message);
    if (message == WM_PAINT)
    {
        PAINTSTRUCT ps;
        ::BeginPaint(hwnd, &ps);
        ::EndPaint(hwnd, &ps);
        return 0;
    }
    return ::DefWindowProcW(hwnd, message, wParam, lParam);
}

} // namespace

RecordingWindow::RecordingWindow() : m_hWnd(NULL)
{
    Clear();
    WNDCLASSEXW wc = {};
    wc.cbSize = sizeof(wc);
    wc.lpfnWndProc = &RecordingProc;
    wc.hInstance = ::GetModuleHandleW(NULL);
    wc.lpszClassName = kClassName;
    ::RegisterClassExW(&wc); // fails harmlessly when a previous test registered it
    m_hWnd = ::CreateWindowExW(0, kClassName, L"recording", WS_POPUP, 10, 10, 200, 150, NULL, NULL,
                               wc.hInstance, NULL);
    if (m_hWnd == NULL)
        return;
    ::SetWindowLongPtrW(m_hWnd, GWLP_USERDATA, reinterpret_cast<LONG_PTR>(this));
    // Shown without activation: Wine then leaves the window unmanaged, and destroying it does not wait
    // two seconds for a window manager that Xvfb does not have.
    ::ShowWindow(m_hWnd, SW_SHOWNOACTIVATE);
    // Let the window settle: creation and the first paint are not what the tests look at.
    ::UpdateWindow(m_hWnd);
    const ULONGLONG end = ::GetTickCount64() + 200;
    while (::GetTickCount64() < end)
    {
        MSG msg;
        while (::PeekMessageW(&msg, NULL, 0, 0, PM_REMOVE))
        {
            ::TranslateMessage(&msg);
            ::DispatchMessageW(&msg);
        }
        ::Sleep(5);
    }
    Clear();
}

RecordingWindow::~RecordingWindow()
{
    if (m_hWnd != NULL)
        ::DestroyWindow(m_hWnd);
    MSG msg;
    while (::PeekMessageW(&msg, NULL, 0, 0, PM_REMOVE))
    {
    }
}

void RecordingWindow::Record(UINT message)
{
    if (message < kTracked)
        ++m_aCount[message];
}

int RecordingWindow::Count(UINT message) const
{
    return message < kTracked ? m_aCount[message].load() : 0;
}

void RecordingWindow::Clear()
{
    for (std::atomic<int>& c : m_aCount)
        c = 0;
}

bool RecordingWindow::WaitFor(UINT message, DWORD timeoutMs) const
{
    const ULONGLONG end = ::GetTickCount64() + timeoutMs;
    while (Count(message) == 0)
    {
        if (::GetTickCount64() >= end)
            return false;
        ::Sleep(1);
    }
    return true;
}

bool RecordingWindow::HasQueued(UINT first, UINT last) const
{
    MSG msg;
    return ::PeekMessageW(&msg, m_hWnd, first, last, PM_NOREMOVE) != FALSE;
}

} // namespace threadtests

using threadtests::RecordingWindow;

// TestMessage ------------------------------------------------------------------------------------------

namespace
{

struct Probe : CAPC
{
    explicit Probe(DWORD mask) : CAPC(mask) {}
    DWORD Run() override { return 0; }
};

} // namespace

// The edges of every row of the mask table.
TEST(CAPCTest, TestMessagePassesExactlyTheMessagesOfEachMaskBit)
{
    struct Case
    {
        DWORD mask;
        UINT message;
        bool passes;
    };
    const Case cases[] = {
        {QS_KEY, WM_KEYDOWN, true},
        {QS_KEY, WM_KEYUP, true},
        {QS_KEY, WM_CHAR, false},
        {QS_KEY, WM_SYSKEYDOWN, true},
        {QS_KEY, WM_SYSKEYUP, true},
        {QS_KEY, WM_SYSCHAR, false},
        {QS_MOUSEMOVE, WM_MOUSEMOVE, true},
        {QS_MOUSEMOVE, WM_LBUTTONDOWN, false},
        {QS_MOUSEBUTTON, 0x200, false},
        {QS_MOUSEBUTTON, 0x201, true},
        {QS_MOUSEBUTTON, 0x209, true},
        {QS_MOUSEBUTTON, 0x20A, false},
        {QS_TIMER, WM_TIMER, true},
        {QS_PAINT, WM_PAINT, true},
        {QS_PAINT, WM_TIMER, false},
        {QS_HOTKEY, WM_HOTKEY, true},
        {QS_POSTMESSAGE, 1023, false},
        {QS_POSTMESSAGE, WM_USER, true},
        {QS_POSTMESSAGE, 0x80000000u, true},
        {QS_POSTMESSAGE, 0xFFFFFFFFu, true},
        {QS_POSTMESSAGE, WM_COMMAND, false},
        {QS_SENDMESSAGE, WM_USER, false},
        {QS_ALLINPUT, WM_COMMAND, false},
        {QS_KEY | QS_PAINT, WM_KEYUP, true},
    };
    for (const Case& c : cases)
        EXPECT_EQ(c.passes, Probe(c.mask).TestMessage(c.message))
            << "mask 0x" << std::hex << c.mask << " message 0x" << c.message;
}

// Invoke and the window ---------------------------------------------------------------------------------

namespace
{

// Posts two application messages and a WM_COMMAND to the window and invalidates it, then waits (bounded)
// until the window has seen what the mask lets through.
class PostingCall : public CAPC
{
public:
    PostingCall(DWORD mask, const RecordingWindow& window, bool invalidateFirst)
        : CAPC(mask), m_Window(window), m_bInvalidateFirst(invalidateFirst), m_bSawAll(false)
    {
    }

    bool SawAll() const { return m_bSawAll; }

protected:
    DWORD Run() override
    {
        HWND hwnd = m_Window.Handle();
        if (m_bInvalidateFirst)
            ::InvalidateRect(hwnd, NULL, FALSE);
        ::PostMessageW(hwnd, WM_USER + 1, 0, 0);
        ::PostMessageW(hwnd, WM_COMMAND, 1, 0);
        ::PostMessageW(hwnd, WM_USER + 2, 0, 0);
        if (!m_bInvalidateFirst)
            ::InvalidateRect(hwnd, NULL, FALSE);
        bool saw = true;
        if (TestMessage(WM_PAINT))
            saw = m_Window.WaitFor(WM_PAINT, 5000) && saw;
        if (TestMessage(WM_USER))
            saw = m_Window.WaitFor(WM_USER + 2, 5000) && saw;
        m_bSawAll = saw;
        return 42;
    }

private:
    const RecordingWindow& m_Window;
    bool m_bInvalidateFirst;
    bool m_bSawAll;
};

} // namespace

TEST(CAPCTest, DefaultMaskDeliversOnlyThePaintAndDropsTheRest)
{
    RecordingWindow window;
    ASSERT_TRUE(window.Handle() != NULL);
    PostingCall call(QS_PAINT, window, false);
    EXPECT_EQ(42u, call.Invoke());
    EXPECT_TRUE(call.SawAll());
    EXPECT_GE(window.Count(WM_PAINT), 1);
    EXPECT_EQ(0, window.Count(WM_USER + 1));
    EXPECT_EQ(0, window.Count(WM_USER + 2));
    EXPECT_EQ(0, window.Count(WM_COMMAND));
    // Removed from the queue, not merely held back.
    EXPECT_FALSE(window.HasQueued(WM_USER, WM_USER + 2));
    EXPECT_FALSE(window.HasQueued(WM_COMMAND, WM_COMMAND));
}

TEST(CAPCTest, PostMessageMaskAlsoDeliversApplicationMessagesButNeverCommands)
{
    RecordingWindow window;
    ASSERT_TRUE(window.Handle() != NULL);
    PostingCall call(QS_PAINT | QS_POSTMESSAGE, window, false);
    EXPECT_EQ(42u, call.Invoke());
    EXPECT_TRUE(call.SawAll());
    EXPECT_GE(window.Count(WM_PAINT), 1);
    EXPECT_EQ(1, window.Count(WM_USER + 1));
    EXPECT_EQ(1, window.Count(WM_USER + 2));
    EXPECT_EQ(0, window.Count(WM_COMMAND));
    EXPECT_FALSE(window.HasQueued(WM_COMMAND, WM_COMMAND));
}

// WM_PAINT stays queued until the window is validated: a mask without QS_PAINT must neither spin on it
// nor swallow it.
TEST(CAPCTest, MaskWithoutPaintLeavesTheRepaintPendingAndReturns)
{
    RecordingWindow window;
    ASSERT_TRUE(window.Handle() != NULL);
    PostingCall call(QS_POSTMESSAGE, window, true);
    EXPECT_EQ(42u, call.Invoke());
    EXPECT_TRUE(call.SawAll());
    EXPECT_EQ(0, window.Count(WM_PAINT));
    EXPECT_EQ(0, window.Count(WM_COMMAND));
    EXPECT_TRUE(::GetUpdateRect(window.Handle(), NULL, FALSE));
}

TEST(CAPCTest, QuitRequestSurvivesTheCall)
{
    RecordingWindow window;
    ASSERT_TRUE(window.Handle() != NULL);
    for (DWORD mask : {DWORD(QS_PAINT), DWORD(QS_POSTMESSAGE)})
    {
        ::PostQuitMessage(9);
        PostingCall call(mask, window, false);
        EXPECT_EQ(42u, call.Invoke());
        MSG msg;
        ASSERT_TRUE(::PeekMessageW(&msg, NULL, WM_QUIT, WM_QUIT, PM_REMOVE)) << "mask 0x" << std::hex << mask;
        EXPECT_EQ(9u, msg.wParam);
    }
}

// Results and exceptions ------------------------------------------------------------------------------

namespace
{

// Runs a function on the worker and records the worker's thread.
template <class F> class FunctionCall : public CAPC
{
public:
    explicit FunctionCall(F f) : m_f(f), m_dwWorker(0) {}
    DWORD Worker() const { return m_dwWorker; }

protected:
    DWORD Run() override
    {
        m_dwWorker = ::GetCurrentThreadId();
        return m_f();
    }

private:
    F m_f;
    DWORD m_dwWorker;
};

template <class F> FunctionCall<F> MakeCall(F f)
{
    return FunctionCall<F>(f);
}

} // namespace

TEST(CAPCTest, InvokeReturnsRunsValueFromAnotherThread)
{
    // STILL_ACTIVE as a result must not confuse the wait for the worker's end.
    for (DWORD value : {DWORD(0), DWORD(42), DWORD(STILL_ACTIVE), DWORD(0xFFFFFFFF)})
    {
        auto call = MakeCall([value] { return value; });
        EXPECT_EQ(value, call.Invoke());
        EXPECT_NE(0u, call.Worker());
        EXPECT_NE(::GetCurrentThreadId(), call.Worker());
    }
}

TEST(CAPCTest, LibraryExceptionsArriveWithTheirTypeAndPayload)
{
    auto win =
        MakeCall([]() -> DWORD { throw CWinException(123, L"Worker", L"ReadFile", ERROR_HANDLE_EOF); });
    try
    {
        win.Invoke();
        ADD_FAILURE() << "Invoke returned";
    }
    catch (const CWinException& e)
    {
        EXPECT_EQ(static_cast<DWORD>(ERROR_HANDLE_EOF), e.GetErrorCode());
        EXPECT_EQ(ustring(L"ReadFile"), e.GetFunction());
        EXPECT_EQ(ustring(L"Worker"), e.GetFileName());
        EXPECT_EQ(123u, e.GetLine());
    }

    auto comm =
        MakeCall([]() -> DWORD { throw CCommException(7, L"Port", L"Query", L"{2,,wrong command}"); });
    try
    {
        comm.Invoke();
        ADD_FAILURE() << "Invoke returned";
    }
    catch (const CCommException& e)
    {
        EXPECT_EQ(ustring(L"{2,,wrong command}"), e.GetErrorCodeStr());
        EXPECT_EQ(ustring(L"Query"), e.GetFunction());
    }
}

// Other exceptions keep their type too, and the object is usable again afterwards.
TEST(CAPCTest, ForeignExceptionsArriveUnchanged)
{
    int calls = 0;
    auto call = MakeCall(
        [&calls]() -> DWORD
        {
            switch (++calls)
            {
            case 1:
                throw std::runtime_error("device gone");
            case 2:
                throw 17;
            default:
                return 5;
            }
        });
    try
    {
        call.Invoke();
        ADD_FAILURE() << "Invoke returned";
    }
    catch (const std::runtime_error& e)
    {
        EXPECT_STREQ("device gone", e.what());
    }
    try
    {
        call.Invoke();
        ADD_FAILURE() << "Invoke returned";
    }
    catch (int value)
    {
        EXPECT_EQ(17, value);
    }
    EXPECT_EQ(5u, call.Invoke());
}
