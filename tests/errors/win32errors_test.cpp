// CWinException::GetErrorMessage with the supplementary message file DATA\Win32Errors.txt beside
// ostrand.dll. The fixture owns the file and its folder and removes both after every test, so this
// executable runs serially: no other test may see the file.
#include <ostrand/errors/Exception.h>
#include <ostrand/system/File.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <cwchar>
#include <random>
#include <string>

using namespace ostrand;

namespace
{

// Codes without a system text (the fixture checks that in this process).
const DWORD kCodeA = 0x2000ABCD; // 536914893
const DWORD kCodeB = 0x2000ABCE; // 536914894
const DWORD kCodeC = 0x2000ABCF; // 536914895
const DWORD kCodeD = 0x2000ABD0; // 536914896
const DWORD kCodeTop = 0xE000ABCD;
const DWORD kCodeAllBits = 0xFFFFFFFF;
const DWORD kUntextedCodes[] = {kCodeA, kCodeB, kCodeC, kCodeD, kCodeTop, kCodeAllBits};

const char kBom[] = "\xFF\xFE";

std::string Utf16(const std::wstring& text)
{
    return std::string(reinterpret_cast<const char*>(text.data()), text.size() * sizeof(wchar_t));
}

std::string WithBom(const std::wstring& text)
{
    return std::string(kBom, 2) + Utf16(text);
}

bool SystemText(DWORD code, ustring& text)
{
    wchar_t* buffer = NULL;
    const DWORD n = ::FormatMessageW(
        FORMAT_MESSAGE_ALLOCATE_BUFFER | FORMAT_MESSAGE_IGNORE_INSERTS | FORMAT_MESSAGE_FROM_SYSTEM, NULL,
        code, MAKELANGID(LANG_NEUTRAL, SUBLANG_DEFAULT), reinterpret_cast<wchar_t*>(&buffer), 0, NULL);
    if (buffer != NULL)
    {
        text.assign(buffer, n);
        ::LocalFree(buffer);
    }
    return n != 0;
}

ustring Fallback(DWORD code)
{
    ustring text;
    text.sprintf(L"Unknown error: %d (0x%X).", code, code);
    return text;
}

// The lookup done plainly on the whole file at once. The library reads in 512-byte pieces and keeps
// its scan positions between them; both must agree on every file.
bool ReferenceLookup(const std::string& bytes, DWORD code, ustring& message)
{
    if (bytes.size() < 2 || bytes.compare(0, 2, kBom, 2) != 0)
        return false;
    ustring text((bytes.size() - 2) / 2, L'\0');
    if (!text.empty())
        std::memcpy(&text[0], bytes.data() + 2, text.size() * sizeof(wchar_t));
    text.removeForbiddenSymbols(L"\r");
    size_t pos = 0;
    for (;;)
    {
        while (pos < text.size() && text[pos] == L'\n')
            ++pos;
        const size_t comma = text.find(L',', pos);
        if (comma == ustring::npos)
            return false;
        const size_t lineFeed = text.find(L'\n', comma);
        if (lineFeed == ustring::npos)
            return false;
        ustring key(text.substr(pos, comma - pos));
        key.trim(L' ');
        const bool hex = key.size() >= 2 && key[0] == L'0' && (key[1] == L'x' || key[1] == L'X');
        if (std::wcstoul(key.c_str() + (hex ? 2 : 0), NULL, hex ? 16 : 10) == code)
        {
            message = text.substr(comma + 1, lineFeed - comma - 1);
            message.trim(L' ');
            message.replace(L"\\r", L"\r");
            message.replace(L"\\n", L"\n");
            message.replace(L"\\\"", L"\"");
            message.trim(L'"');
            return true;
        }
        pos = lineFeed + 1;
    }
}

class Win32ErrorsFileTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        for (DWORD code : kUntextedCodes)
        {
            ustring text;
            ASSERT_FALSE(SystemText(code, text))
                << std::hex << code << " has a system text: the cases need codes without one";
        }
        const HMODULE library = ::GetModuleHandleW(L"ostrand.dll");
        ASSERT_TRUE(library != NULL);
        ustring dllPath, drive, dir, name, ext;
        CFile::GetModuleFileNameW(library, dllPath, true);
        CFile::SplitPath(dllPath.c_str(), drive, dir, name, ext);
        CFile::MakePath(m_strFolder, drive.c_str(), dir.c_str(), L"DATA", NULL);
        m_strFile = m_strFolder + ustring(L"\\Win32Errors.txt");
        ::DeleteFileW(m_strFile.c_str()); // a leftover of an aborted run
        ASSERT_TRUE(::CreateDirectoryW(m_strFolder.c_str(), NULL) ||
                    ::GetLastError() == ERROR_ALREADY_EXISTS);
    }

    void TearDown() override
    {
        ::DeleteFileW(m_strFile.c_str());
        ::RemoveDirectoryW(m_strFolder.c_str());
        EXPECT_FALSE(CFile::FileExists(m_strFolder.c_str())) << "DATA must not outlive the test";
    }

    void Write(const std::string& bytes)
    {
        CFile file(m_strFile.c_str(), GENERIC_WRITE, 0, NULL, CREATE_ALWAYS, FILE_ATTRIBUTE_NORMAL);
        unsigned __int64 written = 0;
        if (!bytes.empty())
            file.Write(bytes.data(), bytes.size(), written);
        ASSERT_EQ(bytes.size(), written);
    }

    void WriteEntries(const std::wstring& text) { Write(WithBom(text)); }

    static bool Lookup(DWORD code, ustring& message)
    {
        return CWinException(0, NULL, NULL, code).GetErrorMessage(message);
    }

    // The message of `code`, or the fallback marker text when the lookup says it found nothing.
    static ustring Message(DWORD code)
    {
        ustring message;
        if (!Lookup(code, message))
        {
            EXPECT_EQ(Fallback(code), message);
            return L"<fallback>";
        }
        return message;
    }

    ustring m_strFolder;
    ustring m_strFile;
};

TEST_F(Win32ErrorsFileTest, KeysAreHexadecimalWithPrefixOrDecimal)
{
    WriteEntries(L"0x2000ABCD,hex\r\n"
                 L"  0X2000abce  ,upper-case prefix, blanks around the key\r\n"
                 L"536914895,decimal\r\n"
                 L"0x2000ABD0zz,only the leading digits count\r\n");
    EXPECT_EQ(ustring(L"hex"), Message(kCodeA));
    EXPECT_EQ(ustring(L"upper-case prefix, blanks around the key"), Message(kCodeB));
    EXPECT_EQ(ustring(L"decimal"), Message(kCodeC));
    EXPECT_EQ(ustring(L"only the leading digits count"), Message(kCodeD));

    // The same code written in decimal.
    WriteEntries(L"536914893,\"decimal\\nkey\"\n");
    EXPECT_EQ(ustring(L"decimal\nkey"), Message(kCodeA));

    // Without the prefix the digits are decimal: 2000ABCD reads as 2000.
    WriteEntries(L"2000ABCD,not hex\n");
    EXPECT_EQ(ustring(L"<fallback>"), Message(kCodeA));
}

TEST_F(Win32ErrorsFileTest, TextIsTrimmedUnescapedAndUnquoted)
{
    WriteEntries(L"0x2000ABCD,   \"first\\nsecond\"   \n"
                 L"0x2000ABCE,a,b,c\n"
                 L"0x2000ABCF,say \\\"hi\\\"\\rnow\n"
                 L"0x2000ABD0,\"only an opening quote\n");
    ustring message;
    EXPECT_TRUE(Lookup(kCodeA, message));
    EXPECT_EQ(ustring(L"first\nsecond"), message);
    EXPECT_EQ(ustring(L"a,b,c"), Message(kCodeB));
    EXPECT_EQ(ustring(L"say \"hi\"\rnow"), Message(kCodeC));
    EXPECT_EQ(ustring(L"only an opening quote"), Message(kCodeD));
}

TEST_F(Win32ErrorsFileTest, CarriageReturnsAndEmptyLinesAreIgnored)
{
    WriteEntries(L"\n\r\n\n0x2000\rABCD,x\ry\r\r\n\n\n\r\n0x2000ABCE,after empty lines\n");
    EXPECT_EQ(ustring(L"xy"), Message(kCodeA));
    EXPECT_EQ(ustring(L"after empty lines"), Message(kCodeB));
}

TEST_F(Win32ErrorsFileTest, OnlyLinesEndedByALineFeedCount)
{
    WriteEntries(L"0x2000ABCE,ended\n0x2000ABCD,last line without a line feed");
    EXPECT_EQ(ustring(L"ended"), Message(kCodeB));
    EXPECT_EQ(ustring(L"<fallback>"), Message(kCodeA));

    // A dangling odd byte is half a unit, not a line feed.
    Write(WithBom(L"0x2000ABCD,x") + "\n");
    EXPECT_EQ(ustring(L"<fallback>"), Message(kCodeA));
    Write(WithBom(L"0x2000ABCD,x\n") + "\n");
    EXPECT_EQ(ustring(L"x"), Message(kCodeA));
}

TEST_F(Win32ErrorsFileTest, LineWithoutCommaJoinsTheNextAndHidesIt)
{
    // The first two lines form one entry whose key reads the first line's leading digits (536914894).
    WriteEntries(L"536914894 has no comma\n"
                 L"0x2000ABCD,joined\n"
                 L"0x2000ABCF,after\n");
    EXPECT_EQ(ustring(L"joined"), Message(kCodeB));
    EXPECT_EQ(ustring(L"<fallback>"), Message(kCodeA));
    EXPECT_EQ(ustring(L"after"), Message(kCodeC));
}

TEST_F(Win32ErrorsFileTest, FileWithoutByteOrderMarkIsNotRead)
{
    const std::wstring entries = L"0x2000ABCD,hex\n536914894,decimal\n";
    Write(Utf16(entries));
    ustring message;
    EXPECT_FALSE(Lookup(kCodeA, message));
    EXPECT_EQ(ustring(L"Unknown error: 536914893 (0x2000ABCD)."), message);
    EXPECT_EQ(ustring(L"<fallback>"), Message(kCodeB));

    Write("\xFE\xFF" + Utf16(entries)); // big-endian mark
    EXPECT_EQ(ustring(L"<fallback>"), Message(kCodeA));
    Write("\xFF");
    EXPECT_EQ(ustring(L"<fallback>"), Message(kCodeA));

    WriteEntries(entries);
    EXPECT_EQ(ustring(L"hex"), Message(kCodeA));
    EXPECT_EQ(ustring(L"decimal"), Message(kCodeB));
}

TEST_F(Win32ErrorsFileTest, MissingOrUnreadableFileGivesTheFallback)
{
    ustring message;
    EXPECT_FALSE(Lookup(kCodeA, message));
    EXPECT_EQ(ustring(L"Unknown error: 536914893 (0x2000ABCD)."), message);
    EXPECT_FALSE(Lookup(kCodeTop, message));
    EXPECT_EQ(ustring(L"Unknown error: -536826931 (0xE000ABCD)."), message);

    // A folder where the file should be cannot be opened as a file.
    ASSERT_TRUE(::CreateDirectoryW(m_strFile.c_str(), NULL));
    EXPECT_FALSE(Lookup(kCodeA, message));
    EXPECT_EQ(ustring(L"Unknown error: 536914893 (0x2000ABCD)."), message);
    ::RemoveDirectoryW(m_strFile.c_str());
}

TEST_F(Win32ErrorsFileTest, SystemTextComesFirst)
{
    WriteEntries(L"2,from the file\n0x2000ABCD,from the file\n");
    ustring system;
    ASSERT_TRUE(SystemText(ERROR_FILE_NOT_FOUND, system));
    ustring message;
    EXPECT_TRUE(Lookup(ERROR_FILE_NOT_FOUND, message));
    EXPECT_EQ(system, message);
    EXPECT_EQ(ustring(L"from the file"), Message(kCodeA));
}

TEST_F(Win32ErrorsFileTest, FileIsReadAfreshForEveryLookup)
{
    WriteEntries(L"0x2000ABCD,before\n");
    EXPECT_EQ(ustring(L"before"), Message(kCodeA));
    WriteEntries(L"0x2000ABCD,after\n");
    EXPECT_EQ(ustring(L"after"), Message(kCodeA));
    ASSERT_TRUE(::DeleteFileW(m_strFile.c_str()));
    EXPECT_EQ(ustring(L"<fallback>"), Message(kCodeA));
}

TEST_F(Win32ErrorsFileTest, EntriesAcrossPieceBoundaries)
{
    // Lines of varying length, so that keys, commas and line feeds fall on every side of the 512-byte
    // pieces; every entry must be found with its own text.
    std::wstring text;
    for (int i = 0; i < 300; ++i)
    {
        wchar_t line[128];
        std::swprintf(line, 128, L"0x%X,\"entry %d %ls\"\r\n", 0x2000A000 + i, i,
                      std::wstring(i % 37, L'*').c_str());
        text += line;
    }
    WriteEntries(text);
    for (int i = 0; i < 300; i += 7)
    {
        const DWORD code = 0x2000A000 + i;
        ustring system;
        ASSERT_FALSE(SystemText(code, system));
        ustring expected;
        expected.sprintf(L"entry %d %s", i, std::wstring(i % 37, L'*').c_str());
        EXPECT_EQ(expected, Message(code)) << i;
    }
}

TEST_F(Win32ErrorsFileTest, MegabyteLines)
{
    const std::wstring big(1 << 20, L'A'); // 2 MiB
    // A line without a comma hides the entry after it, however long it is.
    WriteEntries(big + L"\n0x2000ABCD,hidden\n0x2000ABCE,after\n");
    EXPECT_EQ(ustring(L"<fallback>"), Message(kCodeA));
    EXPECT_EQ(ustring(L"after"), Message(kCodeB));

    // A text of a megabyte.
    WriteEntries(L"0x2000ABCD," + big + L"\n");
    EXPECT_EQ(ustring(big), Message(kCodeA));

    // Megabytes without a line feed: the comma is found at once, the line never ends.
    WriteEntries(L"0x2000ABCD," + big);
    EXPECT_EQ(ustring(L"<fallback>"), Message(kCodeA));

    // Many lines without any comma.
    std::wstring lines;
    while (lines.size() < (1u << 20))
        lines += L"0x2000ABCD no comma\r\n";
    WriteEntries(lines);
    EXPECT_EQ(ustring(L"<fallback>"), Message(kCodeA));
}

// Files of any content: every lookup ends with a message, the fallback exactly when nothing was found,
// and agrees with the plain whole-file reading.
TEST_F(Win32ErrorsFileTest, RandomFilesAlwaysEndWithAMessage)
{
    const wchar_t* const keys[] = {
        L"0x2000ABCD", L"536914894", L"0X2000abcf", L" 0x2000ABD0 ", L"junk",        L"",
        L"0x",         L"-1",        L"4294967295", L"99999999999",  L"0x0x2000ABCD"};
    const wchar_t textUnits[] = L"a ,\"\\nr\r\n";
    const wchar_t* const ends[] = {L"\n", L"\r\n", L"", L"\n\n", L"\r"};
    const DWORD codes[] = {kCodeA, kCodeB, kCodeC, kCodeD, kCodeAllBits};

    int found = 0, notFound = 0;
    for (unsigned int seed = 1; seed <= 240; ++seed)
    {
        std::mt19937 random(seed);
        auto below = [&random](size_t n) { return static_cast<size_t>(random() % n); };
        std::string bytes;
        switch (seed % 8)
        {
        case 0: // empty
            break;
        case 1: // one byte
            bytes.assign(1, static_cast<char>(random()));
            break;
        case 2: // noise, half of the time behind a byte-order mark
        case 3:
            if (seed % 16 < 8)
                bytes.assign(kBom, 2);
            for (size_t n = below(4000); n > 0; --n)
                bytes += static_cast<char>(random());
            break;
        default: // lines made of keys, commas, quotes, escapes, carriage returns and line feeds
        {
            const bool noLineFeeds = seed % 8 == 4;
            const bool noCommas = seed % 8 == 5;
            std::wstring text;
            for (size_t lines = below(120); lines > 0; --lines)
            {
                text += keys[below(sizeof(keys) / sizeof(keys[0]))];
                if (!noCommas && below(8) != 0)
                    text += L',';
                for (size_t n = below(60); n > 0; --n)
                    text += textUnits[below(sizeof(textUnits) / sizeof(textUnits[0]) - 1)];
                text += ends[below(sizeof(ends) / sizeof(ends[0]))];
            }
            if (noLineFeeds)
                text.erase(std::remove(text.begin(), text.end(), L'\n'), text.end());
            if (noCommas)
                text.erase(std::remove(text.begin(), text.end(), L','), text.end());
            if (seed % 40 == 6) // 2 MB without a line feed in front of the entries
                text.insert(0, std::wstring(1 << 20, L','));
            bytes = WithBom(text);
            if (below(2) != 0) // an odd length
                bytes += static_cast<char>(random());
            break;
        }
        }
        Write(bytes);
        for (DWORD code : codes)
        {
            ustring message, expected;
            const bool hit = Lookup(code, message);
            ASSERT_EQ(ReferenceLookup(bytes, code, expected), hit) << "seed " << seed << " code " << code;
            if (hit)
                EXPECT_EQ(expected, message) << "seed " << seed << " code " << code;
            else
                EXPECT_EQ(Fallback(code), message) << "seed " << seed << " code " << code;
            ++(hit ? found : notFound);
        }
    }
    // The files are meant to exercise both outcomes.
    EXPECT_GT(found, 50);
    EXPECT_GT(notFound, 50);
}

} // namespace
