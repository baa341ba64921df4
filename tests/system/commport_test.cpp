// CCommPort against a real serial peer: a pseudo-terminal linked as a COM port of the Wine prefix and
// driven by tests/peers/serial_peer.py. Where Wine's serial driver on a pseudo-terminal differs from
// Windows on a real port, the test checks what Wine does and says why.
#include <ostrand/platform.h>
#include <ostrand/system/CommPort.h>
#include <ostrand/system/Object.h>

#include "serial_peer_fixture.h"
#include "system_test_util.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

using ostrand::CCommPort;
using ostrand::COverlapped;
using systest::CatchWin;
using systest::ExpectPayload;

namespace
{

class CCommPortTest : public serialtest::SerialPeerTest
{
protected:
    // 115200 8N1 without flow control, and reads that wait up to `readTotal` ms for the whole count.
    static void Configure(CCommPort& port, DWORD readTotal = 5000)
    {
        port.SetupComm(65536, 65536);
        DCB dcb = {};
        dcb.DCBlength = sizeof(dcb);
        port.GetCommState(dcb);
        dcb.BaudRate = CBR_115200;
        dcb.ByteSize = 8;
        dcb.Parity = NOPARITY;
        dcb.StopBits = ONESTOPBIT;
        dcb.fBinary = TRUE;
        dcb.fParity = FALSE;
        dcb.fOutxCtsFlow = FALSE;
        dcb.fOutxDsrFlow = FALSE;
        dcb.fDtrControl = DTR_CONTROL_DISABLE;
        dcb.fRtsControl = RTS_CONTROL_DISABLE;
        dcb.fOutX = FALSE;
        dcb.fInX = FALSE;
        port.SetCommState(dcb);
        COMMTIMEOUTS timeouts = {};
        timeouts.ReadTotalTimeoutConstant = readTotal;
        timeouts.WriteTotalTimeoutConstant = 10000;
        port.SetCommTimeouts(timeouts);
    }

    // Waits until at least `count` bytes are queued for reading; returns the queued count.
    static DWORD WaitForInput(CCommPort& port, DWORD count, DWORD milliseconds = 5000)
    {
        const ULONGLONG end = ::GetTickCount64() + milliseconds;
        DWORD errors = 0;
        COMSTAT status = {};
        for (;;)
        {
            port.ClearCommError(errors, status);
            if (status.cbInQue >= count || ::GetTickCount64() >= end)
                return status.cbInQue;
            ::Sleep(5);
        }
    }

    static void WriteText(CCommPort& port, const std::string& text)
    {
        unsigned __int64 written = 0;
        ASSERT_TRUE(port.Write(text.data(), text.size(), written));
        ASSERT_EQ(text.size(), written);
    }

    static void WriteOverlapped(CCommPort& port, const std::string& text)
    {
        COverlapped writing(NULL, TRUE);
        unsigned __int64 written = 0;
        if (!port.Write(text.data(), text.size(), written, &writing))
        {
            ASSERT_TRUE(port.GetOverlappedResult(&writing, written, TRUE));
        }
        ASSERT_EQ(text.size(), written);
    }

    static std::string ReadText(CCommPort& port, size_t count)
    {
        std::string text(count, '\0');
        unsigned __int64 read = 0;
        EXPECT_TRUE(port.Read(&text[0], count, read));
        text.resize(static_cast<size_t>(read));
        return text;
    }
};

// Opening ------------------------------------------------------------------------------------------------

TEST_F(CCommPortTest, OpensClosesAndReopens)
{
    ASSERT_TRUE(StartPeer("expect ONE; expect TWO"));
    CCommPort empty;
    EXPECT_FALSE(empty.IsCreated());
    EXPECT_EQ(INVALID_HANDLE_VALUE, empty.GetHandle());

    CCommPort port(PortName().c_str(), 0);
    ASSERT_TRUE(port.IsCreated());
    Configure(port);
    WriteText(port, "ONE");
    port.Close();
    EXPECT_FALSE(port.IsCreated());

    port.Open(PortName().c_str(), 0);
    const HANDLE first = port.GetHandle();
    port.Open(PortName().c_str(), 0);
    ASSERT_TRUE(port.IsCreated());
    // Open on an open port closes the old handle: either its value was reused or it is gone.
    DWORD flags = 0;
    EXPECT_TRUE(port.GetHandle() == first || !::GetHandleInformation(first, &flags));
    WriteText(port, "TWO");
    EXPECT_EQ("ok", StopPeer());
    EXPECT_EQ("ONETWO", ReceivedText());
}

TEST_F(CCommPortTest, MissingPortThrowsCreateFileAndLeavesThePortEmpty)
{
    // Opening goes through CFile::Open, so the exception names the file "File".
    ExpectPayload(CatchWin([] { CCommPort port(L"COM9", 0); }), ERROR_FILE_NOT_FOUND, L"CreateFile", L"File");

    ASSERT_TRUE(StartPeer(""));
    CCommPort port(PortName().c_str(), FILE_FLAG_OVERLAPPED);
    ASSERT_TRUE(port.IsCreated());
    // The open port is closed before the new name is tried, so a failed Open leaves nothing open.
    ExpectPayload(CatchWin([&] { port.Open(L"COM9", 0); }), ERROR_FILE_NOT_FOUND, L"CreateFile", L"File");
    EXPECT_FALSE(port.IsCreated());
}

TEST_F(CCommPortTest, PortsAboveNineOpenOnlyInTheDeviceForm)
{
    ASSERT_TRUE(StartPeer("expect HI", 11));
    ExpectPayload(CatchWin([] { CCommPort port(L"COM11", 0); }), ERROR_FILE_NOT_FOUND, L"CreateFile",
                  L"File");
    CCommPort port(L"\\\\.\\COM11", 0);
    Configure(port);
    WriteText(port, "HI");
    EXPECT_EQ("ok", StopPeer());
}

TEST_F(CCommPortTest, SecondOpenOfAnExclusivePort)
{
    ASSERT_TRUE(StartPeer(""));
    CCommPort first(PortName().c_str(), 0);
    // Windows refuses the second exclusive open with ERROR_ACCESS_DENIED; Wine's serial driver does not
    // enforce exclusive use of a device, so the second open succeeds there.
    CCommPort second(PortName().c_str(), 0);
    EXPECT_TRUE(second.IsCreated());
    EXPECT_NE(first.GetHandle(), second.GetHandle());
}

TEST_F(CCommPortTest, MembersOnAClosedPortThrowTheSystemErrorUnderTheirOwnName)
{
    CCommPort port;
    DCB dcb = {};
    DWORD mask = 0;
    COMSTAT status = {};
    ExpectPayload(CatchWin([&] { port.GetCommState(dcb); }), ERROR_INVALID_HANDLE, L"GetCommState",
                  L"CommPort");
    ExpectPayload(CatchWin([&] { port.SetCommMask(EV_RXCHAR); }), ERROR_INVALID_HANDLE, L"SetCommMask",
                  L"CommPort");
    ExpectPayload(CatchWin([&] { port.ClearCommError(mask, status); }), ERROR_INVALID_HANDLE,
                  L"ClearCommError", L"CommPort");
    ExpectPayload(CatchWin([&] { port.PurgeComm(PURGE_RXCLEAR); }), ERROR_INVALID_HANDLE, L"PurgeComm",
                  L"CommPort");
    ExpectPayload(CatchWin([&] { port.WaitCommEvent(mask); }), ERROR_INVALID_HANDLE, L"WaitCommEvent",
                  L"CommPort");
}

// Configuration --------------------------------------------------------------------------------------------

TEST_F(CCommPortTest, ConfigurationRoundTrips)
{
    ASSERT_TRUE(StartPeer(""));
    CCommPort port(PortName().c_str(), 0);
    port.SetupComm(4096, 4096);

    DCB dcb = {};
    dcb.DCBlength = sizeof(dcb);
    port.GetCommState(dcb);
    dcb.BaudRate = CBR_19200;
    dcb.StopBits = TWOSTOPBITS;
    dcb.fOutX = TRUE;
    dcb.fInX = TRUE;
    dcb.fOutxCtsFlow = TRUE;
    dcb.ByteSize = 7;
    dcb.Parity = EVENPARITY;
    dcb.fParity = TRUE;
    port.SetCommState(dcb);
    DCB back = {};
    back.DCBlength = sizeof(back);
    port.GetCommState(back);
    EXPECT_EQ(19200u, back.BaudRate);
    EXPECT_EQ(TWOSTOPBITS, back.StopBits);
    EXPECT_TRUE(back.fOutX);
    EXPECT_TRUE(back.fInX);
    EXPECT_TRUE(back.fOutxCtsFlow);
    // A Linux pseudo-terminal keeps 8 data bits without parity whatever it is told (its termios setter
    // clears the size and parity bits), so Wine reads back 8N where a real port keeps 7E.
    EXPECT_EQ(8, back.ByteSize);
    EXPECT_EQ(NOPARITY, back.Parity);

    back.BaudRate = CBR_9600;
    back.StopBits = ONESTOPBIT;
    back.fOutX = FALSE;
    back.fInX = FALSE;
    back.fOutxCtsFlow = FALSE;
    port.SetCommState(back);
    port.GetCommState(dcb);
    EXPECT_EQ(9600u, dcb.BaudRate);
    EXPECT_EQ(ONESTOPBIT, dcb.StopBits);
    EXPECT_FALSE(dcb.fOutX);
    EXPECT_FALSE(dcb.fInX);
    EXPECT_FALSE(dcb.fOutxCtsFlow);

    COMMTIMEOUTS timeouts = {50, 3, 700, 11, 900};
    port.SetCommTimeouts(timeouts);
    COMMTIMEOUTS timeoutsBack = {};
    port.GetCommTimeouts(timeoutsBack);
    EXPECT_EQ(50u, timeoutsBack.ReadIntervalTimeout);
    EXPECT_EQ(3u, timeoutsBack.ReadTotalTimeoutMultiplier);
    EXPECT_EQ(700u, timeoutsBack.ReadTotalTimeoutConstant);
    EXPECT_EQ(11u, timeoutsBack.WriteTotalTimeoutMultiplier);
    EXPECT_EQ(900u, timeoutsBack.WriteTotalTimeoutConstant);

    port.SetCommMask(EV_RXCHAR | EV_TXEMPTY | EV_ERR);
    DWORD mask = 0;
    port.GetCommMask(mask);
    EXPECT_EQ(static_cast<DWORD>(EV_RXCHAR | EV_TXEMPTY | EV_ERR), mask);
    port.SetCommMask(0);
    port.GetCommMask(mask);
    EXPECT_EQ(0u, mask);

    COMMPROP properties = {};
    port.GetCommProperties(properties);
    EXPECT_EQ(static_cast<DWORD>(PST_RS232), properties.dwProvSubType);
    EXPECT_NE(0u, properties.dwSettableBaud & BAUD_115200);
}

TEST_F(CCommPortTest, InvalidStateThrowsSetCommState)
{
    ASSERT_TRUE(StartPeer(""));
    CCommPort port(PortName().c_str(), 0);
    DCB dcb = {};
    dcb.DCBlength = sizeof(dcb);
    port.GetCommState(dcb);
    const BYTE oldSize = dcb.ByteSize;
    dcb.ByteSize = 3;
    // Windows rejects the byte size with ERROR_INVALID_PARAMETER; Wine maps it to no terminal setting and
    // reports ERROR_NOT_SUPPORTED instead.
    ExpectPayload(CatchWin([&] { port.SetCommState(dcb); }), ERROR_NOT_SUPPORTED, L"SetCommState",
                  L"CommPort");
    DCB back = {};
    back.DCBlength = sizeof(back);
    port.GetCommState(back);
    EXPECT_EQ(oldSize, back.ByteSize);
}

// Synchronous transfers ------------------------------------------------------------------------------------

TEST_F(CCommPortTest, SynchronousCommandAndAnswerWithTimeouts)
{
    ASSERT_TRUE(StartPeer("expect 'PING\\r'; sleep 0.3; send 'PONG\\r'"));
    CCommPort port(PortName().c_str(), 0);
    Configure(port, 5000);
    WriteText(port, "PING\r");
    // The answer comes after a delay; the read waits for the whole count within its total time-out.
    EXPECT_EQ("PONG\r", ReadText(port, 5));

    // A silent peer: the total time-out ends the read with nothing.
    COMMTIMEOUTS timeouts = {0, 0, 200, 0, 10000};
    port.SetCommTimeouts(timeouts);
    EXPECT_EQ("", ReadText(port, 10));

    // MAXDWORD interval and no totals: return at once with what is queued.
    ASSERT_TRUE(StartPeer("send abc; hold"));
    port.Open(PortName().c_str(), 0);
    Configure(port);
    COMMTIMEOUTS immediate = {MAXDWORD, 0, 0, 0, 10000};
    port.SetCommTimeouts(immediate);
    ASSERT_EQ(3u, WaitForInput(port, 3));
    EXPECT_EQ("abc", ReadText(port, 100));
    EXPECT_EQ("", ReadText(port, 100));
}

TEST_F(CCommPortTest, MegabyteBothWays)
{
    const size_t size = 1024 * 1024;
    ASSERT_TRUE(StartPeer("recv " + std::to_string(size) + " 30; burst " + std::to_string(size)));
    CCommPort port(PortName().c_str(), 0);
    Configure(port, 10000);

    const std::vector<unsigned char> sent = serialtest::Pattern(size);
    unsigned __int64 written = 0;
    ASSERT_TRUE(port.Write(sent.data(), sent.size(), written));
    ASSERT_EQ(size, written);

    std::vector<unsigned char> got(size);
    size_t have = 0;
    while (have < size)
    {
        unsigned __int64 read = 0;
        ASSERT_TRUE(port.Read(&got[have], size - have, read));
        ASSERT_GT(read, 0u) << "the burst stopped after " << have << " bytes";
        have += static_cast<size_t>(read);
    }
    EXPECT_TRUE(got == sent);
    EXPECT_EQ("ok", StopPeer());
    EXPECT_TRUE(Received() == sent);
}

// Overlapped transfers -------------------------------------------------------------------------------------

TEST_F(CCommPortTest, OverlappedReadAndWrite)
{
    ASSERT_TRUE(StartPeer("expect 'GO\\r'; sleep 0.2; send DATA"));
    CCommPort port(PortName().c_str(), FILE_FLAG_OVERLAPPED);
    Configure(port, 5000);

    char buffer[4] = {};
    unsigned __int64 read = 0;
    COverlapped reading(NULL, TRUE);
    ASSERT_FALSE(port.Read(buffer, sizeof(buffer), read, &reading)); // the peer waits for GO
    EXPECT_FALSE(port.GetOverlappedResult(&reading, read, FALSE));

    WriteOverlapped(port, "GO\r");

    ASSERT_EQ(WAIT_OBJECT_0, ::WaitForSingleObject(reading.hEvent, 5000));
    ASSERT_TRUE(port.GetOverlappedResult(&reading, read, FALSE));
    EXPECT_EQ(4u, read);
    EXPECT_EQ("DATA", std::string(buffer, 4));
}

TEST_F(CCommPortTest, OverlappedReadCancelledOrTimedOut)
{
    ASSERT_TRUE(StartPeer(""));
    CCommPort port(PortName().c_str(), FILE_FLAG_OVERLAPPED);
    Configure(port, 0); // no total time-out: a read waits for its count

    char buffer[8];
    unsigned __int64 read = 0;
    COverlapped reading(NULL, TRUE);
    ASSERT_FALSE(port.Read(buffer, sizeof(buffer), read, &reading));
    port.CancelIo();
    ASSERT_EQ(WAIT_OBJECT_0, ::WaitForSingleObject(reading.hEvent, 5000));
    ExpectPayload(CatchWin([&] { port.GetOverlappedResult(&reading, read, TRUE); }), ERROR_OPERATION_ABORTED,
                  L"GetOverlappedResult", L"File");

    // Windows completes a timed-out overlapped read successfully with what it has; Wine's serial driver
    // completes it with STATUS_TIMEOUT, which reaches the caller as ERROR_TIMEOUT.
    COMMTIMEOUTS timeouts = {0, 0, 150, 0, 10000};
    port.SetCommTimeouts(timeouts);
    COverlapped again(NULL, TRUE);
    ASSERT_FALSE(port.Read(buffer, sizeof(buffer), read, &again));
    ASSERT_EQ(WAIT_OBJECT_0, ::WaitForSingleObject(again.hEvent, 5000));
    ExpectPayload(CatchWin([&] { port.GetOverlappedResult(&again, read, TRUE); }), ERROR_TIMEOUT,
                  L"GetOverlappedResult", L"File");
}

// Events ---------------------------------------------------------------------------------------------------

// Wine answers WaitCommEvent on a pseudo-terminal from the modem status, which a pseudo-terminal does not
// have: it reports EV_RXCHAR only for data already queued, and otherwise does not wait at all.
TEST_F(CCommPortTest, WaitCommEventSynchronous)
{
    ASSERT_TRUE(StartPeer("expect SEND; send X"));
    CCommPort port(PortName().c_str(), 0);
    Configure(port);
    port.SetCommMask(EV_RXCHAR);

    // Windows would block here until a character arrives; Wine returns at once with an empty mask.
    DWORD mask = 0xFFFFFFFF;
    EXPECT_TRUE(port.WaitCommEvent(mask));
    EXPECT_EQ(0u, mask);

    WriteText(port, "SEND");
    ASSERT_EQ(1u, WaitForInput(port, 1));
    mask = 0;
    EXPECT_TRUE(port.WaitCommEvent(mask));
    EXPECT_EQ(static_cast<DWORD>(EV_RXCHAR), mask);
    EXPECT_EQ("X", ReadText(port, 1));
}

TEST_F(CCommPortTest, WaitCommEventOverlapped)
{
    ASSERT_TRUE(StartPeer("expect SEND; send X"));
    CCommPort port(PortName().c_str(), FILE_FLAG_OVERLAPPED);
    Configure(port);
    port.SetCommMask(EV_RXCHAR);

    // Windows keeps this wait pending until a character arrives; Wine aborts it within milliseconds.
    DWORD mask = 0;
    COverlapped waiting(NULL, TRUE);
    unsigned __int64 unused = 0;
    if (!port.WaitCommEvent(mask, &waiting))
    {
        ASSERT_EQ(WAIT_OBJECT_0, ::WaitForSingleObject(waiting.hEvent, 5000));
        ExpectPayload(CatchWin([&] { port.GetOverlappedResult(&waiting, unused, TRUE); }),
                      ERROR_OPERATION_ABORTED, L"GetOverlappedResult", L"File");
    }
    else
        ADD_FAILURE() << "WaitCommEvent completed at once with mask " << mask;

    WriteOverlapped(port, "SEND");
    ASSERT_EQ(1u, WaitForInput(port, 1));

    COverlapped waiting2(NULL, TRUE);
    mask = 0;
    if (!port.WaitCommEvent(mask, &waiting2))
    {
        ASSERT_EQ(WAIT_OBJECT_0, ::WaitForSingleObject(waiting2.hEvent, 5000));
        EXPECT_TRUE(port.GetOverlappedResult(&waiting2, unused, TRUE));
    }
    EXPECT_EQ(static_cast<DWORD>(EV_RXCHAR), mask);
}

// Line control ---------------------------------------------------------------------------------------------

TEST_F(CCommPortTest, PurgeClearErrorAndTransmitChar)
{
    ASSERT_TRUE(StartPeer("send abcdef; expect Z; send gh"));
    CCommPort port(PortName().c_str(), 0);
    Configure(port, 300);

    ASSERT_EQ(6u, WaitForInput(port, 6));
    DWORD errors = 0xFFFFFFFF;
    COMSTAT status = {};
    port.ClearCommError(errors, status);
    EXPECT_EQ(0u, errors);
    EXPECT_EQ(6u, status.cbInQue);
    EXPECT_EQ(0u, status.cbOutQue);

    port.PurgeComm(PURGE_RXCLEAR | PURGE_TXCLEAR);
    port.ClearCommError(errors, status);
    EXPECT_EQ(0u, status.cbInQue);

    // The peer answers only once it sees the character; the purged "abcdef" must not come first.
    port.TransmitCommChar('Z');
    EXPECT_EQ("gh", ReadText(port, 2));
    EXPECT_EQ("ok", StopPeer());
    EXPECT_EQ("Z", ReceivedText());
}

TEST_F(CCommPortTest, BreakAndEscapeFunctions)
{
    ASSERT_TRUE(StartPeer(""));
    CCommPort port(PortName().c_str(), 0);
    Configure(port);
    ASSERT_TRUE(::SetCommBreak(port.GetHandle()));
    port.ClearCommBreak();
    port.EscapeCommFunction(SETBREAK);
    port.EscapeCommFunction(CLRBREAK);

    // A pseudo-terminal has no modem lines: Wine's ioctls for DTR and the modem status fail there with
    // ERROR_NOT_SUPPORTED, where a real port on Windows succeeds.
    ExpectPayload(CatchWin([&] { port.EscapeCommFunction(SETDTR); }), ERROR_NOT_SUPPORTED,
                  L"EscapeCommFunction", L"CommPort");
    DWORD modem = 0;
    ExpectPayload(CatchWin([&] { port.GetCommModemStatus(modem); }), ERROR_NOT_SUPPORTED,
                  L"GetCommModemStatus", L"CommPort");
}

// The peer hangs up ----------------------------------------------------------------------------------------

TEST_F(CCommPortTest, PeerClosingDuringASynchronousRead)
{
    ASSERT_TRUE(StartPeer("expect GO; sleep 0.3; close"));
    CCommPort port(PortName().c_str(), 0);
    Configure(port, 1500);
    WriteText(port, "GO");
    // Wine's synchronous read does not notice the hang-up: it ends at its total time-out with nothing,
    // as a read on a real line without a peer does. The port's own calls then fail with ERROR_NOT_READY.
    EXPECT_EQ("", ReadText(port, 16));
    EXPECT_EQ("ok", WaitPeer());
    DCB dcb = {};
    ExpectPayload(CatchWin([&] { port.GetCommState(dcb); }), ERROR_NOT_READY, L"GetCommState", L"CommPort");
    DWORD errors = 0;
    COMSTAT status = {};
    ExpectPayload(CatchWin([&] { port.ClearCommError(errors, status); }), ERROR_NOT_READY, L"ClearCommError",
                  L"CommPort");
    ExpectPayload(CatchWin([&] { WriteText(port, "x"); }), ERROR_NOT_READY, L"WriteFile", L"File");
}

TEST_F(CCommPortTest, PeerClosingDuringAnOverlappedRead)
{
    ASSERT_TRUE(StartPeer("expect GO; sleep 0.3; close"));
    CCommPort port(PortName().c_str(), FILE_FLAG_OVERLAPPED);
    Configure(port, 0);

    char buffer[16];
    unsigned __int64 read = 0;
    COverlapped reading(NULL, TRUE);
    ASSERT_FALSE(port.Read(buffer, sizeof(buffer), read, &reading));
    WriteOverlapped(port, "GO");

    ASSERT_EQ(WAIT_OBJECT_0, ::WaitForSingleObject(reading.hEvent, 10000));
    ExpectPayload(CatchWin([&] { port.GetOverlappedResult(&reading, read, TRUE); }), ERROR_BROKEN_PIPE,
                  L"GetOverlappedResult", L"File");
    EXPECT_EQ("ok", WaitPeer());
}

} // namespace
