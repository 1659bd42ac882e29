// Log sessions of this test program, and of fresh host processes (TraceChild.exe with Sample.Net.dll)
// for what a process does once: read the configuration file c:\keltrace\debug, find its own name.
#include "KelvraTrace.h"

#include "TraceTestSupport.h"
#include "common/UniqueHandle.h"

#include <gmock/gmock.h>

#include <process.h>
#include <share.h>
#include <windows.h>

#include <atomic>
#include <cstdio>
#include <thread>
#include <utility>
#include <vector>

using namespace KelvraTraceTest;

namespace
{

// Starts in an empty c:\keltrace (no configuration file for this process: level 0, every module),
// removed afterwards; a session of this program ends with the test.
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
    EXPECT_EQ(CLog::_log, nullptr);
    EXPECT_FALSE(std::filesystem::exists(kMarker));
}

TEST_F(TraceSession, AppendsBannerAndLinesToTheFirstStartsFile)
{
    const std::wstring file = L"trace_tests." + std::to_wstring(::_getpid()) + L".net.log";
    WriteMarkerFile(file, "old line\r\n");
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
    WriteMarkerFile(L"shared.log", "content of an earlier run\r\n");
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

TEST_F(TraceSession, LinesFollowTheHostsOwnChangesOfListAndLevel)
{
    // Each change comes after an answer for this program was kept for the state before it.
    Debug::start(L"net", true, false);
    KELVRA_TRC(L"empty list");
    for (const wchar_t* name : {L"another", L"trace_tests"})
    {
        Debug::lock();
        Debug::_modules->assign(1, name);
        Debug::unlock();
        KELVRA_TRC(L"named in place: %s", name);
    }
    Debug::_lvl = Debug::lvlInfo;
    KELVRA_TRC(L"dropped by the level");
    KELVRA_INF(L"at the level");
    Debug::_lvl = Debug::lvlDebug;
    EXPECT_EQ(Written(L"net.log"),
              (Lines{"TRC empty list", "TRC named in place: trace_tests", "INF at the level"}));
}

TEST_F(TraceSession, ThreadsNeverInterleaveNorLoseLines)
{
    const int threads = 4, linesEach = 2000;
    Debug::start(L"threads", false, false);
    std::vector<std::thread> writers;
    for (int t = 0; t < threads; ++t)
        writers.emplace_back(
            [t]
            {
                for (int n = 0; n < linesEach; ++n)
                    KELVRA_TRC(L"thread %d line %d of a line long enough to be written in several pieces", t,
                               n);
            });
    for (std::thread& writer : writers)
        writer.join();
    const Lines lines = Written(L"threads.log");
    ASSERT_EQ(lines.size(), static_cast<size_t>(threads * linesEach));
    std::vector<int> next(threads, 0);
    for (const std::string& line : lines)
    {
        int t = -1, n = -1;
        ASSERT_EQ(std::sscanf(line.c_str(), "TRC thread %d line %d", &t, &n), 2) << line;
        ASSERT_TRUE(t >= 0 && t < threads && n == next[t]++) << "lost or reordered: " << line;
    }
}

TEST_F(TraceSession, LinesRacingTheStartAreWholeOrAbsent)
{
    std::atomic<bool> started(false);
    int emitted = 0;
    std::thread writer(
        [&]
        {
            // Until 200 lines after the start was seen: the first ones find no session.
            for (int after = 0; after < 200; after += started)
                KELVRA_TRC(L"race %d", emitted++);
        });
    ::Sleep(20);
    Debug::start(L"race", true, false);
    started = true;
    writer.join();
    // From some line on, every line whole and in order, up to the last one.
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
        {{"trc:early", "config:Sample.Net", "configure", "start:net:0:0", "trc:dropped", "sample-trc:kept"},
         {"TRC sample kept"}},
        // The highest level wins (CR LF lines), and a list shuts the other module out.
        {{"config:warn\r\ninfo\r\nTraceChild\r\n", "start:net:0:0", "inf:i", "err:e", "sample-err:e"},
         {"ERR host e"}},
        // The listed module alone; stop and a new start (a new, empty list, whatever the first one
        // taught) let every module trace.
        {{"config:Sample.Net\nSAMPLE.NET\ninfo\n", "start:net:0:0", "inf:before", "sample-inf:before",
          "sample-trc:before", "stop", "start:net:1:0", "inf:after", "trc:after", "sample-inf:after"},
         {"INF sample before", "INF host after", "INF sample after"}},
        // Read after stop, names start no list.
        {{"config:Sample.Net", "start:net:0:0", "stop", "trc:kept", "sample-trc:kept"},
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
    const std::filesystem::path copy = BesideTestProgram(L"TraceChildNoDot");
    std::filesystem::copy_file(BesideTestProgram(L"TraceChild.exe"), copy,
                               std::filesystem::copy_options::overwrite_existing);
    // The per-process name fails before anything is opened, the fixed one after its file was
    // opened: closed at once, it opens again (it would deny the second writer).
    RunChild({"start:net:1:1", "start:net:0:0", "start:net:0:0", "trc:lost"}, L"TraceChildNoDot");
    std::filesystem::remove(copy);
    const std::string failure = "Failed to find the dot extension in the process file name\r\n";
    EXPECT_EQ(ReadMarkerFile(L"failures"), failure + failure + failure);
    EXPECT_EQ(ReadMarkerFile(L"net.log"), "");
}
