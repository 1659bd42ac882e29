// KELVRA_API marks what KelvraSDK.dll exports. Hosts include the headers as they are and get the
// import declarations; the library defines KELVRA_BUILDING_LIBRARY while it compiles itself.
// Outside Windows (the native fuzzing build of the platform-neutral sources) it marks nothing.
#pragma once

#if !defined(_WIN32)
#define KELVRA_API
#elif defined(KELVRA_BUILDING_LIBRARY)
#define KELVRA_API __declspec(dllexport)
#else
#define KELVRA_API __declspec(dllimport)
#endif
