// Owning wrappers of kernel handles and the synchronisation objects.
//
// Classes in this file: CHandle, CEvent, CMutex, CCriticalSection, CWSAEvent, COverlapped, CWSAOverlapped.
//
// Ownership: a CHandle owns its handle exactly when the handle differs from the empty value fixed at
// construction (NULL for events and mutexes, INVALID_HANDLE_VALUE for files and devices). Attach and
// successful creation make it owning, Detach and Close make it empty. The destructor closes an owned
// handle and swallows a failure of that close; an explicit Close() throws it.
//
// Failures: every failed system call throws CWinException with the call's name and the file "Object".
// A mutex time-out is not a failure: Lock returns false.
//
// Threads: no locking of their own; each operation is one system call with that call's thread safety.
#pragma once

#include <ostrand/platform.h>

namespace ostrand
{

class OSTRAND_API CHandle
{
public:
    explicit CHandle(HANDLE empty);
    virtual ~CHandle();

    virtual bool IsCreated() const { return m_hHandle != m_hEmpty; }
    // Closes an owned handle; closing an empty object does nothing. The object is empty afterwards even
    // when CloseHandle fails (which throws).
    virtual void Close();

    HANDLE GetHandle() const { return m_hHandle; }
    operator void*() const { return m_hHandle; }

    // Takes ownership of `h` (not tested) unless a handle is already owned; then returns false.
    bool Attach(HANDLE h);
    // Gives up ownership without closing; returns the empty value when nothing is owned.
    HANDLE Detach();

    CHandle(const CHandle&) = delete;
    CHandle& operator=(const CHandle&) = delete;

protected:
    HANDLE GetEmptyValue() const { return m_hEmpty; }
    // For derived classes that close by other means: forget the handle without closing it.
    void ResetHandle() { m_hHandle = m_hEmpty; }
    // Stores a freshly created handle; for derived constructors and Open members.
    void SetHandle(HANDLE h) { m_hHandle = h; }

private:
    HANDLE m_hEmpty;
    HANDLE m_hHandle;
};

// A kernel event. The default is unnamed, auto-reset and not signalled.
class OSTRAND_API CEvent : public CHandle
{
public:
    CEvent(SECURITY_ATTRIBUTES* sa = NULL, BOOL manualReset = FALSE, BOOL initialState = FALSE,
           const wchar_t* name = NULL);
    // Opens an existing named event.
    CEvent(DWORD desiredAccess, BOOL inheritHandle, const wchar_t* name);

    void Set();
    void Reset();
};

class OSTRAND_API CMutex : public CHandle
{
public:
    CMutex(SECURITY_ATTRIBUTES* sa, BOOL initialOwner, const wchar_t* name);

    // True when acquired, also when the previous owner ended without releasing it; false on time-out.
    bool Lock(DWORD timeout);
    void Unlock();
};

// A process-local critical section; recursive for the owning thread. Holds no handle, so IsCreated()
// is always false.
class OSTRAND_API CCriticalSection : public CHandle
{
public:
    CCriticalSection();
    ~CCriticalSection() override;

    // `wait` false only tries: false while another thread holds the section.
    bool Lock(bool wait);
    void Unlock();

private:
    CRITICAL_SECTION m_cs;
};

// A Winsock event. Close() uses WSACloseEvent and, unlike CHandle::Close, keeps the handle when that
// fails.
class OSTRAND_API CWSAEvent : public CHandle
{
public:
    CWSAEvent();

    void Close() override;
    void Set();
    void Reset();
};

// An OVERLAPPED record that owns the event in its hEvent, so it can be passed straight to overlapped
// calls.
class OSTRAND_API COverlapped : public OVERLAPPED
{
public:
    COverlapped(SECURITY_ATTRIBUTES* sa = NULL, BOOL manualReset = FALSE, BOOL initialState = FALSE,
                const wchar_t* name = NULL);
    virtual ~COverlapped();

    void SetEvent();
    void ResetEvent();

    COverlapped(const COverlapped&) = delete;
    COverlapped& operator=(const COverlapped&) = delete;

private:
    CEvent m_Event;
};

// A WSAOVERLAPPED record that owns the Winsock event in its hEvent.
class OSTRAND_API CWSAOverlapped : public WSAOVERLAPPED
{
public:
    CWSAOverlapped();
    virtual ~CWSAOverlapped();

    void SetEvent();
    void ResetEvent();

    CWSAOverlapped(const CWSAOverlapped&) = delete;
    CWSAOverlapped& operator=(const CWSAOverlapped&) = delete;

private:
    CWSAEvent m_Event;
};

} // namespace ostrand
