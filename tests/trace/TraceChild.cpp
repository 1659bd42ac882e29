// TraceChild.exe: a host program the trace tests start in a fresh process (the trace state is
// process-wide), built with a host's default compiler settings. Each argument is one step:
//   start:<append 0|1>:<perProcess 0|1>:<name>, stop, configure: Debug's (what they throw goes to
//     c:\keltrace\failures, a line each); config:<text> writes c:\keltrace\debug;
//   trc|inf|sample-trc|sample-inf:<text>: "host <text>" of this module, "sample <text>" of Sample.Net.
#include <Kelvra.h>

#include <fstream>
#include <string>

extern "C" __declspec(dllimport) void SampleTrace(char level, const wchar_t* text);

int main(int argc, char** argv)
{
    for (int i = 1; i < argc; ++i)
    {
        const std::string step = argv[i], verb = step.substr(0, step.find(':'));
        const std::string argument = verb.size() < step.size() ? step.substr(verb.size() + 1) : "";
        const std::wstring text(argument.begin(), argument.end());
        try
        {
            if (verb == "start")
                Debug::start(text.substr(4), text[0] == L'1', text[2] == L'1');
            else if (verb == "stop")
                Debug::stop();
            else if (verb == "configure")
                Debug::configure();
            else if (verb == "trc")
                KELVRA_TRC(L"host %s", text.c_str());
            else if (verb == "inf")
                KELVRA_INF(L"host %s", text.c_str());
            else if (verb.rfind("sample-", 0) == 0)
                SampleTrace(verb[7], text.c_str());
            else if (verb != "config" ||
                     !(std::ofstream("c:\\keltrace\\debug", std::ios::binary) << argument))
                return 2;
        }
        catch (const std::exception& error)
        {
            std::ofstream("c:\\keltrace\\failures", std::ios::app) << error.what() << "\n";
        }
    }
    return 0;
}
