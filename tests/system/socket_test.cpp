#include <ostrand/errors/Exception.h>
#include <ostrand/logging/LogFileServer.h>
#include <ostrand/system/File.h>
#include <ostrand/system/Object.h>
#include <ostrand/system/Socket.h>

#include "../support/ChildProcess.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

using namespace ostrand;

namespace
{

// Winsock for the whole test process, as an application starts it.
class WinsockEnvironment : public ::testing::Environment
{
public:
    void SetUp() override
    {
        WSADATA data;
        ASSERT_EQ(0, ::WSAStartup(MAKEWORD(2, 2), &data));
    }
    void TearDown() override { ::WSACleanup(); }
};
const ::testing::Environment* const winsock = ::testing::AddGlobalTestEnvironment(new WinsockEnvironment);

sockaddr_in Loopback(unsigned short port)
{
    sockaddr_in a = {};
    a.sin_family = AF_INET;
    a.sin_port = ::htons(port);
    a.sin_addr.s_addr = ::htonl(INADDR_LOOPBACK);
    return a;
}

template <class F> void ExpectWinException(F f, const wchar_t* call, DWORD code)
{
    try
    {
        f();
        ADD_FAILURE() << "no exception";
    }
    catch (const CWinException& e)
    {
        EXPECT_EQ(ustring(call), e.GetFunction());
        EXPECT_EQ(code, e.GetErrorCode());
        EXPECT_EQ(ustring(L"Socket"), e.GetFileName());
        EXPECT_GT(e.GetLine(), 0u);
    }
}

// A listening TCP socket on a free loopback port.
class SocketTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        listener.Create(AF_INET, SOCK_STREAM, IPPROTO_TCP);
        sockaddr_in a = Loopback(0);
        listener.BindLL(&a, sizeof a);
        listener.Listen(4);
        listener.GetSockNameLL(&a, sizeof a);
        port = ::ntohs(a.sin_port);
    }

    void Connect(CWSASocket& client)
    {
        client.Create(AF_INET, SOCK_STREAM, IPPROTO_TCP);
        const sockaddr_in a = Loopback(port);
        client.ConnectLL(&a, sizeof a);
    }

    // Starts the peer process that connects to the listener, waits `delayMs` and sends `text`.
    void StartPeer(int delayMs, const char* text)
    {
        wchar_t self[MAX_PATH];
        ::GetModuleFileNameW(NULL, self, MAX_PATH);
        std::wstring exe(self);
        exe = exe.substr(0, exe.find_last_of(L'\\') + 1) + L"socket_peer.exe";
        ASSERT_TRUE(peer.Start({exe, std::to_wstring(port), std::to_wstring(delayMs),
                                std::wstring(text, text + std::strlen(text))}));
    }

    void TearDown() override { EXPECT_TRUE(peer.Wait(10000)) << "the peer did not end"; }

    CWSASocket listener;
    unsigned short port = 0;
    testsupport::ChildProcess peer;
};

int CALLBACK Reject(LPWSABUF, LPWSABUF, LPQOS, LPQOS, LPWSABUF, LPWSABUF, GROUP*, DWORD_PTR)
{
    return CF_REJECT;
}
int CALLBACK Defer(LPWSABUF, LPWSABUF, LPQOS, LPQOS, LPWSABUF, LPWSABUF, GROUP*, DWORD_PTR)
{
    return CF_DEFER;
}
int CALLBACK AcceptAndCount(LPWSABUF, LPWSABUF, LPQOS, LPQOS, LPWSABUF, LPWSABUF, GROUP*, DWORD_PTR data)
{
    ++*reinterpret_cast<int*>(data);
    return CF_ACCEPT;
}

} // namespace

TEST(CWSASocketAddressTest, FormatsIPv4AndBluetoothAndRejectsTheRest)
{
    CWSASocket s;
    ustring text;
    sockaddr_in in = {};
    in.sin_family = AF_INET;
    in.sin_port = ::htons(80);
    in.sin_addr.s_addr = ::inet_addr("192.168.0.10");
    EXPECT_TRUE(s.GetAddressString(reinterpret_cast<sockaddr*>(&in), sizeof in, false, text));
    EXPECT_EQ(ustring(L"192.168.0.10:80"), text);
    EXPECT_TRUE(s.GetAddressString(reinterpret_cast<sockaddr*>(&in), sizeof in, true, text));
    EXPECT_EQ(ustring(L"192.168.0.10@80"), text);
    EXPECT_FALSE(s.GetAddressString(reinterpret_cast<sockaddr*>(&in), 15, false, text));
    EXPECT_TRUE(text.empty());

    unsigned char bth[30] = {};
    const unsigned short family = AF_BTH;
    const unsigned __int64 address = 0xFFFF00A0C9112233ull; // only the six low bytes count
    std::memcpy(bth, &family, 2);
    std::memcpy(bth + 2, &address, 8);
    EXPECT_TRUE(s.GetAddressString(reinterpret_cast<sockaddr*>(bth), 30, false, text));
    EXPECT_EQ(ustring(L"00:A0:C9:11:22:33"), text);
    EXPECT_TRUE(s.GetAddressString(reinterpret_cast<sockaddr*>(bth), 30, true, text));
    EXPECT_EQ(ustring(L"00_A0_C9_11_22_33"), text);
    // A record too short to hold a Bluetooth address is no address, not an empty one.
    EXPECT_FALSE(s.GetAddressString(reinterpret_cast<sockaddr*>(bth), 29, false, text));
    EXPECT_TRUE(text.empty());

    sockaddr_in6 in6 = {};
    in6.sin6_family = AF_INET6;
    EXPECT_FALSE(s.GetAddressString(reinterpret_cast<sockaddr*>(&in6), sizeof in6, false, text));
    EXPECT_TRUE(text.empty());
    EXPECT_FALSE(s.GetAddressString(reinterpret_cast<sockaddr*>(&in), 1, false, text));
}

TEST(CWSASocketTest, CloseReleasesTheObjectEvenWhenWinsockRefuses)
{
    CWSASocket empty;
    EXPECT_NO_THROW(empty.Close());

    // A value that is no socket: both setsockopt and closesocket fail; the first failure is reported
    // and the object is empty afterwards.
    CWSASocket bogus;
    ASSERT_TRUE(bogus.Attach(static_cast<SOCKET>(0x7FFF0)));
    EXPECT_FALSE(bogus.Attach(static_cast<SOCKET>(0x7FFF4)));
    ExpectWinException([&] { bogus.Close(); }, L"setsockopt", WSAENOTSOCK);
    EXPECT_FALSE(bogus.IsCreated());

    // Members called on an empty object pass INVALID_SOCKET on and throw Winsock's error.
    unsigned __int64 n = 0;
    DWORD flags = 0;
    char buffer[4];
    ExpectWinException([&] { empty.Recv(buffer, sizeof buffer, n, flags); }, L"WSARecv", WSAENOTSOCK);
    ExpectWinException([&] { empty.Listen(1); }, L"listen", WSAENOTSOCK);

    // Detach hands the socket over without closing it.
    CWSASocket a;
    a.Create(AF_INET, SOCK_DGRAM, IPPROTO_UDP);
    CWSASocket b(a.Detach());
    EXPECT_FALSE(a.IsCreated());
    int type = 0;
    b.GetSockOptLL(SOL_SOCKET, SO_TYPE, &type, sizeof type);
    EXPECT_EQ(SOCK_DGRAM, type);
}

TEST_F(SocketTest, ConditionFunctionRejectsDefersAndAccepts)
{
    CWSASocket first;
    Connect(first);
    EXPECT_EQ(INVALID_SOCKET, listener.AcceptLL(NULL, 0, Reject, 0));
    EXPECT_EQ(WSAECONNREFUSED, ::WSAGetLastError());

    CWSASocket second;
    Connect(second);
    EXPECT_EQ(INVALID_SOCKET, listener.AcceptLL(NULL, 0, Defer, 0));
    EXPECT_EQ(WSATRY_AGAIN, ::WSAGetLastError());
    // The deferred connection is still there to be accepted.
    int accepted = 0;
    sockaddr_in from = {};
    CWSASocket server(
        listener.AcceptLL(&from, sizeof from, AcceptAndCount, reinterpret_cast<DWORD_PTR>(&accepted)));
    EXPECT_TRUE(server.IsCreated());
    EXPECT_EQ(1, accepted);
    EXPECT_EQ(::htonl(INADDR_LOOPBACK), from.sin_addr.s_addr);
}

TEST_F(SocketTest, OverlappedReceivePendsUntilThePeerSends)
{
    StartPeer(500, "hello");
    CWSASocket server(listener.AcceptLL(NULL, 0));
    ASSERT_TRUE(server.IsCreated());

    CWSAOverlapped ov;
    char buffer[64] = {};
    unsigned __int64 received = 0;
    DWORD flags = 0;
    ASSERT_FALSE(server.Recv(buffer, sizeof buffer, received, flags, &ov)) << "the peer has not sent yet";
    EXPECT_FALSE(server.GetOverlappedResult(&ov, received, FALSE, flags));
    ASSERT_EQ(WAIT_OBJECT_0, ::WSAWaitForMultipleEvents(1, &ov.hEvent, TRUE, 10000, FALSE));
    ASSERT_TRUE(server.GetOverlappedResult(&ov, received, TRUE, flags));
    EXPECT_EQ(5u, received);
    EXPECT_EQ(std::string("hello"), std::string(buffer, 5));

    // An overlapped send completes, and the peer echoes it back.
    CWSAOverlapped sendOv;
    unsigned __int64 sent = 0;
    const char reply[] = "0123456789";
    if (!server.Send(reply, 10, sent, 0, &sendOv))
    {
        ASSERT_TRUE(server.GetOverlappedResult(&sendOv, sent, TRUE, flags));
    }
    EXPECT_EQ(10u, sent);
    std::string echoed;
    while (echoed.size() < 10)
    {
        ASSERT_TRUE(server.Recv(buffer, sizeof buffer, received, flags));
        ASSERT_GT(received, 0u);
        echoed.append(buffer, static_cast<size_t>(received));
    }
    EXPECT_EQ(std::string(reply), echoed);
    server.Shutdown(SD_SEND); // the peer sees the end and exits
}

TEST_F(SocketTest, SelectPollsTimesOutAndBlocksUntilDataArrives)
{
    StartPeer(300, "x");
    CWSASocket server(listener.AcceptLL(NULL, 0));
    fd_set r, w, e;
    FD_ZERO(&r);
    FD_ZERO(&w);
    FD_ZERO(&e);
    FD_SET(static_cast<SOCKET>(server), &r);
    EXPECT_EQ(0, CWSASocket::Select(r, w, e, 0));

    const DWORD t0 = ::GetTickCount();
    // Nothing to wait for but the time-out: 1 s and 500,000 us.
    FD_ZERO(&r);
    CWSASocket idle;
    idle.Create(AF_INET, SOCK_DGRAM, IPPROTO_UDP);
    FD_SET(static_cast<SOCKET>(idle), &r);
    EXPECT_EQ(0, CWSASocket::Select(r, w, e, 1500));
    EXPECT_GE(::GetTickCount() - t0, 1400u);

    FD_ZERO(&r);
    FD_SET(static_cast<SOCKET>(server), &r);
    EXPECT_EQ(1, CWSASocket::Select(r, w, e, INFINITE));
    EXPECT_TRUE(FD_ISSET(static_cast<SOCKET>(server), &r));
    unsigned long pending = 0;
    server.IoctlSocket(FIONREAD, pending);
    EXPECT_EQ(1u, pending);

    // The same arrival seen through an event: the peer's echo of what we send now.
    CWSAEvent event;
    server.EventSelect(event.GetHandle(), FD_READ);
    char c;
    unsigned __int64 n = 0;
    DWORD flags = 0;
    ASSERT_TRUE(server.Recv(&c, 1, n, flags)); // re-enables FD_READ
    ASSERT_TRUE(server.Send("y", 1, n));
    WSAEVENT h = event.GetHandle();
    ASSERT_EQ(WSA_WAIT_EVENT_0, ::WSAWaitForMultipleEvents(1, &h, TRUE, 10000, FALSE));
    server.EventSelect(NULL, 0);
    server.Shutdown(SD_SEND);
}

namespace
{
// The log files of `prefix` in the documents folder's _Debug folder.
std::vector<ustring> LogFiles(const wchar_t* prefix)
{
    ustring folder;
    CFile::GetSpecialFolderPath(CSIDL_PERSONAL, folder);
    folder += L"\\_Debug\\";
    std::vector<ustring> files;
    WIN32_FIND_DATAW found;
    HANDLE search = ::FindFirstFileW(ustring(folder + prefix + L"-*.log").c_str(), &found);
    if (search == INVALID_HANDLE_VALUE)
        return files;
    do
        files.push_back(folder + found.cFileName);
    while (::FindNextFileW(search, &found));
    ::FindClose(search);
    return files;
}

std::string ReadAll(const ustring& path)
{
    CFile file(path.c_str(), GENERIC_READ, FILE_SHARE_READ | FILE_SHARE_WRITE, NULL, OPEN_EXISTING, 0);
    std::string content(static_cast<size_t>(file.GetLength()), '\0');
    unsigned __int64 n = 0;
    if (!content.empty())
        file.Read(&content[0], content.size(), n);
    return content;
}
} // namespace

TEST_F(SocketTest, ShutdownIsRecordedInTheChannelLogByDetail)
{
    CLogFileServer& logs = CLogFileServer::Ref();
    const CLogFileServer::LogFileDetail previous = logs.GetDetail();
    for (CLogFileServer::LogFileDetail detail : {CLogFileServer::DetailNormal, CLogFileServer::DetailFull})
    {
        for (const ustring& old : LogFiles(L"socket-shutdown"))
            CFile::Remove(old.c_str());
        CWSASocket client;
        Connect(client);
        CWSASocket server(listener.AcceptLL(NULL, 0));
        logs.SetDetail(detail);
        const unsigned __int64 channel = static_cast<SOCKET>(client);
        ASSERT_TRUE(logs.CreateLogFile(channel, L"socket-shutdown"));
        client.Shutdown(SD_SEND);
        ASSERT_TRUE(logs.CloseLogFile(channel)); // writes what was queued
        const std::vector<ustring> files = LogFiles(L"socket-shutdown");
        ASSERT_EQ(1u, files.size());
        const std::string content = ReadAll(files[0]);
        EXPECT_NE(std::string::npos, content.find("shutdown(int how=1) succeeded.")) << content;
    }
    logs.SetDetail(previous);
}
