#include "KelvraThread.h"
#include "ThreadingSupport.h"
#include "common/UniqueHandle.h"

#include <gtest/gtest.h>

#include <windows.h>

#include <atomic>
#include <memory>

namespace
{

using KelvraCsThread::CInterlockedBooleanFx2;
using KelvraCsThread::CThreadWin32;
using KelvraTest::OpenHandleCount;
using KelvraTest::Stopwatch;

constexpr DWORD kSelfStopped = 0xA5A5A5A5u;
constexpr DWORD kTerminated = 0xFFFFFFFDu;
// Long enough never to be reached on a busy machine; the tests check they were not.
constexpr int kPatientTimeout = 20000;

// What a test worker reports. It outlives the worker, so that a body may go on running while
// the worker is destroyed.
struct WorkerProbe
{
    CInterlockedBooleanFx2 started; // set once self holds a handle to the worker thread
    CInterlockedBooleanFx2 release; // lets WaitForRelease return
    Kelvra::UniqueThread self;
    std::atomic<int> runs{0};
    std::atomic<bool> wasItMe{false};

    // The worker thread's exit code, or STILL_ACTIVE when it has not ended within timeout.
    DWORD ExitCode(DWORD timeout = 5000) const
    {
        DWORD code = STILL_ACTIVE;
        if (::WaitForSingleObject(self.get(), timeout) == WAIT_OBJECT_0)
            ::GetExitCodeThread(self.get(), &code);
        return code;
    }
};

class Worker : public CThreadWin32
{
public:
    using Body = unsigned int (*)(Worker& worker, WorkerProbe& probe);

    Worker(WorkerProbe& probe, Body body) : m_probe(probe), m_body(body) {}

    using CThreadWin32::IsItMe;

    // Starts the thread and waits until its body runs.
    void StartAndWait()
    {
        m_probe.started = false;
        Create();
        ASSERT_TRUE(m_probe.started.Wait(5000)) << "the body never ran";
    }

protected:
    unsigned int Run() override
    {
        // Only locals from here on: the bodies that ignore a stop request outlive this object.
        WorkerProbe& probe = m_probe;
        const Body body = m_body;
        const HANDLE process = ::GetCurrentProcess();
        ::DuplicateHandle(process, ::GetCurrentThread(), process, probe.self.put(), 0, FALSE, DUPLICATE_SAME_ACCESS);
        ++probe.runs;
        probe.started = true;
        return body(*this, probe);
    }

private:
    WorkerProbe& m_probe;
    Body m_body;
};

unsigned int WaitForRelease(Worker&, WorkerProbe& probe)
{
    probe.release.Wait(-1);
    return 7;
}

unsigned int PollStopRequest(Worker& worker, WorkerProbe&)
{
    while (!worker.StopRequested())
        ::Sleep(1);
    return 42;
}

unsigned int WaitForStopEvent(Worker& worker, WorkerProbe&)
{
    ::WaitForSingleObject(worker.GetStopRequestEvent(), INFINITE);
    return 43;
}

[[noreturn]] unsigned int IgnoreStopRequest(Worker&, WorkerProbe&)
{
    for (;;)
        ::Sleep(10);
}

unsigned int StopItself(Worker& worker, WorkerProbe&)
{
    worker.Stop(kPatientTimeout);
    return 1;
}

unsigned int SuspendItself(Worker&, WorkerProbe&)
{
    ::SuspendThread(::GetCurrentThread());
    return 5;
}

unsigned int RecordIsItMe(Worker& worker, WorkerProbe& probe)
{
    probe.wasItMe = worker.IsItMe();
    return 0;
}

TEST(ThreadWin32, IsRunningFromCreateUntilRunReturns)
{
    WorkerProbe probe;
    Worker worker(probe, &WaitForRelease);
    EXPECT_FALSE(worker.IsRunning());
    worker.Create();
    EXPECT_TRUE(worker.IsRunning());
    ASSERT_TRUE(probe.started.Wait(5000));
    probe.release = true;
    EXPECT_TRUE(worker.WaitForExit(5000));
    EXPECT_FALSE(worker.IsRunning());
    EXPECT_EQ(7u, probe.ExitCode());
}

TEST(ThreadWin32, CreateWhileRunningDoesNothing)
{
    WorkerProbe probe;
    Worker worker(probe, &WaitForRelease);
    worker.StartAndWait();
    worker.Create();
    worker.Create();
    probe.release = true;
    EXPECT_TRUE(worker.WaitForExit(5000));
    EXPECT_EQ(1, probe.runs);
}

TEST(ThreadWin32, CreateAfterRunReturnedStartsANewThread)
{
    WorkerProbe probe;
    Worker worker(probe, &WaitForRelease);
    probe.release = true;
    worker.StartAndWait();
    EXPECT_TRUE(worker.WaitForExit(5000));
    worker.StartAndWait();
    EXPECT_TRUE(worker.WaitForExit(5000));
    EXPECT_EQ(2, probe.runs);
}

TEST(ThreadWin32, WaitForExitTimesOutOnlyWhileTheBodyRuns)
{
    WorkerProbe probe;
    Worker worker(probe, &WaitForRelease);
    EXPECT_TRUE(worker.WaitForExit(0)) << "never started";
    worker.StartAndWait();
    EXPECT_FALSE(worker.WaitForExit(0));
    const Stopwatch watch;
    EXPECT_FALSE(worker.WaitForExit(200));
    EXPECT_GE(watch.Milliseconds(), 150);
    probe.release = true;
    EXPECT_TRUE(worker.WaitForExit(INFINITE));
}

struct CooperativeBody
{
    const char* name;
    Worker::Body body;
    DWORD exitCode;
};

class ThreadWin32Stop : public testing::TestWithParam<CooperativeBody>
{
};

TEST_P(ThreadWin32Stop, EndsACooperativeBodyWithItsResult)
{
    WorkerProbe probe;
    Worker worker(probe, GetParam().body);
    worker.StartAndWait();
    const Stopwatch watch;
    worker.Stop(kPatientTimeout);
    EXPECT_LT(watch.Milliseconds(), 5000) << "Stop waited for its time-out";
    EXPECT_EQ(GetParam().exitCode, probe.ExitCode(0)) << "the thread has not ended with its result";
    EXPECT_FALSE(worker.IsRunning());
    EXPECT_TRUE(worker.StopRequested());
}

INSTANTIATE_TEST_SUITE_P(Bodies, ThreadWin32Stop,
                         testing::Values(CooperativeBody{"PollingStopRequested", &PollStopRequest, 42},
                                         CooperativeBody{"WaitingOnTheStopEvent", &WaitForStopEvent, 43}),
                         [](const testing::TestParamInfo<CooperativeBody>& info) {
                             return std::string(info.param.name);
                         });

TEST(ThreadWin32, StopTerminatesABodyThatIgnoresTheRequest)
{
    WorkerProbe probe;
    Worker worker(probe, &IgnoreStopRequest);
    worker.StartAndWait();
    const Stopwatch watch;
    worker.Stop(100);
    const long long elapsed = watch.Milliseconds();
    EXPECT_GE(elapsed, 80);
    EXPECT_LT(elapsed, 3000);
    EXPECT_EQ(kTerminated, probe.ExitCode(0)) << "the thread has not ended when Stop returned";
    EXPECT_FALSE(worker.IsRunning());
}

TEST(ThreadWin32, StopFromInsideRunEndsTheWorker)
{
    WorkerProbe probe;
    Worker worker(probe, &StopItself);
    worker.StartAndWait();
    EXPECT_EQ(kSelfStopped, probe.ExitCode());
    EXPECT_FALSE(worker.IsRunning());
    EXPECT_TRUE(worker.StopRequested());
    EXPECT_TRUE(worker.WaitForExit(0));
}

TEST(ThreadWin32, StopAfterRunReturnedKeepsTheExitCode)
{
    WorkerProbe probe;
    Worker worker(probe, &WaitForRelease);
    probe.release = true;
    worker.StartAndWait();
    ASSERT_TRUE(worker.WaitForExit(5000));
    const Stopwatch watch;
    worker.Stop(kPatientTimeout);
    EXPECT_LT(watch.Milliseconds(), 5000);
    EXPECT_EQ(7u, probe.ExitCode());
}

TEST(ThreadWin32, StopWithoutAThreadDoesNothing)
{
    WorkerProbe probe;
    Worker worker(probe, &WaitForRelease);
    worker.Stop(kPatientTimeout);
    EXPECT_FALSE(worker.StopRequested());
    EXPECT_FALSE(worker.IsRunning());
}

TEST(ThreadWin32, StopRequestStaysSetUntilClearedThroughItsEvent)
{
    WorkerProbe probe;
    Worker worker(probe, &PollStopRequest);
    worker.StartAndWait();
    worker.Stop(kPatientTimeout);

    worker.StartAndWait();
    EXPECT_TRUE(worker.WaitForExit(5000)) << "a restarted body saw no stop request";
    EXPECT_EQ(42u, probe.ExitCode());

    ::ResetEvent(worker.GetStopRequestEvent());
    EXPECT_FALSE(worker.StopRequested());
    worker.StartAndWait();
    EXPECT_FALSE(worker.WaitForExit(200));
    worker.Stop(kPatientTimeout);
    EXPECT_EQ(42u, probe.ExitCode());
}

TEST(ThreadWin32, KillTerminatesAndLeavesTheStateToStop)
{
    WorkerProbe probe;
    Worker worker(probe, &IgnoreStopRequest);
    worker.StartAndWait();
    worker.Kill();
    EXPECT_EQ(kTerminated, probe.ExitCode());
    EXPECT_TRUE(worker.IsRunning());
    EXPECT_FALSE(worker.StopRequested());
    EXPECT_TRUE(worker.WaitForExit(5000));
    const Stopwatch watch;
    worker.Stop(kPatientTimeout);
    EXPECT_LT(watch.Milliseconds(), 5000);
    EXPECT_FALSE(worker.IsRunning());
}

TEST(ThreadWin32, IsItMeOnlyOnTheWorkerFromItsFirstInstruction)
{
    WorkerProbe probe;
    Worker worker(probe, &RecordIsItMe);
    worker.StartAndWait();
    ASSERT_TRUE(worker.WaitForExit(5000));
    EXPECT_TRUE(probe.wasItMe);
    EXPECT_FALSE(worker.IsItMe());
}

bool WaitUntilSuspended(HANDLE thread)
{
    for (int attempt = 0; attempt < 500; ++attempt)
    {
        const DWORD count = ::SuspendThread(thread);
        ::ResumeThread(thread);
        if (count != static_cast<DWORD>(-1) && count > 0)
            return true;
        ::Sleep(10);
    }
    return false;
}

TEST(ThreadWin32, ResumeGivesThePreviousSuspendCount)
{
    WorkerProbe probe;
    Worker worker(probe, &SuspendItself);
    EXPECT_EQ(0xFFFFFFFFu, worker.Resume()) << "no thread";
    worker.StartAndWait();
    ASSERT_TRUE(WaitUntilSuspended(probe.self.get()));
    EXPECT_EQ(1u, worker.Resume());
    EXPECT_EQ(5u, probe.ExitCode());
}

TEST(ThreadWin32, PriorityIsSetAndReadOnTheThread)
{
    WorkerProbe probe;
    Worker worker(probe, &WaitForRelease);
    EXPECT_EQ(THREAD_PRIORITY_ERROR_RETURN, worker.GetPriority()) << "no thread";
    worker.SetPriority(THREAD_PRIORITY_HIGHEST);
    worker.StartAndWait();
    for (int priority : {THREAD_PRIORITY_LOWEST, THREAD_PRIORITY_BELOW_NORMAL, THREAD_PRIORITY_NORMAL,
                         THREAD_PRIORITY_ABOVE_NORMAL, THREAD_PRIORITY_HIGHEST})
    {
        worker.SetPriority(priority);
        EXPECT_EQ(priority, worker.GetPriority());
        EXPECT_EQ(priority, ::GetThreadPriority(probe.self.get()));
    }
    probe.release = true;
}

TEST(ThreadWin32, SuspendIsRefused)
{
    WorkerProbe probe;
    Worker worker(probe, &WaitForRelease);
    try
    {
        worker.Suspend();
        ADD_FAILURE() << "no exception";
    }
    catch (const wchar_t* text)
    {
        EXPECT_STREQ(L"Thread suspend operation is not safe", text);
    }
}

TEST(ThreadWin32, CopyConstructionIsRefusedWithTheFlagLiteral)
{
    WorkerProbe probe;
    Worker original(probe, &WaitForRelease);
    try
    {
        Worker copy(original);
        ADD_FAILURE() << "no exception";
    }
    catch (const wchar_t* text)
    {
        EXPECT_STREQ(L"You can't use CGlobalBooleanFx2::CGlobalBooleanFx2 copy constructor", text);
    }
}

TEST(ThreadWin32, DestroyingAWorkerThatIgnoresTheRequestTakesAboutFiveSeconds)
{
    WorkerProbe probe;
    auto worker = std::make_unique<Worker>(probe, &IgnoreStopRequest);
    worker->StartAndWait();
    const Stopwatch watch;
    worker.reset();
    const long long elapsed = watch.Milliseconds();
    EXPECT_GE(elapsed, 4500);
    EXPECT_LT(elapsed, 15000);
    EXPECT_EQ(kTerminated, probe.ExitCode(0));
}

TEST(ThreadWin32, AssignmentTakesAHandleOfItsOwn)
{
    WorkerProbe probe;
    WorkerProbe unused;
    const unsigned long handlesBefore = OpenHandleCount();
    {
        Worker original(probe, &WaitForStopEvent);
        Worker copy(unused, &WaitForRelease);
        original.StartAndWait();
        original.SetPriority(THREAD_PRIORITY_BELOW_NORMAL);
        static_cast<CThreadWin32&>(copy) = original;
        EXPECT_TRUE(copy.IsRunning());
        EXPECT_FALSE(copy.StopRequested());

        original.Stop(kPatientTimeout);
        EXPECT_EQ(43u, probe.ExitCode(0));
        EXPECT_EQ(THREAD_PRIORITY_BELOW_NORMAL, copy.GetPriority()) << "the copy lost its handle with the original's";
        EXPECT_TRUE(copy.WaitForExit(0));

        static_cast<CThreadWin32&>(copy) = original;
        EXPECT_TRUE(copy.StopRequested());
        EXPECT_FALSE(copy.IsRunning());
        EXPECT_EQ(THREAD_PRIORITY_ERROR_RETURN, copy.GetPriority()) << "the original has no thread any more";
    }
    probe.self.reset();
    EXPECT_EQ(handlesBefore, OpenHandleCount());
}

TEST(ThreadWin32, ManyCyclesLeaveNoHandleOpen)
{
    WorkerProbe probe;
    Worker worker(probe, &WaitForStopEvent);
    Worker finisher(probe, &WaitForRelease);
    // One cycle first, so that whatever the runtime sets up once per process is not counted.
    worker.StartAndWait();
    worker.Stop(kPatientTimeout);
    probe.self.reset();
    const unsigned long handlesBefore = OpenHandleCount();

    for (int cycle = 0; cycle < 50; ++cycle)
    {
        ::ResetEvent(worker.GetStopRequestEvent());
        worker.StartAndWait();
        worker.Stop(kPatientTimeout);
        ASSERT_EQ(43u, probe.ExitCode(0)) << "cycle " << cycle;
    }
    // Threads that end on their own: each Create closes the handle of the previous one.
    probe.release = true;
    for (int cycle = 0; cycle < 20; ++cycle)
    {
        finisher.StartAndWait();
        ASSERT_TRUE(finisher.WaitForExit(5000)) << "cycle " << cycle;
    }
    finisher.Stop(kPatientTimeout);
    probe.self.reset();
    EXPECT_EQ(handlesBefore, OpenHandleCount());
}

} // namespace
