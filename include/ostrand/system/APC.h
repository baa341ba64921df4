// An asynchronous call: work that runs on a worker thread while the calling thread keeps a window alive.
//
// Classes in this file: CAPC.
//
// Derive, supply Run, call Invoke on a thread that owns windows. Invoke starts a new thread that calls
// Run, and until that thread ends it pumps the calling thread's queue: it wakes for the queue-status
// kinds (QS_ values) in the mask and dispatches the messages that TestMessage passes; every other
// queued message is removed and dropped, so the user cannot act on the window meanwhile. Two
// exceptions to the dropping: a WM_QUIT is posted again after Invoke, so a request to quit is not lost,
// and with a mask without QS_PAINT a pending repaint is left queued for the application's own loop
// (the system keeps WM_PAINT queued until the window is validated, so removing it is not possible).
//
// Failures: a failed wait throws CWinException with "MsgWaitForMultipleObjects" and the file "APC";
// a failed start of the worker throws "CreateThread" (file "Thread"). An exception that leaves Run is
// caught on the worker, kept in the object and raised again from Invoke on the calling thread with its
// own type: a CStdException through Clone and Throw, anything else through std::exception_ptr. No
// exception is lost and none ends the process.
//
// Threads: the object is shared by the caller and the worker while Invoke runs. Invoke returns, or
// throws, only after the worker has ended, so Run never outlives the object. One Invoke at a time.
#pragma once

#include <ostrand/platform.h>
#include <ostrand/errors/Exception.h>

#include <exception>

namespace ostrand
{

class OSTRAND_API CAPC
{
public:
    // The default 32 is QS_PAINT: the window repaints, nothing else reaches it.
    explicit CAPC(DWORD mask = QS_PAINT);

    // Runs Run on a new thread, pumps messages until it ends and returns Run's result.
    virtual DWORD Invoke();
    bool TestMessage(UINT message) const;

    // The worker's routine: calls Run of the CAPC passed as `object` and returns its result. An exception
    // from Run is kept in the object for Invoke; the thread then ends with ERROR_UNHANDLED_EXCEPTION (574).
    static DWORD WINAPI ThreadProc(void* object);

protected:
    // Runs on the worker thread; the result is the thread's exit code.
    virtual DWORD Run() = 0;

    // Not virtual: a CAPC is not deleted through a base pointer, and the protected destructor says so.
    ~CAPC() {}

private:
    // Raises what Run threw, if anything, and forgets it.
    void RethrowWorkerException();

    DWORD m_dwMask;
    boost::shared_ptr<const CStdException> m_pException;
    std::exception_ptr m_pForeignException;
};

} // namespace ostrand
