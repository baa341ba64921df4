// ustring: construction, conversion, resources, formatting and comparison.
#include <ostrand/text/ustring.h>
#include <gtest/gtest.h>
#include <oleauto.h>
#include <cstring>
#include <stdexcept>
#include <tuple>

using ostrand::ustring;

TEST(UstringTest, ConstructionIndexAndResources)
{
    const wchar_t units[] = {L'a', L'b', L'\0', L'c', L'd'};
    EXPECT_EQ(2u, ustring(units, ustring::npos).size());
    EXPECT_TRUE(ustring(nullptr, 3).empty() && ustring(_bstr_t(static_cast<BSTR>(nullptr), false)).empty());
    ustring s(L"x");
    EXPECT_TRUE((s = static_cast<const wchar_t*>(nullptr)).empty());
    // The BSTR is handed over to the _bstr_t (no copy), which frees it.
    EXPECT_EQ(ustring(units, 5), ustring(_bstr_t(::SysAllocStringLen(units, 5), false)));
    s = _bstr_t(L"new");
    EXPECT_EQ(L'w', s[2]);
    EXPECT_THROW(static_cast<const ustring&>(s)[3], std::out_of_range); // operator[](size()) too
    EXPECT_THROW(ustring()[0], std::out_of_range);
    HINSTANCE self = ::GetModuleHandleW(NULL); // resource strings of any length load whole
    ustring x;
    ASSERT_TRUE(s.load(self, 3)); // exactly fills a first buffer of 255 units
    EXPECT_EQ(ustring(255, L'x'), s);
    ASSERT_TRUE(s.load(self, 2));
    EXPECT_EQ(ustring(300, L'L') + L"-end", s);
    EXPECT_TRUE(x.xload(self, 2)); // no translator yet: xload gives exactly what load gives
    EXPECT_EQ(s, x);
    EXPECT_TRUE(!s.load(self, 4711) && s.empty());
}

TEST(UstringTest, CodePageConversions)
{
    // Every UTF-8 sequence length, a surrogate pair and an embedded zero survive a round trip.
    const ustring wide(L"a\x00E9\x20AC\xD83D\xDE00z\0end", 10);
    const std::string utf8("a\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80z\0end", 15);
    EXPECT_EQ(utf8, ustring::WideCharToMultiByte(wide, CP_UTF8, 0));
    EXPECT_EQ(wide, ustring(utf8, CP_UTF8, 0));
    // npos: up to the terminator; an incomplete sequence before it still gives a replacement character.
    EXPECT_EQ(ustring(L"a\x00E9"), ustring::MultiByteToWideChar("a\xC3\xA9\0t", ustring::npos, CP_UTF8, 0));
    EXPECT_EQ(ustring(L"ab\xFFFD"), ustring::MultiByteToWideChar("ab\xC3", ustring::npos, CP_UTF8, 0));
    EXPECT_EQ(std::string("ab\xEF\xBF\xBD"),
              ustring::WideCharToMultiByte(L"ab\xD800", ustring::npos, CP_UTF8, 0));
    EXPECT_TRUE(ustring::MultiByteToWideChar(nullptr, 4, CP_UTF8, 0).empty());
    for (const char* bad : {"\xFF", "ok\xC3", "\xED\xA0\x80", "\xC0\xAF", "a\x80z"})
    {
        SCOPED_TRACE(bad); // rejected whole with MB_ERR_INVALID_CHARS, never an exception
        EXPECT_TRUE(ustring(std::string(bad), CP_UTF8, MB_ERR_INVALID_CHARS).empty());
        EXPECT_FALSE(ustring::MultiByteToWideChar(bad, std::strlen(bad), CP_UTF8, 0).empty());
    }
    EXPECT_EQ(ustring(L"\x00E9"), ustring::MultiByteToWideChar("\xE9", 1, 1252, 0));
}

TEST(UstringTest, SprintfLegacyWideModeLongOutputAndSelfArguments)
{
    ustring s(L"kept");
    EXPECT_THROW(s.sprintf(nullptr), std::invalid_argument); // Wine's msvcrt accepts any other format
    EXPECT_EQ(ustring(L"kept"), s);
    s.sprintf(L"%s|%S|%c|%C|%I64u|0x%X", L"wide", "narrow", L'w', 'n', 18446744073709551615ull, 0xBEEFu);
    EXPECT_EQ(ustring(L"wide|narrow|w|n|18446744073709551615|0xBEEF"), s);
    for (size_t n : {1023u, 1024u, 1025u, 5000u}) // around the first buffer of 1024 units
    {
        s.sprintf(L"<%s", ustring(n - 1, L'y').c_str());
        EXPECT_EQ(L'<' + ustring(n - 1, L'y'), s);
    }
    s.assign(1500, L'q'); // the argument points into the string, and the result needs a new buffer
    const ustring expected = s + L"|" + s;
    s.sprintf(L"%s|%s", s.c_str(), s.c_str());
    EXPECT_EQ(expected, s);
}

TEST(UstringTest, CompareReturnsTheCodeUnitDifferenceAndFunctorsOrder)
{
    const size_t all = ustring::npos; // a trailing zero unit equals an absent one; units are unsigned
    // clang-format off
    const std::tuple<ustring, ustring, size_t, int> rows[] = {
        {L"a", L"ab", all, -98}, {L"abcX", L"abcY", 3, 0}, {L"abcX", L"abcY", 4, -1}, {L"x", L"yz", 0, 0},
        {ustring(L"a\0", 2), L"a", all, 0}, {L"\xFFFF", L"\x0001", all, 65534}, {L"", L"\xFFFF", all, -65535},
        {L"\xD800", L"\x7FFF", all, 0xD800 - 0x7FFF}};
    // clang-format on
    for (const auto& [a, b, count, expected] : rows)
    {
        EXPECT_EQ(expected, a.compare(b, count)) << expected;
        EXPECT_EQ(-expected, b.compare(a, count)) << expected;
        const bool operatorsFollow =
            (a == b) == (expected == 0) && (a < b) == (expected < 0) && (a >= b.c_str()) == (expected >= 0);
        EXPECT_TRUE(count != all || operatorsFollow) << expected;
    }
    EXPECT_EQ(L'z' - L'a', ustring(L"xYZ").compareNoCase(L"xya", ustring::npos));
    EXPECT_EQ(0, ustring(L"ABcd").compareNoCase(L"abCE", 3));
    EXPECT_EQ(-L'a', ustring(L"").compareNoCase(L"A", ustring::npos));
    EXPECT_TRUE(ustring() == static_cast<const wchar_t*>(nullptr)); // a null pointer is the empty text
    EXPECT_TRUE(ustring(L"a") > static_cast<const wchar_t*>(nullptr));
    const ostrand::LessStrNotCaseSensitiveW ci;
    EXPECT_TRUE(ostrand::LessStrCaseSensitiveW()(L"B", L"a"));
    EXPECT_TRUE(ci(L"a", L"B") && !ci(L"B", L"a") && !ci(L"ABC", L"abc") && !ci(L"abc", L"ABC"));
    const ostrand::LessStrWN wn; // only the first number counts; no digits and a dropped sign count as 0
    const wchar_t* const less[][2] = {
        {L"file2", L"file10"}, {L"b2", L"a3"}, {L"2", L"-3"}, {L"v1.9", L"v2.0"}};
    for (const auto& r : less)
        EXPECT_TRUE(wn(r[0], r[1]) && !wn(r[1], r[0])) << r[0];
    const wchar_t* const same[][2] = {{L"x7", L"y7"}, {L"abc", L"x0"}, {L"99999999999", L"2147483647"}};
    for (const auto& r : same)
        EXPECT_TRUE(!wn(r[0], r[1]) && !wn(r[1], r[0])) << r[0];
}
