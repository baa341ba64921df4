#include <ostrand/system/Thread.h>
#include <ostrand/errors/Exception.h>

#include <gtest/gtest.h>

#include <cstdio>
#include <functional>
#include <string>

using namespace ostrand;

namespace threadtests
{

// Expects `f` to throw CWinException with this call name, code and source file, and a line.
void ExpectWinError(const std::function<void()>& f, const wchar_t* call, DWORD code, const wchar_t* file)
{
    try
    {
        f();
        ADD_FAILURE() << "no exception; expected one from " << ustring(call).c_str();
    }
    catch (const CWinException& e)
    {
        EXPECT_EQ(ustring(call), e.GetFunction());
        EXPECT_EQ(code, e.GetErrorCode()) << ustring(call).c_str();
        EXPECT_EQ(ustring(file), e.GetFileName());
        EXPECT_GT(e.GetLine(), 0u);
    }
}

} // namespace threadtests

using threadtests::ExpectWinError;

namespace
{

// Bounds every test of this executable: one still running after 30 s ends the process with its name
// instead of hanging until the harness kills it.
class WatchdogListener : public ::testing::EmptyTestEventListener
{
public:
    void OnTestStart(const ::testing::TestInfo& info) override
    {
        m_strName = std::string(info.test_suite_name()) + "." + info.name();
        m_Done.Reset();
        m_Thread.Create(&WatchdogListener::Watch, this);
    }
    void OnTestEnd(const ::testing::TestInfo&) override
    {
        m_Done.Set();
        ::WaitForSingleObject(m_Thread.GetHandle(), INFINITE);
        m_Thread.Close();
    }

private:
    static DWORD WINAPI Watch(void* self)
    {
        WatchdogListener* w = static_cast<WatchdogListener*>(self);
        if (::WaitForSingleObject(w->m_Done.GetHandle(), 30000) != WAIT_OBJECT_0)
        {
            std::fprintf(stderr, "\n%s did not finish within 30 s\n", w->m_strName.c_str());
            std::fflush(stderr);
            ::TerminateProcess(::GetCurrentProcess(), 3);
        }
        return 0;
    }

    CEvent m_Done{NULL, TRUE, FALSE};
    CThread m_Thread;
    std::string m_strName;
};

// gtest owns the listener once appended.
const bool g_bWatchdog = []
{
    ::testing::UnitTest::GetInstance()->listeners().Append(new WatchdogListener);
    return true;
}();

// Waits (at most 10 s) for the event passed as parameter, then ends with 7.
DWORD WINAPI WaitForEvent(void* event)
{
    ::WaitForSingleObject(static_cast<HANDLE>(event), 10000);
    return 7;
}

DWORD WINAPI ReturnParameter(void* value)
{
    return static_cast<DWORD>(reinterpret_cast<ULONG_PTR>(value));
}

void* AsParameter(ULONG_PTR value)
{
    return reinterpret_cast<void*>(value);
}

void ExpectEnds(const CThread& t, DWORD exitCode)
{
    ASSERT_EQ(WAIT_OBJECT_0, ::WaitForSingleObject(t.GetHandle(), 10000));
    EXPECT_EQ(exitCode, t.GetExitCode());
}

} // namespace

TEST(CThreadTest, CreateRunCloseAndRecreate)
{
    CThread t;
    EXPECT_FALSE(t.IsCreated());
    EXPECT_EQ(0u, t.GetId());

    CEvent go(NULL, TRUE, FALSE);
    t.Create(&WaitForEvent, go.GetHandle());
    EXPECT_TRUE(t.IsCreated());
    const DWORD firstId = t.GetId();
    EXPECT_NE(0u, firstId);
    HANDLE first = NULL;
    ASSERT_TRUE(::DuplicateHandle(::GetCurrentProcess(), t.GetHandle(), ::GetCurrentProcess(), &first, 0,
                                  FALSE, DUPLICATE_SAME_ACCESS));
    CThread firstCopy;
    firstCopy.Attach(first);

    // A second Create closes the first handle; the first thread runs on.
    t.Create(&ReturnParameter, AsParameter(1234));
    EXPECT_NE(firstId, t.GetId());
    ExpectEnds(t, 1234);
    EXPECT_EQ(static_cast<DWORD>(STILL_ACTIVE), firstCopy.GetExitCode());
    go.Set();
    ExpectEnds(firstCopy, 7);

    t.Close();
    EXPECT_FALSE(t.IsCreated());
    EXPECT_EQ(0u, t.GetId());
}

TEST(CThreadTest, SuspendResumeCountsAndPriority)
{
    CEvent go(NULL, TRUE, FALSE);
    CThread t;
    t.Create(NULL, 0, &WaitForEvent, go.GetHandle(), CREATE_SUSPENDED);
    EXPECT_EQ(static_cast<DWORD>(STILL_ACTIVE), t.GetExitCode());
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
    go.Set();
    ExpectEnds(t, 7);
}

TEST(CThreadTest, TerminateKeepsTheHandleAndForgetsTheId)
{
    CEvent never(NULL, TRUE, FALSE);
    CThread t;
    t.Create(&WaitForEvent, never.GetHandle());
    t.Terminate(77);
    EXPECT_TRUE(t.IsCreated());
    EXPECT_EQ(0u, t.GetId());
    ExpectEnds(t, 77);
}

// A handle duplicated with query rights only: reading works, the rest fails with 5 and its call name.
TEST(CThreadTest, CallsWithoutTheRightsFailWithTheirNames)
{
    CEvent go(NULL, TRUE, FALSE);
    CThread t;
    t.Create(&WaitForEvent, go.GetHandle());
    HANDLE limited = NULL;
    ASSERT_TRUE(::DuplicateHandle(::GetCurrentProcess(), t.GetHandle(), ::GetCurrentProcess(), &limited,
                                  THREAD_QUERY_INFORMATION, FALSE, 0));
    CThread weak;
    ASSERT_TRUE(weak.Attach(limited));
    EXPECT_EQ(0u, weak.GetId());
    EXPECT_EQ(static_cast<DWORD>(STILL_ACTIVE), weak.GetExitCode());
    EXPECT_EQ(THREAD_PRIORITY_NORMAL, weak.GetPriority());

    ExpectWinError([&] { weak.Suspend(); }, L"SuspendThread", ERROR_ACCESS_DENIED, L"Thread");
    ExpectWinError([&] { weak.Resume(); }, L"ResumeThread", ERROR_ACCESS_DENIED, L"Thread");
    ExpectWinError([&] { weak.SetThreadPriority(THREAD_PRIORITY_LOWEST); }, L"SetThreadPriority",
                   ERROR_ACCESS_DENIED, L"Thread");
    ExpectWinError([&] { weak.Terminate(1); }, L"TerminateThread", ERROR_ACCESS_DENIED, L"Thread");

    // The refused calls left the thread alone.
    go.Set();
    ExpectEnds(t, 7);
}

TEST(CThreadTest, FailuresOfCreateAndOfQueriesOnNoHandle)
{
    CThread t;
    ExpectWinError([&] { t.GetExitCode(); }, L"GetExitCodeThread", ERROR_INVALID_HANDLE, L"Thread");
    ExpectWinError([&] { t.GetPriority(); }, L"GetThreadPriority", ERROR_INVALID_HANDLE, L"Thread");
    // No stack of 2^60 bytes can be reserved.
    ExpectWinError([&] { t.Create(NULL, 1ull << 60, &ReturnParameter, NULL, 0); }, L"CreateThread",
                   ERROR_NOT_ENOUGH_MEMORY, L"Thread");
    EXPECT_FALSE(t.IsCreated());
    EXPECT_EQ(0u, t.GetId());
}
