// ostrand-demo: the typical run of an instrument application.
//
//   ostrand-demo.exe [--port COMn | --tcp host:port]
//
// Opens the link to the instrument (a serial port, COM5 by default, or a TCP connection), configures
// it, logs every transfer into a log file of the channel, sends a few commands, shows an instrument
// error reply and a failing Win32 call as the library reports them, and prints the start of the log.
#include <ostrand/ostrand.h>

#include <cstdio>
#include <memory>
#include <string>
#include <vector>

using namespace ostrand;

namespace
{

// How the demo shows an error: every field of its CExInfo.
void Report(const CStdException& e)
{
    const CStdException::CExInfo info(e);
    ustring message = info.GetErrorMessage();
    message.trim_right(std::vector<wchar_t>{L'\r', L'\n'}); // system texts end with a line break
    std::wprintf(L"  error %ls from %ls: %ls\n", info.GetErrorCodeStr().c_str(), info.GetSource().c_str(),
                 message.c_str());
    std::wprintf(L"    call %ls, file %ls, line %u\n", info.GetFunction().c_str(), info.GetFileName().c_str(),
                 info.GetLine());
}

ustring Widen(const std::string& s)
{
    return ustring::MultiByteToWideChar(s, CP_UTF8, 0);
}

// One connection to the instrument. Every transfer is reported to the log file server under the
// channel's handle.
class Link
{
public:
    virtual ~Link() {}
    virtual unsigned __int64 Channel() const = 0;
    virtual ustring Name() const = 0;
    // The start of the log file's name: the name without characters a file name cannot hold.
    virtual ustring LogPrefix() const = 0;
    virtual void Send(const std::string& bytes) = 0;
    // Whatever has arrived (waits up to about two seconds for the first byte).
    virtual std::string Receive() = 0;
    // A configuration call that the link refuses, to show a Win32 failure.
    virtual void WrongConfiguration() = 0;

    std::string Query(const std::string& command)
    {
        Send(command + "\r\n");
        std::string reply;
        while (reply.find('\n') == std::string::npos)
        {
            const std::string part = Receive();
            if (part.empty())
                throw CCommException(__LINE__, L"demo", L"Query", L"no reply", Name().c_str());
            reply += part;
        }
        reply.erase(reply.find_last_not_of("\r\n") + 1);
        if (!reply.empty() && reply[0] == '{')
            throw CCommException(__LINE__, L"demo", L"Query", Widen(reply).c_str(), Name().c_str());
        return reply;
    }
};

class SerialLink : public Link
{
public:
    explicit SerialLink(const ustring& port) : m_strPort(port), m_Port(port.c_str(), FILE_FLAG_OVERLAPPED)
    {
        m_Port.SetupComm(4096, 4096);
        DCB dcb;
        m_Port.GetCommState(dcb);
        dcb.BaudRate = CBR_115200;
        dcb.ByteSize = 8;
        dcb.Parity = NOPARITY;
        dcb.StopBits = ONESTOPBIT;
        m_Port.SetCommState(dcb);
        // A read returns at once with what has arrived, possibly nothing; Receive polls. (The Windows
        // form "wait for the first byte up to a limit", MAXDWORD/MAXDWORD/limit, never ends early under
        // Wine on a pseudo-terminal.)
        COMMTIMEOUTS timeouts = {MAXDWORD, 0, 0, 0, 2000};
        m_Port.SetCommTimeouts(timeouts);
        m_Port.SetCommMask(EV_RXCHAR);
    }

    unsigned __int64 Channel() const override
    {
        return reinterpret_cast<unsigned __int64>(m_Port.GetHandle());
    }
    ustring Name() const override { return m_strPort; }
    ustring LogPrefix() const override
    {
        ustring prefix(m_strPort);
        prefix.removeForbiddenSymbols(L"\\.:/"); // "\\.\COM12" gives "COM12"
        return prefix;
    }

    void Send(const std::string& bytes) override
    {
        COverlapped ov;
        unsigned __int64 n = 0;
        if (m_Port.Write(bytes.data(), bytes.size(), n, &ov))
        {
            CLogFileServer::Ref().LogSentData(Channel(), bytes.data(), static_cast<size_t>(n), true);
            return;
        }
        CLogFileServer::Ref().AddPendingWriteOperation(Channel(), bytes.data(), bytes.size(), &ov);
        m_Port.GetOverlappedResult(&ov, n, TRUE);
        CLogFileServer::Ref().CommitPendingOperation(&ov, static_cast<size_t>(n));
    }

    std::string Receive() override
    {
        WaitForData();
        for (int attempt = 0; attempt < 200; ++attempt)
        {
            const std::string part = ReadAvailable();
            if (!part.empty())
                return part;
            ::Sleep(10);
        }
        return std::string();
    }

    void WrongConfiguration() override
    {
        DCB dcb;
        m_Port.GetCommState(dcb);
        dcb.ByteSize = 3; // no UART has three data bits
        m_Port.SetCommState(dcb);
    }

private:
    std::string ReadAvailable()
    {
        char buffer[256];
        COverlapped ov;
        unsigned __int64 n = 0;
        if (m_Port.Read(buffer, sizeof buffer, n, &ov))
        {
            if (n > 0)
                CLogFileServer::Ref().LogReceivedData(Channel(), buffer, static_cast<size_t>(n), true);
        }
        else
        {
            CLogFileServer::Ref().AddPendingReadOperation(Channel(), buffer, sizeof buffer, &ov);
            m_Port.GetOverlappedResult(&ov, n, TRUE);
            CLogFileServer::Ref().CommitPendingOperation(&ov, static_cast<size_t>(n));
        }
        return std::string(buffer, static_cast<size_t>(n));
    }

    // Waits briefly for EV_RXCHAR where the platform reports serial events. Wine on a pseudo-terminal
    // reports them only for data already queued (and otherwise ends the wait at once), so reading never
    // depends on this.
    void WaitForData()
    {
        COverlapped ov;
        unsigned long mask = 0;
        try
        {
            if (m_Port.WaitCommEvent(mask, &ov))
                return;
            unsigned __int64 n = 0;
            if (::WaitForSingleObject(ov.hEvent, 200) != WAIT_OBJECT_0)
            {
                m_Port.CancelIo();
                m_Port.GetOverlappedResult(&ov, n, TRUE);
                return;
            }
            if (m_Port.GetOverlappedResult(&ov, n, FALSE))
            {
                // Registered only once it has completed, so no record outlives `ov`.
                CLogFileServer::Ref().AddPendingWaitOperation(Channel(), &mask, &ov);
                CLogFileServer::Ref().CommitPendingOperation(&ov, sizeof mask);
            }
        }
        catch (const CWinException&)
        {
            // The platform ended the wait without an event; the read below does not need it.
        }
    }

    ustring m_strPort;
    CCommPort m_Port;
};

class TcpLink : public Link
{
public:
    TcpLink(const std::string& host, unsigned short port)
        : m_strName(Widen(host + ":" + std::to_string(port)))
    {
        m_Socket.Create(AF_INET, SOCK_STREAM, IPPROTO_TCP);
        m_Address = Address(host, port);
        m_Socket.ConnectLL(&m_Address, sizeof m_Address);
    }

    ~TcpLink() override
    {
        try
        {
            m_Socket.Shutdown(SD_SEND); // recorded in the channel's log
        }
        catch (const CStdException&)
        {
        }
    }

    unsigned __int64 Channel() const override { return static_cast<SOCKET>(m_Socket); }
    ustring Name() const override { return m_strName; }
    ustring LogPrefix() const override
    {
        ustring prefix;
        m_Socket.GetAddressString(reinterpret_cast<const sockaddr*>(&m_Address), sizeof m_Address, true,
                                  prefix);
        return prefix;
    }

    void Send(const std::string& bytes) override
    {
        CWSAOverlapped ov;
        unsigned __int64 n = 0;
        DWORD flags = 0;
        if (m_Socket.Send(bytes.data(), bytes.size(), n, 0, &ov))
        {
            CLogFileServer::Ref().LogSentData(Channel(), bytes.data(), static_cast<size_t>(n), true);
            return;
        }
        CLogFileServer::Ref().AddPendingWriteOperation(Channel(), bytes.data(), bytes.size(), &ov);
        m_Socket.GetOverlappedResult(&ov, n, TRUE, flags);
        CLogFileServer::Ref().CommitPendingOperation(&ov, static_cast<size_t>(n));
    }

    std::string Receive() override
    {
        fd_set r, w, e;
        FD_ZERO(&r);
        FD_ZERO(&w);
        FD_ZERO(&e);
        FD_SET(static_cast<SOCKET>(m_Socket), &r);
        if (CWSASocket::Select(r, w, e, 2000) == 0)
            return std::string();
        char buffer[256];
        CWSAOverlapped ov;
        unsigned __int64 n = 0;
        DWORD flags = 0;
        if (m_Socket.Recv(buffer, sizeof buffer, n, flags, &ov))
        {
            CLogFileServer::Ref().LogReceivedData(Channel(), buffer, static_cast<size_t>(n), true);
        }
        else
        {
            CLogFileServer::Ref().AddPendingReadOperation(Channel(), buffer, sizeof buffer, &ov);
            m_Socket.GetOverlappedResult(&ov, n, TRUE, flags);
            CLogFileServer::Ref().CommitPendingOperation(&ov, static_cast<size_t>(n));
        }
        return std::string(buffer, static_cast<size_t>(n));
    }

    void WrongConfiguration() override
    {
        // Connecting a second socket to a port where nobody listens.
        CWSASocket other;
        other.Create(AF_INET, SOCK_STREAM, IPPROTO_TCP);
        sockaddr_in nowhere = m_Address;
        nowhere.sin_port = ::htons(1);
        other.ConnectLL(&nowhere, sizeof nowhere);
    }

private:
    static sockaddr_in Address(const std::string& host, unsigned short port)
    {
        sockaddr_in a = {};
        a.sin_family = AF_INET;
        a.sin_port = ::htons(port);
        if (::inet_pton(AF_INET, host.c_str(), &a.sin_addr) != 1)
            throw CCommException(__LINE__, L"demo", L"inet_pton", L"not an IPv4 address",
                                 Widen(host).c_str());
        return a;
    }

    ustring m_strName;
    CWSASocket m_Socket;
    sockaddr_in m_Address;
};

// The newest log file of `prefix` in the documents folder's _Debug folder.
ustring NewestLogFile(const ustring& prefix)
{
    ustring folder;
    CFile::GetSpecialFolderPath(CSIDL_PERSONAL, folder);
    folder += L"\\_Debug\\";
    WIN32_FIND_DATAW found;
    HANDLE search = ::FindFirstFileW(ustring(folder + prefix + L"-*.log").c_str(), &found);
    if (search == INVALID_HANDLE_VALUE)
        return ustring();
    ustring newest;
    do
    {
        // The names carry the local time, so the greatest name is the newest file.
        if (newest.empty() || ustring(found.cFileName) > newest)
            newest = found.cFileName;
    } while (::FindNextFileW(search, &found));
    ::FindClose(search);
    return folder + newest;
}

void PrintStartOfLog(const ustring& path, size_t maxLines)
{
    CFile file(path.c_str(), GENERIC_READ, FILE_SHARE_READ | FILE_SHARE_WRITE, NULL, OPEN_EXISTING, 0);
    std::string text(static_cast<size_t>(file.GetLength()), '\0');
    unsigned __int64 n = 0;
    if (!text.empty())
        file.Read(&text[0], text.size(), n);
    size_t start = 0;
    for (size_t line = 0; line < maxLines && start < text.size(); ++line)
    {
        size_t end = text.find('\n', start);
        if (end == std::string::npos)
            end = text.size();
        std::string l = text.substr(start, end - start);
        if (!l.empty() && l.back() == '\r')
            l.pop_back();
        std::wprintf(L"  | %ls\n", Widen(l).c_str());
        start = end + 1;
    }
}

struct Options
{
    ustring port = L"COM5";
    std::string host;
    unsigned short tcpPort = 0;
};

bool ParseOptions(int argc, wchar_t** argv, Options& options)
{
    for (int i = 1; i < argc; ++i)
    {
        const ustring arg(argv[i]);
        if (arg == L"--port" && i + 1 < argc)
            options.port = argv[++i];
        else if (arg == L"--tcp" && i + 1 < argc)
        {
            const std::string value = ustring::WideCharToMultiByte(ustring(argv[++i]), CP_UTF8, 0);
            const size_t colon = value.rfind(':');
            if (colon == std::string::npos)
                return false;
            options.host = value.substr(0, colon);
            options.tcpPort = static_cast<unsigned short>(std::stoi(value.substr(colon + 1)));
        }
        else
            return false;
    }
    return true;
}

int Run(const Options& options)
{
    CLogFileServer& logs = CLogFileServer::Ref();
    logs.SetDetail(CLogFileServer::DetailFull);

    std::unique_ptr<Link> link;
    if (options.tcpPort != 0)
    {
        std::wprintf(L"Connecting to the instrument at %ls:%u over TCP\n", Widen(options.host).c_str(),
                     options.tcpPort);
        link.reset(new TcpLink(options.host, options.tcpPort));
    }
    else
    {
        std::wprintf(L"Opening %ls at 115200 baud, 8N1\n", options.port.c_str());
        link.reset(new SerialLink(options.port));
    }
    const ustring prefix = link->LogPrefix();
    if (!logs.CreateLogFile(link->Channel(), prefix.c_str()))
        std::wprintf(L"  (no log file could be created)\n");
    logs.LogText(link->Channel(), true, L"Demo session on %s", link->Name().c_str());

    const char* const commands[] = {"*IDN?", "CONF:RATE 10", "MEAS?",        "MEAS?",
                                    "MEAS?", "FETCH?",       "CONF:RATE 500"};
    for (const char* command : commands)
    {
        std::wprintf(L"> %hs\n", command);
        try
        {
            std::wprintf(L"< %ls\n", Widen(link->Query(command)).c_str());
        }
        catch (const CCommException& e)
        {
            Report(e);
        }
    }

    std::wprintf(L"A configuration the link refuses:\n");
    try
    {
        link->WrongConfiguration();
        std::wprintf(L"  (accepted)\n");
    }
    catch (const CWinException& e)
    {
        Report(e);
    }

    const unsigned __int64 channel = link->Channel();
    link.reset(); // a TCP link records its shutdown
    logs.CloseLogFile(channel);

    const ustring path = NewestLogFile(prefix);
    if (path.empty())
        return 1;
    std::wprintf(L"\nLog file: %ls\n", path.c_str());
    PrintStartOfLog(path, 16);
    return 0;
}

} // namespace

int wmain(int argc, wchar_t** argv)
{
    Options options;
    if (!ParseOptions(argc, argv, options))
    {
        std::fwprintf(stderr, L"usage: ostrand-demo [--port COMn | --tcp host:port]\n");
        return 2;
    }
    std::wprintf(L"ostrand %ls\n", GetLibraryVersion());
    WSADATA wsa;
    if (::WSAStartup(MAKEWORD(2, 2), &wsa) != 0)
        return 1;
    int status = 1;
    try
    {
        status = Run(options);
    }
    catch (const CStdException& e)
    {
        std::wprintf(L"The demo stopped:\n");
        Report(e);
    }
    ::WSACleanup();
    return status;
}
