// The global operator new and delete of a test program that links CountedHeap.cpp: they count the
// blocks in use and can fail one chosen allocation. The other forms (arrays, nothrow) forward to them.
#pragma once

#include <atomic>

namespace KelvraTest
{

inline std::atomic<long long> liveBlocks{0};
// Allocations to go before the chosen one, which fails when this reaches 0 from 1; 0: none chosen.
inline std::atomic<long long> failCountdown{0};

} // namespace KelvraTest
