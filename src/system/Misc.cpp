#include <ostrand/system/Misc.h>

#include "internal/MessagePump.h"
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

void MsgSleep(DWORD milliseconds, CEvent& cancel)
{
    const DWORD start = ::GetTickCount();
    HANDLE handle = cancel.GetHandle();
    // Repaints are dispatched, everything else is dropped.
    detail::MessagePump pump(QS_PAINT);
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
