#include <ostrand/system/File.h>
#include <gtest/gtest.h>
#include <winioctl.h>
#include <filesystem>
#include <functional>
#include <string>
#include <tuple>
#include "system_test_util.h"

using namespace ostrand;
using u64 = unsigned __int64;

// Each test gets a fresh temporary folder; a test that goes beyond MAX_PATH removes that part itself.
class CFileTest : public ::testing::Test
{
protected:
    CFileTest()
    {
        wchar_t temp[MAX_PATH + 1];
        m_temp = std::wstring(temp, ::GetTempPathW(MAX_PATH + 1, temp)) + L"ostrand-test-" +
                 std::to_wstring(::GetCurrentProcessId()) + L"-" + std::to_wstring(::GetTickCount());
        std::filesystem::create_directory(m_temp);
    }
    void TearDown() override { std::filesystem::remove_all(m_temp); }
    std::wstring In(const std::wstring& name) const { return m_temp + L"\\" + name; }

    // Creates or replaces the file with `bytes` and leaves it open in `file`.
    std::wstring Create(CFile& file, const std::wstring& name, const std::string& bytes = "")
    {
        const std::wstring path = name[0] == L'\\' ? name : In(name);
        file.Open(path.c_str(), GENERIC_READ | GENERIC_WRITE, 0, NULL, CREATE_ALWAYS, 0);
        u64 n = 0;
        EXPECT_TRUE(file.Write(bytes.data(), bytes.size(), n) && n == bytes.size());
        return path;
    }
    std::wstring m_temp;
};

TEST_F(CFileTest, SetLengthBelowThePositionAndPositionsBeyondFourGiBOnASparseFile)
{
    CFile file;
    const std::wstring path = Create(file, L"big.bin", "hello, file");
    EXPECT_EQ(1u, file.Seek(-10, FILE_CURRENT));
    EXPECT_EQ(6u, file.Seek(-5, FILE_END));
    u64 n = 0;
    char buffer[32] = {0};
    file.SetLength(4);
    EXPECT_EQ(4u, file.GetPosition());
    EXPECT_TRUE(file.Write("yz", 2, n));
    file.SetLength(9);
    EXPECT_EQ(0u, file.Seek(0, FILE_BEGIN));
    EXPECT_TRUE(file.Read(buffer, sizeof buffer, n));
    EXPECT_EQ(std::string("hellyz\0\0\0", 9), std::string(buffer, n));
    DWORD returned = 0; // sparse where the file system allows it; on Wine the host file has a hole anyway
    ::DeviceIoControl(file.GetHandle(), FSCTL_SET_SPARSE, NULL, 0, NULL, 0, &returned, NULL);
    const __int64 four = 4ll << 30, distant = (5ll << 30) + 7;
    EXPECT_EQ(u64(distant), file.Seek(distant, FILE_BEGIN));
    EXPECT_TRUE(file.Write("Z", 1, n));
    EXPECT_EQ(u64(distant + 1), file.GetLength());
    EXPECT_EQ(u64(distant + 1), CFile::GetLength(path.c_str()));
    EXPECT_EQ(u64(distant - four), file.Seek(-four - 1, FILE_END));
    EXPECT_EQ(u64(distant), file.Seek(four, FILE_CURRENT));
    EXPECT_TRUE(file.Read(buffer, 1, n) && buffer[0] == 'Z');
    // A stale error from an earlier call must not turn a low half of all ones into a failure.
    for (u64 at : {0xFFFFFFFFull, 0x1FFFFFFFFull})
    {
        EXPECT_EQ(at, (::SetLastError(ERROR_ACCESS_DENIED), file.Seek(static_cast<__int64>(at), FILE_BEGIN)));
        EXPECT_EQ(at, (::SetLastError(ERROR_ACCESS_DENIED), file.GetPosition()));
        ::SetLastError(ERROR_ACCESS_DENIED);
        file.SetLength(at);
        EXPECT_EQ(at, (::SetLastError(ERROR_ACCESS_DENIED), file.GetLength()));
    }
}

TEST_F(CFileTest, FailuresCarryTheCallAndTheSystemError)
{
    CFile empty, readOnly, file, other;
    Create(file, L"a.txt", "abc");
    Create(other, L"c.txt");
    Create(other, L"b.txt");
    other.Close();
    const std::wstring b = In(L"b.txt"), c = In(L"c.txt"), missing = In(L"missing.txt");
    readOnly.Open(b.c_str(), GENERIC_READ, 0, NULL, OPEN_EXISTING, 0);
    char buffer[4];
    u64 n = 0;
    ustring name(L"old"), text(L"old");
    // clang-format off
    const std::tuple<DWORD, const wchar_t*, std::function<void()>> rows[] = {
        {ERROR_INVALID_HANDLE, L"ReadFile", [&] { empty.Read(buffer, 4, n); }},
        {ERROR_INVALID_HANDLE, L"WriteFile", [&] { empty.Write(buffer, 4, n); }},
        {ERROR_INVALID_HANDLE, L"FlushFileBuffers", [&] { empty.Flush(); }},
        {ERROR_INVALID_HANDLE, L"SetFilePointer", [&] { empty.GetPosition(); }},
        {ERROR_INVALID_HANDLE, L"GetFileSize", [&] { empty.GetLength(); }},
        {ERROR_NEGATIVE_SEEK, L"SetFilePointer", [&] { file.Seek(-4, FILE_CURRENT); }},
        {ERROR_ACCESS_DENIED, L"WriteFile", [&] { readOnly.Write("x", 1, n); }},
        // Windows reports 5; Wine passes the refusal of its read-only host file on as 6.
        {ERROR_INVALID_HANDLE, L"SetEndOfFile", [&] { readOnly.SetLength(1); }},
        {ERROR_FILE_EXISTS, L"CreateFile", [&] { readOnly.Open(c.c_str(), GENERIC_WRITE, 0, NULL, CREATE_NEW, 0); }},
        {ERROR_FILE_NOT_FOUND, L"MoveFile", [&] { CFile::Rename(missing.c_str(), c.c_str()); }},
        {ERROR_ALREADY_EXISTS, L"MoveFile", [&] { CFile::Rename(c.c_str(), b.c_str()); }},
        {ERROR_FILE_NOT_FOUND, L"DeleteFile", [&] { CFile::Remove(missing.c_str()); }},
        {ERROR_MOD_NOT_FOUND, L"GetModuleFileName", [&] { CFile::GetModuleFileNameW(HINSTANCE(ULONG_PTR(0x10000)), text, true); }},
        {ERROR_DIRECTORY, L"GetTempFileName", [&] { CFile::GetTempFileNameW(missing.c_str(), L"o", 0, name); }},
    };
    for (const auto& [code, call, f] : rows) ExpectWin(f, code, call, L"File");
    // clang-format on
    EXPECT_TRUE(file.GetPosition() == 3 && CFile::GetLength(b.c_str()) == 0);
    EXPECT_TRUE(!readOnly.IsCreated() &&
                CFile(b.c_str(), GENERIC_READ, 0, NULL, OPEN_EXISTING, 0).IsCreated())
        << "the failing Open did not close the handle it replaced";
    EXPECT_TRUE(name.empty() && text.empty()) << "a failing name function left the old text";
    CFile::Rename(c.c_str(), missing.c_str());
    CFile::Remove(missing.c_str());
    EXPECT_FALSE(CFile::FileExists(c.c_str()) || CFile::FileExists(missing.c_str()));
}

// A read on an empty pipe really stays pending, unlike one on a regular file.
TEST(CFileOverlappedTest, ReadOnAPipePendsUntilThePeerWrites)
{
    const std::wstring name = L"\\\\.\\pipe\\ostrand-test-" + std::to_wstring(::GetCurrentProcessId());
    CFile server, client;
    server.Attach(::CreateNamedPipeW(name.c_str(), PIPE_ACCESS_DUPLEX, PIPE_TYPE_BYTE, 1, 4096, 4096, 0, 0));
    client.Open(name.c_str(), GENERIC_READ | GENERIC_WRITE, 0, NULL, OPEN_EXISTING, FILE_FLAG_OVERLAPPED);
    COverlapped ov(NULL, TRUE, FALSE, NULL);
    char buffer[16] = {0};
    u64 n = 0, written = 0;
    EXPECT_EQ(DWORD(ERROR_IO_PENDING), client.Read(buffer, sizeof buffer, n, &ov) ? 0 : ::GetLastError());
    EXPECT_EQ(DWORD(ERROR_IO_INCOMPLETE), client.GetOverlappedResult(&ov, n, FALSE) ? 0 : ::GetLastError());
    EXPECT_TRUE(server.Write("12345", 5, written) && client.GetOverlappedResult(&ov, n, TRUE));
    EXPECT_EQ("12345", std::string(buffer, n));
}

TEST_F(CFileTest, FileExistsAndGetLengthNeverThrowAndNamesAreWhole)
{
    CFile file;
    Create(file, L"a1.txt", "1234567");
    ASSERT_TRUE(::CreateDirectoryW(In(L"sub.d").c_str(), NULL));
    std::wstring deep = L"\\\\?\\" + m_temp;
    while (deep.size() <= 300)
        ::CreateDirectoryW((deep += L"\\" + std::wstring(50, L'd')).c_str(), NULL);
    const std::wstring huge = In(std::wstring(40000, L'n'));
    Create(file, deep + L"\\long.bin", "123");
    file.Close();
    // clang-format off
    const std::tuple<std::wstring, bool, bool, u64> rows[] = {
        {In(L"A1.TXT"), true, false, 7}, {m_temp + L"/a1.txt", true, false, 7}, {In(L"sub.d"), true, true, 0},
        {In(L"*.txt"), true, false, 7}, {In(L"a?.txt"), true, false, 7}, {In(L"*.dat"), false, false, ~0ull},
        {deep + L"\\long.bin", true, false, 3}, {deep, true, true, 0}, {huge, false, false, ~0ull},
        {L"\\\\?\\" + huge, false, false, ~0ull}, {L"", false, false, ~0ull}, {L"<>|\"\x01", false, false, ~0ull},
    };
    // clang-format on
    for (const auto& [path, exists, folder, length] : rows)
    {
        SCOPED_TRACE(std::string(path.begin(), path.begin() + (path.size() > 80 ? 80 : path.size())));
        bool isFolder = !folder;
        EXPECT_EQ(exists, CFile::FileExists(path.c_str(), isFolder));
        EXPECT_EQ(folder, isFolder);
        EXPECT_EQ(length, CFile::GetLength(path.c_str()));
    }
    bool isFolder = true;
    EXPECT_FALSE(CFile::FileExists(NULL, isFolder) || isFolder || CFile::FileExists(NULL) ||
                 CFile::GetLength(static_cast<const wchar_t*>(NULL)) != ~0ull);
    EXPECT_TRUE(CFile::FileExists(CSIDL_SYSTEM, L"kernel32", L".dll", isFolder) && !isFolder);
    EXPECT_NE(~0ull, CFile::GetLength(CSIDL_SYSTEM, L"kernel32", L"dll"));
    EXPECT_FALSE(CFile::FileExists(0xFF, L"kernel32", L"dll", isFolder) || isFolder);
    EXPECT_EQ(0u, CFile::GetLength(0xFF, L"kernel32", L"dll")) << "an unresolvable special folder gives 0";

    wchar_t raw[MAX_PATH + 1];
    ustring full, name, drive, dir, fname, ext;
    EXPECT_EQ(ustring(raw, ::GetTempPathW(MAX_PATH + 1, raw)), (CFile::GetTempPathW(full), full));
    CFile::GetModuleFileNameW(NULL, full, true);
    CFile::SplitPath(full.c_str(), drive, dir, fname, ext);
    ASSERT_TRUE(::CopyFileW((drive + dir + ustring(L"ostrand_tiny_module.dll")).c_str(),
                            (deep + L"\\tiny.module.dll").c_str(), FALSE));
    HMODULE module = ::LoadLibraryW((deep + L"\\tiny.module.dll").c_str());
    ASSERT_NE(HMODULE(NULL), module) << ::GetLastError();
    CFile::GetModuleFileNameW(module, full, true);
    CFile::GetModuleFileNameW(module, name, false);
    ::FreeLibrary(module);
    EXPECT_GT(full.size(), 300u);
    EXPECT_EQ(std::wstring(L"\\tiny.module.dll|tiny.module"),
              full.substr(full.size() - 16) + L"|" + name.c_str());
    for (::DeleteFileW((deep + L"\\long.bin").c_str()), ::DeleteFileW((deep + L"\\tiny.module.dll").c_str());
         deep.size() > m_temp.size() + 4; deep.resize(deep.rfind(L'\\')))
        ::RemoveDirectoryW(deep.c_str());
}
