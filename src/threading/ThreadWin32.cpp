#include "KelvraThread.h"
#include "common/UniqueHandle.h"
#include "threading/WaitTimeout.h"

#include <windows.h>

#include <process.h>

#include <utility>

namespace KelvraCsThread
{

namespace
{

constexpr unsigned int kSelfStopExitCode = 0xA5A5A5A5u;
constexpr unsigned int kTerminatedExitCode = 0xFFFFFFFDu;
constexpr int kDestructorStopTimeout = 5000;
// TerminateThread only starts the termination; this bounds the wait for it to complete.
constexpr DWORD kTerminationWait = 2000;

// The object whose Run this thread executes. Emptied by the object's destructor when Run deletes
// its own object, so that the thread does not touch the object once Run returns.
thread_local const CThreadWin32* t_object = nullptr;

} // namespace

CThreadWin32::CThreadWin32() : m_threadId(0), m_thread(nullptr) {}

// The flags refuse the copy, so this throws before anything is owned.
CThreadWin32::CThreadWin32(const CThreadWin32& other)
    : m_stopRequest(other.m_stopRequest), m_running(other.m_running), m_threadId(0),
      m_thread(nullptr)
{
}

CThreadWin32& CThreadWin32::operator=(const CThreadWin32& other)
{
    if (this == &other)
        return *this;
    m_stopRequest = other.m_stopRequest;
    m_running = other.m_running;
    m_threadId = other.m_threadId;
    // A handle of our own, so that each object closes exactly the handle it holds.
    Kelvra::UniqueThread duplicate;
    if (other.m_thread != nullptr)
    {
        const HANDLE process = ::GetCurrentProcess();
        ::DuplicateHandle(process, other.m_thread, process, duplicate.put(), 0, FALSE,
                          DUPLICATE_SAME_ACCESS);
    }
    Kelvra::UniqueThread::close(m_thread);
    m_thread = duplicate.release();
    // Without a handle nothing could ever clear the flag again, and Create would refuse to start.
    if (m_thread == nullptr)
        m_running = false;
    return *this;
}

CThreadWin32::~CThreadWin32()
{
    // On the worker itself (Run deleting its object) stopping would end the thread on its way
    // out of Run, leaking the object and losing Run's result: release only.
    if (IsItMe())
    {
        if (t_object == this)
            t_object = nullptr;
        Kelvra::UniqueThread::close(m_thread);
        return;
    }
    Stop(kDestructorStopTimeout);
}

// A new thread reaches this version instead of the derived body when the object's derived part
// was destroyed before the thread got to Run: there is no body left to run.
unsigned int CThreadWin32::Run()
{
    return kSelfStopExitCode;
}

unsigned int __stdcall CThreadWin32::ThreadMain(void* self)
{
    CThreadWin32* thread = static_cast<CThreadWin32*>(self);
    t_object = thread;
    const unsigned int exitCode = thread->Run();
    if (t_object == thread)
        thread->m_running = false;
    return exitCode;
}

void CThreadWin32::Create()
{
    if (m_running)
        return;
    Kelvra::UniqueThread::close(m_thread);
    m_threadId = 0;
    m_running = true;
    // Started suspended so that the identifier and handle are stored before Run executes: a Run
    // that calls Stop at once must find itself through IsItMe.
    m_thread = reinterpret_cast<HANDLE>(
        ::_beginthreadex(nullptr, 0, &CThreadWin32::ThreadMain, this, CREATE_SUSPENDED, &m_threadId));
    if (m_thread == nullptr)
    {
        m_threadId = 0;
        m_running = false;
        return;
    }
    if (::ResumeThread(m_thread) == static_cast<DWORD>(-1))
    {
        ::TerminateThread(m_thread, kTerminatedExitCode);
        Kelvra::UniqueThread::close(m_thread);
        m_threadId = 0;
        m_running = false;
    }
}

void CThreadWin32::Stop(int timeout)
{
    if (m_thread == nullptr)
        return;
    m_stopRequest = true;
    if (IsItMe())
    {
        m_running = false;
        ::_endthreadex(kSelfStopExitCode);
    }
    Kelvra::UniqueThread thread(std::exchange(m_thread, nullptr));
    m_threadId = 0;
    // With the running flag clear Run has returned, but the thread may still be on its way out
    // (in this module's code): wait for that too, so that the object or the library can go once
    // Stop returns. Only a body still running is terminated.
    const bool bodyRunning = m_running;
    const DWORD waited = ::WaitForSingleObject(thread.get(), Kelvra::WaitMilliseconds(timeout));
    if (waited == WAIT_TIMEOUT && bodyRunning)
    {
        ::TerminateThread(thread.get(), kTerminatedExitCode);
        ::WaitForSingleObject(thread.get(), kTerminationWait);
    }
    m_running = false;
}

unsigned long CThreadWin32::Suspend()
{
    throw L"Thread suspend operation is not safe";
}

unsigned long CThreadWin32::Resume()
{
    return ::ResumeThread(m_thread);
}

void CThreadWin32::SetPriority(int priority)
{
    ::SetThreadPriority(m_thread, priority);
}

int CThreadWin32::GetPriority()
{
    return ::GetThreadPriority(m_thread);
}

bool CThreadWin32::WaitForExit(unsigned long timeout)
{
    if (!m_running)
        return true;
    return ::WaitForSingleObject(m_thread, timeout) != WAIT_TIMEOUT;
}

void CThreadWin32::Kill()
{
    if (m_thread != nullptr)
        ::TerminateThread(m_thread, kTerminatedExitCode);
}

bool CThreadWin32::IsRunning() const
{
    return m_running;
}

bool CThreadWin32::StopRequested() const
{
    return m_stopRequest;
}

void* CThreadWin32::GetStopRequestEvent()
{
    return m_stopRequest.GetEvent();
}

bool CThreadWin32::IsItMe() const
{
    return m_thread != nullptr && m_threadId == ::GetCurrentThreadId();
}

} // namespace KelvraCsThread
