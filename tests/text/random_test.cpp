// Bad input: random texts of zeros, lone surrogates, blanks, markers and hex-like units (fixed seed).
#include <ostrand/text/ustring.h>
#include <gtest/gtest.h>
#include <algorithm>
#include <cwctype>
#include <random>
#include <vector>

using ostrand::ustring;

TEST(UstringBadInputTest, RandomTextKeepsEveryInvariant)
{
    std::mt19937 rng(7);
    const auto below = [&rng](unsigned n) { return unsigned(rng() % n); };
    const auto unit = [&]() { // zero, lone surrogate halves, full-width digits and letters, any unit, markers
        const wchar_t kinds[] = {0, wchar_t(0xD800 + below(0x800)), wchar_t(0xFF10 + below(0x40)),
                                 wchar_t(below(0x10000)), L"aAbF09 ,;%-{}\r\n\t?*"[below(19)]};
        return kinds[std::min(below(8), 4u)];
    };
    const auto text = [&](unsigned maxLength, bool zeros)
    {
        ustring s;
        for (unsigned n = below(maxLength + 1); s.size() < n;)
            if (const wchar_t c = unit(); zeros || c != 0)
                s.push_back(c);
        return s;
    };
    for (int n = 0; n < 4000; ++n)
    {
        SCOPED_TRACE(n);
        const ustring s = text(24, true), set = text(3, false), what = text(2, true), with = text(3, true);
        const auto inSet = [&set](wchar_t c) { return c != 0 && set.find(c) != ustring::npos; };
        bool lone = false; // strict conversion rejects exactly the texts with a lone surrogate
        for (size_t i = 0; i < s.size(); ++i)
            if ((s.data()[i] & 0xFC00) == 0xD800 && i + 1 < s.size() && (s.data()[i + 1] & 0xFC00) == 0xDC00)
                ++i;
            else
                lone = lone || (s.data()[i] & 0xF800) == 0xD800;
        const std::string utf8 = ustring::WideCharToMultiByte(s, CP_UTF8, 0);
        ASSERT_TRUE(lone || s == ustring(utf8, CP_UTF8, MB_ERR_INVALID_CHARS));
        ASSERT_EQ(lone, !s.empty() && ustring::WideCharToMultiByte(s, CP_UTF8, WC_ERR_INVALID_CHARS).empty());
        const std::string bytes(reinterpret_cast<const char*>(s.data()),
                                s.size() * 2);                      // mostly invalid UTF-8
        const ustring strict(bytes, CP_UTF8, MB_ERR_INVALID_CHARS); // accepted bytes convert back exactly
        ASSERT_TRUE(strict.empty() || bytes == ustring::WideCharToMultiByte(strict, CP_UTF8, 0));
        std::vector<ustring> pieces; // the pieces joined by the delimiter give the text back
        ustring::split(s, set.c_str(), pieces, true);
        ustring joined;
        for (size_t i = 0; i < pieces.size(); ++i)
        {
            joined += (i > 0 ? set : ustring()) + pieces[i];
            ASSERT_TRUE(set.empty() || pieces[i].find(set) == ustring::npos);
        }
        ASSERT_EQ(s, joined);
        ustring replaced = s, plain; // replace equals a plain left-to-right loop
        replaced.replace(what, with);
        size_t from = 0;
        for (size_t p; !what.empty() && (p = s.find(what, from)) != ustring::npos; from = p + what.size())
            plain.append(s, from, p - from).append(with);
        ASSERT_EQ(plain.append(s, from, ustring::npos), replaced);
        ASSERT_NE(ustring::npos, s.find(s.substr(set.c_str(), what.c_str(), n % 2 == 0, n % 3 == 0)));
        ustring removed = s, kept = s, encoded = s;
        removed.removeForbiddenSymbols(set.c_str());
        kept.removeForbiddenSymbols2(set.c_str());
        encoded.replaceForbiddenSymbols(set.c_str());
        ASSERT_EQ(s.size(), removed.size() + kept.size());
        ASSERT_EQ(0, std::count_if(removed.begin(), removed.end(), inSet));
        ASSERT_EQ(kept.size(), size_t(std::count_if(kept.begin(), kept.end(), inSet)));
        size_t encodedSize = 0, digits = 0; // "%XX" has two to four digits; Hex2Bin reads digits and blanks
        bool valid = true;
        for (wchar_t c : s)
        {
            encodedSize += !inSet(c) ? 1 : unsigned(c) < 0x100 ? 3 : unsigned(c) < 0x1000 ? 4 : 5;
            digits += ::iswxdigit(c) ? 1 : 0;
            valid = valid && (::iswxdigit(c) || c == L' ' || c == L'\r' || c == L'\n' || c == L'\t');
        }
        ASSERT_EQ(encodedSize, encoded.size());
        std::vector<unsigned char> bin{0x55};
        ASSERT_EQ(valid, ustring::Hex2Bin(s, bin));
        ASSERT_EQ(valid ? digits / 2 : 0u, bin.size());
        GUID guid = {0x12345678, 1, 2, {3}}; // text of any shape: accepted, or rejected with a zero GUID
        ASSERT_TRUE(ustring::String2GUID(text(40, false).c_str(), guid) || IsEqualGUID(GUID(), guid));
        ustring formatted;
        formatted.sprintf(L"[%s]", s.c_str());
        ASSERT_EQ(L"[" + ustring(s.c_str()) + L"]", formatted);
    }
}
