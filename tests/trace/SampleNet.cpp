// Sample.Net.dll: a second module of the host process, tracing through the public macros.
#include <Kelvra.h>

extern "C" __declspec(dllexport) void SampleTrace(char level, const wchar_t* text)
{
    if (level == 't')
        KELVRA_TRC(L"sample %s", text);
    else
        KELVRA_INF(L"sample %s", text);
}
