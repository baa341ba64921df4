// The one path by which library code throws CWinException.
//
// Every source file is compiled with OSTRAND_SOURCE_FILE set to its base name ("File", "CommPort"), so
// an exception names the file without folder or extension. Call names are passed as the exact text the
// library reports (L"CreateFile"), not stringized from the call.
#pragma once

#include <ostrand/platform.h>

#ifndef OSTRAND_SOURCE_FILE
#error "OSTRAND_SOURCE_FILE must name the source file; the build sets it for every library source"
#endif

#define OSTRAND_WIDEN2(x) L##x
#define OSTRAND_WIDEN(x) OSTRAND_WIDEN2(x)

namespace ostrand
{
namespace detail
{
[[noreturn]] void ThrowWinException(unsigned int line, const wchar_t* file, const wchar_t* call, DWORD code);
} // namespace detail
} // namespace ostrand

// Throws CWinException for `call` with an explicit code (a returned LSTATUS, HRESULT, WSA code ...).
#define OSTRAND_THROW_WIN(call, code)                                                                        \
    ::ostrand::detail::ThrowWinException(__LINE__, OSTRAND_WIDEN(OSTRAND_SOURCE_FILE), call, (DWORD)(code))

// Throws CWinException for `call` with GetLastError(), read before anything else can change it.
#define OSTRAND_THROW_LAST_ERROR(call) OSTRAND_THROW_WIN(call, ::GetLastError())

// For the BOOL convention: throws with GetLastError() when `expr` is FALSE.
#define OSTRAND_CHECK_BOOL(expr, call)                                                                       \
    do                                                                                                       \
    {                                                                                                        \
        if (!(expr))                                                                                         \
            OSTRAND_THROW_LAST_ERROR(call);                                                                  \
    } while (0)

// For status results (LSTATUS, HRESULT): throws with the status when it is a failure.
#define OSTRAND_CHECK_HRESULT(expr, call)                                                                    \
    do                                                                                                       \
    {                                                                                                        \
        const HRESULT ostrand_hr_ = (expr);                                                                  \
        if (FAILED(ostrand_hr_))                                                                             \
            OSTRAND_THROW_WIN(call, ostrand_hr_);                                                            \
    } while (0)

#define OSTRAND_CHECK_STATUS(expr, call)                                                                     \
    do                                                                                                       \
    {                                                                                                        \
        const LONG ostrand_status_ = (expr);                                                                 \
        if (ostrand_status_ != ERROR_SUCCESS)                                                                \
            OSTRAND_THROW_WIN(call, ostrand_status_);                                                        \
    } while (0)

// For Winsock: throws with WSAGetLastError() when `failed` holds.
#define OSTRAND_CHECK_WSA(failed, call)                                                                      \
    do                                                                                                       \
    {                                                                                                        \
        if (failed)                                                                                          \
            OSTRAND_THROW_WIN(call, ::WSAGetLastError());                                                    \
    } while (0)

// For calls whose "not yet" outcome is not a failure (an overlapped operation pending, a result still
// incomplete): returns true when the call succeeded, false when its error is `notYet`, and throws
// otherwise. `error` must have been read right after the call.
#define OSTRAND_RETURN_DONE_OR_NOT_YET(succeeded, error, notYet, call)                                       \
    do                                                                                                       \
    {                                                                                                        \
        if (succeeded)                                                                                       \
            return true;                                                                                     \
        if ((error) == (notYet))                                                                             \
            return false;                                                                                    \
        OSTRAND_THROW_WIN(call, error);                                                                      \
    } while (0)
