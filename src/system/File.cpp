#include <ostrand/system/File.h>
#include <ostrand/errors/Exception.h>

#include <shlobj.h>

#include <vector>

#include "internal/module.h"
#include "internal/throw.h"

namespace ostrand
{

namespace
{
// A transfer count reaches the system as 32 bits. A larger request moves at most 0xFFFFFFFF bytes and
// reports the shorter count, instead of wrapping to a small (or zero) count.
DWORD TransferCount(unsigned __int64 count)
{
    return count > 0xFFFFFFFFull ? 0xFFFFFFFFu : static_cast<DWORD>(count);
}

unsigned __int64 Combine(DWORD high, DWORD low)
{
    return (static_cast<unsigned __int64>(high) << 32) | low;
}

// The first match of a system search, or false; never throws.
bool FindFirst(const wchar_t* path, WIN32_FIND_DATAW& data)
{
    if (path == NULL || *path == L'\0')
        return false;
    HANDLE search = ::FindFirstFileW(path, &data);
    if (search == INVALID_HANDLE_VALUE)
        return false;
    ::FindClose(search);
    return true;
}

void Slashes(ustring& s)
{
    for (wchar_t& c : s)
        if (c == L'/')
            c = L'\\';
}
} // namespace

// Object operations ------------------------------------------------------------------------------------

CFile::CFile() : CHandle(INVALID_HANDLE_VALUE) {}

CFile::CFile(const wchar_t* fileName, DWORD access, DWORD share, SECURITY_ATTRIBUTES* sa, DWORD disposition,
             DWORD flags, HANDLE templateFile, bool unused)
    : CHandle(INVALID_HANDLE_VALUE)
{
    CFile::Open(fileName, access, share, sa, disposition, flags, templateFile, unused);
}

void CFile::Close()
{
    CHandle::Close();
}

void CFile::Open(const wchar_t* fileName, DWORD access, DWORD share, SECURITY_ATTRIBUTES* sa,
                 DWORD disposition, DWORD flags, HANDLE templateFile, bool)
{
    Close();
    HANDLE h = ::CreateFileW(fileName, access, share, sa, disposition, flags, templateFile);
    if (h == INVALID_HANDLE_VALUE)
        OSTRAND_THROW_LAST_ERROR(L"CreateFile");
    SetHandle(h);
}

bool CFile::Read(void* buffer, unsigned __int64 count, unsigned __int64& transferred, OVERLAPPED* overlapped)
{
    DWORD n = 0;
    const BOOL done = ::ReadFile(GetHandle(), buffer, TransferCount(count), &n, overlapped);
    const DWORD error = done ? 0 : ::GetLastError();
    transferred = n;
    OSTRAND_RETURN_DONE_OR_NOT_YET(done, error, ERROR_IO_PENDING, L"ReadFile");
}

bool CFile::Write(const void* buffer, unsigned __int64 count, unsigned __int64& transferred,
                  OVERLAPPED* overlapped)
{
    DWORD n = 0;
    const BOOL done = ::WriteFile(GetHandle(), buffer, TransferCount(count), &n, overlapped);
    const DWORD error = done ? 0 : ::GetLastError();
    transferred = n;
    OSTRAND_RETURN_DONE_OR_NOT_YET(done, error, ERROR_IO_PENDING, L"WriteFile");
}

void CFile::Flush()
{
    OSTRAND_CHECK_BOOL(::FlushFileBuffers(GetHandle()), L"FlushFileBuffers");
}

// SetFilePointer and GetFileSize fail only when the low half is 0xFFFFFFFF and the last error is set;
// the error is cleared first so that a stale one from an earlier call cannot fake a failure.

unsigned __int64 CFile::GetPosition() const
{
    LONG high = 0;
    ::SetLastError(0);
    const DWORD low = ::SetFilePointer(GetHandle(), 0, &high, FILE_CURRENT);
    if (low == INVALID_SET_FILE_POINTER)
    {
        const DWORD error = ::GetLastError();
        if (error != 0)
            OSTRAND_THROW_WIN(L"SetFilePointer", error);
    }
    return Combine(static_cast<DWORD>(high), low);
}

unsigned __int64 CFile::Seek(__int64 offset, DWORD moveMethod)
{
    LONG high = static_cast<LONG>(offset >> 32);
    ::SetLastError(0);
    const DWORD low =
        ::SetFilePointer(GetHandle(), static_cast<LONG>(offset & 0xFFFFFFFF), &high, moveMethod);
    if (low == INVALID_SET_FILE_POINTER)
    {
        const DWORD error = ::GetLastError();
        if (error != 0)
            OSTRAND_THROW_WIN(L"SetFilePointer", error);
    }
    return Combine(static_cast<DWORD>(high), low);
}

unsigned __int64 CFile::GetLength() const
{
    DWORD high = 0;
    ::SetLastError(0);
    const DWORD low = ::GetFileSize(GetHandle(), &high);
    if (low == INVALID_FILE_SIZE)
    {
        const DWORD error = ::GetLastError();
        if (error != 0)
            OSTRAND_THROW_WIN(L"GetFileSize", error);
    }
    return Combine(high, low);
}

void CFile::SetLength(unsigned __int64 length)
{
    Seek(static_cast<__int64>(length), FILE_BEGIN);
    OSTRAND_CHECK_BOOL(::SetEndOfFile(GetHandle()), L"SetEndOfFile");
}

void CFile::CancelIo()
{
    OSTRAND_CHECK_BOOL(::CancelIo(GetHandle()), L"CancelIo");
}

bool CFile::GetOverlappedResult(OVERLAPPED* overlapped, unsigned __int64& transferred, BOOL wait)
{
    DWORD n = 0;
    const BOOL done = ::GetOverlappedResult(GetHandle(), overlapped, &n, wait);
    const DWORD error = done ? 0 : ::GetLastError();
    transferred = n;
    OSTRAND_RETURN_DONE_OR_NOT_YET(done, error, ERROR_IO_INCOMPLETE, L"GetOverlappedResult");
}

// Testers ----------------------------------------------------------------------------------------------

bool CFile::FileExists(const wchar_t* path)
{
    bool isFolder = false;
    return FileExists(path, isFolder);
}

bool CFile::FileExists(const wchar_t* path, bool& isFolder)
{
    isFolder = false;
    WIN32_FIND_DATAW data;
    if (!FindFirst(path, data))
        return false;
    isFolder = (data.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY) != 0;
    return true;
}

bool CFile::FileExists(int folder, const wchar_t* name, const wchar_t* ext)
{
    bool isFolder = false;
    return FileExists(folder, name, ext, isFolder);
}

bool CFile::FileExists(int folder, const wchar_t* name, const wchar_t* ext, bool& isFolder)
{
    isFolder = false;
    ustring folderPath;
    try
    {
        GetSpecialFolderPath(folder, folderPath);
    }
    catch (const CWinException&)
    {
        return false;
    }
    ustring path;
    MakePath(path, NULL, folderPath, name, ext);
    return FileExists(path, isFolder);
}

unsigned __int64 CFile::GetLength(const wchar_t* path)
{
    WIN32_FIND_DATAW data;
    if (!FindFirst(path, data))
        return ~0ull;
    return Combine(data.nFileSizeHigh, data.nFileSizeLow);
}

unsigned __int64 CFile::GetLength(int folder, const wchar_t* name, const wchar_t* ext)
{
    ustring folderPath;
    try
    {
        GetSpecialFolderPath(folder, folderPath);
    }
    catch (const CWinException&)
    {
        return 0;
    }
    ustring path;
    MakePath(path, NULL, folderPath, name, ext);
    return GetLength(path);
}

// Path text --------------------------------------------------------------------------------------------

void CFile::MakePath(ustring& path, const wchar_t* drive, const wchar_t* dir, const wchar_t* fname,
                     const wchar_t* ext)
{
    ustring result;
    if (drive != NULL)
        result += drive;
    if (dir != NULL)
    {
        if (!result.empty())
            result += L'\\';
        result += dir;
    }
    if (fname != NULL)
    {
        if (!result.empty())
            result += L'\\';
        result += fname;
    }
    if (ext != NULL && *ext != L'\0')
    {
        if (*ext != L'.')
            result += L'.';
        result += ext;
    }
    Slashes(result);
    // Every run of backslashes becomes one, a leading "\\" of a network share included; stored paths
    // were built this way, so the rule stays.
    const ustring doubled(L"\\\\");
    const ustring single(L"\\");
    while (result.find(doubled) != ustring::npos)
        result.replace(doubled, single);
    path.swap(result);
}

void CFile::SplitPath(const wchar_t* path, ustring& drive, ustring& dir, ustring& fname, ustring& ext)
{
    ustring rest(path);
    Slashes(rest);

    ustring outDrive, outExt, outName;
    const size_t colon = rest.find(L':');
    if (colon != ustring::npos)
    {
        outDrive = rest.substr(0, colon + 1);
        rest.erase(0, colon + 1);
    }

    const size_t dot = rest.rfind(L'.');
    size_t slash = rest.rfind(L'\\');
    if (dot != ustring::npos && (slash == ustring::npos || slash < dot))
    {
        outExt = rest.substr(dot);
        rest.erase(dot);
    }

    slash = rest.rfind(L'\\');
    if (slash != ustring::npos)
    {
        outName = rest.substr(slash + 1);
        rest.erase(slash + 1);
    }
    else
    {
        outName.swap(rest);
        rest.clear();
    }

    drive.swap(outDrive);
    dir.swap(rest);
    fname.swap(outName);
    ext.swap(outExt);
}

void CFile::UpdateFileName(const wchar_t* path, const wchar_t* newName, ustring& result)
{
    if (path == NULL || *path == L'\0')
    {
        result = newName;
        return;
    }
    ustring drive, dir, fname, ext;
    SplitPath(path, drive, dir, fname, ext);
    MakePath(result, drive, dir, newName, NULL);
}

bool CFile::IsParentFolder(const wchar_t* path, const wchar_t* folder)
{
    ustring p(path), f(folder);
    Slashes(p);
    Slashes(f);
    std::vector<ustring> pathParts, folderParts;
    ustring::split(p, L'\\', pathParts, false);
    ustring::split(f, L'\\', folderParts, false);
    if (folderParts.size() > pathParts.size())
        return false;
    for (size_t i = 0; i < folderParts.size(); ++i)
        if (folderParts[i].compareNoCase(pathParts[i], ustring::npos) != 0)
            return false;
    return true;
}

// System folders and names -----------------------------------------------------------------------------

void CFile::GetSpecialFolderPath(int folder, ustring& result)
{
    wchar_t buffer[MAX_PATH] = {0};
    ::SetLastError(0);
    if (!::SHGetSpecialFolderPathW(NULL, buffer, folder, FALSE))
        OSTRAND_THROW_LAST_ERROR(L"SHGetSpecialFolderPath");
    result = buffer;
}

void CFile::GetTempPathW(ustring& result)
{
    // GetTempPathW answers a too-small buffer with the size it needs (terminator included), so grow
    // to that rather than return a cut path.
    std::vector<wchar_t> buffer(MAX_PATH + 1);
    for (;;)
    {
        const DWORD n = ::GetTempPathW(static_cast<DWORD>(buffer.size()), buffer.data());
        if (n == 0)
        {
            const DWORD error = ::GetLastError();
            result.clear();
            OSTRAND_THROW_WIN(L"GetTempPath", error);
        }
        if (n < buffer.size())
        {
            result.assign(buffer.data(), n);
            return;
        }
        buffer.resize(n + 1);
    }
}

void CFile::GetTempFileNameW(const wchar_t* path, const wchar_t* prefix, unsigned int unique, ustring& result)
{
    wchar_t buffer[MAX_PATH + 1] = {0};
    if (::GetTempFileNameW(path, prefix, unique, buffer) == 0)
    {
        const DWORD error = ::GetLastError();
        result.clear();
        OSTRAND_THROW_WIN(L"GetTempFileName", error);
    }
    result = buffer;
}

void CFile::GetModuleFileNameW(HINSTANCE module, ustring& result, bool fullPath)
{
    const ustring path = detail::ModuleFileName(module);
    if (path.empty())
    {
        const DWORD error = ::GetLastError();
        result.clear();
        OSTRAND_THROW_WIN(L"GetModuleFileName", error);
    }
    result = fullPath ? path : detail::BaseNameWithoutExtension(path);
}

void CFile::Remove(const wchar_t* path)
{
    OSTRAND_CHECK_BOOL(::DeleteFileW(path), L"DeleteFile");
}

void CFile::Rename(const wchar_t* from, const wchar_t* to)
{
    OSTRAND_CHECK_BOOL(::MoveFileW(from, to), L"MoveFile");
}

} // namespace ostrand
