// Timing and reporting shared by the benchmarks. Each figure is the best of several runs, so
// that a noisy, shared machine disturbs it as little as possible.
#pragma once

#include <windows.h>

#include <algorithm>
#include <array>
#include <cstdio>

namespace KelvraBench
{

inline double Seconds()
{
    LARGE_INTEGER frequency, counter;
    ::QueryPerformanceFrequency(&frequency);
    ::QueryPerformanceCounter(&counter);
    return static_cast<double>(counter.QuadPart) / static_cast<double>(frequency.QuadPart);
}

// Best wall time of `runs` calls of work().
template <typename Work>
double BestSeconds(int runs, Work&& work)
{
    double best = 1e300;
    for (int i = 0; i < runs; ++i)
    {
        const double start = Seconds();
        work();
        const double elapsed = Seconds() - start;
        if (elapsed < best)
            best = elapsed;
    }
    return best;
}

// Best wall time of each work over `runs` rounds. Each round runs every work once, in turn, so
// that a busy spell of the shared machine hits all of them alike and their ratios stay fair.
template <typename... Works>
std::array<double, sizeof...(Works)> BestSecondsInTurn(int runs, Works&&... works)
{
    std::array<double, sizeof...(Works)> best;
    best.fill(1e300);
    for (int run = 0; run < runs; ++run)
    {
        size_t index = 0;
        ((best[index] = std::min(best[index], BestSeconds(1, works)), ++index), ...);
    }
    return best;
}

inline double MegabytesPerSecond(double bytes, double seconds)
{
    return bytes / (1024.0 * 1024.0) / seconds;
}

// Prints "label  value  target  verdict" and returns whether the target holds.
inline bool ReportTarget(const char* label, double value, const char* comparison, double limit)
{
    const bool atMost = comparison[0] == '<';
    const bool met = atMost ? value <= limit : value >= limit;
    std::printf("  %-44s %8.2f   target %s %-6.2f %s\n", label, value, comparison, limit, met ? "met" : "MISSED");
    return met;
}

} // namespace KelvraBench
