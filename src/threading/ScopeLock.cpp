#include "KelvraLocks.h"

namespace KelvraCsLocks
{

CScopeLock::CScopeLock(CLock* lock) : m_lock(lock)
{
    if (m_lock != nullptr)
        m_lock->Lock();
}

CScopeLock::CScopeLock(CScopeLock&) : m_lock(nullptr)
{
    throw "Not implemented";
}

CScopeLock& CScopeLock::operator=(CScopeLock&)
{
    throw "Not implemented";
}

CScopeLock::~CScopeLock()
{
    if (m_lock != nullptr)
        m_lock->Unlock();
}

} // namespace KelvraCsLocks
