#include "KelvraEventLog.h"
#include "eventlog/EventMessage.h"

#include <gtest/gtest.h>

#include <windows.h>

#include <map>
#include <string>

namespace
{

using Values = std::map<std::wstring, std::wstring>;

// A source's values as "<type>:<data>", strings with the terminator they were stored with.
Values ValuesOf(const std::wstring& source)
{
    Values values;
    const std::wstring key = L"SYSTEM\\CurrentControlSet\\Services\\EventLog\\Application\\" + source;
    for (const wchar_t* name :
         {L"EventMessageFile", L"TypesSupported", L"CategoryMessageFile", L"CategoryCount"})
    {
        wchar_t data[1024];
        DWORD type = 0, size = sizeof(data);
        if (::RegGetValueW(HKEY_LOCAL_MACHINE, key.c_str(), name, RRF_RT_ANY | RRF_NOEXPAND, &type, data,
                           &size) == 0)
            values[name] = std::to_wstring(type) + L':' +
                           (type == REG_DWORD ? std::to_wstring(data[0] | static_cast<DWORD>(data[1]) << 16)
                                              : std::wstring(data, size / sizeof(wchar_t)));
    }
    return values;
}

Values Registered(unsigned long categories)
{
    wchar_t path[MAX_PATH];
    const std::wstring program =
        L"2:" + std::wstring(path, ::GetModuleFileNameW(nullptr, path, MAX_PATH) + 1);
    Values values{{L"EventMessageFile", program}, {L"TypesSupported", L"4:7"}};
    if (categories > 0)
        values.insert(
            {{L"CategoryMessageFile", program}, {L"CategoryCount", L"4:" + std::to_wstring(categories)}});
    return values;
}

// The formatted message, or "(refused)" with the buffer emptied.
std::wstring Message(const wchar_t* format, ...)
{
    wchar_t buffer[Kelvra::kEventMessageCapacity];
    va_list args;
    va_start(args, format);
    const bool formatted = Kelvra::FormatEventMessage(buffer, format, args);
    va_end(args);
    return formatted ? buffer : (buffer[0] == L'\0' ? L"(refused)" : L"(refused but not emptied)");
}

// Every test leaves the registry as it found it.
class EventLog : public testing::Test
{
protected:
    void TearDown() override
    {
        for (const wchar_t* source : {L"KelvraSDK", L"KelvraTest.None", L"KelvraTest.Twelve", m_long.c_str()})
            m_log.RemoveEventSource(source);
    }

    COSEventLog m_log;
    // The key path passes 260 characters: a cut path would register another source.
    const std::wstring m_long = L"KelvraTest." + std::wstring(220, L'n');
};

} // namespace

TEST_F(EventLog, AddsSourcesWithCategoryValuesOnlyForCategoriesAndRemovesThem)
{
    EXPECT_EQ(ValuesOf(L"KelvraSDK"), Registered(3)); // by the constructor
    const std::pair<const wchar_t*, unsigned long> sources[] = {
        {L"KelvraTest.None", 0}, {L"KelvraTest.Twelve", 12}, {m_long.c_str(), 1}};
    for (const auto& [source, categories] : sources)
    {
        EXPECT_EQ(m_log.AddEventSource(source, categories), 0u);
        EXPECT_EQ(ValuesOf(source), Registered(categories)) << source;
        EXPECT_EQ(m_log.RemoveEventSource(source), 0u);
        EXPECT_EQ(ValuesOf(source), Values());
        EXPECT_EQ(m_log.RemoveEventSource(source), static_cast<unsigned long>(ERROR_FILE_NOT_FOUND));
    }
}

TEST_F(EventLog, NamesThatAreNoSourceKeyOfTheirOwnAreRefused)
{
    // An empty name would be the Application log's own key, a backslash would reach into another.
    for (const wchar_t* name : {static_cast<const wchar_t*>(nullptr), L"", L"KelvraTest.X\\sub", L"\\"})
    {
        EXPECT_EQ(m_log.AddEventSource(name, 3), static_cast<unsigned long>(ERROR_INVALID_PARAMETER));
        EXPECT_EQ(m_log.RemoveEventSource(name), static_cast<unsigned long>(ERROR_INVALID_PARAMETER));
    }
}

TEST(EventMessage, ExpandsArgumentsWithMicrosoftRulesCutTo4095Characters)
{
    EXPECT_EQ(Message(L"%s failed: %d (%hs)", L"backup", 5, "denied"), L"backup failed: 5 (denied)");
    EXPECT_EQ(Message(L""), L"");
    EXPECT_EQ(Message(nullptr), L"(refused)");
    const std::wstring text(5000, L'x');
    EXPECT_EQ(Message(L"%s", text.c_str()), text.substr(0, 4095));
    // Formatted within the buffer: the whole field would take gigabytes.
    EXPECT_EQ(Message(L"%1500000000d", 5), std::wstring(4095, L' '));
    EXPECT_EQ(Message(L"%-1500000000c", L'c'), L'c' + std::wstring(4094, L' '));
}
