// A program built only against the installed package: it formats text and catches a library
// exception thrown inside ostrand.dll.
#include <ostrand/ostrand.h>

#include <cstdio>

int main()
{
    ostrand::ustring text;
    text.sprintf(L"%s %d", L"ostrand", 7);
    if (text != L"ostrand 7")
        return 1;

    std::vector<ostrand::ustring> parts;
    ostrand::ustring::split(ostrand::ustring(L"a,b,c"), L',', parts, false);
    if (parts.size() != 3)
        return 2;

    try
    {
        ostrand::CWinException(__LINE__, L"consumer", L"CreateFile", ERROR_ACCESS_DENIED).Throw();
        return 3;
    }
    catch (const ostrand::CStdException& e)
    {
        ostrand::CStdException::CExInfo info(e);
        if (info.GetErrorCodeStr() != L"5" || info.GetFunction() != L"CreateFile" ||
            info.GetSource() != L"Win32")
            return 4;
    }
    std::printf("consumer ok, ostrand %ls\n", ostrand::GetLibraryVersion());
    return 0;
}
