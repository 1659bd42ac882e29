#include "KelvraThread.h"

namespace KelvraCsThread
{

CAutoBoolean::CAutoBoolean() : CGlobalBooleanFx2(nullptr, false) {}

// The base refuses the copy.
CAutoBoolean::CAutoBoolean(const CAutoBoolean& other) : CGlobalBooleanFx2(other) {}

CAutoBoolean& CAutoBoolean::operator=(const CAutoBoolean& other)
{
    CGlobalBooleanFx2::operator=(other);
    return *this;
}

} // namespace KelvraCsThread
