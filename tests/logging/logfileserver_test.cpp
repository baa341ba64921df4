#include <ostrand/logging/LogFileServer.h>

#include <gtest/gtest.h>

#include "LogParser.h"
#include "TestFiles.h"

#include <cstring>
#include <set>
#include <thread>
#include <vector>

using namespace ostrand;
using logtest::ParsedBlock;

namespace
{

// Every test gets its own channel values and file prefix, and leaves the server as it found it.
class CLogFileServerTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        m_eSaved = CLogFileServer::Ref().GetDetail();
        CLogFileServer::Ref().SetDetail(CLogFileServer::DetailFull);
        const ::testing::TestInfo* info = ::testing::UnitTest::GetInstance()->current_test_info();
        const std::string name = info->name();
        m_strPrefix = L"srv-" + std::wstring(name.begin(), name.end()) + L"-" +
                      std::to_wstring(::GetCurrentProcessId());
        RemoveLogs();
    }

    void TearDown() override
    {
        for (unsigned __int64 h : m_aHandles)
            CLogFileServer::Ref().CloseLogFile(h);
        CLogFileServer::Ref().SetDetail(m_eSaved);
        RemoveLogs();
    }

    unsigned __int64 Channel()
    {
        static unsigned __int64 next = 0x7000000000000000ull;
        m_aHandles.push_back(++next);
        return next;
    }

    std::wstring Prefix(int i = 0) const { return m_strPrefix + L"-" + std::to_wstring(i); }

    std::vector<std::wstring> Files(int i = 0) const
    {
        return logtest::FindFiles(logtest::DebugFolder(), Prefix(i) + L"-*.log");
    }

    // The blocks of the one log file made with prefix `i`.
    std::vector<ParsedBlock> Blocks(int i = 0) const
    {
        std::vector<ParsedBlock> blocks;
        const std::vector<std::wstring> files = Files(i);
        EXPECT_EQ(1u, files.size());
        if (files.size() == 1)
        {
            const std::string error =
                logtest::ParseLog(logtest::ReadWholeFile(logtest::DebugFolder() + L"\\" + files[0]), blocks);
            EXPECT_EQ("", error);
        }
        return blocks;
    }

    void RemoveLogs() const
    {
        for (const std::wstring& name : logtest::FindFiles(logtest::DebugFolder(), m_strPrefix + L"-*"))
            ::DeleteFileW((logtest::DebugFolder() + L"\\" + name).c_str());
    }

    CLogFileServer::LogFileDetail m_eSaved = CLogFileServer::DetailNone;
    std::wstring m_strPrefix;
    std::vector<unsigned __int64> m_aHandles;
};

std::vector<unsigned char> Bytes(std::initializer_list<unsigned char> b)
{
    return std::vector<unsigned char>(b);
}

} // namespace

TEST_F(CLogFileServerTest, RefIsOneInstanceForAllThreads)
{
    std::vector<CLogFileServer*> seen(8, nullptr);
    std::vector<std::thread> threads;
    for (size_t i = 0; i < seen.size(); ++i)
        threads.emplace_back([&seen, i] { seen[i] = &CLogFileServer::Ref(); });
    for (std::thread& t : threads)
        t.join();
    for (CLogFileServer* s : seen)
        EXPECT_EQ(&CLogFileServer::Ref(), s);
}

TEST_F(CLogFileServerTest, FileIsNamedByPrefixAndLocalTime)
{
    CLogFileServer& server = CLogFileServer::Ref();
    const unsigned __int64 h = Channel();
    const SYSTEMTIME before = logtest::LocalNow();
    ASSERT_TRUE(server.CreateLogFile(h, Prefix().c_str()));
    const SYSTEMTIME after = logtest::LocalNow();
    EXPECT_TRUE(server.LogFileExists(h));
    const std::vector<std::wstring> files = Files();
    ASSERT_EQ(1u, files.size());
    SYSTEMTIME t = {};
    wchar_t tail[16] = {};
    const std::wstring rest = files[0].substr(Prefix().size());
    ASSERT_EQ(8, swscanf(rest.c_str(), L"-%4hu.%2hu.%2hu-%2hu.%2hu.%2hu.%3hu%ls", &t.wYear, &t.wMonth,
                         &t.wDay, &t.wHour, &t.wMinute, &t.wSecond, &t.wMilliseconds, tail));
    EXPECT_EQ(std::wstring(L".log"), tail);
    EXPECT_EQ(std::wstring(L"-0000.00.00-00.00.00.000.log").size(), rest.size()); // padded fields
    EXPECT_LE(logtest::ToTicks(before), logtest::ToTicks(t));
    EXPECT_GE(logtest::ToTicks(after), logtest::ToTicks(t));
}

TEST_F(CLogFileServerTest, DetailLevelsDecideWhatIsRecorded)
{
    CLogFileServer& server = CLogFileServer::Ref();
    const unsigned __int64 h = Channel(), none = Channel();
    const unsigned char b = 1;

    server.SetDetail(CLogFileServer::DetailNone);
    EXPECT_FALSE(server.CreateLogFile(none, Prefix(1).c_str()));
    EXPECT_TRUE(Files(1).empty());
    EXPECT_FALSE(server.LogFileExists(none));

    server.SetDetail(CLogFileServer::DetailNormal);
    ASSERT_TRUE(server.CreateLogFile(h, Prefix().c_str()));
    EXPECT_FALSE(server.LogText(h, false, L"unimportant"));
    EXPECT_TRUE(server.LogText(h, true, L"important %d", 1));
    EXPECT_TRUE(server.LogSentData(h, &b, 1, true));

    server.SetDetail(CLogFileServer::DetailNone); // the file stays, nothing reaches it
    EXPECT_TRUE(server.LogFileExists(h));
    EXPECT_FALSE(server.LogSentData(h, &b, 1, true));
    EXPECT_FALSE(server.LogReceivedData(h, &b, 1, true));
    EXPECT_FALSE(server.LogText(h, true, L"dropped"));

    server.SetDetail(CLogFileServer::DetailFull);
    EXPECT_TRUE(server.LogText(h, false, L"full"));
    EXPECT_TRUE(server.LogReceivedData(h, &b, 1, false));

    // A channel without a log file is a no-op at every level.
    EXPECT_FALSE(server.LogSentData(none, &b, 1, true));
    EXPECT_FALSE(server.LogText(none, true, L"x"));

    EXPECT_TRUE(server.CloseLogFile(h));
    EXPECT_FALSE(server.CloseLogFile(h));
    const std::vector<ParsedBlock> blocks = Blocks();
    ASSERT_EQ(4u, blocks.size());
    EXPECT_EQ("important 1", blocks[0].text);
    EXPECT_EQ(ParsedBlock::Sent, blocks[1].kind);
    EXPECT_EQ("full", blocks[2].text);
    EXPECT_EQ(ParsedBlock::Received, blocks[3].kind);
    EXPECT_FALSE(blocks[3].sync);
}

TEST_F(CLogFileServerTest, SecondCreateKeepsTheFirstLogFile)
{
    CLogFileServer& server = CLogFileServer::Ref();
    const unsigned __int64 h = Channel();
    ASSERT_TRUE(server.CreateLogFile(h, Prefix(0).c_str()));
    ASSERT_TRUE(server.CreateLogFile(h, Prefix(1).c_str()));
    EXPECT_TRUE(server.LogText(h, true, L"first"));
    EXPECT_TRUE(server.CloseLogFile(h));
    EXPECT_EQ(1u, Blocks(0).size());
    const std::vector<std::wstring> refused = Files(1);
    ASSERT_EQ(1u, refused.size()); // made and left empty
    EXPECT_EQ("", logtest::ReadWholeFile(logtest::DebugFolder() + L"\\" + refused[0]));
}

TEST_F(CLogFileServerTest, PendingOperationsAreLoggedOnCommit)
{
    CLogFileServer& server = CLogFileServer::Ref();
    const unsigned __int64 h = Channel(), other = Channel();
    ASSERT_TRUE(server.CreateLogFile(h, Prefix().c_str()));
    OVERLAPPED read = {}, write = {}, wait = {}, twice = {}, unknown = {}, orphan = {};
    unsigned char buffer[8] = {};
    const unsigned char sent[] = {0xDE, 0xAD, 0xBE, 0xEF};
    unsigned long mask = 0;

    EXPECT_FALSE(server.CommitPendingOperation(&unknown, 4));

    server.AddPendingReadOperation(h, buffer, sizeof(buffer), &read);
    std::memcpy(buffer, "\x01\x02\x03\x04\x05\x06\x07\x08", 8); // the read fills the buffer later
    EXPECT_TRUE(server.CommitPendingOperation(&read, 100));     // more than the buffer: the buffer's size
    EXPECT_FALSE(server.CommitPendingOperation(&read, 1));      // already committed

    server.AddPendingReadOperation(h, buffer, sizeof(buffer), &read);
    EXPECT_TRUE(server.CommitPendingOperation(&read, 0));

    server.AddPendingWriteOperation(h, sent, sizeof(sent), &write);
    EXPECT_TRUE(server.CommitPendingOperation(&write, 3));

    server.AddPendingWaitOperation(h, &mask, &wait);
    mask = 0x81;
    EXPECT_TRUE(server.CommitPendingOperation(&wait, 4));
    server.SetDetail(CLogFileServer::DetailNormal);
    server.AddPendingWaitOperation(h, &mask, &wait);
    EXPECT_TRUE(server.CommitPendingOperation(&wait, 4)); // removed, nothing logged
    EXPECT_FALSE(server.CommitPendingOperation(&wait, 4));

    // A second operation under one OVERLAPPED replaces the first.
    server.AddPendingReadOperation(h, buffer, sizeof(buffer), &twice);
    server.AddPendingWriteOperation(h, sent, sizeof(sent), &twice);
    EXPECT_TRUE(server.CommitPendingOperation(&twice, 4));

    // A channel without a log file records nothing.
    server.AddPendingReadOperation(other, buffer, sizeof(buffer), &orphan);
    EXPECT_FALSE(server.CommitPendingOperation(&orphan, 4));

    // CloseLogFile removes the channel's records.
    server.AddPendingWriteOperation(h, sent, sizeof(sent), &write);
    EXPECT_TRUE(server.CloseLogFile(h));
    EXPECT_FALSE(server.CommitPendingOperation(&write, 4));
    // ... even when the channel gets a log file again.
    server.SetDetail(CLogFileServer::DetailFull);
    ASSERT_TRUE(server.CreateLogFile(h, Prefix(1).c_str()));
    EXPECT_FALSE(server.CommitPendingOperation(&write, 4));
    EXPECT_TRUE(server.CloseLogFile(h));
    EXPECT_TRUE(Blocks(1).empty());

    const std::vector<ParsedBlock> blocks = Blocks();
    ASSERT_EQ(5u, blocks.size());
    EXPECT_EQ(ParsedBlock::Received, blocks[0].kind);
    EXPECT_FALSE(blocks[0].sync);
    EXPECT_EQ(Bytes({1, 2, 3, 4, 5, 6, 7, 8}), blocks[0].data);
    EXPECT_EQ(ParsedBlock::Received, blocks[1].kind);
    EXPECT_TRUE(blocks[1].data.empty());
    EXPECT_EQ(ParsedBlock::Sent, blocks[2].kind);
    EXPECT_FALSE(blocks[2].sync);
    EXPECT_EQ(Bytes({0xDE, 0xAD, 0xBE}), blocks[2].data);
    EXPECT_EQ(ParsedBlock::Text, blocks[3].kind);
    EXPECT_EQ("ASYNC WaitCommEvent(LPDWORD lpEvtMask) succeeded. *lpEvtMask=0x81.", blocks[3].text);
    EXPECT_EQ(ParsedBlock::Sent, blocks[4].kind);
    EXPECT_EQ(Bytes({0xDE, 0xAD, 0xBE, 0xEF}), blocks[4].data);
}

TEST_F(CLogFileServerTest, AttachedHandlesShareOneFile)
{
    CLogFileServer& server = CLogFileServer::Ref();
    const unsigned __int64 first = Channel(), second = Channel(), third = Channel();
    ASSERT_TRUE(server.CreateLogFile(first, Prefix(0).c_str()));
    ASSERT_TRUE(server.CreateLogFile(third, Prefix(1).c_str()));
    EXPECT_FALSE(server.Attach(second, Channel())); // no log file to share
    ASSERT_TRUE(server.Attach(second, first));
    EXPECT_TRUE(server.Attach(third, first)); // an existing entry is kept
    EXPECT_TRUE(server.LogText(first, true, L"from first"));
    EXPECT_TRUE(server.CloseLogFile(first));
    EXPECT_FALSE(server.LogFileExists(first));
    EXPECT_TRUE(server.LogText(second, true, L"from second"));
    EXPECT_TRUE(server.LogText(third, true, L"from third"));

    // Still open for the second handle: the writer holds it without write sharing.
    const std::wstring path = logtest::DebugFolder() + L"\\" + Files(0).at(0);
    HANDLE h = ::CreateFileW(path.c_str(), GENERIC_WRITE, FILE_SHARE_READ | FILE_SHARE_WRITE, NULL,
                             OPEN_EXISTING, 0, NULL);
    EXPECT_EQ(INVALID_HANDLE_VALUE, h);
    if (h != INVALID_HANDLE_VALUE)
        ::CloseHandle(h);

    EXPECT_TRUE(server.CloseLogFile(second));
    h = ::CreateFileW(path.c_str(), GENERIC_WRITE, FILE_SHARE_READ | FILE_SHARE_WRITE, NULL, OPEN_EXISTING, 0,
                      NULL);
    EXPECT_NE(INVALID_HANDLE_VALUE, h);
    if (h != INVALID_HANDLE_VALUE)
        ::CloseHandle(h);

    const std::vector<ParsedBlock> blocks = Blocks(0);
    ASSERT_EQ(2u, blocks.size());
    EXPECT_EQ("from first", blocks[0].text);
    EXPECT_EQ("from second", blocks[1].text);
    EXPECT_TRUE(server.CloseLogFile(third));
    ASSERT_EQ(1u, Blocks(1).size());
    EXPECT_EQ("from third", Blocks(1)[0].text);
}

TEST_F(CLogFileServerTest, ConcurrentProducersLoseNothingAndKeepTheirOrder)
{
    const int kThreads = 8, kChannels = 4, kEntries = 20000;
    CLogFileServer& server = CLogFileServer::Ref();
    std::vector<unsigned __int64> channels;
    for (int c = 0; c < kChannels; ++c)
    {
        channels.push_back(Channel());
        ASSERT_TRUE(server.CreateLogFile(channels.back(), Prefix(c).c_str()));
    }
    std::vector<int> failures(kThreads, 0);
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t)
        threads.emplace_back(
            [&, t]
            {
                const unsigned __int64 channel = channels[size_t(t % kChannels)];
                for (int i = 0; i < kEntries; ++i)
                {
                    // Thread, sequence number and a length that varies with both.
                    unsigned char entry[40] = {static_cast<unsigned char>(t)};
                    std::memcpy(entry + 1, &i, sizeof(i));
                    const size_t size = 5 + size_t((i + t) % 36);
                    for (size_t k = 5; k < size; ++k)
                        entry[k] = static_cast<unsigned char>(k * 7 + i);
                    const bool ok = (i % 3 == 0)   ? server.LogText(channel, true, L"t%d #%d", t, i)
                                    : (i % 3 == 1) ? server.LogSentData(channel, entry, size, true)
                                                   : server.LogReceivedData(channel, entry, size, false);
                    if (!ok)
                        ++failures[size_t(t)];
                }
            });
    for (std::thread& t : threads)
        t.join();
    for (int c = 0; c < kChannels; ++c)
        EXPECT_TRUE(server.CloseLogFile(channels[size_t(c)]));
    for (int f : failures)
        EXPECT_EQ(0, f);

    for (int c = 0; c < kChannels; ++c)
    {
        SCOPED_TRACE("channel " + std::to_string(c));
        std::vector<int> next(kThreads, 0);
        for (const ParsedBlock& b : Blocks(c))
        {
            int t = -1, i = -1;
            if (b.kind == ParsedBlock::Text)
            {
                ASSERT_EQ(2, sscanf(b.text.c_str(), "t%d #%d", &t, &i)) << b.text;
                ASSERT_EQ(0, i % 3);
            }
            else
            {
                ASSERT_GE(b.data.size(), 5u);
                t = b.data[0];
                std::memcpy(&i, &b.data[1], sizeof(i));
                ASSERT_EQ(5 + size_t((i + t) % 36), b.data.size());
                ASSERT_EQ(i % 3 == 1 ? ParsedBlock::Sent : ParsedBlock::Received, b.kind);
                for (size_t k = 5; k < b.data.size(); ++k)
                    ASSERT_EQ(static_cast<unsigned char>(k * 7 + i), b.data[k]);
            }
            ASSERT_TRUE(t >= 0 && t < kThreads && t % kChannels == c) << t;
            ASSERT_EQ(next[size_t(t)], i) << "thread " << t; // once each, in order
            ++next[size_t(t)];
        }
        for (int t = c; t < kThreads; t += kChannels)
            EXPECT_EQ(kEntries, next[size_t(t)]) << "thread " << t;
    }
}
