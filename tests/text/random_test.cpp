// Bad input: random texts full of zeros, lone surrogates, blanks, markers and hex-like units, fed to the
// text functions with fixed seeds. Nothing may crash or hang, and each result must keep its invariant.
#include <ostrand/text/ustring.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <cwchar>
#include <cwctype>
#include <random>
#include <vector>

using ostrand::ustring;

namespace
{

class RandomText
{
public:
    explicit RandomText(unsigned seed) : m_rng(seed) {}

    unsigned Below(unsigned n) { return m_rng() % n; }

    wchar_t Unit()
    {
        static const wchar_t common[] = L"aAbBfF09 ,;%-{}\r\n\t?*x";
        switch (Below(8))
        {
        case 0:
            return L'\0';
        case 1:
            return static_cast<wchar_t>(0xD800 + Below(0x800)); // a lone half of a surrogate pair
        case 2:
            return static_cast<wchar_t>(0xFF10 + Below(0x40)); // full-width digits and letters
        case 3:
            return static_cast<wchar_t>(Below(0x10000));
        default:
            return common[Below(sizeof(common) / sizeof(common[0]) - 1)];
        }
    }

    ustring Text(unsigned maxLength)
    {
        ustring s(Below(maxLength + 1), L' ');
        for (wchar_t& c : static_cast<std::wstring&>(s))
            c = Unit();
        return s;
    }

    // A text without zero units, for the parameters that are C strings.
    ustring CText(unsigned minLength, unsigned maxLength)
    {
        ustring s;
        for (unsigned n = minLength + Below(maxLength - minLength + 1); s.size() < n;)
            if (const wchar_t c = Unit())
                s.push_back(c);
        return s;
    }

    std::string Bytes(unsigned maxLength)
    {
        std::string b(Below(maxLength + 1), '\0');
        for (char& c : b)
            c = static_cast<char>(Below(3) == 0 ? Below(0x80) : 0x80 + Below(0x80));
        return b;
    }

private:
    std::mt19937 m_rng;
};

bool HasLoneSurrogate(const ustring& s)
{
    for (size_t i = 0; i < s.size(); ++i)
    {
        const unsigned c = static_cast<unsigned short>(s.data()[i]);
        if (c >= 0xD800 && c < 0xDC00 && i + 1 < s.size() && (s.data()[i + 1] & 0xFC00) == 0xDC00)
            ++i;
        else if (c >= 0xD800 && c < 0xE000)
            return true;
    }
    return false;
}

// Replacement left to right without looking at inserted text again, written as plainly as possible.
ustring ReplaceReference(const ustring& s, const ustring& what, const ustring& with)
{
    std::wstring out;
    size_t from = 0;
    for (size_t pos; (pos = s.std::wstring::find(what, from)) != std::wstring::npos; from = pos + what.size())
        out.append(s, from, pos - from).append(with);
    return out.append(s, from, std::wstring::npos);
}

// Encoding walked from the last unit to the first with the runtime's own "%%%02X", inserting in place.
template <class Pred> ustring PercentReference(ustring s, Pred encode)
{
    for (size_t i = s.size(); i-- > 0;)
    {
        if (!encode(s.data()[i]))
            continue;
        wchar_t code[8];
        ::_snwprintf(code, 8, L"%%%02X", static_cast<unsigned>(static_cast<unsigned short>(s.data()[i])));
        code[7] = L'\0';
        s.std::wstring::replace(i, 1, code);
    }
    return s;
}

} // namespace

TEST(UstringBadInputTest, ConversionsRoundTripOrRejectWhole)
{
    RandomText rnd(7);
    for (int n = 0; n < 3000; ++n)
    {
        SCOPED_TRACE(n);
        const ustring s = rnd.Text(24);
        const std::string utf8 = ustring::WideCharToMultiByte(s, CP_UTF8, 0);
        const bool lone = HasLoneSurrogate(s);
        if (!lone)
        {
            ASSERT_EQ(s, ustring::MultiByteToWideChar(utf8, CP_UTF8, MB_ERR_INVALID_CHARS));
        }
        if (!s.empty()) // strict conversion rejects exactly the texts with a lone surrogate
        {
            ASSERT_EQ(lone, ustring::WideCharToMultiByte(s, CP_UTF8, WC_ERR_INVALID_CHARS).empty());
        }

        const std::string bytes = rnd.Bytes(16);
        const ustring strict = ustring::MultiByteToWideChar(bytes, CP_UTF8, MB_ERR_INVALID_CHARS);
        if (!strict.empty()) // accepted input converts back to exactly the same bytes
        {
            ASSERT_EQ(bytes, ustring::WideCharToMultiByte(strict, CP_UTF8, 0));
        }
        ASSERT_EQ(bytes.empty(), ustring::MultiByteToWideChar(bytes, CP_UTF8, 0).empty());
        // npos means "up to the terminator", whatever stands before it.
        ASSERT_EQ(ustring::MultiByteToWideChar(bytes.c_str(), std::strlen(bytes.c_str()), CP_UTF8, 0),
                  ustring::MultiByteToWideChar(bytes.c_str(), ustring::npos, CP_UTF8, 0));
        ASSERT_EQ(ustring::WideCharToMultiByte(s.c_str(), std::wcslen(s.c_str()), CP_UTF8, 0),
                  ustring::WideCharToMultiByte(s.c_str(), ustring::npos, CP_UTF8, 0));
    }
}

TEST(UstringBadInputTest, SplitJoinsBackAndReplaceMatchesAPlainLoop)
{
    RandomText rnd(11);
    for (int n = 0; n < 3000; ++n)
    {
        SCOPED_TRACE(n);
        const ustring s = rnd.Text(30);
        const ustring delimiter = rnd.CText(0, 2);
        std::vector<ustring> pieces;
        ustring::split(s, delimiter.c_str(), pieces, true);
        ustring joined;
        for (size_t i = 0; i < pieces.size(); ++i)
        {
            if (i > 0)
                joined += delimiter;
            joined += pieces[i];
            if (!delimiter.empty())
            {
                ASSERT_EQ(ustring::npos, pieces[i].find(delimiter));
            }
        }
        ASSERT_EQ(s, joined);

        ustring::split(s, pieces); // multi-string: non-empty pieces without zeros, in order, from the start
        ustring rebuilt;
        for (const ustring& p : pieces)
        {
            ASSERT_FALSE(p.empty());
            ASSERT_EQ(ustring::npos, p.find(L'\0'));
            rebuilt += p;
            rebuilt += L'\0';
        }
        ASSERT_EQ(0, ustring(s.c_str(), std::min(s.size(), rebuilt.size())).compare(rebuilt, ustring::npos));

        const ustring what = rnd.Text(2), with = rnd.Text(3);
        ustring replaced = s;
        replaced.replace(what, with);
        ASSERT_EQ(what.empty() ? s : ReplaceReference(s, what, with), replaced);

        const ustring begin = rnd.CText(0, 1), end = rnd.CText(0, 1);
        const ustring cut = s.substr(begin.c_str(), end.c_str(), rnd.Below(2) == 0, rnd.Below(2) == 0);
        ASSERT_NE(ustring::npos, s.find(cut));
    }
}

TEST(UstringBadInputTest, FiltersEncodingAndCase)
{
    RandomText rnd(13);
    for (int n = 0; n < 3000; ++n)
    {
        SCOPED_TRACE(n);
        const ustring s = rnd.Text(20);
        const ustring set = rnd.CText(0, 4);
        const auto inSet = [&set](wchar_t c) { return c != L'\0' && set.find(c) != ustring::npos; };

        ustring removed = s, kept = s;
        removed.removeForbiddenSymbols(set.c_str());
        kept.removeForbiddenSymbols2(set.c_str());
        ASSERT_EQ(s.size(), removed.size() + kept.size());
        for (wchar_t c : static_cast<const std::wstring&>(removed))
            ASSERT_FALSE(inSet(c));
        for (wchar_t c : static_cast<const std::wstring&>(kept))
            ASSERT_TRUE(inSet(c));

        ustring encoded = s;
        encoded.replaceForbiddenSymbols(set.c_str());
        ASSERT_EQ(PercentReference(s, inSet), encoded);
        encoded = s;
        encoded.replaceNonAlphaNumericSymbols();
        ASSERT_EQ(PercentReference(s, [](wchar_t c) { return !::iswalnum(c); }), encoded);

        std::vector<wchar_t> trimSet(set.begin(), set.end());
        ustring trimmed = s;
        trimmed.trim(trimSet);
        ASSERT_TRUE(trimmed.empty() || (!inSet(trimmed.front()) && !inSet(trimmed.back())));
        ASSERT_NE(ustring::npos, s.find(trimmed));

        ustring lower = s, upper = s;
        lower.strlwr();
        upper.strupr();
        ASSERT_EQ(s.size(), lower.size());
        for (size_t i = 0; i < s.size(); ++i)
        {
            ASSERT_EQ(static_cast<wchar_t>(::towlower(s.data()[i])), lower.data()[i]);
            ASSERT_EQ(static_cast<wchar_t>(::towupper(s.data()[i])), upper.data()[i]);
        }

        ustring formatted;
        formatted.sprintf(L"[%s]", s.c_str());
        ASSERT_EQ(L"[" + ustring(s.c_str()) + L"]", formatted);
    }
}

TEST(UstringBadInputTest, HexAndGuidTextOfAnyShape)
{
    RandomText rnd(17);
    for (int n = 0; n < 3000; ++n)
    {
        SCOPED_TRACE(n);
        std::vector<unsigned char> bytes(rnd.Below(40)), back;
        for (unsigned char& b : bytes)
            b = static_cast<unsigned char>(rnd.Below(256));
        ustring hex;
        ustring::Bin2Hex(bytes, hex);
        ASSERT_EQ(2 * bytes.size(), hex.size());
        ASSERT_TRUE(ustring::Hex2Bin(hex, back));
        ASSERT_EQ(bytes, back);

        // True exactly when every unit is a hex digit or a blank; then one byte per pair of digits.
        const ustring text = rnd.Text(12);
        size_t digits = 0;
        bool valid = true;
        for (wchar_t c : static_cast<const std::wstring&>(text))
        {
            if (::iswxdigit(c))
                ++digits;
            else if (c != L' ' && c != L'\r' && c != L'\n' && c != L'\t')
                valid = false;
        }
        back.assign(3, 0x55);
        ASSERT_EQ(valid, ustring::Hex2Bin(text, back));
        ASSERT_EQ(valid ? digits / 2 : 0u, back.size());

        // A GUID's text round-trips; damaged text of any shape is rejected with a zero GUID, or, when the
        // damage left a valid GUID, reads as that GUID.
        GUID guid;
        for (unsigned char* p = reinterpret_cast<unsigned char*>(&guid);
             p != reinterpret_cast<unsigned char*>(&guid + 1); ++p)
            *p = static_cast<unsigned char>(rnd.Below(256));
        ustring guidText;
        ASSERT_TRUE(ustring::GUID2String(guid, guidText));
        ASSERT_EQ(38u, guidText.size());
        GUID read;
        ASSERT_TRUE(ustring::String2GUID(guidText, read));
        ASSERT_TRUE(IsEqualGUID(guid, read));

        ustring damaged = guidText;
        const size_t at = rnd.Below(39);
        switch (rnd.Below(3))
        {
        case 0:
            damaged.insert(at, 1, rnd.Unit());
            break;
        case 1:
            damaged.erase(std::min<size_t>(at, 37), 1);
            break;
        default:
            damaged.std::wstring::replace(std::min<size_t>(at, 37), 1, 1, rnd.Unit());
        }
        if (rnd.Below(4) == 0)
            damaged = rnd.CText(1, 40);
        read = guid;
        if (ustring::String2GUID(damaged, read) && damaged.size() == 38 && damaged[0] == L'{')
        {
            ustring again;
            ASSERT_TRUE(ustring::GUID2String(read, again));
            ASSERT_EQ(0, again.compareNoCase(damaged, ustring::npos));
        }
        else if (!ustring::String2GUID(damaged, read))
        {
            ASSERT_TRUE(IsEqualGUID(GUID(), read));
        }
    }
}
