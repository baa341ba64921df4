#include "internal/module.h"
#include "internal/throw.h"

namespace
{
HINSTANCE g_hLibraryModule = NULL;
}

extern "C" BOOL WINAPI DllMain(HINSTANCE instance, DWORD reason, LPVOID)
{
    if (reason == DLL_PROCESS_ATTACH)
    {
        g_hLibraryModule = instance;
        ::DisableThreadLibraryCalls(instance);
    }
    return TRUE;
}

namespace ostrand
{
namespace detail
{

HINSTANCE LibraryModule()
{
    return g_hLibraryModule;
}

ustring ModuleFileName(HMODULE module)
{
    // GetModuleFileNameW returns the buffer size (and does not terminate the text) when the path does
    // not fit, so grow until it does instead of returning a cut path.
    ustring path(MAX_PATH, L'\0');
    for (;;)
    {
        const DWORD n = ::GetModuleFileNameW(module, &path.at(0), static_cast<DWORD>(path.size()));
        if (n == 0)
            return ustring();
        if (n < path.size())
        {
            path.resize(n);
            return path;
        }
        if (path.size() >= 32768)
            return ustring();
        path.resize(path.size() * 2);
    }
}

ustring BaseNameWithoutExtension(const ustring& path)
{
    const size_t slash = path.find_last_of(L"\\/:");
    ustring name(slash == ustring::npos ? path : ustring(path.substr(slash + 1)));
    const size_t dot = name.rfind(L'.');
    if (dot != ustring::npos)
        name.resize(dot);
    return name;
}

} // namespace detail
} // namespace ostrand

#include <ostrand/version.h>

const wchar_t* ostrand::GetLibraryVersion()
{
    return OSTRAND_WIDEN(OSTRAND_VERSION_STRING);
}
