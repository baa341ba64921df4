// The log file of one communication channel.
//
// Classes in this file: CLogFile.
//
// A CLogFile records the blocks of bytes sent and received on a channel and free text events. Producer
// threads only queue entries: the local time, a copy of the bytes or the formatted text, one append under
// the queue lock. A worker thread of its own, at the lowest priority, wakes every 100 ms, takes the whole
// queue out under the lock and formats and appends it to the file outside the lock, so logging never
// makes the I/O path wait for the disk. Close() lets the worker write everything queued before it and
// joins it.
//
// The file is UTF-8 text without a byte-order mark and with CR LF line ends; every entry is one block
// ending with an empty line:
//
//   Text Event, 2024/3/7, 09:05:02.045
//   <the text>
//
//   SYNC WRITE request completed: 4 (0x4) bytes, 2024/3/7, 09:05:02.045
//    41 54 0D 0A <28 x 3 spaces>    AT..
//
// Failures: Open reports by its result, Close never throws a library exception, and a block that cannot
// be written is lost on its own while the file stays open. Nothing the worker meets leaves the worker.
//
// Threads: any number of producers may log at once. Open and Close must not run concurrently on one
// object.
#pragma once

#include <ostrand/platform.h>
#include <ostrand/system/File.h>
#include <ostrand/system/Object.h>
#include <ostrand/system/Thread.h>
#include <ostrand/text/ustring.h>

#include <cstdarg>
#include <string>
#include <vector>

namespace ostrand
{

class OSTRAND_API CLogFile
{
public:
    enum EEntryType : int
    {
        EntryText = 0,
        EntrySent = 1,
        EntryReceived = 2
    };

    // One queued entry; the time is the producer's local time when it made the entry.
    struct LogEntry
    {
        EEntryType m_eType;
        bool m_bSync; // data only: completed synchronously (true) or as an overlapped operation
        SYSTEMTIME m_Time;
        std::vector<unsigned char> m_aData; // data entries
        ustring m_strText;                  // text events
    };

    CLogFile();
    // Closes; entries queued after the worker's last pass are discarded.
    virtual ~CLogFile();

    // Closes whatever was open, then opens `fileName` for appending (creating it when missing) and
    // starts the worker. A name without a slash or backslash goes to the folder "_Debug" of the user's
    // documents folder, which is created when missing. False, and closed, when the file cannot be opened.
    bool Open(const wchar_t* fileName);
    // Writes everything queued so far, stops the worker and closes the file. Harmless when closed.
    void Close();

    void LogSentData(const void* data, size_t size, bool sync);
    void LogReceivedData(const void* data, size_t size, bool sync);
    // The text is formatted at once with ustring::vsprintf; an invalid format queues nothing.
    void LogText(const wchar_t* format, va_list args);
    void LogText(const wchar_t* format, ...);

    // "41 54 0D 0A": upper-case pairs separated by single spaces.
    static ustring Bin2Hex(const void* data, size_t size);
    // The dump of the log: per run of `bytesPerLine` bytes one line of a space, the hex column at full
    // width ("%02X " per byte, three spaces per missing byte), four spaces, the printable column
    // (0x21..0x7E as themselves, every other byte as "."), CR LF. A `bytesPerLine` of 0 counts as 1.
    static ustring Bin2Text(const std::vector<unsigned char>& data, size_t bytesPerLine);

    CLogFile(const CLogFile&) = delete;
    CLogFile& operator=(const CLogFile&) = delete;

private:
    void AddEntry(LogEntry&& entry);
    void AddData(EEntryType type, const void* data, size_t size, bool sync);
    static unsigned long WINAPI ThreadRoutine(void* param);
    unsigned long WorkerRoutine();
    // Appends UTF-8 bytes at the end of the file; true only when every byte was written. `written`
    // (may be null) receives the count that reached the file.
    bool Write(const char* bytes, size_t size, unsigned __int64* written);
    // Writes the formatted blocks of one pass; `ends` holds the end offset of every block in `text`.
    void WriteBlocks(const std::string& text, const std::vector<size_t>& ends);

    CCriticalSection m_csQueue; // guards m_aQueue and nothing else
    CEvent m_evStop;
    CFile m_File;
    CThread m_Thread;
    std::vector<LogEntry> m_aQueue;
};

} // namespace ostrand
