#include "eventlog/EventMessage.h"

#include <gtest/gtest.h>

#include <string>

namespace
{

bool Format(std::wstring& message, const wchar_t* format, ...)
{
    wchar_t buffer[Kelvra::kEventMessageCapacity];
    va_list args;
    va_start(args, format);
    const bool formatted = Kelvra::FormatEventMessage(buffer, format, args);
    va_end(args);
    message = buffer;
    return formatted;
}

} // namespace

TEST(EventMessage, ExpandsArgumentsWithMicrosoftRules)
{
    std::wstring message;
    ASSERT_TRUE(Format(message, L"%s failed: %d (%hs)", L"backup", 5, "access denied"));
    EXPECT_EQ(message, L"backup failed: 5 (access denied)");
}

TEST(EventMessage, LongMessagesAreCutTo4095Characters)
{
    const std::wstring text(5000, L'x');
    std::wstring message;
    ASSERT_TRUE(Format(message, L"%s", text.c_str()));
    EXPECT_EQ(message, text.substr(0, 4095));

    const std::wstring exact(4095, L'y');
    ASSERT_TRUE(Format(message, L"%s", exact.c_str()));
    EXPECT_EQ(message, exact);

    // Formatted within the buffer: the whole field would take gigabytes.
    ASSERT_TRUE(Format(message, L"%1500000000d", 5));
    EXPECT_EQ(message, std::wstring(4095, L' '));
    ASSERT_TRUE(Format(message, L"%-1500000000c", L'c'));
    EXPECT_EQ(message, L'c' + std::wstring(4094, L' '));
}

TEST(EventMessage, EmptyMessageIsAMessageButANullFormatIsNot)
{
    std::wstring message = L"old";
    EXPECT_TRUE(Format(message, L""));
    EXPECT_EQ(message, L"");
    message = L"old";
    EXPECT_FALSE(Format(message, nullptr));
    EXPECT_EQ(message, L"");
}
