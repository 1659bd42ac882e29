#include "common/UniqueHandle.h"

#include <gtest/gtest.h>

#include <vector>

namespace
{

std::vector<int> g_closed;

struct RecordingTraits
{
    using pointer = int;
    static pointer invalid() noexcept { return -1; }
    static void close(pointer value) noexcept { g_closed.push_back(value); }
};

} // namespace

TEST(UniqueHandle, ClosesEachValueOnceAndNeverOneHandedOn)
{
    using Recorded = Kelvra::UniqueHandle<RecordingTraits>;
    g_closed.clear();
    {
        Recorded first(1);
        Recorded second(std::move(first)); // a moved or released value is not closed again
        Recorded third(3);
        third = std::move(second); // closes 3, takes 1
        third.reset(4);            // closes 1
        *third.put() = 5;          // closes 4
        EXPECT_EQ(third.release(), 5);
        Recorded last(6);
    }
    EXPECT_EQ(g_closed, (std::vector<int>{3, 1, 4, 6}));
}

