#include "KelvraThread.h"
#include "common/UniqueHandle.h"
#include "threading/WaitTimeout.h"

#include <windows.h>

namespace KelvraCsThread
{

CGlobalBooleanFx2::CGlobalBooleanFx2(const wchar_t* name) : CGlobalBooleanFx2(name, true) {}

// CreateEventW is the last call: its last error (ERROR_ALREADY_EXISTS, or why it failed) is what
// the caller reads after construction.
CGlobalBooleanFx2::CGlobalBooleanFx2(const wchar_t* name, bool manualReset)
    : m_event(::CreateEventW(nullptr, manualReset ? TRUE : FALSE, FALSE, name))
{
}

CGlobalBooleanFx2::CGlobalBooleanFx2(const CGlobalBooleanFx2&) : m_event(nullptr)
{
    throw L"You can't use CGlobalBooleanFx2::CGlobalBooleanFx2 copy constructor";
}

CGlobalBooleanFx2::~CGlobalBooleanFx2()
{
    Kelvra::UniqueEvent::close(m_event);
}

void CGlobalBooleanFx2::operator=(const CGlobalBooleanFx2& other)
{
    *this = static_cast<bool>(other);
}

void CGlobalBooleanFx2::operator=(bool value)
{
    if (value)
        ::SetEvent(m_event);
    else
        ::ResetEvent(m_event);
}

bool CGlobalBooleanFx2::operator==(const CGlobalBooleanFx2& other) const
{
    const bool mine = *this;
    const bool theirs = other;
    return mine == theirs;
}

CGlobalBooleanFx2::operator bool() const
{
    return Wait(0);
}

bool CGlobalBooleanFx2::Wait(int timeout) const
{
    return ::WaitForSingleObject(m_event, Kelvra::WaitMilliseconds(timeout)) == WAIT_OBJECT_0;
}

void* CGlobalBooleanFx2::GetEvent() const
{
    return m_event;
}

} // namespace KelvraCsThread
