#include "ThreadingSupport.h"

#include <windows.h>

namespace KelvraTest
{

unsigned long OpenHandleCount()
{
    DWORD count = 0;
    if (::GetProcessHandleCount(::GetCurrentProcess(), &count) && count != 0)
        return count;
    // Handle values are multiples of 4 handed out from the lowest free slot, so a test process
    // (a few dozen handles) stays far below this bound.
    constexpr ULONG_PTR kLastValue = 4 * 4096;
    unsigned long open = 0;
    for (ULONG_PTR value = 4; value <= kLastValue; value += 4)
    {
        DWORD flags = 0;
        if (::GetHandleInformation(reinterpret_cast<HANDLE>(value), &flags))
            ++open;
    }
    return open;
}

std::wstring UniqueObjectName(const wchar_t* purpose)
{
    return L"Kelvra.Threading." + std::to_wstring(::GetCurrentProcessId()) + L"." + purpose;
}

} // namespace KelvraTest
