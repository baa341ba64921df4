// Holds a CCriticalSection for one scope.
#pragma once

#include <ostrand/platform.h>
#include <ostrand/system/Object.h>

namespace ostrand
{
namespace detail
{
class CScopedLock
{
public:
    explicit CScopedLock(CCriticalSection& cs) : m_cs(cs) { m_cs.Lock(true); }
    ~CScopedLock() { m_cs.Unlock(); }

    CScopedLock(const CScopedLock&) = delete;
    CScopedLock& operator=(const CScopedLock&) = delete;

private:
    CCriticalSection& m_cs;
};
} // namespace detail
} // namespace ostrand
