// The library's Winsock 2 socket.
//
// Classes in this file: CWSASocket.
//
// Ownership: the object owns its socket exactly when it is not INVALID_SOCKET; Create and Attach make it
// owning, Close, Detach and destruction make it empty. Close never lingers: it sets SO_DONTLINGER so
// closesocket returns at once and the system finishes a graceful close in the background.
//
// Failures: every failed call throws CWinException with WSAGetLastError(), the Winsock call's name and
// the file "Socket". Not failures: AcceptLL returning INVALID_SOCKET for a peer the condition function
// refused (10061) or deferred (11002); Send/Recv returning false for an overlapped operation under way
// (997); GetOverlappedResult returning false while incomplete (996).
//
// The application starts Winsock (WSAStartup) before the first socket and stops it after the last.
// Threads: no locking; overlapped sends and receives need one OVERLAPPED record each.
#pragma once

#include <ostrand/platform.h>
#include <ostrand/text/ustring.h>

namespace ostrand
{

class OSTRAND_API CWSASocket
{
public:
    CWSASocket() : m_Socket(INVALID_SOCKET) {}
    explicit CWSASocket(SOCKET s) : m_Socket(s) {}
    virtual ~CWSASocket();

    CWSASocket(const CWSASocket&) = delete;
    CWSASocket& operator=(const CWSASocket&) = delete;

    // Closes an owned socket first.
    void Create(int af, int type, int protocol, WSAPROTOCOL_INFOW* info = NULL, GROUP group = 0,
                DWORD flags = WSA_FLAG_OVERLAPPED);
    bool Attach(SOCKET s);
    SOCKET Detach();
    bool IsCreated() const { return m_Socket != INVALID_SOCKET; }
    operator SOCKET() const { return m_Socket; }

    // The object is empty afterwards whatever fails. closesocket is called even when SO_DONTLINGER is
    // refused (some socket types do), so no socket leaks; the first failure is thrown.
    void Close();

    void BindLL(const void* address, unsigned __int64 length);
    void Listen(int backlog);
    // The caller owns the returned socket.
    SOCKET AcceptLL(void* address, unsigned __int64 length, LPCONDITIONPROC condition = NULL,
                    DWORD_PTR callbackData = 0);
    void ConnectLL(const void* address, unsigned __int64 length, WSABUF* callerData = NULL,
                   WSABUF* calleeData = NULL, QOS* socketQos = NULL, QOS* groupQos = NULL);
    // Also records the shutdown in the log file of the socket's channel, if it has one.
    void Shutdown(int how);
    bool Send(const void* buffer, unsigned __int64 size, unsigned __int64& sent, DWORD flags = 0,
              OVERLAPPED* overlapped = NULL);
    bool Recv(void* buffer, unsigned __int64 size, unsigned __int64& received, DWORD& flags,
              OVERLAPPED* overlapped = NULL);
    bool GetOverlappedResult(OVERLAPPED* overlapped, unsigned __int64& transferred, BOOL wait, DWORD& flags);
    void EventSelect(WSAEVENT event, long networkEvents);
    void IoctlSocket(long command, unsigned long& argument);
    void GetSockOptLL(int level, int name, void* value, unsigned __int64 length);
    void SetSockOptLL(int level, int name, const void* value, unsigned __int64 length);
    void GetSockNameLL(void* address, unsigned __int64 length);

    // Number of ready sockets, 0 on time-out. INFINITE (exactly 0xFFFFFFFF) blocks.
    static int Select(fd_set& read, fd_set& write, fd_set& except, unsigned __int64 milliseconds);

    // IPv4 as "a.b.c.d:port" (file-name form "a.b.c.d@port"), Bluetooth as "00:A0:C9:11:22:33"
    // (file-name form with '_'). False, with `text` empty, for records too short and other families.
    bool GetAddressString(const sockaddr* address, unsigned __int64 length, bool fileNameForm,
                          ustring& text) const;

private:
    SOCKET m_Socket;
};

} // namespace ostrand
