// Log sessions of this program, and of fresh host processes (TraceChild.exe with Sample.Net.dll) for
// what a process does once: read c:\keltrace\debug, find its own name.
#include "KelvraTrace.h"

#include "TraceTestSupport.h"
#include "common/UniqueHandle.h"

#include <gmock/gmock.h>

#include <process.h>
#include <share.h>
#include <windows.h>

#include <algorithm>
#include <atomic>
#include <cstdio>
#include <fstream>
#include <thread>
#include <utility>
#include <vector>

using namespace KelvraTraceTest;

namespace
{

// The lines of a session's log file, which must start with the banner of process (exact bytes).
Lines SessionLines(const std::string& file, const std::string& process)
{
    const std::string banner = "\r\n\r\n*****     NEW LOG SESSION [" + process + "]     *****\r\n\r\n";
    EXPECT_EQ(file.substr(0, banner.size()), banner);
    return TaggedMessages(file.substr(std::min(banner.size(), file.size())));
}

// Runs TraceChild.exe, or its copy, with these steps (see TraceChild.cpp); it must exit with 0.
void RunChild(const Lines& steps, const std::wstring& program = L"TraceChild.exe")
{
    wchar_t self[MAX_PATH];
    const std::wstring selfPath(self, ::GetModuleFileNameW(nullptr, self, MAX_PATH));
    const std::filesystem::path child = std::filesystem::path(selfPath).parent_path() / program;
    std::vector<std::wstring> arguments = {L"\"" + program + L"\""};
    for (const std::string& step : steps)
        arguments.push_back(L"\"" + std::wstring(step.begin(), step.end()) + L"\"");
    std::vector<const wchar_t*> argv;
    for (const std::wstring& argument : arguments)
        argv.push_back(argument.c_str());
    argv.push_back(nullptr);
    EXPECT_EQ(::_wspawnv(_P_WAIT, child.c_str(), argv.data()), 0) << steps[0];
}

// Each test starts in an empty c:\keltrace (level 0, every module) and ends its session.
class TraceSession : public testing::Test
{
protected:
    void SetUp() override
    {
        std::filesystem::remove_all(kMarker);
        ASSERT_TRUE(std::filesystem::create_directory(kMarker));
    }
    void TearDown() override
    {
        Debug::stop();
        Close();
        std::filesystem::remove_all(kMarker);
    }
    static void Close() { Kelvra::UniqueFile(std::exchange(CLog::_log, nullptr)); }
    static Lines Written(const std::wstring& file)
    {
        Close();
        return SessionLines(ReadMarkerFile(file), "trace_tests");
    }
};

} // namespace

TEST(TraceSessionMarker, WithoutTheMarkerDirectoryNothingHappens)
{
    std::filesystem::remove_all(kMarker);
    Debug::start(L"net", true, false);
    EXPECT_FALSE(std::filesystem::exists(kMarker));
}

TEST_F(TraceSession, AppendsBannerAndLinesToTheFirstStartsFile)
{
    const std::wstring file = L"trace_tests." + std::to_wstring(::_getpid()) + L".net.log";
    EXPECT_TRUE(std::ofstream(kMarker / file, std::ios::binary) << "old line\r\n");
    Debug::start(L"net", true, true);
    ::SetLastError(12345);
    errno = 7;
    const int line = __LINE__ + 1;
    KELVRA_TRC(L"wide %s number %d narrow %hs", L"w\u00e9\u4e2d", -5, "n");
    EXPECT_EQ(::GetLastError(), 12345u);
    EXPECT_EQ(errno, 7);
    Debug::start(L"other", false, false);
    KELVRA_INF("narrow literal %s", L"too");
    Debug::emit(&__ImageBase, Debug::lvlError, L"[ERR]", nullptr, -1, nullptr); // null texts count as empty
    Close();
    // One file, the first start's, with one banner; no probe file left behind.
    EXPECT_EQ(std::distance(std::filesystem::directory_iterator(kMarker), {}), 1);
    const std::string text = ReadMarkerFile(file);
    ASSERT_EQ(text.rfind("old line\r\n", 0), 0u) << text;
    EXPECT_NE(text.find("][TraceSessionTest.cpp:" + std::to_string(line) + "] wide"), std::string::npos);
    // Microsoft format rules; the "C" locale writes U+00E9 as one byte and nothing beyond U+00FF.
    EXPECT_EQ(SessionLines(text.substr(10), "trace_tests"),
              (Lines{"TRC wide w\xe9? number -5 narrow n", "INF narrow literal too", "ERR "}));
}

TEST_F(TraceSession, TruncatingSessionKeepsOtherWritersOut)
{
    EXPECT_TRUE(std::ofstream(kMarker / L"shared.log", std::ios::binary) << "content of an earlier run\r\n");
    Debug::start(L"shared", false, false);
    KELVRA_TRC(L"holder");
    // Whatever their own mode, other writers cannot open the file now, another session included.
    EXPECT_FALSE(Kelvra::UniqueFile(::_wfsopen(L"c:\\keltrace\\shared.log", L"a", _SH_DENYNO)));
    std::FILE* const holder = std::exchange(CLog::_log, nullptr);
    EXPECT_THAT([] { Debug::start(L"shared", true, false); },
                testing::ThrowsMessage<std::runtime_error>("Debug::setFile fopen failed"));
    Close(); // what a start that failed to refuse opened, so that later tests find c:\keltrace free
    CLog::_log = holder;
    EXPECT_EQ(Written(L"shared.log"), Lines{"TRC holder"});
}

TEST_F(TraceSession, LinesFollowTheHostsOwnChangesOfItsList)
{
    // Each change comes after an answer for this program was kept for the list before it.
    Debug::start(L"net", true, false);
    KELVRA_TRC(L"empty list");
    for (const wchar_t* name : {L"another", L"trace_tests"})
    {
        Debug::lock();
        Debug::_modules->assign(1, name);
        Debug::unlock();
        KELVRA_TRC(L"named in place: %s", name);
    }
    EXPECT_EQ(Written(L"net.log"), (Lines{"TRC empty list", "TRC named in place: trace_tests"}));
}

TEST_F(TraceSession, ThreadsNeverInterleaveNorLoseLines)
{
    Debug::start(L"threads", false, false);
    const auto write = [](int t)
    {
        for (int n = 0; n < 2000; ++n)
            KELVRA_TRC(L"thread %d line %d of a line long enough to be written in several pieces", t, n);
    };
    std::thread writers[] = {std::thread(write, 0), std::thread(write, 1), std::thread(write, 2),
                             std::thread(write, 3)};
    for (std::thread& writer : writers)
        writer.join();
    int next[4] = {}, t = -1, n = -1;
    for (const std::string& line : Written(L"threads.log"))
        ASSERT_TRUE(std::sscanf(line.c_str(), "TRC thread %d line %d", &t, &n) == 2 && t >= 0 && t < 4 &&
                    n == next[t]++)
            << "reordered: " << line;
    EXPECT_THAT(next, testing::Each(2000)) << "lines lost";
}

TEST_F(TraceSession, LinesRacingTheStartAreWholeOrAbsent)
{
    std::atomic<bool> started(false);
    int emitted = 0;
    // The writer goes on for 200 lines begun after it saw the start (those before, the one it saw the
    // start in included, may find no session). From some line on, every line is whole and in order.
    std::thread writer(
        [&]
        {
            for (int after = 0; after <= 200; after += started)
                KELVRA_TRC(L"race %d", emitted++);
        });
    ::Sleep(20);
    Debug::start(L"race", true, false);
    started = true;
    writer.join();
    const Lines lines = Written(L"race.log");
    ASSERT_GE(lines.size(), 200u);
    for (size_t i = 0; i < lines.size(); ++i)
        EXPECT_EQ(lines[i], "TRC race " + std::to_string(emitted - lines.size() + i));
}

TEST_F(TraceSession, ConfigurationReadAtTheFirstLineOfAProcessSessionFiltersBothModules)
{
    // Each run empties net.log; the first one starts without a configuration file.
    const std::pair<Lines, Lines> cases[] = {
        // Not read while no session is open; names that configure read before it start the list.
        {{"trc:early", "config:Sample.Net", "configure", "start:0:0:net", "trc:dropped", "sample-trc:kept"},
         {"TRC sample kept"}},
        // The listed module alone; stop and a new start (a new, empty list) let every module trace.
        {{"config:Sample.Net\nSAMPLE.NET\ninfo\n", "start:0:0:net", "inf:before", "sample-inf:before",
          "sample-trc:before", "stop", "start:1:0:net", "inf:after", "trc:after", "sample-inf:after"},
         {"INF sample before", "INF host after", "INF sample after"}},
        // Read after stop, names start no list.
        {{"config:Sample.Net", "start:0:0:net", "stop", "trc:kept", "sample-trc:kept"},
         {"TRC host kept", "TRC sample kept"}},
    };
    for (const auto& [steps, written] : cases)
    {
        RunChild(steps);
        EXPECT_EQ(SessionLines(ReadMarkerFile(L"net.log"), "TraceChild"), written) << steps[0];
    }
}

TEST_F(TraceSession, ProcessNameFailuresThrowAndCloseTheFileAtOnce)
{
    // The per-process name fails before opening, the fixed one after: closed at once, it opens again.
    RunChild({"start:1:1:net", "start:0:0:net", "start:0:0:net", "trc:lost"}, L"TraceChildNoDot");
    const std::string failure = "Failed to find the dot extension in the process file name\r\n";
    EXPECT_EQ(ReadMarkerFile(L"failures"), failure + failure + failure);
    EXPECT_EQ(ReadMarkerFile(L"net.log"), "");
}
