#include <ostrand/errors/Exception.h>
#include <ostrand/logging/LogFileServer.h>
#include <ostrand/system/File.h>
#include <ostrand/system/Object.h>
#include <ostrand/system/Socket.h>

#include "../support/ChildProcess.h"
#include "system_test_util.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>

using namespace ostrand;

namespace
{

struct WinsockEnvironment : ::testing::Environment
{
    void SetUp() override
    {
        WSADATA data;
        ASSERT_EQ(0, ::WSAStartup(MAKEWORD(2, 2), &data));
    }
    void TearDown() override { ::WSACleanup(); }
};
const auto* const winsock = ::testing::AddGlobalTestEnvironment(new WinsockEnvironment);

sockaddr_in Loopback(unsigned short port)
{
    sockaddr_in a = {};
    a.sin_family = AF_INET;
    a.sin_port = ::htons(port);
    a.sin_addr.s_addr = ::htonl(INADDR_LOOPBACK);
    return a;
}

// A listener on a free loopback port; the peer process connects to it, waits and sends a text.
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
    void TearDown() override { EXPECT_TRUE(peer.Wait(10000)) << "the peer did not end"; }

    void Connect(CWSASocket& client)
    {
        client.Create(AF_INET, SOCK_STREAM, IPPROTO_TCP);
        const sockaddr_in a = Loopback(port);
        client.ConnectLL(&a, sizeof a);
    }
    SOCKET AcceptPeer(int delayMs, const wchar_t* text)
    {
        wchar_t self[MAX_PATH];
        ::GetModuleFileNameW(NULL, self, MAX_PATH);
        std::wstring exe(self);
        exe = exe.substr(0, exe.find_last_of(L'\\') + 1) + L"socket_peer.exe";
        EXPECT_TRUE(peer.Start({exe, std::to_wstring(port), std::to_wstring(delayMs), text}));
        return listener.AcceptLL(NULL, 0);
    }

    CWSASocket listener;
    unsigned short port = 0;
    testsupport::ChildProcess peer;
};

int CALLBACK Condition(LPWSABUF, LPWSABUF, LPQOS, LPQOS, LPWSABUF, LPWSABUF, GROUP*, DWORD_PTR answer)
{
    return static_cast<int>(answer);
}

} // namespace

TEST(CWSASocketTest, FormatsIPv4AndBluetoothAddressesAndRejectsTheRest)
{
    sockaddr_in in = Loopback(80);
    in.sin_addr.s_addr = ::inet_addr("192.168.0.10");
    unsigned char bth[30] = {AF_BTH, 0};
    const unsigned __int64 address = 0xFFFF00A0C9112233ull; // only the six low bytes count
    std::memcpy(bth + 2, &address, 8);
    sockaddr_in6 in6 = {};
    in6.sin6_family = AF_INET6;
    const struct
    {
        const void* record;
        unsigned __int64 length;
        bool fileName;
        const wchar_t* text; // null: false and empty
    } rows[] = {{&in, sizeof in, false, L"192.168.0.10:80"},
                {&in, sizeof in, true, L"192.168.0.10@80"},
                {&in, 15, false, NULL},
                {bth, 30, false, L"00:A0:C9:11:22:33"},
                {bth, 30, true, L"00_A0_C9_11_22_33"},
                {bth, 29, false, NULL}, // too short to hold a Bluetooth address: no address
                {&in6, sizeof in6, false, NULL},
                {&in, 1, false, NULL}};
    for (const auto& r : rows)
    {
        ustring text(L"old");
        EXPECT_EQ(r.text != NULL, CWSASocket().GetAddressString(static_cast<const sockaddr*>(r.record),
                                                                r.length, r.fileName, text));
        EXPECT_EQ(ustring(r.text != NULL ? r.text : L""), text);
    }
}

TEST(CWSASocketTest, CloseAndDetachLeaveTheObjectEmpty)
{
    CWSASocket empty;
    EXPECT_NO_THROW(empty.Close());
    // A value that is no socket: setsockopt and closesocket both fail, the first failure is thrown.
    CWSASocket bogus;
    ASSERT_TRUE(bogus.Attach(static_cast<SOCKET>(0x7FFF0)));
    EXPECT_FALSE(bogus.Attach(static_cast<SOCKET>(0x7FFF4)));
    ExpectWin([&] { bogus.Close(); }, WSAENOTSOCK, L"setsockopt", L"Socket");
    EXPECT_FALSE(bogus.IsCreated());
    unsigned __int64 n = 0;
    DWORD flags = 0;
    char buffer[4];
    ExpectWin([&] { empty.Recv(buffer, sizeof buffer, n, flags); }, WSAENOTSOCK, L"WSARecv", L"Socket");

    CWSASocket a;
    a.Create(AF_INET, SOCK_DGRAM, IPPROTO_UDP);
    CWSASocket b(a.Detach());
    EXPECT_FALSE(a.IsCreated());
    int type = 0;
    b.GetSockOptLL(SOL_SOCKET, SO_TYPE, &type, sizeof type); // still open
    EXPECT_EQ(SOCK_DGRAM, type);
}

TEST_F(SocketTest, ConditionFunctionRejectsDefersAndAccepts)
{
    CWSASocket first, second;
    Connect(first);
    EXPECT_EQ(INVALID_SOCKET, listener.AcceptLL(NULL, 0, Condition, CF_REJECT));
    EXPECT_EQ(WSAECONNREFUSED, ::WSAGetLastError());
    Connect(second);
    EXPECT_EQ(INVALID_SOCKET, listener.AcceptLL(NULL, 0, Condition, CF_DEFER));
    EXPECT_EQ(WSATRY_AGAIN, ::WSAGetLastError());
    sockaddr_in from = {};
    CWSASocket server(listener.AcceptLL(&from, sizeof from, Condition, CF_ACCEPT)); // the deferred one
    EXPECT_TRUE(server.IsCreated());
    EXPECT_EQ(::htonl(INADDR_LOOPBACK), from.sin_addr.s_addr);
}

TEST_F(SocketTest, OverlappedReceivePendsUntilThePeerSends)
{
    CWSASocket server(AcceptPeer(500, L"hello"));
    CWSAOverlapped ov;
    char buffer[64] = {};
    unsigned __int64 received = 0;
    DWORD flags = 0;
    ASSERT_FALSE(server.Recv(buffer, sizeof buffer, received, flags, &ov)) << "the peer has not sent yet";
    EXPECT_FALSE(server.GetOverlappedResult(&ov, received, FALSE, flags));
    ASSERT_TRUE(server.GetOverlappedResult(&ov, received, TRUE, flags));
    EXPECT_EQ("hello", std::string(buffer, static_cast<size_t>(received)));

    // An overlapped send, which the peer echoes.
    CWSAOverlapped sendOv;
    unsigned __int64 sent = 0;
    if (!server.Send("0123456789", 10, sent, 0, &sendOv))
    {
        ASSERT_TRUE(server.GetOverlappedResult(&sendOv, sent, TRUE, flags));
    }
    EXPECT_EQ(10u, sent);
    std::string echoed;
    while (echoed.size() < 10 && server.Recv(buffer, sizeof buffer, received, flags) && received > 0)
        echoed.append(buffer, static_cast<size_t>(received));
    EXPECT_EQ("0123456789", echoed);
    server.Shutdown(SD_SEND);
}

TEST_F(SocketTest, SelectPollsTimesOutBlocksAndEventsSignal)
{
    CWSASocket server(AcceptPeer(300, L"x"));
    fd_set r, w, e;
    FD_ZERO(&r);
    FD_ZERO(&w);
    FD_ZERO(&e);
    FD_SET(static_cast<SOCKET>(server), &r);
    EXPECT_EQ(0, CWSASocket::Select(r, w, e, 0));

    CWSASocket idle;
    idle.Create(AF_INET, SOCK_DGRAM, IPPROTO_UDP);
    FD_ZERO(&r);
    FD_SET(static_cast<SOCKET>(idle), &r);
    const DWORD t0 = ::GetTickCount();
    EXPECT_EQ(0, CWSASocket::Select(r, w, e, 1500)); // 1 s and 500,000 us
    EXPECT_GE(::GetTickCount() - t0, 1400u);

    FD_ZERO(&r);
    FD_SET(static_cast<SOCKET>(server), &r);
    EXPECT_EQ(1, CWSASocket::Select(r, w, e, INFINITE));
    unsigned long pending = 0;
    server.IoctlSocket(FIONREAD, pending);
    EXPECT_EQ(1u, pending);

    CWSAEvent event;
    server.EventSelect(event.GetHandle(), FD_READ);
    char c;
    unsigned __int64 n = 0;
    DWORD flags = 0;
    ASSERT_TRUE(server.Recv(&c, 1, n, flags)); // re-enables FD_READ
    ASSERT_TRUE(server.Send("y", 1, n));       // echoed back by the peer
    WSAEVENT h = event.GetHandle();
    EXPECT_EQ(WSA_WAIT_EVENT_0, ::WSAWaitForMultipleEvents(1, &h, TRUE, 10000, FALSE));
    server.EventSelect(NULL, 0);
    server.Shutdown(SD_SEND);
}

TEST_F(SocketTest, ShutdownIsRecordedInTheChannelLogByDetail)
{
    CLogFileServer& logs = CLogFileServer::Ref();
    ustring folder;
    CFile::GetSpecialFolderPath(CSIDL_PERSONAL, folder);
    folder += L"\\_Debug\\";
    for (auto detail : {CLogFileServer::DetailNormal, CLogFileServer::DetailFull})
    {
        CWSASocket client;
        Connect(client);
        CWSASocket server(listener.AcceptLL(NULL, 0));
        logs.SetDetail(detail);
        const wchar_t* prefix = detail == CLogFileServer::DetailFull ? L"shutdown-full" : L"shutdown-normal";
        ASSERT_TRUE(logs.CreateLogFile(static_cast<SOCKET>(client), prefix));
        client.Shutdown(SD_SEND);
        ASSERT_TRUE(logs.CloseLogFile(static_cast<SOCKET>(client))); // writes what was queued

        WIN32_FIND_DATAW found;
        HANDLE search = ::FindFirstFileW((folder + prefix + L"-*.log").c_str(), &found);
        ASSERT_NE(INVALID_HANDLE_VALUE, search);
        ::FindClose(search);
        CFile file((folder + found.cFileName).c_str(), GENERIC_READ, FILE_SHARE_READ, NULL, OPEN_EXISTING, 0);
        std::string content(static_cast<size_t>(file.GetLength()), '\0');
        unsigned __int64 n = 0;
        file.Read(&content[0], content.size(), n);
        file.Close();
        CFile::Remove((folder + found.cFileName).c_str());
        EXPECT_NE(std::string::npos, content.find("shutdown(int how=1) succeeded.")) << content;
    }
    logs.SetDetail(CLogFileServer::DetailNone);
}
