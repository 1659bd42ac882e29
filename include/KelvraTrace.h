// Diagnostic trace shared by every module of a process: one log file, one level, one module
// filter, one lock, all living in KelvraSDK.dll.
//
// A host switches tracing on in three steps:
//   1. the marker directory c:\keltrace exists (and takes new files);
//   2. optionally c:\keltrace\debug, the configuration file, names a level ("info"/"inf",
//      "warn"/"wrn"/"warning", "error"/"err"; the highest one wins) and module names, one a line
//      (any other line is a module name; once any name is listed only the listed modules trace);
//   3. the host calls Debug::start once. Without it every trace line is dropped.
// Modules then write lines with KELVRA_TRC / KELVRA_INF / KELVRA_ERR (below). The configuration
// is read once per process, at the first line emitted with the log file open.
#pragma once

#include "KelvraApi.h"

#include <cstdarg>
#include <cstddef>
#include <cstdio>
#include <stdexcept>
#include <string>
#include <type_traits>
#include <vector>

class KELVRA_API Debug
{
public:
    // Lowest level written: "[TRC]" lines need lvlDebug, "[INF]" at most lvlInfo, "[ERR]" any.
    enum Levels : int
    {
        lvlDebug = 0,
        lvlInfo = 1,
        lvlWarning = 2,
        lvlError = 3,
    };

    // Class of the exit-time clean-up object: when the library unloads it frees the module list
    // (telling the debugger output "TO ELIMINATE THE ABOVE FALSE MEMORY LEAKS PLEASE CALL
    // Debug::stop()" when the host never called stop) and closes the log file.
    class KELVRA_API Destructor
    {
    public:
        ~Destructor();
    };

    // Both do nothing: the class has static members only.
    Debug();
    Debug& operator=(const Debug& other);

    // Process-wide trace state. Read and change it under the trace lock (lock / unlock): a
    // host may set _lvl or _modules, or change the names in the list, and lines follow from
    // unlock on. Emitting threads also read _lvl, _modules and CLog::_log without the lock.
    // _lvl only rises (configuration); 0 at load.
    static Levels _lvl;
    // Lower-cased module names allowed to trace, in file order, duplicates kept; null or empty
    // means every module traces. Owned by Debug.
    static std::vector<std::wstring>* _modules;
    static Destructor _destructor;

    // Starts the process's log session: c:\keltrace\<name>.log, or with perProcess
    // c:\keltrace\<process>.<pid>.<name>.log (process name lower-cased, pid in decimal).
    // append keeps the old content and lets other processes write too; otherwise the file is
    // emptied and other processes may only read it while this one runs. A banner
    // "\n\n*****     NEW LOG SESSION [<Process>]     *****\n\n" opens the session (text mode:
    // each line feed is written as CR LF). Returns quietly, with no session, when no file can be
    // created in c:\keltrace. Once a session is open further calls keep its file and write no
    // banner. Throws std::runtime_error "Debug::setFile fopen failed" when the log file cannot
    // be opened, or when the process name cannot be found: "Failed to retrieve process path",
    // "Failed to find process file name", "Failed to find the dot extension in the process
    // file name", "Failed to find the process name". After a throw no session is open and no
    // file is left open.
    static void start(std::wstring name, bool append, bool perProcess);
    // Frees the module list: from then on every module traces at the configured level (module
    // names of a configuration read later are ignored, until a later start makes a new, empty
    // list). The log file stays open and the configuration is not read again. Stopping before
    // the library unloads avoids the exit notice on the debugger output.
    static void stop();
    // Take and release the trace lock (recursive, no time-out), for a host that wants several
    // lines together or changes the trace state. While a host holds it, lines of other threads
    // wait for it, dropped ones included. Pair them on the same thread.
    static void lock();
    static void unlock();

    // Reads c:\keltrace\debug once per process (later calls return at once); a missing file
    // means level 0 and no filter. Module names met while no list exists (configure called
    // before start) start the list, so the filter holds once the session opens; after stop they
    // are ignored. Throws only std::bad_alloc; the file is then read again at the next call.
    static void configure();
    // Module filter: true when no list exists, the list is empty, or it holds the name
    // (compared after lowering A-Z, nothing else: no trimming, no wildcards).
    static bool debugIt(const std::wstring& module);
    // Module name of a file path: the file name without directory and last extension, case
    // kept ("c:\\bin\\Sample.Net.dll" -> "Sample.Net"); "" for names of 256 characters or more.
    static std::wstring module(const std::wstring& path);
    // Local time stamp of trace lines, KelvraTime::Time::NowLocal(): "041220260905037".
    static std::wstring now();

    // The emission sequence behind the macros below; call the macros rather than these.
    // Under the trace lock, with a session open: reads the configuration once, checks the level
    // against threshold and the filter against the name of the module whose image starts at
    // moduleBase (a loaded image, or null for the executable), then appends
    // "<tag>[<now>][<file>:<line>] <message>\n" to the log file and flushes it. A line dropped
    // for want of a session, by the level, or by the filter's answer already known for its
    // module costs a few reads and no lock. message is formatted with Microsoft rules whatever
    // the caller's compiler settings: %s takes a wide string, %hs a narrow one, %d an int.
    // Characters the C runtime's current locale cannot write become '?'. Never throws, and
    // leaves the calling thread's last-error code and errno as they were. Null texts count as
    // empty.
    static void emit(const void* moduleBase, Levels threshold, const wchar_t* tag, const wchar_t* file,
                     int line, const wchar_t* message, ...) noexcept;
    static void emitV(const void* moduleBase, Levels threshold, const wchar_t* tag, const wchar_t* file,
                      int line, const wchar_t* message, va_list args) noexcept;

private:
    static bool config();
    static const wchar_t* dir();
    static const wchar_t* testFile();
    static const wchar_t* test();
    static bool log();
    static void setFile(const std::wstring& path, bool append);
    static std::wstring autoName(const std::wstring& name);
    static std::wstring fixedName(const std::wstring& name);
    static std::wstring exe();
    static std::wstring process();
};

class KELVRA_API CLog
{
public:
    // Both do nothing: the class has static members only.
    CLog();
    CLog& operator=(const CLog& other);

    // The open log file; null until a session starts, then open until the library unloads.
    static std::FILE* _log;
    // The trace lock: a HANDLE to an unnamed, process-local mutex created at load, never closed.
    static void* _mutex;
};

// Every module's own image base, so that a line is filtered by the name of the module (the
// executable or DLL) that holds the emitting code. The linker provides it with MSVC and MinGW.
struct _IMAGE_DOS_HEADER;
extern "C" struct _IMAGE_DOS_HEADER __ImageBase;

namespace KelvraTraceDetail
{

// Where the file name starts in a source path: after its last '\\' or '/'.
constexpr std::size_t FileNameOffset(const wchar_t* path)
{
    std::size_t offset = 0;
    for (std::size_t i = 0; path[i] != L'\0'; ++i)
    {
        if (path[i] == L'\\' || path[i] == L'/')
            offset = i + 1;
    }
    return offset;
}

} // namespace KelvraTraceDetail

// The emitting source file's name without its directory, worked out at compile time.
#define KELVRA_TRACE_FILE_                                                                                   \
    (L"" __FILE__ +                                                                                          \
     std::integral_constant<std::size_t, ::KelvraTraceDetail::FileNameOffset(L"" __FILE__)>::value)

#define KELVRA_TRACE_LINE_(threshold, tag, ...)                                                              \
    ::Debug::emit(&__ImageBase, threshold, tag, KELVRA_TRACE_FILE_, __LINE__, L"" __VA_ARGS__)

// KELVRA_TRC(message, ...), KELVRA_INF(message, ...), KELVRA_ERR(message, ...): one trace line
// "[TRC][<time>][<file>:<line>] <message>" tagged for the level of debug, information or error.
// message is a string literal (narrow or wide) with its own %s (wide string) and %d fields
// for the arguments that follow: KELVRA_INF(L"Connecting to %s:%d", host.c_str(), port).
#define KELVRA_TRC(...) KELVRA_TRACE_LINE_(::Debug::lvlDebug, L"[TRC]", __VA_ARGS__)
#define KELVRA_INF(...) KELVRA_TRACE_LINE_(::Debug::lvlInfo, L"[INF]", __VA_ARGS__)
#define KELVRA_ERR(...) KELVRA_TRACE_LINE_(::Debug::lvlError, L"[ERR]", __VA_ARGS__)
