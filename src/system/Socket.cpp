#include <ostrand/system/Socket.h>

#include <ostrand/logging/LogFileServer.h>

#include "internal/throw.h"

#include <cstring>

namespace ostrand
{

CWSASocket::~CWSASocket()
{
    try
    {
        Close();
    }
    catch (...)
    {
        // A destructor cannot report a failed close; the socket is released either way.
    }
}

void CWSASocket::Create(int af, int type, int protocol, WSAPROTOCOL_INFOW* info, GROUP group, DWORD flags)
{
    Close();
    const SOCKET s = ::WSASocketW(af, type, protocol, info, group, flags);
    OSTRAND_CHECK_WSA(s == INVALID_SOCKET, L"WSASocket");
    m_Socket = s;
}

bool CWSASocket::Attach(SOCKET s)
{
    if (IsCreated())
        return false;
    m_Socket = s;
    return true;
}

SOCKET CWSASocket::Detach()
{
    const SOCKET s = m_Socket;
    m_Socket = INVALID_SOCKET;
    return s;
}

void CWSASocket::Close()
{
    if (!IsCreated())
        return;
    const SOCKET s = m_Socket;
    m_Socket = INVALID_SOCKET;

    const BOOL dontLinger = TRUE;
    const bool optionSet =
        ::setsockopt(s, SOL_SOCKET, SO_DONTLINGER, reinterpret_cast<const char*>(&dontLinger),
                     sizeof dontLinger) != SOCKET_ERROR;
    const int optionError = optionSet ? 0 : ::WSAGetLastError();
    const bool closed = ::closesocket(s) != SOCKET_ERROR;
    const int closeError = closed ? 0 : ::WSAGetLastError();
    if (!optionSet)
        OSTRAND_THROW_WIN(L"setsockopt", optionError);
    if (!closed)
        OSTRAND_THROW_WIN(L"closesocket", closeError);
}

namespace
{
// Winsock takes 32-bit lengths; larger ones cannot describe a real address or option.
int Length32(unsigned __int64 length)
{
    return length > 0x7FFFFFFF ? 0x7FFFFFFF : static_cast<int>(length);
}
} // namespace

void CWSASocket::BindLL(const void* address, unsigned __int64 length)
{
    OSTRAND_CHECK_WSA(
        ::bind(m_Socket, static_cast<const sockaddr*>(address), Length32(length)) == SOCKET_ERROR, L"bind");
}

void CWSASocket::Listen(int backlog)
{
    OSTRAND_CHECK_WSA(::listen(m_Socket, backlog) == SOCKET_ERROR, L"listen");
}

SOCKET CWSASocket::AcceptLL(void* address, unsigned __int64 length, LPCONDITIONPROC condition,
                            DWORD_PTR callbackData)
{
    int len = Length32(length);
    const SOCKET s = ::WSAAccept(m_Socket, static_cast<sockaddr*>(address), address == NULL ? NULL : &len,
                                 condition, callbackData);
    if (s != INVALID_SOCKET)
        return s;
    const int error = ::WSAGetLastError();
    if (error == WSAECONNREFUSED || error == WSATRY_AGAIN)
        return INVALID_SOCKET;
    OSTRAND_THROW_WIN(L"WSAAccept", error);
}

void CWSASocket::ConnectLL(const void* address, unsigned __int64 length, WSABUF* callerData,
                           WSABUF* calleeData, QOS* socketQos, QOS* groupQos)
{
    OSTRAND_CHECK_WSA(::WSAConnect(m_Socket, static_cast<const sockaddr*>(address), Length32(length),
                                   callerData, calleeData, socketQos, groupQos) == SOCKET_ERROR,
                      L"WSAConnect");
}

void CWSASocket::Shutdown(int how)
{
    OSTRAND_CHECK_WSA(::shutdown(m_Socket, how) == SOCKET_ERROR, L"shutdown");
    CLogFileServer::Ref().LogText(static_cast<unsigned __int64>(m_Socket), true,
                                  L"shutdown(int how=%d) succeeded.", how);
}

bool CWSASocket::Send(const void* buffer, unsigned __int64 size, unsigned __int64& sent, DWORD flags,
                      OVERLAPPED* overlapped)
{
    WSABUF b;
    b.len = static_cast<ULONG>(size);
    b.buf = static_cast<char*>(const_cast<void*>(buffer));
    DWORD n = 0;
    const int r = ::WSASend(m_Socket, &b, 1, &n, flags, overlapped, NULL);
    sent = n;
    const int error = r == SOCKET_ERROR ? ::WSAGetLastError() : 0;
    OSTRAND_RETURN_DONE_OR_NOT_YET(r != SOCKET_ERROR, error, WSA_IO_PENDING, L"WSASend");
}

bool CWSASocket::Recv(void* buffer, unsigned __int64 size, unsigned __int64& received, DWORD& flags,
                      OVERLAPPED* overlapped)
{
    WSABUF b;
    b.len = static_cast<ULONG>(size);
    b.buf = static_cast<char*>(buffer);
    DWORD n = 0;
    const int r = ::WSARecv(m_Socket, &b, 1, &n, &flags, overlapped, NULL);
    received = n;
    const int error = r == SOCKET_ERROR ? ::WSAGetLastError() : 0;
    OSTRAND_RETURN_DONE_OR_NOT_YET(r != SOCKET_ERROR, error, WSA_IO_PENDING, L"WSARecv");
}

bool CWSASocket::GetOverlappedResult(OVERLAPPED* overlapped, unsigned __int64& transferred, BOOL wait,
                                     DWORD& flags)
{
    DWORD n = 0;
    const BOOL done = ::WSAGetOverlappedResult(m_Socket, overlapped, &n, wait, &flags);
    transferred = n;
    const int error = done ? 0 : ::WSAGetLastError();
    OSTRAND_RETURN_DONE_OR_NOT_YET(done, error, WSA_IO_INCOMPLETE, L"WSAGetOverlappedResult");
}

void CWSASocket::EventSelect(WSAEVENT event, long networkEvents)
{
    OSTRAND_CHECK_WSA(::WSAEventSelect(m_Socket, event, networkEvents) == SOCKET_ERROR, L"WSAEventSelect");
}

void CWSASocket::IoctlSocket(long command, unsigned long& argument)
{
    OSTRAND_CHECK_WSA(::ioctlsocket(m_Socket, command, &argument) == SOCKET_ERROR, L"ioctlsocket");
}

void CWSASocket::GetSockOptLL(int level, int name, void* value, unsigned __int64 length)
{
    int len = Length32(length);
    OSTRAND_CHECK_WSA(::getsockopt(m_Socket, level, name, static_cast<char*>(value), &len) == SOCKET_ERROR,
                      L"getsockopt");
}

void CWSASocket::SetSockOptLL(int level, int name, const void* value, unsigned __int64 length)
{
    OSTRAND_CHECK_WSA(::setsockopt(m_Socket, level, name, static_cast<const char*>(value),
                                   Length32(length)) == SOCKET_ERROR,
                      L"setsockopt");
}

void CWSASocket::GetSockNameLL(void* address, unsigned __int64 length)
{
    int len = Length32(length);
    OSTRAND_CHECK_WSA(::getsockname(m_Socket, static_cast<sockaddr*>(address), &len) == SOCKET_ERROR,
                      L"getsockname");
}

int CWSASocket::Select(fd_set& read, fd_set& write, fd_set& except, unsigned __int64 milliseconds)
{
    timeval timeout;
    timeval* pTimeout = NULL;
    if (milliseconds != INFINITE)
    {
        timeout.tv_sec = static_cast<long>(milliseconds / 1000);
        timeout.tv_usec = static_cast<long>((milliseconds % 1000) * 1000);
        pTimeout = &timeout;
    }
    const int n = ::select(0, &read, &write, &except, pTimeout);
    OSTRAND_CHECK_WSA(n == SOCKET_ERROR, L"select");
    return n;
}

bool CWSASocket::GetAddressString(const sockaddr* address, unsigned __int64 length, bool fileNameForm,
                                  ustring& text) const
{
    text.clear();
    if (address == NULL || length < 2)
        return false;
    const unsigned char* raw = reinterpret_cast<const unsigned char*>(address);
    unsigned short family;
    std::memcpy(&family, raw, sizeof family);
    if (family == AF_INET)
    {
        if (length < sizeof(sockaddr_in))
            return false;
        sockaddr_in in;
        std::memcpy(&in, raw, sizeof in);
        const unsigned char* a = reinterpret_cast<const unsigned char*>(&in.sin_addr);
        text.sprintf(fileNameForm ? L"%u.%u.%u.%u@%u" : L"%u.%u.%u.%u:%u", a[0], a[1], a[2], a[3],
                     static_cast<unsigned>(::ntohs(in.sin_port)));
        return true;
    }
    if (family == AF_BTH)
    {
        // SOCKADDR_BTH packed: family (2), 64-bit address (8), service class GUID (16), port (4).
        const unsigned __int64 bthRecordSize = 30;
        if (length < bthRecordSize)
            return false;
        unsigned __int64 bth;
        std::memcpy(&bth, raw + 2, sizeof bth);
        const unsigned b[6] = {unsigned(bth >> 40) & 0xFF, unsigned(bth >> 32) & 0xFF,
                               unsigned(bth >> 24) & 0xFF, unsigned(bth >> 16) & 0xFF,
                               unsigned(bth >> 8) & 0xFF,  unsigned(bth) & 0xFF};
        text.sprintf(fileNameForm ? L"%02X_%02X_%02X_%02X_%02X_%02X" : L"%02X:%02X:%02X:%02X:%02X:%02X", b[0],
                     b[1], b[2], b[3], b[4], b[5]);
        return true;
    }
    return false;
}

} // namespace ostrand
