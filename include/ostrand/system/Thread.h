// The owning wrapper of a thread handle.
//
// Classes in this file: CThread.
//
// Ownership: a CThread owns the thread handle, not the thread. Closing the handle (Close, the destructor,
// a second Create) lets the thread run on; only Terminate stops it, and the handle stays owned after
// that so the exit code can still be read. The identifier is 0 whenever no running thread is known
// to the object: before Create, after Close or Terminate, and after Attach of a foreign handle.
//
// Failures: every failed system call throws CWinException with the call's name ("CreateThread",
// "SuspendThread", ...) and the file "Thread".
//
// Threads: no locking of its own; one object is used by one thread at a time.
#pragma once

#include <ostrand/platform.h>
#include <ostrand/system/Object.h>

namespace ostrand
{

class OSTRAND_API CThread : public CHandle
{
public:
    CThread();

    // Default security, stack size and flags.
    void Create(LPTHREAD_START_ROUTINE routine, void* parameter);
    // Closes a previously owned handle first (which may throw "CloseHandle"), then creates the thread.
    void Create(SECURITY_ATTRIBUTES* sa, unsigned __int64 stackSize, LPTHREAD_START_ROUTINE routine,
                void* parameter, DWORD flags);
    void Close() override;

    DWORD GetId() const { return m_dwThreadId; }
    // STILL_ACTIVE (259) while the thread runs.
    DWORD GetExitCode() const;
    int GetPriority() const;
    void SetThreadPriority(int priority);
    // Both return the suspend count from before the call.
    DWORD Suspend();
    DWORD Resume();
    // Forgets the identifier even when TerminateThread fails; the handle stays owned.
    void Terminate(DWORD exitCode);

private:
    DWORD m_dwThreadId;
};

} // namespace ostrand
