// Boolean flags backed by event objects, and an abstract worker thread with a cooperative stop.
#pragma once

#include "KelvraApi.h"

namespace KelvraCsThread
{

// A manual-reset flag: one event object, set = signalled. It stays set until it is cleared.
// Any thread may set, clear, test and wait at any time. A flag cannot be copied, but the value
// of one flag can be assigned to another (each keeps its own event).
//
// Every operation is one platform call, except assignment from another flag and ==, which read
// two events one after the other: a flag changed between the two reads gives a stale answer.
class KELVRA_API CGlobalBooleanFx2
{
public:
    // Creates a clear flag. Flags of one name share one value: when the name exists already,
    // its event is opened with its current value, and GetLastError() right after construction
    // gives ERROR_ALREADY_EXISTS. Names live in the caller's session ("Global\" prefix: the
    // whole machine). Null creates a private flag. When the name cannot be used (another kind
    // of object holds it, access denied, unknown "xxx\" namespace), the flag has no event:
    // GetEvent() is null, it tests false, Wait returns false at once, setting it has no effect,
    // and GetLastError() right after construction gives the reason.
    CGlobalBooleanFx2(const wchar_t* name);
    // Throws the const wchar_t* literal
    // "You can't use CGlobalBooleanFx2::CGlobalBooleanFx2 copy constructor".
    CGlobalBooleanFx2(const CGlobalBooleanFx2& other);
    // Closes this object's handle; the event lives on while other handles to it are open.
    ~CGlobalBooleanFx2();

    // Sets this flag when other is set (reading other: an automatic flag is consumed), clears it
    // otherwise.
    void operator=(const CGlobalBooleanFx2& other);
    void operator=(bool value);
    // Reads this flag, then other: true when both are set or both clear.
    bool operator==(const CGlobalBooleanFx2& other) const;
    operator bool() const;
    // True when the flag is or becomes set within timeout milliseconds (negative: no limit);
    // false on time-out or failure.
    bool Wait(int timeout) const;
    // The event handle (still owned by the flag), for waiting on several objects at once.
    void* GetEvent() const;

protected:
    // For the derived flags: an unnamed or named event with the given reset mode, clear.
    CGlobalBooleanFx2(const wchar_t* name, bool manualReset);

private:
    void* m_event;
};

// An unnamed manual-reset flag for the threads of one process.
class KELVRA_API CInterlockedBooleanFx2 : public CGlobalBooleanFx2
{
public:
    CInterlockedBooleanFx2();
    // Throws the same literal as CGlobalBooleanFx2's copy constructor.
    CInterlockedBooleanFx2(const CInterlockedBooleanFx2& other);

    // Copies the value of other, as CGlobalBooleanFx2's assignment does.
    CInterlockedBooleanFx2& operator=(const CInterlockedBooleanFx2& other);
    using CGlobalBooleanFx2::operator=;
};

// An unnamed automatic-reset flag: setting it releases exactly one reader. Every operation that
// reads it and finds it set (bool conversion, ==, Wait, use as an assignment source) clears it,
// so exactly one of them reports true.
class KELVRA_API CAutoBoolean : public CGlobalBooleanFx2
{
public:
    CAutoBoolean();
    // Throws the same literal as CGlobalBooleanFx2's copy constructor.
    CAutoBoolean(const CAutoBoolean& other);

    // Copies the value of other, as CGlobalBooleanFx2's assignment does.
    CAutoBoolean& operator=(const CAutoBoolean& other);
    using CGlobalBooleanFx2::operator=;
};

// Owner of one worker thread. Derive from it and supply Run, the thread body; it polls
// StopRequested() or waits on GetStopRequestEvent(). Stop asks first and forces only after a
// bounded wait:
//
//     class Poller : public KelvraCsThread::CThreadWin32 {
//     public:
//         ~Poller() override { Stop(2000); }   // before the members Run uses are destroyed
//     protected:
//         unsigned int Run() override {
//             while (!StopRequested()) Poll();
//             return 0;                         // the thread's exit code
//         }
//     };
//
// Run executes on the worker; Stop may also be called from it. Create, Stop, assignment and
// destruction of one object must not run concurrently with each other. Run must not let an
// exception escape (the process ends, as with std::thread). Run may delete its own object; a
// derived destructor that calls Stop must then skip it on the worker (if (!IsItMe()) ...).
class KELVRA_API CThreadWin32
{
public:
    // Not started: both flags clear, no handle.
    CThreadWin32();
    // Throws the const wchar_t* literal
    // "You can't use CGlobalBooleanFx2::CGlobalBooleanFx2 copy constructor".
    CThreadWin32(const CThreadWin32& other);
    // Copies the stop request, the running flag and the thread identifier, and takes a duplicate
    // of other's thread handle: each object owns and closes its own handle to the one thread
    // (whose body keeps running on other). The handle this object held is closed first; its
    // thread, if any, keeps running unmanaged, so assign only to an object without a running
    // thread. Without a handle (other has none, or it cannot be duplicated) the running flag
    // ends clear.
    CThreadWin32& operator=(const CThreadWin32& other);
    // Stop(5000). A derived class whose Run uses its own members must stop the thread in its own
    // destructor: by the time this one runs, the derived part is gone. On the worker itself (Run
    // deleting its object) it only closes the handle: the thread ends with Run's result.
    virtual ~CThreadWin32();

    // Starts a thread running Run, unless the running flag is set (then it does nothing). The
    // handle of a previous, finished thread is closed first. The stop request is left as it is:
    // after a Stop it is still set, until cleared with ResetEvent(GetStopRequestEvent()). When
    // no thread can be started the object stays idle, with the running flag clear. The object may
    // be destroyed as soon as Create returns: a thread that has not reached Run by then ends
    // without running it.
    void Create();
    // Does nothing without a thread handle. Otherwise sets the stop request; called from the
    // worker itself, ends it at once with exit code 0xA5A5A5A5 (no return, no stack unwinding).
    // Otherwise waits up to timeout milliseconds (negative: no limit) for the thread to end and,
    // if Run was still running (running flag set), then terminates it with exit code 0xFFFFFFFD.
    // Returns with the running flag clear, the handle closed and, unless the wait for a thread
    // that had left Run ran out, the thread ended: the object may be destroyed at once.
    void Stop(int timeout);
    // Always throws the const wchar_t* literal "Thread suspend operation is not safe".
    unsigned long Suspend();
    // ResumeThread: the previous suspend count, 0xFFFFFFFF on failure (also without a thread).
    unsigned long Resume();
    // SetThreadPriority with a THREAD_PRIORITY_* level; without a thread nothing happens.
    void SetPriority(int priority);
    // GetThreadPriority: the THREAD_PRIORITY_* level, 0x7FFFFFFF on failure (also without a
    // thread).
    int GetPriority();
    // True at once when the running flag is clear; otherwise waits up to timeout milliseconds
    // (0xFFFFFFFF: no limit) for the thread to end, false only on time-out.
    bool WaitForExit(unsigned long timeout);
    // Terminates the thread at once with exit code 0xFFFFFFFD, leaving the flags and the handle
    // as they are (Stop cleans up). Anything the thread held (locks, heap) stays held: a last
    // resort.
    void Kill();
    // Set from Create until Run returns or Stop; not cleared by Kill.
    bool IsRunning() const;
    // Set by Stop, never cleared by this class.
    bool StopRequested() const;
    // The stop request's event handle (owned by the object), for waiting on it together with
    // other objects or for clearing it.
    void* GetStopRequestEvent();

protected:
    // The thread body, supplied by the derived class; its result becomes the thread's exit code.
    // This class's own version runs only on a thread whose object lost its derived part before the
    // thread got to Run: it returns 0xA5A5A5A5 at once.
    virtual unsigned int Run();
    // True on the thread this object started, while it holds the thread's handle.
    bool IsItMe() const;

private:
    static unsigned int __stdcall ThreadMain(void* self);

    CInterlockedBooleanFx2 m_stopRequest;
    CInterlockedBooleanFx2 m_running;
    unsigned int m_threadId;
    void* m_thread;
};

} // namespace KelvraCsThread
