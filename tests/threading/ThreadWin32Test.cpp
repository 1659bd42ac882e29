#include "KelvraThread.h"
#include "ThreadingSupport.h"
#include "common/UniqueHandle.h"

#include <gtest/gtest.h>

#include <windows.h>

#include <memory>

namespace
{

using KelvraCsThread::CAutoBoolean;
using KelvraCsThread::CInterlockedBooleanFx2;
using KelvraCsThread::CThreadWin32;
using KelvraTest::Milliseconds;
using KelvraTest::ThrownLiteral;

constexpr DWORD kTerminated = 0xFFFFFFFDu;
// Long enough never to be reached on a busy machine; the tests check they were not.
constexpr int kPatientTimeout = 20000;

// Handles open in this process, counted by probing every plausible handle value (Wine 8 answers 0 to
// GetProcessHandleCount): values are multiples of 4 handed out from the lowest free slot, and a test
// process holds a few dozen.
unsigned long OpenHandleCount()
{
    unsigned long open = 0;
    for (ULONG_PTR value = 4; value <= 4 * 4096; value += 4)
    {
        DWORD flags = 0;
        open += ::GetHandleInformation(reinterpret_cast<HANDLE>(value), &flags) ? 1 : 0;
    }
    return open;
}

// What a test worker reports. It outlives the worker, so that a body may go on running while
// the worker is destroyed.
struct WorkerProbe
{
    CAutoBoolean started;           // set once self holds a handle to the worker thread
    CInterlockedBooleanFx2 release; // lets Cooperate return
    Kelvra::UniqueThread self;

    // The worker thread's exit code, or STILL_ACTIVE when it has not ended within timeout.
    DWORD ExitCode(DWORD timeout = 5000) const
    {
        DWORD code = STILL_ACTIVE;
        if (::WaitForSingleObject(self.get(), timeout) == WAIT_OBJECT_0)
            ::GetExitCodeThread(self.get(), &code);
        return code;
    }
};

// A worker thread running body, which each test may choose before Create.
class Worker : public CThreadWin32
{
public:
    using Body = unsigned int (*)(Worker& worker, WorkerProbe& probe);

    Worker(WorkerProbe& probe, Body body) : body(body), m_probe(probe) {}

    using CThreadWin32::IsItMe;

    // Starts the thread and waits until its body runs.
    void StartAndWait()
    {
        Create();
        ASSERT_TRUE(m_probe.started.Wait(5000)) << "the body never ran";
    }

    Body body;

protected:
    unsigned int Run() override
    {
        // Only locals from here on: the bodies that ignore a stop request outlive this object.
        WorkerProbe& probe = m_probe;
        const Body run = body;
        const HANDLE process = ::GetCurrentProcess();
        ::DuplicateHandle(process, ::GetCurrentThread(), process, probe.self.put(), 0, FALSE,
                          DUPLICATE_SAME_ACCESS);
        probe.started = true;
        return run(*this, probe);
    }

private:
    WorkerProbe& m_probe;
};

// Ends with 7 once released, with 43 once a stop is requested.
unsigned int Cooperate(Worker& worker, WorkerProbe& probe)
{
    const HANDLE events[] = {probe.release.GetEvent(), worker.GetStopRequestEvent()};
    return ::WaitForMultipleObjects(2, events, FALSE, INFINITE) == WAIT_OBJECT_0 ? 7 : 43;
}

[[noreturn]] unsigned int IgnoreStopRequest(Worker&, WorkerProbe&)
{
    for (;;)
        ::Sleep(10);
}

// A cooperating worker, unless the test gives it another body.
class ThreadWin32 : public testing::Test
{
protected:
    WorkerProbe probe;
    Worker worker{probe, &Cooperate};
};

TEST_F(ThreadWin32, CreateStartsOneBodyAndIsRunningUntilItReturns)
{
    EXPECT_FALSE(worker.IsRunning());
    worker.Create();
    EXPECT_TRUE(worker.IsRunning());
    ASSERT_TRUE(probe.started.Wait(5000));
    worker.Create();
    probe.release = true;
    EXPECT_TRUE(worker.WaitForExit(5000));
    EXPECT_FALSE(probe.started.Wait(0)) << "Create while running started another body";
    EXPECT_EQ(7u, probe.ExitCode());
    EXPECT_FALSE(worker.IsRunning());
}

TEST_F(ThreadWin32, WithoutAThreadCallsChangeNothing)
{
    worker.Stop(kPatientTimeout);
    EXPECT_FALSE(worker.StopRequested());
    EXPECT_TRUE(worker.WaitForExit(0));
    EXPECT_EQ(0xFFFFFFFFu, worker.Resume());
    EXPECT_EQ(THREAD_PRIORITY_ERROR_RETURN, worker.GetPriority());
}

TEST_F(ThreadWin32, WaitForExitTimesOutOnlyWhileTheBodyRuns)
{
    worker.StartAndWait();
    EXPECT_FALSE(worker.WaitForExit(0));
    EXPECT_GE(Milliseconds([&] { EXPECT_FALSE(worker.WaitForExit(200)); }), 150u);
    probe.release = true;
    EXPECT_TRUE(worker.WaitForExit(INFINITE));
}

TEST_F(ThreadWin32, StopEndsACooperativeBodyWithItsResult)
{
    worker.StartAndWait();
    EXPECT_LT(Milliseconds([&] { worker.Stop(kPatientTimeout); }), 5000u) << "Stop waited for its time-out";
    EXPECT_EQ(43u, probe.ExitCode(0)) << "the thread has not ended with its result";
    EXPECT_FALSE(worker.IsRunning());
}

TEST_F(ThreadWin32, StopTerminatesABodyThatIgnoresTheRequest)
{
    worker.body = &IgnoreStopRequest;
    worker.StartAndWait();
    const ULONGLONG elapsed = Milliseconds([&] { worker.Stop(100); });
    EXPECT_GE(elapsed, 80u);
    EXPECT_LT(elapsed, 3000u);
    EXPECT_EQ(kTerminated, probe.ExitCode(0)) << "the thread has not ended when Stop returned";
    EXPECT_FALSE(worker.IsRunning());
}

TEST_F(ThreadWin32, StopFromInsideRunEndsTheWorker)
{
    worker.body = [](Worker& self, WorkerProbe&) -> unsigned int
    {
        self.Stop(kPatientTimeout);
        return 1;
    };
    worker.StartAndWait();
    EXPECT_EQ(0xA5A5A5A5u, probe.ExitCode());
    EXPECT_FALSE(worker.IsRunning());
    EXPECT_TRUE(worker.StopRequested());
}

TEST_F(ThreadWin32, IsItMeOnlyOnTheWorkerFromItsFirstInstruction)
{
    worker.body = [](Worker& self, WorkerProbe&) -> unsigned int { return self.IsItMe() ? 1 : 0; };
    worker.StartAndWait();
    EXPECT_EQ(1u, probe.ExitCode()) << "the worker did not know itself";
    EXPECT_FALSE(worker.IsItMe());
}

TEST_F(ThreadWin32, StopAfterRunReturnedKeepsTheExitCode)
{
    probe.release = true;
    worker.StartAndWait();
    ASSERT_TRUE(worker.WaitForExit(5000));
    EXPECT_LT(Milliseconds([&] { worker.Stop(kPatientTimeout); }), 5000u);
    EXPECT_EQ(7u, probe.ExitCode(0)) << "Stop returned before the thread ended, or terminated it";
}

TEST_F(ThreadWin32, StopRequestStaysSetUntilClearedThroughItsEvent)
{
    worker.StartAndWait();
    worker.Stop(kPatientTimeout);
    worker.StartAndWait();
    EXPECT_TRUE(worker.WaitForExit(5000)) << "a restarted body saw no stop request";
    ::ResetEvent(worker.GetStopRequestEvent());
    EXPECT_FALSE(worker.StopRequested());
    worker.StartAndWait();
    EXPECT_FALSE(worker.WaitForExit(200)) << "the cleared request still ended the body";
}

TEST_F(ThreadWin32, KillTerminatesAndLeavesTheStateToStop)
{
    worker.body = &IgnoreStopRequest;
    worker.StartAndWait();
    worker.Kill();
    EXPECT_EQ(kTerminated, probe.ExitCode());
    EXPECT_TRUE(worker.IsRunning());
    EXPECT_FALSE(worker.StopRequested());
    EXPECT_LT(Milliseconds([&] { worker.Stop(kPatientTimeout); }), 5000u);
    EXPECT_FALSE(worker.IsRunning());
}

TEST_F(ThreadWin32, ResumeGivesThePreviousSuspendCount)
{
    worker.body = [](Worker&, WorkerProbe&) -> unsigned int
    {
        ::SuspendThread(::GetCurrentThread());
        return 5;
    };
    worker.StartAndWait();
    // Until the body has suspended itself, Resume finds a count of 0 and changes nothing.
    unsigned long previous = 0;
    for (int attempt = 0; attempt < 500 && previous == 0; ++attempt, ::Sleep(10))
        previous = worker.Resume();
    EXPECT_EQ(1u, previous);
    EXPECT_EQ(5u, probe.ExitCode());
}

TEST_F(ThreadWin32, PriorityIsSetAndReadOnTheThread)
{
    worker.StartAndWait();
    for (int priority : {THREAD_PRIORITY_LOWEST, THREAD_PRIORITY_BELOW_NORMAL, THREAD_PRIORITY_NORMAL,
                         THREAD_PRIORITY_ABOVE_NORMAL, THREAD_PRIORITY_HIGHEST})
    {
        worker.SetPriority(priority);
        EXPECT_EQ(priority, worker.GetPriority());
        EXPECT_EQ(priority, ::GetThreadPriority(probe.self.get()));
    }
}

TEST_F(ThreadWin32, SuspendAndCopyAreRefusedWithTheirLiterals)
{
    EXPECT_EQ(L"Thread suspend operation is not safe", ThrownLiteral<wchar_t>([&] { worker.Suspend(); }));
    EXPECT_EQ(KelvraTest::kFlagCopyRefusal, ThrownLiteral<wchar_t>([&] { Worker copy(worker); }));
}

TEST_F(ThreadWin32, DestroyingAWorkerThatIgnoresTheRequestTakesAboutFiveSeconds)
{
    auto unresponsive = std::make_unique<Worker>(probe, &IgnoreStopRequest);
    unresponsive->StartAndWait();
    const ULONGLONG elapsed = Milliseconds([&] { unresponsive.reset(); });
    EXPECT_GE(elapsed, 4500u);
    EXPECT_LT(elapsed, 15000u);
    EXPECT_EQ(kTerminated, probe.ExitCode(0));
}

TEST_F(ThreadWin32, DestroyingRightAfterCreateIsSafe)
{
    // Worker does not stop the thread in its own destructor: the new thread may reach Run only once the
    // derived part is gone.
    for (int cycle = 0; cycle < 20; ++cycle)
        EXPECT_LT(Milliseconds([&] { Worker(probe, &Cooperate).Create(); }), 5000u) << "cycle " << cycle;
}

TEST_F(ThreadWin32, RunMayDeleteItsOwnObject)
{
    // A first thread, so that what the runtime sets up once per process is not counted.
    worker.StartAndWait();
    worker.Stop(kPatientTimeout);
    probe.self.reset();
    const unsigned long handlesBefore = OpenHandleCount();
    const Worker::Body deleteItself = [](Worker& self, WorkerProbe&) -> unsigned int
    {
        delete &self;
        return 9;
    };
    (new Worker(probe, deleteItself))->Create();
    ASSERT_TRUE(probe.started.Wait(5000));
    EXPECT_EQ(9u, probe.ExitCode()) << "the destructor ended the thread it ran on";
    probe.self.reset();
    EXPECT_EQ(handlesBefore, OpenHandleCount()) << "the thread handle or an event leaked";
}

TEST_F(ThreadWin32, AssignmentTakesAHandleOfItsOwn)
{
    const unsigned long handlesBefore = OpenHandleCount();
    {
        Worker copy(probe, &Cooperate);
        worker.StartAndWait();
        worker.SetPriority(THREAD_PRIORITY_BELOW_NORMAL);
        static_cast<CThreadWin32&>(copy) = worker;
        EXPECT_TRUE(copy.IsRunning());
        EXPECT_FALSE(copy.StopRequested());

        worker.Stop(kPatientTimeout);
        EXPECT_EQ(43u, probe.ExitCode(0));
        EXPECT_EQ(THREAD_PRIORITY_BELOW_NORMAL, copy.GetPriority())
            << "the copy lost its handle with the original's";

        static_cast<CThreadWin32&>(copy) = worker;
        EXPECT_TRUE(copy.StopRequested());
        EXPECT_FALSE(copy.IsRunning());
        EXPECT_EQ(THREAD_PRIORITY_ERROR_RETURN, copy.GetPriority()) << "the original has no thread any more";
    }
    probe.self.reset();
    EXPECT_EQ(handlesBefore, OpenHandleCount());
}

// Also shows that Create starts a new thread once Run has returned.
TEST_F(ThreadWin32, ManyCyclesLeaveNoHandleOpen)
{
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
    // Threads that end on their own, each started anew by Create, which closes the previous handle.
    probe.release = true;
    for (int cycle = 0; cycle < 20; ++cycle)
    {
        worker.StartAndWait();
        ASSERT_TRUE(worker.WaitForExit(5000)) << "cycle " << cycle;
    }
    worker.Stop(kPatientTimeout);
    probe.self.reset();
    EXPECT_EQ(handlesBefore, OpenHandleCount());
}

} // namespace
