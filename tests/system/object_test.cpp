#include <ostrand/system/File.h>
#include <ostrand/system/Object.h>

#include <gtest/gtest.h>

#include <atomic>
#include <string>
#include <thread>

#include "system_test_util.h"

using namespace ostrand;
using namespace systest;

namespace
{
// No handle table of the test process hands this value out, so closing it fails with 6.
const HANDLE kBogus = reinterpret_cast<HANDLE>(static_cast<ULONG_PTR>(0x7FFFFF00));
const auto IsSignalled = [](HANDLE h) { return ::WaitForSingleObject(h, 0) == WAIT_OBJECT_0; };
const auto IsOpen = [](HANDLE h) { return ::WaitForSingleObject(h, 0) != WAIT_FAILED; };
} // namespace

TEST(CHandleTest, AttachDetachAndCloseFollowTheOwnershipRulesEvenWhenCloseFails)
{
    HANDLE detached = NULL;
    {
        CEvent event;
        const HANDLE owned = event.GetHandle();
        EXPECT_FALSE(event.Attach(kBogus));
        EXPECT_EQ(owned, static_cast<void*>(event));
        EXPECT_EQ(owned, detached = event.Detach());
        EXPECT_FALSE(event.IsCreated());
        EXPECT_EQ(HANDLE(NULL), event.Detach());
    }
    EXPECT_TRUE(IsOpen(detached)) << "the destructor closed a detached handle";

    CHandle handle(NULL);
    EXPECT_TRUE(handle.Attach(NULL));
    EXPECT_FALSE(handle.IsCreated());
    EXPECT_TRUE(handle.Attach(detached)) << "attaching the empty value made the object owning";
    EXPECT_TRUE(handle.IsCreated());
    handle.Close();
    EXPECT_FALSE(handle.IsCreated());
    EXPECT_FALSE(IsOpen(detached));
    EXPECT_NO_THROW(handle.Close());

    ASSERT_TRUE(handle.Attach(kBogus));
    ExpectPayload(CatchWin([&] { handle.Close(); }), ERROR_INVALID_HANDLE, L"CloseHandle", L"Object");
    EXPECT_EQ(HANDLE(NULL), handle.GetHandle());

    CFile file;
    EXPECT_EQ(INVALID_HANDLE_VALUE, file.Detach());
    EXPECT_TRUE(file.Attach(INVALID_HANDLE_VALUE));
    EXPECT_FALSE(file.IsCreated());
    // The process would end at the end of the test if the destructor let a failing close out.
    EXPECT_TRUE(file.Attach(kBogus));
}

TEST(CEventTest, NamedEventIsSharedAndFailuresCarryTheCall)
{
    const std::wstring name = L"ostrand-test-event-" + std::to_wstring(::GetCurrentProcessId());
    CEvent created(NULL, TRUE, FALSE, name.c_str());
    CEvent opened(EVENT_MODIFY_STATE | SYNCHRONIZE, FALSE, name.c_str());
    opened.Set();
    EXPECT_TRUE(IsSignalled(created.GetHandle()));

    ExpectPayload(CatchWin([] { CEvent e(SYNCHRONIZE, FALSE, L"ostrand-test-no-such-event"); }),
                  ERROR_FILE_NOT_FOUND, L"OpenEventW", L"Object");
    created.Close();
    ExpectPayload(CatchWin([&] { created.Set(); }), ERROR_INVALID_HANDLE, L"SetEvent", L"Object");
    ExpectPayload(CatchWin([&] { created.Reset(); }), ERROR_INVALID_HANDLE, L"ResetEvent", L"Object");
}

TEST(CMutexTest, LockWithZeroTimeoutFailsAtOnceWhileAnotherThreadOwnsIt)
{
    CMutex mutex(NULL, FALSE, NULL);
    CEvent held, release;
    std::thread owner(
        [&]
        {
            EXPECT_TRUE(mutex.Lock(INFINITE));
            held.Set();
            ::WaitForSingleObject(release.GetHandle(), INFINITE);
            mutex.Unlock();
        });
    EXPECT_EQ(WAIT_OBJECT_0, ::WaitForSingleObject(held.GetHandle(), 10000));
    const DWORD start = ::GetTickCount();
    EXPECT_FALSE(mutex.Lock(0));
    EXPECT_LT(::GetTickCount() - start, 1000u);
    release.Set();
    owner.join();

    EXPECT_TRUE(mutex.Lock(0));
    EXPECT_TRUE(mutex.Lock(0));
    mutex.Unlock();
    mutex.Unlock();
    ExpectPayload(CatchWin([&] { mutex.Unlock(); }), ERROR_NOT_OWNER, L"ReleaseMutex", L"Object");
}

TEST(CMutexTest, AbandonedMutexCountsAsAcquired)
{
    CMutex mutex(NULL, FALSE, NULL);
    std::thread([&] { EXPECT_TRUE(mutex.Lock(INFINITE)); }).join(); // ends without Unlock
    EXPECT_TRUE(mutex.Lock(0));
    EXPECT_NO_THROW(mutex.Unlock()) << "Lock reported an abandoned mutex as acquired but it is not ours";
    mutex.Close();
    ExpectPayload(CatchWin([&] { mutex.Lock(0); }), ERROR_INVALID_HANDLE, L"WaitForSingleObject", L"Object");
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
    EXPECT_EQ(WAIT_OBJECT_0, ::WaitForSingleObject(held.GetHandle(), 10000));
    EXPECT_TRUE(recursive.load());
    EXPECT_FALSE(cs.Lock(false));
    release.Set();
    owner.join();
    EXPECT_TRUE(cs.Lock(false)) << "the owner's two levels did not both end";
    cs.Unlock();
}

TEST(COverlappedTest, EventsResetAsAskedAndDieWithTheirRecord)
{
    WSADATA data;
    ASSERT_EQ(0, ::WSAStartup(MAKEWORD(2, 2), &data));
    HANDLE h = NULL;
    {
        CEvent automatic;
        COverlapped ov, manual(NULL, TRUE, TRUE, NULL);
        CWSAOverlapped wsa;
        h = ov.hEvent;
        automatic.Set();
        EXPECT_TRUE(IsSignalled(automatic.GetHandle()));
        EXPECT_FALSE(IsSignalled(automatic.GetHandle()));
        EXPECT_EQ(0u, ov.Internal + ov.InternalHigh + ov.Offset + ov.OffsetHigh);
        EXPECT_EQ(0u, wsa.Internal + wsa.InternalHigh + wsa.Offset + wsa.OffsetHigh);
        ov.SetEvent();
        EXPECT_TRUE(IsSignalled(h));
        EXPECT_FALSE(IsSignalled(h));
        EXPECT_TRUE(IsSignalled(manual.hEvent));
        manual.ResetEvent();
        EXPECT_FALSE(IsSignalled(manual.hEvent));
        wsa.SetEvent();
        EXPECT_TRUE(IsSignalled(wsa.hEvent));
        EXPECT_TRUE(IsSignalled(wsa.hEvent));
        wsa.ResetEvent();
        EXPECT_FALSE(IsSignalled(wsa.hEvent));
    }
    EXPECT_FALSE(IsOpen(h));

    CWSAEvent event;
    h = event.GetHandle();
    event.Close();
    EXPECT_FALSE(event.IsCreated());
    EXPECT_FALSE(IsOpen(h));
    ExpectPayload(CatchWin([&] { event.Set(); }), ERROR_INVALID_HANDLE, L"SetEvent", L"Object");
    EXPECT_TRUE(event.Attach(kBogus));
    ExpectPayload(CatchWin([&] { event.Close(); }), WSA_INVALID_HANDLE, L"WSACloseEvent", L"Object");
    EXPECT_EQ(kBogus, event.Detach()) << "a failing WSACloseEvent lost the handle";
    ::WSACleanup();
}
