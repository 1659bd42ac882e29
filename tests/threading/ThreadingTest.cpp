// Locks, flags and the worker thread, on real threads, events and a second process.
#include "KelvraLocks.h"
#include "KelvraThread.h"
#include "common/UniqueHandle.h"

#include <gtest/gtest.h>

#include <windows.h>

#include <process.h>

#include <chrono>
#include <future>
#include <memory>
#include <string>
#include <thread>

namespace
{

using namespace KelvraCsLocks;
using namespace KelvraCsThread;

// TryLock from another thread (released again at once): what any thread but the holder gets.
int TryLockElsewhere(CLock& lock)
{
    const auto tryLock = [&] { return lock.TryLock() != 0 ? (lock.Unlock(), 1) : 0; };
    return std::async(std::launch::async, tryLock).get();
}

// A lock on a section of its creator's, as a host's derived class would make one.
class AdoptingLock : public CLock
{
public:
    explicit AdoptingLock(ICritSec* section) : CLock(section) {}
    using CLock::Init;
};

TEST(Lock, HoldingIsCountedPerThreadAndInitOfTheHeldSectionOrOfNullKeepsIt)
{
    ICritSec* section = new CCritSec();
    AdoptingLock lock(section);
    lock.Lock();
    lock.Lock();
    lock.Init(section);
    lock.Init(nullptr);
    ASSERT_NE(0, lock.TryLock()) << "TryLock by the holder adds a level";
    for (int levels = 3; levels > 0; --levels)
    {
        EXPECT_EQ(0, TryLockElsewhere(lock)) << levels << " levels held, or Init started the section afresh";
        lock.Unlock();
    }
    EXPECT_EQ(1, TryLockElsewhere(lock));
}

TEST(Lock, LockWaitsForTheHolderToRelease)
{
    CLock lock;
    lock.Lock();
    auto other = std::async(std::launch::async, [&] { CScopeLock held(&lock); });
    EXPECT_EQ(std::future_status::timeout, other.wait_for(std::chrono::milliseconds(150)))
        << "the other thread got in while the lock was held";
    lock.Unlock();
    other.get();
    EXPECT_EQ(1, TryLockElsewhere(lock)) << "the scope lock was not released";
}

TEST(FlagValue, FollowsTheResetModeOfItsClass)
{
    CGlobalBooleanFx2 global(nullptr);
    CInterlockedBooleanFx2 interlocked;
    CAutoBoolean automatic;
    // Three reads in a row: '1' set, '0' clear.
    const auto reads = [](const CGlobalBooleanFx2& flag) -> std::string {
        return {flag ? '1' : '0', flag ? '1' : '0', flag ? '1' : '0'};
    };
    const std::pair<CGlobalBooleanFx2*, const char*> cases[] = {
        {&global, "111"}, {&interlocked, "111"}, {&automatic, "100"}};
    for (const auto& [flag, afterSet] : cases)
    {
        EXPECT_EQ("000", reads(*flag)) << afterSet << ", new";
        *flag = true;
        EXPECT_EQ(afterSet, reads(*flag)) << afterSet << ", set";
        *flag = true;
        *flag = false;
        EXPECT_EQ("000", reads(*flag)) << afterSet << ", cleared";
    }
}

TEST(FlagWait, TimesOutOnAClearFlagAndNegativeWaitsUntilAnotherThreadSetsIt)
{
    CInterlockedBooleanFx2 flag;
    EXPECT_FALSE(flag.Wait(100));
    std::thread setter([&] { flag = true; });
    EXPECT_TRUE(flag.Wait(-1000));
    setter.join();
}

TEST(NamedFlag, NameOfAnotherKindOfObjectGivesAFlagWithoutEvent)
{
    const std::wstring name = L"Kelvra.Threading.Mutex." + std::to_wstring(::GetCurrentProcessId());
    const Kelvra::UniqueMutex mutex(::CreateMutexW(nullptr, FALSE, name.c_str()));
    ASSERT_TRUE(mutex);
    CGlobalBooleanFx2 flag(name.c_str());
    EXPECT_EQ(static_cast<DWORD>(ERROR_INVALID_HANDLE), ::GetLastError());
    EXPECT_EQ(nullptr, flag.GetEvent());
    flag = true;
    EXPECT_FALSE(flag);
    EXPECT_FALSE(flag.Wait(-1)) << "a wait without an event must not block";
}

TEST(ScopeLock, NullLockHoldsNothing)
{
    CScopeLock nothing(nullptr);
}

TEST(NamedFlag, ObjectsOfOneNameShareTheValueAcrossProcesses)
{
    const std::wstring name = L"Kelvra.Threading." + std::to_wstring(::GetCurrentProcessId());
    CGlobalBooleanFx2 first(name.c_str());
    first = true;
    CGlobalBooleanFx2 second(name.c_str());
    EXPECT_EQ(static_cast<DWORD>(ERROR_ALREADY_EXISTS), ::GetLastError());
    EXPECT_TRUE(second) << "opening an existing name lost its value";
    // The peer, beside this program, clears the flag once it has found it set.
    wchar_t path[MAX_PATH] = {};
    std::wstring peer(path, ::GetModuleFileNameW(nullptr, path, MAX_PATH));
    peer = peer.substr(0, peer.find_last_of(L'\\') + 1) + L"threading_flag_peer.exe";
    EXPECT_EQ(0, ::_wspawnl(_P_WAIT, peer.c_str(), (L'"' + peer + L'"').c_str(), name.c_str(), nullptr))
        << "-1: the peer did not start, 2: it did not see the value set here";
    EXPECT_FALSE(first) << "the peer's clear did not reach this process";
    EXPECT_FALSE(second);
}

constexpr DWORD kTerminated = 0xFFFFFFFDu;
// Long enough never to be reached on a busy machine: the exit codes show it was not.
constexpr int kPatientTimeout = 20000;

// Open handles, found by probing handle values (Wine 8 answers 0 to GetProcessHandleCount).
unsigned long OpenHandleCount()
{
    unsigned long open = 0;
    DWORD flags = 0;
    for (ULONG_PTR value = 4; value <= 4 * 4096; value += 4)
        open += ::GetHandleInformation(reinterpret_cast<HANDLE>(value), &flags) ? 1 : 0;
    return open;
}

// What a worker reports; it outlives the worker, so that a body may run on while it is destroyed.
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

// A worker thread running body, which a test may change before Create.
class Worker : public CThreadWin32
{
public:
    using Body = unsigned int (*)(Worker& worker, WorkerProbe& probe);

    Worker(WorkerProbe& probe, Body body) : body(body), m_probe(probe) {}

    void StartAndWait()
    {
        Create();
        ASSERT_TRUE(m_probe.started.Wait(5000)) << "the body never ran";
    }

    Body body;

protected:
    unsigned int Run() override
    {
        // Only locals from here on: a body that ignores a stop request outlives this object.
        WorkerProbe& probe = m_probe;
        const Body run = body;
        ::DuplicateHandle(::GetCurrentProcess(), ::GetCurrentThread(), ::GetCurrentProcess(),
                          probe.self.put(), 0, FALSE, DUPLICATE_SAME_ACCESS);
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

class ThreadWin32 : public testing::Test
{
protected:
    WorkerProbe probe;
    Worker worker{probe, &Cooperate};
};

TEST_F(ThreadWin32, CreateStartsOneBodyThatRunsUntilItReturnsAndStopThenKeepsItsResult)
{
    worker.Create();
    EXPECT_TRUE(worker.IsRunning());
    ASSERT_TRUE(probe.started.Wait(5000));
    worker.Create();
    EXPECT_FALSE(worker.WaitForExit(0));
    probe.release = true;
    EXPECT_TRUE(worker.WaitForExit(5000));
    EXPECT_FALSE(probe.started.Wait(0)) << "Create while running started another body";
    EXPECT_FALSE(worker.IsRunning());
    worker.Stop(kPatientTimeout);
    EXPECT_EQ(7u, probe.ExitCode(0)) << "Stop returned before the thread ended, or terminated it";
}

TEST_F(ThreadWin32, StopEndsACooperativeBodyAndItsRequestStaysSetUntilClearedThroughItsEvent)
{
    worker.StartAndWait();
    worker.Stop(kPatientTimeout);
    EXPECT_EQ(43u, probe.ExitCode(0)) << "the thread has not ended with its result";
    worker.StartAndWait();
    EXPECT_TRUE(worker.WaitForExit(5000)) << "a restarted body saw no stop request";
    ::ResetEvent(worker.GetStopRequestEvent());
    EXPECT_FALSE(worker.StopRequested());
    worker.StartAndWait();
    EXPECT_FALSE(worker.WaitForExit(200)) << "the cleared request still ended the body";
}

TEST_F(ThreadWin32, StopTerminatesABodyThatIgnoresTheRequestAfterItsTimeOut)
{
    worker.body = &IgnoreStopRequest;
    worker.StartAndWait();
    const ULONGLONG start = ::GetTickCount64();
    worker.Stop(100);
    EXPECT_LT(::GetTickCount64() - start, 4000u) << "Stop did not keep to its time-out";
    EXPECT_EQ(kTerminated, probe.ExitCode(0)) << "the thread has not ended when Stop returned";
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
}

TEST_F(ThreadWin32, DestroyingRightAfterCreateIsSafe)
{
    // The derived part may be gone before the new thread reaches Run: the base class answers it.
    for (int cycle = 0; cycle < 20; ++cycle)
        Worker(probe, &Cooperate).Create();
}

TEST_F(ThreadWin32, DestroyingAWorkerThatIgnoresTheRequestTakesAboutFiveSeconds)
{
    auto unresponsive = std::make_unique<Worker>(probe, &IgnoreStopRequest);
    unresponsive->StartAndWait();
    const ULONGLONG start = ::GetTickCount64();
    unresponsive.reset();
    EXPECT_GE(::GetTickCount64() - start, 4500u);
    EXPECT_EQ(kTerminated, probe.ExitCode(0));
}

TEST_F(ThreadWin32, RestartsAssignmentAndRunDeletingItsObjectCloseEveryHandleOnce)
{
    // A first thread, so that what the runtime sets up once per process is not counted.
    worker.StartAndWait();
    worker.Stop(kPatientTimeout);
    probe.self.reset();
    const unsigned long handlesBefore = OpenHandleCount();
    {
        ::ResetEvent(worker.GetStopRequestEvent());
        Worker copy(probe, &Cooperate);
        worker.StartAndWait();
        static_cast<CThreadWin32&>(copy) = worker;
        worker.Stop(kPatientTimeout);
        EXPECT_NE(THREAD_PRIORITY_ERROR_RETURN, copy.GetPriority()) << "the copy lost its handle";
    }
    probe.release = true;
    worker.StartAndWait();
    ASSERT_TRUE(worker.WaitForExit(5000));
    worker.StartAndWait(); // Run has returned: Create closes the previous handle
    (new Worker(probe, [](Worker& self, WorkerProbe&) -> unsigned int { return delete &self, 9; }))->Create();
    ASSERT_TRUE(probe.started.Wait(5000));
    EXPECT_EQ(9u, probe.ExitCode()) << "the destructor ended the thread it ran on";
    worker.Stop(kPatientTimeout);
    probe.self.reset();
    EXPECT_EQ(handlesBefore, OpenHandleCount()) << "a thread handle or an event leaked";
}

} // namespace
