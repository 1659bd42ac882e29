#include "eventlog/EventMessage.h"

#include <gtest/gtest.h>

#include <string>

namespace
{

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

} // namespace

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
