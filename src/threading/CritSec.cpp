#include "KelvraLocks.h"

#include <windows.h>

#include <new>

namespace KelvraCsLocks
{

namespace
{

// The process heap rather than operator new: a derived class in another module (another C
// runtime) allocates records the same way and this object frees them.
_RTL_CRITICAL_SECTION* AllocateRecord()
{
    void* memory = ::HeapAlloc(::GetProcessHeap(), 0, sizeof(CRITICAL_SECTION));
    if (memory == nullptr)
        throw std::bad_alloc();
    return static_cast<_RTL_CRITICAL_SECTION*>(memory);
}

void FreeRecord(_RTL_CRITICAL_SECTION* record)
{
    if (record != nullptr)
        ::HeapFree(::GetProcessHeap(), 0, record);
}

} // namespace

ICritSec::~ICritSec() = default;

CCritSec::CCritSec() : m_record(AllocateRecord()) {}

CCritSec::CCritSec(_RTL_CRITICAL_SECTION* storage)
    : m_record(storage != nullptr ? storage : AllocateRecord())
{
}

CCritSec::CCritSec(CCritSec&) : m_record(nullptr)
{
    throw "Not copyable";
}

CCritSec& CCritSec::operator=(CCritSec&)
{
    throw "Not copyable";
}

CCritSec::~CCritSec()
{
    FreeRecord(m_record);
}

void CCritSec::Init(_RTL_CRITICAL_SECTION* storage)
{
    if (storage != nullptr)
        m_record = storage;
}

void CCritSec::InitCritSec()
{
    ::InitializeCriticalSection(m_record);
}

void CCritSec::EnterCritSec()
{
    ::EnterCriticalSection(m_record);
}

int CCritSec::TryEnterCritSec()
{
    return ::TryEnterCriticalSection(m_record);
}

void CCritSec::LeaveCritSec()
{
    ::LeaveCriticalSection(m_record);
}

void CCritSec::DeleteCritSec()
{
    ::DeleteCriticalSection(m_record);
}

} // namespace KelvraCsLocks
