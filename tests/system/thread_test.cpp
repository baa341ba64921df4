#include "window_recorder.h"

using namespace ostrand;
using threadtests::ExpectWinError;

namespace
{

// Waits (at most 10 s) for the event passed as parameter, then ends with 7.
DWORD WINAPI WaitForEvent(void* event)
{
    ::WaitForSingleObject(static_cast<HANDLE>(event), 10000);
    return 7;
}

void ExpectEnds(const CThread& t, DWORD exitCode)
{
    ASSERT_EQ(WAIT_OBJECT_0, ::WaitForSingleObject(t.GetHandle(), 10000));
    EXPECT_EQ(exitCode, t.GetExitCode());
}

} // namespace

TEST(CThreadTest, CreateRunAndClose)
{
    CThread t;
    // No stack of 2^60 bytes can be reserved.
    ExpectWinError([&] { t.Create(NULL, 1ull << 60, &WaitForEvent, NULL, 0); }, L"CreateThread",
                   ERROR_NOT_ENOUGH_MEMORY, L"Thread");
    EXPECT_FALSE(t.IsCreated());
    t.Create([](void* p) { return static_cast<DWORD>(reinterpret_cast<ULONG_PTR>(p)); },
             reinterpret_cast<void*>(1234));
    EXPECT_TRUE(t.IsCreated());
    EXPECT_NE(0u, t.GetId());
    ExpectEnds(t, 1234);
    t.Close();
    EXPECT_FALSE(t.IsCreated());
    EXPECT_EQ(0u, t.GetId());
}

TEST(CThreadTest, SuspendResumeCountsPriorityAndTerminate)
{
    CEvent never(NULL, TRUE, FALSE);
    CThread t;
    t.Create(NULL, 0, &WaitForEvent, never.GetHandle(), CREATE_SUSPENDED);
    EXPECT_EQ(1u, t.Suspend());
    EXPECT_EQ(2u, t.Suspend());
    EXPECT_EQ(3u, t.Resume());
    EXPECT_EQ(2u, t.Resume());
    EXPECT_EQ(THREAD_PRIORITY_NORMAL, t.GetPriority());
    for (int priority : {THREAD_PRIORITY_LOWEST, THREAD_PRIORITY_ABOVE_NORMAL, THREAD_PRIORITY_IDLE})
    {
        t.SetThreadPriority(priority);
        EXPECT_EQ(priority, t.GetPriority());
    }
    EXPECT_EQ(1u, t.Resume());
    EXPECT_EQ(0u, t.Resume()); // running: nothing left to resume
    t.Terminate(77);
    EXPECT_TRUE(t.IsCreated());
    EXPECT_EQ(0u, t.GetId());
    ExpectEnds(t, 77);
}

// A handle with query rights only: reading works, changing fails with 5 and the call's name.
TEST(CThreadTest, CallsWithoutTheRightsFailWithTheirNames)
{
    CEvent go(NULL, TRUE, FALSE);
    CThread t, weak;
    t.Create(&WaitForEvent, go.GetHandle());
    HANDLE limited = NULL;
    ASSERT_TRUE(::DuplicateHandle(::GetCurrentProcess(), t.GetHandle(), ::GetCurrentProcess(), &limited,
                                  THREAD_QUERY_INFORMATION, FALSE, 0));
    ASSERT_TRUE(weak.Attach(limited));
    EXPECT_EQ(THREAD_PRIORITY_NORMAL, weak.GetPriority());
    ExpectWinError([&] { weak.Suspend(); }, L"SuspendThread", ERROR_ACCESS_DENIED, L"Thread");
    ExpectWinError([&] { weak.Resume(); }, L"ResumeThread", ERROR_ACCESS_DENIED, L"Thread");
    ExpectWinError([&] { weak.Terminate(1); }, L"TerminateThread", ERROR_ACCESS_DENIED, L"Thread");
    // The refused calls left the thread running.
    EXPECT_EQ(static_cast<DWORD>(STILL_ACTIVE), weak.GetExitCode());
    go.Set();
    ExpectEnds(t, 7);
}
