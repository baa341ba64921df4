// Helpers of the system tests: a temporary folder per test and the capture of a CWinException.
#pragma once

#include <ostrand/errors/Exception.h>

#include <gtest/gtest.h>

#include <stdexcept>
#include <string>

namespace systest
{

// Runs `f` and returns the CWinException it throws; records a failure when it throws none.
template <class F> ostrand::CWinException CatchWin(F f)
{
    try
    {
        f();
    }
    catch (const ostrand::CWinException& e)
    {
        return e;
    }
    ADD_FAILURE() << "no CWinException was thrown";
    return ostrand::CWinException();
}

// Checks the payload of an exception: code, call name, source file and a real line.
inline void ExpectPayload(const ostrand::CWinException& e, DWORD code, const wchar_t* call,
                          const wchar_t* file)
{
    EXPECT_EQ(code, e.GetErrorCode());
    EXPECT_EQ(ostrand::ustring(call), e.GetFunction());
    EXPECT_EQ(ostrand::ustring(file), e.GetFileName());
    EXPECT_GT(e.GetLine(), 0u);
}

// Deletes a folder with everything in it; paths go through the \\?\ form so long ones work too.
inline void DeleteTree(const std::wstring& folder)
{
    const std::wstring base = folder.compare(0, 4, L"\\\\?\\") == 0 ? folder : L"\\\\?\\" + folder;
    WIN32_FIND_DATAW data;
    HANDLE search = ::FindFirstFileW((base + L"\\*").c_str(), &data);
    if (search != INVALID_HANDLE_VALUE)
    {
        do
        {
            const std::wstring name = data.cFileName;
            if (name == L"." || name == L"..")
                continue;
            const std::wstring path = base + L"\\" + name;
            if (data.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY)
                DeleteTree(path);
            else
            {
                ::SetFileAttributesW(path.c_str(), FILE_ATTRIBUTE_NORMAL);
                ::DeleteFileW(path.c_str());
            }
        } while (::FindNextFileW(search, &data));
        ::FindClose(search);
    }
    ::RemoveDirectoryW(base.c_str());
}

// A fresh, empty folder under the system's temporary folder, removed with its contents at the end.
class TempFolder
{
public:
    TempFolder()
    {
        static unsigned counter = 0;
        wchar_t temp[MAX_PATH + 1];
        const DWORD n = ::GetTempPathW(MAX_PATH + 1, temp);
        if (n == 0 || n > MAX_PATH)
            throw std::runtime_error("no temporary folder");
        wchar_t name[64];
        _snwprintf(name, 63, L"ostrand-test-%lu-%lu-%u", ::GetCurrentProcessId(), ::GetTickCount(),
                   ++counter);
        name[63] = 0;
        m_path = std::wstring(temp) + name;
        if (!::CreateDirectoryW(m_path.c_str(), NULL))
            throw std::runtime_error("cannot create the temporary folder");
    }
    ~TempFolder() { DeleteTree(m_path); }

    TempFolder(const TempFolder&) = delete;
    TempFolder& operator=(const TempFolder&) = delete;

    // The folder without a trailing backslash.
    const std::wstring& Path() const { return m_path; }
    std::wstring operator/(const std::wstring& name) const { return m_path + L"\\" + name; }

private:
    std::wstring m_path;
};

// Writes `bytes` to a new file (replacing an old one).
inline void WriteWholeFile(const std::wstring& path, const std::string& bytes)
{
    HANDLE h = ::CreateFileW(path.c_str(), GENERIC_WRITE, 0, NULL, CREATE_ALWAYS, 0, NULL);
    ASSERT_NE(INVALID_HANDLE_VALUE, h);
    DWORD written = 0;
    EXPECT_TRUE(::WriteFile(h, bytes.data(), static_cast<DWORD>(bytes.size()), &written, NULL));
    EXPECT_EQ(bytes.size(), written);
    ::CloseHandle(h);
}

} // namespace systest
