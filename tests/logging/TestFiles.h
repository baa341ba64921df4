// Files, folders, times and text conversions for the logging tests, written on Win32 directly.
#pragma once

#include <ostrand/platform.h>

#include <shlobj.h>

#include <string>
#include <vector>

namespace logtest
{

inline std::wstring DocumentsFolder()
{
    wchar_t path[MAX_PATH] = {};
    if (FAILED(::SHGetFolderPathW(NULL, CSIDL_PERSONAL, NULL, 0, path)))
        return std::wstring();
    return path;
}

inline std::wstring DebugFolder()
{
    return DocumentsFolder() + L"\\_Debug";
}

// The whole file as bytes; empty when it cannot be read. Opened with every sharing mode, so a log
// file that is still open for writing can be read.
inline std::string ReadWholeFile(const std::wstring& path)
{
    std::string bytes;
    HANDLE h =
        ::CreateFileW(path.c_str(), GENERIC_READ, FILE_SHARE_READ | FILE_SHARE_WRITE | FILE_SHARE_DELETE,
                      NULL, OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, NULL);
    if (h == INVALID_HANDLE_VALUE)
        return bytes;
    char buffer[65536];
    DWORD n = 0;
    while (::ReadFile(h, buffer, sizeof(buffer), &n, NULL) && n > 0)
        bytes.append(buffer, n);
    ::CloseHandle(h);
    return bytes;
}

inline bool WriteWholeFile(const std::wstring& path, const std::string& bytes)
{
    HANDLE h =
        ::CreateFileW(path.c_str(), GENERIC_WRITE, 0, NULL, CREATE_ALWAYS, FILE_ATTRIBUTE_NORMAL, NULL);
    if (h == INVALID_HANDLE_VALUE)
        return false;
    DWORD n = 0;
    const BOOL ok = ::WriteFile(h, bytes.data(), static_cast<DWORD>(bytes.size()), &n, NULL);
    ::CloseHandle(h);
    return ok && n == bytes.size();
}

inline bool PathExists(const std::wstring& path)
{
    return ::GetFileAttributesW(path.c_str()) != INVALID_FILE_ATTRIBUTES;
}

// Names (without folder) of the files in `folder` that match `pattern`.
inline std::vector<std::wstring> FindFiles(const std::wstring& folder, const std::wstring& pattern)
{
    std::vector<std::wstring> names;
    WIN32_FIND_DATAW data;
    HANDLE h = ::FindFirstFileW((folder + L"\\" + pattern).c_str(), &data);
    if (h == INVALID_HANDLE_VALUE)
        return names;
    do
    {
        if (!(data.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY))
            names.push_back(data.cFileName);
    } while (::FindNextFileW(h, &data));
    ::FindClose(h);
    return names;
}

// Deletes the files in `folder` and then the folder itself (one level deep is all the tests make).
inline void RemoveFolder(const std::wstring& folder)
{
    for (const std::wstring& name : FindFiles(folder, L"*"))
        ::DeleteFileW((folder + L"\\" + name).c_str());
    ::RemoveDirectoryW(folder.c_str());
}

// A fresh folder under the temporary folder, removed with its files at the end of the scope.
class TempFolder
{
public:
    TempFolder()
    {
        wchar_t temp[MAX_PATH] = {};
        ::GetTempPathW(MAX_PATH, temp);
        static LONG counter = 0;
        m_path = std::wstring(temp) + L"ostrand-logging-" + std::to_wstring(::GetCurrentProcessId()) + L"-" +
                 std::to_wstring(::InterlockedIncrement(&counter));
        RemoveFolder(m_path);
        ::CreateDirectoryW(m_path.c_str(), NULL);
    }
    ~TempFolder() { RemoveFolder(m_path); }
    const std::wstring& Path() const { return m_path; }
    std::wstring File(const wchar_t* name) const { return m_path + L"\\" + name; }

    TempFolder(const TempFolder&) = delete;
    TempFolder& operator=(const TempFolder&) = delete;

private:
    std::wstring m_path;
};

inline unsigned long long ToTicks(const SYSTEMTIME& t)
{
    FILETIME f = {};
    ::SystemTimeToFileTime(&t, &f);
    return (static_cast<unsigned long long>(f.dwHighDateTime) << 32) | f.dwLowDateTime;
}

inline SYSTEMTIME LocalNow()
{
    SYSTEMTIME t;
    ::GetLocalTime(&t);
    return t;
}

inline std::wstring FromUtf8(const std::string& s)
{
    if (s.empty())
        return std::wstring();
    const int n = ::MultiByteToWideChar(CP_UTF8, MB_ERR_INVALID_CHARS, s.data(), int(s.size()), NULL, 0);
    if (n <= 0)
        return L"<invalid UTF-8>";
    std::wstring w(size_t(n), L'\0');
    ::MultiByteToWideChar(CP_UTF8, MB_ERR_INVALID_CHARS, s.data(), int(s.size()), &w[0], n);
    return w;
}

} // namespace logtest
