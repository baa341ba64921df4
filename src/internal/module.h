// The library's own module and its file name.
#pragma once

#include <ostrand/platform.h>
#include <ostrand/text/ustring.h>

namespace ostrand
{
namespace detail
{
// The handle stored when the library was attached; every load of the library's resources uses it.
HINSTANCE LibraryModule();

// The full path of `module` (null: the executable), however long; empty when it cannot be read.
ustring ModuleFileName(HMODULE module);

// The last path component without its extension: "C:\bin\tool.exe" gives "tool".
ustring BaseNameWithoutExtension(const ustring& path);
} // namespace detail
} // namespace ostrand
