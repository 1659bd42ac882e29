#include "http/pattern/PatternExtraction.h"

#include "http/pattern/RegexPattern.h"

#include <new>
#include <string_view>
#include <unordered_set>

bool ExtractPatternGroups(const std::wstring& pattern, const std::wstring& text,
                          std::vector<std::wstring>& results)
{
    results.clear();
    if (pattern.empty() || text.empty())
        return false;
    try
    {
        CRegexPattern compiled;
        if (compiled.Parse(pattern.c_str()) != 0)
            return false;
        // One lowered copy for the whole scan; each match starts where the last one ended.
        const KelvraRegex::LoweredText lowered(text.c_str());
        CRegexMatchContext context(256);
        // The entries so far as they stand in the lowered copy: a case-insensitive comparison
        // with each of them in one look-up.
        std::unordered_set<std::wstring_view> seen;
        size_t from = 0;
        while (compiled.Match(lowered, from, context))
        {
            const CRegexMatchContext::Capture capture = context.Group(0);
            if (capture.start != nullptr && capture.end != nullptr && capture.end >= capture.start)
            {
                const size_t offset = static_cast<size_t>(capture.start - lowered.Original());
                const size_t count = static_cast<size_t>(capture.end - capture.start);
                if (seen.emplace(lowered.Lowered() + offset, count).second)
                    results.emplace_back(capture.start, count);
            }
            const size_t start = static_cast<size_t>(context.MatchStart() - lowered.Original());
            const size_t end = static_cast<size_t>(context.MatchEnd() - lowered.Original());
            // An empty match would be found again at the same place.
            from = end > start ? end : end + 1;
            if (from >= lowered.Length())
                break;
        }
        // A match cut short by memory would pass for the end of the matches.
        if (context.OutOfMemory())
            throw std::bad_alloc();
    }
    catch (const std::bad_alloc&)
    {
        results.clear();
        return false;
    }
    return true;
}

std::wstring TrimChars(const std::wstring& text, const std::wstring& set)
{
    const size_t first = text.find_first_not_of(set);
    if (first == std::wstring::npos)
        return std::wstring();
    const size_t last = text.find_last_not_of(set);
    return text.substr(first, last - first + 1);
}
