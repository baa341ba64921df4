#include <ostrand/system/APC.h>
#include <ostrand/system/Thread.h>

#include "internal/throw.h"

namespace ostrand
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

// Keeps a WM_QUIT that the pump removed and posts it again when the pump is left, however it is left.
class QuitKeeper
{
public:
    QuitKeeper() : m_bSeen(false), m_nExitCode(0) {}
    ~QuitKeeper()
    {
        if (m_bSeen)
            ::PostQuitMessage(m_nExitCode);
    }
    void Keep(const MSG& msg)
    {
        m_bSeen = true;
        m_nExitCode = static_cast<int>(msg.wParam);
    }

    QuitKeeper(const QuitKeeper&) = delete;
    QuitKeeper& operator=(const QuitKeeper&) = delete;

private:
    bool m_bSeen;
    int m_nExitCode;
};

// ERROR_UNHANDLED_EXCEPTION, which the MinGW headers lack: the worker's exit code when Run threw.
const DWORD kRunThrew = 574;

} // namespace

CAPC::CAPC(DWORD mask) : m_dwMask(mask) {}

bool CAPC::TestMessage(UINT message) const
{
    for (const MaskRow& row : g_aMaskRows)
        if ((m_dwMask & row.flag) != 0 && message >= row.first && message <= row.last)
            return true;
    return false;
}

DWORD CAPC::ThreadProc(void* object)
{
    CAPC* apc = static_cast<CAPC*>(object);
    try
    {
        return apc->Run();
    }
    catch (const CStdException& e)
    {
        try
        {
            apc->m_pException = e.Clone();
        }
        catch (...)
        {
            // The copy failed (out of memory): carry that failure instead.
            apc->m_pForeignException = std::current_exception();
        }
    }
    catch (...)
    {
        apc->m_pForeignException = std::current_exception();
    }
    return kRunThrew;
}

DWORD CAPC::Invoke()
{
    m_pException.reset();
    m_pForeignException = nullptr;

    CThread worker;
    worker.Create(&CAPC::ThreadProc, this);
    HANDLE thread = worker.GetHandle();

    // WM_PAINT stays queued until the window is validated, so when paint is not dispatched the peek
    // must not see it, or the removal loop below would never end.
    const UINT peekFlags = (m_dwMask & QS_PAINT) != 0
                               ? PM_REMOVE
                               : PM_REMOVE | PM_QS_INPUT | PM_QS_POSTMESSAGE | PM_QS_SENDMESSAGE;
    try
    {
        QuitKeeper quit;
        for (;;)
        {
            const DWORD r = ::MsgWaitForMultipleObjects(1, &thread, FALSE, INFINITE, m_dwMask);
            if (r == WAIT_OBJECT_0)
                break;
            if (r == WAIT_OBJECT_0 + 1)
            {
                DWORD code = 0;
                if (::GetExitCodeThread(thread, &code) && code != STILL_ACTIVE)
                    break;
                MSG msg;
                while (::PeekMessageW(&msg, NULL, 0, 0, peekFlags))
                {
                    if (TestMessage(msg.message))
                    {
                        ::TranslateMessage(&msg);
                        ::DispatchMessageW(&msg);
                    }
                    else if (msg.message == WM_QUIT)
                        quit.Keep(msg);
                }
                continue;
            }
            if (r == WAIT_FAILED)
                OSTRAND_THROW_LAST_ERROR(L"MsgWaitForMultipleObjects");
            OSTRAND_THROW_WIN(L"MsgWaitForMultipleObjects", ERROR_INTERNAL_ERROR);
        }
    }
    catch (...)
    {
        // Run uses this object: let it finish before the caller can destroy it.
        ::WaitForSingleObject(thread, INFINITE);
        throw;
    }

    RethrowWorkerException();
    return worker.GetExitCode();
}

void CAPC::RethrowWorkerException()
{
    if (m_pException)
    {
        const boost::shared_ptr<const CStdException> kept = m_pException;
        m_pException.reset();
        kept->Throw();
    }
    if (m_pForeignException)
    {
        std::exception_ptr kept = m_pForeignException;
        m_pForeignException = nullptr;
        std::rethrow_exception(kept);
    }
}

} // namespace ostrand
