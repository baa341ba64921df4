// Fixture of the CCommPort tests: runs tests/peers/serial_peer.py on COM7 of the Wine prefix (Z: is the
// Linux root). Wine gives the Unix peer no pipes nor process handle: the two talk through files in a folder.
#pragma once

#include "ChildProcess.h"
#include <ostrand/system/CommPort.h>
#include <ostrand/system/Object.h>
#include <gtest/gtest.h>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <utility>
#include <string>

class SerialPeerTest : public ::testing::Test
{
protected:
    static constexpr const wchar_t* kPort = L"COM7";
    static std::wstring Wide(const std::string& s) { return std::wstring(s.begin(), s.end()); } // ASCII only
    // Starts a peer running `script` (it ends by itself after 60 s) and opens its port; reads wait
    // `readTotal` ms.
    ostrand::CCommPort& Connect(const std::string& script, DWORD flags = 0, DWORD readTotal = 5000)
    {
        StopPeer();
        const ::testing::TestInfo* test = ::testing::UnitTest::GetInstance()->current_test_info();
        const std::wstring dir =
            Wide(OSTRAND_SERIAL_PEER_DIR "/") + Wide(test->test_suite_name()) + L"." + Wide(test->name());
        std::filesystem::remove_all(m_dir = L"Z:" + dir);
        std::filesystem::create_directories(m_dir);
        if (!(m_running = m_peer.Start({Wide(OSTRAND_PYTHON3), Wide(OSTRAND_SERIAL_PEER), L"--port", L"com7",
                                        L"--dir", dir, L"--timeout", L"60", L"-e", Wide(script)})))
            ADD_FAILURE() << "CreateProcessW failed: " << ::GetLastError();
        else if (WaitForStatus("READY").empty())
            ADD_FAILURE() << "the peer did not get ready: " << Read(L"peer.log");
        m_port.Open(kPort, flags);
        m_port.SetCommTimeouts({0, 0, readTotal, 0, 10000});
        return m_port;
    }
    // Stops the peer (`tell` false: waits for a script ending in "close"); "ok", "fail: why" or "no answer".
    std::string StopPeer(bool tell = true)
    {
        if (m_running && tell)
            std::ofstream((m_dir + L"/stop").c_str());
        const std::string done = std::exchange(m_running, false) ? WaitForStatus("DONE ") : "DONE ";
        return done.empty() ? "no answer" : done.substr(5);
    }
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
        std::ifstream file((m_dir + L"/" + name).c_str(), std::ios::binary);
        return std::string(std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>());
    }
    // The count queued for reading, after waiting up to 5 s for at least `count` bytes.
    DWORD WaitForInput(DWORD count)
    {
        DWORD errors = 0;
        COMSTAT status = {};
        for (const ULONGLONG end = ::GetTickCount64() + 5000;
             status.cbInQue < count && ::GetTickCount64() < end; ::Sleep(5))
            m_port.ClearCommError(errors, status);
        return status.cbInQue;
    }
    void WriteText(const std::string& text, bool overlapped = false)
    {
        ostrand::COverlapped writing(NULL, TRUE);
        unsigned __int64 written = 0;
        EXPECT_TRUE(m_port.Write(text.data(), text.size(), written, overlapped ? &writing : NULL) ||
                    m_port.GetOverlappedResult(&writing, written, TRUE));
        EXPECT_EQ(text.size(), written);
    }
    std::string ReadText(size_t count)
    {
        std::string text(count, '\0');
        unsigned __int64 read = 0;
        EXPECT_TRUE(m_port.Read(&text[0], count, read));
        return text.substr(0, static_cast<size_t>(read));
    }
    testsupport::ChildProcess m_peer;
    std::wstring m_dir;
    bool m_running = false;
    ostrand::CCommPort m_port;
};
