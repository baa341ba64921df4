// Wildcard comparison: the library's result must equal the plain recursive definition, on every input.
#include <ostrand/text/ustring.h>

#include <gtest/gtest.h>

#include <cwchar>
#include <random>

using ostrand::ustring;

namespace
{

int CompareCase(wchar_t s, wchar_t m)
{
    return static_cast<unsigned short>(s) < static_cast<unsigned short>(m)
               ? -1
               : (static_cast<unsigned short>(s) > static_cast<unsigned short>(m) ? 1 : 0);
}

int CompareNoCase(wchar_t s, wchar_t m)
{
    const wchar_t a[2] = {s, L'\0'}, b[2] = {m, L'\0'};
    const int r = ::_wcsicmp(a, b);
    return r < 0 ? -1 : (r > 0 ? 1 : 0);
}

// The definition, step by step and without any cleverness: exponential on purpose.
int ReferenceMask(const wchar_t* s, size_t len, const wchar_t* mask, int (*cmp)(wchar_t, wchar_t))
{
    if (len == 0)
        return 0;
    size_t i = 0;
    for (const wchar_t* m = mask;;)
    {
        if (*m == L'\0')
            return 1;
        if (*m == L'*')
        {
            while (*m == L'*' || *m == L'?')
                ++m;
            if (*m == L'\0')
                return 0;
            for (size_t k = i; k < len; ++k)
                if (ReferenceMask(s + k, len - k, m, cmp) == 0)
                    return 0;
            return ReferenceMask(s, len, m, cmp);
        }
        if (*m != L'?')
        {
            const int c = cmp(s[i], *m);
            if (c != 0)
                return c;
        }
        ++i;
        ++m;
        if (i == len)
            return 0;
    }
}

} // namespace

TEST(UstringMaskTest, DocumentedCases)
{
    struct Row
    {
        const wchar_t *s, *mask;
        int expected;
    };
    const Row rows[] = {
        {L"abc", L"a*c", 0},  {L"abc", L"a?c", 0}, {L"abc", L"abd", -1}, {L"abc", L"ab", 1},
        {L"abc", L"abcd", 0}, {L"", L"x", 0},      {L"", L"", 0},        {L"xyz", L"*", 0},
        {L"abc", L"", 1},     {L"abc", L"*d", -1}, {L"abc", L"?*?c", 0}, {L"b", L"a*", 1},
        {L"abc", L"*?", 0},   {L"abc", L"B*", 1},
    };
    for (const Row& r : rows)
    {
        SCOPED_TRACE(testing::Message() << "row " << (&r - rows));
        EXPECT_EQ(r.expected, ustring(r.s).compareWithMask(r.mask));
    }
    EXPECT_EQ(0, ustring(L"ABC").compareWithMaskNoCase(L"a*c"));
    EXPECT_EQ(-1, ustring(L"ABC").compareWithMaskNoCase(L"abd"));
    EXPECT_EQ(1, ustring(L"abc").compareWithMask(L"ABC"));
    EXPECT_EQ(0, ustring(L"a\0b", 3).compareWithMask(L"a?b"));
}

TEST(UstringMaskTest, EqualsTheRecursiveDefinitionOnRandomInputs)
{
    const wchar_t stringUnits[] = {L'a', L'b', L'A', L'*', L'?', L'\0'};
    const wchar_t maskUnits[] = {L'a', L'b', L'B', L'*', L'?'};
    for (unsigned seed : {1u, 2u, 3u})
    {
        std::mt19937 rng(seed);
        for (int n = 0; n < 6000; ++n)
        {
            ustring s(rng() % 8, L' ');
            for (wchar_t& c : static_cast<std::wstring&>(s))
                c = stringUnits[rng() % 6];
            std::wstring mask(rng() % 8, L' ');
            for (wchar_t& c : mask)
                c = maskUnits[rng() % 5];
            SCOPED_TRACE(testing::Message() << "seed " << seed << " case " << n);
            ASSERT_EQ(ReferenceMask(s.data(), s.size(), mask.c_str(), CompareCase),
                      s.compareWithMask(mask.c_str()));
            ASSERT_EQ(ReferenceMask(s.data(), s.size(), mask.c_str(), CompareNoCase),
                      s.compareWithMaskNoCase(mask.c_str()));
        }
    }
}

TEST(UstringMaskTest, AdversarialMaskFinishes)
{
    const wchar_t* mask = L"*a*a*a*a*a*a*a*a*a*b";
    // A suffix that ends inside the mask matches, so a text of only a's matches.
    EXPECT_EQ(0, ustring(10000, L'a').compareWithMask(mask));
    EXPECT_EQ(0, ustring(10000, L'A').compareWithMaskNoCase(mask));
    // Ending in a unit no segment starts with, nothing matches and the fallback chain ends at "b".
    const ustring small = ustring(12, L'a') + L"c";
    ASSERT_EQ(-1, ReferenceMask(small.data(), small.size(), mask, CompareCase));
    EXPECT_EQ(-1, (ustring(10000, L'a') + L"c").compareWithMask(mask));
    EXPECT_EQ(-1, (ustring(10000, L'a') + L"C").compareWithMaskNoCase(mask));
}
