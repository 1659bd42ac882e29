#include "KelvraTrace.h"

#include <windows.h>

std::FILE* CLog::_log = nullptr;
// Created while the library loads, before any host code can trace; never closed, so that a line
// emitted late during unload still finds a valid handle.
void* CLog::_mutex = ::CreateMutexW(nullptr, FALSE, nullptr);

CLog::CLog() = default;

CLog& CLog::operator=(const CLog&)
{
    return *this;
}
