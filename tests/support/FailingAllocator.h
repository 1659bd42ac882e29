// Heap accounting for the one test program that links FailingAllocator.cpp: its global operator
// new and delete count the blocks in use and fail the allocation a test chooses.
#pragma once

namespace KelvraTest
{

// Blocks taken with operator new (any form) and not given back yet.
long long LiveAllocations();

// While it lives, the n-th allocation from its construction fails (operator new throws
// std::bad_alloc, the nothrow forms give null); those before and after it succeed.
class AllocationFailure
{
public:
    explicit AllocationFailure(long long n);
    ~AllocationFailure();
    AllocationFailure(const AllocationFailure&) = delete;
    AllocationFailure& operator=(const AllocationFailure&) = delete;

    // Whether the chosen allocation came while the latest object lived.
    static bool Happened();
};

} // namespace KelvraTest
