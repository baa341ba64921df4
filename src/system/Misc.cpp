#include <ostrand/system/Misc.h>

#include "internal/throw.h"

namespace ostrand
{

void Sleep(DWORD milliseconds, CEvent& cancel)
{
    const DWORD r = ::WaitForSingleObject(cancel.GetHandle(), milliseconds);
    if (r == WAIT_TIMEOUT)
        return;
    if (r == WAIT_OBJECT_0)
        OSTRAND_THROW_WIN(L"ostrand::Sleep", ERROR_CANCELLED);
    if (r == WAIT_FAILED)
        OSTRAND_THROW_LAST_ERROR(L"ostrand::Sleep");
    OSTRAND_THROW_WIN(L"WaitForSingleObject", ERROR_INTERNAL_ERROR);
}

namespace
{

// Removes every queued message of the thread and dispatches only the repaints. A WM_QUIT is kept and
// posted again when the wait is left, however it is left.
class PaintPump
{
public:
    PaintPump() : m_bQuit(false), m_nExitCode(0) {}
    ~PaintPump()
    {
        if (m_bQuit)
            ::PostQuitMessage(m_nExitCode);
    }

    void Drain()
    {
        MSG msg;
        while (::PeekMessageW(&msg, NULL, 0, 0, PM_REMOVE))
        {
            if (msg.message == WM_PAINT)
            {
                ::TranslateMessage(&msg);
                ::DispatchMessageW(&msg);
            }
            else if (msg.message == WM_QUIT)
            {
                m_bQuit = true;
                m_nExitCode = static_cast<int>(msg.wParam);
            }
        }
    }

    PaintPump(const PaintPump&) = delete;
    PaintPump& operator=(const PaintPump&) = delete;

private:
    bool m_bQuit;
    int m_nExitCode;
};

} // namespace

void MsgSleep(DWORD milliseconds, CEvent& cancel)
{
    const DWORD start = ::GetTickCount();
    HANDLE handle = cancel.GetHandle();
    PaintPump pump;
    for (;;)
    {
        DWORD timeout = INFINITE;
        if (milliseconds != INFINITE)
        {
            // Unsigned arithmetic: a wrap of the tick counter does no harm.
            const DWORD elapsed = ::GetTickCount() - start;
            if (elapsed >= milliseconds)
                return;
            timeout = milliseconds - elapsed;
        }
        const DWORD r = ::MsgWaitForMultipleObjects(1, &handle, FALSE, timeout, QS_ALLEVENTS);
        if (r == WAIT_OBJECT_0)
            OSTRAND_THROW_WIN(L"ostrand::MsgSleep", ERROR_CANCELLED);
        if (r == WAIT_OBJECT_0 + 1)
        {
            pump.Drain();
            continue;
        }
        if (r == WAIT_TIMEOUT)
            return;
        if (r == WAIT_FAILED)
            OSTRAND_THROW_LAST_ERROR(L"WaitForMultipleObjects");
        OSTRAND_THROW_WIN(L"WaitForMultipleObjects", ERROR_INTERNAL_ERROR);
    }
}

void MsgSleep(DWORD milliseconds)
{
    CEvent never;
    MsgSleep(milliseconds, never);
}

} // namespace ostrand
