#include "LogParser.h"
#include <ostrand/logging/LogFile.h>

using namespace ostrand;
using logtest::ParseFile;

// Data and texts round trip with their times; entries logged while closed wait for Open, which appends.
TEST(CLogFileTest, BlocksRoundTripOpenAppendsAndAFailedWriteLosesOnlyItsBlock)
{
    const auto now = []
    {
        SYSTEMTIME t;
        ::GetLocalTime(&t);
        return ((((t.wYear * 100ull + t.wMonth) * 100 + t.wDay) * 100 + t.wHour) * 100 + t.wMinute) * 100000 +
               t.wSecond * 1000u + t.wMilliseconds;
    };
    // clang-format off
    std::vector<std::string> texts = {"", "two\r\nlines, a bare\nline feed\r\n",
                     "Gr\xC3\xBC\xC3\x9F" "e \xE2\x80\x94 \xE6\x97\xA5\xE6\x9C\xAC \xF0\x9F\x98\x80", ""};
    // clang-format on
    for (size_t i = 0; i < 100000; ++i) // the last: 100,000 characters, some of them two bytes in UTF-8
        texts.back() += i % 100 == 0 ? std::string("\xC3\xA4") : std::string(1, char('a' + i % 26));
    std::vector<std::string> expected;
    const std::wstring path = logtest::DebugFolder() + L"log-" + std::to_wstring(::GetCurrentProcessId());
    ::DeleteFileW(path.c_str());
    const unsigned long long before = now();
    {
        CLogFile log;
        ASSERT_TRUE(log.Open(path.c_str()));
        for (size_t size : {0, 1, 31, 32, 33, 100000, 256}) // the last: every byte value in order
        {
            std::string data(size, '\0');
            for (size_t j = 0; j < size; ++j)
                data[j] = char(size == 256 ? j : (j * 2654435761u) >> 7);
            const bool sent = expected.size() % 2 == 0, sync = expected.size() % 3 != 0;
            (log.*(sent ? &CLogFile::LogSentData : &CLogFile::LogReceivedData))(data.data(), size, sync);
            expected.push_back((sent ? "sent " : "received ") + data + (sync ? "" : " async"));
        }
        for (const std::string& text : texts) // logged as UTF-16, read back as UTF-8
        {
            std::wstring wide(text.size(), L'\0');
            wide.resize(size_t(::MultiByteToWideChar(CP_UTF8, 0, text.data(), int(text.size()), &wide[0],
                                                     int(wide.size()))));
            log.LogText(L"%ls", wide.c_str());
        }
        log.LogText(L"%d-%ls-%S-%04X", -12, L"w\u00E9", "narrow", 0xBEEF);
        log.LogText((std::wstring(100000, L'f') + L"%d").c_str(), 5);
    }
    expected.insert(expected.end(), texts.begin(), texts.end());
    expected.insert(expected.end(), {"-12-w\xC3\xA9-narrow-BEEF", std::string(100000, 'f') + "5", "first",
                                     "second", "third"});
    CLogFile log;
    EXPECT_FALSE(log.Open((path + L"-missing\\x.log").c_str()));
    log.LogText(L"first");
    log.Close(), log.Close();            // harmless, also twice
    ASSERT_TRUE(log.Open(path.c_str())); // appends
    log.LogText(L"second");
    ASSERT_TRUE(log.Open(path.c_str())); // drains the old worker into the file first
    log.LogText(L"third");
    for (int i = 0; i < 100 && ParseFile(path).size() < expected.size(); ++i) // the worker wakes by itself
        ::Sleep(50);
    ASSERT_TRUE(expected == ParseFile(path, before, now()));
    // A lock on the region after the end makes the worker's next write fail, as a failing disk would.
    const HANDLE h = ::CreateFileW(path.c_str(), GENERIC_READ, FILE_SHARE_READ | FILE_SHARE_WRITE, NULL,
                                   OPEN_EXISTING, 0, NULL);
    ASSERT_NE(INVALID_HANDLE_VALUE, h);
    OVERLAPPED at = {0, 0, {{::GetFileSize(h, NULL), 0}}, NULL};
    ASSERT_TRUE(::LockFileEx(h, LOCKFILE_EXCLUSIVE_LOCK | LOCKFILE_FAIL_IMMEDIATELY, 0, 1 << 20, 0, &at));
    log.LogText(L"lost"), ::Sleep(1000); // several passes of the worker
    ::UnlockFileEx(h, 0, 1 << 20, 0, &at);
    ::CloseHandle(h);
    log.LogText(L"after");
    log.Close();
    // Wine keeps byte-range locks but does not check them on writes, so there the block gets through.
    if (::GetProcAddress(::GetModuleHandleW(L"ntdll.dll"), "wine_get_version") != NULL)
        expected.push_back("lost");
    expected.push_back("after");
    EXPECT_TRUE(expected == ParseFile(path));
    ::DeleteFileW(path.c_str());
}
