#include <ostrand/system/Object.h>

#include "internal/throw.h"

namespace ostrand
{

// CHandle ----------------------------------------------------------------------------------------------

CHandle::CHandle(HANDLE empty) : m_hEmpty(empty), m_hHandle(empty) {}

CHandle::~CHandle()
{
    // A destructor cannot report a failed close; the handle is gone either way.
    if (m_hHandle != m_hEmpty)
        ::CloseHandle(m_hHandle);
}

void CHandle::Close()
{
    if (m_hHandle == m_hEmpty)
        return;
    const BOOL closed = ::CloseHandle(m_hHandle);
    const DWORD error = ::GetLastError();
    m_hHandle = m_hEmpty;
    if (!closed)
        OSTRAND_THROW_WIN(L"CloseHandle", error);
}

bool CHandle::Attach(HANDLE h)
{
    if (m_hHandle != m_hEmpty)
        return false;
    m_hHandle = h;
    return true;
}

HANDLE CHandle::Detach()
{
    HANDLE h = m_hHandle;
    m_hHandle = m_hEmpty;
    return h;
}

// CEvent -----------------------------------------------------------------------------------------------

CEvent::CEvent(SECURITY_ATTRIBUTES* sa, BOOL manualReset, BOOL initialState, const wchar_t* name)
    : CHandle(NULL)
{
    HANDLE h = ::CreateEventW(sa, manualReset, initialState, name);
    if (h == NULL)
        OSTRAND_THROW_LAST_ERROR(L"CreateEventW");
    SetHandle(h);
}

CEvent::CEvent(DWORD desiredAccess, BOOL inheritHandle, const wchar_t* name) : CHandle(NULL)
{
    HANDLE h = ::OpenEventW(desiredAccess, inheritHandle, name);
    if (h == NULL)
        OSTRAND_THROW_LAST_ERROR(L"OpenEventW");
    SetHandle(h);
}

void CEvent::Set()
{
    OSTRAND_CHECK_BOOL(::SetEvent(GetHandle()), L"SetEvent");
}

void CEvent::Reset()
{
    OSTRAND_CHECK_BOOL(::ResetEvent(GetHandle()), L"ResetEvent");
}

// CMutex -----------------------------------------------------------------------------------------------

CMutex::CMutex(SECURITY_ATTRIBUTES* sa, BOOL initialOwner, const wchar_t* name) : CHandle(NULL)
{
    HANDLE h = ::CreateMutexW(sa, initialOwner, name);
    if (h == NULL)
        OSTRAND_THROW_LAST_ERROR(L"CreateMutexW");
    SetHandle(h);
}

bool CMutex::Lock(DWORD timeout)
{
    const DWORD r = ::WaitForSingleObject(GetHandle(), timeout);
    if (r == WAIT_OBJECT_0 || r == WAIT_ABANDONED)
        return true;
    if (r == WAIT_TIMEOUT)
        return false;
    OSTRAND_THROW_LAST_ERROR(L"WaitForSingleObject");
}

void CMutex::Unlock()
{
    OSTRAND_CHECK_BOOL(::ReleaseMutex(GetHandle()), L"ReleaseMutex");
}

// CCriticalSection -------------------------------------------------------------------------------------

CCriticalSection::CCriticalSection() : CHandle(NULL)
{
    ::InitializeCriticalSection(&m_cs);
}

CCriticalSection::~CCriticalSection()
{
    ::DeleteCriticalSection(&m_cs);
}

bool CCriticalSection::Lock(bool wait)
{
    if (!wait)
        return ::TryEnterCriticalSection(&m_cs) != FALSE;
    ::EnterCriticalSection(&m_cs);
    return true;
}

void CCriticalSection::Unlock()
{
    ::LeaveCriticalSection(&m_cs);
}

// CWSAEvent --------------------------------------------------------------------------------------------

CWSAEvent::CWSAEvent() : CHandle(NULL)
{
    WSAEVENT h = ::WSACreateEvent();
    if (h == WSA_INVALID_EVENT)
        OSTRAND_THROW_WIN(L"WSACreateEvent", ::WSAGetLastError());
    SetHandle(h);
}

void CWSAEvent::Close()
{
    if (!IsCreated())
        return;
    OSTRAND_CHECK_WSA(!::WSACloseEvent(GetHandle()), L"WSACloseEvent");
    ResetHandle();
}

void CWSAEvent::Set()
{
    OSTRAND_CHECK_BOOL(::SetEvent(GetHandle()), L"SetEvent");
}

void CWSAEvent::Reset()
{
    OSTRAND_CHECK_BOOL(::ResetEvent(GetHandle()), L"ResetEvent");
}

// COverlapped, CWSAOverlapped --------------------------------------------------------------------------

namespace
{
template <class Record> void ZeroOffsets(Record& r, HANDLE event)
{
    r.Internal = 0;
    r.InternalHigh = 0;
    r.Offset = 0;
    r.OffsetHigh = 0;
    r.hEvent = event;
}
} // namespace

COverlapped::COverlapped(SECURITY_ATTRIBUTES* sa, BOOL manualReset, BOOL initialState, const wchar_t* name)
    : OVERLAPPED(), m_Event(sa, manualReset, initialState, name)
{
    ZeroOffsets<OVERLAPPED>(*this, m_Event.GetHandle());
}

COverlapped::~COverlapped() {}

void COverlapped::SetEvent()
{
    m_Event.Set();
}

void COverlapped::ResetEvent()
{
    m_Event.Reset();
}

CWSAOverlapped::CWSAOverlapped() : WSAOVERLAPPED(), m_Event()
{
    ZeroOffsets<WSAOVERLAPPED>(*this, m_Event.GetHandle());
}

CWSAOverlapped::~CWSAOverlapped() {}

void CWSAOverlapped::SetEvent()
{
    m_Event.Set();
}

void CWSAOverlapped::ResetEvent()
{
    m_Event.Reset();
}

} // namespace ostrand
