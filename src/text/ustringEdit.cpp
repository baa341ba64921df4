#include <ostrand/text/ustring.h>

#include <objbase.h>

#include <algorithm>
#include <array>
#include <cwchar>
#include <cwctype>

namespace ostrand
{

// Trimming ---------------------------------------------------------------------------------------------

namespace
{
template <class Pred> void TrimLeft(ustring& s, Pred inSet)
{
    size_t i = 0;
    while (i < s.size() && inSet(s.data()[i]))
        ++i;
    s.erase(0, i);
}

template <class Pred> void TrimRight(ustring& s, Pred inSet)
{
    size_t n = s.size();
    while (n > 0 && inSet(s.data()[n - 1]))
        --n;
    s.resize(n);
}

struct IsUnit
{
    wchar_t c;
    bool operator()(wchar_t u) const { return u == c; }
};

struct InSet
{
    const std::vector<wchar_t>& set;
    bool operator()(wchar_t u) const { return std::find(set.begin(), set.end(), u) != set.end(); }
};
} // namespace

ustring& ustring::trim(wchar_t c)
{
    return trim_left(c).trim_right(c);
}

ustring& ustring::trim_left(wchar_t c)
{
    TrimLeft(*this, IsUnit{c});
    return *this;
}

ustring& ustring::trim_right(wchar_t c)
{
    TrimRight(*this, IsUnit{c});
    return *this;
}

ustring& ustring::trim(const std::vector<wchar_t>& set)
{
    return trim_left(set).trim_right(set);
}

ustring& ustring::trim_left(const std::vector<wchar_t>& set)
{
    TrimLeft(*this, InSet{set});
    return *this;
}

ustring& ustring::trim_right(const std::vector<wchar_t>& set)
{
    TrimRight(*this, InSet{set});
    return *this;
}

// Splitting --------------------------------------------------------------------------------------------

namespace
{
// Each piece is built in its place in the container, without an intermediate string.
template <class Sequence> void AddPiece(Sequence& out, const wchar_t* p, size_t n)
{
    out.emplace_back();
    out.back().assign(p, n);
}
void AddPiece(std::set<ustring, LessStrCaseSensitiveW>& out, const wchar_t* p, size_t n)
{
    out.insert(ustring(p, n));
}

template <class C>
void SplitAt(const ustring& s, const wchar_t* delimiter, size_t delimiterLength, C& out, bool keepLastEmpty)
{
    out.clear();
    if (s.empty())
        return;
    if (delimiterLength == 0)
    {
        // Nothing can separate the text: it is one piece.
        AddPiece(out, s.data(), s.size());
        return;
    }
    size_t pos = 0;
    for (;;)
    {
        const size_t found = s.find(delimiter, pos, delimiterLength);
        if (found == ustring::npos)
        {
            AddPiece(out, s.data() + pos, s.size() - pos);
            return;
        }
        AddPiece(out, s.data() + pos, found - pos);
        pos = found + delimiterLength;
        if (pos >= s.size())
        {
            if (keepLastEmpty)
                AddPiece(out, s.data(), 0);
            return;
        }
    }
}
} // namespace

template <class C> void ustring::split(const ustring& s, const wchar_t* delimiter, C& out, bool keepLastEmpty)
{
    SplitAt(s, delimiter, delimiter == NULL ? 0 : std::wcslen(delimiter), out, keepLastEmpty);
}

template <class C> void ustring::split(const ustring& s, wchar_t delimiter, C& out, bool keepLastEmpty)
{
    SplitAt(s, &delimiter, 1, out, keepLastEmpty);
}

template <class C> void ustring::split(const ustring& s, C& out)
{
    out.clear();
    // The string's own terminator ends the list when no empty entry stands inside.
    const wchar_t* p = s.c_str();
    const wchar_t* const end = p + s.size();
    while (p < end && *p != L'\0')
    {
        const size_t n = std::wcslen(p);
        AddPiece(out, p, n);
        p += n + 1;
    }
}

template OSTRAND_API void ustring::split(const ustring&, const wchar_t*, std::list<ustring>&, bool);
template OSTRAND_API void ustring::split(const ustring&, const wchar_t*, std::vector<ustring>&, bool);
template OSTRAND_API void ustring::split(const ustring&, const wchar_t*,
                                         std::set<ustring, LessStrCaseSensitiveW>&, bool);
template OSTRAND_API void ustring::split(const ustring&, wchar_t, std::list<ustring>&, bool);
template OSTRAND_API void ustring::split(const ustring&, wchar_t, std::vector<ustring>&, bool);
template OSTRAND_API void ustring::split(const ustring&, wchar_t, std::set<ustring, LessStrCaseSensitiveW>&,
                                         bool);
template OSTRAND_API void ustring::split(const ustring&, std::list<ustring>&);
template OSTRAND_API void ustring::split(const ustring&, std::vector<ustring>&);
template OSTRAND_API void ustring::split(const ustring&, std::set<ustring, LessStrCaseSensitiveW>&);

// Cutting and replacing --------------------------------------------------------------------------------

ustring ustring::substr(const wchar_t* begin, const wchar_t* end, bool keepBegin, bool needEnd) const
{
    if (empty())
        return ustring();
    size_t start = 0;
    const size_t beginLength = begin == NULL ? 0 : std::wcslen(begin);
    if (begin != NULL)
    {
        start = find(begin, 0, beginLength);
        if (start == npos)
            return ustring();
    }
    size_t stop = size();
    if (end != NULL)
    {
        const size_t found = find(end, start + beginLength);
        if (found != npos)
            stop = found;
        else if (needEnd)
            return ustring();
    }
    if (begin != NULL && !keepBegin)
        start += beginLength;
    return ustring(base_type::substr(start, stop - start));
}

void ustring::replace(const ustring& what, const ustring& with)
{
    if (what.empty())
        return;
    // Built in one pass into a new string: repeated in-place replacement would be quadratic.
    size_t pos = find(what);
    if (pos == npos)
        return;
    ustring result;
    result.reserve(size());
    size_t from = 0;
    while (pos != npos)
    {
        result.append(*this, from, pos - from);
        result.append(with);
        from = pos + what.size();
        pos = find(what, from);
    }
    result.append(*this, from, npos);
    swap(result);
}

namespace
{
bool Contains(const wchar_t* set, wchar_t c)
{
    if (set == NULL)
        return false;
    for (; *set != L'\0'; ++set)
        if (*set == c)
            return true;
    return false;
}

// Every unit for which `encode` holds becomes "%XX" (at least two upper-case hex digits). Each unit of
// the original text is looked at once; inserted text is never examined.
template <class Pred> void PercentEncode(ustring& s, Pred encode)
{
    static const wchar_t digits[] = L"0123456789ABCDEF";
    ustring result;
    result.reserve(s.size());
    for (size_t i = 0; i < s.size(); ++i)
    {
        const wchar_t c = s.data()[i];
        if (!encode(c))
        {
            result.push_back(c);
            continue;
        }
        const unsigned v = static_cast<unsigned short>(c);
        result.push_back(L'%');
        if (v > 0xFFF)
            result.push_back(digits[(v >> 12) & 0xF]);
        if (v > 0xFF)
            result.push_back(digits[(v >> 8) & 0xF]);
        result.push_back(digits[(v >> 4) & 0xF]);
        result.push_back(digits[v & 0xF]);
    }
    s.swap(result);
}
} // namespace

void ustring::removeForbiddenSymbols(const wchar_t* set)
{
    erase(std::remove_if(begin(), end(), [set](wchar_t c) { return Contains(set, c); }), end());
}

void ustring::removeForbiddenSymbols2(const wchar_t* set)
{
    erase(std::remove_if(begin(), end(), [set](wchar_t c) { return !Contains(set, c); }), end());
}

void ustring::replaceForbiddenSymbols(const wchar_t* set)
{
    PercentEncode(*this, [set](wchar_t c) { return Contains(set, c); });
}

void ustring::replaceNonAlphaNumericSymbols()
{
    PercentEncode(*this, [](wchar_t c) { return !::iswalnum(c); });
}

void ustring::strlwr()
{
    for (wchar_t& c : static_cast<base_type&>(*this))
        c = static_cast<wchar_t>(::towlower(c));
}

void ustring::strupr()
{
    for (wchar_t& c : static_cast<base_type&>(*this))
        c = static_cast<wchar_t>(::towupper(c));
}

// Hex and GUID text ------------------------------------------------------------------------------------

void ustring::Bin2Hex(const std::vector<unsigned char>& bytes, ustring& hex)
{
    static const wchar_t digits[] = L"0123456789ABCDEF";
    hex.resize(bytes.size() * 2);
    wchar_t* out = bytes.empty() ? NULL : &hex.base_type::operator[](0);
    for (unsigned char b : bytes)
    {
        *out++ = digits[b >> 4];
        *out++ = digits[b & 0xF];
    }
}

namespace
{
const signed char kNotHex = -1;
const signed char kBlank = -2; // skipped anywhere, also between the two digits of a pair

constexpr std::array<signed char, 128> MakeAsciiHexTable()
{
    std::array<signed char, 128> t{};
    for (int c = 0; c < 128; ++c)
        t[c] = kNotHex;
    for (int c = '0'; c <= '9'; ++c)
        t[c] = static_cast<signed char>(c - '0');
    for (int c = 'a'; c <= 'f'; ++c)
        t[c] = t[c - 'a' + 'A'] = static_cast<signed char>(c - 'a' + 10);
    t[' '] = t['\r'] = t['\n'] = t['\t'] = kBlank;
    return t;
}
constexpr std::array<signed char, 128> kAsciiHex = MakeAsciiHexTable();

// A digit's value, kBlank or kNotHex. The digits are those the runtime classifies with iswxdigit:
// beyond ASCII also the full-width forms of 0-9, A-F and a-f, which read as their ASCII originals.
int HexDigitValue(wchar_t c)
{
    if (c < 0x80)
        return kAsciiHex[c];
    if (c < 0xFF10 || c > 0xFF46 || !::iswxdigit(c))
        return kNotHex;
    return kAsciiHex[c - 0xFEE0];
}
} // namespace

bool ustring::Hex2Bin(const ustring& hex, std::vector<unsigned char>& bytes)
{
    bytes.clear();
    bytes.reserve(hex.size() / 2);
    int high = -1;
    for (wchar_t c : static_cast<const base_type&>(hex))
    {
        const int v = HexDigitValue(c);
        if (v < 0)
        {
            if (v == kBlank)
                continue;
            bytes.clear();
            return false;
        }
        if (high < 0)
            high = v;
        else
        {
            bytes.push_back(static_cast<unsigned char>(high << 4 | v));
            high = -1;
        }
    }
    return true;
}

bool ustring::GUID2String(const GUID& guid, ustring& text)
{
    wchar_t buffer[128];
    if (::StringFromGUID2(guid, buffer, 128) == 0)
    {
        text.clear();
        return false;
    }
    text = buffer;
    return true;
}

bool ustring::String2GUID(const wchar_t* text, GUID& guid)
{
    // CLSIDFromString takes a non-const pointer in older headers; it does not write through it. A null
    // text is its way of writing the null GUID, and succeeds. On failure it may have written part of
    // the GUID already.
    if (FAILED(::CLSIDFromString(const_cast<LPOLESTR>(text), &guid)))
    {
        guid = GUID();
        return false;
    }
    return true;
}

} // namespace ostrand
