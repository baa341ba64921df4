// The message pump shared by CAPC::Invoke and MsgSleep.
#pragma once

#include <ostrand/platform.h>

namespace ostrand
{
namespace detail
{
// Whether a queue-status kind (QS_ value) in `mask` covers `message`: QS_PAINT lets WM_PAINT through,
// QS_POSTMESSAGE every message from WM_USER on, and so on; WM_COMMAND is covered by none.
bool MaskPasses(DWORD mask, UINT message);

// Removes the thread's queued messages, dispatches those MaskPasses lets through for its mask and drops
// the rest. A removed WM_QUIT is kept and posted again when the pump is destroyed, however the caller
// leaves. Without QS_PAINT in the mask repaints are left queued: the system keeps WM_PAINT queued until
// the window is validated, so removing it without dispatching would never end.
class MessagePump
{
public:
    explicit MessagePump(DWORD mask);
    ~MessagePump();

    // Empties the queue as described above.
    void Drain();

    MessagePump(const MessagePump&) = delete;
    MessagePump& operator=(const MessagePump&) = delete;

private:
    DWORD m_dwMask;
    bool m_bQuit;
    int m_nExitCode;
};
} // namespace detail
} // namespace ostrand
