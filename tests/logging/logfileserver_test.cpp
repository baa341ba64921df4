#include "LogParser.h"
#include <ostrand/logging/LogFileServer.h>
#include <atomic>
#include <cstring>
#include <memory>
#include <thread>

using namespace ostrand;
using logtest::Strings;

TEST(CLogFileServerTest, DetailPendingOperationsTwoHandlesAndConcurrentProducers)
{
    CLogFileServer& server = CLogFileServer::Ref();
    const unsigned __int64 ch = 0x7000000000000000ull;
    const std::wstring folder = logtest::DebugFolder(),
                       prefix = L"srv-" + std::to_wstring(::GetCurrentProcessId()) + L"-";
    const std::shared_ptr<void> cleanup(nullptr, [&, saved = server.GetDetail()](void*) { // every way out
        for (unsigned __int64 c = ch; c < ch + 10; ++c)
            server.CloseLogFile(c);
        server.SetDetail(saved);
        for (const std::wstring& name : logtest::FindFiles(folder + prefix + L"*"))
            ::DeleteFileW((folder + name).c_str());
    });
    const auto Prefix = [&](int i) { return prefix + std::to_wstring(i); };
    const auto Logged = [&](int i) // the blocks of the one log file made with prefix `i`, its name checked
    {
        static const std::wregex name(L"-[0-9]{4}(\\.[0-9]{2}){2}-[0-9]{2}(\\.[0-9]{2}){2}\\.[0-9]{3}\\.log");
        const std::vector<std::wstring> files = logtest::FindFiles(folder + Prefix(i) + L"-*");
        if (files.size() != 1)
            return ADD_FAILURE() << files.size() << " files", Strings();
        EXPECT_TRUE(std::regex_match(files[0].substr(Prefix(i).size()), name)) << files[0];
        return logtest::ParseFile(folder + files[0]);
    };
    const unsigned __int64 h = ch, none = ch + 1, second = ch + 2;
    OVERLAPPED read = {}, write = {}, wait = {}, twice = {}, unknown = {};
    unsigned long mask = 0x81;
    char buffer[8] = {};
    server.SetDetail(CLogFileServer::DetailNone); // no log file: a no-op
    EXPECT_FALSE(server.CreateLogFile(none, Prefix(1).c_str()) || server.LogSentData(none, "x", 1, true));
    server.SetDetail(CLogFileServer::DetailNormal);
    ASSERT_TRUE(server.CreateLogFile(h, Prefix(0).c_str()));
    EXPECT_TRUE(!server.LogText(h, false, L"unimportant") && server.LogText(h, true, L"important %d", 1) &&
                server.LogSentData(h, "A", 1, true));
    server.AddPendingWaitOperation(h, &mask, &wait);
    EXPECT_TRUE(server.CommitPendingOperation(&wait, 4)); // removed, not logged
    server.SetDetail(CLogFileServer::DetailNone);         // the file stays, nothing reaches it
    EXPECT_FALSE(server.LogReceivedData(h, "B", 1, true) || server.LogText(h, true, L"dropped"));
    server.SetDetail(CLogFileServer::DetailFull);
    EXPECT_TRUE(server.LogText(h, false, L"full"));
    server.AddPendingWaitOperation(h, &mask, &wait);
    mask = 0x84; // the mask is read when the wait completes
    EXPECT_TRUE(server.CommitPendingOperation(&wait, 4) && !server.CommitPendingOperation(&unknown, 4));
    server.AddPendingReadOperation(h, buffer, sizeof(buffer), &read);
    std::memcpy(buffer, "12345678", 8); // the read fills the buffer later; more than its size: its size
    EXPECT_TRUE(server.CommitPendingOperation(&read, 100) && !server.CommitPendingOperation(&read, 1));
    server.AddPendingWriteOperation(h, "WXYZ", 4, &write);
    server.AddPendingReadOperation(h, buffer, sizeof(buffer), &twice); // replaced by the next one
    server.AddPendingWriteOperation(h, "abcd", 4, &twice);
    EXPECT_TRUE(server.CommitPendingOperation(&write, 3) && server.CommitPendingOperation(&twice, 4));
    EXPECT_FALSE(server.Attach(second, none)); // no log file to share
    ASSERT_TRUE(server.Attach(second, h));
    // CloseLogFile drops the channel's pending operations (also once it logs again); the other handle logs
    // on.
    server.AddPendingWriteOperation(h, "lost", 4, &write);
    EXPECT_TRUE(server.CloseLogFile(h) && !server.CommitPendingOperation(&write, 4));
    EXPECT_TRUE(server.LogText(second, true, L"from second") && server.CloseLogFile(second));
    ASSERT_TRUE(server.CreateLogFile(h, Prefix(1).c_str()));
    EXPECT_TRUE(!server.CommitPendingOperation(&write, 4) && server.CloseLogFile(h) && Logged(1).empty());
    EXPECT_EQ((Strings{"important 1", "sent A", "full",
                       "ASYNC WaitCommEvent(LPDWORD lpEvtMask) succeeded. *lpEvtMask=0x84.",
                       "received 12345678 async", "sent WXY async", "sent abcd async", "from second"}),
              Logged(0));
    // Concurrency: entry i of thread t is "<t:i>" as a text, as sent SYNC or as received ASYNC, by i % 3.
    const int kThreads = 8, kChannels = 4, kEntries = 20000;
    const char* const kinds[][2] = {{"", ""}, {"sent ", ""}, {"received ", " async"}};
    std::vector<Strings> expected(kThreads);
    for (int c = 0; c < kChannels; ++c)
        ASSERT_TRUE(server.CreateLogFile(ch + c, Prefix(c + 2).c_str()));
    std::atomic<int> failures{0};
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t)
        threads.emplace_back(
            [&, t]
            {
                for (int i = 0; i < kEntries; ++i)
                {
                    const std::string e = "<" + std::to_string(t) + ":" + std::to_string(i) + ">";
                    expected[t].push_back(kinds[i % 3][0] + e + kinds[i % 3][1]);
                    const unsigned __int64 c = ch + t % kChannels;
                    failures += !(i % 3 == 0   ? server.LogText(c, true, L"%S", e.c_str())
                                  : i % 3 == 1 ? server.LogSentData(c, e.data(), e.size(), true)
                                               : server.LogReceivedData(c, e.data(), e.size(), false));
                }
            });
    for (std::thread& t : threads)
        t.join();
    EXPECT_EQ(0, failures.load());
    for (int c = 0; c < kChannels; ++c)
    {
        EXPECT_TRUE(server.CloseLogFile(ch + c));
        std::vector<Strings> got(kThreads); // each thread's entries all in its channel's file, once, in order
        for (const std::string& s : Logged(c + 2))
            got[std::stoul(s.substr(s.find('<') + 1)) % kThreads].push_back(s);
        for (int t = 0; t < kThreads; ++t)
            EXPECT_TRUE(got[t] == (t % kChannels == c ? expected[t] : Strings())) << c << " " << t;
    }
}
