// The process-wide registry of communication log files.
//
// Classes in this file: CLogFileServer.
//
// Code that owns a channel (a serial port handle, a socket) names it by its handle value, asks the
// server for a log file once, and then reports every transfer and text event with that value. The
// server passes the call to the channel's CLogFile or, when the channel has none, returns false at the
// cost of one map look-up. For overlapped I/O it keeps the caller's buffer under the OVERLAPPED record
// until the caller reports the completion with CommitPendingOperation; the buffer is not copied, so it
// must stay valid until then or until CloseLogFile.
//
// Failures: nothing throws; absent channels, absent records and DetailNone give false.
//
// Threads: every member is guarded by the server lock. Logging calls hold it while they queue into the
// log file (server lock, then the log file's queue lock); the log files' workers never take it, and a
// log file is destroyed (which waits for its worker) only after the server lock has been released.
#pragma once

#include <ostrand/platform.h>
#include <ostrand/logging/LogFile.h>
#include <ostrand/system/Object.h>

#include <map>
#include <memory>

namespace ostrand
{

class OSTRAND_API CLogFileServer
{
public:
    enum LogFileDetail : int
    {
        DetailNone = 0,   // nothing is recorded and no log file is created
        DetailNormal = 1, // data and important text events
        DetailFull = 2    // data, every text event and completed asynchronous waits
    };

    enum EOperation : int
    {
        OperationRead = 0,
        OperationWrite = 1,
        OperationWait = 2
    };

    // An overlapped operation in flight: the caller's buffer (a wait: its event mask word, size 4).
    struct PendingOperation
    {
        unsigned __int64 m_nHandle;
        EOperation m_eOperation;
        const void* m_pData;
        size_t m_nSize;
    };

    // The process-wide instance: made on first use, destroyed when the library is unloaded, and made
    // again if it is used after that.
    static CLogFileServer& Ref();

    CLogFileServer();
    // Releases every log file; each writes what was queued before it closes.
    virtual ~CLogFileServer();

    LogFileDetail GetDetail() const;
    void SetDetail(LogFileDetail detail);

    // Opens "<prefix>-yyyy.mm.dd-hh.mm.ss.mmm.log" (local time) for the channel. A prefix without a
    // path separator puts the file in "_Debug" under the user's documents folder. False at DetailNone or
    // when the file cannot be opened; true, keeping the existing log file, when the channel has one.
    bool CreateLogFile(unsigned __int64 handle, const wchar_t* prefix);
    // Removes the channel and its pending operations; its log file closes when no handle refers to it.
    bool CloseLogFile(unsigned __int64 handle);
    bool LogFileExists(unsigned __int64 handle) const;
    // Lets `handle` share the log file of `existingHandle`; an existing entry of `handle` is kept.
    bool Attach(unsigned __int64 handle, unsigned __int64 existingHandle);

    bool LogSentData(unsigned __int64 handle, const void* data, size_t size, bool sync);
    bool LogReceivedData(unsigned __int64 handle, const void* data, size_t size, bool sync);
    // Recorded at DetailFull, and at DetailNormal when `important`.
    bool LogText(unsigned __int64 handle, bool important, const wchar_t* format, ...);

    // Each replaces a record kept under the same OVERLAPPED; nothing happens for a channel without a
    // log file. The detail level is not consulted.
    void AddPendingReadOperation(unsigned __int64 handle, const void* buffer, size_t size,
                                 OVERLAPPED* overlapped);
    void AddPendingWriteOperation(unsigned __int64 handle, const void* data, size_t size,
                                  OVERLAPPED* overlapped);
    void AddPendingWaitOperation(unsigned __int64 handle, const unsigned long* eventMask,
                                 OVERLAPPED* overlapped);
    // Logs the first min(transferred, size) bytes of a read or write as ASYNC, or at DetailFull the
    // event mask of a wait, and forgets the record. False when no record is kept under `overlapped` or
    // its channel has no log file (the record is then kept).
    bool CommitPendingOperation(OVERLAPPED* overlapped, size_t transferred);

    CLogFileServer(const CLogFileServer&) = delete;
    CLogFileServer& operator=(const CLogFileServer&) = delete;

private:
    void AddPendingOperation(unsigned __int64 handle, EOperation operation, const void* data, size_t size,
                             OVERLAPPED* overlapped);
    CLogFile* FindLogFile(unsigned __int64 handle) const; // under the server lock

    mutable CCriticalSection m_csServer;
    LogFileDetail m_eDetail;
    std::map<unsigned __int64, std::shared_ptr<CLogFile>> m_mapFiles;
    std::map<OVERLAPPED*, PendingOperation> m_mapPending;
};

} // namespace ostrand
