#include "window_recorder.h"

#include <ostrand/system/APC.h>

#include <stdexcept>
#include <tuple>

using namespace ostrand;

namespace
{

// Runs `f` on the worker and records the worker's thread.
template <class F> struct Call : CAPC
{
    explicit Call(F f, DWORD mask = QS_PAINT) : CAPC(mask), m_f(f) {}
    DWORD Run() override { return worker = ::GetCurrentThreadId(), m_f(); }
    F m_f;
    DWORD worker = 0;
};

} // namespace

TEST(CAPCTest, TestMessageFollowsTheEdgesOfEachMaskBit)
{
    const std::tuple<DWORD, UINT, bool> cases[] = {
        {QS_KEY, WM_SYSKEYUP, true},   {QS_KEY, WM_CHAR, false},
        {QS_MOUSEBUTTON, 0x209, true}, {QS_MOUSEBUTTON, 0x20A, false},
        {QS_PAINT, WM_PAINT, true},    {QS_PAINT, WM_TIMER, false},
        {QS_POSTMESSAGE, ~0u, true},   {QS_POSTMESSAGE, WM_USER - 1, false}};
    for (const auto& [mask, message, passes] : cases)
        EXPECT_EQ(passes, Call([] { return 0u; }, mask).TestMessage(message)) << mask << " " << message;
}

// The worker posts WM_USER messages and a WM_COMMAND and repaints, with a WM_QUIT already queued.
TEST(CAPCTest, TheMaskDecidesWhatReachesTheWindowAndTheQuitIsKept)
{
    const std::tuple<DWORD, bool, bool> cases[] = {
        {QS_PAINT, true, false}, {QS_PAINT | QS_POSTMESSAGE, true, true}, {QS_POSTMESSAGE, false, true}};
    for (const auto& [mask, paint, user] : cases)
    {
        SCOPED_TRACE(mask);
        threadtests::RecordingWindow window;
        const HWND hwnd = window.Handle();
        ::PostQuitMessage(9);
        Call call(
            [&, paint = paint, user = user]() -> DWORD
            {
                // A repaint not passed is pending before the posts: the pump must neither spin on it nor drop
                // it.
                if (!paint)
                    ::InvalidateRect(hwnd, NULL, FALSE);
                for (UINT m : {UINT(WM_USER + 1), UINT(WM_COMMAND), UINT(WM_USER + 2)})
                    ::PostMessageW(hwnd, m, 0, 0);
                if (paint)
                    ::InvalidateRect(hwnd, NULL, FALSE);
                return (!paint || window.WaitFor(WM_PAINT, 5000)) &&
                       (!user || window.WaitFor(WM_USER + 2, 5000));
            },
            mask);
        EXPECT_EQ(1u, call.Invoke());
        EXPECT_EQ(paint, window.Count(WM_PAINT) > 0);
        EXPECT_EQ(paint, ::GetUpdateRect(hwnd, NULL, FALSE) == FALSE);
        EXPECT_EQ(user ? 2 : 0, window.Count(WM_USER + 1) + window.Count(WM_USER + 2));
        EXPECT_EQ(0, window.Count(WM_COMMAND));
        MSG msg; // the WM_QUIT first: a peek with any filter returns it
        ASSERT_TRUE(::PeekMessageW(&msg, NULL, WM_QUIT, WM_QUIT, PM_REMOVE));
        EXPECT_EQ(9u, msg.wParam);
        EXPECT_FALSE(window.HasQueued(WM_COMMAND, WM_USER + 2)); // dropped means removed, not held back
    }
}

// What Run throws leaves Invoke with its own type and payload; then Run's value, even STILL_ACTIVE.
TEST(CAPCTest, InvokeGivesRunsExceptionOrValue)
{
    int calls = 0;
    Call call(
        [&calls]() -> DWORD
        {
            if (++calls == 1)
                throw CWinException(123, L"Worker", L"ReadFile", ERROR_HANDLE_EOF);
            if (calls == 2)
                throw std::runtime_error("device gone");
            return STILL_ACTIVE;
        });
    try
    {
        call.Invoke();
        ADD_FAILURE() << "Invoke returned";
    }
    catch (const CWinException& e)
    {
        EXPECT_EQ(static_cast<DWORD>(ERROR_HANDLE_EOF), e.GetErrorCode());
        EXPECT_EQ(ustring(L"ReadFile"), e.GetFunction());
        EXPECT_EQ(ustring(L"Worker"), e.GetFileName());
        EXPECT_EQ(123u, e.GetLine());
    }
    EXPECT_THROW(call.Invoke(), std::runtime_error);
    EXPECT_EQ(static_cast<DWORD>(STILL_ACTIVE), call.Invoke());
    EXPECT_NE(::GetCurrentThreadId(), call.worker);
}
