// CWinException::GetErrorMessage with the supplementary file DATA\Win32Errors.txt beside ostrand.dll.
// The fixture owns the file and its folder, so this executable runs serially: no other test sees them.
#include <ostrand/errors/Exception.h>
#include <ostrand/system/File.h>
#include <gtest/gtest.h>
#include <algorithm>
#include <cstring>
#include <cwchar>
#include <random>
#include <string>
#include <tuple>

using namespace ostrand;

static const DWORD kA = 0x2000ABCD, kB = 0x2000ABCE, kC = 0x2000ABCF; // codes without a system text
static const ustring kFallback = L"<fallback>";

// UTF-16 bytes, behind the byte-order mark unless `bom` is false.
static std::string Utf16(const std::wstring& text, bool bom = true)
{
    return (bom ? "\xFF\xFE" : "") + std::string(reinterpret_cast<const char*>(text.data()), text.size() * 2);
}

// The lookup done plainly on the whole file at once; the library reads 512-byte pieces.
static bool ReferenceLookup(const std::string& bytes, DWORD code, ustring& message)
{
    if (bytes.size() < 2 || bytes.compare(0, 2, "\xFF\xFE") != 0)
        return false;
    ustring text((bytes.size() - 2) / 2, L'\0');
    std::memcpy(text.data(), bytes.data() + 2, text.size() * sizeof(wchar_t));
    text.removeForbiddenSymbols(L"\r");
    for (size_t pos = 0;;)
    {
        pos = std::min(text.find_first_not_of(L'\n', pos), text.size());
        const size_t comma = text.find(L',', pos), lineFeed = text.find(L'\n', comma);
        if (comma == ustring::npos || lineFeed == ustring::npos)
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
        ustring dll, drive, dir, name, ext;
        CFile::GetModuleFileNameW(::GetModuleHandleW(L"ostrand.dll"), dll, true);
        CFile::SplitPath(dll.c_str(), drive, dir, name, ext);
        CFile::MakePath(m_strFolder, drive.c_str(), dir.c_str(), L"DATA", NULL);
        m_strFile = m_strFolder + L"\\Win32Errors.txt";
        ::DeleteFileW(m_strFile.c_str()); // a leftover of an aborted run
        ASSERT_TRUE(::CreateDirectoryW(m_strFolder.c_str(), NULL) ||
                    ::GetLastError() == ERROR_ALREADY_EXISTS);
    }

    void TearDown() override
    {
        ::DeleteFileW(m_strFile.c_str());
        EXPECT_TRUE(::RemoveDirectoryW(m_strFolder.c_str())) << "DATA must not outlive the test";
    }

    void Write(const std::string& bytes)
    {
        CFile file(m_strFile.c_str(), GENERIC_WRITE, 0, NULL, CREATE_ALWAYS, FILE_ATTRIBUTE_NORMAL);
        unsigned __int64 written = 0;
        ASSERT_TRUE(bytes.empty() ||
                    (file.Write(bytes.data(), bytes.size(), written) && written == bytes.size()));
    }

    // The message of `code`, or kFallback when the lookup found nothing and gave the fallback text.
    static ustring Message(DWORD code)
    {
        ustring message, fallback;
        if (CWinException(0, NULL, NULL, code).GetErrorMessage(message))
            return message;
        fallback.sprintf(L"Unknown error: %d (0x%X).", code, code);
        EXPECT_EQ(fallback, message);
        return kFallback;
    }

    ustring m_strFolder, m_strFile;
};

TEST_F(Win32ErrorsFileTest, FileFormat)
{
    const std::wstring big(1 << 20, L'A'); // 2 MiB
    const std::wstring hides = L"536914894 no comma\n0x2000ABCD,joined\n0x2000ABCF,after\n";
    wchar_t* system = NULL; // the system's text comes before the file's, whatever Wine's text is
    const DWORD flags =
        FORMAT_MESSAGE_ALLOCATE_BUFFER | FORMAT_MESSAGE_IGNORE_INSERTS | FORMAT_MESSAGE_FROM_SYSTEM;
    ASSERT_NE(0u, ::FormatMessageW(flags, NULL, 2, MAKELANGID(LANG_NEUTRAL, SUBLANG_DEFAULT),
                                   reinterpret_cast<wchar_t*>(&system), 0, NULL));
    const ustring systemText(system);
    ::LocalFree(system);
    const std::tuple<std::string, DWORD, ustring> rows[] = {
        // file, code, message
        {Utf16(L"0x2000ABCD,hex\r\n"), kA, L"hex"},
        {Utf16(L"  0X2000abce  ,a, b\n"), kB, L"a, b"}, // blanks around the key; the first comma splits
        {Utf16(L"536914893,decimal\n"), kA, L"decimal"},
        {Utf16(L"0x2000ABCDzz,x\n"), kA, L"x"},              // only the leading digits count
        {Utf16(L"2000ABCD,not hex\n"), kA, kFallback},       // without the prefix: decimal 2000
        {Utf16(L"0x2000ABCD,  \"a\\nb\"  \n"), kA, L"a\nb"}, // trimmed, then unquoted
        {Utf16(L"0x2000ABCD,say \\\"hi\\\"\\rnow\n"), kA, L"say \"hi\"\rnow"},
        {Utf16(L"0x2000ABCD,\"open\n"), kA, L"open"},
        {Utf16(L"\n\r\n\n0x2000\rABCD,x\ry\r\r\n"), kA, L"xy"}, // carriage returns and empty lines ignored
        {Utf16(L"0x2000ABCE,ended\n0x2000ABCD,last line without a line feed"), kA, kFallback},
        {Utf16(L"0x2000ABCE,ended\n0x2000ABCD,last"), kB, L"ended"},
        {Utf16(L"0x2000ABCD,x") + "\n", kA, kFallback}, // a dangling odd byte is no line feed
        {Utf16(L"0x2000ABCD,x\n") + "\n", kA, L"x"},
        {Utf16(hides), kB, L"joined"}, // a line without a comma is the front of the next entry's key
        {Utf16(hides), kA, kFallback},
        {Utf16(hides), kC, L"after"},
        {Utf16(L"0x2000ABCD,no mark\n", false), kA, kFallback},
        {"\xFE\xFF" + Utf16(L"0x2000ABCD,big-endian mark\n", false), kA, kFallback},
        {"\xFF", kA, kFallback},
        {"", kA, kFallback},
        {Utf16(big + L"\n0x2000ABCD,hidden\n0x2000ABCE,after\n"), kB, L"after"},
        {Utf16(L"0x2000ABCD," + big + L"\n"), kA, big},
        {Utf16(L"0x2000ABCD," + big), kA, kFallback},
        {Utf16(L"2,from the file\n"), ERROR_FILE_NOT_FOUND, systemText}};
    for (const auto& [file, code, expected] : rows)
    {
        Write(file); // a fresh file for every row: the library must not keep an earlier one
        EXPECT_EQ(expected, Message(code)) << file.size() << " bytes, code " << code;
    }
}

TEST_F(Win32ErrorsFileTest, MissingFileGivesTheFallback)
{
    ustring message;
    EXPECT_FALSE(CWinException(0, NULL, NULL, 0xE000ABCD).GetErrorMessage(message));
    EXPECT_EQ(ustring(L"Unknown error: -536826931 (0xE000ABCD)."), message);
    ASSERT_TRUE(::CreateDirectoryW(m_strFile.c_str(), NULL)); // a folder where the file should be
    EXPECT_EQ(kFallback, Message(kA));
    ::RemoveDirectoryW(m_strFile.c_str());
}

// Files of any content: every lookup ends, with the plain whole-file reading's text or the fallback.
TEST_F(Win32ErrorsFileTest, RandomFilesAlwaysEndWithAMessage)
{
    const wchar_t* const keys[] = {
        L"0x2000ABCD", L"536914894", L"0X2000abcf", L" 0x2000ABCD ", L"junk",        L"",
        L"0x",         L"-1",        L"4294967295", L"99999999999",  L"0x0x2000ABCD"};
    const wchar_t units[] = L"a ,\"\\nr\r\n";
    int found = 0;
    for (unsigned seed = 1; seed <= 200; ++seed)
    {
        std::mt19937 rng(seed);
        std::wstring text;
        for (size_t lines = rng() % 120; lines > 0; --lines)
        {
            text += keys[rng() % 11];
            text += rng() % 8 == 0 ? L"" : L",";
            for (size_t n = rng() % 60; n > 0; --n)
                text += units[rng() % 9];
            text += L"\n";
        }
        if (seed % 5 == 1 || seed % 5 == 2) // every fifth file has no comma, and every fifth no line feed
            text.erase(std::remove(text.begin(), text.end(), seed % 5 == 1 ? L',' : L'\n'), text.end());
        std::string bytes = Utf16(seed % 5 == 3 ? L"" : text, seed % 10 != 8); // noise may follow a mark
        for (size_t n = seed % 5 == 3 ? rng() % 4000 : rng() % 2; n > 0; --n)  // noise, or an odd length
            bytes += static_cast<char>(rng());
        Write(bytes);
        for (DWORD code : {kA, kB, kC, DWORD(0xFFFFFFFF)})
        {
            ustring expected;
            ASSERT_EQ(ReferenceLookup(bytes, code, expected) ? expected : kFallback, Message(code))
                << "seed " << seed << " code " << code;
            found += expected.empty() ? 0 : 1;
        }
    }
    EXPECT_GT(found, 50); // the files exercise both outcomes
}
