#include "KelvraBytes.h"

#include <gtest/gtest.h>

#include <windows.h>

#include <atomic>
#include <cstdlib>
#include <new>
#include <optional>
#include <type_traits>

static_assert(std::is_convertible_v<std::uint32_t, Bytes>, "Bytes b = 4096; compiles, as documented");

// Counts the blocks this program holds through the ordinary single-object operator new, which
// Bytes uses: a block released twice or never shows up as a wrong count.
namespace
{
std::atomic<long> g_liveBlocks{0};
}

void* operator new(std::size_t size)
{
    void* block = std::malloc(size == 0 ? 1 : size);
    if (block == nullptr)
        throw std::bad_alloc();
    g_liveBlocks.fetch_add(1);
    return block;
}

void operator delete(void* block) noexcept
{
    if (block != nullptr)
    {
        g_liveBlocks.fetch_sub(1);
        std::free(block);
    }
}

void operator delete(void* block, std::size_t) noexcept
{
    operator delete(block);
}

namespace
{
long LiveBlocks()
{
    return g_liveBlocks.load();
}

DWORD WINAPI CopyAndAssignRepeatedly(void* argument)
{
    const Bytes& shared = *static_cast<const Bytes*>(argument);
    for (int i = 0; i < 20000; ++i)
    {
        Bytes copy(shared);
        Bytes other(1);
        other = copy;
    }
    return 0;
}
} // namespace

TEST(Bytes, ZeroSizeGivesUniqueNonNullPointers)
{
    Bytes a(0), b(0);
    EXPECT_NE(static_cast<char*>(a), nullptr);
    EXPECT_NE(static_cast<char*>(a), static_cast<char*>(b));
}

TEST(Bytes, BothConversionsGiveTheSameAddress)
{
    Bytes buffer(16);
    EXPECT_EQ(static_cast<void*>(static_cast<char*>(buffer)),
              static_cast<void*>(static_cast<unsigned char*>(buffer)));
}

TEST(Bytes, CopyKeepsTheBlockAliveUntilTheLastOwnerGoes)
{
    const long baseline = LiveBlocks();
    std::optional<Bytes> original(std::in_place, 8);
    std::optional<Bytes> copy(std::in_place, *original);
    EXPECT_EQ(LiveBlocks(), baseline + 1); // the copy allocated nothing
    EXPECT_EQ(static_cast<char*>(*copy), static_cast<char*>(*original));
    original.reset();
    EXPECT_EQ(LiveBlocks(), baseline + 1);
    char* data = *copy;
    data[7] = 'x';
    EXPECT_EQ(data[7], 'x');
    copy.reset();
    EXPECT_EQ(LiveBlocks(), baseline);
}

TEST(Bytes, AssignmentSharesTheSourceAndReleasesTheTargetsBlock)
{
    const long baseline = LiveBlocks();
    {
        Bytes source(10);
        Bytes target(20);
        const long both = LiveBlocks();
        target = source;
        const long afterAssignment = LiveBlocks();
        EXPECT_EQ(static_cast<char*>(target), static_cast<char*>(source));
        EXPECT_EQ(both - afterAssignment, 1); // the target's old block went, once
    }
    EXPECT_EQ(LiveBlocks(), baseline);
}

TEST(Bytes, SelfAssignmentKeepsTheBlock)
{
    const long baseline = LiveBlocks();
    {
        Bytes buffer(4);
        char* before = buffer;
        Bytes& same = buffer;
        buffer = same;
        EXPECT_EQ(static_cast<char*>(buffer), before);
        EXPECT_EQ(LiveBlocks(), baseline + 1);
    }
    EXPECT_EQ(LiveBlocks(), baseline);
}

TEST(Bytes, CopiesOnManyThreadsReleaseTheBlockOnce)
{
    const long baseline = LiveBlocks();
    {
        // Plain Win32 threads: std::thread would add allocations of its own to the count.
        Bytes shared(64);
        HANDLE threads[8];
        for (HANDLE& thread : threads)
            thread = ::CreateThread(nullptr, 0, &CopyAndAssignRepeatedly, &shared, 0, nullptr);
        ::WaitForMultipleObjects(8, threads, TRUE, INFINITE);
        for (HANDLE thread : threads)
            ::CloseHandle(thread);
        EXPECT_EQ(LiveBlocks(), baseline + 1);
    }
    EXPECT_EQ(LiveBlocks(), baseline);
}
