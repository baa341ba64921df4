#include <ostrand/logging/LogFile.h>

#include <gtest/gtest.h>

#include "LogParser.h"
#include "TestFiles.h"

#include <string>
#include <vector>

using namespace ostrand;
using logtest::ParsedBlock;

namespace
{

std::vector<unsigned char> Pattern(size_t size, unsigned seed)
{
    std::vector<unsigned char> bytes(size);
    unsigned x = seed * 2654435761u + 1;
    for (unsigned char& b : bytes)
    {
        x = x * 1103515245u + 12345u;
        b = static_cast<unsigned char>(x >> 16);
    }
    return bytes;
}

// Reads `path` back with the independent parser; fails the test when the format is broken.
std::vector<ParsedBlock> ParseFile(const std::wstring& path)
{
    std::vector<ParsedBlock> blocks;
    const std::string error = logtest::ParseLog(logtest::ReadWholeFile(path), blocks);
    EXPECT_EQ("", error);
    return blocks;
}

void ExpectTimeWithin(const ParsedBlock& b, const SYSTEMTIME& before, const SYSTEMTIME& after)
{
    SYSTEMTIME t = {};
    t.wYear = WORD(b.year);
    t.wMonth = WORD(b.month);
    t.wDay = WORD(b.day);
    t.wHour = WORD(b.hour);
    t.wMinute = WORD(b.minute);
    t.wSecond = WORD(b.second);
    t.wMilliseconds = WORD(b.milliseconds);
    EXPECT_LE(logtest::ToTicks(before), logtest::ToTicks(t));
    EXPECT_GE(logtest::ToTicks(after), logtest::ToTicks(t));
}

} // namespace

TEST(CLogFileTest, DataBlocksOfEverySizeRoundTripByteForByte)
{
    logtest::TempFolder folder;
    const std::wstring path = folder.File(L"data.log");
    std::vector<std::vector<unsigned char>> sent;
    for (size_t size : {0, 1, 31, 32, 33, 64, 100000})
        sent.push_back(Pattern(size, unsigned(size)));
    std::vector<unsigned char> all(256);
    for (int i = 0; i < 256; ++i)
        all[size_t(i)] = static_cast<unsigned char>(i);
    sent.push_back(all);

    const SYSTEMTIME before = logtest::LocalNow();
    {
        CLogFile log;
        ASSERT_TRUE(log.Open(path.c_str()));
        for (size_t i = 0; i < sent.size(); ++i)
        {
            const bool sync = i % 3 != 0;
            if (i % 2 == 0)
                log.LogSentData(sent[i].data(), sent[i].size(), sync);
            else
                log.LogReceivedData(sent[i].data(), sent[i].size(), sync);
        }
        log.Close();
    }
    const SYSTEMTIME after = logtest::LocalNow();

    const std::vector<ParsedBlock> blocks = ParseFile(path);
    ASSERT_EQ(sent.size(), blocks.size());
    for (size_t i = 0; i < sent.size(); ++i)
    {
        SCOPED_TRACE("block " + std::to_string(i));
        EXPECT_EQ(i % 2 == 0 ? ParsedBlock::Sent : ParsedBlock::Received, blocks[i].kind);
        EXPECT_EQ(i % 3 != 0, blocks[i].sync);
        EXPECT_TRUE(sent[i] == blocks[i].data);
        ExpectTimeWithin(blocks[i], before, after);
    }
}

TEST(CLogFileTest, BlockTextIsExactlyTheDocumentedLayout)
{
    logtest::TempFolder folder;
    const std::wstring path = folder.File(L"layout.log");
    const unsigned char at[] = {0x41, 0x54, 0x0D, 0x0A};
    {
        CLogFile log;
        ASSERT_TRUE(log.Open(path.c_str()));
        log.LogSentData(at, sizeof(at), true);
        log.LogReceivedData(NULL, 0, false);
        log.LogText(L"n=%d", 7);
    }
    const std::string file = logtest::ReadWholeFile(path);
    // The time stamps vary; everything else is fixed.
    const std::string dump = " 41 54 0D 0A " + std::string(28 * 3, ' ') + "    AT..\r\n";
    size_t p = 0;
    auto expectLine = [&](const std::string& start, bool stamped)
    {
        const size_t end = file.find("\r\n", p);
        ASSERT_NE(std::string::npos, end);
        const std::string line = file.substr(p, end - p);
        EXPECT_EQ(start, line.substr(0, start.size()));
        if (stamped)
            EXPECT_EQ(std::string::npos, line.find_first_not_of("0123456789/:,. ", start.size())) << line;
        else
            EXPECT_EQ(start.size(), line.size());
        p = end + 2;
    };
    expectLine("SYNC WRITE request completed: 4 (0x4) bytes, ", true);
    EXPECT_EQ(dump, file.substr(p, dump.size()));
    p += dump.size();
    expectLine("", false);
    expectLine("ASYNC READ request completed: 0 (0x0) bytes, ", true);
    expectLine("", false);
    expectLine("Text Event, ", true);
    expectLine("n=7", false);
    expectLine("", false);
    EXPECT_EQ(file.size(), p);
}

TEST(CLogFileTest, Bin2TextAndBin2Hex)
{
    const std::vector<unsigned char> at = {0x41, 0x54, 0x0D, 0x0A};
    EXPECT_EQ(ustring(L" 41 54 0D 0A " + std::wstring(28 * 3, L' ') + L"    AT..\r\n"),
              CLogFile::Bin2Text(at, 32));
    EXPECT_EQ(ustring(L"41 54 0D 0A"), CLogFile::Bin2Hex(at.data(), at.size()));
    EXPECT_EQ(ustring(), CLogFile::Bin2Hex(at.data(), 0));
    EXPECT_EQ(ustring(), CLogFile::Bin2Text(std::vector<unsigned char>(), 32));

    // 33 bytes: a full line, then one byte followed by 31 empty cells.
    std::vector<unsigned char> b33(33, 0x20);
    b33[32] = 0x7E;
    const ustring text = CLogFile::Bin2Text(b33, 32);
    std::wstring first = L" ";
    for (int i = 0; i < 32; ++i)
        first += L"20 ";
    first += L"    " + std::wstring(32, L'.') + L"\r\n";
    EXPECT_EQ(ustring(first + L" 7E " + std::wstring(31 * 3, L' ') + L"    ~\r\n"), text);

    // Only 0x21..0x7E are shown as themselves; the width follows bytesPerLine.
    std::vector<unsigned char> all(256);
    for (int i = 0; i < 256; ++i)
        all[size_t(i)] = static_cast<unsigned char>(i);
    const ustring dump = CLogFile::Bin2Text(all, 256);
    const size_t column = 1 + 3 * 256 + 4;
    ASSERT_EQ(column + 256 + 2, dump.size());
    for (int i = 0; i < 256; ++i)
        EXPECT_EQ(i >= 0x21 && i <= 0x7E ? wchar_t(i) : L'.', dump[column + size_t(i)]) << i;
    EXPECT_EQ(ustring(L"FF"), ustring(dump.substr(1 + 3 * 255, 2)));
    // A line width of 0 would make no progress; it counts as 1.
    EXPECT_EQ(ustring(L" 41     A\r\n 54     T\r\n"), CLogFile::Bin2Text({0x41, 0x54}, 0));
}

TEST(CLogFileTest, TextEventsRoundTripAsUtf8)
{
    logtest::TempFolder folder;
    const std::wstring path = folder.File(L"text.log");
    const std::vector<std::wstring> texts = {
        L"plain",
        L"two\r\nlines and a bare\nline feed",
        L"Gr\u00FC\u00DFe \u2014 \u03A9\u03BC\u03AD\u03B3\u03B1 \u65E5\u672C \U0001F600",
        L"",
    };
    {
        CLogFile log;
        ASSERT_TRUE(log.Open(path.c_str()));
        for (const std::wstring& t : texts)
            log.LogText(L"%ls", t.c_str());
        log.LogText(L"%d-%ls-%S-%04X", -12, L"w\u00E9", "narrow", 0xBEEF);
    }
    const std::string file = logtest::ReadWholeFile(path);
    EXPECT_NE(std::string::npos, file.find("Gr\xC3\xBC\xC3\x9F"
                                           "e \xE2\x80\x94"));
    EXPECT_NE(std::string::npos, file.find("\xF0\x9F\x98\x80")); // a surrogate pair becomes one character
    const std::vector<ParsedBlock> blocks = ParseFile(path);
    ASSERT_EQ(texts.size() + 1, blocks.size());
    for (size_t i = 0; i < texts.size(); ++i)
    {
        EXPECT_EQ(ParsedBlock::Text, blocks[i].kind);
        EXPECT_EQ(texts[i], logtest::FromUtf8(blocks[i].text));
    }
    EXPECT_EQ(L"-12-w\u00E9-narrow-BEEF", logtest::FromUtf8(blocks.back().text));
}

TEST(CLogFileTest, LongTextsAreWrittenWhole)
{
    logtest::TempFolder folder;
    const std::wstring path = folder.File(L"long.log");
    std::wstring argument(100000, L'a');
    for (size_t i = 0; i < argument.size(); i += 100)
        argument[i] = L'\u00E4';
    const std::wstring format = std::wstring(100000, L'f') + L"%d";
    {
        CLogFile log;
        ASSERT_TRUE(log.Open(path.c_str()));
        log.LogText(L"<%ls>", argument.c_str());
        log.LogText(format.c_str(), 5);
    }
    const std::vector<ParsedBlock> blocks = ParseFile(path);
    ASSERT_EQ(2u, blocks.size());
    EXPECT_TRUE(L"<" + argument + L">" == logtest::FromUtf8(blocks[0].text));
    EXPECT_TRUE(std::wstring(100000, L'f') + L"5" == logtest::FromUtf8(blocks[1].text));
}

TEST(CLogFileTest, OpenAppendsToAnExistingFile)
{
    logtest::TempFolder folder;
    const std::wstring path = folder.File(L"append.log");
    const unsigned char one[] = {1, 2, 3}, two[] = {4, 5};
    {
        CLogFile log;
        ASSERT_TRUE(log.Open(path.c_str()));
        log.LogSentData(one, sizeof(one), true);
    }
    const std::string first = logtest::ReadWholeFile(path);
    ASSERT_FALSE(first.empty());
    {
        CLogFile log;
        ASSERT_TRUE(log.Open(path.c_str()));
        log.LogReceivedData(two, sizeof(two), false);
        // Opening again on the same object drains the old worker into the old file first.
        ASSERT_TRUE(log.Open(path.c_str()));
        log.LogText(L"third");
    }
    const std::string whole = logtest::ReadWholeFile(path);
    EXPECT_EQ(first, whole.substr(0, first.size()));
    const std::vector<ParsedBlock> blocks = ParseFile(path);
    ASSERT_EQ(3u, blocks.size());
    EXPECT_TRUE(std::vector<unsigned char>(one, one + 3) == blocks[0].data);
    EXPECT_TRUE(std::vector<unsigned char>(two, two + 2) == blocks[1].data);
    EXPECT_EQ(ParsedBlock::Received, blocks[1].kind);
    EXPECT_EQ("third", blocks[2].text);
}

TEST(CLogFileTest, MissingFolderFailsAndLeavesTheObjectClosed)
{
    logtest::TempFolder folder;
    const std::wstring missing = folder.File(L"no-such-folder\\x.log");
    const std::wstring good = folder.File(L"later.log");
    const unsigned char byte = 0x5A;
    CLogFile log;
    EXPECT_FALSE(log.Open(missing.c_str()));
    EXPECT_FALSE(logtest::PathExists(missing));
    // Closed: entries only queue, Close is harmless (also twice), and a later Open writes them.
    log.LogSentData(&byte, 1, true);
    log.Close();
    log.Close();
    ASSERT_TRUE(log.Open(good.c_str()));
    log.Close();
    const std::vector<ParsedBlock> blocks = ParseFile(good);
    ASSERT_EQ(1u, blocks.size());
    EXPECT_EQ(std::vector<unsigned char>(1, byte), blocks[0].data);
}

TEST(CLogFileTest, NamesWithoutSeparatorGoToDebugUnderDocuments)
{
    const std::wstring debug = logtest::DebugFolder();
    ASSERT_FALSE(logtest::DocumentsFolder().empty());
    logtest::RemoveFolder(debug);
    ASSERT_FALSE(logtest::PathExists(debug));
    const std::wstring name = L"bare-name-" + std::to_wstring(::GetCurrentProcessId()) + L".log";
    {
        CLogFile log;
        ASSERT_TRUE(log.Open(name.c_str()));
        log.LogText(L"in documents");
    }
    EXPECT_EQ(1u, ParseFile(debug + L"\\" + name).size());
    ::DeleteFileW((debug + L"\\" + name).c_str());

    // A forward slash makes the name a path that is used as given.
    logtest::TempFolder folder;
    std::wstring slashed = folder.File(L"slashed.log");
    for (wchar_t& c : slashed)
        if (c == L'\\')
            c = L'/';
    {
        CLogFile log;
        ASSERT_TRUE(log.Open(slashed.c_str()));
        log.LogText(L"as given");
    }
    EXPECT_EQ(1u, ParseFile(folder.File(L"slashed.log")).size());
}

TEST(CLogFileTest, WorkerWritesWithoutWaitingForClose)
{
    logtest::TempFolder folder;
    const std::wstring path = folder.File(L"live.log");
    CLogFile log;
    ASSERT_TRUE(log.Open(path.c_str()));
    log.LogText(L"soon");
    // The worker wakes every 100 ms; allow a loaded machine far more.
    std::vector<ParsedBlock> blocks;
    for (int i = 0; i < 100 && blocks.empty(); ++i)
    {
        ::Sleep(50);
        logtest::ParseLog(logtest::ReadWholeFile(path), blocks);
    }
    ASSERT_EQ(1u, blocks.size());
    EXPECT_EQ("soon", blocks[0].text);
}

TEST(CLogFileTest, FailedWriteLosesOnlyThatBlock)
{
    logtest::TempFolder folder;
    const std::wstring path = folder.File(L"locked.log");
    CLogFile log;
    ASSERT_TRUE(log.Open(path.c_str()));
    log.LogText(L"before");
    std::vector<ParsedBlock> blocks;
    for (int i = 0; i < 100 && blocks.empty(); ++i)
    {
        ::Sleep(50);
        logtest::ParseLog(logtest::ReadWholeFile(path), blocks);
    }
    ASSERT_EQ(1u, blocks.size());

    // Another handle locks the region after the end, so the writer's next write fails with a lock
    // violation, as it would on a full or failing disk.
    HANDLE h = ::CreateFileW(path.c_str(), GENERIC_READ, FILE_SHARE_READ | FILE_SHARE_WRITE, NULL,
                             OPEN_EXISTING, 0, NULL);
    ASSERT_NE(INVALID_HANDLE_VALUE, h);
    OVERLAPPED at = {};
    at.Offset = static_cast<DWORD>(logtest::ReadWholeFile(path).size());
    ASSERT_TRUE(::LockFileEx(h, LOCKFILE_EXCLUSIVE_LOCK | LOCKFILE_FAIL_IMMEDIATELY, 0, 1 << 20, 0, &at));
    // Wine keeps byte-range locks but does not check them on writes, so there the block gets through.
    // Whether this system checks them is probed on a scratch file.
    bool locksEnforced = false;
    {
        const std::wstring scratch = folder.File(L"probe.bin");
        HANDLE a = ::CreateFileW(scratch.c_str(), GENERIC_READ | GENERIC_WRITE,
                                 FILE_SHARE_READ | FILE_SHARE_WRITE, NULL, CREATE_ALWAYS, 0, NULL);
        HANDLE b = ::CreateFileW(scratch.c_str(), GENERIC_WRITE, FILE_SHARE_READ | FILE_SHARE_WRITE, NULL,
                                 OPEN_EXISTING, 0, NULL);
        ASSERT_NE(INVALID_HANDLE_VALUE, a);
        ASSERT_NE(INVALID_HANDLE_VALUE, b);
        OVERLAPPED zero = {};
        ASSERT_TRUE(::LockFileEx(a, LOCKFILE_EXCLUSIVE_LOCK | LOCKFILE_FAIL_IMMEDIATELY, 0, 16, 0, &zero));
        DWORD n = 0;
        locksEnforced = !::WriteFile(b, "x", 1, &n, NULL);
        ::CloseHandle(b);
        ::CloseHandle(a);
    }

    log.LogText(L"lost");
    ::Sleep(1000); // several passes of the worker
    ::UnlockFileEx(h, 0, 1 << 20, 0, &at);
    ::CloseHandle(h);
    log.LogText(L"after");
    log.Close();

    blocks = ParseFile(path);
    std::vector<std::string> texts;
    for (const ParsedBlock& b : blocks)
        texts.push_back(b.text);
    if (locksEnforced)
        EXPECT_EQ((std::vector<std::string>{"before", "after"}), texts);
    else
        EXPECT_EQ((std::vector<std::string>{"before", "lost", "after"}), texts);
}
