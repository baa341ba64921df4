#include "window_recorder.h"

using namespace ostrand;
using threadtests::Thrown;

TEST(CThreadTest, SuspendResumePriorityRightsTerminateAndClose)
{
    CEvent never(NULL, TRUE, FALSE);
    const LPTHREAD_START_ROUTINE waitForEvent = [](void* event)
    { return ::WaitForSingleObject(event, 10000); };
    CThread t, weak;
    EXPECT_EQ(L"CreateThread 8 Thread", Thrown([&] { t.Create(NULL, 1ull << 60, waitForEvent, NULL, 0); }));
    EXPECT_FALSE(t.IsCreated()); // no stack of 2^60 bytes can be reserved
    t.Create(NULL, 0, waitForEvent, never.GetHandle(), CREATE_SUSPENDED);
    EXPECT_NE(0u, t.GetId());
    EXPECT_EQ(THREAD_PRIORITY_NORMAL, t.GetPriority());
    for (int priority : {THREAD_PRIORITY_LOWEST, THREAD_PRIORITY_ABOVE_NORMAL, THREAD_PRIORITY_IDLE})
    {
        t.SetThreadPriority(priority);
        EXPECT_EQ(priority, t.GetPriority());
    }
    // Previous counts; the last Resume finds the thread running.
    EXPECT_EQ((std::vector<DWORD>{1, 2, 3, 2, 1, 0}),
              (std::vector<DWORD>{t.Suspend(), t.Suspend(), t.Resume(), t.Resume(), t.Resume(), t.Resume()}));

    // A handle with query rights only: reading works, changing fails with 5 and the call's name.
    HANDLE limited = NULL;
    ASSERT_TRUE(::DuplicateHandle(::GetCurrentProcess(), t.GetHandle(), ::GetCurrentProcess(), &limited,
                                  THREAD_QUERY_INFORMATION, FALSE, 0));
    ASSERT_TRUE(weak.Attach(limited));
    EXPECT_EQ(THREAD_PRIORITY_IDLE, weak.GetPriority());
    EXPECT_EQ(L"SuspendThread 5 Thread", Thrown([&] { weak.Suspend(); }));
    EXPECT_EQ(L"ResumeThread 5 Thread", Thrown([&] { weak.Resume(); }));
    EXPECT_EQ(L"TerminateThread 5 Thread", Thrown([&] { weak.Terminate(1); }));
    EXPECT_EQ(static_cast<DWORD>(STILL_ACTIVE), weak.GetExitCode()); // the refused calls left it running

    t.Terminate(77);
    EXPECT_TRUE(t.IsCreated());
    EXPECT_EQ(0u, t.GetId());
    ASSERT_EQ(WAIT_OBJECT_0, ::WaitForSingleObject(t.GetHandle(), 10000));
    EXPECT_EQ(77u, t.GetExitCode());
    t.Close();
    EXPECT_FALSE(t.IsCreated());
}
