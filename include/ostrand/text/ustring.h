// ustring: the library's UTF-16 string.
//
// Classes in this file: ustring, LessStrCaseSensitiveW, LessStrNotCaseSensitiveW, LessStrWN.
//
// ustring is std::wstring with conversions, comparisons and editing helpers added. It adds no data
// member and no virtual function, so it converts to and from std::wstring without loss. All members
// work on UTF-16 code units one at a time; none knows about surrogate pairs.
//
// Threads: no internal locking; one object is used by one thread at a time.
#pragma once

#include <ostrand/platform.h>

#include <comutil.h>

#include <cstdarg>
#include <list>
#include <set>
#include <string>
#include <vector>

namespace ostrand
{

class ustring;

// Ordinal, case-sensitive order (ustring::compare). The order of the library's sets of texts.
struct OSTRAND_API LessStrCaseSensitiveW
{
    typedef const ustring& first_argument_type;
    typedef const ustring& second_argument_type;
    typedef bool result_type;
    bool operator()(const ustring& a, const ustring& b) const;
};

// Order after towlower of every code unit (ustring::compareNoCase).
struct OSTRAND_API LessStrNotCaseSensitiveW
{
    typedef const ustring& first_argument_type;
    typedef const ustring& second_argument_type;
    typedef bool result_type;
    bool operator()(const ustring& a, const ustring& b) const;
};

// Orders by the first decimal number in each text only: "item9" < "item10", "x7" ~ "y7", a text
// without digits counts as 0. Signs are dropped with the other non-digits.
struct OSTRAND_API LessStrWN
{
    typedef const ustring& first_argument_type;
    typedef const ustring& second_argument_type;
    typedef bool result_type;
    bool operator()(const ustring& a, const ustring& b) const;
};

class OSTRAND_API ustring : public std::basic_string<wchar_t>
{
public:
    typedef std::basic_string<wchar_t> base_type;
    static const size_t npos;

    // Construction and assignment
    ustring() {}
    ustring(const ustring& other) : base_type(other) {}
    ustring(ustring&& other) noexcept : base_type(std::move(other)) {}
    ustring(const base_type& other) : base_type(other) {}
    ustring(base_type&& other) noexcept : base_type(std::move(other)) {}
    ustring(size_t n, wchar_t c) : base_type(n, c) {}
    // A null `p` gives the empty string; `n == npos` takes the text up to its terminator, any other
    // `n` exactly that many units (embedded zeros included).
    ustring(const wchar_t* p, size_t n = npos);
    ustring(const std::string& s, unsigned int codePage, unsigned long flags);
    // The BSTR's SysStringLen units, embedded zeros kept; an empty _bstr_t gives the empty string.
    explicit ustring(const _bstr_t& b);

    ustring& operator=(const ustring& other);
    ustring& operator=(ustring&& other) noexcept;
    ustring& operator=(const wchar_t* p); // null: empty
    ustring& operator=(const _bstr_t& b);
    ustring& operator=(wchar_t c);

    operator wchar_t const*() const { return c_str(); }

    // Bounds-checked: i >= size() (also i == size()) throws std::out_of_range("invalid string position").
    wchar_t& operator[](size_t i);
    const wchar_t& operator[](size_t i) const;

    ustring& operator+=(const ustring& s);
    ustring& operator+=(const wchar_t* p); // p must not be null
    ustring& operator+=(wchar_t c);

    // Code-page conversion. Failures and unconvertible input give an empty result; nothing throws
    // except on allocation failure. `len == npos` converts up to and including the terminator.
    static ustring MultiByteToWideChar(const char* s, size_t len, unsigned int codePage, unsigned long flags);
    static ustring MultiByteToWideChar(const std::string& s, unsigned int codePage, unsigned long flags);
    static std::string WideCharToMultiByte(const wchar_t* s, size_t len, unsigned int codePage,
                                           unsigned long flags);
    static std::string WideCharToMultiByte(const ustring& s, unsigned int codePage, unsigned long flags);

    // String resources. Both return false, and leave the string empty, when the resource is missing or
    // empty. Texts of any length load whole.
    bool load(HINSTANCE module, unsigned int id);
    // load, then translated for the user interface. This is the form for every user-visible text.
    bool xload(HINSTANCE module, unsigned int id);

    // Formatting with the runtime's legacy wide printf: %s and %c take wide arguments, %S and %C narrow
    // ones, I64 is the 64-bit prefix. Arguments may point into this string. An invalid format throws
    // std::invalid_argument and leaves the string as it was.
    void sprintf(const wchar_t* format, ...);
    void vsprintf(const wchar_t* format, va_list args);

    // Ordinal comparison by UTF-16 code unit over the first min(max(size, other.size), count) units;
    // absent units count as 0. Returns the code-unit difference (-65535..65535), not just the sign.
    int compare(const ustring& other, size_t count) const;
    int compareNoCase(const ustring& other, size_t count) const; // units through towlower first
    using base_type::compare;

    // Editing in place
    ustring& trim(wchar_t c);
    ustring& trim_left(wchar_t c);
    ustring& trim_right(wchar_t c);
    ustring& trim(const std::vector<wchar_t>& set);
    ustring& trim_left(const std::vector<wchar_t>& set);
    ustring& trim_right(const std::vector<wchar_t>& set);

    // Splits at every occurrence of `delimiter`; empty pieces are kept, and a trailing empty piece only
    // when `keepLastEmpty`. An empty `s` gives an empty container. An empty or null delimiter gives
    // the whole of `s` as one piece.
    template <class C>
    static void split(const ustring& s, const wchar_t* delimiter, C& out, bool keepLastEmpty);
    template <class C> static void split(const ustring& s, wchar_t delimiter, C& out, bool keepLastEmpty);
    // Splits a zero-separated multi-string ("a\0b\0\0").
    template <class C> static void split(const ustring& s, C& out);

    // The text from the first `begin` up to the next `end` after it; a null marker stands for the start
    // or the end of the string. `keepBegin` keeps the begin marker in the result (the end marker never
    // is); without the end marker the result is empty when `needEnd`, else it runs to the end.
    ustring substr(const wchar_t* begin, const wchar_t* end, bool keepBegin, bool needEnd) const;
    using base_type::substr;

    // Replaces every non-overlapping occurrence, left to right; inserted text is not searched again.
    // An empty `what` changes nothing.
    void replace(const ustring& what, const ustring& with);
    using base_type::replace;

    void removeForbiddenSymbols(const wchar_t* set);  // drops every unit found in `set`
    void removeForbiddenSymbols2(const wchar_t* set); // keeps only units found in `set`
    void replaceForbiddenSymbols(const wchar_t* set); // units in `set` become "%XX"
    void replaceNonAlphaNumericSymbols();             // units failing iswalnum become "%XX"

    void strlwr();
    void strupr();

    // Wildcard match with "*" and "?": 0 on a match, -1 or 1 otherwise. A string that ends while mask
    // characters remain still matches; the empty string matches every mask. Time is bounded by
    // size() * mask length, whatever the mask.
    int compareWithMask(const wchar_t* mask) const;
    int compareWithMaskNoCase(const wchar_t* mask) const;

    static void Bin2Hex(const std::vector<unsigned char>& bytes, ustring& hex);
    // Pairs of hex digits; blanks (space, CR, LF, tab) are skipped anywhere, an odd last digit is
    // dropped, any other character clears `bytes` and returns false.
    static bool Hex2Bin(const ustring& hex, std::vector<unsigned char>& bytes);
    static bool GUID2String(const GUID& guid, ustring& text); // braced upper-case form
    static bool String2GUID(const wchar_t* text, GUID& guid); // what CLSIDFromString accepts
};

// Concatenation. The mixed forms make `u + L"text"` and `L"text" + u` unambiguous ustrings.
OSTRAND_API ustring operator+(const ustring& a, const ustring& b);
OSTRAND_API ustring operator+(const ustring& a, const wchar_t* b);
OSTRAND_API ustring operator+(const wchar_t* a, const ustring& b);
OSTRAND_API ustring operator+(const ustring& a, wchar_t b);
OSTRAND_API ustring operator+(wchar_t a, const ustring& b);

// Comparison operators: compare(other, npos) against 0. A null pointer compares as the empty string.
OSTRAND_API bool operator==(const ustring& a, const ustring& b);
OSTRAND_API bool operator!=(const ustring& a, const ustring& b);
OSTRAND_API bool operator<(const ustring& a, const ustring& b);
OSTRAND_API bool operator<=(const ustring& a, const ustring& b);
OSTRAND_API bool operator>(const ustring& a, const ustring& b);
OSTRAND_API bool operator>=(const ustring& a, const ustring& b);
OSTRAND_API bool operator==(const ustring& a, const wchar_t* b);
OSTRAND_API bool operator!=(const ustring& a, const wchar_t* b);
OSTRAND_API bool operator<(const ustring& a, const wchar_t* b);
OSTRAND_API bool operator<=(const ustring& a, const wchar_t* b);
OSTRAND_API bool operator>(const ustring& a, const wchar_t* b);
OSTRAND_API bool operator>=(const ustring& a, const wchar_t* b);

// The library instantiates split for these three containers; other containers are not supported.
extern template OSTRAND_API void ustring::split(const ustring&, const wchar_t*, std::list<ustring>&, bool);
extern template OSTRAND_API void ustring::split(const ustring&, const wchar_t*, std::vector<ustring>&, bool);
extern template OSTRAND_API void ustring::split(const ustring&, const wchar_t*,
                                                std::set<ustring, LessStrCaseSensitiveW>&, bool);
extern template OSTRAND_API void ustring::split(const ustring&, wchar_t, std::list<ustring>&, bool);
extern template OSTRAND_API void ustring::split(const ustring&, wchar_t, std::vector<ustring>&, bool);
extern template OSTRAND_API void ustring::split(const ustring&, wchar_t,
                                                std::set<ustring, LessStrCaseSensitiveW>&, bool);
extern template OSTRAND_API void ustring::split(const ustring&, std::list<ustring>&);
extern template OSTRAND_API void ustring::split(const ustring&, std::vector<ustring>&);
extern template OSTRAND_API void ustring::split(const ustring&, std::set<ustring, LessStrCaseSensitiveW>&);

} // namespace ostrand
