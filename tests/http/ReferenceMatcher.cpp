#include "http/ReferenceMatcher.h"

#include "http/PatternExtraction.h"
#include "http/RegexException.h"
#include "http/RegexPattern.h"

#include <cstdio>
#include <cwchar>

using KelvraRegex::Node;
using KelvraRegex::NodeKind;
using KelvraRegex::Quantifier;

namespace KelvraTest
{

namespace
{

wchar_t Fold(wchar_t c)
{
    return c >= L'A' && c <= L'Z' ? static_cast<wchar_t>(c - L'A' + L'a') : c;
}

bool EqualIgnoringCase(const std::wstring& a, const std::wstring& b)
{
    if (a.size() != b.size())
        return false;
    for (size_t i = 0; i < a.size(); ++i)
    {
        if (Fold(a[i]) != Fold(b[i]))
            return false;
    }
    return true;
}

} // namespace

ReferenceMatcher::ReferenceMatcher(const KelvraRegex::SyntaxTree& tree, const std::wstring& text)
    : m_tree(tree), m_text(text.c_str())
{
    for (wchar_t& c : m_text)
        c = Fold(c);
}

ReferenceResult ReferenceMatcher::Search(size_t from)
{
    m_captures.assign(m_tree.groupCount, ReferenceSpan());
    for (size_t start = from;; ++start)
    {
        size_t end = 0;
        if (Match(*m_tree.root, start,
                  [&end](size_t pos)
                  {
                      end = pos;
                      return true;
                  }))
            return ReferenceResult{true, start, end, m_captures};
        if (m_tree.anchored || start + 1 >= m_text.size())
            return ReferenceResult{};
    }
}

bool ReferenceMatcher::Match(const Node& node, size_t pos, const Next& next)
{
    const size_t length = m_text.size();
    switch (node.kind)
    {
    case NodeKind::Sequence:
        return MatchUnits(node, 0, pos, next);
    case NodeKind::Char:
        if (node.character == L'\0')
            return pos == length && next(pos + 1);
        return pos < length && m_text[pos] == node.character && next(pos + 1);
    case NodeKind::AnyChar:
        return pos < length && next(pos + 1);
    case NodeKind::Class:
    {
        if (pos >= length)
            return false;
        bool inside = false;
        for (const KelvraRegex::ClassRange& range : node.ranges)
            inside = inside || (range.low <= m_text[pos] && m_text[pos] <= range.high);
        return inside != node.negated && next(pos + 1);
    }
    case NodeKind::Capture:
    {
        // The capture is set on the way in and out, and given back only when the group fails.
        const ReferenceSpan before = m_captures[node.group];
        m_captures[node.group].start = pos;
        if (Match(*node.children[0], pos,
                  [&](size_t end)
                  {
                      m_captures[node.group].end = end;
                      return next(end);
                  }))
            return true;
        m_captures[node.group] = before;
        return false;
    }
    case NodeKind::Group:
        return Match(*node.children[0], pos, next);
    case NodeKind::NotAhead:
        if (Match(*node.children[0], pos, [](size_t) { return true; }))
            return false;
        return next(pos);
    case NodeKind::Alternation:
        return Match(*node.children[0], pos, next) || Match(*node.children[1], pos, next);
    case NodeKind::Repeat:
        return MatchRepeat(node, pos, next);
    case NodeKind::BackRef:
    {
        const ReferenceSpan& span = m_captures[node.group];
        size_t n = 0;
        if (span.start != ReferenceSpan::kNone && span.end != ReferenceSpan::kNone && span.end > span.start)
            n = span.end - span.start;
        for (size_t i = 0; i < n; ++i)
        {
            if (pos + i >= length || m_text[pos + i] != m_text[span.start + i])
                return false;
        }
        return next(pos + n);
    }
    }
    return false;
}

bool ReferenceMatcher::MatchUnits(const Node& sequence, size_t index, size_t pos, const Next& next)
{
    if (index == sequence.children.size())
        return next(pos);
    return Match(*sequence.children[index], pos,
                 [&](size_t end) { return MatchUnits(sequence, index + 1, end, next); });
}

bool ReferenceMatcher::MatchRepeat(const Node& repeat, size_t pos, const Next& next)
{
    const Node& body = *repeat.children[0];
    switch (repeat.quantifier)
    {
    case Quantifier::Star:
        return repeat.lazy ? LazyTurns(repeat, pos, next) : GreedyTurns(repeat, pos, next, true);
    case Quantifier::Plus:
        return Match(body, pos,
                     [&](size_t end) {
                         return repeat.lazy ? LazyTurns(repeat, end, next)
                                            : GreedyTurns(repeat, end, next, true);
                     });
    case Quantifier::Optional:
        if (repeat.lazy)
            return next(pos) || Match(body, pos, next);
        return GreedyTurns(repeat, pos, next, false);
    }
    return false;
}

// One more turn first; a turn that consumed nothing fails.
bool ReferenceMatcher::GreedyTurns(const Node& repeat, size_t pos, const Next& next, bool again)
{
    if (Match(*repeat.children[0], pos,
              [&](size_t end)
              { return end != pos && (again ? GreedyTurns(repeat, end, next, true) : next(end)); }))
        return true;
    return next(pos);
}

// What follows first, one more turn only when it fails; a turn that consumed nothing fails.
bool ReferenceMatcher::LazyTurns(const Node& repeat, size_t pos, const Next& next)
{
    if (next(pos))
        return true;
    return Match(*repeat.children[0], pos,
                 [&](size_t end) { return end != pos && LazyTurns(repeat, end, next); });
}

std::vector<std::wstring> ReferenceExtract(const std::wstring& pattern, const std::wstring& text, bool* threw)
{
    *threw = false;
    std::vector<std::wstring> results;
    KelvraRegex::SyntaxTree tree;
    if (pattern.empty() || text.empty() || KelvraRegex::ParseRegex(pattern.c_str(), tree) != 0)
        return results;
    const std::wstring whole = text.c_str();
    size_t from = 0;
    for (;;)
    {
        ReferenceMatcher matcher(tree, whole.substr(from));
        const ReferenceResult result = matcher.Search(0);
        if (!result.matched)
            break;
        if (tree.groupCount == 0)
        {
            *threw = true;
            return results;
        }
        const ReferenceSpan& capture = result.captures[0];
        if (capture.start != ReferenceSpan::kNone && capture.end != ReferenceSpan::kNone &&
            capture.end >= capture.start)
        {
            const std::wstring value = whole.substr(from + capture.start, capture.end - capture.start);
            bool seen = false;
            for (const std::wstring& earlier : results)
                seen = seen || EqualIgnoringCase(earlier, value);
            if (!seen)
                results.push_back(value);
        }
        from += result.end > result.start ? result.end : result.end + 1;
        if (from >= whole.size())
            break;
    }
    return results;
}

std::string Printable(const std::wstring& text)
{
    std::string printable = "\"";
    for (wchar_t c : text)
    {
        if (c >= 0x20 && c < 0x7F)
        {
            printable += static_cast<char>(c);
            continue;
        }
        char escaped[16];
        std::snprintf(escaped, sizeof(escaped), "\\x%02X", static_cast<unsigned>(c));
        printable += escaped;
    }
    return printable + "\"";
}

testing::AssertionResult AgreesWithReference(const std::wstring& pattern, const std::wstring& text)
{
    KelvraRegex::SyntaxTree tree;
    if (KelvraRegex::ParseRegex(pattern.c_str(), tree) != 0)
        return testing::AssertionSuccess();
    CRegexPattern engine;
    if (engine.Parse(pattern.c_str()) != 0)
        return testing::AssertionFailure() << "the engine does not compile " << Printable(pattern);
    // A bounded stack: an engine fault shows as a disagreement, not as all memory taken.
    CRegexMatchContext context(256, 1 << 22);
    const bool matched = engine.Match(text.c_str(), context);
    const ReferenceResult expected = ReferenceMatcher(tree, text).Search(0);
    testing::AssertionResult failure = testing::AssertionFailure();
    failure << "pattern " << Printable(pattern) << " text " << Printable(text) << ": ";
    if (matched != expected.matched)
        return failure << "engine " << (matched ? "matches" : "does not match") << ", reference "
                       << (expected.matched ? "matches" : "does not match");
    if (!matched)
        return testing::AssertionSuccess();
    const size_t start = static_cast<size_t>(context.MatchStart() - text.c_str());
    const size_t end = static_cast<size_t>(context.MatchEnd() - text.c_str());
    if (start != expected.start || end != expected.end)
        return failure << "engine matches [" << start << ", " << end << "), reference [" << expected.start
                       << ", " << expected.end << ")";
    for (std::uint32_t group = 0; group < tree.groupCount; ++group)
    {
        const CRegexMatchContext::Capture capture = context.Group(group);
        const size_t captureStart = capture.start == nullptr
                                        ? ReferenceSpan::kNone
                                        : static_cast<size_t>(capture.start - text.c_str());
        const size_t captureEnd =
            capture.end == nullptr ? ReferenceSpan::kNone : static_cast<size_t>(capture.end - text.c_str());
        const ReferenceSpan& span = expected.captures[group];
        const bool spanSet = span.start != ReferenceSpan::kNone && span.end != ReferenceSpan::kNone;
        if (captureStart != (spanSet ? span.start : ReferenceSpan::kNone) ||
            captureEnd != (spanSet ? span.end : ReferenceSpan::kNone))
            return failure << "group " << group << ": engine [" << static_cast<long long>(captureStart)
                           << ", " << static_cast<long long>(captureEnd) << "), reference ["
                           << static_cast<long long>(span.start) << ", " << static_cast<long long>(span.end)
                           << ")";
    }
    return testing::AssertionSuccess();
}

testing::AssertionResult ExtractionAgreesWithReference(const std::wstring& pattern, const std::wstring& text)
{
    bool expectThrow = false;
    const std::vector<std::wstring> expected = ReferenceExtract(pattern, text, &expectThrow);
    std::vector<std::wstring> results;
    bool threw = false;
    try
    {
        ExtractPatternGroups(pattern, text, results);
    }
    catch (const CRegexException&)
    {
        threw = true;
    }
    testing::AssertionResult failure = testing::AssertionFailure();
    failure << "pattern " << Printable(pattern) << " text " << Printable(text) << ": ";
    if (threw != expectThrow)
        return failure << "engine " << (threw ? "throws" : "does not throw");
    if (!threw && results != expected)
    {
        failure << "engine gives";
        for (const std::wstring& entry : results)
            failure << " " << Printable(entry);
        failure << "; reference gives";
        for (const std::wstring& entry : expected)
            failure << " " << Printable(entry);
        return failure;
    }
    return testing::AssertionSuccess();
}

} // namespace KelvraTest
