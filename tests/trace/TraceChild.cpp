// TraceChild.exe: a host program the trace tests start in a fresh process (the trace state is
// process-wide), built with a host's default compiler settings. Each argument is one step, run
// in order; steps that have a result report one line "<step>:<result>" on standard output.
//   out:<file>                                   standard output goes to this file (the first step)
//   start:<name>:<append 0|1>:<perProcess 0|1>   Debug::start, prints "ok" or the exception text
//   race:<name>                                  start:<name>:1:0 while another thread emits lines
//                                                "host race <n>", n from 0; prints how many
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

#include <atomic>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <stdexcept>
#include <string>
#include <thread>

extern "C" __declspec(dllimport) void SampleTrace(char level, const wchar_t* text);

namespace
{

void Report(const std::string& step, const std::string& result)
{
    std::printf("%s:%s\n", step.c_str(), result.c_str());
    std::fflush(stdout);
}

void Start(const std::string& arguments)
{
    char name[64] = "";
    int append = 0, perProcess = 0;
    std::sscanf(arguments.c_str(), "%63[^:]:%d:%d", name, &append, &perProcess);
    try
    {
        Debug::start(std::wstring(name, name + std::strlen(name)), append != 0, perProcess != 0);
        Report("start", "ok");
    }
    catch (const std::exception& error)
    {
        Report("start", error.what());
    }
}

void StartWhileAnotherThreadTraces(const std::string& name)
{
    std::atomic<int> emitted(0);
    std::atomic<bool> started(false);
    std::thread emitter(
        [&]
        {
            // Goes on for 100 lines emitted once start returned, so that the lines cross it.
            for (int after = 0; after < 100;)
            {
                const bool open = started;
                KELVRA_TRC(L"host race %d", emitted++);
                after += open ? 1 : 0;
            }
        });
    while (emitted == 0)
        ::Sleep(0);
    Start(name + ":1:0");
    started = true;
    emitter.join();
    Report("race", std::to_string(emitted));
}

bool RunStep(const std::string& step)
{
    const size_t colon = step.find(':');
    const std::string verb = step.substr(0, colon);
    const std::string argument = colon == std::string::npos ? std::string() : step.substr(colon + 1);
    const std::wstring text(argument.begin(), argument.end());
    if (verb == "out")
        return ::_wfreopen(text.c_str(), L"w", stdout) != nullptr;
    else if (verb == "start")
        Start(argument);
    else if (verb == "race")
        StartWhileAnotherThreadTraces(argument);
    else if (verb == "stop")
        Debug::stop();
    else if (verb == "configure")
        Debug::configure();
    else if (verb == "trc")
        KELVRA_TRC(L"host %s", text.c_str());
    else if (verb == "inf")
        KELVRA_INF(L"host %s", text.c_str());
    else if (verb == "err")
        KELVRA_ERR(L"host %s", text.c_str());
    else if (verb == "sample-trc" || verb == "sample-inf" || verb == "sample-err")
        SampleTrace(verb[7], text.c_str());
    else if (verb == "format")
        KELVRA_INF(L"wide %s narrow %hs number %d", L"w\u00e9\u4e2d", "n", -42);
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
        FILE* file = ::_wfsopen((L"c:\\keltrace\\" + text).c_str(), L"a", _SH_DENYNO);
        Report("open", file != nullptr ? "ok" : "failed");
        if (file != nullptr)
            std::fclose(file);
    }
    else if (verb == "config")
    {
        FILE* file = ::_wfopen(L"c:\\keltrace\\debug", L"wb");
        if (file == nullptr)
            return false;
        std::fputs(argument.c_str(), file);
        std::fclose(file);
    }
    else if (verb == "signal" || verb == "wait")
    {
        const HANDLE event = ::OpenEventW(EVENT_MODIFY_STATE | SYNCHRONIZE, FALSE, text.c_str());
        const bool done =
            event != nullptr && (verb == "signal" ? ::SetEvent(event) != FALSE
                                                  : ::WaitForSingleObject(event, 60000) == WAIT_OBJECT_0);
        if (event != nullptr)
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
