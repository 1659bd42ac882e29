#include "http/BodyBuffer.h"

#include <windows.h>

namespace KelvraHttp
{

namespace
{

const std::uint64_t kReserved = std::uint64_t{1} << 32;

} // namespace

unsigned char* ReserveBody(std::uint64_t& committed)
{
    committed = 0;
    auto* const body =
        static_cast<unsigned char*>(::VirtualAlloc(nullptr, kReserved, MEM_RESERVE, PAGE_NOACCESS));
    if (body != nullptr && !CommitBody(body, committed, 1))
    {
        ReleaseBody(body);
        return nullptr;
    }
    return body;
}

bool CommitBody(unsigned char* body, std::uint64_t& committed, std::uint64_t size)
{
    if (size > kReserved)
        return false;
    if (size > committed)
    {
        if (::VirtualAlloc(body + committed, size - committed, MEM_COMMIT, PAGE_READWRITE) == nullptr)
            return false;
        committed = size;
    }
    return true;
}

void ReleaseBody(unsigned char* body)
{
    if (body != nullptr)
        ::VirtualFree(body, 0, MEM_RELEASE);
}

} // namespace KelvraHttp
