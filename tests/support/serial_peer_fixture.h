// The fixture of the serial-port tests: starts tests/peers/serial_peer.py with a script on COM7 of the
// Wine prefix and stops it. Wine gives the Unix peer no pipes and no process handle, so the two talk
// through files in a work folder (status, received, stop). The build passes the Linux paths
// OSTRAND_PYTHON3, OSTRAND_SERIAL_PEER and OSTRAND_SERIAL_PEER_DIR; Wine's drive Z: is the Linux root.
#pragma once

#include "ChildProcess.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>

namespace serialtest
{

class SerialPeerTest : public ::testing::Test
{
protected:
    static std::wstring PortName() { return L"COM7"; }

    // Starts a peer running `script` and waits until the port exists; the peer ends by itself after 60 s.
    ::testing::AssertionResult StartPeer(const std::string& script)
    {
        StopPeer();
        const ::testing::TestInfo* test = ::testing::UnitTest::GetInstance()->current_test_info();
        m_strDir = std::string(OSTRAND_SERIAL_PEER_DIR) + "/" + test->test_suite_name() + "." + test->name();
        std::filesystem::remove_all(Path(m_strDir));
        std::filesystem::create_directories(Path(m_strDir));
        if (!m_peer.Start({Wide(OSTRAND_PYTHON3), Wide(OSTRAND_SERIAL_PEER), L"--port", L"com7", L"--dir",
                           Wide(m_strDir), L"--timeout", L"60", L"-e", Wide(script)}))
            return ::testing::AssertionFailure() << "CreateProcessW failed: " << ::GetLastError();
        m_bRunning = true;
        if (WaitForStatus("READY").empty())
            return ::testing::AssertionFailure() << "the peer did not get ready: " << Read("peer.log");
        return ::testing::AssertionSuccess();
    }

    // Stops the peer (`tell` false: waits for a script that ends with "close"). Returns "ok", the
    // peer's failure ("fail: stopped during expect X"), "no answer", or "" when no peer runs.
    std::string StopPeer(bool tell = true)
    {
        if (m_bRunning && tell)
            std::ofstream(Path(m_strDir + "/stop").c_str());
        const std::string done = m_bRunning ? WaitForStatus("DONE ") : "DONE ";
        m_bRunning = false;
        return done.empty() ? "no answer" : done.substr(5);
    }

    std::string Received() const { return Read("received"); }

    void TearDown() override { StopPeer(); }

private:
    // The status line that starts with `key` (the peer writes each line at once), or "" after 20 s.
    std::string WaitForStatus(const std::string& key) const
    {
        for (const ULONGLONG end = ::GetTickCount64() + 20000; ::GetTickCount64() < end; ::Sleep(10))
        {
            const std::string status = Read("status");
            const size_t at = status.find(key);
            if (at != std::string::npos)
                return status.substr(at, status.find('\n', at) - at);
        }
        return std::string();
    }

    std::string Read(const char* name) const
    {
        std::ostringstream text;
        text << std::ifstream(Path(m_strDir + "/" + name).c_str(), std::ios::binary).rdbuf();
        return text.str();
    }

    static std::wstring Wide(const std::string& s)
    {
        std::wstring w(s.size(), L'\0');
        w.resize(::MultiByteToWideChar(CP_UTF8, 0, s.data(), static_cast<int>(s.size()), &w[0],
                                       static_cast<int>(w.size())));
        return w;
    }

    static std::wstring Path(const std::string& linuxPath) { return L"Z:" + Wide(linuxPath); }

    testsupport::ChildProcess m_peer;
    std::string m_strDir;
    bool m_bRunning = false;
};

} // namespace serialtest
