// Helpers of the system tests: the capture of a CWinException and a temporary folder per test.
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

inline void ExpectPayload(const ostrand::CWinException& e, DWORD code, const wchar_t* call,
                          const wchar_t* file)
{
    EXPECT_EQ(code, e.GetErrorCode());
    EXPECT_EQ(ostrand::ustring(call), e.GetFunction());
    EXPECT_EQ(ostrand::ustring(file), e.GetFileName());
    EXPECT_GT(e.GetLine(), 0u);
}

// A fresh folder under the system's temporary folder, removed with its contents at the end.
class TempFolder
{
public:
    TempFolder()
    {
        static unsigned counter = 0;
        wchar_t temp[MAX_PATH + 1];
        const DWORD n = ::GetTempPathW(MAX_PATH + 1, temp);
        m_path = std::wstring(temp, n) + L"ostrand-test-" + std::to_wstring(::GetCurrentProcessId()) + L"-" +
                 std::to_wstring(::GetTickCount()) + L"-" + std::to_wstring(++counter);
        if (n == 0 || n > MAX_PATH || !::CreateDirectoryW(m_path.c_str(), NULL))
            throw std::runtime_error("cannot create the temporary folder");
    }
    ~TempFolder() { DeleteTree(L"\\\\?\\" + m_path); }

    const std::wstring& Path() const { return m_path; }
    std::wstring operator/(const std::wstring& name) const { return m_path + L"\\" + name; }

    // Creates a chain of folders below this one, longer than `length` in all; returns its path.
    std::wstring DeepFolder(size_t length) const
    {
        std::wstring folder = m_path;
        while (folder.size() <= length)
            if (!::CreateDirectoryW((L"\\\\?\\" + (folder += L"\\" + std::wstring(50, L'd'))).c_str(), NULL))
                throw std::runtime_error("cannot create a deep folder");
        return folder;
    }

private:
    static void DeleteTree(const std::wstring& folder) // in the \\?\ form, so beyond 260 too
    {
        WIN32_FIND_DATAW data;
        HANDLE search = ::FindFirstFileW((folder + L"\\*").c_str(), &data);
        for (BOOL more = search != INVALID_HANDLE_VALUE; more; more = ::FindNextFileW(search, &data))
        {
            const std::wstring name = data.cFileName, path = folder + L"\\" + name;
            if (name == L"." || name == L"..")
                continue;
            if (data.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY)
                DeleteTree(path);
            else
                ::DeleteFileW(path.c_str());
        }
        ::FindClose(search);
        ::RemoveDirectoryW(folder.c_str());
    }

    std::wstring m_path;
};

} // namespace systest
