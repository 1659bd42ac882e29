#include "support/CountedHeap.h"

#include <cstdlib>
#include <new>

using KelvraTest::failCountdown;
using KelvraTest::liveBlocks;

void* operator new(std::size_t size)
{
    void* block =
        failCountdown.load() > 0 && failCountdown.fetch_sub(1) == 1 ? nullptr : std::malloc(size + 1);
    liveBlocks += block != nullptr ? 1 : 0;
    return block != nullptr ? block : throw std::bad_alloc();
}
void operator delete(void* block) noexcept
{
    if (block != nullptr)
        --liveBlocks, std::free(block);
}
void operator delete(void* block, std::size_t) noexcept
{
    operator delete(block);
}
