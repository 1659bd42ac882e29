#include "KelvraEventLog.h"

#include "common/UniqueHandle.h"

#include <gtest/gtest.h>

#include <sddl.h>

#include <atomic>
#include <cstdint>
#include <cstdlib>
#include <new>
#include <string>

namespace
{
// While a test lowers it, larger requests to operator new fail.
std::atomic<std::size_t> g_allocationLimit{SIZE_MAX};
} // namespace

void* operator new(std::size_t size)
{
    void* block = size <= g_allocationLimit.load() ? std::malloc(size == 0 ? 1 : size) : nullptr;
    if (block == nullptr)
        throw std::bad_alloc();
    return block;
}

void operator delete(void* block) noexcept
{
    std::free(block);
}

void operator delete(void* block, std::size_t) noexcept
{
    std::free(block);
}

namespace
{

const wchar_t kApplicationLog[] = L"SYSTEM\\CurrentControlSet\\Services\\EventLog\\Application\\";

std::wstring KeyPath(const std::wstring& source)
{
    return kApplicationLog + source;
}

bool KeyExists(const std::wstring& source)
{
    Kelvra::UniqueRegKey key;
    return ::RegOpenKeyExW(HKEY_LOCAL_MACHINE, KeyPath(source).c_str(), 0, KEY_READ, key.put()) == ERROR_SUCCESS;
}

struct RegistryValue
{
    LONG status = ERROR_FILE_NOT_FOUND;
    DWORD type = 0;
    std::wstring text;
    DWORD number = 0;
    DWORD size = 0;
};

RegistryValue ReadValue(const std::wstring& source, const wchar_t* name)
{
    RegistryValue value;
    Kelvra::UniqueRegKey key;
    value.status = ::RegOpenKeyExW(HKEY_LOCAL_MACHINE, KeyPath(source).c_str(), 0, KEY_READ, key.put());
    if (value.status != ERROR_SUCCESS)
        return value;
    BYTE data[4096] = {};
    value.size = sizeof(data);
    value.status = ::RegQueryValueExW(key.get(), name, nullptr, &value.type, data, &value.size);
    if (value.status == ERROR_SUCCESS && value.type == REG_DWORD)
        value.number = *reinterpret_cast<DWORD*>(data);
    else if (value.status == ERROR_SUCCESS)
        value.text = reinterpret_cast<const wchar_t*>(data);
    return value;
}

std::wstring ThisProgram()
{
    wchar_t path[MAX_PATH];
    return std::wstring(path, ::GetModuleFileNameW(nullptr, path, MAX_PATH));
}

// Exposes the protected look-up of the user's security identifier.
class InspectableEventLog : public COSEventLog
{
public:
    using COSEventLog::GetUserSID;
};

// Every test leaves the registry as it found it.
class EventLog : public testing::Test
{
protected:
    void TearDown() override
    {
        COSEventLog cleaner;
        cleaner.RemoveEventSource(L"KelvraSDK");
        for (const std::wstring& source : m_created)
            cleaner.RemoveEventSource(source.c_str());
    }
    const wchar_t* Created(const std::wstring& source)
    {
        m_created.push_back(source);
        return m_created.back().c_str();
    }

private:
    std::vector<std::wstring> m_created;
};

} // namespace

TEST_F(EventLog, ConstructionRegistersTheSourceWithThreeCategories)
{
    COSEventLog log;
    const std::wstring program = ThisProgram();
    const RegistryValue message = ReadValue(L"KelvraSDK", L"EventMessageFile");
    ASSERT_EQ(message.status, ERROR_SUCCESS);
    EXPECT_EQ(message.type, static_cast<DWORD>(REG_EXPAND_SZ));
    EXPECT_EQ(message.text, program);
    EXPECT_EQ(message.size, (program.size() + 1) * sizeof(wchar_t)); // terminator included
    const RegistryValue types = ReadValue(L"KelvraSDK", L"TypesSupported");
    EXPECT_EQ(types.type, static_cast<DWORD>(REG_DWORD));
    EXPECT_EQ(types.number, 7u);
    const RegistryValue categoryFile = ReadValue(L"KelvraSDK", L"CategoryMessageFile");
    EXPECT_EQ(categoryFile.type, static_cast<DWORD>(REG_EXPAND_SZ));
    EXPECT_EQ(categoryFile.text, program);
    const RegistryValue count = ReadValue(L"KelvraSDK", L"CategoryCount");
    EXPECT_EQ(count.type, static_cast<DWORD>(REG_DWORD));
    EXPECT_EQ(count.number, 3u);
}

TEST_F(EventLog, AddEventSourceWritesCategoryValuesOnlyForCategories)
{
    COSEventLog log;
    const wchar_t* none = Created(L"KelvraTest.NoCategories");
    EXPECT_EQ(log.AddEventSource(none, 0), 0u);
    EXPECT_EQ(ReadValue(none, L"EventMessageFile").text, ThisProgram());
    EXPECT_EQ(ReadValue(none, L"TypesSupported").number, 7u);
    EXPECT_EQ(ReadValue(none, L"CategoryMessageFile").status, ERROR_FILE_NOT_FOUND);
    EXPECT_EQ(ReadValue(none, L"CategoryCount").status, ERROR_FILE_NOT_FOUND);

    const wchar_t* twelve = Created(L"KelvraTest.Twelve");
    EXPECT_EQ(log.AddEventSource(twelve, 12), 0u);
    EXPECT_EQ(ReadValue(twelve, L"CategoryCount").number, 12u);
}

TEST_F(EventLog, LongSourceNamesAreRegisteredWhole)
{
    // The key path passes 260 characters: a cut path would register another source.
    COSEventLog log;
    const std::wstring name = L"KelvraTest." + std::wstring(220, L'n');
    const wchar_t* source = Created(name);
    EXPECT_EQ(log.AddEventSource(source, 1), 0u);
    EXPECT_EQ(ReadValue(name, L"CategoryCount").number, 1u);
    EXPECT_FALSE(KeyExists(name.substr(0, 260 - (sizeof(kApplicationLog) / sizeof(wchar_t) - 1) - 1)));
}

TEST_F(EventLog, RemoveEventSourceDeletesTheKeyAndReportsMissingOnes)
{
    COSEventLog log;
    const wchar_t* source = Created(L"KelvraTest.Removed");
    ASSERT_EQ(log.AddEventSource(source, 0), 0u);
    ASSERT_TRUE(KeyExists(source));
    EXPECT_EQ(log.RemoveEventSource(source), 0u);
    EXPECT_FALSE(KeyExists(source));
    EXPECT_EQ(log.RemoveEventSource(source), static_cast<unsigned long>(ERROR_FILE_NOT_FOUND));
    EXPECT_EQ(log.RemoveEventSource(L"KelvraTest.NeverRegistered"), static_cast<unsigned long>(ERROR_FILE_NOT_FOUND));
}

TEST_F(EventLog, NamesThatAreNoSourceKeyOfTheirOwnAreRefused)
{
    // An empty name would be the Application log's own key, a backslash would reach into another.
    COSEventLog log;
    for (const wchar_t* name : {static_cast<const wchar_t*>(nullptr), L"", L"KelvraTest.X\\sub", L"\\"})
    {
        SCOPED_TRACE(name == nullptr ? L"(null)" : name);
        EXPECT_EQ(log.AddEventSource(name, 3), static_cast<unsigned long>(ERROR_INVALID_PARAMETER));
        EXPECT_EQ(log.RemoveEventSource(name), static_cast<unsigned long>(ERROR_INVALID_PARAMETER));
    }
    EXPECT_TRUE(KeyExists(L""));
    EXPECT_EQ(ReadValue(L"", L"EventMessageFile").status, ERROR_FILE_NOT_FOUND);
    EXPECT_FALSE(KeyExists(L"KelvraTest.X"));
}

TEST_F(EventLog, LogNeedsAnOpenSource)
{
    COSEventLog log;
    EXPECT_TRUE(log.Log(EVENTLOG_INFORMATION_TYPE, 1, 100, L"open %d", 1));
    EXPECT_TRUE(log.UnInitializeEventLog());
    EXPECT_FALSE(log.Log(EVENTLOG_INFORMATION_TYPE, 1, 100, L"closed %d", 2));
    EXPECT_TRUE(log.UnInitializeEventLog()); // closing twice is harmless
    EXPECT_TRUE(log.InitializeEventLog());
    EXPECT_TRUE(log.Log(EVENTLOG_INFORMATION_TYPE, 1, 100, L"reopened %d", 3));
    EXPECT_TRUE(log.InitializeEventLog()); // opening twice keeps one source
    EXPECT_TRUE(log.Log(EVENTLOG_INFORMATION_TYPE, 1, 100, L"still open %d", 4));
}

TEST_F(EventLog, LogRefusesANullFormat)
{
    COSEventLog log;
    EXPECT_FALSE(log.Log(EVENTLOG_ERROR_TYPE, 1, 100, nullptr));
}

TEST_F(EventLog, LogFormatsWithinItsBufferAndNeverThrows)
{
    COSEventLog log;
    g_allocationLimit = 64 * 1024;
    bool logged = false;
    EXPECT_NO_THROW(logged = log.Log(EVENTLOG_WARNING_TYPE, 1, 100, L"%1500000000d", 5));
    g_allocationLimit = SIZE_MAX;
    EXPECT_TRUE(logged);
}

TEST_F(EventLog, UserSidIsValidAndOwnedByTheCaller)
{
    InspectableEventLog log;
    void* sid = reinterpret_cast<void*>(1);
    void* returned = log.GetUserSID(&sid);
    ASSERT_NE(returned, nullptr);
    EXPECT_EQ(returned, sid);
    EXPECT_TRUE(::IsValidSid(sid));
    wchar_t* text = nullptr;
    ASSERT_TRUE(::ConvertSidToStringSidW(sid, &text));
    EXPECT_EQ(std::wstring(text).substr(0, 4), L"S-1-");
    ::LocalFree(text);
    EXPECT_EQ(::LocalFree(sid), nullptr); // the buffer is the caller's, released with LocalFree
    EXPECT_EQ(log.GetUserSID(nullptr), nullptr);
}
