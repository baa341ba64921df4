// A reader of communication log files that shares no code with the library, and the tests' file helpers.
#pragma once

#include <ostrand/platform.h>
#include <gtest/gtest.h>
#include <shlobj.h>
#include <fstream>
#include <regex>

namespace logtest
{

using Strings = std::vector<std::string>;

// Each block as a string: a text event's text, or "sent "/"received ", the bytes and " async" when
// ASYNC. A part that breaks the format, or a time stamp (yyyymmddhhmmssmmm) outside from..to, fails the test.
inline Strings ParseFile(const std::wstring& path, unsigned long long from = 0, unsigned long long to = ~0ull)
{
    // clang-format off
    static const std::regex header("(?:Text Event|(A?SYNC) (WRITE|READ) request completed: (0|[1-9][0-9]*) \\(0x(0|[1-9A-F][0-9A-F]*)\\) bytes), "
                                   "([0-9]{4})/([1-9]|1[0-2])/([1-9]|[12][0-9]|3[01]), ([01][0-9]|2[0-3]):([0-5][0-9]):([0-5][0-9])\\.([0-9]{3})");
    // clang-format on
    std::ifstream in(path.c_str(), std::ios::binary); // _wfopen shares reading and writing
    const std::string f{std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
    Strings lines, blocks;
    size_t l = 0, e = 0;
    for (size_t p = 0; p < f.size(); p = e == std::string::npos ? f.size() : e + 2)
        lines.push_back(f.substr(p, (e = f.find("\r\n", p)) - p)); // no CR LF at the end: a bad block
    const auto fail = [&](const char* what) { return ADD_FAILURE() << what << " at line " << l, blocks; };
    for (std::smatch m; l < lines.size(); ++l) // a byte-order mark fails the first header
    {
        if (!std::regex_match(lines[l], m, header))
            return fail("bad header");
        unsigned long long time = 0;
        for (int i = 5; i < 12; ++i)
            time = time * (i == 11 ? 1000 : 100) + std::stoul(m[i].str());
        if (time < from || time > to)
            return fail("time stamp out of range");
        std::string block;
        if (!m[1].matched) // a text runs to the first empty line before the end or another header
        {
            for (e = ++l; e < lines.size(); ++e)
                if (lines[e].empty() && (e + 1 == lines.size() || std::regex_match(lines[e + 1], header)))
                    break;
            for (; l < e; ++l)
                block += lines[l] + (l + 1 < e ? "\r\n" : "");
        }
        else
        {
            // Dump lines, rebuilt from the hex column: a space, 32 cells of "XX " (upper case) or of three
            // spaces after the data, four spaces, then each byte as itself when 0x21..0x7E, else '.'.
            for (std::string s; ++l < lines.size() && !(s = lines[l]).empty();)
            {
                size_t n = 0, full = block.size() % 32 == 0; // only a block's last line may be short
                while (n < 32 && 3 * n + 3 < s.size() && s[3 * n + 1] != ' ')
                    block.push_back(char(std::stoul(s.substr(3 * n++ + 1, 2), nullptr, 16)));
                std::string cells = " ", text;
                for (size_t i = block.size() - n; i < block.size(); ++i)
                {
                    const unsigned char b = block[i];
                    cells += {"0123456789ABCDEF"[b >> 4], "0123456789ABCDEF"[b & 15], ' '};
                    text += b > 0x20 && b < 0x7F ? char(b) : '.';
                }
                if (!full || n == 0 || s != cells + std::string(3 * (32 - n) + 4, ' ') + text)
                    return fail("bad dump line");
            }
            if (std::to_string(block.size()) != m[3] || std::stoul(m[4].str(), nullptr, 16) != block.size())
                return fail("wrong byte count");
            block = (m[2] == "WRITE" ? "sent " : "received ") + block + (m[1] == "SYNC" ? "" : " async");
        }
        if (l == lines.size())
            return fail("no empty line at the end of the block");
        blocks.push_back(block);
    }
    return blocks;
}

inline std::wstring DebugFolder()
{
    wchar_t path[MAX_PATH] = {};
    EXPECT_TRUE(SUCCEEDED(::SHGetFolderPathW(NULL, CSIDL_PERSONAL, NULL, 0, path)));
    return std::wstring(path) + L"\\_Debug\\";
}

inline std::vector<std::wstring> FindFiles(const std::wstring& pattern)
{
    std::vector<std::wstring> names;
    WIN32_FIND_DATAW data;
    const HANDLE h = ::FindFirstFileW(pattern.c_str(), &data);
    for (bool more = h != INVALID_HANDLE_VALUE; more; more = ::FindNextFileW(h, &data) || !::FindClose(h))
        names.push_back(data.cFileName);
    return names;
}

} // namespace logtest
