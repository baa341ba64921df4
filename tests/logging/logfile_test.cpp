#include <ostrand/logging/LogFile.h>

#include "LogParser.h"

using namespace ostrand;
using logtest::ParsedBlock;
using logtest::Strings;

namespace
{

// A log file path of this process, absent at the start and removed at the end.
struct TempLog
{
    explicit TempLog(const wchar_t* name)
        : path(logtest::DebugFolder() + L"\\log-" + std::to_wstring(::GetCurrentProcessId()) + name)
    {
        ::DeleteFileW(path.c_str());
    }
    ~TempLog() { ::DeleteFileW(path.c_str()); }
    const std::wstring path;
};

} // namespace

TEST(CLogFileTest, DataBlocksRoundTripByteForByte)
{
    std::vector<std::vector<unsigned char>> sent;
    for (size_t size : {0, 1, 31, 32, 33, 100000, 256}) // the last: every byte value in order
        for (sent.emplace_back(size); size-- > 0;)
            sent.back()[size] =
                static_cast<unsigned char>(sent.size() == 7 ? size : (size * 2654435761u) >> 7);

    TempLog file(L"data.log");
    const unsigned long long before = logtest::NowKey();
    {
        CLogFile log;
        ASSERT_TRUE(log.Open(file.path.c_str()));
        for (size_t i = 0; i < sent.size(); ++i)
            (log.*(i % 2 == 0 ? &CLogFile::LogSentData : &CLogFile::LogReceivedData))(
                sent[i].data(), sent[i].size(), i % 3 != 0);
    }
    const unsigned long long after = logtest::NowKey();
    const std::vector<ParsedBlock> blocks = logtest::ParseFile(file.path);
    ASSERT_EQ(sent.size(), blocks.size());
    for (size_t i = 0; i < sent.size(); ++i)
    {
        SCOPED_TRACE("block " + std::to_string(i));
        EXPECT_EQ(i % 2 == 0 ? 'W' : 'R', blocks[i].kind);
        EXPECT_EQ(i % 3 != 0, blocks[i].sync);
        EXPECT_TRUE(sent[i] == blocks[i].data);
        EXPECT_TRUE(before <= blocks[i].time && blocks[i].time <= after) << blocks[i].time;
    }
}

TEST(CLogFileTest, TextEventsOfAnyLengthRoundTripAsUtf8)
{
    std::vector<std::wstring> wide = {L"", L"two\r\nlines, a bare\nline feed\r\n",
                                      L"Gr\u00FC\u00DFe \u2014 \u65E5\u672C \U0001F600", L""};
    Strings expected = {"", "two\r\nlines, a bare\nline feed\r\n",
                        "Gr\xC3\xBC\xC3\x9F"
                        "e \xE2\x80\x94 \xE6\x97\xA5\xE6\x9C\xAC \xF0\x9F\x98\x80",
                        ""};
    for (size_t i = 0; i < 100000; ++i) // the last text: 100,000 characters, some of them two bytes
    {
        wide.back() += i % 100 == 0 ? L'\u00E4' : wchar_t(L'a' + i % 26);
        expected.back() += i % 100 == 0 ? std::string("\xC3\xA4") : std::string(1, char('a' + i % 26));
    }
    const std::wstring longFormat = std::wstring(100000, L'f') + L"%d";
    TempLog file(L"text.log");
    {
        CLogFile log;
        ASSERT_TRUE(log.Open(file.path.c_str()));
        for (const std::wstring& text : wide)
            log.LogText(L"%ls", text.c_str());
        log.LogText(L"%d-%ls-%S-%04X", -12, L"w\u00E9", "narrow", 0xBEEF);
        log.LogText(longFormat.c_str(), 5);
    }
    expected.push_back("-12-w\xC3\xA9-narrow-BEEF");
    expected.push_back(std::string(100000, 'f') + "5");
    EXPECT_TRUE(expected == logtest::Texts(logtest::ParseFile(file.path)));
}

TEST(CLogFileTest, OpenFailsInAMissingFolderAndAppendsToAnExistingFile)
{
    TempLog file(L"append.log");
    const std::wstring missing = file.path + L"-missing\\x.log";
    {
        CLogFile log;
        EXPECT_FALSE(log.Open(missing.c_str()));
        log.LogText(L"first"); // closed: entries wait for the next Open, Close is harmless, also twice
        log.Close();
        log.Close();
        ASSERT_TRUE(log.Open(file.path.c_str()));
    }
    {
        CLogFile log;
        ASSERT_TRUE(log.Open(file.path.c_str()));
        log.LogText(L"second");
        ASSERT_TRUE(log.Open(file.path.c_str())); // drains the old worker into the file first
        log.LogText(L"third");
    }
    EXPECT_EQ((Strings{"first", "second", "third"}), logtest::Texts(logtest::ParseFile(file.path)));
}

TEST(CLogFileTest, FailedWriteLosesOnlyThatBlock)
{
    TempLog file(L"locked.log");
    CLogFile log;
    ASSERT_TRUE(log.Open(file.path.c_str()));
    log.LogText(L"before");
    for (int i = 0; i < 100 && logtest::ParseFile(file.path).empty(); ++i) // the worker wakes by itself
        ::Sleep(50);
    ASSERT_EQ(Strings{"before"}, logtest::Texts(logtest::ParseFile(file.path)));

    // A lock on the region after the end makes the worker's next write fail, as a failing disk would.
    const HANDLE h = ::CreateFileW(file.path.c_str(), GENERIC_READ, FILE_SHARE_READ | FILE_SHARE_WRITE, NULL,
                                   OPEN_EXISTING, 0, NULL);
    ASSERT_NE(INVALID_HANDLE_VALUE, h);
    OVERLAPPED at = {};
    at.Offset = ::GetFileSize(h, NULL);
    ASSERT_TRUE(::LockFileEx(h, LOCKFILE_EXCLUSIVE_LOCK | LOCKFILE_FAIL_IMMEDIATELY, 0, 1 << 20, 0, &at));
    log.LogText(L"lost");
    ::Sleep(1000); // several passes of the worker
    ::UnlockFileEx(h, 0, 1 << 20, 0, &at);
    ::CloseHandle(h);
    log.LogText(L"after");
    log.Close();
    // Wine keeps byte-range locks but does not check them on writes, so there the block gets through.
    const bool wine = ::GetProcAddress(::GetModuleHandleW(L"ntdll.dll"), "wine_get_version") != NULL;
    EXPECT_EQ((wine ? Strings{"before", "lost", "after"} : Strings{"before", "after"}),
              logtest::Texts(logtest::ParseFile(file.path)));
}
