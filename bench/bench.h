// A minimal benchmark harness: each benchmark registers a function that measures and prints its own
// figures, always as a ratio against a plain baseline measured in the same run.
#pragma once

#include <ostrand/platform.h>

#include <algorithm>
#include <cstdio>
#include <functional>
#include <string>
#include <vector>

namespace bench
{

struct Entry
{
    const char* name;
    std::function<void()> run;
};

inline std::vector<Entry>& Registry()
{
    static std::vector<Entry> entries;
    return entries;
}

struct Registrar
{
    Registrar(const char* name, std::function<void()> run) { Registry().push_back(Entry{name, run}); }
};

// Seconds from the performance counter.
inline double Now()
{
    static const double frequency = []
    {
        LARGE_INTEGER f;
        ::QueryPerformanceFrequency(&f);
        return static_cast<double>(f.QuadPart);
    }();
    LARGE_INTEGER c;
    ::QueryPerformanceCounter(&c);
    return static_cast<double>(c.QuadPart) / frequency;
}

// Best time of `repeats` runs of `f`, in seconds (the minimum is the least noisy estimate).
template <class F> double BestOf(int repeats, F f)
{
    double best = 1e300;
    for (int i = 0; i < repeats; ++i)
    {
        const double t0 = Now();
        f();
        best = std::min(best, Now() - t0);
    }
    return best;
}

inline void Report(const char* what, double seconds, double baselineSeconds, const char* baseline)
{
    std::printf("%-44s %10.3f ms   %-28s %10.3f ms   ratio %.3f\n", what, seconds * 1e3, baseline,
                baselineSeconds * 1e3, seconds / baselineSeconds);
}

// Keeps the optimiser from discarding a result.
template <class T> inline void Keep(const T& value)
{
    asm volatile("" : : "g"(&value) : "memory");
}

} // namespace bench

#define BENCH_CAT2(a, b) a##b
#define BENCH_CAT(a, b) BENCH_CAT2(a, b)
#define BENCHMARK(name)                                                                                      \
    static void BENCH_CAT(bench_, __LINE__)();                                                               \
    static ::bench::Registrar BENCH_CAT(bench_registrar_, __LINE__)(name, BENCH_CAT(bench_, __LINE__));      \
    static void BENCH_CAT(bench_, __LINE__)()
