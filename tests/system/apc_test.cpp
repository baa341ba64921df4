#include "window_recorder.h"

using namespace ostrand;

namespace
{
template <class F> struct Call : CAPC
{
    explicit Call(F f, DWORD mask = QS_PAINT) : CAPC(mask), m_f(f) {}
    DWORD Run() override { return worker = ::GetCurrentThreadId(), m_f(); }
    F m_f;
    DWORD worker = 0;
};
} // namespace

// The worker posts WM_USER messages and a WM_COMMAND and repaints, with a WM_QUIT already queued.
TEST(CAPCTest, TheMaskDecidesWhatReachesTheWindowAndTheQuitIsKept)
{
    const std::tuple<DWORD, bool, bool> cases[] = {
        {QS_PAINT, true, false}, {QS_PAINT | QS_POSTMESSAGE, true, true}, {QS_POSTMESSAGE, false, true}};
    for (const auto& [mask, paint, user] : cases)
    {
        SCOPED_TRACE(mask);
        threadtests::RecordingWindow window;
        ::PostQuitMessage(9);
        Call call(
            [&, paint = paint, user = user]() -> DWORD
            {
                // Pending all along, a repaint not passed must neither make the pump spin nor be dropped.
                ::InvalidateRect(window.hwnd, NULL, FALSE);
                for (UINT m : {UINT(WM_USER + 1), UINT(WM_COMMAND), UINT(WM_USER + 2)})
                    ::PostMessageW(window.hwnd, m, 0, 0);
                return (!paint || window.WaitFor(WM_PAINT)) && (!user || window.WaitFor(WM_USER + 2));
            },
            mask);
        EXPECT_EQ(1u, call.Invoke());
        EXPECT_EQ(user ? 2 : 0, window.count[WM_USER + 1] + window.count[WM_USER + 2]);
        EXPECT_EQ(0, window.count[WM_COMMAND]);
        window.ExpectPaintedQuitKeptAndDropped(paint, 9, WM_COMMAND, WM_USER + 2);
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
    EXPECT_EQ(L"ReadFile 38 Worker", threadtests::Thrown([&] { call.Invoke(); }));
    EXPECT_EQ(L"runtime_error device gone", threadtests::Thrown([&] { call.Invoke(); }));
    EXPECT_EQ(static_cast<DWORD>(STILL_ACTIVE), call.Invoke());
    EXPECT_NE(::GetCurrentThreadId(), call.worker);
}
