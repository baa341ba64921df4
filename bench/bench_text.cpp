// Text: split, replace, hex conversion and formatting against plain loops over std::wstring and the
// runtime's formatter in the same run, and the wildcard comparison on an adversarial mask.
#include "bench.h"

#include <ostrand/text/ustring.h>

#include <cstdarg>
#include <cwchar>
#include <string>
#include <vector>

using ostrand::ustring;

namespace
{

// About 1 MB of text: 100,000 fields of a comma-separated record.
ustring Fields()
{
    ustring s;
    wchar_t field[32];
    for (int i = 0; i < 100000; ++i)
    {
        ::_snwprintf(field, 32, L"f%d,", i * 7919 % 100000);
        field[31] = L'\0';
        s += field;
    }
    return s;
}

void SplitByHand(const std::wstring& s, const std::wstring& delimiter, std::vector<std::wstring>& out)
{
    out.clear();
    size_t pos = 0;
    for (size_t f; (f = s.find(delimiter, pos)) != std::wstring::npos; pos = f + delimiter.size())
        out.push_back(s.substr(pos, f - pos));
    out.push_back(s.substr(pos));
}

std::wstring ReplaceByHand(const std::wstring& s, const std::wstring& what, const std::wstring& with)
{
    std::wstring out;
    out.reserve(s.size());
    size_t from = 0;
    for (size_t pos; (pos = s.find(what, from)) != std::wstring::npos; from = pos + what.size())
        out.append(s, from, pos - from).append(with);
    return out.append(s, from, std::wstring::npos);
}

void HexByHand(const std::vector<unsigned char>& bytes, std::wstring& hex)
{
    static const wchar_t digits[] = L"0123456789ABCDEF";
    hex.clear();
    hex.reserve(bytes.size() * 2);
    for (unsigned char b : bytes)
    {
        hex.push_back(digits[b >> 4]);
        hex.push_back(digits[b & 15]);
    }
}

int DigitByHand(wchar_t c)
{
    return c <= L'9' ? c - L'0' : (c | 0x20) - L'a' + 10;
}

void BinByHand(const std::wstring& hex, std::vector<unsigned char>& bytes)
{
    bytes.clear();
    bytes.reserve(hex.size() / 2);
    for (size_t i = 0; i + 1 < hex.size(); i += 2)
        bytes.push_back(static_cast<unsigned char>(DigitByHand(hex[i]) << 4 | DigitByHand(hex[i + 1])));
}

int FormatOnStack(wchar_t* buffer, size_t size, const wchar_t* format, ...)
{
    va_list args;
    va_start(args, format);
    const int n = ::_vsnwprintf(buffer, size, format, args);
    va_end(args);
    return n;
}

} // namespace

BENCHMARK("text/split")
{
    const ustring s = Fields();
    std::vector<ustring> pieces;
    std::vector<std::wstring> byHand;
    const double t = bench::BestOf(15, [&] { ustring::split(s, L",", pieces, true); });
    const double base = bench::BestOf(15, [&] { SplitByHand(s, L",", byHand); });
    if (pieces.size() != byHand.size())
        std::printf("  MISMATCH: %u pieces against %u\n", unsigned(pieces.size()), unsigned(byHand.size()));
    bench::Report("split 1 MB into a vector (100k pieces)", t, base, "wstring::find loop");
}

BENCHMARK("text/replace")
{
    const ustring s = Fields();
    ustring r;
    std::wstring byHand;
    const double t = bench::BestOf(15,
                                   [&]
                                   {
                                       r = s;
                                       r.replace(L",f", L"; field ");
                                   });
    const double base = bench::BestOf(15, [&] { byHand = ReplaceByHand(s, L",f", L"; field "); });
    if (r != ustring(byHand))
        std::printf("  MISMATCH\n");
    bench::Report("replace in 1 MB (100k hits)", t, base, "wstring::find loop");
}

BENCHMARK("text/hex")
{
    std::vector<unsigned char> bytes(1 << 20);
    for (size_t i = 0; i < bytes.size(); ++i)
        bytes[i] = static_cast<unsigned char>(i * 2654435761u >> 13);
    ustring hex;
    std::wstring hexByHand;
    std::vector<unsigned char> back, backByHand;
    const double t1 = bench::BestOf(15, [&] { ustring::Bin2Hex(bytes, hex); });
    const double b1 = bench::BestOf(15, [&] { HexByHand(bytes, hexByHand); });
    bench::Report("Bin2Hex 1 MB", t1, b1, "table loop");
    const double t2 = bench::BestOf(15, [&] { ustring::Hex2Bin(hex, back); });
    const double b2 = bench::BestOf(15, [&] { BinByHand(hexByHand, backByHand); });
    bench::Report("Hex2Bin 2 M digits", t2, b2, "unchecked digit loop");
    if (back != bytes || backByHand != bytes || hex != ustring(hexByHand))
        std::printf("  MISMATCH\n");
}

BENCHMARK("text/sprintf")
{
    const int n = 200000;
    ustring s;
    wchar_t buffer[256];
    size_t sink = 0;
    const double t = bench::BestOf(7,
                                   [&]
                                   {
                                       for (int i = 0; i < n; ++i)
                                       {
                                           s.sprintf(L"%s;%d;0x%X", L"COM3", i, i);
                                           sink += s.size();
                                       }
                                   });
    const double base = bench::BestOf(7,
                                      [&]
                                      {
                                          for (int i = 0; i < n; ++i)
                                              sink += static_cast<size_t>(
                                                  FormatOnStack(buffer, 256, L"%s;%d;0x%X", L"COM3", i, i));
                                      });
    bench::Keep(sink);
    bench::Report("sprintf short format x200k", t, base, "_vsnwprintf on the stack");
}

BENCHMARK("text/mask")
{
    const wchar_t* mask = L"*a*a*a*a*a*a*a*a*a*b";
    const ustring match(10000, L'a');
    const ustring noMatch = match + L"c";
    int r1 = 0, r2 = 0;
    const double t1 = bench::BestOf(5, [&] { r1 = match.compareWithMask(mask); });
    const double t2 = bench::BestOf(5, [&] { r2 = noMatch.compareWithMask(mask); });
    std::printf("%-44s %10.3f ms   (result %d)\n", "compareWithMask 10,000 a, *a*a*...*a*b", t1 * 1e3, r1);
    std::printf("%-44s %10.3f ms   (result %d)\n", "  the same text ending in c (no match)", t2 * 1e3, r2);
}
