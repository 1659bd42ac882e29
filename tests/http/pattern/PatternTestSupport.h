// The row checks of the matcher's tables. Each match runs on a worker thread within a time limit
// and with a bounded stack, so that a match that never ends or runs away fails its row instead of
// stalling the program or taking all memory; the worker shares what it uses, as it may outlive the row.
#pragma once

#include "http/pattern/RegexPattern.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <future>
#include <memory>
#include <string>
#include <thread>
#include <vector>

namespace KelvraTest
{

// A pattern, a text, and the match expected: "none", or where the match starts, ':' and the text
// matched, then each group's capture in braces, or "-" for a group that took no part
// ("1:abc", "0:Aab {a} -").
using MatchRow = std::array<const wchar_t*, 3>;

// Checks each row, and that the matcher stopped within the text (one step past its end after "$").
inline void ExpectMatches(const std::vector<MatchRow>& rows)
{
    constexpr size_t kStackLimit = 1 << 20; // far more than any row needs, filled in a moment
    for (const auto& [pattern, text, expected] : rows)
    {
        SCOPED_TRACE("pattern " + testing::PrintToString(pattern) + " text " + testing::PrintToString(text));
        const auto compiled = std::make_shared<CRegexPattern>();
        const auto context = std::make_shared<CRegexMatchContext>(256, kStackLimit);
        const auto end = std::make_shared<const wchar_t*>(nullptr);
        ASSERT_EQ(compiled->Parse(pattern), 0);
        std::packaged_task<bool()> task([=, text = text]
                                        { return compiled->Match(text, *context, end.get()); });
        std::future<bool> matched = task.get_future();
        std::thread worker(std::move(task));
        // Generous: on a loaded machine a new thread can wait seconds for its first turn. Joined
        // otherwise, so that no thread of a finished row is still ending when the program exits.
        if (matched.wait_for(std::chrono::seconds(30)) != std::future_status::ready)
        {
            worker.detach();
            FAIL() << "the match does not end";
        }
        worker.join();
        EXPECT_LT(context->StackSize(), kStackLimit) << "the match ran away";
        const wchar_t* const textEnd = text + std::char_traits<wchar_t>::length(text);
        std::wstring found = L"none";
        if (matched.get())
        {
            EXPECT_EQ(*end, context->MatchEnd());
            found = std::to_wstring(context->MatchStart() - text) + L":" +
                    std::wstring(context->MatchStart(), std::min(context->MatchEnd(), textEnd));
            for (std::uint32_t group = 0; group < context->GroupCount(); ++group)
            {
                const CRegexMatchContext::Capture capture = context->Group(group);
                found += capture.start ? L" {" + std::wstring(capture.start, capture.end) + L"}" : L" -";
            }
        }
        ASSERT_NE(*end, nullptr);
        EXPECT_LE(*end, textEnd + (found == L"none" ? 0 : 1));
        EXPECT_EQ(found, expected);
    }
}

} // namespace KelvraTest
