#include "KelvraLocks.h"
#include "ThreadingSupport.h"

#include <gtest/gtest.h>

#include <windows.h>

#include <chrono>
#include <future>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace KelvraCsLocks
{

// Reaches the private copy operations through the friendship the classes grant it.
struct CopyRefusalProbe
{
    // What copy construction from one and assignment of other to one throw.
    template <typename T> static std::pair<std::string, std::string> Refusals(T& one, T& other)
    {
        return {KelvraTest::ThrownLiteral<char>([&] { T copy(one); }),
                KelvraTest::ThrownLiteral<char>([&] { one = other; })};
    }
};

} // namespace KelvraCsLocks

namespace
{

using KelvraCsLocks::CCritSec;
using KelvraCsLocks::CLock;
using KelvraCsLocks::CopyRefusalProbe;
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

TEST(Lock, CopiesAreRefusedWithTheClassLiteral)
{
    using Texts = std::pair<std::string, std::string>;
    HostRecordSection section(nullptr);
    CLock lock, otherLock;
    CScopeLock scope(&lock), otherScope(&otherLock);
    EXPECT_EQ(Texts("Not copyable", "Not copyable"), CopyRefusalProbe::Refusals<CCritSec>(section, section));
    EXPECT_EQ(Texts("Not implemented", "Not implemented"), CopyRefusalProbe::Refusals(lock, otherLock));
    EXPECT_EQ(Texts("Not implemented", "Not implemented"), CopyRefusalProbe::Refusals(scope, otherScope));
    // The refused scope copy must not have released the lock the original holds.
    EXPECT_EQ(0, TryLockElsewhere(lock));
}

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

TEST(Lock, DeletesEachSectionItOwnsExactlyOnceAlsoWhenInitReplacesIt)
{
    Calls calls;
    {
        AdoptingLock lock(new CountingSection("a", calls));
        lock.Lock();
        EXPECT_EQ(7, lock.TryLock());
        lock.Unlock();
        ICritSec* replacement = new CountingSection("b", calls);
        lock.Init(replacement);
        lock.Init(replacement);
        lock.Init(nullptr);
    }
    EXPECT_EQ(Calls({"a.init", "a.enter", "a.try", "a.leave", "a.delete", "a.destroyed", "b.init", "b.delete",
                     "b.destroyed"}),
              calls);
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

// Also covers the record adopted at construction: it is the one Init must free.
TEST(CritSec, InitFreesTheRecordItReplaces)
{
    const auto newRecord = []
    { return static_cast<CRITICAL_SECTION*>(::HeapAlloc(::GetProcessHeap(), 0, sizeof(CRITICAL_SECTION))); };
    CRITICAL_SECTION* first = newRecord();
    CRITICAL_SECTION* second = newRecord();
    ASSERT_TRUE(IsAllocated(first));
    HostRecordSection* section = new HostRecordSection(first);
    section->Init(second);
    EXPECT_FALSE(IsAllocated(first)) << "the replaced record leaked";
    section->Init(nullptr);
    section->Init(second);
    EXPECT_TRUE(IsAllocated(second)) << "Init with the record already held freed it";
    {
        AdoptingLock lock(section);
        lock.Lock();
        EXPECT_EQ(1, second->RecursionCount) << "the lock does not run on the adopted record";
        lock.Unlock();
    }
    EXPECT_FALSE(IsAllocated(second)) << "the record was not freed with the section";
}

} // namespace
