// The matcher on the pattern, a NUL, then the text (as WideText reads them): a pattern compiles or
// gets an error code; a match lies within the text (or one past its end after '$'); extraction gives
// parts of the text and throws nothing but CRegexException, for a pattern without a group.
#include "FuzzSupport.h"
#include "http/pattern/PatternExtraction.h"
#include "http/pattern/RegexException.h"
#include "http/pattern/RegexPattern.h"

#include <algorithm>
#include <cmath>
#include <cwchar>
#include <string_view>

using KelvraFuzz::Check;

namespace
{

// Backtracking may try every way to share the text among the choices, the matcher's documented
// limit: about text^(choices + 1) steps, or (choices + 1)^text once a group or abbreviation is
// repeated. Inputs beyond a fraction of a second are not matched: a time-out is an endless loop.
bool WithinBacktrackingLimit(const std::wstring& pattern, size_t text)
{
    double choices = 0;
    bool nested = false;
    for (size_t i = 0; i < pattern.size(); ++i)
    {
        if (std::wcschr(L"*+?|\\", pattern[i]) == nullptr)
            continue;
        ++choices;
        // The matcher ignores case: "\W" is the word loop "\w".
        nested = nested || (i > 0 && pattern[i] != L'|' && std::wcschr(L")}nqwzNQWZ", pattern[i - 1]) != nullptr);
    }
    const double steps = 1e7;
    return std::pow(text + 1.0, choices + 1) <= steps && (!nested || std::pow(choices + 1, text) <= steps);
}

bool Within(const wchar_t* position, const wchar_t* first, const wchar_t* last)
{
    return position >= first && position <= last;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, size_t size)
{
    const std::wstring input = KelvraFuzz::WideText(data, size);
    const size_t split = std::min(input.find(L'\0'), input.size());
    const std::wstring pattern = input.substr(0, split);
    const std::wstring text = split < input.size() ? input.substr(split + 1) : std::wstring();
    if (pattern.size() > 64 || text.size() > 256)
        return -1;

    CRegexPattern compiled;
    const int error = compiled.Parse(pattern.c_str());
    Check(error >= 0 && error <= 9);
    if (!WithinBacktrackingLimit(pattern, text.size()))
        return 0;

    const wchar_t* const first = text.c_str();
    const wchar_t* const last = first + std::wcslen(first);
    CRegexMatchContext context;
    const wchar_t* end = nullptr;
    const bool matched = compiled.Match(first, context, &end);
    Check(error == 0 ? Within(end, first, last + matched) : !matched);
    if (matched)
    {
        Check(Within(context.MatchStart(), first, last) && Within(end, context.MatchStart(), last + 1));
        Check(context.MatchEnd() == end && context.GroupCount() == compiled.GroupCount());
        for (std::uint32_t group = 0; group < context.GroupCount(); ++group)
        {
            const CRegexMatchContext::Capture capture = context.Group(group);
            Check(capture.start == nullptr
                      ? capture.end == nullptr
                      : Within(capture.start, first, last + 1) && Within(capture.end, first, last + 1));
        }
    }

    std::vector<std::wstring> results;
    try
    {
        Check(ExtractPatternGroups(pattern, text, results) ==
              (!pattern.empty() && !text.empty() && error == 0));
    }
    catch (const CRegexException& exception)
    {
        Check(exception.Code() == CRegexException::kFailure && compiled.GroupCount() == 0);
    }
    for (const std::wstring& entry : results)
        Check(std::wstring_view(first, last - first + 1).find(entry) != std::wstring_view::npos);

    const std::wstring trimmed = TrimChars(text, pattern);
    Check(text.find(trimmed) != std::wstring::npos);
    Check(trimmed.empty() || (pattern.find(trimmed.front()) == std::wstring::npos &&
                              pattern.find(trimmed.back()) == std::wstring::npos));
    return 0;
}
