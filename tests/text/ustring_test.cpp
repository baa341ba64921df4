#include <ostrand/text/ustring.h>
#include <gtest/gtest.h>
#include <oleauto.h>
#include <algorithm>
#include <cwctype>
#include <random>
#include <regex>
#include <set>
#include <tuple>

using ostrand::ustring;

TEST(UstringTest, ConstructionConversionsSprintfComparisonEditsHexGuidSplitAndSubstr)
{
    const wchar_t units[] = {L'a', L'b', L'\0', L'c', L'd'};
    EXPECT_EQ(2u, ustring(units, ustring::npos).size());
    EXPECT_TRUE(ustring(nullptr, 3).empty() && ustring(_bstr_t(static_cast<BSTR>(nullptr), false)).empty());
    ustring s(L"x"), x;
    EXPECT_TRUE((s = static_cast<const wchar_t*>(nullptr)).empty());
    EXPECT_EQ(ustring(units, 5), ustring(_bstr_t(::SysAllocStringLen(units, 5), false))); // taken, not copied
    EXPECT_EQ(L'w', (s = _bstr_t(L"new"))[2]);
    EXPECT_THROW(static_cast<const ustring&>(s)[3], std::out_of_range); // operator[](size()) too
    EXPECT_THROW(ustring()[0], std::out_of_range);
    HINSTANCE self = ::GetModuleHandleW(NULL); // string 3 fills the first buffer of 255 units exactly
    EXPECT_TRUE(s.load(self, 3) && s == ustring(255, L'x'));
    EXPECT_TRUE(s.load(self, 2) && x.xload(self, 2) && s == ustring(300, L'L') + L"-end" && x == s);
    EXPECT_TRUE(!s.load(self, 4711) && s.empty());
    const ustring wide(L"a\x00E9\x20AC\xD83D\xDE00z\0end", 10);
    const std::string utf8("a\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80z\0end", 15);
    EXPECT_TRUE(utf8 == ustring::WideCharToMultiByte(wide, CP_UTF8, 0) && wide == ustring(utf8, CP_UTF8, 0));
    // npos: up to the terminator; an incomplete sequence gives U+FFFD; strict conversion rejects it whole.
    EXPECT_EQ(ustring(L"a\x00E9"), ustring::MultiByteToWideChar("a\xC3\xA9\0t", ustring::npos, CP_UTF8, 0));
    EXPECT_EQ(ustring(L"ab\xFFFD"), ustring::MultiByteToWideChar("ab\xC3", ustring::npos, CP_UTF8, 0));
    EXPECT_TRUE(ustring::MultiByteToWideChar(nullptr, 4, CP_UTF8, 0).empty());
    EXPECT_EQ(ustring(L"\x00E9"), ustring::MultiByteToWideChar("\xE9", 1, 1252, 0));
    EXPECT_EQ("ab\xEF\xBF\xBD", ustring::WideCharToMultiByte(L"ab\xD800", ustring::npos, CP_UTF8, 0));
    for (const char* bad : {"\xFF", "ok\xC3", "\xED\xA0\x80", "\xC0\xAF", "a\x80z"})
        EXPECT_TRUE(ustring(std::string(bad), CP_UTF8, MB_ERR_INVALID_CHARS).empty() &&
                    !ustring::MultiByteToWideChar(bad, ustring::npos, CP_UTF8, 0).empty());
    s = L"kept";
    EXPECT_THROW(s.sprintf(nullptr), std::invalid_argument); // Wine's msvcrt accepts any other format
    EXPECT_EQ(ustring(L"kept"), s);
    s.sprintf(L"%s|%S|%c|%C|%I64u|0x%X", L"wide", "narrow", L'w', 'n', 18446744073709551615ull, 0xBEEFu);
    EXPECT_EQ(ustring(L"wide|narrow|w|n|18446744073709551615|0xBEEF"), s);
    for (size_t n : {1023u, 1024u, 1025u, 5000u}) // around the first buffer of 1024 units
        EXPECT_EQ(L'<' + ustring(n - 1, L'y'), (s.sprintf(L"<%s", ustring(n - 1, L'y').c_str()), s));
    s.assign(1500, L'q'); // the argument points into the string, and the result needs a new buffer
    const ustring twice = s + L"|" + s;
    EXPECT_EQ(twice, (s.sprintf(L"%s|%s", s.c_str(), s.c_str()), s));
    const size_t all = ustring::npos; // a trailing zero unit equals an absent one; units are unsigned
    // clang-format off
    const std::tuple<ustring, ustring, size_t, bool, int> compared[] = { // a, b, count, without case, result
        {L"a", L"ab", all, false, -98}, {L"abcX", L"abcY", 3, false, 0}, {L"abcX", L"abcY", 4, false, -1}, {L"x", L"yz", 0, false, 0},
        {ustring(L"a\0", 2), L"a", all, false, 0}, {L"\xFFFF", L"\x0001", all, false, 65534}, {L"", L"\xFFFF", all, false, -65535},
        {L"\xD800", L"\x7FFF", all, false, 0xD800 - 0x7FFF}, {L"xYZ", L"xya", all, true, L'z' - L'a'}, {L"ABcd", L"abCE", 3, true, 0}, {L"", L"A", all, true, -L'a'}};
    // clang-format on
    for (const auto& [a, b, count, noCase, expected] : compared)
        EXPECT_TRUE((noCase ? a.compareNoCase(b, count) : a.compare(b, count)) == expected &&
                    (noCase ? b.compareNoCase(a, count) : b.compare(a, count)) == -expected);
    const ustring high(L"\xFFFF"); // the operators follow compare; a null pointer is the empty text
    const wchar_t* const null = nullptr;
    const ostrand::LessStrNotCaseSensitiveW ci;
    EXPECT_TRUE(high > L"\x0001" && !(high < L"\x0001") && high > null && ustring() == null &&
                ustring(L"a\0", 2) == L"a" && ostrand::LessStrCaseSensitiveW()(L"B", L"a") &&
                ci(L"a", L"B") && !ci(L"B", L"a") && !ci(L"ABC", L"abc") && !ci(L"abc", L"ABC"));
    const ostrand::LessStrWN wn; // only the first number counts; no digits and a dropped sign count as 0
    // clang-format off
    const std::tuple<const wchar_t*, const wchar_t*, bool> numbered[] = {{L"file2", L"file10", true}, {L"b2", L"a3", true},
        {L"2", L"-3", true}, {L"v1.9", L"v2.0", true}, {L"x7", L"y7", false}, {L"abc", L"x0", false}, {L"99999999999", L"2147483647", false}};
    // clang-format on
    for (const auto& [a, b, less] : numbered)
        EXPECT_TRUE(wn(a, b) == less && !wn(b, a)) << a;
    // Case mapping passes embedded zeros; inserted digits are not encoded again; e-acute is a letter, the
    // snowman not. Hex2Bin ("!": failed) skips blanks, drops an odd last digit, takes full-width digits,
    // clears stale output. GUID text round trip ("!": rejected with an all-zero GUID, even where the system
    // wrote part of it).
    // clang-format off
    const auto hex = [](ustring s) { std::vector<unsigned char> b{0x99}; const bool ok = ustring::Hex2Bin(s, b); return ustring::Bin2Hex(b, s), (ok ? L"" : L"!") + s; };
    const auto guid = [](ustring s) { GUID g = {1, 2, 3, {4}}; return ustring::String2GUID(s.c_str(), g) && ustring::GUID2String(g, s) ? s : IsEqualGUID(g, GUID()) ? L"!" : L"?"; };
#define EDIT(call) [](ustring s) -> ustring { return s.call, s; }
#define SUB(...) [](ustring s) -> ustring { return s.substr(__VA_ARGS__); }
    const std::tuple<ustring, ustring (*)(ustring), ustring> edits[] = {
        {L"   ", EDIT(trim(L' ')), L""}, {ustring(L"\0\0", 2), EDIT(trim(L'\0')), L""}, {L"  a  ", EDIT(trim_left(L' ')), L"a  "},
        {L"\n\"x\"\n", EDIT(trim(std::vector<wchar_t>{L'"', L'\n'})), L"x"}, {ustring(L"AbC1_z\0Q", 8), EDIT(strlwr()), ustring(L"abc1_z\0q", 8)},
        {ustring(L"AbC1_z\0q", 8), EDIT(strupr()), ustring(L"ABC1_Z\0Q", 8)}, {L"stale", [](ustring s) { return ustring::Bin2Hex({0x00, 0x0A, 0xFF}, s), s; }, L"000AFF"},
        {L"1%\x0F|\x0ABC|\xFFFF|\xD800", EDIT(replaceForbiddenSymbols(L"%1\x0F\x0ABC\xFFFF\xD800")), L"%31%25%0F|%ABC|%FFFF|%D800"},
        {ustring(L"Z9-\x00E9\x2603\0", 6), EDIT(replaceNonAlphaNumericSymbols()), L"Z9%2D\x00E9%2603%00"}, {L"0A 1b", hex, L"0A1B"}, {L"A\r\n\tBC", hex, L"AB"},
        {L"\xFF10\xFF21\xFF46", hex, L"0A"}, {L"0G", hex, L"!"}, {L"0x0A", hex, L"!"}, {ustring(L"00\0", 3), hex, L"!"}, {L"{6B29FC40-CA47-1067-B31D-00DD010662DG}", guid, L"!"},
        {L"{6b29fc40-ca47-1067-b31d-00dd010662da}", guid, L"{6B29FC40-CA47-1067-B31D-00DD010662DA}"}, {ustring(L"a,b;\0c", 6), EDIT(removeForbiddenSymbols2(L",;")), L",;"},
        {ustring(L"a,b;\0c", 6), EDIT(removeForbiddenSymbols(L",;")), ustring(L"ab\0c", 4)}, {L"a[b]c", SUB(L"[", L"]", true, true), L"[b"},
        {L"a[b", SUB(L"[", L"]", false, true), L""}, {L"a[b", SUB(L"[", L"]", false, false), L"b"}, {L"abc", SUB(L"[", L"]", false, false), L""},
        {L"ab]c]", SUB(nullptr, L"]", false, true), L"ab"}, {L"<a", SUB(L"<", nullptr, false, true), L"a"}, {L"]x[y]", SUB(L"[", L"]", false, true), L"y"}, {L"a|b|c", SUB(L"|", L"|", false, true), L"b"}};
#undef EDIT
#undef SUB
    // clang-format on
    for (const auto& [s, edit, expected] : edits)
        EXPECT_EQ(expected, edit(s)) << s.c_str();
    // text, delimiter (null: the multi-string form), keepLastEmpty, pieces; an empty delimiter cannot cut.
    // clang-format off
    const std::tuple<ustring, const wchar_t*, bool, std::vector<ustring>> rows[] = {
        {L"a,,b", L",", false, {L"a", L"", L"b"}}, {L"a,b,", L",", true, {L"a", L"b", L""}}, {L"a,b,", L",", false, {L"a", L"b"}},
        {L",", L",", false, {L""}}, {L"", L",", true, {}}, {L"x,,y, ", L", ", true, {L"x,,y", L""}}, {L"a--b---c", L"--", true, {L"a", L"b", L"-c"}},
        {L"a,b", L"", true, {L"a,b"}}, {ustring(L"a\0b;\0", 5), L";", false, {ustring(L"a\0b", 3), ustring(L"\0", 1)}},
        {ustring(L"a\0bc", 4), nullptr, false, {L"a", L"bc"}}, {ustring(L"a\0\0b\0\0", 6), nullptr, false, {L"a"}}, {ustring(L"\0a\0", 3), nullptr, false, {}}};
    // clang-format on
    for (const auto& [s, delimiter, keepLastEmpty, expected] : rows)
    {
        std::vector<ustring> v{L"stale"}, c = expected; // c: the form with a one-unit delimiter, if any
        std::set<ustring, ostrand::LessStrCaseSensitiveW> set{L"stale"};
        const auto split = [&text = s, d = delimiter, keep = keepLastEmpty](auto& out)
        { d == nullptr ? ustring::split(text, out) : ustring::split(text, d, out, keep); };
        split(v);
        split(set);
        if (delimiter != nullptr && std::wcslen(delimiter) == 1)
            ustring::split(s, delimiter[0], c, keepLastEmpty);
        EXPECT_TRUE(v == expected && c == expected && set == decltype(set)(expected.begin(), expected.end()));
    }
}

// The wildcard definition step by step, without any cleverness: exponential on purpose.
static int ReferenceMask(const wchar_t* s, size_t len, const wchar_t* m, bool noCase = false)
{
    for (size_t i = 0; i < len; ++i, ++m)
    {
        if (*m == L'*')
        {
            m += std::wcsspn(m, L"*?");
            for (size_t k = i; *m != L'\0' && k < len; ++k)
                if (ReferenceMask(s + k, len - k, m, noCase) == 0)
                    return 0;
            return *m == L'\0' ? 0 : ReferenceMask(s, len, m, noCase); // the whole (sub)string from its start
        }
        const wchar_t a[2] = {s[i], L'\0'}, b[2] = {*m, L'\0'}; // wchar_t is an unsigned 16-bit unit here
        const int c = *m == L'\0' ? 1 : *m == L'?' ? 0 : noCase ? ::_wcsicmp(a, b) : int(s[i]) - int(*m);
        if (c != 0)
            return (c > 0) - (c < 0);
    }
    return 0;
}

TEST(UstringRandomTest, MaskEqualsTheRecursiveDefinitionAndBadInputKeepsEveryInvariant)
{
    for (const auto& [mask, r] : {std::pair{L"a*c", 0}, {L"abd", -1}, {L"ab", 1}, {L"abcd", 0}, {L"*d", -1}})
        EXPECT_TRUE(ReferenceMask(L"abc", 3, mask) == r && ustring(L"abc").compareWithMask(mask) == r);
    const wchar_t stringUnits[] = L"abA*?", maskUnits[] = L"abB*?"; // the string's units include its zero
    std::mt19937 rng(1);
    for (int n = 0; n < 18000; ++n)
    {
        ustring s(rng() % 8, L' '), mask(rng() % 8, L' ');
        std::generate(s.begin(), s.end(), [&] { return stringUnits[rng() % 6]; });
        std::generate(mask.begin(), mask.end(), [&] { return maskUnits[rng() % 5]; });
        for (bool noCase : {false, true})
            ASSERT_EQ(ReferenceMask(s.data(), s.size(), mask.c_str(), noCase),
                      noCase ? s.compareWithMaskNoCase(mask.c_str()) : s.compareWithMask(mask.c_str()))
                << n;
    }
    // Adversarial: the text ends inside the mask (a match); a "c" after it ends the fallback chain at "b".
    const wchar_t* m = L"*a*a*a*a*a*a*a*a*a*b";
    const ustring as(10000, L'a'), small = ustring(12, L'a') + L"c";
    ASSERT_EQ(-1, ReferenceMask(small.data(), small.size(), m));
    EXPECT_TRUE(as.compareWithMask(m) == 0 && ustring(10000, L'A').compareWithMaskNoCase(m) == 0 &&
                (as + L"c").compareWithMask(m) == -1 && (as + L"C").compareWithMaskNoCase(m) == -1);
    rng.seed(7);
    const auto below = [&rng](unsigned n) { return unsigned(rng() % n); };
    const auto text = [&](unsigned maxLength, bool zeros)
    {
        ustring s; // zero, lone surrogate halves, full-width digits and letters, any unit, markers
        for (unsigned n = below(maxLength + 1); s.size() < n;)
        {
            const wchar_t c[] = {0, wchar_t(0xD800 + below(0x800)), wchar_t(0xFF10 + below(0x40)),
                                 wchar_t(below(0x10000)), L"aAbF09 ,;%-{}\r\n\t?*"[below(19)]};
            if (const wchar_t u = c[std::min(below(8), 4u)]; zeros || u != 0)
                s.push_back(u);
        }
        return s;
    };
    for (int n = 0; n < 4000; ++n)
    {
        SCOPED_TRACE(n);
        const ustring s = text(24, true), set = text(3, false), what = text(2, true), with = text(3, true);
        static const std::wregex loneHalf(
            L"[\xD800-\xDBFF](?![\xDC00-\xDFFF])|(?:^|[^\xD800-\xDBFF])[\xDC00-\xDFFF]");
        const bool lone = std::regex_search(s.begin(), s.end(), loneHalf); // what strict conversion rejects
        const std::string strictUtf8 = ustring::WideCharToMultiByte(s, CP_UTF8, WC_ERR_INVALID_CHARS);
        ASSERT_TRUE(lone ? strictUtf8.empty() : s == ustring(strictUtf8, CP_UTF8, MB_ERR_INVALID_CHARS));
        // Mostly invalid UTF-8: what strict conversion accepts converts back exactly.
        const std::string bytes(reinterpret_cast<const char*>(s.data()), s.size() * 2);
        const ustring strict(bytes, CP_UTF8, MB_ERR_INVALID_CHARS);
        ASSERT_TRUE(strict.empty() || bytes == ustring::WideCharToMultiByte(strict, CP_UTF8, 0));
        std::vector<ustring> pieces; // the pieces, free of the delimiter, joined by it give the text back
        ustring::split(s, set.c_str(), pieces, true);
        ustring joined, replaced = s, plain;
        for (size_t i = 0; i < pieces.size(); joined += (i == 0 ? ustring() : set) + pieces[i], ++i)
            ASSERT_TRUE(set.empty() || pieces[i].find(set) == ustring::npos);
        ASSERT_EQ(s, joined);
        replaced.replace(what, with); // replace equals a plain left-to-right loop
        size_t from = 0;
        for (size_t p; !what.empty() && (p = s.find(what, from)) != ustring::npos; from = p + what.size())
            plain.append(s, from, p - from).append(with);
        ASSERT_EQ(plain.append(s, from, ustring::npos), replaced);
        const bool hex =
            std::all_of(s.begin(), s.end(),
                        [](wchar_t c) { return ::iswxdigit(c) || (c != 0 && std::wcschr(L" \r\n\t", c)); });
        std::vector<unsigned char> bin{0x55};
        ASSERT_TRUE(hex == ustring::Hex2Bin(s, bin) &&
                    bin.size() == (hex ? size_t(std::count_if(s.begin(), s.end(), ::iswxdigit)) / 2 : 0u));
        GUID guid = {0x12345678, 1, 2, {3}}; // text of any shape: accepted, or rejected with a zero GUID
        ASSERT_TRUE(ustring::String2GUID(text(40, false).c_str(), guid) || IsEqualGUID(GUID(), guid));
    }
}
