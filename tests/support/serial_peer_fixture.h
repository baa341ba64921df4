// The fixture of every serial-port test: it starts the serial peer (tests/peers/serial_peer.py) on the
// Linux side with a script, waits until the peer has linked its pseudo-terminal as a COM port of the
// Wine prefix, and afterwards stops it and hands back what the peer received.
//
// Wine runs a Unix program through CreateProcessW but hands it no pipes and no process handle, so the
// peer and the test talk through files in a work folder of the build tree: the script, the peer's
// status lines ("READY ...", "DONE ..."), the bytes it received, and a stop file. The build passes the
// Linux paths of python3, the peer and the work folders (OSTRAND_PYTHON3, OSTRAND_SERIAL_PEER,
// OSTRAND_SERIAL_PEER_DIR); Wine's drive Z: is the Linux root, which gives the Windows paths.
//
// Every peer run is bounded: the peer ends on its own time-out even when a test dies.
#pragma once

#include <ostrand/platform.h>

#include <gtest/gtest.h>

#include <string>
#include <vector>

#if !defined(OSTRAND_PYTHON3) || !defined(OSTRAND_SERIAL_PEER) || !defined(OSTRAND_SERIAL_PEER_DIR)
#error "the build must define OSTRAND_PYTHON3, OSTRAND_SERIAL_PEER and OSTRAND_SERIAL_PEER_DIR"
#endif

namespace serialtest
{

// The peer's burst pattern: byte i is i % 251.
inline std::vector<unsigned char> Pattern(size_t count)
{
    std::vector<unsigned char> bytes(count);
    for (size_t i = 0; i < count; ++i)
        bytes[i] = static_cast<unsigned char>(i % 251);
    return bytes;
}

class SerialPeerTest : public ::testing::Test
{
protected:
    // The port the peer links unless a test asks for another; the demo's simulated instrument uses COM5.
    static constexpr int kPort = 7;

    static std::wstring PortName(int port = kPort) { return L"COM" + std::to_wstring(port); }

    // Starts a peer on COM<port> running `script` (commands of serial_peer.py, one per line or
    // separated by ';') and waits until the port exists. The peer ends by itself after `timeout`
    // seconds.
    ::testing::AssertionResult StartPeer(const std::string& script, int port = kPort, double timeout = 60)
    {
        if (m_bRunning)
            StopPeer();
        const ::testing::TestInfo* info = ::testing::UnitTest::GetInstance()->current_test_info();
        m_strDir = std::string(OSTRAND_SERIAL_PEER_DIR) + "/" + info->test_suite_name() + "." + info->name() +
                   "." + std::to_string(++m_nRuns);
        const std::wstring dir = Windows(m_strDir);
        ::CreateDirectoryW(Windows(OSTRAND_SERIAL_PEER_DIR).c_str(), NULL);
        ::CreateDirectoryW(dir.c_str(), NULL);
        for (const wchar_t* name : {L"\\status", L"\\received", L"\\stop", L"\\script", L"\\peer.log"})
            ::DeleteFileW((dir + name).c_str());
        if (!WriteAll(dir + L"\\script", script))
            return ::testing::AssertionFailure() << "cannot write the peer's script in " << m_strDir;

        std::wstring command = Quote(Wide(OSTRAND_PYTHON3)) + L" " + Quote(Wide(OSTRAND_SERIAL_PEER)) +
                               L" --port com" + std::to_wstring(port) + L" --dir " + Quote(Wide(m_strDir)) +
                               L" --script " + Quote(Wide(m_strDir + "/script")) + L" --timeout " +
                               std::to_wstring(static_cast<int>(timeout));
        // The peer moves its own output into its work folder (peer.log): Wine hands a Unix program the
        // test's standard error whatever the startup record says.
        STARTUPINFOW startup = {};
        startup.cb = sizeof(startup);
        PROCESS_INFORMATION process = {};
        if (!::CreateProcessW(NULL, &command[0], NULL, NULL, FALSE, 0, NULL, NULL, &startup, &process))
            return ::testing::AssertionFailure() << "CreateProcessW of the peer failed: " << ::GetLastError();
        // A Unix process comes without handles; close whatever Wine did give.
        if (process.hThread)
            ::CloseHandle(process.hThread);
        if (process.hProcess)
            ::CloseHandle(process.hProcess);
        m_bRunning = true;

        const std::string status = WaitForStatus("READY", 20000);
        if (status.empty())
            return ::testing::AssertionFailure()
                   << "the peer did not report READY in " << m_strDir << "; status: " << Status()
                   << "; log: " << ReadAll(dir + L"\\peer.log");
        return ::testing::AssertionSuccess();
    }

    // Tells the peer to stop and waits for it: "ok", or the peer's failure ("fail: expect ... timed
    // out"), or "no answer".
    std::string StopPeer()
    {
        if (!m_bRunning)
            return "not running";
        WriteAll(Windows(m_strDir) + L"\\stop", "");
        return Finish(20000);
    }

    // Waits for a peer whose script ends the run itself ("close"); the result as for StopPeer.
    std::string WaitPeer(DWORD milliseconds = 20000)
    {
        return m_bRunning ? Finish(milliseconds) : "not running";
    }

    // Everything the peer has received so far.
    std::string ReceivedText() const { return ReadAll(Windows(m_strDir) + L"\\received"); }

    std::vector<unsigned char> Received() const
    {
        const std::string bytes = ReceivedText();
        return std::vector<unsigned char>(bytes.begin(), bytes.end());
    }

    void TearDown() override
    {
        if (m_bRunning)
            StopPeer();
    }

private:
    std::string Finish(DWORD milliseconds)
    {
        const std::string done = WaitForStatus("DONE ", milliseconds);
        m_bRunning = false;
        return done.empty() ? "no answer" : done.substr(5);
    }

    // The first status line that starts with `key`, or "" when none came in time.
    std::string WaitForStatus(const std::string& key, DWORD milliseconds) const
    {
        const ULONGLONG end = ::GetTickCount64() + milliseconds;
        for (;;)
        {
            const std::string status = Status();
            for (size_t at = 0; at < status.size();)
            {
                size_t eol = status.find('\n', at);
                if (eol == std::string::npos)
                    break; // a line still being written
                if (status.compare(at, key.size(), key) == 0)
                    return status.substr(at, eol - at);
                at = eol + 1;
            }
            if (::GetTickCount64() >= end)
                return std::string();
            ::Sleep(10);
        }
    }

    std::string Status() const { return ReadAll(Windows(m_strDir) + L"\\status"); }

    static std::string ReadAll(const std::wstring& path)
    {
        std::string text;
        HANDLE file =
            ::CreateFileW(path.c_str(), GENERIC_READ, FILE_SHARE_READ | FILE_SHARE_WRITE | FILE_SHARE_DELETE,
                          NULL, OPEN_EXISTING, 0, NULL);
        if (file == INVALID_HANDLE_VALUE)
            return text;
        char buffer[65536];
        DWORD n = 0;
        while (::ReadFile(file, buffer, sizeof(buffer), &n, NULL) && n > 0)
            text.append(buffer, n);
        ::CloseHandle(file);
        return text;
    }

    static bool WriteAll(const std::wstring& path, const std::string& text)
    {
        HANDLE file = ::CreateFileW(path.c_str(), GENERIC_WRITE, 0, NULL, CREATE_ALWAYS, 0, NULL);
        if (file == INVALID_HANDLE_VALUE)
            return false;
        DWORD n = 0;
        const BOOL ok =
            text.empty() || ::WriteFile(file, text.data(), static_cast<DWORD>(text.size()), &n, NULL);
        ::CloseHandle(file);
        return ok && n == text.size();
    }

    static std::wstring Wide(const std::string& s)
    {
        std::wstring w(s.size(), L'\0');
        const int n = ::MultiByteToWideChar(CP_UTF8, 0, s.data(), static_cast<int>(s.size()), &w[0],
                                            static_cast<int>(w.size()));
        w.resize(n > 0 ? n : 0);
        return w;
    }

    // The Windows form of a Linux path: drive Z: is the Linux root.
    static std::wstring Windows(const std::string& linuxPath)
    {
        std::wstring w = L"Z:" + Wide(linuxPath);
        for (wchar_t& c : w)
            if (c == L'/')
                c = L'\\';
        return w;
    }

    static std::wstring Quote(const std::wstring& s) { return L"\"" + s + L"\""; }

    std::string m_strDir;
    int m_nRuns = 0;
    bool m_bRunning = false;
};

} // namespace serialtest
