// ustring editing and wildcard masks: the edge cases as tables, and the mask against its plain definition.
#include <ostrand/text/ustring.h>
#include <gtest/gtest.h>
#include <algorithm>
#include <cwchar>
#include <list>
#include <random>
#include <set>
#include <tuple>
#include <vector>

using ostrand::ustring;
typedef std::vector<ustring> Pieces;

TEST(UstringEditTest, TrimCaseAndSymbols)
{
    EXPECT_EQ(ustring(), ustring(L"   ").trim(L' '));
    EXPECT_EQ(ustring(L"a  "), ustring(L"  a  ").trim_left(L' '));
    EXPECT_EQ(ustring(L"x"), ustring(L"\n\"x\"\n").trim(std::vector<wchar_t>{L'"', L'\n'}));
    EXPECT_EQ(ustring(), ustring(L"\0\0", 2).trim(L'\0'));
    ustring s(L"AbC1_z\0Q", 8); // case mapping goes past embedded zeros
    s.strlwr();
    EXPECT_EQ(ustring(L"abc1_z\0q", 8), s);
    s.strupr();
    EXPECT_EQ(ustring(L"ABC1_Z\0Q", 8), s);
    s = L"1%\x0F|\x0ABC|\xFFFF|\xD800"; // the inserted digits are not encoded again
    s.replaceForbiddenSymbols(L"%1\x0F\x0ABC\xFFFF\xD800");
    EXPECT_EQ(ustring(L"%31%25%0F|%ABC|%FFFF|%D800"), s);
    s = ustring(L"Z9-\x00E9\x2603\0", 6); // e-acute is a letter to the runtime, the snowman is not
    s.replaceNonAlphaNumericSymbols();
    EXPECT_EQ(ustring(L"Z9%2D\x00E9%2603%00"), s);
}

TEST(UstringEditTest, SplitFillsEveryContainerAlikeAndSubstrCuts)
{
    // text, delimiter (null: the multi-string form), keepLastEmpty, pieces; an empty delimiter cannot cut.
    // clang-format off
    const std::tuple<ustring, const wchar_t*, bool, Pieces> rows[] = {
        {L"a,,b", L",", false, {L"a", L"", L"b"}}, {L"a,b,", L",", true, {L"a", L"b", L""}},
        {L"a,b,", L",", false, {L"a", L"b"}}, {L",", L",", false, {L""}}, {L"", L",", true, {}},
        {L"x,,y, ", L", ", true, {L"x,,y", L""}}, {L"a--b---c", L"--", true, {L"a", L"b", L"-c"}},
        {L"a,b", L"", true, {L"a,b"}}, {ustring(L"a\0b;\0", 5), L";", false, {ustring(L"a\0b", 3), ustring(L"\0", 1)}},
        {ustring(L"a\0bc", 4), nullptr, false, {L"a", L"bc"}}, {ustring(L"a\0\0b\0\0", 6), nullptr, false, {L"a"}},
        {ustring(L"\0a\0", 3), nullptr, false, {}}};
    // clang-format on
    for (const auto& [s, delimiter, keepLastEmpty, expected] : rows)
    {
        Pieces v{L"stale"};
        std::list<ustring> l{L"stale"};
        std::set<ustring, ostrand::LessStrCaseSensitiveW> set{L"stale"};
        const auto split = [&text = s, d = delimiter, keep = keepLastEmpty](auto& out)
        { d == nullptr ? ustring::split(text, out) : ustring::split(text, d, out, keep); };
        split(v), split(l), split(set);
        EXPECT_EQ(expected, v);
        EXPECT_EQ(expected, Pieces(l.begin(), l.end()));
        EXPECT_EQ(decltype(set)(expected.begin(), expected.end()), set);
        Pieces c = expected; // the form with a one-unit delimiter
        if (delimiter != nullptr && std::wcslen(delimiter) == 1)
            ustring::split(s, delimiter[0], c, keepLastEmpty);
        EXPECT_EQ(expected, c);
    }
    // clang-format off
    const std::tuple<const wchar_t*, const wchar_t*, const wchar_t*, bool, bool, const wchar_t*> cuts[] = {
        {L"a[b]c", L"[", L"]", true, true, L"[b"}, {L"a[b", L"[", L"]", false, true, L""},
        {L"a[b", L"[", L"]", false, false, L"b"}, {L"abc", L"[", L"]", false, false, L""},
        {L"ab]c]", nullptr, L"]", false, true, L"ab"}, {L"<a", L"<", nullptr, false, true, L"a"},
        {L"]x[y]", L"[", L"]", false, true, L"y"}, {L"a|b|c", L"|", L"|", false, true, L"b"}};
    // clang-format on
    for (const auto& [s, begin, end, keepBegin, needEnd, expected] : cuts)
        EXPECT_EQ(ustring(expected), ustring(s).substr(begin, end, keepBegin, needEnd)) << s;
}

TEST(UstringEditTest, HexAndGuidText)
{
    ustring hex(L"stale");
    ustring::Bin2Hex({0x00, 0x0A, 0xFF}, hex);
    EXPECT_EQ(ustring(L"000AFF"), hex);
    // Blanks are skipped anywhere, an odd last digit dropped; full-width digits are hex digits too.
    // clang-format off
    const std::tuple<ustring, bool, std::vector<unsigned char>> rows[] = {
        {L"0A 1b", true, {0x0A, 0x1B}}, {L"A\r\n\tBC", true, {0xAB}}, {L"0G", false, {}},
        {L"0x0A", false, {}}, {ustring(L"00\0", 3), false, {}}, {L"\xFF10\xFF21\xFF46", true, {0x0A}}};
    // clang-format on
    for (const auto& [text, ok, expected] : rows)
    {
        std::vector<unsigned char> bytes{0x99};
        EXPECT_EQ(ok, ustring::Hex2Bin(text, bytes));
        EXPECT_EQ(expected, bytes);
    }

    const GUID guid = {0x6B29FC40, 0xCA47, 0x1067, {0xB3, 0x1D, 0x00, 0xDD, 0x01, 0x06, 0x62, 0xDA}};
    ASSERT_TRUE(ustring::GUID2String(guid, hex));
    EXPECT_EQ(ustring(L"{6B29FC40-CA47-1067-B31D-00DD010662DA}"), hex);
    GUID back = GUID();
    EXPECT_TRUE(ustring::String2GUID(L"{6b29fc40-ca47-1067-b31d-00dd010662da}", back) &&
                IsEqualGUID(guid, back));
    // Rejected: an all-zero GUID, even where the system has already written part of it.
    EXPECT_FALSE(ustring::String2GUID(L"{6B29FC40-CA47-1067-B31D-00DD010662DG}", back));
    EXPECT_TRUE(IsEqualGUID(GUID(), back));
}

static int CompareUnits(wchar_t s, wchar_t m, bool noCase)
{
    const wchar_t a[2] = {s, L'\0'}, b[2] = {m, L'\0'};
    const int r = noCase ? ::_wcsicmp(a, b) : int(s) - int(m); // wchar_t is an unsigned 16-bit unit here
    return (r > 0) - (r < 0);
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
        const int c = *m == L'\0' ? 1 : *m == L'?' ? 0 : CompareUnits(s[i], *m, noCase);
        if (c != 0)
            return c;
    }
    return 0;
}

TEST(UstringMaskTest, EqualsTheRecursiveDefinition)
{
    const wchar_t* const masks[] = {L"a*c", L"abd", L"ab", L"abcd", L"*d"}; // against "abc"
    const int expected[] = {0, -1, 1, 0, -1};
    for (int i = 0; i < 5; ++i)
        EXPECT_TRUE(ReferenceMask(L"abc", 3, masks[i]) == expected[i] &&
                    ustring(L"abc").compareWithMask(masks[i]) == expected[i])
            << masks[i];
    const wchar_t stringUnits[] = L"abA*?", maskUnits[] = L"abB*?"; // the string's units include its zero
    std::mt19937 rng(1);
    for (int n = 0; n < 18000; ++n)
    {
        ustring s(rng() % 8, L' ');
        std::wstring mask(rng() % 8, L' ');
        std::generate(s.begin(), s.end(), [&rng, &stringUnits] { return stringUnits[rng() % 6]; });
        std::generate(mask.begin(), mask.end(), [&rng, &maskUnits] { return maskUnits[rng() % 5]; });
        SCOPED_TRACE(n);
        ASSERT_EQ(ReferenceMask(s.data(), s.size(), mask.c_str()), s.compareWithMask(mask.c_str()));
        ASSERT_EQ(ReferenceMask(s.data(), s.size(), mask.c_str(), true),
                  s.compareWithMaskNoCase(mask.c_str()));
    }
}

TEST(UstringMaskTest, AdversarialMaskFinishes)
{
    const wchar_t* mask = L"*a*a*a*a*a*a*a*a*a*b";
    EXPECT_EQ(0, ustring(10000, L'a').compareWithMask(mask)); // the text ends inside the mask: a match
    EXPECT_EQ(0, ustring(10000, L'A').compareWithMaskNoCase(mask));
    const ustring small = ustring(12, L'a') + L"c"; // no match; the fallback chain ends at "b"
    ASSERT_EQ(-1, ReferenceMask(small.data(), small.size(), mask));
    EXPECT_EQ(-1, (ustring(10000, L'a') + L"c").compareWithMask(mask));
    EXPECT_EQ(-1, (ustring(10000, L'a') + L"C").compareWithMaskNoCase(mask));
}
