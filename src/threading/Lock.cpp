#include "KelvraLocks.h"

namespace KelvraCsLocks
{

CLock::CLock() : CLock(nullptr) {}

CLock::CLock(ICritSec* section) : m_section(section != nullptr ? section : new CCritSec())
{
    m_section->InitCritSec();
}

CLock::CLock(CLock&) : m_section(nullptr)
{
    throw "Not implemented";
}

CLock& CLock::operator=(CLock&)
{
    throw "Not implemented";
}

CLock::~CLock()
{
    m_section->DeleteCritSec();
    delete m_section;
}

void CLock::Init(ICritSec* section)
{
    if (section == nullptr || section == m_section)
        return;
    m_section = section;
    m_section->InitCritSec();
}

void CLock::Lock()
{
    m_section->EnterCritSec();
}

int CLock::TryLock()
{
    return m_section->TryEnterCritSec();
}

void CLock::Unlock()
{
    m_section->LeaveCritSec();
}

} // namespace KelvraCsLocks
