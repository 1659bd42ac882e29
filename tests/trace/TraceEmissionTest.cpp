// Lines emitted inside this test program, whose code is compiled like the library's own: the
// macros, the emission sequence and the trace lock.
#include "KelvraTrace.h"

#include "TraceTestSupport.h"
#include "support/TestData.h"

#include <atomic>
#include <cerrno>
#include <cstdio>
#include <regex>
#include <share.h>
#include <thread>
#include <utility>

using namespace KelvraTraceTest;

namespace
{

std::string Today()
{
    SYSTEMTIME now;
    ::GetLocalTime(&now);
    char text[16];
    std::snprintf(text, sizeof(text), "%02u%02u%04u", now.wDay, now.wMonth, now.wYear);
    return text;
}

// This process never starts a session, so that c:\keltrace stays free for the helper processes:
// each test points CLog::_log at a scratch file, as Debug::start would (no other thread runs now).
class TraceEmission : public testing::Test
{
protected:
    void SetUp() override
    {
        // The first line reads the configuration file: there must be none.
        std::filesystem::remove_all(kMarker);
        CLog::_log = ::_wfsopen(m_path.c_str(), L"w", _SH_DENYNO);
        ASSERT_NE(CLog::_log, nullptr);
    }

    void TearDown() override { Detach(); }

    // Ends the scratch session and returns what it wrote.
    std::string Written()
    {
        Detach();
        return KelvraTest::ReadBinaryFile(m_path);
    }

private:
    static void Detach()
    {
        if (CLog::_log != nullptr)
            std::fclose(std::exchange(CLog::_log, nullptr));
    }

    const std::wstring m_path = KelvraTest::DataPath(L"trace_emission.log");
};

} // namespace

TEST_F(TraceEmission, LineCarriesTagStampFileLineAndMessage)
{
    const std::string before = Today();
    const int line = __LINE__ + 1;
    KELVRA_TRC(L"value %s %d %hs", L"wide", 5, "narrow");
    KELVRA_INF("narrow literal %s", L"too");
    KELVRA_ERR(L"no fields");
    Debug::emit(&__ImageBase, Debug::lvlError, nullptr, nullptr, -1, nullptr); // null texts count as empty
    const std::string after = Today();

    const auto expected = [](const char* tag, int at, const char* message)
    {
        return std::string("\\[") + tag + R"(\]\[(\d{8})\d{7,9}\]\[TraceEmissionTest\.cpp:)" +
               std::to_string(at) + "\\] " + message + "\r\n";
    };
    const std::string text = Written();
    std::smatch date;
    ASSERT_TRUE(
        std::regex_match(text, date,
                         std::regex(expected("TRC", line, "value wide 5 narrow") +
                                    expected("INF", line + 1, "narrow literal too") +
                                    expected("ERR", line + 2, "no fields") + R"(\[\d{15,17}\]\[:-1\] \r\n)")))
        << text;
    EXPECT_TRUE(date[1] == before || date[1] == after) << date[1];
}

TEST_F(TraceEmission, KeepsTheCallersErrorCodes)
{
    ::SetLastError(12345);
    errno = 7;
    KELVRA_ERR(L"between failing and reading the error");
    EXPECT_EQ(::GetLastError(), 12345u);
    EXPECT_EQ(errno, 7);
    EXPECT_EQ(TaggedMessages(Written()), Lines{"ERR between failing and reading the error"});
}

TEST_F(TraceEmission, LinesFollowTheHostsOwnChangesOfListAndLevel)
{
    // Each change comes after an answer for this program was kept for the state before it.
    std::vector<std::wstring> other = {L"another"}, mine = {L"trace_tests"};
    KELVRA_TRC(L"no list");
    Debug::_modules = &other;
    KELVRA_TRC(L"dropped: the list names another module");
    Debug::_modules = &mine;
    KELVRA_TRC(L"a new list names this program");
    Debug::lock();
    mine[0] = L"another";
    Debug::unlock();
    KELVRA_TRC(L"dropped: the list no longer names it");
    Debug::lock();
    mine[0] = L"trace_tests";
    Debug::unlock();
    KELVRA_TRC(L"named again in place");
    Debug::_lvl = Debug::lvlInfo;
    KELVRA_TRC(L"dropped by the level");
    KELVRA_INF(L"at the level");
    Debug::_lvl = Debug::lvlDebug;
    KELVRA_TRC(L"below it again");
    Debug::_modules = nullptr;
    EXPECT_EQ(TaggedMessages(Written()),
              (Lines{"TRC no list", "TRC a new list names this program", "TRC named again in place",
                     "INF at the level", "TRC below it again"}));
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

    const Lines lines = TaggedMessages(Written());
    ASSERT_EQ(lines.size(), static_cast<size_t>(threads * linesEach));
    std::vector<int> next(threads, 0);
    for (const std::string& line : lines)
    {
        int t = -1, n = -1;
        ASSERT_EQ(std::sscanf(line.c_str(), "TRC thread %d line %d", &t, &n), 2) << line;
        ASSERT_TRUE(t >= 0 && t < threads) << line;
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
