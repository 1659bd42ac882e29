// Trace lines per second with a session open and no filter, for 1 and 4 threads, beside a raw
// loop doing the same work without the library in the same run: the same kind of mutex wait,
// time stamp, seek, Microsoft-rules wide formatted write and flush on the same kind of file. Also
// the cost of a line that is dropped (no session open, a level above the line's, a module the
// filter leaves out) beside a bare mutex wait and release, and how dropped lines scale over
// 4 threads.
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
const int kMutexRounds = 20000;
const int kDroppedLines = 10000000;
const int kDroppedRuns = 20;

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

void InfoLine(int value)
{
    KELVRA_INF(L"bench line %d", value);
}

// `lines` lines spread over `threads` threads.
template <typename Line> void EmitLines(int threads, int lines, Line& line)
{
    std::vector<std::thread> workers;
    for (int t = 0; t < threads; ++t)
        workers.emplace_back(
            [&line, threads, lines]
            {
                for (int i = 0; i < lines / threads; ++i)
                    line(i);
            });
    for (std::thread& worker : workers)
        worker.join();
}

void PrintRow(const char* name, int lines, double seconds)
{
    std::printf("  %-44s %12.0f %12.1f\n", name, lines / seconds, 1e9 * seconds / lines);
}

int Measure()
{
    // The reference for dropped lines: what taking and releasing the trace lock would cost them.
    HANDLE bare = ::CreateMutexW(nullptr, FALSE, nullptr);
    auto idleLine = [](int value) { TraceLine(value); };
    const auto [idleSeconds, bareSeconds] = BestSecondsInTurn(
        kRuns, [&] { EmitLines(1, kDroppedLines, idleLine); },
        [bare]
        {
            for (int i = 0; i < kMutexRounds; ++i)
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
    const auto [trace1Seconds, raw1Seconds] = BestSecondsInTurn(
        kRuns, [&] { EmitLines(1, kLines, traceLine); }, [&] { EmitLines(1, kLines, rawLine); });
    const auto [trace4Seconds, raw4Seconds] = BestSecondsInTurn(
        kRuns, [&] { EmitLines(4, kLines, traceLine); }, [&] { EmitLines(4, kLines, rawLine); });
    std::fclose(raw.file);
    ::CloseHandle(raw.mutex);
    ::_wremove(kRawLog);

    // A host's own settings, changed under the trace lock: level info drops "[TRC]" lines, and a
    // list naming another module drops this program's "[INF]" lines.
    Debug::lock();
    Debug::_lvl = Debug::lvlInfo;
    Debug::_modules->push_back(L"another.module");
    Debug::unlock();
    auto levelDropped = [](int value) { TraceLine(value); };
    auto filterDropped = [](int value) { InfoLine(value); };
    const auto [levelSeconds, filter1Seconds, filter4Seconds] = BestSecondsInTurn(
        kDroppedRuns, [&] { EmitLines(1, kDroppedLines, levelDropped); },
        [&] { EmitLines(1, kDroppedLines, filterDropped); },
        [&] { EmitLines(4, kDroppedLines, filterDropped); });

    std::printf("Trace lines: %d written a round, best of %d rounds; %d dropped a round, best of %d rounds "
                "(%d with no session)\n",
                kLines, kRuns, kDroppedLines, kDroppedRuns, kRuns);
    std::printf("  %-44s %12s %12s\n", "case", "lines/s", "ns/line");
    PrintRow("Kelvra written, 1 thread", kLines, trace1Seconds);
    PrintRow("raw loop, 1 thread", kLines, raw1Seconds);
    PrintRow("Kelvra written, 4 threads", kLines, trace4Seconds);
    PrintRow("raw loop, 4 threads", kLines, raw4Seconds);
    PrintRow("Kelvra dropped, no session open", kDroppedLines, idleSeconds);
    PrintRow("Kelvra dropped by the level", kDroppedLines, levelSeconds);
    PrintRow("Kelvra dropped by the module filter", kDroppedLines, filter1Seconds);
    PrintRow("Kelvra dropped by the module filter, 4 threads", kDroppedLines, filter4Seconds);
    PrintRow("bare mutex wait and release", kMutexRounds, bareSeconds);
    std::printf("Ratios\n");
    const double mutexRound = bareSeconds / kMutexRounds;
    bool met = true;
    met &= ReportTarget("written, 1 thread: Kelvra / raw loop", raw1Seconds / trace1Seconds, ">=", 0.8);
    met &= ReportTarget("written, 4 threads: Kelvra / raw loop", raw4Seconds / trace4Seconds, ">=", 0.8);
    met &= ReportTarget("no session: times faster than the mutex", mutexRound * kDroppedLines / idleSeconds,
                        ">=", 50);
    met &= ReportTarget("level: times faster than the mutex", mutexRound * kDroppedLines / levelSeconds,
                        ">=", 50);
    met &= ReportTarget("module filter: times faster than the mutex",
                        mutexRound * kDroppedLines / filter1Seconds, ">=", 50);
    met &= ReportTarget("module filter: 4 threads / 1 thread", filter1Seconds / filter4Seconds, ">=", 1.5);
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
