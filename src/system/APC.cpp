#include <ostrand/system/APC.h>
#include <ostrand/system/Thread.h>

#include "internal/MessagePump.h"
#include "internal/throw.h"

namespace ostrand
{

namespace
{

// ERROR_UNHANDLED_EXCEPTION, which the MinGW headers lack: the worker's exit code when Run threw.
const DWORD kRunThrew = 574;

} // namespace

CAPC::CAPC(DWORD mask) : m_dwMask(mask) {}

bool CAPC::TestMessage(UINT message) const
{
    return detail::MaskPasses(m_dwMask, message);
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

    try
    {
        detail::MessagePump pump(m_dwMask);
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
                pump.Drain();
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
