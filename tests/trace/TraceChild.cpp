// TraceChild.exe: a host program the trace tests start in a fresh process (the trace state is
// process-wide). Built with a host's default compiler settings. Each argument is one step, run
// in order; steps that have a result print one line "<step>:<result>" on standard output.
//   start:<name>:<append 0|1>:<perProcess 0|1>   Debug::start, prints "ok" or the exception text
//   stop | configure                             Debug::stop / Debug::configure
//   trc:<text> | inf:<text> | err:<text>         a line of this module: "host <text>"
//   sample-trc:<text> | sample-inf:... | sample-err:...   a line of Sample.Net.dll: "sample <text>"
//   format                                       a line with wide, narrow and number fields
//   lasterror                                    a line between setting and reading the error codes
//   session                                      "open" or "closed" (CLog::_log)
//   open:<file>                                  can c:\keltrace\<file> be opened for writing?
//   config:<text>                                writes c:\keltrace\debug
//   signal:<event> | wait:<event>                named events shared with the test
#include <Kelvra.h>

#include <windows.h>

#include <share.h>

#include <cerrno>
#include <cstdio>
#include <stdexcept>
#include <string>

extern "C" __declspec(dllimport) void SampleTrace(int level, const wchar_t* text);

namespace
{

std::wstring Widen(const std::string& text)
{
    return std::wstring(text.begin(), text.end());
}

void Report(const std::string& step, const std::string& result)
{
    std::printf("%s:%s\n", step.c_str(), result.c_str());
    std::fflush(stdout);
}

void HostLine(char level, const std::wstring& text)
{
    if (level == 't')
        KELVRA_TRC(L"host %s", text.c_str());
    else if (level == 'i')
        KELVRA_INF(L"host %s", text.c_str());
    else
        KELVRA_ERR(L"host %s", text.c_str());
}

void Start(const std::string& arguments)
{
    // <name>:<append>:<perProcess>
    const size_t second = arguments.rfind(':', arguments.size() - 3);
    const std::wstring name = Widen(arguments.substr(0, second));
    const bool append = arguments[second + 1] == '1';
    const bool perProcess = arguments[second + 3] == '1';
    try
    {
        Debug::start(name, append, perProcess);
        Report("start", "ok");
    }
    catch (const std::exception& error)
    {
        Report("start", error.what());
    }
}

HANDLE OpenNamedEvent(const std::string& name)
{
    return ::OpenEventW(EVENT_MODIFY_STATE | SYNCHRONIZE, FALSE, Widen(name).c_str());
}

bool RunStep(const std::string& step)
{
    const size_t colon = step.find(':');
    const std::string verb = step.substr(0, colon);
    const std::string argument = colon == std::string::npos ? std::string() : step.substr(colon + 1);
    const std::wstring text = Widen(argument);
    if (verb == "start")
        Start(argument);
    else if (verb == "stop")
        Debug::stop();
    else if (verb == "configure")
        Debug::configure();
    else if (verb == "trc" || verb == "inf" || verb == "err")
        HostLine(verb[0], text);
    else if (verb == "sample-trc")
        SampleTrace(0, text.c_str());
    else if (verb == "sample-inf")
        SampleTrace(1, text.c_str());
    else if (verb == "sample-err")
        SampleTrace(3, text.c_str());
    else if (verb == "format")
        KELVRA_INF(L"wide %s narrow %hs number %d", L"w\u00e9", "n", -42);
    else if (verb == "lasterror")
    {
        ::SetLastError(42);
        errno = 33;
        KELVRA_ERR(L"between setting and reading the error codes");
        const DWORD lastError = ::GetLastError();
        Report("lasterror", std::to_string(lastError) + " errno " + std::to_string(errno));
    }
    else if (verb == "session")
        Report("session", CLog::_log != nullptr ? "open" : "closed");
    else if (verb == "open")
    {
        const std::wstring path = L"c:\\keltrace\\" + text;
        FILE* file = ::_wfsopen(path.c_str(), L"a", _SH_DENYNO);
        Report("open", file != nullptr ? "ok" : "failed");
        if (file != nullptr)
            std::fclose(file);
    }
    else if (verb == "config")
    {
        FILE* file = ::_wfopen(L"c:\\keltrace\\debug", L"wb");
        if (file == nullptr)
            return false;
        std::fwrite(argument.data(), 1, argument.size(), file);
        std::fclose(file);
    }
    else if (verb == "signal" || verb == "wait")
    {
        HANDLE event = OpenNamedEvent(argument);
        if (event == nullptr)
            return false;
        const bool done = verb == "signal" ? ::SetEvent(event) != FALSE
                                           : ::WaitForSingleObject(event, 60000) == WAIT_OBJECT_0;
        ::CloseHandle(event);
        return done;
    }
    else
        return false;
    return true;
}

} // namespace

int main(int argc, char** argv)
{
    for (int i = 1; i < argc; ++i)
    {
        if (!RunStep(argv[i]))
        {
            Report("failed", argv[i]);
            return 2;
        }
    }
    return 0;
}
