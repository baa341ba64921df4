#include <ostrand/platform.h>
#include <ostrand/logging/LogFileServer.h>

#include <atomic>
#include <cstdlib>

#include "internal/ScopedLock.h"

namespace ostrand
{

namespace
{
// The process-wide instance; null before the first Ref() and after the exit list has deleted it.
std::atomic<CLogFileServer*> g_pLogFileServer(nullptr);

void DeleteLogFileServer()
{
    delete g_pLogFileServer.exchange(nullptr);
}
} // namespace

CLogFileServer& CLogFileServer::Ref()
{
    CLogFileServer* server = g_pLogFileServer.load(std::memory_order_acquire);
    if (server != nullptr)
        return *server;
    static CMutex creation(NULL, FALSE, NULL);
    creation.Lock(INFINITE);
    server = g_pLogFileServer.load(std::memory_order_acquire);
    if (server == nullptr)
    {
        try
        {
            server = new CLogFileServer;
        }
        catch (...)
        {
            creation.Unlock();
            throw;
        }
        g_pLogFileServer.store(server, std::memory_order_release);
        std::atexit(DeleteLogFileServer);
    }
    creation.Unlock();
    return *server;
}

CLogFileServer::CLogFileServer() : m_eDetail(DetailNone) {}

CLogFileServer::~CLogFileServer()
{
    // The log files close (and wait for their workers) after the lock is given up.
    std::map<unsigned __int64, std::shared_ptr<CLogFile>> files;
    {
        detail::CScopedLock lock(m_csServer);
        files.swap(m_mapFiles);
        m_mapPending.clear();
    }
}

CLogFileServer::LogFileDetail CLogFileServer::GetDetail() const
{
    detail::CScopedLock lock(m_csServer);
    return m_eDetail;
}

void CLogFileServer::SetDetail(LogFileDetail detail)
{
    detail::CScopedLock lock(m_csServer);
    m_eDetail = detail;
}

bool CLogFileServer::CreateLogFile(unsigned __int64 handle, const wchar_t* prefix)
{
    // Opening the file and starting its worker happen outside the lock, so other channels keep logging.
    std::shared_ptr<CLogFile> file = std::make_shared<CLogFile>();
    if (GetDetail() == DetailNone)
        return false;
    SYSTEMTIME t;
    ::GetLocalTime(&t);
    ustring name;
    name.sprintf(L"%ls-%04u.%02u.%02u-%02u.%02u.%02u.%03u.log", prefix != NULL ? prefix : L"", t.wYear,
                 t.wMonth, t.wDay, t.wHour, t.wMinute, t.wSecond, t.wMilliseconds);
    if (!file->Open(name))
        return false;
    detail::CScopedLock lock(m_csServer);
    m_mapFiles.insert(std::make_pair(handle, file));
    return true;
    // When the channel already had a log file, the new one is destroyed here, after the lock is released
    // (locals are destroyed in reverse order).
}

bool CLogFileServer::CloseLogFile(unsigned __int64 handle)
{
    std::shared_ptr<CLogFile> file; // released after the lock
    detail::CScopedLock lock(m_csServer);
    auto found = m_mapFiles.find(handle);
    if (found == m_mapFiles.end())
        return false;
    file.swap(found->second);
    m_mapFiles.erase(found);
    for (auto i = m_mapPending.begin(); i != m_mapPending.end();)
    {
        if (i->second.m_nHandle == handle)
            i = m_mapPending.erase(i);
        else
            ++i;
    }
    return true;
}

bool CLogFileServer::LogFileExists(unsigned __int64 handle) const
{
    detail::CScopedLock lock(m_csServer);
    return FindLogFile(handle) != NULL;
}

bool CLogFileServer::Attach(unsigned __int64 handle, unsigned __int64 existingHandle)
{
    detail::CScopedLock lock(m_csServer);
    auto existing = m_mapFiles.find(existingHandle);
    if (existing == m_mapFiles.end())
        return false;
    m_mapFiles.insert(std::make_pair(handle, existing->second));
    return true;
}

bool CLogFileServer::LogSentData(unsigned __int64 handle, const void* data, size_t size, bool sync)
{
    detail::CScopedLock lock(m_csServer);
    CLogFile* file = m_eDetail != DetailNone ? FindLogFile(handle) : NULL;
    if (file == NULL)
        return false;
    file->LogSentData(data, size, sync);
    return true;
}

bool CLogFileServer::LogReceivedData(unsigned __int64 handle, const void* data, size_t size, bool sync)
{
    detail::CScopedLock lock(m_csServer);
    CLogFile* file = m_eDetail != DetailNone ? FindLogFile(handle) : NULL;
    if (file == NULL)
        return false;
    file->LogReceivedData(data, size, sync);
    return true;
}

bool CLogFileServer::LogText(unsigned __int64 handle, bool important, const wchar_t* format, ...)
{
    detail::CScopedLock lock(m_csServer);
    if (!(m_eDetail == DetailFull || (important && m_eDetail == DetailNormal)))
        return false;
    CLogFile* file = FindLogFile(handle);
    if (file == NULL)
        return false;
    va_list args;
    va_start(args, format);
    file->LogText(format, args);
    va_end(args);
    return true;
}

void CLogFileServer::AddPendingReadOperation(unsigned __int64 handle, const void* buffer, size_t size,
                                             OVERLAPPED* overlapped)
{
    AddPendingOperation(handle, OperationRead, buffer, size, overlapped);
}

void CLogFileServer::AddPendingWriteOperation(unsigned __int64 handle, const void* data, size_t size,
                                              OVERLAPPED* overlapped)
{
    AddPendingOperation(handle, OperationWrite, data, size, overlapped);
}

void CLogFileServer::AddPendingWaitOperation(unsigned __int64 handle, const unsigned long* eventMask,
                                             OVERLAPPED* overlapped)
{
    AddPendingOperation(handle, OperationWait, eventMask, sizeof(unsigned long), overlapped);
}

void CLogFileServer::AddPendingOperation(unsigned __int64 handle, EOperation operation, const void* data,
                                         size_t size, OVERLAPPED* overlapped)
{
    detail::CScopedLock lock(m_csServer);
    if (FindLogFile(handle) == NULL)
        return;
    m_mapPending[overlapped] = PendingOperation{handle, operation, data, size};
}

bool CLogFileServer::CommitPendingOperation(OVERLAPPED* overlapped, size_t transferred)
{
    detail::CScopedLock lock(m_csServer);
    auto found = m_mapPending.find(overlapped);
    if (found == m_mapPending.end())
        return false;
    const PendingOperation& op = found->second;
    CLogFile* file = FindLogFile(op.m_nHandle);
    if (file == NULL)
        return false;
    const size_t n = transferred < op.m_nSize ? transferred : op.m_nSize;
    switch (op.m_eOperation)
    {
    case OperationRead:
        file->LogReceivedData(op.m_pData, n, false);
        break;
    case OperationWrite:
        file->LogSentData(op.m_pData, n, false);
        break;
    case OperationWait:
        if (op.m_nSize == 4 && m_eDetail == DetailFull)
            file->LogText(L"ASYNC WaitCommEvent(LPDWORD lpEvtMask) succeeded. *lpEvtMask=0x%X.",
                          *static_cast<const unsigned long*>(op.m_pData));
        break;
    }
    m_mapPending.erase(found);
    return true;
}

CLogFile* CLogFileServer::FindLogFile(unsigned __int64 handle) const
{
    auto found = m_mapFiles.find(handle);
    return found != m_mapFiles.end() ? found->second.get() : NULL;
}

} // namespace ostrand
