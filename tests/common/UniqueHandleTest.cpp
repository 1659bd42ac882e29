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

using Recorded = Kelvra::UniqueHandle<RecordingTraits>;

class UniqueHandle : public testing::Test
{
protected:
    void SetUp() override { g_closed.clear(); }
};

} // namespace

TEST_F(UniqueHandle, ClosesOnceWhenDestroyed)
{
    {
        Recorded handle(7);
        EXPECT_TRUE(handle);
    }
    EXPECT_EQ(g_closed, std::vector<int>{7});
}

TEST_F(UniqueHandle, MoveHandsOverWithoutClosing)
{
    {
        Recorded first(1);
        Recorded second(std::move(first));
        EXPECT_FALSE(first);
        EXPECT_EQ(second.get(), 1);
        Recorded third(3);
        third = std::move(second); // closes 3, takes 1
        EXPECT_EQ(g_closed, std::vector<int>{3});
    }
    EXPECT_EQ(g_closed, (std::vector<int>{3, 1}));
}

TEST_F(UniqueHandle, ResetPutAndRelease)
{
    Recorded handle(1);
    handle.reset(2);
    EXPECT_EQ(g_closed, std::vector<int>{1});
    *handle.put() = 4;
    EXPECT_EQ(g_closed, (std::vector<int>{1, 2}));
    EXPECT_EQ(handle.release(), 4);
    EXPECT_FALSE(handle);
    handle.reset();
    EXPECT_EQ(g_closed, (std::vector<int>{1, 2}));
}

TEST_F(UniqueHandle, ClosesARealKernelHandle)
{
    HANDLE raw = nullptr;
    {
        Kelvra::UniqueEvent event(::CreateEventW(nullptr, TRUE, FALSE, nullptr));
        ASSERT_TRUE(event);
        raw = event.get();
        DWORD flags = 0;
        EXPECT_TRUE(::GetHandleInformation(raw, &flags));
    }
    DWORD flags = 0;
    EXPECT_FALSE(::GetHandleInformation(raw, &flags));
    EXPECT_EQ(::GetLastError(), static_cast<DWORD>(ERROR_INVALID_HANDLE));
}
