// Waits that another thread can cut short by setting an event.
//
// Functions in this file: Sleep, MsgSleep.
//
// A wait cut short by its event throws CWinException with ERROR_CANCELLED (1223) and the name
// "ostrand::Sleep" or "ostrand::MsgSleep", file "Misc"; the time running out is the normal return.
// An auto-reset event's signal is consumed by the cancellation.
//
// MsgSleep keeps the calling thread's windows painted: it wakes for every kind of queued input, posted
// message, timer, paint and hot key, dispatches WM_PAINT and drops everything else, so keyboard and
// mouse input during the wait is lost. A WM_QUIT is the one exception: it is posted again when
// MsgSleep returns or throws, so a request to quit survives the wait. MsgSleep(0, ...) returns at once
// without looking at the event or the queue. With INFINITE as the time, MsgSleep pumps and waits until
// the event is set; there is no elapsed-time test, so MsgSleep(INFINITE) without an event never returns.
#pragma once

#include <ostrand/platform.h>
#include <ostrand/system/Object.h>

namespace ostrand
{

// Waits on `cancel` for at most `milliseconds`. A failed wait throws with the system's code and
// "ostrand::Sleep".
OSTRAND_API void Sleep(DWORD milliseconds, CEvent& cancel);

// The same wait, pumping paint messages meanwhile. A failed wait throws "WaitForMultipleObjects".
OSTRAND_API void MsgSleep(DWORD milliseconds, CEvent& cancel);

// A pure sleep that keeps the windows painted: MsgSleep with a private event that nobody can set.
OSTRAND_API void MsgSleep(DWORD milliseconds);

} // namespace ostrand
