#include "KelvraTrace.h"

#include "KelvraStrings.h"

#include "common/UniqueHandle.h"
#include "trace/ModuleFilterCache.h"
#include "trace/SharedField.h"
#include "trace/TraceConfig.h"
#include "trace/TraceLine.h"
#include "trace/TraceNames.h"

#include <windows.h>

#include <process.h>
#include <share.h>

#include <atomic>
#include <cerrno>
#include <mutex>
#include <stdexcept>

using KelvraStrings::Strings;
using KelvraTrace::LoadAcquire;
using KelvraTrace::ModuleFilterCache;
using KelvraTrace::StoreRelease;

Debug::Levels Debug::_lvl = Debug::lvlDebug;
std::vector<std::wstring>* Debug::_modules = nullptr;
Debug::Destructor Debug::_destructor;

namespace
{

// Both read and written under the trace lock only.
bool configured = false; // Debug::configure has read the file (or is reading it)
bool stopped = false;    // Debug::stop has run: names read later start no new list

// Constant-initialised, so that lines emitted while the library's statics are being built find it.
ModuleFilterCache filterAnswers;
// Debug::lock calls not yet matched by Debug::unlock. While a host holds the trace lock it may be
// changing the state, so every line waits for the lock as it always did.
std::atomic<int> hostLocks{0};

// Whoever changed the list or the level under the trace lock (this library, or a host between
// Debug::lock and Debug::unlock) makes the module filter's answers follow before letting go.
void ReleaseTraceLock()
{
    filterAnswers.Sync(Debug::_modules, Debug::_lvl);
    ::ReleaseMutex(CLog::_mutex);
}

// Holds the trace lock for one scope. A wait that fails (no mutex) goes on unlocked rather than
// losing the caller's line; an abandoned mutex is ours all the same.
class TraceLock
{
public:
    TraceLock() noexcept : m_held(::WaitForSingleObject(CLog::_mutex, INFINITE) != WAIT_FAILED) {}
    ~TraceLock()
    {
        if (m_held)
            ReleaseTraceLock();
    }
    TraceLock(const TraceLock&) = delete;
    TraceLock& operator=(const TraceLock&) = delete;

private:
    bool m_held;
};

// The whole file, or false when it cannot be opened.
bool ReadWholeFile(const std::wstring& path, std::string& content)
{
    Kelvra::UniqueFile file(::_wfsopen(path.c_str(), L"rb", _SH_DENYNO));
    if (!file)
        return false;
    char buffer[4096];
    size_t got;
    while ((got = std::fread(buffer, 1, sizeof(buffer), file.get())) > 0)
        content.append(buffer, got);
    return true;
}

void WriteText(std::FILE* file, const std::wstring& text)
{
    const std::string bytes = KelvraTrace::ToLogText(text);
    std::fseek(file, 0, SEEK_END);
    std::fwrite(bytes.data(), 1, bytes.size(), file);
    std::fflush(file);
}

// What the state already decides, read without the trace lock: no session, a level above the
// line's, or the module filter's known answer for the caller.
bool IsDroppedBeforeLock(const KelvraTrace::ModuleKey& caller, Debug::Levels threshold) noexcept
{
    if (hostLocks.load(std::memory_order_acquire) != 0)
        return false;
    if (LoadAcquire(CLog::_log) == nullptr)
        return true;
    const Debug::Levels level = LoadAcquire(Debug::_lvl);
    return level > threshold || filterAnswers.Find(caller, LoadAcquire(Debug::_modules), level) ==
                                    ModuleFilterCache::Answer::Dropped;
}

// The module filter for the module whose image starts at moduleBase, asked of the platform once
// per module and filter state.
bool IsTracedUnderLock(const void* moduleBase, const KelvraTrace::ModuleKey& caller)
{
    filterAnswers.Sync(Debug::_modules, Debug::_lvl);
    const ModuleFilterCache::Answer known = filterAnswers.Find(caller, Debug::_modules, Debug::_lvl);
    if (known != ModuleFilterCache::Answer::Unknown)
        return known == ModuleFilterCache::Answer::Traced;
    const HMODULE module = static_cast<HMODULE>(const_cast<void*>(moduleBase));
    const bool traced =
        KelvraTrace::IsModuleTraced(Debug::_modules, Debug::module(KelvraTrace::ModuleFilePath(module)));
    filterAnswers.Store(caller, traced);
    return traced;
}

} // namespace

Debug::Debug() = default;

Debug& Debug::operator=(const Debug&)
{
    return *this;
}

Debug::Destructor::~Destructor()
{
    // The library is going away: no lock, nobody else runs its code any more.
    if (Debug::_modules != nullptr)
    {
        ::OutputDebugStringW(L"TO ELIMINATE THE ABOVE FALSE MEMORY LEAKS PLEASE CALL Debug::stop()\n");
        delete Debug::_modules;
        Debug::_modules = nullptr;
    }
    if (CLog::_log != nullptr)
    {
        std::fclose(CLog::_log);
        CLog::_log = nullptr;
    }
}

const wchar_t* Debug::dir()
{
    return L"c:\\keltrace";
}

const wchar_t* Debug::testFile()
{
    return L"c:\\keltrace\\test";
}

const wchar_t* Debug::test()
{
    static const wchar_t* const path = testFile();
    return path;
}

void Debug::configure()
{
    TraceLock lock;
    if (configured)
        return;
    configured = true;
    try
    {
        config();
    }
    catch (...)
    {
        configured = false;
        throw;
    }
}

bool Debug::config()
{
    std::string content;
    if (!ReadWholeFile(Strings::Format(L"%s\\%s", dir(), L"debug"), content))
        return true;
    const KelvraTrace::TraceConfig read = KelvraTrace::ParseTraceConfig(content);
    if (read.level > _lvl)
        StoreRelease(_lvl, static_cast<Levels>(read.level));
    if (read.modules.empty())
        return true;
    // Without a list the names would be lost for the life of the process (the file is read
    // once), unless stop asked for every module to trace.
    if (_modules == nullptr && !stopped)
        StoreRelease(_modules, new std::vector<std::wstring>());
    if (_modules != nullptr)
        _modules->insert(_modules->end(), read.modules.begin(), read.modules.end());
    return true;
}

bool Debug::debugIt(const std::wstring& module)
{
    TraceLock lock;
    return KelvraTrace::IsModuleTraced(_modules, module);
}

std::wstring Debug::module(const std::wstring& path)
{
    return KelvraTrace::ModuleNameFromPath(path);
}

std::wstring Debug::now()
{
    return KelvraTime::Time::NowLocal();
}

void Debug::emit(const void* moduleBase, Levels threshold, const wchar_t* tag, const wchar_t* file, int line,
                 const wchar_t* message, ...) noexcept
{
    va_list args;
    va_start(args, message);
    emitV(moduleBase, threshold, tag, file, line, message, args);
    va_end(args);
}

void Debug::emitV(const void* moduleBase, Levels threshold, const wchar_t* tag, const wchar_t* file, int line,
                  const wchar_t* message, va_list args) noexcept
{
    // Most lines are dropped, at the cost of a few reads that leave the error codes alone. A line
    // racing a change of state may go either way.
    const KelvraTrace::ModuleKey caller = KelvraTrace::KeyOfModule(moduleBase);
    if (IsDroppedBeforeLock(caller, threshold))
        return;

    // Callers trace on their failure paths before reading the error codes.
    const DWORD lastError = ::GetLastError();
    const int lastErrno = errno;
    {
        TraceLock lock;
        try
        {
            if (CLog::_log != nullptr)
            {
                // Checked here first so that a line costs no second trip through the lock.
                if (!configured)
                    configure();
                if (_lvl <= threshold && IsTracedUnderLock(moduleBase, caller))
                    WriteText(CLog::_log, KelvraTrace::BuildTraceLine(tag, now(), file, line, message, args));
            }
        }
        catch (...)
        {
            // Out of memory: the line is lost, the caller goes on.
        }
    }
    errno = lastErrno;
    ::SetLastError(lastError);
}

void Debug::start(std::wstring name, bool append, bool perProcess)
{
    if (!log())
        return;
    const std::wstring fileName = perProcess ? autoName(name) : fixedName(name);
    setFile(Strings::Format(L"%s\\%s", dir(), fileName.c_str()), append);
}

void Debug::stop()
{
    TraceLock lock;
    stopped = true;
    delete _modules;
    StoreRelease(_modules, static_cast<std::vector<std::wstring>*>(nullptr));
}

void Debug::lock()
{
    ::WaitForSingleObject(CLog::_mutex, INFINITE);
    hostLocks.fetch_add(1);
}

void Debug::unlock()
{
    hostLocks.fetch_sub(1);
    ReleaseTraceLock();
}

bool Debug::log()
{
    bool created;
    {
        const Kelvra::UniqueFile probe(::_wfsopen(test(), L"w", _SH_DENYNO));
        created = static_cast<bool>(probe);
    }
    ::_wremove(test());
    return created;
}

void Debug::setFile(const std::wstring& path, bool append)
{
    TraceLock lock;
    if (_modules == nullptr)
        StoreRelease(_modules, new std::vector<std::wstring>());
    if (CLog::_log != nullptr)
        return;
    // Appending writers share the file; a session that empties it keeps other writers out.
    Kelvra::UniqueFile file(::_wfsopen(path.c_str(), append ? L"a" : L"w", append ? _SH_DENYNO : _SH_DENYWR));
    if (!file)
        throw std::runtime_error("Debug::setFile fopen failed");
    // A process-name failure throws from here and closes the file on the way out.
    WriteText(file.get(),
              Strings::Format(L"\n\n*****     NEW LOG SESSION [%s]     *****\n\n", process().c_str()));
    StoreRelease(CLog::_log, file.release());
}

std::wstring Debug::autoName(const std::wstring& name)
{
    std::wstring processName = process();
    Strings::ToLower(processName);
    return Strings::Format(L"%s.%d.%s.log", processName.c_str(), ::_getpid(), name.c_str());
}

std::wstring Debug::fixedName(const std::wstring& name)
{
    return Strings::Format(L"%s.log", name.c_str());
}

std::wstring Debug::exe()
{
    const std::wstring path = KelvraTrace::ModuleFilePath(nullptr);
    if (path.empty())
        throw std::runtime_error("Failed to retrieve process path");
    return KelvraTrace::ProcessNameFromPath(path);
}

std::wstring Debug::process()
{
    // Worked out once; a failure stores nothing, so the next call tries again.
    static std::mutex guard;
    static std::wstring name;
    const std::lock_guard<std::mutex> hold(guard);
    if (name.empty())
        name = exe();
    return name;
}
