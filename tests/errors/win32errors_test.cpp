// CWinException::GetErrorMessage with DATA\Win32Errors.txt beside ostrand.dll, owned by this serial test.
#include <ostrand/errors/Exception.h>
#include <gtest/gtest.h>
#include <algorithm>
#include <cstdio>
#include <cwchar>
#include <memory>
#include <random>
#include <tuple>

using namespace ostrand;

TEST(Win32ErrorsFileTest, FileFormatMissingFileAndRandomFiles)
{
    const auto Utf16 = [](const std::wstring& t, bool bom = true) // UTF-16 bytes, behind a byte-order mark
    { return (bom ? "\xFF\xFE" : "") + std::string(reinterpret_cast<const char*>(t.data()), t.size() * 2); };
    const DWORD kA = 0x2000ABCD, kB = 0x2000ABCE, kC = 0x2000ABCF; // codes without a system text
    const ustring kFallback = L"<fallback>";
    wchar_t dll[MAX_PATH] = {};
    ASSERT_NE(0u, ::GetModuleFileNameW(::GetModuleHandleW(L"ostrand.dll"), dll, MAX_PATH));
    const ustring folder = ustring(dll, std::wcsrchr(dll, L'\\') - dll) + L"\\DATA",
                  path = folder + L"\\Win32Errors.txt";
    ::DeleteFileW(path.c_str()); // a leftover of an aborted run
    ASSERT_TRUE(::CreateDirectoryW(folder.c_str(), NULL) || ::GetLastError() == ERROR_ALREADY_EXISTS);
    const std::shared_ptr<void> cleanup(nullptr, [&](void*) { // runs on every way out of the test
        ::DeleteFileW(path.c_str());
        EXPECT_TRUE(::RemoveDirectoryW(folder.c_str())) << "DATA must not outlive the test";
    });
    // Writes a fresh file (nothing of an earlier one may be kept) and gives the message, or kFallback.
    const auto lookUp = [&](const std::string& bytes, DWORD code)
    {
        FILE* file = ::_wfopen(path.c_str(), L"wb");
        EXPECT_TRUE(file && (std::fwrite(bytes.data(), 1, bytes.size(), file) == bytes.size()) &
                                (std::fclose(file) == 0));
        ustring text, fallback;
        const bool found = CWinException(0, NULL, NULL, code).GetErrorMessage(text);
        EXPECT_TRUE(found || (fallback.sprintf(L"Unknown error: %d (0x%X).", code, code), text == fallback))
            << text.c_str();
        return found ? text : kFallback;
    };
    const std::wstring big(1 << 20, L'A'),
        hides = L"536914894 no comma\n0x2000ABCD,joined\n0x2000ABCF,after\n";
    wchar_t system[1024] = {}; // the system's text comes before the file's, whatever Wine's text is
    ASSERT_NE(0u, ::FormatMessageW(FORMAT_MESSAGE_FROM_SYSTEM | FORMAT_MESSAGE_IGNORE_INSERTS, NULL, 2,
                                   MAKELANGID(LANG_NEUTRAL, SUBLANG_DEFAULT), system, 1024, NULL));
    // Keys: blanks around, only leading digits, decimal without "0x"; the first comma splits; the message is
    // trimmed then unquoted; carriage returns and empty lines are ignored; a line needs its line feed.
    // clang-format off
    const std::tuple<std::string, DWORD, ustring> rows[] = {
        {Utf16(L"0x2000ABCD,hex\r\n"), kA, L"hex"}, {Utf16(L"  0X2000abce  ,a, b\n"), kB, L"a, b"}, {Utf16(L"536914893,decimal\n"), kA, L"decimal"},
        {Utf16(L"0x2000ABCDzz,x\n"), kA, L"x"}, {Utf16(L"2000ABCD,not hex\n"), kA, kFallback}, {Utf16(L"0x2000ABCD,  \"a\\nb\"  \n"), kA, L"a\nb"},
        {Utf16(L"0x2000ABCD,say \\\"hi\\\"\\rnow\n"), kA, L"say \"hi\"\rnow"}, {Utf16(L"0x2000ABCD,\"open\n"), kA, L"open"}, {Utf16(hides), kC, L"after"},
        {Utf16(L"\n\r\n\n0x2000\rABCD,x\ry\r\r\n"), kA, L"xy"}, {Utf16(L"0x2000ABCE,ended\n0x2000ABCD,last"), kA, kFallback}, {Utf16(hides), kA, kFallback},
        {Utf16(L"0x2000ABCE,ended\n0x2000ABCD,last"), kB, L"ended"}, {Utf16(L"0x2000ABCD,x") + "\n", kA, kFallback}, {Utf16(hides), kB, L"joined"},
        {Utf16(L"0x2000ABCD,x\n") + "\n", kA, L"x"}, {Utf16(L"0x2000ABCD,no mark\n", false), kA, kFallback}, {"\xFF", kA, kFallback}, {"", kA, kFallback},
        {"\xFE\xFF" + Utf16(L"0x2000ABCD,big-endian\n", false), kA, kFallback}, {Utf16(L"0x2000ABCD," + big), kA, kFallback},
        {Utf16(big + L"\n0x2000ABCD,hidden\n0x2000ABCE,after\n"), kB, L"after"}, {Utf16(L"0x2000ABCD," + big + L"\n"), kA, big},
        {Utf16(L"2,from the file\n"), ERROR_FILE_NOT_FOUND, system}};
    // clang-format on
    for (const auto& [bytes, code, expected] : rows)
        EXPECT_EQ(expected, lookUp(bytes, code)) << bytes.size() << " bytes, code " << code;
    ustring message; // no file
    EXPECT_TRUE(::DeleteFileW(path.c_str()) &&
                !CWinException(0, NULL, NULL, 0xE000ABCD).GetErrorMessage(message) &&
                message == L"Unknown error: -536826931 (0xE000ABCD).");
    // Files of any content: every lookup ends, with the whole-file reading's text below or the fallback.
    // clang-format off
    const wchar_t* const keys[] = {L"0x2000ABCD", L"536914894", L"0X2000abcf", L" 0x2000ABCD ", L"junk", L"", L"0x", L"-1", L"4294967295", L"99999999999", L"0x0x2000ABCD"};
    // clang-format on
    int found = 0;
    for (unsigned seed = 1; seed <= 200; ++seed)
    {
        std::mt19937 rng(seed);
        std::wstring text; // a key starts a line now and then, among commas, quotes, escapes and returns
        for (size_t n = rng() % 3000; n > 0; --n)
            text += rng() % 16 ? std::wstring(1, L"a ,\"\\nr\r\n"[rng() % 9])
                               : L"\n" + std::wstring(keys[rng() % 11]);
        if (seed % 5 == 1 || seed % 5 == 2) // every fifth file has no comma, and every fifth no line feed
            text.erase(std::remove(text.begin(), text.end(), seed % 5 == 1 ? L',' : L'\n'), text.end());
        std::string bytes = Utf16(seed % 5 == 3 ? L"" : text, seed % 10 != 8); // noise may follow a mark
        for (size_t n = seed % 5 == 3 ? rng() % 4000 : rng() % 2; n > 0; --n)  // noise, or an odd length
            bytes += static_cast<char>(rng());
        ustring whole; // the library reads 512-byte pieces
        if (bytes.compare(0, 2, "\xFF\xFE") == 0)
            whole.assign(reinterpret_cast<const wchar_t*>(bytes.data() + 2), (bytes.size() - 2) / 2);
        whole.removeForbiddenSymbols(L"\r");
        for (DWORD code : {kA, kB, kC, DWORD(0xFFFFFFFF)})
        {
            ustring expected = kFallback;
            for (size_t pos = 0, comma, lineFeed;; pos = lineFeed + 1)
            {
                pos = std::min(whole.find_first_not_of(L'\n', pos), whole.size());
                if ((comma = whole.find(L',', pos)) == ustring::npos ||
                    (lineFeed = whole.find(L'\n', comma)) == ustring::npos)
                    break;
                const ustring key = ustring(whole.substr(pos, comma - pos)).trim(L' ');
                const bool hex = key.size() >= 2 && key[0] == L'0' && (key[1] == L'x' || key[1] == L'X');
                if (std::wcstoul(key.c_str() + (hex ? 2 : 0), NULL, hex ? 16 : 10) != code)
                    continue;
                expected = ustring(whole.substr(comma + 1, lineFeed - comma - 1)).trim(L' ');
                for (const auto& [escape, unit] :
                     {std::pair{L"\\r", L"\r"}, {L"\\n", L"\n"}, {L"\\\"", L"\""}})
                    expected.replace(escape, unit);
                expected.trim(L'"'), ++found;
                break;
            }
            ASSERT_EQ(expected, lookUp(bytes, code)) << "seed " << seed << " code " << code;
        }
    }
    EXPECT_TRUE(found > 50 && found < 750) << found; // of 800 lookups: the files give both outcomes
}
