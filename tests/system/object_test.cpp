#include <ostrand/system/File.h>
#include <ostrand/system/Object.h>
#include <gtest/gtest.h>
#include <atomic>
#include <string>
#include <thread>
#include "system_test_util.h"

using namespace ostrand;

// No handle table of the test process hands this value out, so closing it fails with 6.
static const HANDLE kBogus = reinterpret_cast<HANDLE>(static_cast<ULONG_PTR>(0x7FFFFF00));
static const auto IsSignalled = [](HANDLE h) { return ::WaitForSingleObject(h, 0) == WAIT_OBJECT_0; };
static const auto IsOpen = [](HANDLE h) { return ::WaitForSingleObject(h, 0) != WAIT_FAILED; };

TEST(CHandleTest, OwnershipRulesHoldEvenWhenCloseFailsAndNamedEventsAreShared)
{
    HANDLE detached = NULL;
    {
        CEvent event;
        const HANDLE owned = event.GetHandle();
        EXPECT_FALSE(event.Attach(kBogus));
        EXPECT_TRUE(owned == (detached = event.Detach()) && !event.IsCreated());
    }
    EXPECT_TRUE(IsOpen(detached)) << "the destructor closed a detached handle";
    CHandle handle(NULL);
    EXPECT_TRUE(handle.Attach(NULL) && !handle.IsCreated());
    EXPECT_TRUE(handle.Attach(detached)) << "attaching the empty value made the object owning";
    handle.Close();
    EXPECT_FALSE(handle.IsCreated() || IsOpen(detached));
    EXPECT_NO_THROW(handle.Close());
    ASSERT_TRUE(handle.Attach(kBogus));
    ExpectWin([&] { handle.Close(); }, ERROR_INVALID_HANDLE, L"CloseHandle", L"Object");
    EXPECT_EQ(HANDLE(NULL), handle.GetHandle());
    CFile file;
    EXPECT_EQ(INVALID_HANDLE_VALUE, file.Detach());
    EXPECT_TRUE(file.Attach(INVALID_HANDLE_VALUE) && !file.IsCreated());
    EXPECT_TRUE(file.Attach(kBogus)); // the process would end here if the destructor let the failure out
    const std::wstring name = L"ostrand-test-event-" + std::to_wstring(::GetCurrentProcessId());
    CEvent created(NULL, TRUE, FALSE, name.c_str());
    CEvent(EVENT_MODIFY_STATE | SYNCHRONIZE, FALSE, name.c_str()).Set();
    EXPECT_TRUE(IsSignalled(created.GetHandle()));
    ExpectWin([] { CEvent e(SYNCHRONIZE, FALSE, L"ostrand-test-no-such-event"); }, ERROR_FILE_NOT_FOUND,
              L"OpenEventW", L"Object");
    ExpectWin([&] { created.Close(), created.Set(); }, ERROR_INVALID_HANDLE, L"SetEvent", L"Object");
    ExpectWin([&] { created.Reset(); }, ERROR_INVALID_HANDLE, L"ResetEvent", L"Object");
}

TEST(CLockTest, ZeroTimeoutFailsAtOnceWhileAnotherThreadOwnsTheLockWhichRecursesOnTheOwner)
{
    CMutex mutex(NULL, FALSE, NULL);
    CCriticalSection cs;
    CEvent held, release;
    std::atomic<bool> owned{false};
    std::thread owner(
        [&]
        {
            cs.Lock(true);
            owned = mutex.Lock(INFINITE) && cs.Lock(false);
            held.Set();
            ::WaitForSingleObject(release.GetHandle(), INFINITE);
            mutex.Unlock();
            cs.Unlock();
            cs.Unlock();
        });
    EXPECT_TRUE(::WaitForSingleObject(held.GetHandle(), 10000) == WAIT_OBJECT_0 && owned.load());
    const DWORD start = ::GetTickCount();
    EXPECT_FALSE(mutex.Lock(0) || cs.Lock(false));
    EXPECT_LT(::GetTickCount() - start, 1000u);
    release.Set();
    owner.join();
    EXPECT_TRUE(cs.Lock(false)) << "the owner's two levels did not both end";
    cs.Unlock();
    EXPECT_TRUE(mutex.Lock(0) && mutex.Lock(0));
    mutex.Unlock();
    mutex.Unlock();
    ExpectWin([&] { mutex.Unlock(); }, ERROR_NOT_OWNER, L"ReleaseMutex", L"Object");
    std::thread([&] { EXPECT_TRUE(mutex.Lock(INFINITE)); }).join(); // ends without Unlock
    EXPECT_TRUE(mutex.Lock(0)) << "an abandoned mutex counts as acquired";
    EXPECT_NO_THROW(mutex.Unlock()) << "Lock reported an abandoned mutex as acquired but it is not ours";
    ExpectWin([&] { mutex.Close(), mutex.Lock(0); }, ERROR_INVALID_HANDLE, L"WaitForSingleObject", L"Object");
}

TEST(COverlappedTest, EventsResetAsAskedAndDieWithTheirRecord)
{
    WSADATA data;
    ASSERT_EQ(0, ::WSAStartup(MAKEWORD(2, 2), &data));
    HANDLE h = NULL;
    {
        COverlapped ov, manual(NULL, TRUE, TRUE, NULL);
        CWSAOverlapped wsa;
        h = ov.hEvent;
        ov.SetEvent();
        wsa.SetEvent();
        EXPECT_TRUE(IsSignalled(h) && !IsSignalled(h));
        EXPECT_TRUE(IsSignalled(manual.hEvent) && IsSignalled(wsa.hEvent) && IsSignalled(wsa.hEvent));
        EXPECT_EQ(0u, ov.Internal + ov.InternalHigh + ov.Offset + ov.OffsetHigh + wsa.Internal +
                          wsa.InternalHigh + wsa.Offset + wsa.OffsetHigh);
        manual.ResetEvent();
        wsa.ResetEvent();
        EXPECT_FALSE(IsSignalled(manual.hEvent) || IsSignalled(wsa.hEvent));
    }
    EXPECT_FALSE(IsOpen(h));
    CWSAEvent event;
    h = event.GetHandle(), event.Close();
    EXPECT_FALSE(event.IsCreated() || IsOpen(h));
    ExpectWin([&] { event.Set(); }, ERROR_INVALID_HANDLE, L"SetEvent", L"Object");
    EXPECT_TRUE(event.Attach(kBogus));
    ExpectWin([&] { event.Close(); }, WSA_INVALID_HANDLE, L"WSACloseEvent", L"Object");
    EXPECT_EQ(kBogus, event.Detach()) << "a failing WSACloseEvent lost the handle";
    ::WSACleanup();
}
