// Helpers the threading tests share: elapsed time, open handles, unique kernel-object names.
#pragma once

#include <chrono>
#include <string>

namespace KelvraTest
{

class Stopwatch
{
public:
    long long Milliseconds() const
    {
        return std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - m_start).count();
    }

private:
    using Clock = std::chrono::steady_clock;
    Clock::time_point m_start = Clock::now();
};

// Handles open in this process. GetProcessHandleCount where it counts; Wine 8 answers 0, so
// there every plausible handle value is probed instead.
unsigned long OpenHandleCount();

// A name no other test run on this machine uses: "Kelvra.Threading.<pid>.<purpose>".
std::wstring UniqueObjectName(const wchar_t* purpose);

} // namespace KelvraTest
