// ustring editing: trimming, splitting, cutting, replacing, encoding, case, hex and GUID text.
#include <ostrand/text/ustring.h>

#include <gtest/gtest.h>

#include <cstring>
#include <list>
#include <set>
#include <vector>

using ostrand::ustring;
typedef std::vector<ustring> Pieces;
typedef std::set<ustring, ostrand::LessStrCaseSensitiveW> PieceSet;

TEST(UstringEditTest, Trim)
{
    EXPECT_EQ(ustring(), ustring(L"   ").trim(L' '));
    EXPECT_EQ(ustring(L"a b"), ustring(L"  a b ").trim(L' '));
    EXPECT_EQ(ustring(L"a  "), ustring(L"  a  ").trim_left(L' '));
    EXPECT_EQ(ustring(L"  a"), ustring(L"  a  ").trim_right(L' '));
    EXPECT_EQ(ustring(L"a"), ustring(L"abc").trim_right(std::vector<wchar_t>{L'c', L'b'}));
    EXPECT_EQ(ustring(L"x\"\n"), ustring(L"\n\"x\"\n").trim_left(std::vector<wchar_t>{L'"', L'\n'}));
    EXPECT_EQ(ustring(L"x"), ustring(L"\n\"x\"\n").trim(std::vector<wchar_t>{L'"', L'\n'}));
    EXPECT_EQ(ustring(L" a "), ustring(L" a ").trim(std::vector<wchar_t>()));
    EXPECT_EQ(ustring(), ustring(L"\0\0", 2).trim(L'\0'));
    ustring s(L"..a..");
    EXPECT_EQ(&s, &s.trim(L'.'));
}

TEST(UstringEditTest, SplitWithADelimiter)
{
    struct Row
    {
        const wchar_t* s;
        const wchar_t* delimiter;
        bool keepLastEmpty;
        Pieces expected;
    };
    const Row rows[] = {
        {L"a,b", L",", false, {L"a", L"b"}},
        {L"a,,b", L",", false, {L"a", L"", L"b"}},
        {L",a", L",", false, {L"", L"a"}},
        {L"a,b,", L",", true, {L"a", L"b", L""}},
        {L"a,b,", L",", false, {L"a", L"b"}},
        {L",", L",", true, {L"", L""}},
        {L",", L",", false, {L""}},
        {L"", L",", true, {}},
        {L"abc", L",", true, {L"abc"}},
        {L"x, y", L", ", false, {L"x", L"y"}},
        {L"x,,y, ", L", ", true, {L"x,,y", L""}},
        {L"a--b---c", L"--", true, {L"a", L"b", L"-c"}},
        {L"ab", L"abc", true, {L"ab"}},
        {L"a,b", L"", true, {L"a,b"}}, // an empty delimiter cannot cut: the whole text is one piece
        {L"a,b", nullptr, true, {L"a,b"}},
    };
    for (const Row& r : rows)
    {
        SCOPED_TRACE(testing::Message() << "row " << (&r - rows));
        Pieces v{L"stale"};
        ustring::split(r.s, r.delimiter, v, r.keepLastEmpty);
        EXPECT_EQ(r.expected, v);
        std::list<ustring> l{L"stale"};
        ustring::split(r.s, r.delimiter, l, r.keepLastEmpty);
        EXPECT_EQ(r.expected, Pieces(l.begin(), l.end()));
        PieceSet set{L"stale"};
        ustring::split(r.s, r.delimiter, set, r.keepLastEmpty);
        EXPECT_EQ(PieceSet(r.expected.begin(), r.expected.end()), set);
        if (r.delimiter != nullptr && std::wcslen(r.delimiter) == 1)
        {
            Pieces c;
            ustring::split(r.s, r.delimiter[0], c, r.keepLastEmpty);
            EXPECT_EQ(r.expected, c);
        }
    }
    PieceSet set;
    ustring::split(L"a,b,a", L',', set, false);
    EXPECT_EQ((PieceSet{L"a", L"b"}), set);
    Pieces withZeros;
    ustring::split(ustring(L"a\0b;\0", 5), L';', withZeros, false);
    EXPECT_EQ((Pieces{ustring(L"a\0b", 3), ustring(L"\0", 1)}), withZeros);
}

TEST(UstringEditTest, SplitAMultiString)
{
    struct Row
    {
        ustring s;
        Pieces expected;
    };
    const Row rows[] = {
        {ustring(L"a\0bc\0\0", 6), {L"a", L"bc"}},
        {ustring(L"a\0bc", 4), {L"a", L"bc"}}, // the string's own terminator ends the last entry
        {ustring(L"a\0\0b\0\0", 6), {L"a"}},   // an empty entry ends the list
        {ustring(L"\0a\0", 3), {}},
        {ustring(), {}},
    };
    for (const Row& r : rows)
    {
        SCOPED_TRACE(testing::Message() << "row " << (&r - rows));
        Pieces v{L"stale"};
        ustring::split(r.s, v);
        EXPECT_EQ(r.expected, v);
        std::list<ustring> l;
        ustring::split(r.s, l);
        EXPECT_EQ(r.expected, Pieces(l.begin(), l.end()));
        PieceSet set;
        ustring::split(r.s, set);
        EXPECT_EQ(PieceSet(r.expected.begin(), r.expected.end()), set);
    }
}

TEST(UstringEditTest, SubstrBetweenMarkers)
{
    struct Row
    {
        const wchar_t* s;
        const wchar_t* begin;
        const wchar_t* end;
        bool keepBegin, needEnd;
        const wchar_t* expected;
    };
    const Row rows[] = {
        {L"a[b]c", L"[", L"]", false, true, L"b"},       {L"a[b]c", L"[", L"]", true, true, L"[b"},
        {L"a[b", L"[", L"]", false, true, L""},          {L"a[b", L"[", L"]", false, false, L"b"},
        {L"abc", L"[", L"]", false, false, L""},         {L"", nullptr, nullptr, true, false, L""},
        {L"abc", nullptr, nullptr, false, true, L"abc"}, {L"ab]c]", nullptr, L"]", false, true, L"ab"},
        {L"]x[y]", L"[", L"]", false, true, L"y"}, // the end marker is searched after the begin marker
        {L"<<a>>b>>", L"<<", L">>", true, true, L"<<a"}, {L"x<<>>", L"<<", L">>", false, true, L""},
        {L"<a", L"<", nullptr, false, true, L"a"},       {L"a|b|c", L"|", L"|", false, true, L"b"},
        {L"a|", L"|", L"|", false, true, L""},
    };
    for (const Row& r : rows)
    {
        SCOPED_TRACE(testing::Message() << "row " << (&r - rows));
        const ustring s(r.s);
        EXPECT_EQ(ustring(r.expected), s.substr(r.begin, r.end, r.keepBegin, r.needEnd));
        EXPECT_EQ(ustring(r.s), s);
    }
}

TEST(UstringEditTest, ReplaceScansOnlyTheOriginalText)
{
    struct Row
    {
        const wchar_t *s, *what, *with, *expected;
    };
    const Row rows[] = {
        {L"aaa", L"aa", L"b", L"ba"},   {L"aaa", L"a", L"aa", L"aaaaaa"},   {L"aaaa", L"aa", L"a", L"aa"},
        {L"Abab", L"ab", L"x", L"Abx"}, {L"abc", L"d", L"x", L"abc"},       {L"a-b-c", L"-", L"", L"abc"},
        {L"abc", L"", L"x", L"abc"}, // an empty pattern changes nothing
        {L"", L"a", L"b", L""},         {L"xyx", L"x", L"xyx", L"xyxyxyx"},
    };
    for (const Row& r : rows)
    {
        SCOPED_TRACE(testing::Message() << "row " << (&r - rows));
        ustring s(r.s);
        s.replace(r.what, r.with);
        EXPECT_EQ(ustring(r.expected), s);
    }
    ustring z(L"a\0a", 3);
    z.replace(ustring(L"\0", 1), L"-");
    EXPECT_EQ(ustring(L"a-a"), z);
}

TEST(UstringEditTest, RemoveAndPercentEncodeSymbols)
{
    ustring s(L"a/b\\c:d");
    s.removeForbiddenSymbols(L"\\/:");
    EXPECT_EQ(ustring(L"abcd"), s);
    s = L"abc";
    s.removeForbiddenSymbols(L"");
    EXPECT_EQ(ustring(L"abc"), s);
    s = L"0x1F-zz";
    s.removeForbiddenSymbols2(L"0123456789ABCDEF");
    EXPECT_EQ(ustring(L"01F"), s);
    s = L"abc";
    s.removeForbiddenSymbols2(L"");
    EXPECT_TRUE(s.empty());

    struct Row
    {
        ustring s;
        const wchar_t* set;
        const wchar_t* expected;
    };
    const Row rows[] = {
        {L"a%", L"a%", L"%61%25"},
        {L"a%", L"%a", L"%61%25"},
        {L"1%", L"%1", L"%31%25"}, // the inserted digits are not encoded again
        {L"a b", L" ", L"a%20b"},
        {L"\x0F", L"\x0F", L"%0F"},
        {L"\x0100|\x0ABC|\x1234|\xFFFF", L"\x0100\x0ABC\x1234\xFFFF", L"%100|%ABC|%1234|%FFFF"},
        {L"\xD800", L"\xD800", L"%D800"},
        {L"abc", L"", L"abc"},
    };
    for (const Row& r : rows)
    {
        SCOPED_TRACE(testing::Message() << "row " << (&r - rows));
        ustring t(r.s);
        t.replaceForbiddenSymbols(r.set);
        EXPECT_EQ(ustring(r.expected), t);
    }

    s = L"a b";
    s.replaceNonAlphaNumericSymbols();
    EXPECT_EQ(ustring(L"a%20b"), s);
    s = ustring(L"Z9-\x00E9\x2603\0", 6); // e-acute is a letter to the runtime, the snowman is not
    s.replaceNonAlphaNumericSymbols();
    EXPECT_EQ(ustring(L"Z9%2D\x00E9%2603%00"), s);
}

TEST(UstringEditTest, CaseMapping)
{
    ustring s(L"AbC1_z\0Q", 8);
    s.strlwr();
    EXPECT_EQ(ustring(L"abc1_z\0q", 8), s);
    s.strupr();
    EXPECT_EQ(ustring(L"ABC1_Z\0Q", 8), s);
}

TEST(UstringEditTest, HexText)
{
    ustring hex(L"stale");
    ustring::Bin2Hex({0x00, 0xFF}, hex);
    EXPECT_EQ(ustring(L"00FF"), hex);
    ustring::Bin2Hex({}, hex);
    EXPECT_TRUE(hex.empty());
    ustring::Bin2Hex({0x0A, 0x1B, 0xC0}, hex);
    EXPECT_EQ(ustring(L"0A1BC0"), hex);

    struct Row
    {
        const wchar_t* hex;
        bool ok;
        std::vector<unsigned char> bytes;
    };
    const Row rows[] = {
        {L"0A 1b", true, {0x0A, 0x1B}},
        {L"0G", false, {}},
        {L"ABC", true, {0xAB}},
        {L"", true, {}},
        {L"A\r\n\tB", true, {0xAB}}, // blanks also between the two digits of a pair
        {L"ff00 ", true, {0xFF, 0x00}},
        {L"0A-1B", false, {}},
        {L"0x0A", false, {}},
        {L"\xFF10\xFF21\xFF46", true, {0x0A}}, // full-width digits are hex digits to the runtime
        {L"12\x00A0", false, {}},
    };
    for (const Row& r : rows)
    {
        SCOPED_TRACE(testing::Message() << "row " << (&r - rows));
        std::vector<unsigned char> bytes{0x99};
        EXPECT_EQ(r.ok, ustring::Hex2Bin(r.hex, bytes));
        EXPECT_EQ(r.bytes, bytes);
    }
    std::vector<unsigned char> bytes{0x99};
    EXPECT_FALSE(ustring::Hex2Bin(ustring(L"00\0", 3), bytes));
    EXPECT_TRUE(bytes.empty());
}

TEST(UstringEditTest, GuidText)
{
    const GUID guid = {0x6B29FC40, 0xCA47, 0x1067, {0xB3, 0x1D, 0x00, 0xDD, 0x01, 0x06, 0x62, 0xDA}};
    ustring text;
    ASSERT_TRUE(ustring::GUID2String(guid, text));
    EXPECT_EQ(ustring(L"{6B29FC40-CA47-1067-B31D-00DD010662DA}"), text);

    GUID back;
    ASSERT_TRUE(ustring::String2GUID(text, back));
    EXPECT_TRUE(IsEqualGUID(guid, back));
    EXPECT_TRUE(ustring::String2GUID(L"{6b29fc40-ca47-1067-b31d-00dd010662da}", back));
    EXPECT_TRUE(IsEqualGUID(guid, back));

    // Whatever CLSIDFromString rejects gives false and an all-zero GUID, even where the system has
    // already written part of it.
    for (const wchar_t* bad :
         {L"{6B29FC40-CA47-1067-B31D-00DD010662DA}x", L"{6B29FC40-CA47-1067-B31D-00DD010662DG}",
          L"6B29FC40-CA47-1067-B31D-00DD010662DA", L"{6B29FC40-CA47-1067-B31D-00DD010662D}", L"{", L"",
          L"}{"})
    {
        SCOPED_TRACE(testing::Message()
                     << "[" << ustring::WideCharToMultiByte(bad, ustring::npos, CP_UTF8, 0) << "]");
        GUID g = guid;
        EXPECT_FALSE(ustring::String2GUID(bad, g));
        EXPECT_TRUE(IsEqualGUID(GUID(), g));
    }
    // A null text is what CLSIDFromString reads as the null GUID.
    GUID g = guid;
    EXPECT_TRUE(ustring::String2GUID(nullptr, g));
    EXPECT_TRUE(IsEqualGUID(GUID(), g));
}
