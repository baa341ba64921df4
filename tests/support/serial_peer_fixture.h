// Runs tests/peers/serial_peer.py with a script on COM7 of the Wine prefix (drive Z: is the Linux root). Wine
// gives the Unix peer no pipes and no process handle, so the two talk through files in a work folder.
#pragma once

#include "ChildProcess.h"
#include <gtest/gtest.h>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>

class SerialPeerTest : public ::testing::Test
{
protected:
    static std::wstring PortName() { return L"COM7"; }

    // Starts a peer running `script` and waits until the port exists; the peer ends by itself after 60 s.
    ::testing::AssertionResult StartPeer(const std::string& script)
    {
        StopPeer();
        const ::testing::TestInfo* test = ::testing::UnitTest::GetInstance()->current_test_info();
        const std::wstring dir =
            Wide(OSTRAND_SERIAL_PEER_DIR "/") + Wide(test->test_suite_name()) + L"." + Wide(test->name());
        std::filesystem::remove_all(m_dir = L"Z:" + dir);
        std::filesystem::create_directories(m_dir);
        if (!m_peer.Start({Wide(OSTRAND_PYTHON3), Wide(OSTRAND_SERIAL_PEER), L"--port", L"com7", L"--dir",
                           dir, L"--timeout", L"60", L"-e", Wide(script)}))
            return ::testing::AssertionFailure() << "CreateProcessW failed: " << ::GetLastError();
        m_running = true;
        if (WaitForStatus("READY").empty())
            return ::testing::AssertionFailure() << "the peer did not get ready: " << Read(L"peer.log");
        return ::testing::AssertionSuccess();
    }

    // Stops the peer (`tell` false: waits for a script ending in "close"); "ok", "fail: why" or "no answer".
    std::string StopPeer(bool tell = true)
    {
        if (m_running && tell)
            std::ofstream((m_dir + L"/stop").c_str());
        const std::string done = m_running ? WaitForStatus("DONE ") : "DONE ";
        m_running = false;
        return done.empty() ? "no answer" : done.substr(5);
    }

    std::string Received() const { return Read(L"received"); }

    void TearDown() override { StopPeer(); }

    // The status line that starts with `key` (the peer writes each line at once), or "" after 20 s.
    std::string WaitForStatus(const std::string& key) const
    {
        for (const ULONGLONG end = ::GetTickCount64() + 20000; ::GetTickCount64() < end; ::Sleep(10))
        {
            const std::string status = Read(L"status");
            const size_t at = status.find(key);
            if (at != std::string::npos)
                return status.substr(at, status.find('\n', at) - at);
        }
        return std::string();
    }

    std::string Read(const wchar_t* name) const
    {
        std::ostringstream text;
        text << std::ifstream((m_dir + L"/" + name).c_str(), std::ios::binary).rdbuf();
        return text.str();
    }

    static std::wstring Wide(const std::string& s) { return std::wstring(s.begin(), s.end()); } // ASCII only

    testsupport::ChildProcess m_peer;
    std::wstring m_dir;
    bool m_running = false;
};
