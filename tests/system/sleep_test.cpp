#include <ostrand/system/Misc.h>
#include <ostrand/system/Thread.h>
#include <ostrand/errors/Exception.h>

#include <gtest/gtest.h>

#include <atomic>
#include <functional>

using namespace ostrand;

// The window of apc_test.cpp and the exception check of thread_test.cpp, defined there.
namespace threadtests
{
void ExpectWinError(const std::function<void()>& f, const wchar_t* call, DWORD code, const wchar_t* file);

class RecordingWindow
{
public:
    RecordingWindow();
    ~RecordingWindow();

    HWND Handle() const { return m_hWnd; }
    void Record(UINT message);
    int Count(UINT message) const;
    void Clear();
    bool WaitFor(UINT message, DWORD timeoutMs) const;
    bool HasQueued(UINT first, UINT last) const;

    RecordingWindow(const RecordingWindow&) = delete;
    RecordingWindow& operator=(const RecordingWindow&) = delete;

private:
    static const UINT kTracked = 0x500;
    HWND m_hWnd;
    std::atomic<int> m_aCount[kTracked];
};
} // namespace threadtests

using threadtests::ExpectWinError;
using threadtests::RecordingWindow;

namespace
{

// Sets the event passed as parameter after 50 ms.
DWORD WINAPI SetSoon(void* event)
{
    ::Sleep(50);
    ::SetEvent(static_cast<HANDLE>(event));
    return 0;
}

// Starts SetSoon and joins it on leaving, so no thread outlives the event.
class Canceller
{
public:
    explicit Canceller(CEvent& event) { m_Thread.Create(&SetSoon, event.GetHandle()); }
    ~Canceller() { ::WaitForSingleObject(m_Thread.GetHandle(), 10000); }

private:
    CThread m_Thread;
};

} // namespace

TEST(SleepTest, ZeroTimeAndTimeRunningOut)
{
    CEvent cancel;
    ostrand::Sleep(0, cancel);
    const ULONGLONG start = ::GetTickCount64();
    ostrand::Sleep(60, cancel);
    // One tick of the coarse counter below the requested time.
    EXPECT_GE(::GetTickCount64() - start, 44u);

    cancel.Set();
    ExpectWinError([&] { ostrand::Sleep(0, cancel); }, L"ostrand::Sleep", ERROR_CANCELLED, L"Misc");
    // The auto-reset event's signal was consumed by the cancellation.
    EXPECT_EQ(static_cast<DWORD>(WAIT_TIMEOUT), ::WaitForSingleObject(cancel.GetHandle(), 0));
}

TEST(SleepTest, AnotherThreadCancelsEitherWait)
{
    CEvent cancel;
    {
        Canceller canceller(cancel);
        ExpectWinError([&] { ostrand::Sleep(10000, cancel); }, L"ostrand::Sleep", ERROR_CANCELLED, L"Misc");
    }
    for (DWORD time : {DWORD(10000), DWORD(INFINITE)})
    {
        Canceller canceller(cancel);
        ExpectWinError([&] { MsgSleep(time, cancel); }, L"ostrand::MsgSleep", ERROR_CANCELLED, L"Misc");
    }
}

// A closed event leaves a null handle: the waits fail with the system's code.
TEST(SleepTest, WaitOnAClosedEventFails)
{
    CEvent closed;
    closed.Close();
    ExpectWinError([&] { ostrand::Sleep(10, closed); }, L"ostrand::Sleep", ERROR_INVALID_HANDLE, L"Misc");
    ExpectWinError([&] { MsgSleep(10, closed); }, L"WaitForMultipleObjects", ERROR_INVALID_HANDLE, L"Misc");
}

// Zero time returns before the wait: neither the set event nor the queue is looked at.
TEST(MsgSleepTest, ZeroTimeReturnsAtOnce)
{
    RecordingWindow window;
    ASSERT_TRUE(window.Handle() != NULL);
    ::PostMessageW(window.Handle(), WM_KEYDOWN, 'A', 0);
    CEvent cancel(NULL, TRUE, TRUE);
    MsgSleep(0, cancel);
    MsgSleep(0);
    EXPECT_TRUE(window.HasQueued(WM_KEYDOWN, WM_KEYDOWN));
}

TEST(MsgSleepTest, DropsKeysAndDeliversTheRepaint)
{
    RecordingWindow window;
    ASSERT_TRUE(window.Handle() != NULL);
    ::PostMessageW(window.Handle(), WM_KEYDOWN, 'A', 0);
    ::PostMessageW(window.Handle(), WM_USER + 1, 0, 0);
    ::InvalidateRect(window.Handle(), NULL, FALSE);
    MsgSleep(300);
    EXPECT_GE(window.Count(WM_PAINT), 1);
    EXPECT_EQ(0, window.Count(WM_KEYDOWN));
    EXPECT_EQ(0, window.Count(WM_USER + 1));
    EXPECT_FALSE(window.HasQueued(WM_KEYDOWN, WM_KEYDOWN));
    EXPECT_FALSE(window.HasQueued(WM_USER + 1, WM_USER + 1));
    EXPECT_FALSE(::GetUpdateRect(window.Handle(), NULL, FALSE));
}

namespace
{

struct PaintThenCancel
{
    const RecordingWindow* window;
    HANDLE cancel;
    bool painted;
};

// During an unlimited MsgSleep: posts a key, repaints, and cancels once the repaint has arrived.
DWORD WINAPI RepaintAndCancel(void* p)
{
    PaintThenCancel* job = static_cast<PaintThenCancel*>(p);
    ::PostMessageW(job->window->Handle(), WM_KEYDOWN, 'B', 0);
    ::InvalidateRect(job->window->Handle(), NULL, FALSE);
    job->painted = job->window->WaitFor(WM_PAINT, 5000);
    ::SetEvent(job->cancel);
    return 0;
}

} // namespace

TEST(MsgSleepTest, UnlimitedWaitKeepsPaintingUntilCancelled)
{
    RecordingWindow window;
    ASSERT_TRUE(window.Handle() != NULL);
    CEvent cancel;
    PaintThenCancel job = {&window, cancel.GetHandle(), false};
    CThread helper;
    helper.Create(&RepaintAndCancel, &job);
    ExpectWinError([&] { MsgSleep(INFINITE, cancel); }, L"ostrand::MsgSleep", ERROR_CANCELLED, L"Misc");
    ASSERT_EQ(WAIT_OBJECT_0, ::WaitForSingleObject(helper.GetHandle(), 10000));
    EXPECT_TRUE(job.painted);
    EXPECT_EQ(0, window.Count(WM_KEYDOWN));
}

TEST(MsgSleepTest, QuitRequestSurvivesTheWait)
{
    ::PostQuitMessage(4);
    MsgSleep(50);
    MSG msg;
    ASSERT_TRUE(::PeekMessageW(&msg, NULL, WM_QUIT, WM_QUIT, PM_REMOVE));
    EXPECT_EQ(4u, msg.wParam);
}
