#include "KelvraBytes.h"
#include "support/CountedHeap.h"

#include <gtest/gtest.h>

#include <windows.h>

#include <optional>

// A block of Bytes released twice or never shows up as a wrong count of blocks in use.
using KelvraTest::liveBlocks;

TEST(Bytes, ZeroSizeGivesUniqueNonNullPointers)
{
    Bytes a(0), b = 0u; // converts implicitly from a size, as documented
    EXPECT_NE(static_cast<char*>(a), nullptr);
    EXPECT_NE(static_cast<char*>(a), static_cast<char*>(b));
}

TEST(Bytes, SharersKeepTheBlockUntilTheLastGoes)
{
    const long long baseline = liveBlocks;
    std::optional<Bytes> original(std::in_place, 8);
    char* const block = *original;
    std::optional<Bytes> copy(std::in_place, *original);
    Bytes target(20);
    EXPECT_EQ(liveBlocks, baseline + 2); // the copy allocated nothing
    target = *copy;                      // the target's own block goes
    EXPECT_EQ(liveBlocks, baseline + 1);
    original.reset();
    copy.reset();
    Bytes& same = target;
    target = same; // self-assignment of the last owner keeps the block
    EXPECT_EQ(liveBlocks, baseline + 1);
    EXPECT_EQ(static_cast<char*>(target), block);
    target = Bytes(1);
    EXPECT_EQ(liveBlocks, baseline + 1);
}

TEST(Bytes, SharersOnManyThreadsReleaseTheBlockOnce)
{
    const long long baseline = liveBlocks;
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
        EXPECT_EQ(liveBlocks, baseline + 1);
    }
    EXPECT_EQ(liveBlocks, baseline);
}
