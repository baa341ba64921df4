#include <ostrand/system/File.h>

#include <gtest/gtest.h>

#include <shlobj.h>
#include <winioctl.h>

#include <string>
#include <vector>

#include "system_test_util.h"

using namespace ostrand;
using systest::CatchWin;
using systest::ExpectPayload;
using systest::TempFolder;
using systest::WriteWholeFile;

namespace
{
const unsigned __int64 kGiB = 1ull << 30;

class CFileTest : public ::testing::Test
{
protected:
    TempFolder m_temp;

    std::wstring PathOf(const wchar_t* name) const { return m_temp / name; }

    void OpenNew(CFile& file, const wchar_t* name, DWORD flags = 0)
    {
        file.Open(PathOf(name).c_str(), GENERIC_READ | GENERIC_WRITE, 0, NULL, CREATE_ALWAYS, flags);
    }

    static void WriteAll(CFile& file, const std::string& bytes)
    {
        unsigned __int64 n = 0;
        ASSERT_TRUE(file.Write(bytes.data(), bytes.size(), n));
        ASSERT_EQ(bytes.size(), n);
    }
};

// Whether a second exclusive open of `path` works, i.e. no one holds the file open any more.
bool CanOpenExclusively(const std::wstring& path)
{
    HANDLE h = ::CreateFileW(path.c_str(), GENERIC_READ, 0, NULL, OPEN_EXISTING, 0, NULL);
    if (h == INVALID_HANDLE_VALUE)
        return false;
    ::CloseHandle(h);
    return true;
}
} // namespace

// Open and close ----------------------------------------------------------------------------------------

TEST_F(CFileTest, WrittenBytesReadBackAndEndOfFileReadsZero)
{
    CFile file;
    EXPECT_FALSE(file.IsCreated());
    OpenNew(file, L"a.bin");
    EXPECT_TRUE(file.IsCreated());
    WriteAll(file, "hello, file");
    file.Flush();
    EXPECT_EQ(11u, file.GetLength());
    EXPECT_EQ(0u, file.Seek(0, FILE_BEGIN));

    char buffer[32] = {0};
    unsigned __int64 n = 99;
    EXPECT_TRUE(file.Read(buffer, sizeof buffer, n));
    EXPECT_EQ(11u, n);
    EXPECT_EQ(std::string("hello, file"), std::string(buffer, 11));
    EXPECT_TRUE(file.Read(buffer, sizeof buffer, n));
    EXPECT_EQ(0u, n);
}

TEST_F(CFileTest, ConstructorOpensAndDestructorCloses)
{
    const std::wstring path = PathOf(L"c.bin");
    {
        CFile file(path.c_str(), GENERIC_WRITE, 0, NULL, CREATE_NEW, 0);
        EXPECT_TRUE(file.IsCreated());
        EXPECT_FALSE(CanOpenExclusively(path));
    }
    EXPECT_TRUE(CanOpenExclusively(path));
}

TEST_F(CFileTest, OpenOnAnOpenObjectClosesTheOldHandleFirst)
{
    CFile file;
    OpenNew(file, L"first.bin");
    OpenNew(file, L"second.bin");
    EXPECT_TRUE(CanOpenExclusively(PathOf(L"first.bin")));
    EXPECT_FALSE(CanOpenExclusively(PathOf(L"second.bin")));
}

TEST_F(CFileTest, FailedOpenLeavesTheObjectEmptyAndTheOldFileClosed)
{
    CFile file;
    OpenNew(file, L"first.bin");
    const std::wstring missing = PathOf(L"missing.bin");
    ExpectPayload(CatchWin([&] { file.Open(missing.c_str(), GENERIC_READ, 0, NULL, OPEN_EXISTING, 0); }),
                  ERROR_FILE_NOT_FOUND, L"CreateFile", L"File");
    EXPECT_FALSE(file.IsCreated());
    EXPECT_TRUE(CanOpenExclusively(PathOf(L"first.bin")));
}

TEST_F(CFileTest, ConstructorPassesTheOpenFailureOn)
{
    const std::wstring inMissingFolder = m_temp / L"no-such-folder\\x.bin";
    ExpectPayload(
        CatchWin([&] { CFile file(inMissingFolder.c_str(), GENERIC_READ, 0, NULL, OPEN_EXISTING, 0); }),
        ERROR_PATH_NOT_FOUND, L"CreateFile", L"File");
    const std::wstring existing = PathOf(L"exists.bin");
    WriteWholeFile(existing, "x");
    ExpectPayload(CatchWin([&] { CFile file(existing.c_str(), GENERIC_WRITE, 0, NULL, CREATE_NEW, 0); }),
                  ERROR_FILE_EXISTS, L"CreateFile", L"File");
}

TEST_F(CFileTest, CloseTwiceIsHarmless)
{
    CFile file;
    OpenNew(file, L"a.bin");
    file.Close();
    EXPECT_FALSE(file.IsCreated());
    EXPECT_NO_THROW(file.Close());
}

// Failures of the object operations ---------------------------------------------------------------------

TEST_F(CFileTest, OperationsOnAnEmptyObjectThrowTheSystemError)
{
    CFile file;
    char buffer[4];
    unsigned __int64 n = 0;
    ExpectPayload(CatchWin([&] { file.Read(buffer, 4, n); }), ERROR_INVALID_HANDLE, L"ReadFile", L"File");
    ExpectPayload(CatchWin([&] { file.Write(buffer, 4, n); }), ERROR_INVALID_HANDLE, L"WriteFile", L"File");
    ExpectPayload(CatchWin([&] { file.Flush(); }), ERROR_INVALID_HANDLE, L"FlushFileBuffers", L"File");
    ExpectPayload(CatchWin([&] { file.GetPosition(); }), ERROR_INVALID_HANDLE, L"SetFilePointer", L"File");
    ExpectPayload(CatchWin([&] { file.Seek(1, FILE_BEGIN); }), ERROR_INVALID_HANDLE, L"SetFilePointer",
                  L"File");
    ExpectPayload(CatchWin([&] { file.GetLength(); }), ERROR_INVALID_HANDLE, L"GetFileSize", L"File");
    ExpectPayload(CatchWin([&] { file.SetLength(1); }), ERROR_INVALID_HANDLE, L"SetFilePointer", L"File");
    // INVALID_HANDLE_VALUE is also the current process's pseudo-handle, which Wine's CancelIo accepts;
    // a handle that does not exist fails everywhere.
    ASSERT_TRUE(file.Attach(reinterpret_cast<HANDLE>(static_cast<ULONG_PTR>(0x7FFFFF00))));
    ExpectPayload(CatchWin([&] { file.CancelIo(); }), ERROR_INVALID_HANDLE, L"CancelIo", L"File");
    file.Detach();
}

TEST_F(CFileTest, AccessDeniedOnAReadOnlyHandle)
{
    const std::wstring path = PathOf(L"ro.bin");
    WriteWholeFile(path, "0123456789");
    CFile file(path.c_str(), GENERIC_READ, 0, NULL, OPEN_EXISTING, 0);
    unsigned __int64 n = 0;
    ExpectPayload(CatchWin([&] { file.Write("x", 1, n); }), ERROR_ACCESS_DENIED, L"WriteFile", L"File");
    // The seek of SetLength succeeds, the truncation does not.
    // Windows reports 5; Wine truncates the host file descriptor and reports 87.
    const CWinException e = CatchWin([&] { file.SetLength(4); });
    EXPECT_EQ(ustring(L"SetEndOfFile"), e.GetFunction());
    EXPECT_EQ(ustring(L"File"), e.GetFileName());
    EXPECT_TRUE(e.GetErrorCode() == ERROR_ACCESS_DENIED || e.GetErrorCode() == ERROR_INVALID_PARAMETER)
        << e.GetErrorCode();
    EXPECT_EQ(10u, file.GetLength());
}

TEST_F(CFileTest, SeekBeforeTheStartFails)
{
    CFile file;
    OpenNew(file, L"a.bin");
    WriteAll(file, "abc");
    ExpectPayload(CatchWin([&] { file.Seek(-4, FILE_CURRENT); }), ERROR_NEGATIVE_SEEK, L"SetFilePointer",
                  L"File");
    EXPECT_EQ(3u, file.GetPosition());
}

// Positions and lengths ---------------------------------------------------------------------------------

TEST_F(CFileTest, SeekMovesFromEachOrigin)
{
    CFile file;
    OpenNew(file, L"a.bin");
    WriteAll(file, std::string(100, 'x'));
    EXPECT_EQ(100u, file.GetPosition());
    EXPECT_EQ(10u, file.Seek(10, FILE_BEGIN));
    EXPECT_EQ(15u, file.Seek(5, FILE_CURRENT));
    EXPECT_EQ(12u, file.Seek(-3, FILE_CURRENT));
    EXPECT_EQ(90u, file.Seek(-10, FILE_END));
    EXPECT_EQ(90u, file.GetPosition());
}

TEST_F(CFileTest, SetLengthBelowThePositionLeavesThePositionAtTheNewEnd)
{
    CFile file;
    OpenNew(file, L"a.bin");
    WriteAll(file, std::string(100, 'x'));
    file.SetLength(40);
    EXPECT_EQ(40u, file.GetLength());
    EXPECT_EQ(40u, file.GetPosition());
    // Writing continues at the new end, not at the old position.
    WriteAll(file, "yz");
    EXPECT_EQ(42u, file.GetLength());
    EXPECT_EQ(42u, CFile::GetLength(PathOf(L"a.bin").c_str()));
}

TEST_F(CFileTest, SetLengthAboveTheEndExtendsWithZeros)
{
    CFile file;
    OpenNew(file, L"a.bin");
    WriteAll(file, "ab");
    file.SetLength(6);
    EXPECT_EQ(6u, file.GetPosition());
    file.Seek(0, FILE_BEGIN);
    char buffer[8];
    unsigned __int64 n = 0;
    ASSERT_TRUE(file.Read(buffer, sizeof buffer, n));
    ASSERT_EQ(6u, n);
    EXPECT_EQ(std::string("ab\0\0\0\0", 6), std::string(buffer, 6));
}

TEST_F(CFileTest, PositionsAndLengthsBeyondFourGiB)
{
    CFile file;
    OpenNew(file, L"big.bin");
    DWORD returned = 0;
    // Sparse where the file system allows it; on Wine the host file has a hole anyway.
    ::DeviceIoControl(file.GetHandle(), FSCTL_SET_SPARSE, NULL, 0, NULL, 0, &returned, NULL);

    const unsigned __int64 distant = 5 * kGiB + 7;
    EXPECT_EQ(distant, file.Seek(static_cast<__int64>(distant), FILE_BEGIN));
    EXPECT_EQ(distant, file.GetPosition());
    WriteAll(file, "Z");
    EXPECT_EQ(distant + 1, file.GetLength());
    EXPECT_EQ(distant + 1, CFile::GetLength(PathOf(L"big.bin").c_str()));

    EXPECT_EQ(distant, file.Seek(-1, FILE_END));
    EXPECT_EQ(distant - 4 * kGiB, file.Seek(-static_cast<__int64>(4 * kGiB), FILE_CURRENT));
    EXPECT_EQ(distant, file.Seek(static_cast<__int64>(4 * kGiB), FILE_CURRENT));
    char c = 0;
    unsigned __int64 n = 0;
    ASSERT_TRUE(file.Read(&c, 1, n));
    EXPECT_EQ(1u, n);
    EXPECT_EQ('Z', c);

    file.SetLength(4 * kGiB + 1);
    EXPECT_EQ(4 * kGiB + 1, file.GetLength());
    EXPECT_EQ(4 * kGiB + 1, file.GetPosition());
    file.SetLength(0);
}

TEST_F(CFileTest, LowHalfOfAllOnesIsAPositionNotAFailure)
{
    CFile file;
    OpenNew(file, L"edge.bin");
    DWORD returned = 0;
    ::DeviceIoControl(file.GetHandle(), FSCTL_SET_SPARSE, NULL, 0, NULL, 0, &returned, NULL);

    // A stale error from an earlier call must not turn the valid result 0xFFFFFFFF into a failure.
    ::SetLastError(ERROR_ACCESS_DENIED);
    EXPECT_EQ(0xFFFFFFFFu, file.Seek(0xFFFFFFFF, FILE_BEGIN));
    ::SetLastError(ERROR_ACCESS_DENIED);
    EXPECT_EQ(0xFFFFFFFFu, file.GetPosition());
    ::SetLastError(ERROR_ACCESS_DENIED);
    file.SetLength(0xFFFFFFFF);
    ::SetLastError(ERROR_ACCESS_DENIED);
    EXPECT_EQ(0xFFFFFFFFu, file.GetLength());
    // The same low half with a high half of 1.
    ::SetLastError(ERROR_ACCESS_DENIED);
    EXPECT_EQ(0x1FFFFFFFFull, file.Seek(0x1FFFFFFFFll, FILE_BEGIN));
    file.SetLength(0);
}

// Overlapped I/O ----------------------------------------------------------------------------------------

namespace
{
// A byte pipe: the server end is a plain blocking handle, the client end a CFile opened for overlapped
// I/O. A read on a pipe with nothing in it really stays pending, unlike one on a regular file.
class PipePair
{
public:
    PipePair()
    {
        static unsigned counter = 0;
        wchar_t name[96];
        _snwprintf(name, 95, L"\\\\.\\pipe\\ostrand-test-%lu-%u", ::GetCurrentProcessId(), ++counter);
        name[95] = 0;
        HANDLE h =
            ::CreateNamedPipeW(name, PIPE_ACCESS_DUPLEX, PIPE_TYPE_BYTE | PIPE_READMODE_BYTE | PIPE_WAIT, 1,
                               4096, 4096, 0, NULL);
        if (h == INVALID_HANDLE_VALUE)
            throw std::runtime_error("CreateNamedPipeW failed");
        server.Attach(h);
        client.Open(name, GENERIC_READ | GENERIC_WRITE, 0, NULL, OPEN_EXISTING, FILE_FLAG_OVERLAPPED);
        if (!::ConnectNamedPipe(server.GetHandle(), NULL) && ::GetLastError() != ERROR_PIPE_CONNECTED)
            throw std::runtime_error("ConnectNamedPipe failed");
    }

    void ServerWrite(const std::string& bytes)
    {
        DWORD n = 0;
        ASSERT_TRUE(
            ::WriteFile(server.GetHandle(), bytes.data(), static_cast<DWORD>(bytes.size()), &n, NULL));
        ASSERT_EQ(bytes.size(), n);
    }

    CFile server;
    CFile client;
};
} // namespace

TEST(CFileOverlappedTest, ReadPendsUntilThePeerWrites)
{
    PipePair pipe;
    COverlapped ov(NULL, TRUE, FALSE, NULL);
    char buffer[16] = {0};
    unsigned __int64 n = 0;

    EXPECT_FALSE(pipe.client.Read(buffer, sizeof buffer, n, &ov));
    EXPECT_EQ(static_cast<DWORD>(ERROR_IO_PENDING), ::GetLastError());
    EXPECT_EQ(0u, n);

    EXPECT_FALSE(pipe.client.GetOverlappedResult(&ov, n, FALSE));
    EXPECT_EQ(static_cast<DWORD>(ERROR_IO_INCOMPLETE), ::GetLastError());
    EXPECT_EQ(WAIT_TIMEOUT, ::WaitForSingleObject(ov.hEvent, 0));

    pipe.ServerWrite("12345");
    EXPECT_TRUE(pipe.client.GetOverlappedResult(&ov, n, TRUE));
    EXPECT_EQ(5u, n);
    EXPECT_EQ(std::string("12345"), std::string(buffer, 5));
    // A finished operation also reports completion without waiting.
    n = 0;
    EXPECT_TRUE(pipe.client.GetOverlappedResult(&ov, n, FALSE));
    EXPECT_EQ(5u, n);
}

TEST(CFileOverlappedTest, ReadOfQueuedBytesCompletesAtOnce)
{
    PipePair pipe;
    pipe.ServerWrite("abc");
    COverlapped ov(NULL, TRUE, FALSE, NULL);
    char buffer[16];
    unsigned __int64 n = 0;
    if (pipe.client.Read(buffer, sizeof buffer, n, &ov))
    {
        EXPECT_EQ(3u, n);
    }
    ASSERT_TRUE(pipe.client.GetOverlappedResult(&ov, n, TRUE));
    EXPECT_EQ(3u, n);
    EXPECT_EQ(std::string("abc"), std::string(buffer, 3));
}

TEST(CFileOverlappedTest, OverlappedWriteReachesThePeer)
{
    PipePair pipe;
    COverlapped ov(NULL, TRUE, FALSE, NULL);
    unsigned __int64 n = 0;
    pipe.client.Write("ping", 4, n, &ov);
    ASSERT_TRUE(pipe.client.GetOverlappedResult(&ov, n, TRUE));
    EXPECT_EQ(4u, n);
    char buffer[8];
    DWORD got = 0;
    ASSERT_TRUE(::ReadFile(pipe.server.GetHandle(), buffer, sizeof buffer, &got, NULL));
    EXPECT_EQ(std::string("ping"), std::string(buffer, got));
}

TEST(CFileOverlappedTest, CancelledReadIsReportedByGetOverlappedResult)
{
    PipePair pipe;
    COverlapped ov(NULL, TRUE, FALSE, NULL);
    char buffer[16];
    unsigned __int64 n = 0;
    ASSERT_FALSE(pipe.client.Read(buffer, sizeof buffer, n, &ov));
    pipe.client.CancelIo();
    ExpectPayload(CatchWin([&] { pipe.client.GetOverlappedResult(&ov, n, TRUE); }), ERROR_OPERATION_ABORTED,
                  L"GetOverlappedResult", L"File");
}

TEST_F(CFileTest, OverlappedTransfersOnARegularFileUseTheRecordsOffset)
{
    CFile file;
    OpenNew(file, L"ov.bin", FILE_FLAG_OVERLAPPED);
    COverlapped ov(NULL, TRUE, FALSE, NULL);
    unsigned __int64 n = 0;
    file.Write("0123456789", 10, n, &ov);
    ASSERT_TRUE(file.GetOverlappedResult(&ov, n, TRUE));
    EXPECT_EQ(10u, n);

    COverlapped at(NULL, TRUE, FALSE, NULL);
    at.Offset = 6;
    char buffer[16] = {0};
    file.Read(buffer, sizeof buffer, n, &at);
    ASSERT_TRUE(file.GetOverlappedResult(&at, n, TRUE));
    EXPECT_EQ(4u, n);
    EXPECT_EQ(std::string("6789"), std::string(buffer, 4));
}

// Testers by path ---------------------------------------------------------------------------------------

TEST_F(CFileTest, FileExistsTellsFilesFromFolders)
{
    WriteWholeFile(PathOf(L"data.txt"), "12345");
    ASSERT_TRUE(::CreateDirectoryW(PathOf(L"sub.d").c_str(), NULL));

    bool isFolder = true;
    EXPECT_TRUE(CFile::FileExists(PathOf(L"data.txt").c_str(), isFolder));
    EXPECT_FALSE(isFolder);
    EXPECT_TRUE(CFile::FileExists(PathOf(L"sub.d").c_str(), isFolder));
    EXPECT_TRUE(isFolder);
    EXPECT_TRUE(CFile::FileExists(PathOf(L"DATA.TXT").c_str()));
    // Forward slashes reach the system, which accepts them.
    std::wstring forward = PathOf(L"data.txt");
    for (wchar_t& c : forward)
        if (c == L'\\')
            c = L'/';
    EXPECT_TRUE(CFile::FileExists(forward.c_str()));

    isFolder = true;
    EXPECT_FALSE(CFile::FileExists(PathOf(L"nothing.txt").c_str(), isFolder));
    EXPECT_FALSE(isFolder);
}

TEST_F(CFileTest, TestersNeverThrowOnStrangeInput)
{
    WriteWholeFile(PathOf(L"a1.txt"), "1234567");
    bool isFolder = true;

    EXPECT_FALSE(CFile::FileExists(NULL, isFolder));
    EXPECT_FALSE(isFolder);
    isFolder = true;
    EXPECT_FALSE(CFile::FileExists(L"", isFolder));
    EXPECT_FALSE(isFolder);
    EXPECT_FALSE(CFile::FileExists(NULL));
    EXPECT_EQ(~0ull, CFile::GetLength(static_cast<const wchar_t*>(NULL)));
    EXPECT_EQ(~0ull, CFile::GetLength(L""));

    // Wildcards are honoured as the system search does.
    EXPECT_TRUE(CFile::FileExists(PathOf(L"*.txt").c_str()));
    EXPECT_TRUE(CFile::FileExists(PathOf(L"a?.txt").c_str()));
    EXPECT_FALSE(CFile::FileExists(PathOf(L"*.dat").c_str()));
    EXPECT_EQ(7u, CFile::GetLength(PathOf(L"*.txt").c_str()));
    EXPECT_EQ(~0ull, CFile::GetLength(PathOf(L"*.dat").c_str()));

    // Longer than any path the system takes, with and without the long-path prefix.
    const std::wstring huge = m_temp.Path() + L"\\" + std::wstring(40000, L'n');
    EXPECT_FALSE(CFile::FileExists(huge.c_str(), isFolder));
    EXPECT_FALSE(isFolder);
    EXPECT_EQ(~0ull, CFile::GetLength(huge.c_str()));
    const std::wstring hugePrefixed = L"\\\\?\\" + huge;
    EXPECT_FALSE(CFile::FileExists(hugePrefixed.c_str()));
    EXPECT_EQ(~0ull, CFile::GetLength(hugePrefixed.c_str()));
    EXPECT_FALSE(CFile::FileExists(L"\\\\?\\"));
    EXPECT_FALSE(CFile::FileExists(L"<>|\"\x01"));
    EXPECT_EQ(~0ull, CFile::GetLength(L"::"));
}

TEST_F(CFileTest, TestersFindFilesBehindPathsLongerThan260)
{
    // Build a folder chain of about 300 characters through the long-path form.
    std::wstring folder = L"\\\\?\\" + m_temp.Path();
    while (folder.size() < 320)
    {
        folder += L"\\" + std::wstring(60, L'd');
        ASSERT_TRUE(::CreateDirectoryW(folder.c_str(), NULL)) << ::GetLastError();
    }
    const std::wstring file = folder + L"\\long.bin";
    WriteWholeFile(file, "123");
    bool isFolder = true;
    EXPECT_TRUE(CFile::FileExists(file.c_str(), isFolder));
    EXPECT_FALSE(isFolder);
    EXPECT_EQ(3u, CFile::GetLength(file.c_str()));
    EXPECT_TRUE(CFile::FileExists(folder.c_str(), isFolder));
    EXPECT_TRUE(isFolder);
}

TEST(CFileSpecialFolderTest, TestersResolveTheSpecialFolder)
{
    ustring system;
    CFile::GetSpecialFolderPath(CSIDL_SYSTEM, system);
    ASSERT_FALSE(system.empty());

    bool isFolder = false;
    EXPECT_TRUE(CFile::FileExists(CSIDL_SYSTEM, L"kernel32", L"dll", isFolder));
    EXPECT_FALSE(isFolder);
    EXPECT_TRUE(CFile::FileExists(CSIDL_SYSTEM, L"kernel32", L".dll"));
    EXPECT_FALSE(CFile::FileExists(CSIDL_SYSTEM, L"no-such-module", L"dll"));
    EXPECT_TRUE(CFile::FileExists(CSIDL_WINDOWS, L"system32", NULL, isFolder));
    EXPECT_TRUE(isFolder);

    const ustring kernel = system + ustring(L"\\kernel32.dll");
    const unsigned __int64 size = CFile::GetLength(kernel.c_str());
    EXPECT_NE(~0ull, size);
    EXPECT_GT(size, 0u);
    EXPECT_EQ(size, CFile::GetLength(CSIDL_SYSTEM, L"kernel32", L"dll"));
    EXPECT_EQ(~0ull, CFile::GetLength(CSIDL_SYSTEM, L"no-such-module", L"dll"));
}

TEST(CFileSpecialFolderTest, UnresolvableFolderGivesFalseAndZero)
{
    const int noFolder = 0xFF;
    ustring result(L"untouched");
    const CWinException e = CatchWin([&] { CFile::GetSpecialFolderPath(noFolder, result); });
    EXPECT_EQ(ustring(L"SHGetSpecialFolderPath"), e.GetFunction());
    EXPECT_EQ(ustring(L"File"), e.GetFileName());
    EXPECT_EQ(ustring(L"untouched"), result);

    bool isFolder = true;
    EXPECT_FALSE(CFile::FileExists(noFolder, L"kernel32", L"dll", isFolder));
    EXPECT_FALSE(isFolder);
    EXPECT_EQ(0u, CFile::GetLength(noFolder, L"kernel32", L"dll"));
}

TEST(CFileSpecialFolderTest, DocumentsFolderIsAnExistingFolder)
{
    ustring documents;
    CFile::GetSpecialFolderPath(CSIDL_PERSONAL, documents);
    bool isFolder = false;
    EXPECT_TRUE(CFile::FileExists(documents.c_str(), isFolder));
    EXPECT_TRUE(isFolder);
}

// Remove and rename -------------------------------------------------------------------------------------

TEST_F(CFileTest, RemoveAndRenameActOrThrow)
{
    const std::wstring a = PathOf(L"a.txt"), b = PathOf(L"b.txt");
    WriteWholeFile(a, "1");
    CFile::Rename(a.c_str(), b.c_str());
    EXPECT_FALSE(CFile::FileExists(a.c_str()));
    EXPECT_TRUE(CFile::FileExists(b.c_str()));
    ExpectPayload(CatchWin([&] { CFile::Rename(a.c_str(), b.c_str()); }), ERROR_FILE_NOT_FOUND, L"MoveFile",
                  L"File");
    WriteWholeFile(a, "2");
    ExpectPayload(CatchWin([&] { CFile::Rename(a.c_str(), b.c_str()); }), ERROR_ALREADY_EXISTS, L"MoveFile",
                  L"File");

    CFile::Remove(b.c_str());
    EXPECT_FALSE(CFile::FileExists(b.c_str()));
    ExpectPayload(CatchWin([&] { CFile::Remove(b.c_str()); }), ERROR_FILE_NOT_FOUND, L"DeleteFile", L"File");
}

// Temporary and module names ----------------------------------------------------------------------------

TEST(CFileNamesTest, TempPathIsAnExistingFolderWithATrailingBackslash)
{
    ustring temp;
    CFile::GetTempPathW(temp);
    ASSERT_FALSE(temp.empty());
    EXPECT_EQ(L'\\', temp[temp.size() - 1]);
    wchar_t raw[MAX_PATH + 1];
    const DWORD n = ::GetTempPathW(MAX_PATH + 1, raw);
    EXPECT_EQ(ustring(raw, n), temp);
}

TEST(CFileNamesTest, TempPathNearTheClassicLimitIsWhole)
{
    TempFolder base;
    std::wstring folder = base.Path() + L"\\";
    folder += std::wstring(250 - folder.size(), L'n');
    ASSERT_TRUE(::CreateDirectoryW(folder.c_str(), NULL));
    std::vector<wchar_t> saved(32768);
    const DWORD savedLength = ::GetEnvironmentVariableW(L"TMP", saved.data(), 32768);
    ASSERT_TRUE(::SetEnvironmentVariableW(L"TMP", folder.c_str()));
    ustring temp;
    try
    {
        CFile::GetTempPathW(temp);
    }
    catch (const CWinException& e)
    {
        ADD_FAILURE() << e.GetErrorCode();
    }
    ::SetEnvironmentVariableW(L"TMP", savedLength ? saved.data() : NULL);
    EXPECT_EQ(ustring(folder + L"\\"), temp);
    EXPECT_EQ(251u, temp.size());
}

TEST(CFileNamesTest, TempPathLongerThan260IsWholeOrAFailureNeverCut)
{
    TempFolder base;
    std::wstring folder = base.Path();
    while (folder.size() < 300)
    {
        folder += L"\\" + std::wstring(50, L't');
        ASSERT_TRUE(::CreateDirectoryW((L"\\\\?\\" + folder).c_str(), NULL));
    }
    std::vector<wchar_t> saved(32768);
    const DWORD savedLength = ::GetEnvironmentVariableW(L"TMP", saved.data(), 32768);
    ASSERT_TRUE(::SetEnvironmentVariableW(L"TMP", folder.c_str()));
    ustring temp(L"old");
    bool threw = false;
    try
    {
        CFile::GetTempPathW(temp);
    }
    catch (const CWinException& e)
    {
        threw = true;
        // Wine refuses a temporary folder longer than the classic limit with 206.
        EXPECT_EQ(ustring(L"GetTempPath"), e.GetFunction());
        EXPECT_NE(0u, e.GetErrorCode());
        EXPECT_TRUE(temp.empty());
    }
    ::SetEnvironmentVariableW(L"TMP", savedLength ? saved.data() : NULL);
    if (!threw)
    {
        EXPECT_EQ(ustring(folder + L"\\"), temp);
    }
}

TEST(CFileNamesTest, TempFileNameCreatesOrOnlyNamesTheFile)
{
    TempFolder folder;
    ustring created;
    CFile::GetTempFileNameW(folder.Path().c_str(), L"ost", 0, created);
    EXPECT_TRUE(CFile::FileExists(created.c_str()));
    EXPECT_TRUE(CFile::IsParentFolder(created.c_str(), folder.Path().c_str()));

    ustring named;
    CFile::GetTempFileNameW(folder.Path().c_str(), L"ost", 0x1A2B, named);
    // Windows writes the number in upper-case hexadecimal, Wine in lower case.
    EXPECT_EQ(0, named.compareNoCase(folder / L"ost1A2B.tmp", ustring::npos)) << named.c_str();
    EXPECT_FALSE(CFile::FileExists(named.c_str()));
}

TEST(CFileNamesTest, TempFileNameInAMissingFolderThrowsAndClears)
{
    TempFolder folder;
    const std::wstring missing = folder / L"missing";
    ustring result(L"old");
    const CWinException e = CatchWin([&] { CFile::GetTempFileNameW(missing.c_str(), L"ost", 0, result); });
    EXPECT_EQ(ustring(L"GetTempFileName"), e.GetFunction());
    EXPECT_EQ(ustring(L"File"), e.GetFileName());
    EXPECT_NE(0u, e.GetErrorCode());
    EXPECT_TRUE(result.empty());
}

TEST(CFileNamesTest, ModuleFileNameFullOrNameOnly)
{
    wchar_t raw[MAX_PATH + 1];
    const DWORD n = ::GetModuleFileNameW(NULL, raw, MAX_PATH + 1);
    ustring full;
    CFile::GetModuleFileNameW(NULL, full, true);
    EXPECT_EQ(ustring(raw, n), full);

    ustring name;
    CFile::GetModuleFileNameW(NULL, name, false);
    EXPECT_EQ(ustring(L"ostrand_system_tests"), name);
    CFile::GetModuleFileNameW(::GetModuleHandleW(L"ostrand.dll"), name, false);
    EXPECT_EQ(ustring(L"ostrand"), name);
}

TEST(CFileNamesTest, ModuleFileNameOfAModuleThatIsNotLoadedThrowsAndClears)
{
    ustring result(L"old");
    HINSTANCE bogus = reinterpret_cast<HINSTANCE>(static_cast<ULONG_PTR>(0x10000));
    const CWinException e = CatchWin([&] { CFile::GetModuleFileNameW(bogus, result, true); });
    ExpectPayload(e, ERROR_MOD_NOT_FOUND, L"GetModuleFileName", L"File");
    EXPECT_TRUE(result.empty());
}

TEST(CFileNamesTest, ModuleFileNameLongerThan260IsNotCut)
{
    // A copy of the tiny test module in a folder chain of about 300 characters.
    ustring exe;
    CFile::GetModuleFileNameW(NULL, exe, true);
    ustring drive, dir, fname, ext;
    CFile::SplitPath(exe.c_str(), drive, dir, fname, ext);
    const std::wstring source = drive + dir + ustring(L"ostrand_tiny_module.dll");

    TempFolder base;
    std::wstring folder = base.Path();
    while (folder.size() < 300)
    {
        folder += L"\\" + std::wstring(50, L'm');
        ASSERT_TRUE(::CreateDirectoryW((L"\\\\?\\" + folder).c_str(), NULL));
    }
    const std::wstring copy = folder + L"\\tiny.module.dll";
    ASSERT_TRUE(::CopyFileW(source.c_str(), (L"\\\\?\\" + copy).c_str(), FALSE)) << ::GetLastError();
    HMODULE module = ::LoadLibraryW((L"\\\\?\\" + copy).c_str());
    ASSERT_NE(HMODULE(NULL), module) << ::GetLastError();

    ustring full, name;
    CFile::GetModuleFileNameW(module, full, true);
    CFile::GetModuleFileNameW(module, name, false);
    ::FreeLibrary(module);
    EXPECT_GT(full.size(), 300u);
    EXPECT_TRUE(full.size() >= 16 && full.compare(full.size() - 16, 16, L"\\tiny.module.dll") == 0)
        << full.c_str();
    EXPECT_EQ(ustring(L"tiny.module"), name);
}
