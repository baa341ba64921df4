#include <ostrand/text/ustring.h>

#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cwchar>
#include <cwctype>
#include <stdexcept>
#include <wchar.h>

namespace ostrand
{

const size_t ustring::npos = static_cast<size_t>(-1);

ustring::ustring(const wchar_t* p, size_t n)
{
    if (p == NULL)
        return;
    if (n == npos)
        assign(p);
    else
        assign(p, n);
}

ustring::ustring(const std::string& s, unsigned int codePage, unsigned long flags)
    : base_type(MultiByteToWideChar(s, codePage, flags))
{
}

ustring::ustring(const _bstr_t& b)
{
    *this = b;
}

ustring& ustring::operator=(const ustring& other)
{
    base_type::operator=(other);
    return *this;
}

ustring& ustring::operator=(ustring&& other) noexcept
{
    base_type::operator=(std::move(other));
    return *this;
}

ustring& ustring::operator=(const wchar_t* p)
{
    if (p == NULL)
        clear();
    else
        assign(p);
    return *this;
}

ustring& ustring::operator=(const _bstr_t& b)
{
    const wchar_t* p = static_cast<const wchar_t*>(b);
    if (p == NULL)
        clear();
    else
        assign(p, b.length());
    return *this;
}

ustring& ustring::operator=(wchar_t c)
{
    assign(1, c);
    return *this;
}

wchar_t& ustring::operator[](size_t i)
{
    if (i >= size())
        throw std::out_of_range("invalid string position");
    return base_type::operator[](i);
}

const wchar_t& ustring::operator[](size_t i) const
{
    if (i >= size())
        throw std::out_of_range("invalid string position");
    return base_type::operator[](i);
}

ustring& ustring::operator+=(const ustring& s)
{
    append(s);
    return *this;
}

ustring& ustring::operator+=(const wchar_t* p)
{
    append(p);
    return *this;
}

ustring& ustring::operator+=(wchar_t c)
{
    push_back(c);
    return *this;
}

namespace
{
ustring Concatenate(const wchar_t* a, size_t na, const wchar_t* b, size_t nb)
{
    ustring r;
    r.reserve(na + nb);
    r.append(a, na);
    r.append(b, nb);
    return r;
}
} // namespace

ustring operator+(const ustring& a, const ustring& b)
{
    return Concatenate(a.data(), a.size(), b.data(), b.size());
}

ustring operator+(const ustring& a, const wchar_t* b)
{
    return Concatenate(a.data(), a.size(), b, std::wcslen(b));
}

ustring operator+(const wchar_t* a, const ustring& b)
{
    return Concatenate(a, std::wcslen(a), b.data(), b.size());
}

ustring operator+(const ustring& a, wchar_t b)
{
    return Concatenate(a.data(), a.size(), &b, 1);
}

ustring operator+(wchar_t a, const ustring& b)
{
    return Concatenate(&a, 1, b.data(), b.size());
}

// Code-page conversion ---------------------------------------------------------------------------------

namespace
{
// The Win32 conversions take a 32-bit count. npos means "up to the terminator": the length is measured
// here instead of passing -1, because Wine's UTF-8 decoder folds the terminator into an incomplete
// sequence that stands right before it, which would cost a character or add one. Longer inputs than
// INT_MAX cannot be passed and convert to nothing.
template <class Char> bool ToWin32Length(const Char* s, size_t len, int& out)
{
    if (len == ustring::npos)
        len = std::char_traits<Char>::length(s);
    if (len > static_cast<size_t>(INT_MAX))
        return false;
    out = static_cast<int>(len);
    return true;
}
} // namespace

ustring ustring::MultiByteToWideChar(const char* s, size_t len, unsigned int codePage, unsigned long flags)
{
    ustring result;
    int n = 0;
    if (s == NULL || !ToWin32Length(s, len, n) || n == 0)
        return result;
    const int needed = ::MultiByteToWideChar(codePage, flags, s, n, NULL, 0);
    if (needed < 1)
        return result;
    result.resize(static_cast<size_t>(needed));
    const int written = ::MultiByteToWideChar(codePage, flags, s, n, &result.at(0), needed);
    if (written < 1)
        return ustring();
    result.resize(static_cast<size_t>(written));
    return result;
}

ustring ustring::MultiByteToWideChar(const std::string& s, unsigned int codePage, unsigned long flags)
{
    return MultiByteToWideChar(s.data(), s.size(), codePage, flags);
}

std::string ustring::WideCharToMultiByte(const wchar_t* s, size_t len, unsigned int codePage,
                                         unsigned long flags)
{
    std::string result;
    int n = 0;
    if (s == NULL || !ToWin32Length(s, len, n) || n == 0)
        return result;
    const int needed = ::WideCharToMultiByte(codePage, flags, s, n, NULL, 0, NULL, NULL);
    if (needed < 1)
        return result;
    result.resize(static_cast<size_t>(needed));
    const int written = ::WideCharToMultiByte(codePage, flags, s, n, &result.at(0), needed, NULL, NULL);
    if (written < 1)
        return std::string();
    result.resize(static_cast<size_t>(written));
    return result;
}

std::string ustring::WideCharToMultiByte(const ustring& s, unsigned int codePage, unsigned long flags)
{
    return WideCharToMultiByte(s.data(), s.size(), codePage, flags);
}

// Resources --------------------------------------------------------------------------------------------

bool ustring::load(HINSTANCE module, unsigned int id)
{
    clear();
    size_t capacity = 256;
    int length = 0;
    for (;;)
    {
        resize(capacity);
        length = ::LoadStringW(module, id, &base_type::operator[](0), static_cast<int>(capacity));
        // A text that fills the buffer may have been cut: try again with twice the room.
        if (length < 0 || static_cast<size_t>(length) + 1 < capacity || capacity >= (1u << 20))
            break;
        capacity *= 2;
    }
    resize(length > 0 ? static_cast<size_t>(length) : 0);
    return length > 0;
}

bool ustring::xload(HINSTANCE module, unsigned int id)
{
    // Until the translator is part of the library the text is returned as loaded.
    return load(module, id);
}

// Formatting -------------------------------------------------------------------------------------------

void ustring::sprintf(const wchar_t* format, ...)
{
    va_list args;
    va_start(args, format);
    try
    {
        vsprintf(format, args);
    }
    catch (...)
    {
        va_end(args);
        throw;
    }
    va_end(args);
}

void ustring::vsprintf(const wchar_t* format, va_list args)
{
    if (format == NULL)
        throw std::invalid_argument("ustring::vsprintf: null format");

    // The text is built in a separate buffer and only then copied in, so an argument may point into
    // this string (its current text is a natural argument). Up to 1024 units that buffer is on the
    // stack and the copy reuses this string's own storage: no allocation for the usual short texts.
    wchar_t local[1024];
    va_list attempt;
    va_copy(attempt, args);
    int n = ::_vsnwprintf(local, 1024, format, attempt);
    va_end(attempt);
    if (n >= 0)
    {
        assign(local, static_cast<size_t>(n));
        return;
    }
    // The legacy formatter only says "did not fit"; ask for the exact length once instead of doubling
    // blindly. A negative answer means the format itself is invalid.
    va_copy(attempt, args);
    const int needed = ::_vscwprintf(format, attempt);
    va_end(attempt);
    if (needed < 0)
        throw std::invalid_argument("ustring::vsprintf: invalid format");
    ustring buffer(static_cast<size_t>(needed) + 1, L'\0');
    va_copy(attempt, args);
    n = ::_vsnwprintf(&buffer.base_type::operator[](0), buffer.size(), format, attempt);
    va_end(attempt);
    if (n < 0)
        throw std::invalid_argument("ustring::vsprintf: invalid format");
    buffer.resize(static_cast<size_t>(n));
    swap(buffer);
}

// Comparison -------------------------------------------------------------------------------------------

namespace
{
template <class Map> int CompareUnits(const ustring& a, const ustring& b, size_t count, Map map)
{
    const size_t n = std::min(std::max(a.size(), b.size()), count);
    if (n == 0)
        return 0;
    const wchar_t* pa = a.data();
    const wchar_t* pb = b.data();
    for (size_t i = 0;; ++i)
    {
        const unsigned c1 = i < a.size() ? map(static_cast<unsigned short>(pa[i])) : 0u;
        const unsigned c2 = i < b.size() ? map(static_cast<unsigned short>(pb[i])) : 0u;
        if (c1 != c2 || i + 1 >= n)
            return static_cast<int>(c1) - static_cast<int>(c2);
    }
}

unsigned Identity(unsigned short c)
{
    return c;
}

unsigned Lower(unsigned short c)
{
    return static_cast<unsigned short>(::towlower(c));
}
} // namespace

int ustring::compare(const ustring& other, size_t count) const
{
    return CompareUnits(*this, other, count, Identity);
}

int ustring::compareNoCase(const ustring& other, size_t count) const
{
    return CompareUnits(*this, other, count, Lower);
}

bool operator==(const ustring& a, const ustring& b)
{
    return a.compare(b, ustring::npos) == 0;
}
bool operator!=(const ustring& a, const ustring& b)
{
    return a.compare(b, ustring::npos) != 0;
}
bool operator<(const ustring& a, const ustring& b)
{
    return a.compare(b, ustring::npos) < 0;
}
bool operator<=(const ustring& a, const ustring& b)
{
    return a.compare(b, ustring::npos) < 1;
}
bool operator>(const ustring& a, const ustring& b)
{
    return a.compare(b, ustring::npos) > 0;
}
bool operator>=(const ustring& a, const ustring& b)
{
    return a.compare(b, ustring::npos) > -1;
}
bool operator==(const ustring& a, const wchar_t* b)
{
    return a == ustring(b);
}
bool operator!=(const ustring& a, const wchar_t* b)
{
    return a != ustring(b);
}
bool operator<(const ustring& a, const wchar_t* b)
{
    return a < ustring(b);
}
bool operator<=(const ustring& a, const wchar_t* b)
{
    return a <= ustring(b);
}
bool operator>(const ustring& a, const wchar_t* b)
{
    return a > ustring(b);
}
bool operator>=(const ustring& a, const wchar_t* b)
{
    return a >= ustring(b);
}

bool LessStrCaseSensitiveW::operator()(const ustring& a, const ustring& b) const
{
    return a.compare(b, ustring::npos) < 0;
}

bool LessStrNotCaseSensitiveW::operator()(const ustring& a, const ustring& b) const
{
    return a.compareNoCase(b, ustring::npos) < 0;
}

namespace
{
int FirstNumber(const ustring& s)
{
    size_t i = 0;
    while (i < s.size() && !::iswdigit(s.data()[i]))
        ++i;
    return ::_wtoi(s.c_str() + i);
}
} // namespace

bool LessStrWN::operator()(const ustring& a, const ustring& b) const
{
    return FirstNumber(a) < FirstNumber(b);
}

} // namespace ostrand
