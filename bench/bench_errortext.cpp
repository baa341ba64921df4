// Error texts: a Win32 message that only the supplementary file DATA\Win32Errors.txt knows, read
// afresh on every lookup, against the system's message table.
#include "bench.h"

#include <ostrand/errors/Exception.h>
#include <ostrand/system/File.h>

#include <string>

using ostrand::CFile;
using ostrand::CWinException;
using ostrand::ustring;

namespace
{

const int kEntries = 2000;
const DWORD kFirstCode = 0x20010000; // customer-bit codes: the system has no text for them

bool HasSystemText(DWORD code)
{
    wchar_t* text = NULL;
    const DWORD n = ::FormatMessageW(
        FORMAT_MESSAGE_ALLOCATE_BUFFER | FORMAT_MESSAGE_IGNORE_INSERTS | FORMAT_MESSAGE_FROM_SYSTEM, NULL,
        code, MAKELANGID(LANG_NEUTRAL, SUBLANG_DEFAULT), reinterpret_cast<wchar_t*>(&text), 0, NULL);
    if (text != NULL)
        ::LocalFree(text);
    return n != 0;
}

// DATA\Win32Errors.txt beside ostrand.dll for the life of the object.
class CSupplementaryFile
{
public:
    CSupplementaryFile()
    {
        ustring dll, drive, dir, name, ext;
        CFile::GetModuleFileNameW(::GetModuleHandleW(L"ostrand.dll"), dll, true);
        CFile::SplitPath(dll.c_str(), drive, dir, name, ext);
        CFile::MakePath(m_strFolder, drive.c_str(), dir.c_str(), L"DATA", NULL);
        CFile::MakePath(m_strFile, drive.c_str(), dir.c_str(), L"DATA\\Win32Errors.txt", NULL);
        ::CreateDirectoryW(m_strFolder.c_str(), NULL);
    }
    ~CSupplementaryFile()
    {
        ::DeleteFileW(m_strFile.c_str());
        ::RemoveDirectoryW(m_strFolder.c_str());
    }
    CSupplementaryFile(const CSupplementaryFile&) = delete;
    CSupplementaryFile& operator=(const CSupplementaryFile&) = delete;

    const ustring& Path() const { return m_strFile; }

    unsigned __int64 Write(const std::wstring& text)
    {
        const std::string bytes = std::string("\xFF\xFE", 2) +
                                  std::string(reinterpret_cast<const char*>(text.data()), text.size() * 2);
        CFile file(m_strFile.c_str(), GENERIC_WRITE, 0, NULL, CREATE_ALWAYS, FILE_ATTRIBUTE_NORMAL);
        unsigned __int64 written = 0;
        file.Write(bytes.data(), bytes.size(), written);
        return written;
    }

private:
    ustring m_strFolder;
    ustring m_strFile;
};

} // namespace

BENCHMARK("errortext: GetErrorMessage through Win32Errors.txt")
{
    const DWORD code = kFirstCode + kEntries - 3; // near the end of the file
    if (HasSystemText(code) || !HasSystemText(ERROR_FILE_NOT_FOUND))
    {
        std::printf("skipped: the system's message table does not fit the benchmark\n");
        return;
    }
    CSupplementaryFile file;
    std::wstring text;
    for (int i = 0; i < kEntries; ++i)
    {
        wchar_t line[128];
        std::swprintf(line, 128, L"0x%X,\"Supplementary message %d: the receiver did not answer\"\r\n",
                      kFirstCode + i, i);
        text += line;
    }
    const unsigned __int64 size = file.Write(text);

    ustring message;
    if (!CWinException(0, NULL, NULL, code).GetErrorMessage(message))
    {
        std::printf("failed: the entry was not found\n");
        return;
    }

    const int lookups = 40;
    const double perLookup = bench::BestOf(5,
                                           [&]
                                           {
                                               for (int i = 0; i < lookups; ++i)
                                               {
                                                   ustring m;
                                                   CWinException(0, NULL, NULL, code).GetErrorMessage(m);
                                                   bench::Keep(m);
                                               }
                                           }) /
                             lookups;

    const int systemLookups = 2000;
    const double perSystemLookup = bench::BestOf(5,
                                                 [&]
                                                 {
                                                     for (int i = 0; i < systemLookups; ++i)
                                                         bench::Keep(HasSystemText(ERROR_FILE_NOT_FOUND));
                                                 }) /
                                   systemLookups;

    // The reading alone: open the same file and read it through in 512-byte pieces.
    const double perRead =
        bench::BestOf(5,
                      [&]
                      {
                          for (int i = 0; i < lookups; ++i)
                          {
                              CFile f(file.Path().c_str(), GENERIC_READ, FILE_SHARE_READ, NULL, OPEN_EXISTING,
                                      FILE_ATTRIBUTE_NORMAL);
                              char piece[512];
                              DWORD n = 0;
                              while (::ReadFile(f.GetHandle(), piece, sizeof(piece), &n, NULL) && n != 0)
                                  bench::Keep(piece);
                          }
                      }) /
        lookups;

    std::printf("file of %d entries, %llu bytes; code 0x%lX is entry %d\n", kEntries,
                static_cast<unsigned long long>(size), static_cast<unsigned long>(code), kEntries - 3);
    std::printf("per lookup: %.1f us through the file, %.3f us from the system table\n", perLookup * 1e6,
                perSystemLookup * 1e6);
    bench::Report("GetErrorMessage via the file, per lookup", perLookup, perSystemLookup,
                  "FormatMessageW(2)");
    bench::Report("GetErrorMessage via the file, per lookup", perLookup, perRead,
                  "open + ReadFile 512 B pieces");
}
