#include "KelvraLocks.h"

#include <gtest/gtest.h>

#include <windows.h>

#include <atomic>
#include <memory>
#include <string>
#include <thread>
#include <vector>

namespace KelvraCsLocks
{

// Reaches the private copy operations through the friendship the classes grant it.
struct CopyRefusalProbe
{
    template <typename T>
    static void CopyConstruct(T& original)
    {
        T copy(original);
    }

    template <typename T>
    static void Assign(T& target, T& source)
    {
        target = source;
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
    std::thread other([&] {
        result = lock.TryLock();
        if (result != 0)
            lock.Unlock();
    });
    other.join();
    return result;
}

template <typename Action>
std::string ThrownText(Action action)
{
    try
    {
        action();
    }
    catch (const char* text)
    {
        return text;
    }
    catch (...)
    {
        return "<an exception of another type>";
    }
    return "<nothing thrown>";
}

TEST(Lock, HoldingIsCountedPerThread)
{
    CLock lock;
    lock.Lock();
    lock.Lock();
    EXPECT_EQ(0, TryLockElsewhere(lock));
    lock.Unlock();
    EXPECT_EQ(0, TryLockElsewhere(lock)) << "one level is still held";
    lock.Unlock();
    EXPECT_NE(0, TryLockElsewhere(lock));
}

TEST(Lock, TryLockByTheHolderAddsALevel)
{
    CLock lock;
    lock.Lock();
    EXPECT_NE(0, lock.TryLock());
    lock.Unlock();
    EXPECT_EQ(0, TryLockElsewhere(lock));
    lock.Unlock();
    EXPECT_NE(0, TryLockElsewhere(lock));
}

TEST(Lock, LockWaitsForTheHolderToRelease)
{
    CLock lock;
    std::atomic<bool> entered{false};
    lock.Lock();
    std::thread other([&] {
        lock.Lock();
        entered = true;
        lock.Unlock();
    });
    ::Sleep(150);
    EXPECT_FALSE(entered) << "the other thread got in while the lock was held";
    lock.Unlock();
    other.join();
    EXPECT_TRUE(entered);
}

TEST(ScopeLock, NestedScopesOnOneLockDoNotBlock)
{
    CLock lock;
    {
        CScopeLock outer(&lock);
        {
            CScopeLock inner(&lock);
            EXPECT_EQ(0, TryLockElsewhere(lock));
        }
        EXPECT_EQ(0, TryLockElsewhere(lock)) << "the outer scope still holds the lock";
    }
    EXPECT_NE(0, TryLockElsewhere(lock));
}

TEST(ScopeLock, NullLockHoldsNothing)
{
    CScopeLock nothing(nullptr);
}

TEST(Lock, CopiesAreRefusedWithTheClassLiteral)
{
    std::unique_ptr<ICritSec> section(new CCritSec());
    CCritSec& critSec = static_cast<CCritSec&>(*section);
    CLock lock;
    CLock otherLock;
    CScopeLock scope(&lock);
    CScopeLock otherScope(&otherLock);

    EXPECT_EQ("Not copyable", ThrownText([&] { CopyRefusalProbe::CopyConstruct(critSec); }));
    EXPECT_EQ("Not copyable", ThrownText([&] { CopyRefusalProbe::Assign(critSec, critSec); }));
    EXPECT_EQ("Not implemented", ThrownText([&] { CopyRefusalProbe::CopyConstruct(lock); }));
    EXPECT_EQ("Not implemented", ThrownText([&] { CopyRefusalProbe::Assign(lock, otherLock); }));
    EXPECT_EQ("Not implemented", ThrownText([&] { CopyRefusalProbe::CopyConstruct(scope); }));
    EXPECT_EQ("Not implemented", ThrownText([&] { CopyRefusalProbe::Assign(scope, otherScope); }));
    // The refused scope copy must not have released the lock the original holds.
    EXPECT_EQ(0, TryLockElsewhere(lock));
}

// Records every call a lock makes on its section, and the section's destruction.
class CountingSection : public ICritSec
{
public:
    CountingSection(const char* name, std::vector<std::string>& calls) : m_name(name), m_calls(calls) {}
    ~CountingSection() override { Record("destroyed"); }

    void InitCritSec() override { Record("init"); }
    void EnterCritSec() override { Record("enter"); }
    int TryEnterCritSec() override
    {
        Record("try");
        return 7;
    }
    void LeaveCritSec() override { Record("leave"); }
    void DeleteCritSec() override { Record("delete"); }

private:
    void Record(const char* call) { m_calls.push_back(m_name + "." + call); }

    std::string m_name;
    std::vector<std::string>& m_calls;
};

class AdoptingLock : public CLock
{
public:
    explicit AdoptingLock(ICritSec* section) : CLock(section) {}
    using CLock::Init;
};

using Calls = std::vector<std::string>;

TEST(Lock, DrivesItsSectionAndDestroysItExactlyOnce)
{
    Calls calls;
    {
        AdoptingLock lock(new CountingSection("a", calls));
        EXPECT_EQ(Calls({"a.init"}), calls);
        lock.Lock();
        EXPECT_EQ(7, lock.TryLock());
        lock.Unlock();
        calls.clear();
    }
    EXPECT_EQ(Calls({"a.delete", "a.destroyed"}), calls);
}

TEST(Lock, InitFinalisesAndDeletesTheSectionItReplaces)
{
    Calls calls;
    {
        AdoptingLock lock(new CountingSection("a", calls));
        ICritSec* replacement = new CountingSection("b", calls);
        lock.Init(replacement);
        lock.Init(replacement);
        lock.Init(nullptr);
        lock.Lock();
        EXPECT_EQ(Calls({"a.init", "a.delete", "a.destroyed", "b.init", "b.enter"}), calls);
        lock.Unlock();
        calls.clear();
    }
    EXPECT_EQ(Calls({"b.delete", "b.destroyed"}), calls);
}

TEST(Lock, NullSectionGivesAWorkingLock)
{
    AdoptingLock lock(nullptr);
    lock.Lock();
    EXPECT_EQ(0, TryLockElsewhere(lock));
    lock.Unlock();
    EXPECT_NE(0, TryLockElsewhere(lock));
}

// A critical section whose record comes from its creator, as a host's derived class would do it.
class HostRecordSection : public CCritSec
{
public:
    explicit HostRecordSection(CRITICAL_SECTION* record) : CCritSec(record) {}
    using CCritSec::Init;
};

CRITICAL_SECTION* NewRecord()
{
    return static_cast<CRITICAL_SECTION*>(::HeapAlloc(::GetProcessHeap(), 0, sizeof(CRITICAL_SECTION)));
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

TEST(CritSec, AdoptedRecordIsUsedAndFreedWithTheSection)
{
    CRITICAL_SECTION* record = NewRecord();
    ASSERT_TRUE(IsAllocated(record));
    {
        AdoptingLock lock(new HostRecordSection(record));
        lock.Lock();
        EXPECT_EQ(1, record->RecursionCount) << "the lock does not run on the adopted record";
        EXPECT_EQ(0, TryLockElsewhere(lock));
        lock.Unlock();
    }
    EXPECT_FALSE(IsAllocated(record));
}

TEST(CritSec, InitFreesTheRecordItReplaces)
{
    CRITICAL_SECTION* first = NewRecord();
    CRITICAL_SECTION* second = NewRecord();
    HostRecordSection* section = new HostRecordSection(first);
    section->Init(second);
    EXPECT_FALSE(IsAllocated(first));
    section->Init(nullptr);
    section->Init(second);
    EXPECT_TRUE(IsAllocated(second));
    {
        AdoptingLock lock(section);
        lock.Lock();
        EXPECT_EQ(1, second->RecursionCount);
        lock.Unlock();
    }
    EXPECT_FALSE(IsAllocated(second));
}

} // namespace
