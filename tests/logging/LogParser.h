// An independent reader of communication log files (it knows the format only from its description and
// shares no code with the library), and the Win32 file helpers of the logging tests.
#pragma once

#include <ostrand/platform.h>

#include <gtest/gtest.h>
#include <shlobj.h>

#include <fstream>
#include <regex>

namespace logtest
{

struct ParsedBlock
{
    char kind = 'T'; // 'T' text event, 'W' sent (WRITE), 'R' received (READ)
    bool sync = true;
    unsigned long long time = 0;     // local time as yyyymmddhhmmssmmm
    std::vector<unsigned char> data; // reconstructed from the hex column
    std::string text;                // the UTF-8 text of a text event
};

// One dump line: a space, 32 cells of "XX " (upper case) or of three spaces after the data, four spaces,
// then each byte as itself when 0x21..0x7E, else '.'. Appends the bytes; false when malformed.
inline bool DumpLine(const std::string& s, std::vector<unsigned char>& out)
{
    static const char hex[] = "0123456789ABCDEF";
    size_t n = 0;
    while (n < 32 && 3 * n + 3 < s.size() && s[3 * n + 1] != ' ')
        out.push_back(static_cast<unsigned char>(std::stoul(s.substr(3 * n++ + 1, 2), nullptr, 16)));
    const unsigned char* b = out.data() + out.size() - n;
    std::string expected = " ";
    for (size_t i = 0; i < 32; ++i)
        expected += i < n ? std::string{hex[b[i] >> 4], hex[b[i] & 15], ' '} : "   ";
    expected += "    ";
    for (size_t i = 0; i < n; ++i)
        expected += b[i] > 0x20 && b[i] < 0x7F ? char(b[i]) : '.';
    return n > 0 && s == expected;
}

// Splits the file into blocks; a part that breaks the format fails the test.
inline std::vector<ParsedBlock> ParseFile(const std::wstring& path)
{
    static const std::regex header("(?:Text Event|(A?SYNC) (WRITE|READ) request completed: (0|[1-9][0-9]*) "
                                   "\\(0x(0|[1-9A-F][0-9A-F]*)\\) bytes), ([0-9]{4})/([1-9][0-9]?)/"
                                   "([1-9][0-9]?), ([0-9]{2}):([0-9]{2}):([0-9]{2})\\.([0-9]{3})");
    std::ifstream in(path.c_str(), std::ios::binary); // _wfopen shares reading and writing
    const std::string f{std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
    std::vector<ParsedBlock> blocks;
    size_t p = 0;
    std::string line;
    const auto nextLine = [&]
    {
        const size_t end = f.find("\r\n", p);
        line = f.substr(p, end - p);
        p = end == std::string::npos ? f.size() : end + 2;
        return end != std::string::npos;
    };
    const auto fail = [&](const std::string& what)
    {
        ADD_FAILURE() << what << " before byte " << p << " of " << f.size();
        return blocks;
    };
    if (f.compare(0, 3, "\xEF\xBB\xBF") == 0)
        return fail("byte-order mark");
    std::smatch m;
    while (p < f.size())
    {
        if (!nextLine() || !std::regex_match(line, m, header))
            return fail("bad header '" + line + "'");
        ParsedBlock b;
        unsigned t[7];
        for (int i = 0; i < 7; ++i)
            b.time = b.time * (i == 6 ? 1000 : 100) + (t[i] = unsigned(std::stoul(m[5 + i].str())));
        if (t[1] > 12 || t[2] > 31 || t[3] > 23 || t[4] > 59 || t[5] > 59)
            return fail("bad time stamp");
        if (!m[1].matched) // a text runs to the first empty line before the end or another header
        {
            size_t end = p;
            while ((end = f.find("\r\n\r\n", end)) != std::string::npos && end + 4 < f.size() &&
                   !std::regex_search(f.begin() + end + 4, f.end(), header,
                                      std::regex_constants::match_continuous))
                ++end;
            if (end == std::string::npos)
                return fail("text without its empty line");
            b.text.assign(f, p, end - p);
            p = end + 4;
        }
        else
        {
            b.sync = m[1] == "SYNC";
            b.kind = m[2].str()[0];
            const unsigned long count = std::stoul(m[3].str()), hex = std::stoul(m[4].str(), nullptr, 16);
            while (nextLine() && !line.empty())
                if (b.data.size() % 32 != 0 || !DumpLine(line, b.data))
                    return fail("bad dump line '" + line + "'");
            if (count != b.data.size() || hex != count || f.compare(p - 4, 4, "\r\n\r\n") != 0)
                return fail("byte counts or the end of the dump wrong");
        }
        blocks.push_back(std::move(b));
    }
    return blocks;
}

inline std::wstring DebugFolder()
{
    wchar_t path[MAX_PATH] = {};
    EXPECT_TRUE(SUCCEEDED(::SHGetFolderPathW(NULL, CSIDL_PERSONAL, NULL, 0, path)));
    return std::wstring(path) + L"\\_Debug";
}

// Names of the files that match `pattern` (a path with wildcards).
inline std::vector<std::wstring> FindFiles(const std::wstring& pattern)
{
    std::vector<std::wstring> names;
    WIN32_FIND_DATAW data;
    const HANDLE h = ::FindFirstFileW(pattern.c_str(), &data);
    for (bool more = h != INVALID_HANDLE_VALUE; more; more = ::FindNextFileW(h, &data))
        names.push_back(data.cFileName);
    if (h != INVALID_HANDLE_VALUE)
        ::FindClose(h);
    return names;
}

using Strings = std::vector<std::string>;

// Each block as one string: a text event's text, or "sent "/"received " and the bytes, then " async".
inline Strings Texts(const std::vector<ParsedBlock>& blocks)
{
    Strings texts;
    for (const ParsedBlock& b : blocks)
        texts.push_back(b.kind == 'T'
                            ? b.text
                            : (b.kind == 'W' ? "sent " : "received ") +
                                  std::string(b.data.begin(), b.data.end()) + (b.sync ? "" : " async"));
    return texts;
}

inline unsigned long long NowKey()
{
    SYSTEMTIME t;
    ::GetLocalTime(&t);
    return ((((t.wYear * 100ull + t.wMonth) * 100 + t.wDay) * 100 + t.wHour) * 100 + t.wMinute) * 100000 +
           t.wSecond * 1000u + t.wMilliseconds;
}

} // namespace logtest
