// Log sessions in fresh helper processes (TraceChild.exe with Sample.Net.dll): the marker
// directory, file names, append and truncate, the banner, sharing between processes,
// process-name failures, the exit notice, and the configuration file c:\keltrace\debug with the
// module filter across the host program (TraceChild) and its DLL (Sample.Net).
#include "TraceTestSupport.h"

#include "common/UniqueHandle.h"

#include <algorithm>
#include <cstring>
#include <future>
#include <tuple>

using namespace KelvraTraceTest;

namespace
{

const char kExitNotice[] = "TO ELIMINATE THE ABOVE FALSE MEMORY LEAKS PLEASE CALL Debug::stop()\n";

using TraceSession = MarkerDirectoryTest;
using TraceConfigured = MarkerDirectoryTest;

} // namespace

TEST(TraceSessionMarker, WithoutTheMarkerDirectoryNothingHappens)
{
    std::filesystem::remove_all(kMarker);
    const ChildResult run = RunChild({"start:net:1:0", "start:net:0:1", "trc:dropped", "session"});
    EXPECT_EQ(run.output, (Lines{"start:ok", "start:ok", "session:closed"}));
    EXPECT_FALSE(std::filesystem::exists(kMarker));
}

TEST_F(TraceSession, AppendsBannerAndLinesToTheFixedFile)
{
    const std::string earlier = "old line\r\n";
    WriteMarkerFile(L"net.log", earlier);
    const ChildResult run = RunChild({"start:net:1:0", "lasterror", "trc:first", "inf:second", "format",
                                      "start:other:0:1", "trc:after the second start", "session"});
    // The first line read the (missing) configuration file, which set the error codes: the
    // caller still sees its own.
    EXPECT_EQ(run.output, (Lines{"start:ok", "lasterror:42 errno 33", "start:ok", "session:open"}));

    // Only the first session's file, with one banner; no probe file left behind.
    EXPECT_EQ(MarkerFiles(), std::vector<std::wstring>{L"net.log"});
    const std::string text = ReadMarkerFile(L"net.log");
    ASSERT_EQ(text.compare(0, earlier.size(), earlier), 0) << text;
    EXPECT_EQ(SessionLines(text.substr(earlier.size())),
              (Lines{"ERR between setting and reading the error codes", "TRC host first", "INF host second",
                     // Microsoft rules in a host built with C99 printf, in the "C" locale
                     "INF wide w\xe9? narrow n number -42", "TRC host after the second start"}));
}

TEST_F(TraceSession, PerProcessFileCarriesProcessNameAndId)
{
    const ChildResult run = RunChild({"start:net:1:1", "trc:mine"});
    EXPECT_EQ(run.output, Lines{"start:ok"});
    const std::wstring name = L"tracechild." + std::to_wstring(run.processId) + L".net.log";
    ASSERT_EQ(MarkerFiles(), std::vector<std::wstring>{name});
    EXPECT_EQ(SessionLines(ReadMarkerFile(name)), Lines{"TRC host mine"});
}

TEST_F(TraceSession, TruncatingSessionKeepsOtherWritersOut)
{
    WriteMarkerFile(L"shared.log", "content of an earlier run\r\n");
    const Kelvra::UniqueEvent ready(::CreateEventW(nullptr, TRUE, FALSE, L"KelvraTraceTestReady"));
    const Kelvra::UniqueEvent release(::CreateEventW(nullptr, TRUE, FALSE, L"KelvraTraceTestRelease"));
    const Lines holding = {"start:shared:0:0", "trc:holder", "signal:KelvraTraceTestReady",
                           "wait:KelvraTraceTestRelease", "trc:holder again"};
    std::future<ChildResult> holder =
        std::async(std::launch::async, RunChild, holding, false, L"TraceChild.exe");
    ASSERT_EQ(::WaitForSingleObject(ready.get(), 60000), WAIT_OBJECT_0);

    // Whatever their own mode, other processes cannot open the file for writing now.
    const Lines refused = {"start:Debug::setFile fopen failed", "session:closed"};
    EXPECT_EQ(RunChild({"start:shared:1:0", "trc:lost", "session"}).output, refused);
    EXPECT_EQ(RunChild({"start:shared:0:0", "session"}).output, refused);
    ::SetEvent(release.get());
    holder.wait();
    EXPECT_EQ(SessionLines(ReadMarkerFile(L"shared.log")),
              (Lines{"TRC host holder", "TRC host holder again"}));
}

TEST_F(TraceSession, ProcessNameFailuresThrowAndCloseTheFileAtOnce)
{
    // Copies of TraceChild.exe, the log file name, and what Debug::start throws.
    const std::tuple<std::wstring, std::string, std::string> cases[] = {
        {L"TraceChildNoDot", "nodot", "start:Failed to find the dot extension in the process file name"},
        {L".exe", "dotonly", "start:Failed to find the process name"},
    };
    for (const auto& [program, log, failure] : cases)
    {
        const std::filesystem::path copy = BesideTestProgram(program);
        std::filesystem::copy_file(BesideTestProgram(L"TraceChild.exe"), copy,
                                   std::filesystem::copy_options::overwrite_existing);
        // The per-process name fails before anything is opened; the fixed name after its file was
        // opened, which must be closed again at once.
        const ChildResult run = RunChild(
            {"start:net:1:1", "start:" + log + ":0:0", "session", "open:" + log + ".log"}, false, program);
        std::filesystem::remove(copy);
        EXPECT_EQ(run.output, (Lines{failure, failure, "session:closed", "open:ok"}));
        EXPECT_EQ(ReadMarkerFile(std::wstring(log.begin(), log.end()) + L".log"), "");
    }
    EXPECT_EQ(MarkerFiles(), (std::vector<std::wstring>{L"dotonly.log", L"nodot.log"}));
}

TEST_F(TraceSession, LinesRacingTheStartAreWholeOrAbsent)
{
    const ChildResult run = RunChild({"race:net"});
    ASSERT_EQ(run.output.size(), 2u);
    const size_t emitted = std::stoul(run.output[1].substr(std::strlen("race:")));
    // From some line on, every line whole and in order, up to the last one.
    const Lines lines = SessionLines(ReadMarkerFile(L"net.log"));
    ASSERT_GE(lines.size(), 100u);
    for (size_t i = 0; i < lines.size(); ++i)
        EXPECT_EQ(lines[i], "TRC host race " + std::to_string(emitted - lines.size() + i));
}

TEST_F(TraceSession, ExitNoticeOnceWhenTheHostNeverStopped)
{
    const Lines notices = RunChild({"start:net:1:0", "trc:some line"}, true).debugStrings;
    EXPECT_EQ(std::count(notices.begin(), notices.end(), kExitNotice), 1);
}

TEST_F(TraceSession, NoExitNoticeAfterStopEvenWhenTheConfigurationNamesModules)
{
    // Read after stop, the name starts no new list: every module keeps tracing.
    WriteMarkerFile(L"debug", "Sample.Net\n");
    const ChildResult run =
        RunChild({"start:net:1:0", "stop", "trc:after stop", "sample-trc:after stop"}, true);
    EXPECT_EQ(std::count(run.debugStrings.begin(), run.debugStrings.end(), kExitNotice), 0);
    EXPECT_EQ(SessionLines(ReadMarkerFile(L"net.log")),
              (Lines{"TRC host after stop", "TRC sample after stop"}));
}

TEST_F(TraceConfigured, LevelsAndNamesFilterTheLinesOfBothModules)
{
    const std::pair<std::string, Lines> cases[] = {
        // First, while no file exists yet: every line of every module.
        {"", {"TRC host t", "INF host i", "ERR host e", "TRC sample t", "INF sample i", "ERR sample e"}},
        {"warn\r\ninfo\r\n", {"ERR host e", "ERR sample e"}}, // the highest level wins; CR LF lines
        {"inf", {"INF host i", "ERR host e", "INF sample i", "ERR sample e"}},
        // A byte-order mark and a trailing blank make module names of level words: level 0 stays,
        // and the list shuts Sample.Net out.
        {"\xEF\xBB\xBFinfo\ninfo \nTraceChild\n", {"TRC host t", "INF host i", "ERR host e"}},
        {"info\n\n", {}}, // an empty line is a name no module has
    };
    for (const auto& [file, written] : cases)
    {
        if (!file.empty())
            WriteMarkerFile(L"debug", file);
        RunChild(
            {"start:net:0:0", "trc:t", "inf:i", "err:e", "sample-trc:t", "sample-inf:i", "sample-err:e"});
        EXPECT_EQ(SessionLines(ReadMarkerFile(L"net.log")), written) << "[" << file << "]";
    }
}

TEST_F(TraceConfigured, NamedModuleAloneTracesUntilStop)
{
    WriteMarkerFile(L"debug", "Sample.Net\nSAMPLE.NET\ninfo\n");
    RunChild({"start:net:1:0", "inf:before", "sample-inf:before", "sample-trc:before", "stop", "inf:after",
              "trc:after", "sample-inf:after"});
    EXPECT_EQ(SessionLines(ReadMarkerFile(L"net.log")),
              (Lines{"INF sample before", "INF host after", "INF sample after"}));
}

TEST_F(TraceConfigured, SecondStartAfterStopLetsEveryModuleTrace)
{
    // What was known under the first list (this program's lines dropped) holds no more.
    WriteMarkerFile(L"debug", "Sample.Net\n");
    RunChild({"start:net:1:0", "trc:dropped", "stop", "start:net:1:0", "trc:after the second start"});
    EXPECT_EQ(SessionLines(ReadMarkerFile(L"net.log")), Lines{"TRC host after the second start"});
}

TEST_F(TraceConfigured, ReadBeforeTheSessionStartsTheFilterStillHolds)
{
    WriteMarkerFile(L"debug", "Sample.Net\n");
    RunChild({"configure", "start:net:1:0", "trc:dropped", "sample-trc:kept"});
    EXPECT_EQ(SessionLines(ReadMarkerFile(L"net.log")), Lines{"TRC sample kept"});
}

TEST_F(TraceConfigured, NotReadWhileNoSessionIsOpen)
{
    // The early line finds no session; the file written after it is the one that counts.
    RunChild({"trc:early", "config:error", "start:net:1:0", "trc:late", "err:late"});
    EXPECT_EQ(SessionLines(ReadMarkerFile(L"net.log")), Lines{"ERR host late"});
}
