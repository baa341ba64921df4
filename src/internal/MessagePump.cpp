#include "internal/MessagePump.h"

namespace ostrand
{
namespace detail
{

namespace
{

// Which messages each queue-status bit lets through. A row covers the inclusive range [first, last].
struct MaskRow
{
    DWORD flag;
    UINT first;
    UINT last;
};

const MaskRow g_aMaskRows[] = {
    {QS_KEY, WM_KEYDOWN, WM_KEYUP},             // 0x100, 0x101
    {QS_KEY, WM_SYSKEYDOWN, WM_SYSKEYUP},       // 0x104, 0x105
    {QS_MOUSEMOVE, WM_MOUSEMOVE, WM_MOUSEMOVE}, // 0x200
    {QS_MOUSEBUTTON, 0x201, 0x209},             // the button messages
    {QS_TIMER, WM_TIMER, WM_TIMER},
    {QS_PAINT, WM_PAINT, WM_PAINT},
    {QS_HOTKEY, WM_HOTKEY, WM_HOTKEY},
    // Application messages from WM_USER on, and every value negative as a signed 32-bit number.
    {QS_POSTMESSAGE, WM_USER, 0xFFFFFFFFu},
};

} // namespace

bool MaskPasses(DWORD mask, UINT message)
{
    for (const MaskRow& row : g_aMaskRows)
        if ((mask & row.flag) != 0 && message >= row.first && message <= row.last)
            return true;
    return false;
}

MessagePump::MessagePump(DWORD mask) : m_dwMask(mask), m_bQuit(false), m_nExitCode(0) {}

MessagePump::~MessagePump()
{
    if (m_bQuit)
        ::PostQuitMessage(m_nExitCode);
}

void MessagePump::Drain()
{
    const UINT flags = (m_dwMask & QS_PAINT) != 0
                           ? PM_REMOVE
                           : PM_REMOVE | PM_QS_INPUT | PM_QS_POSTMESSAGE | PM_QS_SENDMESSAGE;
    MSG msg;
    while (::PeekMessageW(&msg, NULL, 0, 0, flags))
    {
        if (MaskPasses(m_dwMask, msg.message))
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

} // namespace detail
} // namespace ostrand
