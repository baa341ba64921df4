#include <ostrand/system/Thread.h>

#include "internal/throw.h"

namespace ostrand
{

CThread::CThread() : CHandle(NULL), m_dwThreadId(0) {}

void CThread::Create(LPTHREAD_START_ROUTINE routine, void* parameter)
{
    Create(NULL, 0, routine, parameter, 0);
}

void CThread::Create(SECURITY_ATTRIBUTES* sa, unsigned __int64 stackSize, LPTHREAD_START_ROUTINE routine,
                     void* parameter, DWORD flags)
{
    Close();
    DWORD id = 0;
    HANDLE h = ::CreateThread(sa, static_cast<SIZE_T>(stackSize), routine, parameter, flags, &id);
    if (h == NULL)
        OSTRAND_THROW_LAST_ERROR(L"CreateThread");
    SetHandle(h);
    m_dwThreadId = id;
}

void CThread::Close()
{
    m_dwThreadId = 0;
    CHandle::Close();
}

DWORD CThread::GetExitCode() const
{
    DWORD code = 0;
    OSTRAND_CHECK_BOOL(::GetExitCodeThread(GetHandle(), &code), L"GetExitCodeThread");
    return code;
}

int CThread::GetPriority() const
{
    const int priority = ::GetThreadPriority(GetHandle());
    if (priority == THREAD_PRIORITY_ERROR_RETURN)
        OSTRAND_THROW_LAST_ERROR(L"GetThreadPriority");
    return priority;
}

void CThread::SetThreadPriority(int priority)
{
    OSTRAND_CHECK_BOOL(::SetThreadPriority(GetHandle(), priority), L"SetThreadPriority");
}

DWORD CThread::Suspend()
{
    const DWORD previous = ::SuspendThread(GetHandle());
    if (previous == static_cast<DWORD>(-1))
        OSTRAND_THROW_LAST_ERROR(L"SuspendThread");
    return previous;
}

DWORD CThread::Resume()
{
    const DWORD previous = ::ResumeThread(GetHandle());
    if (previous == static_cast<DWORD>(-1))
        OSTRAND_THROW_LAST_ERROR(L"ResumeThread");
    return previous;
}

void CThread::Terminate(DWORD exitCode)
{
    m_dwThreadId = 0;
    OSTRAND_CHECK_BOOL(::TerminateThread(GetHandle(), exitCode), L"TerminateThread");
}

} // namespace ostrand
