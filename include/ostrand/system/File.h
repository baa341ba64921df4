// The library's file handle and its path functions.
//
// Classes in this file: CFile.
//
// CFile is a CHandle whose empty value is INVALID_HANDLE_VALUE. Every failed system call throws
// CWinException with the call name ("CreateFile", "ReadFile", ...) and the file "File"; only Read and
// Write (997, an overlapped operation under way) and GetOverlappedResult (996, still incomplete) report
// an outcome as false instead. Operations on an empty CFile reach the system with INVALID_HANDLE_VALUE
// and throw its error. Overlapped use is the caller's: open with FILE_FLAG_OVERLAPPED, pass a
// COverlapped, wait on its event, collect the count with GetOverlappedResult.
//
// The static path functions work on backslash-separated Windows paths and accept forward slashes.
// FileExists and GetLength by path never throw.
//
// Threads: no locks; one object is used by one thread at a time.
#pragma once

#include <ostrand/platform.h>
#include <ostrand/system/Object.h>
#include <ostrand/text/ustring.h>

#include <shlobj.h> // the CSIDL_ folder values of the special-folder functions

namespace ostrand
{

class OSTRAND_API CFile : public CHandle
{
public:
    CFile();
    // Opens at once; see Open.
    CFile(const wchar_t* fileName, DWORD access, DWORD share, SECURITY_ATTRIBUTES* sa, DWORD disposition,
          DWORD flags, HANDLE templateFile = NULL, bool unused = false);

    void Close() override;
    // Closes an open handle first; if CreateFileW fails the object stays empty. The last argument is
    // for derived classes; CFile ignores it.
    virtual void Open(const wchar_t* fileName, DWORD access, DWORD share, SECURITY_ATTRIBUTES* sa,
                      DWORD disposition, DWORD flags, HANDLE templateFile = NULL, bool unused = false);
    // True when done; false when an overlapped transfer is under way (ERROR_IO_PENDING).
    virtual bool Read(void* buffer, unsigned __int64 count, unsigned __int64& transferred,
                      OVERLAPPED* overlapped = NULL);
    virtual bool Write(const void* buffer, unsigned __int64 count, unsigned __int64& transferred,
                       OVERLAPPED* overlapped = NULL);
    virtual void Flush();
    virtual unsigned __int64 GetPosition() const;
    virtual unsigned __int64 Seek(__int64 offset, DWORD moveMethod);
    virtual unsigned __int64 GetLength() const;
    // Leaves the position at `length`.
    virtual void SetLength(unsigned __int64 length);
    virtual void CancelIo();
    // True when complete; false while incomplete (ERROR_IO_INCOMPLETE, only with `wait` FALSE).
    virtual bool GetOverlappedResult(OVERLAPPED* overlapped, unsigned __int64& transferred, BOOL wait);

    // Path functions
    static bool FileExists(const wchar_t* path);
    static bool FileExists(const wchar_t* path, bool& isFolder);
    static bool FileExists(int folder, const wchar_t* name, const wchar_t* ext);
    static bool FileExists(int folder, const wchar_t* name, const wchar_t* ext, bool& isFolder);
    // All bits set when nothing is found.
    static unsigned __int64 GetLength(const wchar_t* path);
    // 0 when the special folder cannot be resolved.
    static unsigned __int64 GetLength(int folder, const wchar_t* name, const wchar_t* ext);
    static void MakePath(ustring& path, const wchar_t* drive, const wchar_t* dir, const wchar_t* fname,
                         const wchar_t* ext);
    static void SplitPath(const wchar_t* path, ustring& drive, ustring& dir, ustring& fname, ustring& ext);
    static void UpdateFileName(const wchar_t* path, const wchar_t* newName, ustring& result);
    static bool IsParentFolder(const wchar_t* path, const wchar_t* folder);
    static void GetSpecialFolderPath(int folder, ustring& result);
    static void GetTempPathW(ustring& result);
    static void GetTempFileNameW(const wchar_t* path, const wchar_t* prefix, unsigned int unique,
                                 ustring& result);
    // With `fullPath` false only the file name without folder and extension.
    static void GetModuleFileNameW(HINSTANCE module, ustring& result, bool fullPath);
    static void Remove(const wchar_t* path);
    static void Rename(const wchar_t* from, const wchar_t* to);
};

} // namespace ostrand
