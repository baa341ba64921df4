// The supplementary Win32 message file DATA\Win32Errors.txt, beside the library's own module.
//
// UTF-16 little-endian behind the byte-order mark FF FE; one entry per line as `key,text`. The key is
// decimal or hexadecimal after 0x; the text may stand in double quotes and may hold \r, \n and \".
// Carriage returns are ignored anywhere, and only a line ended by a line feed counts. The file is read
// afresh in 512-byte pieces for every lookup.
#include <ostrand/platform.h>

#include <ostrand/errors/Exception.h>
#include <ostrand/system/File.h>

#include "internal/module.h"

#include <algorithm>
#include <cstring>
#include <cwchar>
#include <new>

namespace ostrand
{
namespace
{

const DWORD kPieceBytes = 512;

ustring SupplementaryFilePath()
{
    ustring module, drive, dir, name, ext, path;
    CFile::GetModuleFileNameW(detail::LibraryModule(), module, true);
    CFile::SplitPath(module.c_str(), drive, dir, name, ext);
    CFile::MakePath(path, drive.c_str(), dir.c_str(), L"DATA\\Win32Errors.txt", NULL);
    return path;
}

// The number of a key as the runtime reads it: the leading digits of the base, no range error; a key
// that is no number reads as 0. `key` is trimmed of spaces and points into the text, where spaces and
// the comma follow it: they end the digits just as the end of a copy of the key would.
DWORD ReadKey(const wchar_t* key, size_t length)
{
    if (length >= 2 && key[0] == L'0' && (key[1] == L'x' || key[1] == L'X'))
        return std::wcstoul(key + 2, NULL, 16);
    return std::wcstoul(key, NULL, 10);
}

ustring EntryText(ustring text)
{
    text.trim(L' ');
    text.replace(L"\\r", L"\r");
    text.replace(L"\\n", L"\n");
    text.replace(L"\\\"", L"\"");
    text.trim(L'"');
    return text;
}

// Splits the file's text into entries as the pieces arrive. The unconsumed text starts at m_nStart
// and never with a line feed; consumed text is dropped when the next piece arrives. A line without a
// comma stays and becomes the front of the next entry's key. The scan positions remember how far the
// comma and the line feed after it have been searched for, so a line of megabytes is scanned once
// rather than once for every piece.
class CEntryScanner
{
public:
    explicit CEntryScanner(DWORD code) : m_dwCode(code), m_nStart(0), m_nCommaFrom(0), m_nLineFeedFrom(0) {}

    // Appends `count` units and parses the entries complete so far; true when one is for the code.
    bool Append(const wchar_t* units, size_t count, ustring& message)
    {
        m_strBuffer.erase(0, m_nStart);
        m_nCommaFrom -= m_nStart;
        m_nLineFeedFrom -= m_nStart;
        m_nStart = 0;
        const size_t old = m_strBuffer.size();
        m_strBuffer.append(units, count);
        m_strBuffer.erase(std::remove(m_strBuffer.begin() + old, m_strBuffer.end(), L'\r'),
                          m_strBuffer.end());
        SkipLineFeeds();
        return Parse(message);
    }

private:
    bool Parse(ustring& message)
    {
        for (;;)
        {
            const size_t comma = m_strBuffer.find(L',', m_nCommaFrom);
            if (comma == ustring::npos)
            {
                m_nCommaFrom = m_strBuffer.size();
                return false;
            }
            m_nCommaFrom = comma;
            const size_t lineFeed = m_strBuffer.find(L'\n', std::max(comma, m_nLineFeedFrom));
            if (lineFeed == ustring::npos)
            {
                m_nLineFeedFrom = m_strBuffer.size();
                return false;
            }
            size_t keyBegin = m_nStart, keyEnd = comma;
            while (keyBegin < keyEnd && m_strBuffer[keyBegin] == L' ')
                ++keyBegin;
            while (keyEnd > keyBegin && m_strBuffer[keyEnd - 1] == L' ')
                --keyEnd;
            if (ReadKey(m_strBuffer.c_str() + keyBegin, keyEnd - keyBegin) == m_dwCode)
            {
                message = EntryText(m_strBuffer.substr(comma + 1, lineFeed - comma - 1));
                return true;
            }
            m_nStart = lineFeed + 1;
            SkipLineFeeds();
        }
    }

    void SkipLineFeeds()
    {
        while (m_nStart < m_strBuffer.size() && m_strBuffer[m_nStart] == L'\n')
            ++m_nStart;
        m_nCommaFrom = std::max(m_nCommaFrom, m_nStart);
        m_nLineFeedFrom = std::max(m_nLineFeedFrom, m_nStart);
    }

    const DWORD m_dwCode;
    ustring m_strBuffer;
    size_t m_nStart;        // the first unit not consumed yet
    size_t m_nCommaFrom;    // no comma between m_nStart and this position
    size_t m_nLineFeedFrom; // no line feed between the first comma and this position
};

} // namespace

bool CWinException::FindSupplementaryMessage(DWORD code, ustring& message)
{
    try
    {
        CFile file(SupplementaryFilePath().c_str(), GENERIC_READ, FILE_SHARE_READ, NULL, OPEN_EXISTING,
                   FILE_ATTRIBUTE_NORMAL);
        unsigned char bytes[kPieceBytes + 1];
        unsigned __int64 read = 0;
        if (!file.Read(bytes, 2, read) || read != 2 || bytes[0] != 0xFF || bytes[1] != 0xFE)
            return false;

        CEntryScanner scanner(code);
        wchar_t units[(kPieceBytes + 1) / 2];
        size_t carried = 0; // an odd byte of the previous piece, the low half of the next unit
        for (;;)
        {
            if (!file.Read(bytes + carried, kPieceBytes, read) || read == 0)
                return false; // the end of the file without a match
            const size_t total = carried + static_cast<size_t>(read);
            const size_t count = total / 2;
            std::memcpy(units, bytes, count * sizeof(wchar_t));
            carried = total % 2;
            if (carried != 0)
                bytes[0] = bytes[total - 1];
            if (scanner.Append(units, count, message))
                return true;
        }
    }
    catch (const CStdException&)
    {
        return false;
    }
    catch (const std::bad_alloc&)
    {
        // A file of gigabytes without a line feed must not take the error report down with it.
        return false;
    }
}

} // namespace ostrand
