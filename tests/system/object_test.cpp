#include <ostrand/system/File.h>
#include <ostrand/system/Object.h>

#include <gtest/gtest.h>

#include <atomic>
#include <thread>

#include "system_test_util.h"

using namespace ostrand;
using systest::CatchWin;
using systest::ExpectPayload;

namespace
{
// A value that no handle table of the test process hands out, so closing it fails with 6 without
// touching a handle that someone else owns.
HANDLE BogusHandle()
{
    return reinterpret_cast<HANDLE>(static_cast<ULONG_PTR>(0x7FFFFF00));
}

bool IsSignalled(HANDLE h)
{
    return ::WaitForSingleObject(h, 0) == WAIT_OBJECT_0;
}
} // namespace

// Ownership ---------------------------------------------------------------------------------------------

TEST(CHandleTest, AttachNeverReplacesAnOwnedHandle)
{
    CEvent event;
    const HANDLE owned = event.GetHandle();
    HANDLE other = ::CreateEventW(NULL, TRUE, FALSE, NULL);
    ASSERT_NE(HANDLE(NULL), other);

    EXPECT_FALSE(event.Attach(other));
    EXPECT_EQ(owned, event.GetHandle());
    EXPECT_EQ(owned, static_cast<void*>(event));
    // The refused handle still belongs to the caller.
    EXPECT_TRUE(::CloseHandle(other));
}

TEST(CHandleTest, AttachOfTheEmptyValueSucceedsAndLeavesTheObjectEmpty)
{
    CEvent event;
    HANDLE h = event.Detach();
    ASSERT_FALSE(event.IsCreated());

    EXPECT_TRUE(event.Attach(NULL));
    EXPECT_FALSE(event.IsCreated());
    // Still empty, so a real handle can be attached afterwards and is owned.
    EXPECT_TRUE(event.Attach(h));
    EXPECT_TRUE(event.IsCreated());
    EXPECT_EQ(h, event.GetHandle());

    CFile file; // empty value INVALID_HANDLE_VALUE
    EXPECT_TRUE(file.Attach(INVALID_HANDLE_VALUE));
    EXPECT_FALSE(file.IsCreated());
}

TEST(CHandleTest, DetachGivesUpOwnershipWithoutClosing)
{
    HANDLE h = NULL;
    {
        CEvent event(NULL, TRUE, FALSE, NULL);
        h = event.Detach();
        EXPECT_FALSE(event.IsCreated());
        EXPECT_EQ(HANDLE(NULL), event.GetHandle());
    }
    // The destructor did not close it: the handle still works.
    EXPECT_TRUE(::SetEvent(h));
    EXPECT_TRUE(IsSignalled(h));
    EXPECT_TRUE(::CloseHandle(h));
}

TEST(CHandleTest, DetachOfAnEmptyObjectReturnsTheEmptyValue)
{
    CEvent event;
    event.Close();
    EXPECT_EQ(HANDLE(NULL), event.Detach());
    CFile file;
    EXPECT_EQ(INVALID_HANDLE_VALUE, file.Detach());
}

TEST(CHandleTest, CloseReleasesTheHandleAndASecondCloseDoesNothing)
{
    CEvent event;
    HANDLE duplicate = NULL;
    ASSERT_TRUE(::DuplicateHandle(::GetCurrentProcess(), event.GetHandle(), ::GetCurrentProcess(), &duplicate,
                                  0, FALSE, DUPLICATE_SAME_ACCESS));
    const HANDLE h = event.GetHandle();
    event.Close();
    EXPECT_FALSE(event.IsCreated());
    EXPECT_EQ(HANDLE(NULL), event.GetHandle());
    // The original handle is gone (its value may be reused later, so test right away).
    DWORD flags = 0;
    EXPECT_FALSE(::GetHandleInformation(h, &flags));
    EXPECT_NO_THROW(event.Close());
    EXPECT_TRUE(::CloseHandle(duplicate));
}

TEST(CHandleTest, FailingCloseThrowsAndLeavesTheObjectEmpty)
{
    CEvent event;
    ASSERT_TRUE(::CloseHandle(event.Detach()));
    ASSERT_TRUE(event.Attach(BogusHandle()));
    ASSERT_TRUE(event.IsCreated());

    const CWinException e = CatchWin([&] { event.Close(); });
    ExpectPayload(e, ERROR_INVALID_HANDLE, L"CloseHandle", L"Object");
    EXPECT_FALSE(event.IsCreated());
    EXPECT_EQ(HANDLE(NULL), event.GetHandle());
    EXPECT_NO_THROW(event.Close());
}

TEST(CHandleTest, DestructorSwallowsAFailingClose)
{
    // Would terminate the process if the destructor let the failure out.
    {
        CEvent event;
        ASSERT_TRUE(::CloseHandle(event.Detach()));
        ASSERT_TRUE(event.Attach(BogusHandle()));
    }
    {
        CFile file;
        ASSERT_TRUE(file.Attach(BogusHandle()));
    }
    SUCCEED();
}

// Events ------------------------------------------------------------------------------------------------

TEST(CEventTest, DefaultIsAutoResetAndNotSignalled)
{
    CEvent event;
    ASSERT_TRUE(event.IsCreated());
    EXPECT_FALSE(IsSignalled(event.GetHandle()));
    event.Set();
    EXPECT_TRUE(IsSignalled(event.GetHandle()));
    EXPECT_FALSE(IsSignalled(event.GetHandle())) << "auto-reset: one wait consumes the signal";
}

TEST(CEventTest, ManualResetStaysSignalledUntilReset)
{
    CEvent event(NULL, TRUE, TRUE, NULL);
    EXPECT_TRUE(IsSignalled(event.GetHandle()));
    EXPECT_TRUE(IsSignalled(event.GetHandle()));
    event.Reset();
    EXPECT_FALSE(IsSignalled(event.GetHandle()));
}

TEST(CEventTest, SetWakesAWaiterOnAnotherThread)
{
    CEvent event;
    std::atomic<DWORD> result{0xFFFFFFFF};
    std::thread waiter([&] { result = ::WaitForSingleObject(event.GetHandle(), 10000); });
    event.Set();
    waiter.join();
    EXPECT_EQ(WAIT_OBJECT_0, result.load());
}

TEST(CEventTest, NamedEventIsOpenedByNameAndShared)
{
    wchar_t name[64];
    _snwprintf(name, 63, L"ostrand-test-event-%lu", ::GetCurrentProcessId());
    name[63] = 0;
    CEvent created(NULL, TRUE, FALSE, name);
    CEvent opened(EVENT_MODIFY_STATE | SYNCHRONIZE, FALSE, name);
    EXPECT_NE(created.GetHandle(), opened.GetHandle());
    opened.Set();
    EXPECT_TRUE(IsSignalled(created.GetHandle()));
    // Creating it again opens the existing one without complaint.
    CEvent again(NULL, TRUE, FALSE, name);
    EXPECT_TRUE(IsSignalled(again.GetHandle()));
}

TEST(CEventTest, FailuresCarryTheCallAndTheFileObject)
{
    ExpectPayload(CatchWin([] { CEvent e(SYNCHRONIZE, FALSE, L"ostrand-test-no-such-event"); }),
                  ERROR_FILE_NOT_FOUND, L"OpenEventW", L"Object");

    CEvent event;
    ::CloseHandle(event.Detach());
    ExpectPayload(CatchWin([&] { event.Set(); }), ERROR_INVALID_HANDLE, L"SetEvent", L"Object");
    ExpectPayload(CatchWin([&] { event.Reset(); }), ERROR_INVALID_HANDLE, L"ResetEvent", L"Object");

    // A mutex already holds this name, so an event of that name cannot be made.
    wchar_t name[64];
    _snwprintf(name, 63, L"ostrand-test-taken-%lu", ::GetCurrentProcessId());
    name[63] = 0;
    CMutex mutex(NULL, FALSE, name);
    ExpectPayload(CatchWin([&] { CEvent e(NULL, FALSE, FALSE, name); }), ERROR_INVALID_HANDLE,
                  L"CreateEventW", L"Object");
}

// Mutexes -----------------------------------------------------------------------------------------------

namespace
{
// Holds `mutex` on its own thread from construction until Release().
class MutexHolder
{
public:
    explicit MutexHolder(CMutex& mutex)
        : m_thread(
              [this, &mutex]
              {
                  m_locked = mutex.Lock(INFINITE);
                  ::SetEvent(m_held.GetHandle());
                  ::WaitForSingleObject(m_release.GetHandle(), INFINITE);
                  mutex.Unlock();
              })
    {
        ::WaitForSingleObject(m_held.GetHandle(), INFINITE);
    }
    ~MutexHolder() { Release(); }
    void Release()
    {
        if (m_thread.joinable())
        {
            m_release.Set();
            m_thread.join();
        }
    }
    bool Locked() const { return m_locked; }

private:
    CEvent m_held;
    CEvent m_release;
    std::atomic<bool> m_locked{false};
    std::thread m_thread;
};
} // namespace

TEST(CMutexTest, LockWithZeroTimeoutFailsWhileAnotherThreadOwnsIt)
{
    CMutex mutex(NULL, FALSE, NULL);
    MutexHolder holder(mutex);
    ASSERT_TRUE(holder.Locked());
    EXPECT_FALSE(mutex.Lock(0));
    EXPECT_FALSE(mutex.Lock(20));
    holder.Release();
    EXPECT_TRUE(mutex.Lock(0));
    mutex.Unlock();
}

TEST(CMutexTest, OwnerLocksRecursivelyAndUnlocksAsOftenAsItLocked)
{
    CMutex mutex(NULL, TRUE, NULL);
    EXPECT_TRUE(mutex.Lock(0));
    mutex.Unlock();
    mutex.Unlock();
    // Released for good now: a third Unlock is not the owner's any more.
    ExpectPayload(CatchWin([&] { mutex.Unlock(); }), ERROR_NOT_OWNER, L"ReleaseMutex", L"Object");
}

TEST(CMutexTest, AbandonedMutexCountsAsAcquired)
{
    CMutex mutex(NULL, FALSE, NULL);
    std::atomic<bool> locked{false};
    std::thread leaver([&] { locked = mutex.Lock(INFINITE); }); // ends without Unlock
    leaver.join();
    ASSERT_TRUE(locked.load());

    EXPECT_TRUE(mutex.Lock(5000));
    // Really ours now: another thread cannot take it, and we can release it.
    std::atomic<bool> other{true};
    std::thread prober([&] { other = mutex.Lock(0); });
    prober.join();
    EXPECT_FALSE(other.load());
    EXPECT_NO_THROW(mutex.Unlock());
}

TEST(CMutexTest, UnlockFromANonOwnerAndLockOfAClosedMutexThrow)
{
    CMutex mutex(NULL, FALSE, NULL);
    ExpectPayload(CatchWin([&] { mutex.Unlock(); }), ERROR_NOT_OWNER, L"ReleaseMutex", L"Object");
    mutex.Close();
    ExpectPayload(CatchWin([&] { mutex.Lock(0); }), ERROR_INVALID_HANDLE, L"WaitForSingleObject", L"Object");
}

// Critical sections -------------------------------------------------------------------------------------

TEST(CCriticalSectionTest, HoldsNoHandle)
{
    CCriticalSection cs;
    EXPECT_FALSE(cs.IsCreated());
    EXPECT_EQ(HANDLE(NULL), cs.GetHandle());
}

TEST(CCriticalSectionTest, TryLockFailsWhileAnotherThreadHoldsItAndRecursesOnTheOwner)
{
    CCriticalSection cs;
    CEvent held, release;
    std::atomic<bool> recursive{false};
    std::thread owner(
        [&]
        {
            cs.Lock(true);
            recursive = cs.Lock(false);
            held.Set();
            ::WaitForSingleObject(release.GetHandle(), INFINITE);
            cs.Unlock();
            cs.Unlock();
        });
    ::WaitForSingleObject(held.GetHandle(), INFINITE);
    EXPECT_TRUE(recursive.load());
    EXPECT_FALSE(cs.Lock(false));
    release.Set();
    owner.join();
    // Both levels were left: the section is free again.
    EXPECT_TRUE(cs.Lock(false));
    cs.Unlock();
}

TEST(CCriticalSectionTest, WaitingLockBlocksUntilTheOwnerLeaves)
{
    CCriticalSection cs;
    ASSERT_TRUE(cs.Lock(true));
    std::atomic<bool> entered{false};
    std::thread waiter(
        [&]
        {
            cs.Lock(true);
            entered = true;
            cs.Unlock();
        });
    ::Sleep(50);
    EXPECT_FALSE(entered.load());
    cs.Unlock();
    waiter.join();
    EXPECT_TRUE(entered.load());
}

// Winsock events ----------------------------------------------------------------------------------------

class CWSAEventTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        WSADATA data;
        ASSERT_EQ(0, ::WSAStartup(MAKEWORD(2, 2), &data));
    }
    void TearDown() override { ::WSACleanup(); }
};

TEST_F(CWSAEventTest, IsAManualResetEventThatSetAndResetDrive)
{
    CWSAEvent event;
    ASSERT_TRUE(event.IsCreated());
    HANDLE h = event.GetHandle();
    EXPECT_EQ(WSA_WAIT_TIMEOUT, ::WSAWaitForMultipleEvents(1, &h, FALSE, 0, FALSE));
    event.Set();
    EXPECT_EQ(WSA_WAIT_EVENT_0, ::WSAWaitForMultipleEvents(1, &h, FALSE, 0, FALSE));
    EXPECT_EQ(WSA_WAIT_EVENT_0, ::WSAWaitForMultipleEvents(1, &h, FALSE, 0, FALSE));
    event.Reset();
    EXPECT_EQ(WSA_WAIT_TIMEOUT, ::WSAWaitForMultipleEvents(1, &h, FALSE, 0, FALSE));
}

TEST_F(CWSAEventTest, CloseEmptiesTheObjectAndASecondCloseDoesNothing)
{
    CWSAEvent event;
    const HANDLE h = event.GetHandle();
    event.Close();
    EXPECT_FALSE(event.IsCreated());
    DWORD flags = 0;
    EXPECT_FALSE(::GetHandleInformation(h, &flags));
    EXPECT_NO_THROW(event.Close());
}

TEST_F(CWSAEventTest, FailingCloseThrowsAndKeepsTheHandle)
{
    CWSAEvent event;
    ASSERT_TRUE(::WSACloseEvent(event.Detach()));
    ASSERT_TRUE(event.Attach(BogusHandle()));

    const CWinException e = CatchWin([&] { event.Close(); });
    ExpectPayload(e, WSA_INVALID_HANDLE, L"WSACloseEvent", L"Object");
    EXPECT_TRUE(event.IsCreated());
    EXPECT_EQ(BogusHandle(), event.GetHandle());
    event.Detach();
}

TEST_F(CWSAEventTest, SetOnAClosedEventReportsTheKernelError)
{
    CWSAEvent event;
    event.Close();
    ExpectPayload(CatchWin([&] { event.Set(); }), ERROR_INVALID_HANDLE, L"SetEvent", L"Object");
    ExpectPayload(CatchWin([&] { event.Reset(); }), ERROR_INVALID_HANDLE, L"ResetEvent", L"Object");
}

// Overlapped records ------------------------------------------------------------------------------------

TEST(COverlappedTest, DefaultsAreZeroOffsetsAndAnAutoResetUnsignalledEvent)
{
    COverlapped ov;
    EXPECT_EQ(0u, ov.Internal);
    EXPECT_EQ(0u, ov.InternalHigh);
    EXPECT_EQ(0u, ov.Offset);
    EXPECT_EQ(0u, ov.OffsetHigh);
    ASSERT_NE(HANDLE(NULL), ov.hEvent);
    EXPECT_FALSE(IsSignalled(ov.hEvent));
    ov.SetEvent();
    EXPECT_TRUE(IsSignalled(ov.hEvent));
    EXPECT_FALSE(IsSignalled(ov.hEvent));
    ov.SetEvent();
    ov.ResetEvent();
    EXPECT_FALSE(IsSignalled(ov.hEvent));
}

TEST(COverlappedTest, PassesItsArgumentsToTheEvent)
{
    COverlapped ov(NULL, TRUE, TRUE, NULL);
    EXPECT_TRUE(IsSignalled(ov.hEvent));
    EXPECT_TRUE(IsSignalled(ov.hEvent));
}

TEST(COverlappedTest, DestructionClosesTheEvent)
{
    HANDLE h = NULL;
    {
        COverlapped ov;
        h = ov.hEvent;
    }
    DWORD flags = 0;
    EXPECT_FALSE(::GetHandleInformation(h, &flags));
}

TEST_F(CWSAEventTest, CWSAOverlappedHasZeroOffsetsAndAManualResetEvent)
{
    CWSAOverlapped ov;
    EXPECT_EQ(0u, ov.Internal);
    EXPECT_EQ(0u, ov.InternalHigh);
    EXPECT_EQ(0u, ov.Offset);
    EXPECT_EQ(0u, ov.OffsetHigh);
    ASSERT_NE(WSA_INVALID_EVENT, ov.hEvent);
    EXPECT_FALSE(IsSignalled(ov.hEvent));
    ov.SetEvent();
    EXPECT_TRUE(IsSignalled(ov.hEvent));
    EXPECT_TRUE(IsSignalled(ov.hEvent));
    ov.ResetEvent();
    EXPECT_FALSE(IsSignalled(ov.hEvent));
}
