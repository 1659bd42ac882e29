// Log sessions in fresh helper processes (TraceChild.exe with Sample.Net.dll): the marker
// directory, file names, append and truncate, the banner, sharing between processes,
// process-name failures and the exit notice.
#include "TraceTestSupport.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

using namespace KelvraTraceTest;

namespace
{

using Lines = std::vector<std::string>;

const char kExitNotice[] = "TO ELIMINATE THE ABOVE FALSE MEMORY LEAKS PLEASE CALL Debug::stop()\n";

class TraceSession : public testing::Test
{
protected:
    void SetUp() override { CreateEmptyMarkerDirectory(); }
    void TearDown() override { RemoveMarkerDirectory(); }
};

size_t CountOf(const std::vector<std::string>& texts, const std::string& text)
{
    size_t count = 0;
    for (const std::string& each : texts)
        count += each == text ? 1 : 0;
    return count;
}

} // namespace

TEST(TraceSessionMarker, WithoutTheMarkerDirectoryNothingHappens)
{
    RemoveMarkerDirectory();
    const ChildResult run = RunChild({"start:net:1:0", "start:net:0:1", "trc:dropped", "session"});
    EXPECT_EQ(run.output, (Lines{"start:ok", "start:ok", "session:closed"}));
    EXPECT_FALSE(MarkerDirectoryExists());
}

TEST_F(TraceSession, AppendsBannerAndLinesToTheFixedFile)
{
    WriteMarkerFile(L"net.log", "old line\r\n");
    const ChildResult run = RunChild({"start:net:1:0", "lasterror", "trc:first", "inf:second", "err:third",
                                      "format", "start:other:0:1", "trc:after the second start", "session"});
    // The first line read the (missing) configuration file, which set the error codes: the
    // caller still sees its own.
    EXPECT_EQ(run.output, (Lines{"start:ok", "lasterror:42 errno 33", "start:ok", "session:open"}));

    // Only the first session's file; no probe file left behind.
    EXPECT_EQ(MarkerFiles(), std::vector<std::wstring>{L"net.log"});
    const std::string text = ReadMarkerFile(L"net.log");
    const std::string head = "old line\r\n" + Banner("TraceChild");
    ASSERT_EQ(text.compare(0, head.size(), head), 0) << text;
    EXPECT_EQ(text.find("NEW LOG SESSION", head.size()), std::string::npos) << "a second banner";

    const std::vector<TraceLine> lines = ParseTraceLines(text.substr(head.size()));
    ASSERT_EQ(lines.size(), 6u) << text;
    const Lines expected = {
        "ERR between setting and reading the error codes",
        "TRC host first",
        "INF host second",
        "ERR host third",
        "INF wide w\xe9 narrow n number -42", // Microsoft rules in a host built with C99 printf
        "TRC host after the second start",
    };
    for (size_t i = 0; i < lines.size(); ++i)
    {
        EXPECT_EQ(lines[i].tag + " " + lines[i].message, expected[i]);
        EXPECT_EQ(lines[i].file, "TraceChild.cpp");
        EXPECT_GT(lines[i].line, 0);
    }
}

TEST_F(TraceSession, PerProcessFileCarriesProcessNameAndId)
{
    const ChildResult run = RunChild({"start:net:1:1", "trc:mine"});
    EXPECT_EQ(run.output, Lines{"start:ok"});
    const std::wstring name = L"tracechild." + std::to_wstring(run.processId) + L".net.log";
    ASSERT_EQ(MarkerFiles(), std::vector<std::wstring>{name});
    const std::string text = ReadMarkerFile(name);
    EXPECT_EQ(text.compare(0, Banner("TraceChild").size(), Banner("TraceChild")), 0) << text;
    EXPECT_EQ(TaggedMessages(text), Lines{"TRC host mine"});
}

TEST_F(TraceSession, TruncatingSessionKeepsOtherWritersOut)
{
    WriteMarkerFile(L"shared.log", "content of an earlier run\r\n");
    const SharedEvent ready("KelvraTraceTestReady");
    const SharedEvent release("KelvraTraceTestRelease");
    Child holder({"start:shared:0:0", "trc:holder", "signal:KelvraTraceTestReady",
                  "wait:KelvraTraceTestRelease", "trc:holder again"});
    ASSERT_TRUE(ready.Wait(60000));

    // Whatever their own mode, other processes cannot open the file for writing now.
    const ChildResult appending = RunChild({"start:shared:1:0", "trc:lost", "session"});
    const ChildResult truncating = RunChild({"start:shared:0:0", "session"});
    release.Set();
    const ChildResult held = holder.Finish();

    EXPECT_EQ(appending.output, (Lines{"start:Debug::setFile fopen failed", "session:closed"}));
    EXPECT_EQ(truncating.output, (Lines{"start:Debug::setFile fopen failed", "session:closed"}));
    EXPECT_EQ(held.exitCode, 0u);
    const std::string text = ReadMarkerFile(L"shared.log");
    EXPECT_EQ(text.compare(0, Banner("TraceChild").size(), Banner("TraceChild")), 0) << text;
    EXPECT_EQ(TaggedMessages(text), (Lines{"TRC host holder", "TRC host holder again"}));
}

TEST_F(TraceSession, ProcessFileNameWithoutDotCannotStart)
{
    const ChildCopy noDot(L"TraceChildNoDot");
    const ChildResult run =
        RunChild({"start:net:1:1", "session", "start:nodot:0:0", "session", "open:nodot.log", "trc:lost"},
                 false, noDot.Path());
    const std::string failure = "start:Failed to find the dot extension in the process file name";
    // The per-process name fails before anything is opened; the fixed name after its file was
    // opened, which is closed again at once.
    EXPECT_EQ(run.output, (Lines{failure, "session:closed", failure, "session:closed", "open:ok"}));
    EXPECT_EQ(MarkerFiles(), std::vector<std::wstring>{L"nodot.log"});
    EXPECT_EQ(ReadMarkerFile(L"nodot.log"), "");
}

TEST_F(TraceSession, ProcessFileNameOfOnlyAnExtensionCannotStart)
{
    const ChildCopy onlyExtension(L".exe");
    const ChildResult run = RunChild({"start:net:1:1", "start:dotonly:0:0", "session", "open:dotonly.log"},
                                     false, onlyExtension.Path());
    const std::string failure = "start:Failed to find the process name";
    EXPECT_EQ(run.output, (Lines{failure, failure, "session:closed", "open:ok"}));
    EXPECT_EQ(MarkerFiles(), std::vector<std::wstring>{L"dotonly.log"});
}

TEST_F(TraceSession, ExitNoticeOnceWhenTheHostNeverStopped)
{
    const ChildResult run = RunChild({"start:net:1:0", "trc:some line"}, true);
    EXPECT_EQ(CountOf(run.debugStrings, kExitNotice), 1u);
    EXPECT_EQ(TaggedMessages(ReadMarkerFile(L"net.log")), Lines{"TRC host some line"});
}

TEST_F(TraceSession, NoExitNoticeAfterStopEvenWhenTheConfigurationNamesModules)
{
    // Read after stop, the name starts no new list: every module keeps tracing.
    WriteMarkerFile(L"debug", "Sample.Net\n");
    const ChildResult run =
        RunChild({"start:net:1:0", "stop", "trc:after stop", "sample-trc:after stop"}, true);
    EXPECT_EQ(CountOf(run.debugStrings, kExitNotice), 0u);
    EXPECT_EQ(TaggedMessages(ReadMarkerFile(L"net.log")),
              (Lines{"TRC host after stop", "TRC sample after stop"}));
}
