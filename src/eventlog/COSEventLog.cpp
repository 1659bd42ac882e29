#include "KelvraEventLog.h"

#include "common/UniqueHandle.h"
#include "eventlog/EventMessage.h"

#include <cerrno>
#include <cstdio>
#include <cwchar>
#include <string>

namespace Kelvra
{

bool FormatEventMessage(wchar_t (&message)[kEventMessageCapacity], const wchar_t* format, va_list args)
{
    message[0] = L'\0';
    if (format == nullptr)
        return false;
    errno = 0;
    // -1 also reports a message cut to fit; only EINVAL says that the format was rejected.
    if (_vsnwprintf_s(message, kEventMessageCapacity, _TRUNCATE, format, args) < 0 && errno == EINVAL)
    {
        message[0] = L'\0';
        return false;
    }
    // Wine's runtime leaves the buffer unterminated after a %c field wider than the buffer.
    message[kEventMessageCapacity - 1] = L'\0';
    return true;
}

} // namespace Kelvra

namespace
{

const wchar_t kSourceName[] = L"KelvraSDK";
const unsigned long kCategoryCount = 3;
const DWORD kTypesSupported = EVENTLOG_ERROR_TYPE | EVENTLOG_WARNING_TYPE | EVENTLOG_INFORMATION_TYPE;

// A source name is one key below the Application log's own: empty, it would name that key
// itself, and a backslash would reach into another key.
bool IsSourceName(const wchar_t* name)
{
    return name != nullptr && name[0] != L'\0' && std::wcschr(name, L'\\') == nullptr;
}

std::wstring SourceKeyPath(const wchar_t* name)
{
    return std::wstring(L"SYSTEM\\CurrentControlSet\\Services\\EventLog\\Application\\") + name;
}

// The executable's full path, however long: a cut path would register a file that does not exist.
std::wstring ExecutablePath()
{
    std::wstring path(MAX_PATH, L'\0');
    for (;;)
    {
        const DWORD length = ::GetModuleFileNameW(nullptr, &path[0], static_cast<DWORD>(path.size()));
        if (length == 0)
            return std::wstring();
        if (length < path.size())
        {
            path.resize(length);
            return path;
        }
        if (path.size() >= 32768)
            return std::wstring();
        path.resize(path.size() * 2);
    }
}

LONG SetExpandString(HKEY key, const wchar_t* value, const std::wstring& text)
{
    return ::RegSetValueExW(key, value, 0, REG_EXPAND_SZ, reinterpret_cast<const BYTE*>(text.c_str()),
                            static_cast<DWORD>((text.size() + 1) * sizeof(wchar_t)));
}

LONG SetDword(HKEY key, const wchar_t* value, DWORD data)
{
    return ::RegSetValueExW(key, value, 0, REG_DWORD, reinterpret_cast<const BYTE*>(&data), sizeof(data));
}

} // namespace

COSEventLog::COSEventLog() : m_source(nullptr)
{
    InitializeEventLog();
}

COSEventLog::~COSEventLog()
{
    UnInitializeEventLog();
}

bool COSEventLog::InitializeEventLog()
{
    AddEventSource(kSourceName, kCategoryCount);
    UnInitializeEventLog();
    m_source = ::RegisterEventSourceW(nullptr, kSourceName);
    return true;
}

bool COSEventLog::UnInitializeEventLog()
{
    if (m_source != nullptr)
    {
        ::DeregisterEventSource(static_cast<HANDLE>(m_source));
        m_source = nullptr;
    }
    return true;
}

unsigned long COSEventLog::AddEventSource(const wchar_t* name, unsigned long categoryCount)
{
    if (!IsSourceName(name))
        return ERROR_INVALID_PARAMETER;
    Kelvra::UniqueRegKey key;
    LONG status = ::RegCreateKeyW(HKEY_LOCAL_MACHINE, SourceKeyPath(name).c_str(), key.put());
    if (status != ERROR_SUCCESS)
        return static_cast<unsigned long>(status);
    const std::wstring executable = ExecutablePath();
    if (executable.empty())
        return ::GetLastError();
    status = SetExpandString(key.get(), L"EventMessageFile", executable);
    if (status == ERROR_SUCCESS)
        status = SetDword(key.get(), L"TypesSupported", kTypesSupported);
    if (status == ERROR_SUCCESS && categoryCount > 0)
    {
        status = SetExpandString(key.get(), L"CategoryMessageFile", executable);
        if (status == ERROR_SUCCESS)
            status = SetDword(key.get(), L"CategoryCount", categoryCount);
    }
    return static_cast<unsigned long>(status);
}

unsigned long COSEventLog::RemoveEventSource(const wchar_t* name)
{
    if (!IsSourceName(name))
        return ERROR_INVALID_PARAMETER;
    return static_cast<unsigned long>(::RegDeleteKeyW(HKEY_LOCAL_MACHINE, SourceKeyPath(name).c_str()));
}

bool COSEventLog::Log(unsigned short type, unsigned short category, unsigned long eventId, const wchar_t* format, ...)
{
    if (m_source == nullptr)
        return false;
    wchar_t message[Kelvra::kEventMessageCapacity];
    va_list args;
    va_start(args, format);
    const bool formatted = Kelvra::FormatEventMessage(message, format, args);
    va_end(args);
    if (!formatted)
        return false;
    void* sid = nullptr;
    GetUserSID(&sid);
    const Kelvra::UniqueLocalMemory sidOwner(sid);
    const wchar_t* strings[] = {message};
    return ::ReportEventW(static_cast<HANDLE>(m_source), type, category, eventId, sid, 1, 0, strings, nullptr) != FALSE;
}

void* COSEventLog::GetUserSID(void** sid)
{
    if (sid == nullptr)
        return nullptr;
    *sid = nullptr;
    wchar_t user[260];
    DWORD userLength = sizeof(user) / sizeof(user[0]);
    if (!::GetUserNameW(user, &userLength))
        return nullptr;

    // Both buffers come from LocalAlloc, so that a shortage of memory gives null, not an
    // exception out of Log.
    DWORD sidSize = 260;
    DWORD domainLength = 260;
    Kelvra::UniqueLocalMemory buffer(::LocalAlloc(LMEM_FIXED, sidSize));
    Kelvra::UniqueLocalMemory domain(::LocalAlloc(LMEM_FIXED, domainLength * sizeof(wchar_t)));
    SID_NAME_USE use;
    for (;;)
    {
        if (!buffer || !domain)
            return nullptr;
        DWORD reportedSid = sidSize;
        DWORD reportedDomain = domainLength;
        if (::LookupAccountNameW(nullptr, user, buffer.get(), &reportedSid,
                                 static_cast<wchar_t*>(domain.get()), &reportedDomain, &use))
            break;
        if (::GetLastError() != ERROR_INSUFFICIENT_BUFFER)
            return nullptr;
        // Either buffer may be the short one; retry only while one of them grows, so that a
        // lookup that keeps failing cannot loop for ever.
        const bool sidGrows = reportedSid > sidSize;
        const bool domainGrows = reportedDomain > domainLength;
        if (!sidGrows && !domainGrows)
            return nullptr;
        if (sidGrows)
        {
            sidSize = reportedSid;
            buffer.reset(::LocalAlloc(LMEM_FIXED, sidSize));
        }
        if (domainGrows)
        {
            domainLength = reportedDomain;
            domain.reset(::LocalAlloc(LMEM_FIXED, domainLength * sizeof(wchar_t)));
        }
    }
    if (!::IsValidSid(buffer.get()))
        return nullptr;
    *sid = buffer.release();
    return *sid;
}
