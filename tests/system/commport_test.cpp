// Where Wine differs from Windows on a real port, the tests check what Wine does and say why.
#include "serial_peer_fixture.h"
#include "system_test_util.h"
#include <cstring>
#include <string>

using namespace ostrand;
using CCommPortTest = SerialPeerTest;

TEST_F(CCommPortTest, OpensReopensRoundTripsTheConfigurationAndReportsAMissingPort)
{
    CCommPort& port = Connect("expect ONE; expect TWO");
    WriteText("ONE");
    port.Close();
    port.Open(kPort, 0);
    const HANDLE first = port.GetHandle();
    port.Open(kPort, 0);
    DWORD value = 0; // the old handle was closed: either its value was reused or it is gone
    EXPECT_TRUE(port.GetHandle() == first || !::GetHandleInformation(first, &value));
    // Windows refuses a second exclusive open; Wine's serial driver does not enforce exclusive use.
    EXPECT_TRUE(CCommPort(kPort, 0).IsCreated());
    WriteText("TWO");
    DCB dcb = {}, back = {};
    port.GetCommState(dcb);
    ASSERT_TRUE(::BuildCommDCBW(L"baud=19200 parity=E data=7 stop=2 xon=on octs=on", &dcb));
    port.SetCommState(dcb);
    port.GetCommState(back);
    EXPECT_EQ(19200u, back.BaudRate);
    EXPECT_EQ(3u * 256 + TWOSTOPBITS, (back.fOutX + back.fInX + back.fOutxCtsFlow) * 256 + back.StopBits);
    // A Linux pseudo-terminal clears the size and parity bits of its termios: Wine reads back 8N.
    EXPECT_EQ(8 * 256 + NOPARITY, back.ByteSize * 256 + back.Parity);
    // Windows rejects 3 data bits with ERROR_INVALID_PARAMETER; Wine has no terminal setting for them.
    dcb.ByteSize = 3;
    ExpectWin([&] { port.SetCommState(dcb); }, ERROR_NOT_SUPPORTED, L"SetCommState", L"CommPort");
    COMMTIMEOUTS timeouts = {50, 3, 700, 11, 900}, timeoutsBack = {};
    port.SetCommTimeouts(timeouts);
    port.GetCommTimeouts(timeoutsBack);
    EXPECT_EQ(0, std::memcmp(&timeouts, &timeoutsBack, sizeof(timeouts)));
    port.SetCommMask(EV_RXCHAR | EV_ERR);
    port.GetCommMask(value);
    EXPECT_EQ(static_cast<DWORD>(EV_RXCHAR | EV_ERR), value);
    EXPECT_EQ("ok", StopPeer());
    EXPECT_EQ("ONETWO", Read(L"received"));
    ExpectWin([&] { port.Open(L"COM9", 0); }, ERROR_FILE_NOT_FOUND, L"CreateFile", L"File");
    EXPECT_FALSE(port.IsCreated());
}

TEST_F(CCommPortTest, SynchronousReadsWithTimeoutsAMegabyteBothWaysPurgeAndControl)
{
    CCommPort& port =
        Connect("expect 'PING\\r'; sleep 0.3; send 'PONG\\r'; expect MORE; send abc; recv 1048576; "
                "burst 1048576; expect GO; send abcdef; expect Z; send gh",
                0, 10000);
    WriteText("PING\r");
    EXPECT_EQ("PONG\r", ReadText(5)); // comes after a delay, within the total time-out
    port.SetCommTimeouts({0, 0, 200, 0, 10000});
    const ULONGLONG start = ::GetTickCount64();
    EXPECT_EQ("", ReadText(10));
    EXPECT_LT(::GetTickCount64() - start, 2000u); // not the 10 s set before
    WriteText("MORE");
    ASSERT_EQ(3u, WaitForInput(3));
    port.SetCommTimeouts({MAXDWORD, 0, 0, 0, 10000}); // returns at once with what is queued
    EXPECT_EQ("abc", ReadText(100));
    EXPECT_EQ("", ReadText(100));
    std::string sent;
    for (size_t i = 0; i < (1 << 20); ++i)
        sent += static_cast<char>(i % 251); // the peer's burst pattern
    port.SetCommTimeouts({0, 0, 10000, 0, 10000});
    WriteText(sent);
    EXPECT_TRUE(ReadText(sent.size()) == sent);
    port.SetCommTimeouts({0, 0, 300, 0, 10000});
    port.EscapeCommFunction(SETBREAK);
    port.ClearCommBreak();
    // A pseudo-terminal has no modem lines: Wine fails SETDTR there, where a real port on Windows succeeds.
    ExpectWin([&] { port.EscapeCommFunction(SETDTR); }, ERROR_NOT_SUPPORTED, L"EscapeCommFunction",
              L"CommPort");
    WriteText("GO");
    ASSERT_EQ(6u, WaitForInput(6));
    DWORD errors = 0xFFFF;
    COMSTAT status = {};
    port.ClearCommError(errors, status);
    EXPECT_EQ(0u, errors + status.cbOutQue);
    port.PurgeComm(PURGE_RXCLEAR | PURGE_TXCLEAR);
    port.ClearCommError(errors, status);
    EXPECT_EQ(0u, status.cbInQue);
    port.TransmitCommChar('Z'); // the peer answers only then; the purged "abcdef" must not come first
    EXPECT_EQ("gh", ReadText(2));
    EXPECT_EQ("ok", StopPeer());
    EXPECT_TRUE(Read(L"received") == "PING\rMORE" + sent + "GOZ");
}

TEST_F(CCommPortTest, OverlappedReadsCompleteOrAreCancelledOrTimeOut)
{
    CCommPort& port = Connect("expect 'GO\\r'; sleep 0.2; send DATA", FILE_FLAG_OVERLAPPED);
    char buffer[5] = {};
    unsigned __int64 read = 0;
    COverlapped reading(NULL, TRUE);
    ASSERT_FALSE(port.Read(buffer, 4, read, &reading)); // the peer waits for GO
    EXPECT_FALSE(port.GetOverlappedResult(&reading, read, FALSE));
    WriteText("GO\r", true);
    ASSERT_EQ(WAIT_OBJECT_0, ::WaitForSingleObject(reading.hEvent, 5000));
    EXPECT_TRUE(port.GetOverlappedResult(&reading, read, TRUE) && read == 4 && std::string(buffer) == "DATA");
    // Windows completes a timed-out overlapped read successfully with what it has; Wine with ERROR_TIMEOUT.
    port.SetCommTimeouts({0, 0, 150, 0, 10000});
    for (const DWORD expected : {DWORD(ERROR_OPERATION_ABORTED), DWORD(ERROR_TIMEOUT)})
    {
        ASSERT_FALSE(port.Read(buffer, 4, read, &reading));
        if (expected == ERROR_OPERATION_ABORTED)
            port.CancelIo();
        ExpectWin([&] { port.GetOverlappedResult(&reading, read, TRUE); }, expected, L"GetOverlappedResult",
                  L"File");
    }
}

// On a pseudo-terminal Wine answers WaitCommEvent only for queued data, else a synchronous wait returns at
// once and an overlapped one is aborted; a synchronous read misses a hang-up and times out with nothing, an
// overlapped one ends with ERROR_BROKEN_PIPE. Then the port is not ready.
TEST_F(CCommPortTest, WaitCommEventSeesOnlyQueuedDataAndThePeerClosesDuringARead)
{
    for (const bool overlapped : {false, true})
    {
        SCOPED_TRACE(overlapped ? "overlapped" : "synchronous");
        CCommPort& port = Connect("expect SEND; send X; expect GO; sleep 0.3; close",
                                  overlapped ? FILE_FLAG_OVERLAPPED : 0, overlapped ? 0 : 1500);
        port.SetCommMask(EV_RXCHAR);
        DWORD mask = 0xFFFF;
        COverlapped waiting(NULL, TRUE), reading(NULL, TRUE);
        unsigned __int64 read = 0;
        const auto wait = [&] {
            port.WaitCommEvent(mask, overlapped ? &waiting : NULL) ||
                port.GetOverlappedResult(&waiting, read, TRUE);
        };
        if (overlapped)
            ExpectWin(wait, ERROR_OPERATION_ABORTED, L"GetOverlappedResult", L"File");
        else
            EXPECT_EQ(0u, (wait(), mask));
        WriteText("SEND", overlapped);
        ASSERT_EQ(1u, WaitForInput(1));
        wait();
        EXPECT_EQ(static_cast<DWORD>(EV_RXCHAR), mask);
        port.PurgeComm(PURGE_RXCLEAR);
        char buffer[16];
        ASSERT_TRUE(!overlapped || !port.Read(buffer, sizeof(buffer), read, &reading)); // pending
        WriteText("GO", overlapped);
        if (!overlapped)
            EXPECT_EQ("", ReadText(sizeof(buffer)));
        else
        {
            ASSERT_EQ(WAIT_OBJECT_0, ::WaitForSingleObject(reading.hEvent, 10000));
            ExpectWin([&] { port.GetOverlappedResult(&reading, read, TRUE); }, ERROR_BROKEN_PIPE,
                      L"GetOverlappedResult", L"File");
        }
        EXPECT_EQ("ok", StopPeer(false));
        DCB dcb = {};
        ExpectWin([&] { port.GetCommState(dcb); }, ERROR_NOT_READY, L"GetCommState", L"CommPort");
        ExpectWin([&] { WriteText("x", overlapped); }, ERROR_NOT_READY, L"WriteFile", L"File");
    }
}
