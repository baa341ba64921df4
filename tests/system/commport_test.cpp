// CCommPort against a real serial peer: a pseudo-terminal linked as a COM port of the Wine prefix and
// driven by tests/peers/serial_peer.py. Where Wine's serial driver on a pseudo-terminal differs from
// Windows on a real port, the test checks what Wine does and says why.
#include <ostrand/system/CommPort.h>
#include <ostrand/system/Object.h>

#include "serial_peer_fixture.h"
#include "system_test_util.h"

#include <gtest/gtest.h>

#include <cstring>
#include <functional>
#include <utility>
#include <string>

using ostrand::CCommPort;
using ostrand::COverlapped;
using systest::CatchWin;
using systest::ExpectPayload;

namespace
{

class CCommPortTest : public serialtest::SerialPeerTest
{
protected:
    // Starts a peer with `script` and opens its port: 115200 8N1, no flow control, reads wait `readTotal` ms.
    CCommPort& Connect(const std::string& script, DWORD flags = 0, DWORD readTotal = 5000)
    {
        EXPECT_TRUE(StartPeer(script));
        m_port.Open(PortName().c_str(), flags);
        m_port.SetupComm(65536, 65536);
        DCB dcb = {};
        dcb.DCBlength = sizeof(dcb);
        m_port.GetCommState(dcb);
        EXPECT_TRUE(::BuildCommDCBW(L"baud=115200 parity=N data=8 stop=1 xon=off octs=off dtr=off", &dcb));
        m_port.SetCommState(dcb);
        m_port.SetCommTimeouts({0, 0, readTotal, 0, 10000});
        return m_port;
    }

    // Waits until at least `count` bytes are queued for reading; returns the queued count.
    static DWORD WaitForInput(CCommPort& port, DWORD count)
    {
        DWORD errors = 0;
        COMSTAT status = {};
        const ULONGLONG end = ::GetTickCount64() + 5000;
        for (; status.cbInQue < count && ::GetTickCount64() < end; ::Sleep(5))
            port.ClearCommError(errors, status);
        return status.cbInQue;
    }

    // Writes `text`, on an overlapped port through a COverlapped collected with GetOverlappedResult.
    static void WriteText(CCommPort& port, const std::string& text, bool overlapped = false)
    {
        COverlapped writing(NULL, TRUE);
        unsigned __int64 written = 0;
        EXPECT_TRUE(port.Write(text.data(), text.size(), written, overlapped ? &writing : NULL) ||
                    port.GetOverlappedResult(&writing, written, TRUE));
        EXPECT_EQ(text.size(), written);
    }

    static std::string ReadText(CCommPort& port, size_t count)
    {
        std::string text(count, '\0');
        unsigned __int64 read = 0;
        EXPECT_TRUE(port.Read(&text[0], count, read));
        return text.substr(0, static_cast<size_t>(read));
    }

    CCommPort m_port;
};

TEST_F(CCommPortTest, OpensClosesReopensAndReportsAMissingPort)
{
    // Opening goes through CFile::Open, so the exception names the file "File".
    ExpectPayload(CatchWin([] { CCommPort port(L"COM9", 0); }), ERROR_FILE_NOT_FOUND, L"CreateFile", L"File");
    CCommPort& port = Connect("expect ONE; expect TWO");
    WriteText(port, "ONE");
    port.Close();
    port.Open(PortName().c_str(), 0);
    const HANDLE first = port.GetHandle();
    port.Open(PortName().c_str(), 0);
    // Open on an open port closes the old handle: either its value was reused or it is gone.
    DWORD flags = 0;
    EXPECT_TRUE(port.GetHandle() == first || !::GetHandleInformation(first, &flags));
    // Windows refuses a second exclusive open; Wine's serial driver does not enforce exclusive use.
    EXPECT_TRUE(CCommPort(PortName().c_str(), 0).IsCreated());
    WriteText(port, "TWO");
    EXPECT_EQ("ok", StopPeer());
    EXPECT_EQ("ONETWO", Received());
    ExpectPayload(CatchWin([&] { port.Open(L"COM9", 0); }), ERROR_FILE_NOT_FOUND, L"CreateFile", L"File");
    EXPECT_FALSE(port.IsCreated());
}

// The members whose failure no other test provokes (the others' call names are checked there).
TEST_F(CCommPortTest, MembersOnAClosedPortThrowUnderTheirOwnCallName)
{
    CCommPort port;
    COMMTIMEOUTS timeouts = {};
    COMMPROP properties = {};
    COMSTAT status = {};
    DWORD value = 0;
    const std::pair<const wchar_t*, std::function<void()>> calls[] = {
        {L"SetupComm", [&] { port.SetupComm(64, 64); }},
        {L"GetCommTimeouts", [&] { port.GetCommTimeouts(timeouts); }},
        {L"SetCommTimeouts", [&] { port.SetCommTimeouts(timeouts); }},
        {L"GetCommProperties", [&] { port.GetCommProperties(properties); }},
        {L"GetCommMask", [&] { port.GetCommMask(value); }},
        {L"SetCommMask", [&] { port.SetCommMask(EV_RXCHAR); }},
        {L"ClearCommError", [&] { port.ClearCommError(value, status); }},
        {L"ClearCommBreak", [&] { port.ClearCommBreak(); }},
        {L"PurgeComm", [&] { port.PurgeComm(PURGE_RXCLEAR); }},
        {L"TransmitCommChar", [&] { port.TransmitCommChar('x'); }},
        {L"WaitCommEvent", [&] { port.WaitCommEvent(value); }},
    };
    for (const auto& call : calls)
        ExpectPayload(CatchWin(call.second), ERROR_INVALID_HANDLE, call.first, L"CommPort");
}

TEST_F(CCommPortTest, ConfigurationRoundTrips)
{
    CCommPort& port = Connect("");
    DCB dcb = {};
    dcb.DCBlength = sizeof(dcb);
    port.GetCommState(dcb);
    ASSERT_TRUE(::BuildCommDCBW(L"baud=19200 parity=E data=7 stop=2 xon=on octs=on", &dcb));
    port.SetCommState(dcb);
    DCB back = {};
    back.DCBlength = sizeof(back);
    port.GetCommState(back);
    EXPECT_EQ(19200u, back.BaudRate);
    EXPECT_EQ(TWOSTOPBITS, back.StopBits);
    EXPECT_EQ(3u, back.fOutX + back.fInX + back.fOutxCtsFlow);
    // A Linux pseudo-terminal clears the size and parity bits of its termios: Wine reads back 8N.
    EXPECT_EQ(8 * 256 + NOPARITY, back.ByteSize * 256 + back.Parity);
    // Windows rejects 3 data bits with ERROR_INVALID_PARAMETER; Wine has no terminal setting for them.
    dcb.ByteSize = 3;
    ExpectPayload(CatchWin([&] { port.SetCommState(dcb); }), ERROR_NOT_SUPPORTED, L"SetCommState",
                  L"CommPort");
    const COMMTIMEOUTS timeouts = {50, 3, 700, 11, 900};
    COMMTIMEOUTS timeoutsBack = {};
    port.SetCommTimeouts(timeouts);
    port.GetCommTimeouts(timeoutsBack);
    EXPECT_EQ(0, std::memcmp(&timeouts, &timeoutsBack, sizeof(timeouts)));
    DWORD mask = 0;
    port.SetCommMask(EV_RXCHAR | EV_ERR);
    port.GetCommMask(mask);
    EXPECT_EQ(static_cast<DWORD>(EV_RXCHAR | EV_ERR), mask);
}

TEST_F(CCommPortTest, SynchronousReadsWithTimeouts)
{
    CCommPort& port = Connect("expect 'PING\\r'; sleep 0.3; send 'PONG\\r'; expect MORE; send abc");
    WriteText(port, "PING\r");
    // The answer comes after a delay; the read waits for the whole count within its total time-out.
    EXPECT_EQ("PONG\r", ReadText(port, 5));
    port.SetCommTimeouts({0, 0, 200, 0, 10000});
    const ULONGLONG start = ::GetTickCount64();
    EXPECT_EQ("", ReadText(port, 10));
    EXPECT_LT(::GetTickCount64() - start, 2000u); // not the 5 s set before
    // MAXDWORD interval and no totals: the read returns at once with what is queued.
    WriteText(port, "MORE");
    ASSERT_EQ(3u, WaitForInput(port, 3));
    port.SetCommTimeouts({MAXDWORD, 0, 0, 0, 10000});
    EXPECT_EQ("abc", ReadText(port, 100));
    EXPECT_EQ("", ReadText(port, 100));
}

TEST_F(CCommPortTest, MegabyteBothWays)
{
    const size_t size = 1024 * 1024;
    CCommPort& port = Connect("recv " + std::to_string(size) + "; burst " + std::to_string(size), 0, 10000);
    std::string sent(size, '\0');
    for (size_t i = 0; i < size; ++i)
        sent[i] = static_cast<char>(i % 251); // the peer's burst pattern
    WriteText(port, sent);
    EXPECT_TRUE(ReadText(port, size) == sent); // within the 10 s total time-out
    EXPECT_EQ("ok", StopPeer());
    EXPECT_TRUE(Received() == sent);
}

// Windows completes a timed-out overlapped read successfully with what it has; Wine's serial driver
// completes it with STATUS_TIMEOUT, which reaches the caller as ERROR_TIMEOUT.
TEST_F(CCommPortTest, OverlappedReadsCompleteOrAreCancelledOrTimeOut)
{
    CCommPort& port = Connect("expect 'GO\\r'; sleep 0.2; send DATA", FILE_FLAG_OVERLAPPED);
    for (const long expected : {0L, ERROR_OPERATION_ABORTED, ERROR_TIMEOUT})
    {
        port.SetCommTimeouts({0, 0, expected == ERROR_TIMEOUT ? 150u : 0u, 0, 10000});
        char buffer[5] = {};
        unsigned __int64 read = 0;
        COverlapped reading(NULL, TRUE);
        ASSERT_FALSE(port.Read(buffer, 4, read, &reading)); // the peer waits for GO
        EXPECT_FALSE(port.GetOverlappedResult(&reading, read, FALSE));
        if (expected == 0)
            WriteText(port, "GO\r", true);
        else if (expected == ERROR_OPERATION_ABORTED)
            port.CancelIo();
        ASSERT_EQ(WAIT_OBJECT_0, ::WaitForSingleObject(reading.hEvent, 5000));
        const auto collect = [&] { port.GetOverlappedResult(&reading, read, TRUE); };
        EXPECT_EQ(static_cast<DWORD>(expected),
                  expected ? CatchWin(collect).GetErrorCode() : (collect(), 0ul));
        EXPECT_STREQ(expected ? "" : "DATA", buffer);
    }
}

// Wine answers WaitCommEvent on a pseudo-terminal, which has no modem status, only for data already
// queued: otherwise a synchronous wait returns at once with no event and an overlapped one is aborted.
TEST_F(CCommPortTest, WaitCommEventSeesOnlyQueuedData)
{
    for (const bool overlapped : {false, true})
    {
        SCOPED_TRACE(overlapped ? "overlapped" : "synchronous");
        CCommPort& port = Connect("expect SEND; send X", overlapped ? FILE_FLAG_OVERLAPPED : 0);
        port.SetCommMask(EV_RXCHAR);
        DWORD mask = 0xFFFF;
        COverlapped waiting(NULL, TRUE);
        unsigned __int64 unused = 0;
        const auto wait = [&]
        {
            port.WaitCommEvent(mask, overlapped ? &waiting : NULL) ||
                port.GetOverlappedResult(&waiting, unused, TRUE);
        };
        EXPECT_EQ(overlapped ? ERROR_OPERATION_ABORTED : 0ul,
                  overlapped ? CatchWin(wait).GetErrorCode() : (wait(), 0ul));
        EXPECT_EQ(0u, overlapped ? 0 : mask);
        WriteText(port, "SEND", overlapped);
        ASSERT_EQ(1u, WaitForInput(port, 1));
        wait();
        EXPECT_EQ(static_cast<DWORD>(EV_RXCHAR), mask);
    }
}

// A pseudo-terminal has no modem lines: Wine's ioctls for DTR and the modem status fail there with
// ERROR_NOT_SUPPORTED, where a real port on Windows succeeds.
TEST_F(CCommPortTest, PurgeClearErrorTransmitCharAndEscapeFunctions)
{
    CCommPort& port = Connect("send abcdef; expect Z; send gh", 0, 300);
    port.EscapeCommFunction(SETBREAK);
    port.ClearCommBreak();
    ExpectPayload(CatchWin([&] { port.EscapeCommFunction(SETDTR); }), ERROR_NOT_SUPPORTED,
                  L"EscapeCommFunction", L"CommPort");
    DWORD errors = 0xFFFF;
    ExpectPayload(CatchWin([&] { port.GetCommModemStatus(errors); }), ERROR_NOT_SUPPORTED,
                  L"GetCommModemStatus", L"CommPort");
    ASSERT_EQ(6u, WaitForInput(port, 6));
    COMSTAT status = {};
    port.ClearCommError(errors, status);
    EXPECT_EQ(0u, errors + status.cbOutQue);
    port.PurgeComm(PURGE_RXCLEAR | PURGE_TXCLEAR);
    port.ClearCommError(errors, status);
    EXPECT_EQ(0u, status.cbInQue);
    // The peer answers only once it sees the character; the purged "abcdef" must not come first.
    port.TransmitCommChar('Z');
    EXPECT_EQ("gh", ReadText(port, 2));
    EXPECT_EQ("ok", StopPeer());
    EXPECT_EQ("Z", Received());
}

// Wine's synchronous read does not notice the hang-up and ends at its total time-out with nothing, as
// on a line without a peer; an overlapped read ends with ERROR_BROKEN_PIPE. Then the port is not ready.
TEST_F(CCommPortTest, PeerClosingDuringARead)
{
    for (const bool overlapped : {false, true})
    {
        SCOPED_TRACE(overlapped ? "overlapped" : "synchronous");
        CCommPort& port = Connect("expect GO; sleep 0.3; close", overlapped ? FILE_FLAG_OVERLAPPED : 0,
                                  overlapped ? 0 : 1500);
        char buffer[16];
        unsigned __int64 read = 0;
        COverlapped reading(NULL, TRUE);
        ASSERT_TRUE(!overlapped || !port.Read(buffer, sizeof(buffer), read, &reading)); // pending
        WriteText(port, "GO", overlapped);
        if (!overlapped)
            EXPECT_EQ("", ReadText(port, sizeof(buffer)));
        else if (::WaitForSingleObject(reading.hEvent, 10000) == WAIT_OBJECT_0)
            ExpectPayload(CatchWin([&] { port.GetOverlappedResult(&reading, read, TRUE); }),
                          ERROR_BROKEN_PIPE, L"GetOverlappedResult", L"File");
        else
            ADD_FAILURE() << "the overlapped read did not end";
        EXPECT_EQ("ok", StopPeer(false));
        DCB dcb = {};
        ExpectPayload(CatchWin([&] { port.GetCommState(dcb); }), ERROR_NOT_READY, L"GetCommState",
                      L"CommPort");
        ExpectPayload(CatchWin([&] { WriteText(port, "x", overlapped); }), ERROR_NOT_READY, L"WriteFile",
                      L"File");
    }
}

} // namespace
