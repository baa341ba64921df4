// CWinException::GetErrorMessage with the supplementary file DATA\Win32Errors.txt beside ostrand.dll.
// The fixture owns the file and its folder, so this executable runs serially: no other test sees them.
#include <ostrand/errors/Exception.h>
#include <ostrand/system/File.h>

#include <gtest/gtest.h>

#include <cstring>
#include <cwchar>
#include <random>
#include <string>

using namespace ostrand;

namespace
{

const DWORD kA = 0x2000ABCD, kB = 0x2000ABCE, kC = 0x2000ABCF; // codes without a system text
const DWORD kCodes[] = {kA, kB, kC, 0xFFFFFFFF};
const ustring kFallback = L"<fallback>";

std::string Utf16(const std::wstring& text)
{
    return std::string(reinterpret_cast<const char*>(text.data()), text.size() * sizeof(wchar_t));
}
std::string WithBom(const std::wstring& text)
{
    return "\xFF\xFE" + Utf16(text);
}

bool SystemText(DWORD code, ustring& text)
{
    wchar_t* buffer = NULL;
    const DWORD n = ::FormatMessageW(
        FORMAT_MESSAGE_ALLOCATE_BUFFER | FORMAT_MESSAGE_IGNORE_INSERTS | FORMAT_MESSAGE_FROM_SYSTEM, NULL,
        code, MAKELANGID(LANG_NEUTRAL, SUBLANG_DEFAULT), reinterpret_cast<wchar_t*>(&buffer), 0, NULL);
    text.assign(buffer != NULL ? buffer : L"", n);
    ::LocalFree(buffer);
    return n != 0;
}

// The lookup done plainly on the whole file at once; the library reads 512-byte pieces.
bool ReferenceLookup(const std::string& bytes, DWORD code, ustring& message)
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
        for (DWORD code : kCodes)
        {
            ustring text;
            ASSERT_FALSE(SystemText(code, text)) << std::hex << code << " has a system text";
        }
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
        if (!bytes.empty())
            file.Write(bytes.data(), bytes.size(), written);
        ASSERT_EQ(bytes.size(), written);
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
    const struct
    {
        std::string file;
        DWORD code;
        ustring expected;
    } rows[] = {
        {WithBom(L"0x2000ABCD,hex\r\n"), kA, L"hex"},
        {WithBom(L"  0X2000abce  ,a, b\n"), kB, L"a, b"}, // blanks around the key; the first comma splits
        {WithBom(L"536914893,decimal\n"), kA, L"decimal"},
        {WithBom(L"0x2000ABCDzz,x\n"), kA, L"x"},              // only the leading digits count
        {WithBom(L"2000ABCD,not hex\n"), kA, kFallback},       // without the prefix: decimal 2000
        {WithBom(L"0x2000ABCD,  \"a\\nb\"  \n"), kA, L"a\nb"}, // trimmed, then unquoted
        {WithBom(L"0x2000ABCD,say \\\"hi\\\"\\rnow\n"), kA, L"say \"hi\"\rnow"},
        {WithBom(L"0x2000ABCD,\"open\n"), kA, L"open"},
        {WithBom(L"\n\r\n\n0x2000\rABCD,x\ry\r\r\n"), kA, L"xy"}, // carriage returns and empty lines ignored
        {WithBom(L"0x2000ABCE,ended\n0x2000ABCD,last line without a line feed"), kA, kFallback},
        {WithBom(L"0x2000ABCE,ended\n0x2000ABCD,last"), kB, L"ended"},
        {WithBom(L"0x2000ABCD,x") + "\n", kA, kFallback}, // a dangling odd byte is no line feed
        {WithBom(L"0x2000ABCD,x\n") + "\n", kA, L"x"},
        {WithBom(hides), kB, L"joined"}, // a line without a comma is the front of the next entry's key
        {WithBom(hides), kA, kFallback},
        {WithBom(hides), kC, L"after"},
        {Utf16(L"0x2000ABCD,no mark\n"), kA, kFallback},
        {"\xFE\xFF" + Utf16(L"0x2000ABCD,big-endian mark\n"), kA, kFallback},
        {"\xFF", kA, kFallback},
        {"", kA, kFallback},
        {WithBom(big + L"\n0x2000ABCD,hidden\n0x2000ABCE,after\n"), kB, L"after"},
        {WithBom(L"0x2000ABCD," + big + L"\n"), kA, big},
        {WithBom(L"0x2000ABCD," + big), kA, kFallback}};
    for (const auto& r : rows)
    {
        SCOPED_TRACE(testing::Message() << "row " << (&r - rows));
        Write(r.file); // a fresh file for every row: the library must not keep an earlier one
        EXPECT_EQ(r.expected, Message(r.code));
    }
}

TEST_F(Win32ErrorsFileTest, SystemTextFirstAndFallbacks)
{
    Write(WithBom(L"2,from the file\n"));
    ustring system, message;
    ASSERT_TRUE(SystemText(ERROR_FILE_NOT_FOUND, system));
    EXPECT_TRUE(CWinException(0, NULL, NULL, ERROR_FILE_NOT_FOUND).GetErrorMessage(message));
    EXPECT_EQ(system, message);

    ASSERT_TRUE(::DeleteFileW(m_strFile.c_str()));
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
            text += seed % 5 == 1 || rng() % 8 == 0 ? L"" : L","; // every fifth file has no comma
            for (size_t n = rng() % 60; n > 0; --n)
                text += units[rng() % 9];
            text += seed % 5 == 2 ? L"" : L"\n"; // and every fifth no line feed of its own
        }
        std::string bytes = seed % 5 != 3 ? WithBom(text) : seed % 10 == 3 ? "\xFF\xFE" : "";
        for (size_t n = seed % 5 == 3 ? rng() % 4000 : rng() % 2; n > 0; --n) // noise, or an odd length
            bytes += static_cast<char>(rng());
        Write(bytes);
        for (DWORD code : kCodes)
        {
            SCOPED_TRACE(testing::Message() << "seed " << seed << " code " << code);
            ustring expected;
            ASSERT_EQ(ReferenceLookup(bytes, code, expected) ? expected : kFallback, Message(code));
            found += expected.empty() ? 0 : 1;
        }
    }
    EXPECT_GT(found, 50); // the files exercise both outcomes
}

} // namespace
