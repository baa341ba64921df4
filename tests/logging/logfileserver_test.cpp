#include <ostrand/logging/LogFileServer.h>

#include "LogParser.h"

#include <cstring>
#include <thread>

using namespace ostrand;
using logtest::Strings;

namespace
{

// Each test gets its own channels and file prefix, at full detail, and leaves the server as it found it.
class CLogFileServerTest : public ::testing::Test
{
protected:
    CLogFileServerTest() { server.SetDetail(CLogFileServer::DetailFull); }
    ~CLogFileServerTest()
    {
        for (unsigned __int64 h : m_aHandles)
            server.CloseLogFile(h);
        server.SetDetail(m_eSaved);
        for (const std::wstring& name : logtest::FindFiles(m_strFolder + m_strPrefix + L"*"))
            ::DeleteFileW((m_strFolder + name).c_str());
    }
    unsigned __int64 Channel()
    {
        static unsigned __int64 next = 0x7000000000000000ull;
        m_aHandles.push_back(++next);
        return next;
    }
    std::wstring Prefix(int i = 0) const { return m_strPrefix + std::to_wstring(i); }
    // The blocks of the one log file made with prefix `i`, whose name must follow the pattern.
    Strings Logged(int i = 0) const
    {
        static const std::wregex name(L"-[0-9]{4}(\\.[0-9]{2}){2}-[0-9]{2}(\\.[0-9]{2}){2}\\.[0-9]{3}\\.log");
        const std::vector<std::wstring> files = logtest::FindFiles(m_strFolder + Prefix(i) + L"-*");
        if (files.size() != 1)
            return ADD_FAILURE() << files.size() << " files", Strings();
        EXPECT_TRUE(std::regex_match(files[0].substr(Prefix(i).size()), name)) << files[0];
        return logtest::Texts(logtest::ParseFile(m_strFolder + files[0]));
    }

    CLogFileServer& server = CLogFileServer::Ref();
    const CLogFileServer::LogFileDetail m_eSaved = server.GetDetail();
    const std::wstring m_strFolder = logtest::DebugFolder() + L"\\";
    const std::wstring m_strPrefix =
        L"srv-" + std::to_wstring(::GetCurrentProcessId()) + L"-" + std::to_wstring(::GetTickCount()) + L"-";
    std::vector<unsigned __int64> m_aHandles;
};

} // namespace

TEST_F(CLogFileServerTest, DetailLevelsAndPendingOperations)
{
    const unsigned __int64 h = Channel(), none = Channel();
    OVERLAPPED read = {}, write = {}, wait = {}, twice = {}, unknown = {};
    unsigned long mask = 0x81;
    char buffer[8] = {};
    server.SetDetail(CLogFileServer::DetailNone);
    EXPECT_FALSE(server.CreateLogFile(none, Prefix(1).c_str()));
    EXPECT_TRUE(logtest::FindFiles(m_strFolder + Prefix(1) + L"*").empty());
    EXPECT_FALSE(server.LogSentData(none, "x", 1, true)); // no log file: a no-op
    server.SetDetail(CLogFileServer::DetailNormal);
    ASSERT_TRUE(server.CreateLogFile(h, Prefix().c_str()));
    EXPECT_FALSE(server.LogText(h, false, L"unimportant"));
    EXPECT_TRUE(server.LogText(h, true, L"important %d", 1));
    EXPECT_TRUE(server.LogSentData(h, "A", 1, true));
    server.AddPendingWaitOperation(h, &mask, &wait);
    EXPECT_TRUE(server.CommitPendingOperation(&wait, 4)); // removed, not logged
    server.SetDetail(CLogFileServer::DetailNone);         // the file stays, nothing reaches it
    EXPECT_TRUE(server.LogFileExists(h));
    EXPECT_FALSE(server.LogReceivedData(h, "B", 1, true));
    EXPECT_FALSE(server.LogText(h, true, L"dropped"));
    server.SetDetail(CLogFileServer::DetailFull);
    EXPECT_TRUE(server.LogText(h, false, L"full"));
    server.AddPendingWaitOperation(h, &mask, &wait);
    mask = 0x84; // the mask is read when the wait completes
    EXPECT_TRUE(server.CommitPendingOperation(&wait, 4));
    EXPECT_FALSE(server.CommitPendingOperation(&unknown, 4));
    server.AddPendingReadOperation(h, buffer, sizeof(buffer), &read);
    std::memcpy(buffer, "12345678", 8);                     // the read fills the buffer later
    EXPECT_TRUE(server.CommitPendingOperation(&read, 100)); // more than the buffer: the buffer's size
    EXPECT_FALSE(server.CommitPendingOperation(&read, 1));  // already committed
    server.AddPendingWriteOperation(h, "WXYZ", 4, &write);
    EXPECT_TRUE(server.CommitPendingOperation(&write, 3));
    server.AddPendingReadOperation(h, buffer, sizeof(buffer), &twice); // replaced by the next one
    server.AddPendingWriteOperation(h, "abcd", 4, &twice);
    EXPECT_TRUE(server.CommitPendingOperation(&twice, 4));
    server.AddPendingWriteOperation(h, "lost", 4, &write); // removed by CloseLogFile ...
    EXPECT_TRUE(server.CloseLogFile(h));
    EXPECT_FALSE(server.CommitPendingOperation(&write, 4));
    ASSERT_TRUE(server.CreateLogFile(h, Prefix(1).c_str())); // ... also when the channel logs again
    EXPECT_FALSE(server.CommitPendingOperation(&write, 4));
    EXPECT_TRUE(server.CloseLogFile(h));
    EXPECT_TRUE(Logged(1).empty());
    EXPECT_EQ((Strings{"important 1", "sent A", "full",
                       "ASYNC WaitCommEvent(LPDWORD lpEvtMask) succeeded. *lpEvtMask=0x84.",
                       "received 12345678 async", "sent WXY async", "sent abcd async"}),
              Logged());
}

TEST_F(CLogFileServerTest, ClosingOneOfTwoAttachedHandlesKeepsTheFileOpen)
{
    const unsigned __int64 first = Channel(), second = Channel();
    ASSERT_TRUE(server.CreateLogFile(first, Prefix().c_str()));
    EXPECT_FALSE(server.Attach(second, Channel())); // no log file to share
    ASSERT_TRUE(server.Attach(second, first));
    EXPECT_TRUE(server.LogText(first, true, L"from first"));
    EXPECT_TRUE(server.CloseLogFile(first));
    EXPECT_FALSE(server.LogFileExists(first));
    EXPECT_TRUE(server.LogText(second, true, L"from second"));
    EXPECT_TRUE(server.CloseLogFile(second));
    EXPECT_EQ((Strings{"from first", "from second"}), Logged());
}

TEST_F(CLogFileServerTest, ConcurrentProducersLoseNothingAndKeepTheirOrder)
{
    const int kThreads = 8, kChannels = 4, kEntries = 20000;
    const auto tag = [](int t, int i) { return "<" + std::to_string(t) + ":" + std::to_string(i) + ">"; };
    const char* const kinds[] = {"", "sent ", "received "};
    unsigned __int64 channels[kChannels];
    for (int c = 0; c < kChannels; ++c)
        ASSERT_TRUE(server.CreateLogFile(channels[c] = Channel(), Prefix(c).c_str()));
    std::vector<int> failures(kThreads, 0);
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t)
        threads.emplace_back(
            [&, t]
            {
                const unsigned __int64 channel = channels[t % kChannels];
                for (int i = 0; i < kEntries; ++i)
                {
                    const std::string e = tag(t, i);
                    failures[size_t(t)] +=
                        !(i % 3 == 0   ? server.LogText(channel, true, L"%S", e.c_str())
                          : i % 3 == 1 ? server.LogSentData(channel, e.data(), e.size(), true)
                                       : server.LogReceivedData(channel, e.data(), e.size(), false));
                }
            });
    for (std::thread& t : threads)
        t.join();
    for (unsigned __int64 channel : channels)
        EXPECT_TRUE(server.CloseLogFile(channel));
    EXPECT_EQ(std::vector<int>(kThreads, 0), failures);

    for (int c = 0; c < kChannels; ++c)
    {
        std::vector<int> next(kThreads, 0);
        for (const std::string& s : Logged(c))
        {
            int t = -1;
            ASSERT_EQ(1, sscanf(s.substr(std::min(s.find('<'), s.size())).c_str(), "<%d:", &t)) << s;
            ASSERT_TRUE(t >= 0 && t < kThreads && t % kChannels == c) << s;
            const int n = next[size_t(t)]++; // each entry once, in order
            ASSERT_EQ(kinds[n % 3] + tag(t, n) + (n % 3 == 2 ? " async" : ""), s);
        }
        for (int t = c; t < kThreads; t += kChannels)
            EXPECT_EQ(kEntries, next[size_t(t)]) << "thread " << t;
    }
}
