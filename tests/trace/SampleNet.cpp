// Sample.Net.dll: a second module of the host process that writes its own trace lines through the
// public macros. Built with a host's default compiler settings, like any user's DLL.
#include <Kelvra.h>

extern "C" __declspec(dllexport) void SampleTrace(char level, const wchar_t* text)
{
    if (level == 't')
        KELVRA_TRC(L"sample %s", text);
    else if (level == 'i')
        KELVRA_INF(L"sample %s", text);
    else
        KELVRA_ERR(L"sample %s", text);
}
