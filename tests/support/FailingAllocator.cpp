// Replaces the program's global operator new and delete (link it into one test program only).
#include "support/FailingAllocator.h"

#include <atomic>
#include <cstdlib>
#include <new>

namespace
{

std::atomic<long long> live{0};
// Allocations to go before the chosen one, which fails when this reaches 0 from 1; 0: none chosen.
std::atomic<long long> countdown{0};
std::atomic<bool> happened{false};

void* Allocate(std::size_t size) noexcept
{
    if (countdown.load(std::memory_order_relaxed) > 0 && countdown.fetch_sub(1) == 1)
    {
        happened = true;
        return nullptr;
    }
    void* block = std::malloc(size == 0 ? 1 : size);
    if (block != nullptr)
        ++live;
    return block;
}

void Free(void* block) noexcept
{
    if (block == nullptr)
        return;
    --live;
    std::free(block);
}

} // namespace

void* operator new(std::size_t size)
{
    void* block = Allocate(size);
    if (block == nullptr)
        throw std::bad_alloc();
    return block;
}

void* operator new[](std::size_t size)
{
    return operator new(size);
}

void* operator new(std::size_t size, const std::nothrow_t&) noexcept
{
    return Allocate(size);
}

void* operator new[](std::size_t size, const std::nothrow_t&) noexcept
{
    return Allocate(size);
}

void operator delete(void* block) noexcept
{
    Free(block);
}

void operator delete[](void* block) noexcept
{
    Free(block);
}

void operator delete(void* block, std::size_t) noexcept
{
    Free(block);
}

void operator delete[](void* block, std::size_t) noexcept
{
    Free(block);
}

void operator delete(void* block, const std::nothrow_t&) noexcept
{
    Free(block);
}

void operator delete[](void* block, const std::nothrow_t&) noexcept
{
    Free(block);
}

namespace KelvraTest
{

long long LiveAllocations()
{
    return live;
}

AllocationFailure::AllocationFailure(long long n)
{
    happened = false;
    countdown = n;
}

AllocationFailure::~AllocationFailure()
{
    countdown = 0;
}

bool AllocationFailure::Happened()
{
    return happened;
}

} // namespace KelvraTest
