// Wildcard comparison.
//
// The result is defined recursively: at a star, every suffix of the string from the current position is
// compared with the rest of the mask, and when none matches, the result is the comparison of the whole
// (sub)string with the rest of the mask. Done literally that takes exponential time on masks such as
// "*a*a*a*a*b". The comparison of string position `a` with the mask segment after star group `t` is a
// pure function of (a, t), so it is computed once per pair, from the last segment backwards, keeping
// only two segments' results. Time: O(size * mask length); memory: O(size).
#include <ostrand/text/ustring.h>

#include <cwchar>
#include <vector>

namespace ostrand
{
namespace
{

struct CaseSensitive
{
    int operator()(wchar_t s, wchar_t m) const
    {
        const unsigned short a = static_cast<unsigned short>(s);
        const unsigned short b = static_cast<unsigned short>(m);
        return a < b ? -1 : (a > b ? 1 : 0);
    }
};

struct NoCase
{
    int operator()(wchar_t s, wchar_t m) const
    {
        const wchar_t a[2] = {s, L'\0'};
        const wchar_t b[2] = {m, L'\0'};
        const int r = ::_wcsicmp(a, b);
        return r < 0 ? -1 : (r > 0 ? 1 : 0);
    }
};

// The mask cut at its star groups: segment t runs from segStart[t] to the next star or the terminator.
// Segment 0 starts the mask; segment t > 0 starts after the t-th group of stars and question marks that
// follows a star.
struct Segments
{
    std::vector<size_t> start;
    // True when star group t (t >= 1) ends the mask, so everything after it matches.
    std::vector<bool> endsMask;
};

Segments CutMask(const wchar_t* mask, size_t maskLength)
{
    Segments s;
    s.start.push_back(0);
    s.endsMask.push_back(false);
    for (size_t j = 0; j < maskLength; ++j)
    {
        if (mask[j] != L'*')
            continue;
        size_t k = j;
        while (k < maskLength && (mask[k] == L'*' || mask[k] == L'?'))
            ++k;
        s.start.push_back(k);
        s.endsMask.push_back(k == maskLength);
        j = k == 0 ? 0 : k - 1;
    }
    return s;
}

template <class Compare> int MatchMask(const wchar_t* str, size_t len, const wchar_t* mask, Compare cmp)
{
    if (len == 0)
        return 0;
    if (mask == NULL)
        mask = L"";
    const size_t maskLength = std::wcslen(mask);
    const Segments seg = CutMask(mask, maskLength);
    const size_t segments = seg.start.size();

    // next[a]: result of string[a..] against segment t+1; anyZero[a]: some k in [a, len) has next[k]==0.
    std::vector<signed char> current(len + 1), next(len + 1, 0);
    std::vector<unsigned char> anyZero(len + 1, 0);

    for (size_t t = segments; t-- > 0;)
    {
        // Segment 0 is only ever asked about position 0, the later ones about every position.
        const size_t last = t == 0 ? 0 : len;
        for (size_t a = 0; a <= last; ++a)
        {
            int r = 0;
            if (a == len)
            {
                current[a] = 0;
                continue;
            }
            size_t i = a;
            size_t j = seg.start[t];
            for (;;)
            {
                const wchar_t m = mask[j];
                if (m == L'\0')
                {
                    r = 1;
                    break;
                }
                if (m == L'*')
                {
                    if (seg.endsMask[t + 1])
                        r = 0;
                    else if (anyZero[i])
                        r = 0;
                    else
                        r = next[a];
                    break;
                }
                if (m != L'?')
                {
                    const int c = cmp(str[i], m);
                    if (c != 0)
                    {
                        r = c;
                        break;
                    }
                }
                ++i;
                ++j;
                if (i == len)
                {
                    r = 0;
                    break;
                }
            }
            current[a] = static_cast<signed char>(r);
        }
        if (t == 0)
            return current[0];
        anyZero[len] = 0;
        for (size_t a = len; a-- > 0;)
            anyZero[a] = static_cast<unsigned char>(current[a] == 0 || anyZero[a + 1]);
        next.swap(current);
    }
    return 0; // not reached: segment 0 always exists
}

} // namespace

int ustring::compareWithMask(const wchar_t* mask) const
{
    return MatchMask(data(), size(), mask, CaseSensitive());
}

int ustring::compareWithMaskNoCase(const wchar_t* mask) const
{
    return MatchMask(data(), size(), mask, NoCase());
}

} // namespace ostrand
