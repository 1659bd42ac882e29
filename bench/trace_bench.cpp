// Trace lines per second with a session open and no filter, for 1 and 4 threads, beside a raw
// loop doing the same work without the library in the same run: the same kind of mutex wait,
// time stamp, seek, Microsoft-rules wide formatted write and flush on the same kind of file. Also
// the cost of one line while no session is open.
//
// The measurements run in a child process (the session lasts as long as its process), so that
// the parent can remove the log files and the marker directory afterwards.
#include <Kelvra.h>

#include "BenchSupport.h"

#include <windows.h>

#include <share.h>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <cwchar>
#include <string>
#include <thread>
#include <vector>

using namespace KelvraBench;

namespace
{

const wchar_t kMarker[] = L"c:\\keltrace";
const wchar_t kRawLog[] = L"c:\\keltrace\\trace_bench_raw.log";
const int kRuns = 5;
const int kLines = 20000;
const int kIdleLines = 100000;

struct RawLog
{
    HANDLE mutex;
    FILE* file;
};

void RawLine(RawLog& log, int value)
{
    ::WaitForSingleObject(log.mutex, INFINITE);
    SYSTEMTIME now;
    ::GetLocalTime(&now);
    wchar_t stamp[32];
    swprintf_s(stamp, 32, L"%02u%02u%u%02u%02u%02u%u", now.wDay, now.wMonth, now.wYear, now.wHour,
               now.wMinute, now.wSecond, now.wMilliseconds);
    std::fseek(log.file, 0, SEEK_END);
    __ms_fwprintf(log.file, L"[TRC][%s][%s:%d] bench line %d\n", stamp, L"trace_bench.cpp", __LINE__, value);
    std::fflush(log.file);
    ::ReleaseMutex(log.mutex);
}

void TraceLine(int value)
{
    KELVRA_TRC(L"bench line %d", value);
}

// kLines lines spread over `threads` threads.
template <typename Line> void WriteLines(int threads, Line& line)
{
    std::vector<std::thread> workers;
    for (int t = 0; t < threads; ++t)
        workers.emplace_back(
            [&line, threads]
            {
                for (int i = 0; i < kLines / threads; ++i)
                    line(i);
            });
    for (std::thread& worker : workers)
        worker.join();
}

int Measure()
{
    // With no session a line only takes and releases the trace lock: compare with a bare wait and
    // release of a mutex.
    HANDLE bare = ::CreateMutexW(nullptr, FALSE, nullptr);
    const auto [idleSeconds, bareSeconds] = BestSecondsInTurn(
        kRuns,
        []
        {
            for (int i = 0; i < kIdleLines; ++i)
                TraceLine(i);
        },
        [bare]
        {
            for (int i = 0; i < kIdleLines; ++i)
            {
                ::WaitForSingleObject(bare, INFINITE);
                ::ReleaseMutex(bare);
            }
        });
    ::CloseHandle(bare);

    Debug::start(L"bench", false, true);
    if (CLog::_log == nullptr)
    {
        std::printf("no session: cannot create files in c:\\keltrace\n");
        return 1;
    }
    RawLog raw = {::CreateMutexW(nullptr, FALSE, nullptr), ::_wfsopen(kRawLog, L"w", _SH_DENYWR)};
    if (raw.file == nullptr)
        return 1;
    auto rawLine = [&raw](int value) { RawLine(raw, value); };

    auto traceLine = [](int value) { TraceLine(value); };
    const auto [trace1Seconds, raw1Seconds] =
        BestSecondsInTurn(kRuns, [&] { WriteLines(1, traceLine); }, [&] { WriteLines(1, rawLine); });
    const auto [trace4Seconds, raw4Seconds] =
        BestSecondsInTurn(kRuns, [&] { WriteLines(4, traceLine); }, [&] { WriteLines(4, rawLine); });
    const double trace1 = kLines / trace1Seconds, raw1 = kLines / raw1Seconds;
    const double trace4 = kLines / trace4Seconds, raw4 = kLines / raw4Seconds;
    std::fclose(raw.file);
    ::CloseHandle(raw.mutex);
    ::_wremove(kRawLog);

    std::printf("Trace lines, %d lines a run, best of %d runs\n", kLines, kRuns);
    std::printf("  %-34s %12s %12s\n", "case", "lines/s", "us/line");
    std::printf("  %-34s %12.0f %12.2f\n", "Kelvra, 1 thread", trace1, 1e6 / trace1);
    std::printf("  %-34s %12.0f %12.2f\n", "raw loop, 1 thread", raw1, 1e6 / raw1);
    std::printf("  %-34s %12.0f %12.2f\n", "Kelvra, 4 threads", trace4, 1e6 / trace4);
    std::printf("  %-34s %12.0f %12.2f\n", "raw loop, 4 threads", raw4, 1e6 / raw4);
    std::printf("  %-34s %12.0f %12.2f\n", "Kelvra, no session open", kIdleLines / idleSeconds,
                1e6 * idleSeconds / kIdleLines);
    std::printf("  %-34s %12.0f %12.2f\n", "bare mutex wait and release", kIdleLines / bareSeconds,
                1e6 * bareSeconds / kIdleLines);
    std::printf("Ratios\n");
    bool met = true;
    met &= ReportTarget("1 thread: Kelvra / raw loop", trace1 / raw1, ">=", 0.8);
    met &= ReportTarget("4 threads: Kelvra / raw loop", trace4 / raw4, ">=", 0.8);
    return met ? 0 : 1;
}

} // namespace

int main(int argc, char** argv)
{
    if (argc > 1 && std::strcmp(argv[1], "--measure") == 0)
        return Measure();

    const bool createdMarker = ::CreateDirectoryW(kMarker, nullptr) != FALSE;
    wchar_t self[MAX_PATH];
    ::GetModuleFileNameW(nullptr, self, MAX_PATH);
    std::wstring commandLine = L"\"" + std::wstring(self) + L"\" --measure";
    STARTUPINFOW startup = {};
    startup.cb = sizeof(startup);
    PROCESS_INFORMATION child = {};
    if (!::CreateProcessW(self, &commandLine[0], nullptr, nullptr, FALSE, 0, nullptr, nullptr, &startup,
                          &child))
    {
        std::printf("cannot start the measuring process (error %lu)\n", ::GetLastError());
        return 1;
    }
    ::WaitForSingleObject(child.hProcess, INFINITE);
    DWORD exitCode = 1;
    ::GetExitCodeProcess(child.hProcess, &exitCode);
    ::CloseHandle(child.hThread);
    ::CloseHandle(child.hProcess);

    const std::wstring traceLog =
        std::wstring(kMarker) + L"\\trace_bench." + std::to_wstring(child.dwProcessId) + L".bench.log";
    ::DeleteFileW(traceLog.c_str());
    if (createdMarker)
        ::RemoveDirectoryW(kMarker);
    return static_cast<int>(exitCode);
}
