// ostrand-demo: what an application of the library does, on a console.
#include <ostrand/ostrand.h>

#include <cstdio>
#include <vector>

using ostrand::ustring;

int wmain()
{
    std::wprintf(L"ostrand %ls\n\n", ostrand::GetLibraryVersion());

    // Text through ustring: formatting, splitting and matching.
    ustring line;
    line.sprintf(L"%s;%d;0x%04X;%I64u", L"COM3", 115200, 0xBEEF, 1ull << 40);
    std::vector<ustring> fields;
    ustring::split(line, L';', fields, false);
    std::wprintf(L"formatted: %ls\n", line.c_str());
    for (size_t i = 0; i < fields.size(); ++i)
        std::wprintf(L"  field %u: %ls\n", static_cast<unsigned>(i), fields[i].c_str());
    std::wprintf(L"COM3 matches COM*: %ls\n", ustring(L"COM3").compareWithMask(L"COM*") == 0 ? L"yes" : L"no");

    // A real Win32 failure, raised and reported the way every wrapper of the library does.
    try
    {
        HANDLE h = ::CreateFileW(L"\\\\.\\COM250", GENERIC_READ | GENERIC_WRITE, 0, NULL, OPEN_EXISTING, 0, NULL);
        if (h == INVALID_HANDLE_VALUE)
            ostrand::CWinException(__LINE__, L"demo", L"CreateFile", ::GetLastError()).Throw();
        ::CloseHandle(h);
    }
    catch (const ostrand::CStdException& e)
    {
        const ostrand::CStdException::CExInfo info(e);
        std::wprintf(L"\nerror %ls from %ls in %ls (%ls, line %u): %ls\n", info.GetErrorCodeStr().c_str(),
                     info.GetSource().c_str(), info.GetFunction().c_str(), info.GetFileName().c_str(),
                     info.GetLine(), info.GetErrorMessage().c_str());
    }
    return 0;
}
