// Re-entrant mutual exclusion between the threads of one process. Holding is per thread and
// counted: a thread that took a lock n times (Lock, or a successful TryLock) must release it
// n times before another thread gets in. None of the classes can be copied.
#pragma once

#include "KelvraApi.h"

#include <new>

// The platform's critical section record (CRITICAL_SECTION in <windows.h>).
struct _RTL_CRITICAL_SECTION;

namespace KelvraCsLocks
{

// A critical section behind an interface, so that CLock can drive other implementations.
class KELVRA_API ICritSec
{
public:
    virtual ~ICritSec();
    // Makes the section usable and unowned. Called once before any other operation.
    virtual void InitCritSec() = 0;
    // Blocks until the calling thread holds the section; re-entrant for the holder.
    virtual void EnterCritSec() = 0;
    // Never blocks: non-zero when the calling thread now holds the section (also when it
    // already did, adding one level), 0 when another thread holds it.
    virtual int TryEnterCritSec() = 0;
    // Releases one level of holding. Only the holder may call it.
    virtual void LeaveCritSec() = 0;
    // Frees the platform resources of an unowned section; InitCritSec makes it usable again.
    virtual void DeleteCritSec() = 0;
};

// One platform critical section whose record the object owns. The destructor is protected:
// the object is deleted through ICritSec (CLock does it, after DeleteCritSec).
//
// Records the object owns live on the process heap (GetProcessHeap), so that a derived class in
// any module can hand one over: allocate it with HeapAlloc(GetProcessHeap(), 0,
// sizeof(CRITICAL_SECTION)); the object frees it with HeapFree.
class KELVRA_API CCritSec : public ICritSec
{
public:
    // Allocates an uninitialised record; throws std::bad_alloc when the heap is exhausted.
    CCritSec();

    void InitCritSec() override;
    void EnterCritSec() override;
    int TryEnterCritSec() override;
    void LeaveCritSec() override;
    void DeleteCritSec() override;

protected:
    // Releases the record without finalising it: DeleteCritSec must have run first.
    ~CCritSec() override;

    // Adopts storage (see above for how to allocate it); null allocates a record as CCritSec().
    explicit CCritSec(_RTL_CRITICAL_SECTION* storage);
    // Holds storage instead of the current record, before InitCritSec. The replaced record is
    // neither finalised nor freed: it stays the caller's, to free or to hand back with Init (so
    // replace only records you supplied). The object frees the record it holds when destroyed.
    // Null changes nothing.
    void Init(_RTL_CRITICAL_SECTION* storage);

private:
    // Both throw the const char* literal "Not copyable".
    CCritSec(CCritSec& other);
    CCritSec& operator=(CCritSec& other);

    _RTL_CRITICAL_SECTION* m_record;
};

// A lock that owns its section: initialised on construction, finalised and deleted on destruction.
// Construction and destruction must not overlap with use from other threads.
class KELVRA_API CLock
{
private:
    // Throws the const char* literal "Not implemented".
    virtual CLock& operator=(CLock& other);

public:
    // Uses a new CCritSec.
    CLock();
    // Calls DeleteCritSec on the section, then deletes it. The lock must not be held.
    virtual ~CLock();

    virtual void Lock();
    // Non-zero when the calling thread now holds the lock (one more level), 0 otherwise.
    virtual int TryLock();
    virtual void Unlock();

protected:
    // Adopts section (deleted with delete through ICritSec) and initialises it; null uses a new
    // CCritSec.
    explicit CLock(ICritSec* section);
    // Holds section instead of the current one and initialises it; only while no thread holds the
    // lock. The replaced section is neither finalised nor deleted: it stays the caller's, to hand
    // back with Init (initialised again) or to finalise and delete. The lock finalises and deletes
    // only the section it holds when destroyed. Null or the section already held changes nothing.
    void Init(ICritSec* section);

private:
    // Throws the const char* literal "Not implemented".
    CLock(CLock& other);

    ICritSec* m_section;
};

// Holds a lock from construction to destruction, on the thread that constructed it:
//     { CScopeLock guard(&lock); ... }   // released at the closing brace, also on an exception
// The lock must outlive the scope lock. A null lock holds nothing.
class KELVRA_API CScopeLock
{
private:
    // Throws the const char* literal "Not implemented".
    virtual CScopeLock& operator=(CScopeLock& other);

public:
    CScopeLock(CLock* lock);
    virtual ~CScopeLock();

private:
    // Throws the const char* literal "Not implemented".
    CScopeLock(CScopeLock& other);

    CLock* m_lock;
};

} // namespace KelvraCsLocks
