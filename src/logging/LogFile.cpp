#include <ostrand/platform.h>
#include <ostrand/logging/LogFile.h>
#include <ostrand/errors/Exception.h>

#include <shlobj.h>

#include <cstring>
#include <stdexcept>
#include <utility>

#include "internal/ScopedLock.h"

namespace ostrand
{

namespace
{
const DWORD kWakeInterval = 100; // ms between the worker's passes
const size_t kDumpBytesPerLine = 32;
// The worker hands the file blocks gathered into writes of about this size.
const size_t kWriteChunk = 256 * 1024;

const char kHexDigits[] = "0123456789ABCDEF";

// Per byte value: its hex cell "XX " followed by one more space, and its printable character (what
// isgraph gives in the default locale: 0x21..0x7E as themselves, everything else as "."). A cell is
// stored with one spare space so that it can be copied as one word; the spare lands where the next
// cell or the spaces after the hex column go.
template <class Ch> struct DumpTables
{
    Ch cell[256][4];
    Ch printable[256];
    DumpTables()
    {
        for (int i = 0; i < 256; ++i)
        {
            cell[i][0] = Ch(kHexDigits[i >> 4]);
            cell[i][1] = Ch(kHexDigits[i & 15]);
            cell[i][2] = Ch(' ');
            cell[i][3] = Ch(' ');
            printable[i] = (i >= 0x21 && i <= 0x7E) ? Ch(i) : Ch('.');
        }
    }
};

template <class Ch> const DumpTables<Ch>& Tables()
{
    static const DumpTables<Ch> tables;
    return tables;
}

size_t DumpSize(size_t size, size_t perLine)
{
    const size_t lines = (size + perLine - 1) / perLine;
    return lines * (1 + 3 * perLine + 4 + 2) + size;
}

// Writes the dump of `size` bytes into `out`, which has room for DumpSize(size, perLine) characters.
// One routine serves the wide text of Bin2Text and the UTF-8 bytes that the worker writes.
template <class Ch> void WriteDump(const unsigned char* data, size_t size, size_t perLine, Ch* out)
{
    const DumpTables<Ch>& t = Tables<Ch>();
    while (size > 0)
    {
        const size_t n = size < perLine ? size : perLine;
        *out++ = Ch(' ');
        for (size_t i = 0; i < n; ++i, out += 3)
            std::memcpy(out, t.cell[data[i]], sizeof(t.cell[0]));
        for (size_t i = 3 * n; i < 3 * perLine + 4; ++i)
            *out++ = Ch(' ');
        for (size_t i = 0; i < n; ++i)
            out[i] = t.printable[data[i]];
        out += n;
        out[0] = Ch('\r');
        out[1] = Ch('\n');
        out += 2;
        data += n;
        size -= n;
    }
}

void AppendUnsigned(std::string& s, unsigned long value, unsigned minDigits, unsigned base = 10)
{
    char digits[16];
    unsigned n = 0;
    do
    {
        digits[n++] = kHexDigits[value % base];
        value /= base;
    } while (value != 0);
    while (n < minDigits)
        digits[n++] = '0';
    while (n > 0)
        s += digits[--n];
}

void AppendLiteral(std::string& s, const char* text)
{
    s.append(text, std::strlen(text));
}

// "2024/3/7, 09:05:02.045"
void AppendTimeStamp(std::string& s, const SYSTEMTIME& t)
{
    AppendUnsigned(s, t.wYear, 0);
    s += '/';
    AppendUnsigned(s, t.wMonth, 0);
    s += '/';
    AppendUnsigned(s, t.wDay, 0);
    AppendLiteral(s, ", ");
    AppendUnsigned(s, t.wHour, 2);
    s += ':';
    AppendUnsigned(s, t.wMinute, 2);
    s += ':';
    AppendUnsigned(s, t.wSecond, 2);
    s += '.';
    AppendUnsigned(s, t.wMilliseconds, 3);
}

// Appends the UTF-8 block of one entry; false when the entry gives no block.
bool FormatBlock(std::string& s, const CLogFile::LogEntry& e)
{
    switch (e.m_eType)
    {
    case CLogFile::EntryText:
    {
        std::string text;
        if (!e.m_strText.empty())
        {
            text = ustring::WideCharToMultiByte(e.m_strText, CP_UTF8, 0);
            if (text.empty())
                return false; // the text cannot be converted: the block is lost
        }
        AppendLiteral(s, "Text Event, ");
        AppendTimeStamp(s, e.m_Time);
        AppendLiteral(s, "\r\n");
        s += text;
        AppendLiteral(s, "\r\n\r\n");
        return true;
    }
    case CLogFile::EntrySent:
    case CLogFile::EntryReceived:
    {
        // The count is shown as an unsigned 32-bit number.
        const unsigned long count = static_cast<unsigned long>(e.m_aData.size() & 0xFFFFFFFFu);
        AppendLiteral(s, e.m_bSync ? "SYNC" : "ASYNC");
        AppendLiteral(s, e.m_eType == CLogFile::EntrySent ? " WRITE" : " READ");
        AppendLiteral(s, " request completed: ");
        AppendUnsigned(s, count, 0);
        AppendLiteral(s, " (0x");
        AppendUnsigned(s, count, 0, 16);
        AppendLiteral(s, ") bytes, ");
        AppendTimeStamp(s, e.m_Time);
        AppendLiteral(s, "\r\n");
        const size_t at = s.size();
        s.resize(at + DumpSize(e.m_aData.size(), kDumpBytesPerLine));
        WriteDump(e.m_aData.data(), e.m_aData.size(), kDumpBytesPerLine, &s[at]);
        AppendLiteral(s, "\r\n");
        return true;
    }
    }
    return false;
}

bool HasPathSeparator(const wchar_t* name)
{
    for (; *name != L'\0'; ++name)
        if (*name == L'\\' || *name == L'/')
            return true;
    return false;
}
} // namespace

CLogFile::CLogFile() : m_evStop(NULL, TRUE, FALSE, NULL) {}

CLogFile::~CLogFile()
{
    Close();
}

bool CLogFile::Open(const wchar_t* fileName)
{
    Close();
    try
    {
        ustring path;
        if (fileName != NULL && !HasPathSeparator(fileName))
        {
            ustring folder;
            CFile::GetSpecialFolderPath(CSIDL_PERSONAL, folder);
            folder += L"\\_Debug";
            ::CreateDirectoryW(folder.c_str(), NULL); // usually there already
            CFile::MakePath(path, NULL, folder, fileName, NULL);
        }
        else
            path = fileName;
        m_evStop.Reset();
        m_File.Open(path, GENERIC_WRITE, FILE_SHARE_READ, NULL, OPEN_ALWAYS, FILE_ATTRIBUTE_NORMAL, NULL,
                    false);
        m_File.Seek(0, FILE_END);
        m_Thread.Create(ThreadRoutine, this);
        return true;
    }
    catch (const CStdException&)
    {
        Close();
        return false;
    }
}

void CLogFile::Close()
{
    try
    {
        m_evStop.Set();
        if (m_Thread.IsCreated())
            ::WaitForSingleObject(m_Thread.GetHandle(), INFINITE);
        m_Thread.Close();
        m_File.Close();
    }
    catch (const CStdException&)
    {
    }
}

void CLogFile::AddData(EEntryType type, const void* data, size_t size, bool sync)
{
    LogEntry entry;
    entry.m_eType = type;
    entry.m_bSync = sync;
    ::GetLocalTime(&entry.m_Time);
    if (data != NULL && size > 0)
    {
        const unsigned char* bytes = static_cast<const unsigned char*>(data);
        entry.m_aData.assign(bytes, bytes + size);
    }
    AddEntry(std::move(entry));
}

void CLogFile::LogSentData(const void* data, size_t size, bool sync)
{
    AddData(EntrySent, data, size, sync);
}

void CLogFile::LogReceivedData(const void* data, size_t size, bool sync)
{
    AddData(EntryReceived, data, size, sync);
}

void CLogFile::LogText(const wchar_t* format, va_list args)
{
    LogEntry entry;
    entry.m_eType = EntryText;
    entry.m_bSync = true;
    ::GetLocalTime(&entry.m_Time);
    try
    {
        entry.m_strText.vsprintf(format, args);
    }
    catch (const std::invalid_argument&)
    {
        return; // a logging call does not fail the I/O that it records
    }
    AddEntry(std::move(entry));
}

void CLogFile::LogText(const wchar_t* format, ...)
{
    va_list args;
    va_start(args, format);
    LogText(format, args);
    va_end(args);
}

ustring CLogFile::Bin2Hex(const void* data, size_t size)
{
    ustring hex;
    if (data == NULL || size == 0)
        return hex;
    const unsigned char* bytes = static_cast<const unsigned char*>(data);
    hex.assign(3 * size - 1, L' ');
    wchar_t* out = hex.data();
    for (size_t i = 0; i < size; ++i, out += 3)
    {
        out[0] = kHexDigits[bytes[i] >> 4];
        out[1] = kHexDigits[bytes[i] & 15];
    }
    return hex;
}

ustring CLogFile::Bin2Text(const std::vector<unsigned char>& data, size_t bytesPerLine)
{
    ustring text;
    if (data.empty())
        return text;
    if (bytesPerLine == 0)
        bytesPerLine = 1;
    text.resize(DumpSize(data.size(), bytesPerLine));
    WriteDump(data.data(), data.size(), bytesPerLine, text.data());
    return text;
}

void CLogFile::AddEntry(LogEntry&& entry)
{
    detail::CScopedLock lock(m_csQueue);
    m_aQueue.push_back(std::move(entry));
}

unsigned long WINAPI CLogFile::ThreadRoutine(void* param)
{
    return static_cast<CLogFile*>(param)->WorkerRoutine();
}

unsigned long CLogFile::WorkerRoutine()
{
    ::SetThreadPriority(::GetCurrentThread(), THREAD_PRIORITY_LOWEST);
    // Kept across passes so that their storage is reused: the queue and the batch swap places.
    std::vector<LogEntry> batch;
    std::string text;
    std::vector<size_t> ends;
    for (;;)
    {
        const DWORD wait = ::WaitForSingleObject(m_evStop.GetHandle(), kWakeInterval);
        if (wait != WAIT_OBJECT_0 && wait != WAIT_TIMEOUT)
            return 0;
        const bool last = wait == WAIT_OBJECT_0;
        {
            detail::CScopedLock lock(m_csQueue);
            m_aQueue.swap(batch);
        }
        // Nothing may leave the worker: a failure here loses what it was formatting, no more.
        try
        {
            text.clear();
            ends.clear();
            for (const LogEntry& entry : batch)
            {
                if (FormatBlock(text, entry))
                    ends.push_back(text.size());
                if (text.size() >= kWriteChunk)
                {
                    WriteBlocks(text, ends);
                    text.clear();
                    ends.clear();
                }
            }
            WriteBlocks(text, ends);
        }
        catch (const std::exception&)
        {
        }
        batch.clear();
        if (text.capacity() > 4 * kWriteChunk)
            std::string().swap(text);
        if (last)
            return 0;
    }
}

void CLogFile::WriteBlocks(const std::string& text, const std::vector<size_t>& ends)
{
    if (text.empty())
        return;
    // Blocks go out together; when that write fails, each block not yet fully in the file is tried on
    // its own, so a failure costs only the blocks that really cannot be written.
    unsigned __int64 written = 0;
    if (Write(text.data(), text.size(), &written))
        return;
    size_t begin = 0;
    for (size_t end : ends)
    {
        if (begin >= written)
            Write(text.data() + begin, end - begin, NULL);
        begin = end;
    }
}

bool CLogFile::Write(const char* bytes, size_t size, unsigned __int64* written)
{
    if (written != NULL)
        *written = 0;
    if (!m_File.IsCreated())
        return false;
    try
    {
        unsigned __int64 transferred = 0;
        const bool done = m_File.Write(bytes, size, transferred, NULL);
        if (written != NULL)
            *written = transferred;
        return done && transferred == size;
    }
    catch (const CStdException&)
    {
        return false;
    }
}

} // namespace ostrand
