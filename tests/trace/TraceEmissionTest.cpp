// Lines emitted inside this test program, whose code is compiled like the library's own: the
// macros, the emission sequence and the trace lock, with CLog::_log pointed at a scratch file
// (this process never starts a session of its own, so that c:\keltrace stays free for the
// helper processes).
#include "KelvraTrace.h"

#include "TraceTestSupport.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cerrno>
#include <cstdio>
#include <share.h>
#include <string>
#include <thread>
#include <vector>

using namespace KelvraTraceTest;

namespace
{

std::wstring ScratchLogPath()
{
    wchar_t folder[MAX_PATH];
    const DWORD length = ::GetTempPathW(MAX_PATH, folder);
    return std::wstring(folder, length) + L"kelvra_trace_emission.log";
}

std::string Today()
{
    SYSTEMTIME now;
    ::GetLocalTime(&now);
    char text[16];
    std::snprintf(text, sizeof(text), "%02u%02u%04u", now.wDay, now.wMonth, now.wYear);
    return text;
}

// Points the process's log at a scratch file for one test, as Debug::start would.
class TraceEmission : public testing::Test
{
protected:
    void SetUp() override
    {
        // The first line read the configuration file: there must be none.
        RemoveMarkerDirectory();
        m_file = ::_wfsopen(ScratchLogPath().c_str(), L"w", _SH_DENYNO);
        ASSERT_NE(m_file, nullptr);
        Debug::lock();
        CLog::_log = m_file;
        Debug::unlock();
    }

    void TearDown() override { Detach(); }

    // Ends the scratch session and returns what it wrote.
    std::string Written()
    {
        Detach();
        FILE* file = ::_wfopen(ScratchLogPath().c_str(), L"rb");
        std::string content;
        if (file == nullptr)
            return content;
        char buffer[65536];
        size_t got;
        while ((got = std::fread(buffer, 1, sizeof(buffer), file)) > 0)
            content.append(buffer, got);
        std::fclose(file);
        return content;
    }

private:
    void Detach()
    {
        if (m_file == nullptr)
            return;
        Debug::lock();
        CLog::_log = nullptr;
        Debug::unlock();
        std::fclose(m_file);
        m_file = nullptr;
    }

    FILE* m_file = nullptr;
};

// Installs a module list for one scope.
class ModuleList
{
public:
    explicit ModuleList(std::vector<std::wstring> names) : m_names(std::move(names))
    {
        Debug::lock();
        Debug::_modules = &m_names;
        Debug::unlock();
    }
    ~ModuleList()
    {
        Debug::lock();
        Debug::_modules = nullptr;
        Debug::unlock();
    }

private:
    std::vector<std::wstring> m_names;
};

} // namespace

TEST_F(TraceEmission, LineCarriesTagStampFileLineAndMessage)
{
    const std::string before = Today();
    const int line = __LINE__ + 1;
    KELVRA_TRC(L"value %s %d %hs", L"wide", 5, "narrow");
    KELVRA_INF("narrow literal %s", L"too");
    KELVRA_ERR(L"no fields");
    const std::string after = Today();

    const std::string text = Written();
    const std::vector<TraceLine> lines = ParseTraceLines(text);
    ASSERT_EQ(lines.size(), 3u) << text;
    EXPECT_EQ(lines[0].tag, "TRC");
    EXPECT_EQ(lines[0].file, "TraceEmissionTest.cpp");
    EXPECT_EQ(lines[0].line, line);
    EXPECT_EQ(lines[0].message, "value wide 5 narrow");
    EXPECT_TRUE(lines[0].stamp.compare(0, 8, before) == 0 || lines[0].stamp.compare(0, 8, after) == 0)
        << lines[0].stamp;
    EXPECT_EQ(lines[1].tag, "INF");
    EXPECT_EQ(lines[1].line, line + 1);
    EXPECT_EQ(lines[1].message, "narrow literal too");
    EXPECT_EQ(lines[2].tag, "ERR");
    EXPECT_EQ(lines[2].message, "no fields");
    // Text mode: every line ends in CR LF.
    EXPECT_EQ(text.compare(text.size() - 11, 11, "no fields\r\n"), 0);
}

TEST_F(TraceEmission, KeepsTheCallersErrorCodes)
{
    ::SetLastError(12345);
    errno = 7;
    KELVRA_ERR(L"between failing and reading the error");
    EXPECT_EQ(::GetLastError(), 12345u);
    EXPECT_EQ(errno, 7);
    EXPECT_EQ(ParseTraceLines(Written()).size(), 1u);
}

TEST_F(TraceEmission, UnwritableCharactersBecomeQuestionMarks)
{
    KELVRA_INF(L"%s|%s", L"caf\u00e9 \u4e2d", L"after");
    KELVRA_INF(L"next line");
    EXPECT_EQ(TaggedMessages(Written()), (std::vector<std::string>{"INF caf\xe9 ?|after", "INF next line"}));
}

TEST_F(TraceEmission, FilterUsesTheNameOfTheModuleHoldingTheCode)
{
    {
        const ModuleList others({L"sample.net"});
        EXPECT_FALSE(Debug::debugIt(L"trace_tests"));
        KELVRA_TRC(L"dropped");
    }
    {
        const ModuleList ours({L"sample.net", L"trace_tests"});
        EXPECT_TRUE(Debug::debugIt(L"TRACE_TESTS"));
        KELVRA_TRC(L"kept");
    }
    EXPECT_EQ(TaggedMessages(Written()), std::vector<std::string>{"TRC kept"});
}

TEST_F(TraceEmission, ThreadsNeverInterleaveNorLoseLines)
{
    const int threads = 8, linesEach = 10000;
    std::vector<std::thread> writers;
    for (int t = 0; t < threads; ++t)
    {
        writers.emplace_back(
            [t]
            {
                for (int n = 0; n < linesEach; ++n)
                    KELVRA_TRC(L"thread %d line %d of a line long enough to be written in several pieces", t,
                               n);
            });
    }
    for (std::thread& writer : writers)
        writer.join();

    const std::vector<TraceLine> lines = ParseTraceLines(Written());
    ASSERT_EQ(lines.size(), static_cast<size_t>(threads * linesEach));
    std::vector<int> next(threads, 0);
    for (const TraceLine& line : lines)
    {
        int t = -1, n = -1;
        ASSERT_EQ(std::sscanf(line.message.c_str(), "thread %d line %d", &t, &n), 2) << line.message;
        ASSERT_TRUE(t >= 0 && t < threads) << line.message;
        ASSERT_EQ(n, next[t]) << "thread " << t << " lost or reordered a line";
        ++next[t];
    }
}

TEST(TraceLock, HostLockHoldsBackOtherThreadsEvenWithoutASession)
{
    ASSERT_EQ(CLog::_log, nullptr);
    Debug::lock();
    KELVRA_TRC(L"the lock is recursive: its owner may trace");
    std::atomic<bool> traced(false);
    std::thread other(
        [&traced]
        {
            KELVRA_TRC(L"waits for the lock");
            traced = true;
        });
    ::Sleep(300);
    EXPECT_FALSE(traced);
    Debug::unlock();
    other.join();
    EXPECT_TRUE(traced);
}
