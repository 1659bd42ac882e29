#include "KelvraLocks.h"

#include <gtest/gtest.h>

#include <windows.h>

#include <chrono>
#include <future>
#include <string>
#include <thread>
#include <vector>

namespace
{

using KelvraCsLocks::CCritSec;
using KelvraCsLocks::CLock;
using KelvraCsLocks::CScopeLock;
using KelvraCsLocks::ICritSec;

// TryLock from a thread of its own (released again at once): what any other thread would get.
int TryLockElsewhere(CLock& lock)
{
    int result = 0;
    std::thread other(
        [&]
        {
            result = lock.TryLock();
            if (result != 0)
                lock.Unlock();
        });
    other.join();
    return result;
}

TEST(Lock, HoldingIsCountedPerThread)
{
    CLock lock;
    lock.Lock();
    lock.Lock();
    ASSERT_NE(0, lock.TryLock()) << "TryLock by the holder adds a level";
    for (int levels = 3; levels > 0; --levels)
    {
        EXPECT_EQ(0, TryLockElsewhere(lock)) << levels << " levels held";
        lock.Unlock();
    }
    EXPECT_NE(0, TryLockElsewhere(lock));
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
}

TEST(ScopeLock, NestedScopesOnOneLockDoNotBlock)
{
    CLock lock;
    {
        CScopeLock outer(&lock);
        {
            CScopeLock inner(&lock);
        }
        EXPECT_EQ(0, TryLockElsewhere(lock)) << "the outer scope no longer holds the lock";
    }
    EXPECT_NE(0, TryLockElsewhere(lock));
}

TEST(ScopeLock, NullLockHoldsNothing)
{
    CScopeLock nothing(nullptr);
}

// A critical section whose record comes from its creator, as a host's derived class would do it.
class HostRecordSection : public CCritSec
{
public:
    explicit HostRecordSection(CRITICAL_SECTION* record) : CCritSec(record) {}
    using CCritSec::Init;
};

using Calls = std::vector<std::string>;

// Records every call a lock makes on its section, and the section's destruction. TryEnterCritSec
// answers 7, for TryLock to pass on.
class CountingSection : public ICritSec
{
public:
    CountingSection(const char* name, Calls& calls) : m_name(name), m_calls(calls) {}
    ~CountingSection() override { Record("destroyed"); }
    void InitCritSec() override { Record("init"); }
    void EnterCritSec() override { Record("enter"); }
    int TryEnterCritSec() override { return Record("try"); }
    void LeaveCritSec() override { Record("leave"); }
    void DeleteCritSec() override { Record("delete"); }

private:
    int Record(const char* call)
    {
        m_calls.push_back(m_name + "." + call);
        return 7;
    }

    std::string m_name;
    Calls& m_calls;
};

class AdoptingLock : public CLock
{
public:
    explicit AdoptingLock(ICritSec* section) : CLock(section) {}
    using CLock::Init;
};

TEST(Lock, InitSwapsSectionsAndTheLockDeletesOnlyTheOneItHoldsAtTheEnd)
{
    Calls calls;
    ICritSec* kept = new CountingSection("a", calls);
    ICritSec* replacement = new CountingSection("b", calls);
    {
        AdoptingLock lock(kept);
        lock.Lock();
        EXPECT_EQ(7, lock.TryLock());
        lock.Unlock();
        lock.Init(replacement);
        ASSERT_EQ(Calls({"a.init", "a.enter", "a.try", "a.leave", "b.init"}), calls)
            << "Init finalised or deleted the section it replaced";
        lock.Init(replacement);
        lock.Init(nullptr);
        lock.Init(kept);
    }
    EXPECT_EQ(Calls({"a.init", "a.enter", "a.try", "a.leave", "b.init", "a.init", "a.delete", "a.destroyed"}),
              calls);
    delete replacement;
}

TEST(Lock, NullSectionGivesAWorkingLock)
{
    AdoptingLock lock(nullptr);
    lock.Lock();
    EXPECT_EQ(0, TryLockElsewhere(lock));
    lock.Unlock();
}

bool IsAllocated(const void* block)
{
    const HANDLE heap = ::GetProcessHeap();
    ::HeapLock(heap);
    PROCESS_HEAP_ENTRY entry = {};
    bool found = false;
    while (!found && ::HeapWalk(heap, &entry))
        found = (entry.wFlags & PROCESS_HEAP_ENTRY_BUSY) != 0 && entry.lpData == block;
    ::HeapUnlock(heap);
    return found;
}

// Also covers the record adopted at construction.
TEST(CritSec, InitLeavesTheReplacedRecordToItsOwner)
{
    const auto newRecord = []
    { return static_cast<CRITICAL_SECTION*>(::HeapAlloc(::GetProcessHeap(), 0, sizeof(CRITICAL_SECTION))); };
    CRITICAL_SECTION* kept = newRecord();
    CRITICAL_SECTION* replacement = newRecord();
    HostRecordSection* section = new HostRecordSection(kept);
    section->Init(replacement);
    ASSERT_TRUE(IsAllocated(kept)) << "Init freed the record it replaced";
    section->Init(kept);
    section->Init(nullptr);
    {
        AdoptingLock lock(section);
        lock.Lock();
        EXPECT_EQ(1, kept->RecursionCount) << "the lock does not run on the record swapped back in";
        lock.Unlock();
    }
    EXPECT_FALSE(IsAllocated(kept)) << "the record held at the end was not freed with the section";
    EXPECT_TRUE(IsAllocated(replacement));
    ::HeapFree(::GetProcessHeap(), 0, replacement);
}

} // namespace
