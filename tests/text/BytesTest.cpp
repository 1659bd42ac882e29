#include "KelvraBytes.h"

#include <gtest/gtest.h>

#include <windows.h>

#include <atomic>
#include <cstdlib>
#include <new>
#include <optional>

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
    ++g_liveBlocks;
    return block;
}

void operator delete(void* block) noexcept
{
    g_liveBlocks -= block != nullptr;
    std::free(block);
}

void operator delete(void* block, std::size_t) noexcept
{
    g_liveBlocks -= block != nullptr;
    std::free(block);
}

TEST(Bytes, ZeroSizeGivesUniqueNonNullPointers)
{
    Bytes a(0), b = 0u; // converts implicitly from a size, as documented
    EXPECT_NE(static_cast<char*>(a), nullptr);
    EXPECT_NE(static_cast<char*>(a), static_cast<char*>(b));
}

TEST(Bytes, SharersKeepTheBlockUntilTheLastGoes)
{
    const long baseline = g_liveBlocks;
    std::optional<Bytes> original(std::in_place, 8);
    char* const block = *original;
    std::optional<Bytes> copy(std::in_place, *original);
    Bytes target(20);
    EXPECT_EQ(g_liveBlocks, baseline + 2); // the copy allocated nothing
    target = *copy;                        // the target's own block goes
    EXPECT_EQ(g_liveBlocks, baseline + 1);
    original.reset();
    copy.reset();
    Bytes& same = target;
    target = same; // self-assignment of the last owner keeps the block
    EXPECT_EQ(g_liveBlocks, baseline + 1);
    EXPECT_EQ(static_cast<char*>(target), block);
    target = Bytes(1);
    EXPECT_EQ(g_liveBlocks, baseline + 1);
}

TEST(Bytes, SharersOnManyThreadsReleaseTheBlockOnce)
{
    const long baseline = g_liveBlocks;
    {
        // Plain Win32 threads: std::thread would add allocations of its own to the count.
        const auto copyAndAssign = [](void* shared) -> DWORD
        {
            for (int i = 0; i < 20000; ++i)
            {
                Bytes other(1);
                other = *static_cast<const Bytes*>(shared);
            }
            return 0;
        };
        Bytes shared(64);
        HANDLE threads[8];
        for (HANDLE& thread : threads)
            thread = ::CreateThread(nullptr, 0, copyAndAssign, &shared, 0, nullptr);
        ::WaitForMultipleObjects(8, threads, TRUE, INFINITE);
        for (HANDLE thread : threads)
            ::CloseHandle(thread);
        EXPECT_EQ(g_liveBlocks, baseline + 1);
    }
    EXPECT_EQ(g_liveBlocks, baseline);
}
