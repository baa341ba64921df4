// Wake-up latency of a message-pumping wait cut short from another thread: ostrand::MsgSleep against a
// plain WaitForSingleObject on the same kind of event, 1,000 wake-ups each in the same run.
#include "bench.h"

#include <ostrand/system/Misc.h>
#include <ostrand/system/Thread.h>
#include <ostrand/errors/Exception.h>

#include <atomic>

namespace
{

const int kWakeups = 1000;

// The other thread: for each round waits until the waiter is about to wait, gives it a millisecond to
// get there, notes the time and sets the cancel event.
struct Setter
{
    ostrand::CEvent ready;  // auto-reset: the waiter is about to wait
    ostrand::CEvent cancel; // auto-reset: what the waiter waits on
    std::atomic<double> setAt{0.0};
    int rounds = 0;

    static DWORD WINAPI Run(void* self)
    {
        Setter* s = static_cast<Setter*>(self);
        for (int i = 0; i < s->rounds; ++i)
        {
            if (::WaitForSingleObject(s->ready.GetHandle(), 10000) != WAIT_OBJECT_0)
                return 1;
            ::Sleep(1);
            s->setAt = bench::Now();
            ::SetEvent(s->cancel.GetHandle());
        }
        return 0;
    }
};

struct Figures
{
    double median;
    double worst;
    int failures;
};

// Runs `wait` once per round (it returns when the event is set, or false when it was not woken by it)
// and collects the time from SetEvent to the waiter running again.
template <class Wait> Figures Measure(Wait wait)
{
    Setter setter;
    setter.rounds = kWakeups;
    ostrand::CThread thread;
    thread.Create(&Setter::Run, &setter);

    std::vector<double> latencies;
    latencies.reserve(kWakeups);
    int failures = 0;
    for (int i = 0; i < kWakeups; ++i)
    {
        setter.ready.Set();
        const bool woken = wait(setter.cancel);
        const double now = bench::Now();
        if (woken)
            latencies.push_back(now - setter.setAt);
        else
            ++failures;
    }
    ::WaitForSingleObject(thread.GetHandle(), 10000);

    std::sort(latencies.begin(), latencies.end());
    Figures f = {0.0, 0.0, failures};
    if (!latencies.empty())
    {
        f.median = latencies[latencies.size() / 2];
        f.worst = latencies.back();
    }
    return f;
}

bool WaitWithMsgSleep(ostrand::CEvent& cancel)
{
    try
    {
        ostrand::MsgSleep(5000, cancel);
        return false;
    }
    catch (const ostrand::CWinException& e)
    {
        return e.GetErrorCode() == ERROR_CANCELLED;
    }
}

bool WaitPlain(ostrand::CEvent& cancel)
{
    return ::WaitForSingleObject(cancel.GetHandle(), 5000) == WAIT_OBJECT_0;
}

} // namespace

BENCHMARK("MsgSleep wake-up by event (1,000)")
{
    // Alternate the two so that neither gets a warmer machine; keep the second round of each.
    Measure(WaitPlain);
    Measure(WaitWithMsgSleep);
    const Figures plain = Measure(WaitPlain);
    const Figures msg = Measure(WaitWithMsgSleep);

    std::printf("  %-36s median %8.1f us   worst %8.1f us   missed %d\n", "ostrand::MsgSleep",
                msg.median * 1e6, msg.worst * 1e6, msg.failures);
    std::printf("  %-36s median %8.1f us   worst %8.1f us   missed %d\n", "WaitForSingleObject (baseline)",
                plain.median * 1e6, plain.worst * 1e6, plain.failures);
    bench::Report("MsgSleep wake-up, median", msg.median, plain.median, "WaitForSingleObject");
    bench::Report("MsgSleep wake-up, worst", msg.worst, plain.worst, "WaitForSingleObject");
}
