#include "KelvraThread.h"

namespace KelvraCsThread
{

CInterlockedBooleanFx2::CInterlockedBooleanFx2() : CGlobalBooleanFx2(nullptr, true) {}

// The base refuses the copy.
CInterlockedBooleanFx2::CInterlockedBooleanFx2(const CInterlockedBooleanFx2& other)
    : CGlobalBooleanFx2(other)
{
}

CInterlockedBooleanFx2& CInterlockedBooleanFx2::operator=(const CInterlockedBooleanFx2& other)
{
    CGlobalBooleanFx2::operator=(other);
    return *this;
}

} // namespace KelvraCsThread
