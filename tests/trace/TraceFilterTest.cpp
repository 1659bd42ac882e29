// The configuration file c:\keltrace\debug as fresh helper processes read it: level words, module
// names, and the module filter across the host program (TraceChild) and its DLL (Sample.Net).
#include "TraceTestSupport.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

using namespace KelvraTraceTest;

namespace
{

using Lines = std::vector<std::string>;

class TraceConfigured : public testing::Test
{
protected:
    void SetUp() override { CreateEmptyMarkerDirectory(); }
    void TearDown() override { RemoveMarkerDirectory(); }

    // Writes the configuration, runs a session in which both modules emit one line of each tag,
    // and returns the lines that reached the file.
    static Lines LinesWithConfiguration(const std::string& configuration)
    {
        WriteMarkerFile(L"debug", configuration);
        RunChild(
            {"start:net:1:0", "trc:t", "inf:i", "err:e", "sample-trc:t", "sample-inf:i", "sample-err:e"});
        return TaggedMessages(ReadMarkerFile(L"net.log"));
    }
};

} // namespace

TEST_F(TraceConfigured, WithoutAFileEveryLineOfEveryModuleIsWritten)
{
    RunChild({"start:net:1:0", "trc:t", "inf:i", "err:e", "sample-trc:t", "sample-inf:i", "sample-err:e"});
    EXPECT_EQ(
        TaggedMessages(ReadMarkerFile(L"net.log")),
        (Lines{"TRC host t", "INF host i", "ERR host e", "TRC sample t", "INF sample i", "ERR sample e"}));
}

TEST_F(TraceConfigured, HighestLevelWinsAcrossCrLfLines)
{
    EXPECT_EQ(LinesWithConfiguration("warn\r\ninfo\r\n"), (Lines{"ERR host e", "ERR sample e"}));
}

TEST_F(TraceConfigured, InfLetsInformationAndErrorsThrough)
{
    EXPECT_EQ(LinesWithConfiguration("inf"),
              (Lines{"INF host i", "ERR host e", "INF sample i", "ERR sample e"}));
}

TEST_F(TraceConfigured, ByteOrderMarkAndTrailingBlankTurnLevelWordsIntoModuleNames)
{
    // Level 0 stays: the host's TRC line gets through, and the list shuts Sample.Net out.
    EXPECT_EQ(LinesWithConfiguration("\xEF\xBB\xBFinfo\ninfo \nTraceChild\n"),
              (Lines{"TRC host t", "INF host i", "ERR host e"}));
}

TEST_F(TraceConfigured, EmptyLineSwitchesTheFilterOnForEveryModule)
{
    EXPECT_EQ(LinesWithConfiguration("info\n\n"), Lines{});
}

TEST_F(TraceConfigured, NamedModuleAloneTracesUntilStop)
{
    WriteMarkerFile(L"debug", "Sample.Net\nSAMPLE.NET\ninfo\n");
    RunChild({"start:net:1:0", "inf:before", "sample-inf:before", "sample-trc:before", "stop", "inf:after",
              "trc:after", "sample-inf:after"});
    EXPECT_EQ(TaggedMessages(ReadMarkerFile(L"net.log")),
              (Lines{"INF sample before", "INF host after", "INF sample after"}));
}

TEST_F(TraceConfigured, ReadBeforeTheSessionStartsTheFilterStillHolds)
{
    WriteMarkerFile(L"debug", "Sample.Net\n");
    RunChild({"configure", "start:net:1:0", "trc:dropped", "sample-trc:kept"});
    EXPECT_EQ(TaggedMessages(ReadMarkerFile(L"net.log")), Lines{"TRC sample kept"});
}

TEST_F(TraceConfigured, NotReadWhileNoSessionIsOpen)
{
    // The early line finds no session; the file written after it is the one that counts.
    RunChild({"trc:early", "config:error", "start:net:1:0", "trc:late", "err:late"});
    EXPECT_EQ(TaggedMessages(ReadMarkerFile(L"net.log")), Lines{"ERR host late"});
}
