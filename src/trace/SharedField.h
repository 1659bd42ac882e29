// Loads and stores of the exported trace fields (CLog::_log, Debug::_lvl, Debug::_modules), which
// keep their plain types for hosts but are read by emitting threads that do not hold the trace
// lock: each access is one untorn load or store, ordered so that a reader that sees a value also
// sees what was written before it.
#pragma once

#include <atomic>

namespace KelvraTrace
{

template <typename T> T LoadAcquire(const T& field) noexcept
{
#if defined(__GNUC__)
    return __atomic_load_n(&field, __ATOMIC_ACQUIRE);
#else
    // MSVC keeps aligned volatile accesses whole; the fence orders what follows after the load.
    const T value = *static_cast<const volatile T*>(&field);
    std::atomic_thread_fence(std::memory_order_acquire);
    return value;
#endif
}

template <typename T> void StoreRelease(T& field, T value) noexcept
{
#if defined(__GNUC__)
    __atomic_store_n(&field, value, __ATOMIC_RELEASE);
#else
    std::atomic_thread_fence(std::memory_order_release);
    *static_cast<volatile T*>(&field) = value;
#endif
}

} // namespace KelvraTrace
