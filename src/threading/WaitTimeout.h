// Time-outs as the public classes take them (int milliseconds, negative: no limit) turned into
// what the wait functions take.
#pragma once

#include <windows.h>

namespace Kelvra
{

inline DWORD WaitMilliseconds(int timeout)
{
    return timeout < 0 ? INFINITE : static_cast<DWORD>(timeout);
}

} // namespace Kelvra
