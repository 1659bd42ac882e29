#include "http/pattern/ReferenceMatcher.h"

#include "common/UniqueHandle.h"
#include "http/pattern/PatternExtraction.h"
#include "http/pattern/RegexPattern.h"
#include "http/pattern/RegexSyntax.h"

#include <windows.h>

#include <algorithm>
#include <cwchar>
#include <functional>
#include <memory>

using KelvraRegex::Node;
using KelvraRegex::NodeKind;
using testing::PrintToString;

namespace KelvraTest
{

namespace
{

constexpr size_t kNone = static_cast<size_t>(-1);
// Far more than any row needs, small enough to fill in a moment.
constexpr size_t kStackLimit = 1 << 20;

struct Span
{
    size_t start;
    size_t end;
};

std::wstring Folded(std::wstring text)
{
    for (wchar_t& c : text)
        c = c >= L'A' && c <= L'Z' ? static_cast<wchar_t>(c - L'A' + L'a') : c;
    return text;
}

class Interpreter
{
public:
    explicit Interpreter(const std::wstring& text) : m_text(Folded(text)) {}

    // The match and then each group's capture, or nothing. Start positions are tried left to
    // right (only the first when anchored), none at the end of a non-empty text; captures carry
    // over from one attempt to the next, as they do in the engine.
    std::vector<Span> Search(const KelvraRegex::SyntaxTree& tree)
    {
        m_captures.assign(tree.groupCount, Span{kNone, kNone});
        for (size_t start = 0;; ++start)
        {
            size_t end = 0;
            if (Match(*tree.root, start,
                      [&end](size_t pos)
                      {
                          end = pos;
                          return true;
                      }))
            {
                std::vector<Span> spans{{start, end}};
                spans.insert(spans.end(), m_captures.begin(), m_captures.end());
                return spans;
            }
            if (tree.anchored || start + 1 >= m_text.size())
                return {};
        }
    }

private:
    // next is the rest of the pattern, given the position where the node ended.
    using Next = std::function<bool(size_t)>;

    bool Match(const Node& node, size_t pos, const Next& next)
    {
        const bool inText = pos < m_text.size();
        switch (node.kind)
        {
        case NodeKind::Sequence:
            return Units(node, 0, pos, next);
        case NodeKind::Char: // 0 is the end of the text, and steps past it
            return (node.character == L'\0' ? pos == m_text.size()
                                            : inText && m_text[pos] == node.character) &&
                   next(pos + 1);
        case NodeKind::AnyChar:
            return inText && next(pos + 1);
        case NodeKind::Class:
            return inText &&
                   std::any_of(node.ranges.begin(), node.ranges.end(),
                               [&](const KelvraRegex::ClassRange& range) {
                                   return range.low <= m_text[pos] && m_text[pos] <= range.high;
                               }) != node.negated &&
                   next(pos + 1);
        case NodeKind::Capture:
        {
            // Set on the way through, given back only when the group fails.
            Span& capture = m_captures[node.group];
            const Span before = capture;
            capture.start = pos;
            if (Match(*node.children[0], pos,
                      [&](size_t end)
                      {
                          capture.end = end;
                          return next(end);
                      }))
                return true;
            capture = before;
            return false;
        }
        case NodeKind::Group:
            return Match(*node.children[0], pos, next);
        case NodeKind::NotAhead:
            return !Match(*node.children[0], pos, [](size_t) { return true; }) && next(pos);
        case NodeKind::Alternation:
            return Match(*node.children[0], pos, next) || Match(*node.children[1], pos, next);
        case NodeKind::Repeat:
            if (node.quantifier == KelvraRegex::Quantifier::Plus)
                return Match(*node.children[0], pos, [&](size_t end) { return Turns(node, end, next); });
            return Turns(node, pos, next);
        case NodeKind::BackRef:
        {
            // A capture without its end (or with an end before its start) counts as empty.
            const Span& capture = m_captures[node.group];
            const size_t n = capture.start != kNone && capture.end != kNone && capture.end > capture.start
                                 ? capture.end - capture.start
                                 : 0;
            if (n > 0 && (pos + n > m_text.size() || m_text.compare(pos, n, m_text, capture.start, n) != 0))
                return false;
            return next(pos + n);
        }
        }
        return false;
    }

    bool Units(const Node& sequence, size_t index, size_t pos, const Next& next)
    {
        if (index == sequence.children.size())
            return next(pos);
        return Match(*sequence.children[index], pos,
                     [&](size_t end) { return Units(sequence, index + 1, end, next); });
    }

    // The turns of x*, of x? and of x+ after its first x: greedy tries one more turn first, lazy
    // what follows first. A turn that consumed nothing fails, but for the one turn of "??".
    bool Turns(const Node& repeat, size_t pos, const Next& next)
    {
        const Node& body = *repeat.children[0];
        const bool loop = repeat.quantifier != KelvraRegex::Quantifier::Optional;
        const Next turn = [&](size_t end)
        { return end != pos && (loop ? Turns(repeat, end, next) : next(end)); };
        if (repeat.lazy)
            return next(pos) || Match(body, pos, loop ? turn : next);
        return Match(body, pos, turn) || next(pos);
    }

    std::wstring m_text;
    std::vector<Span> m_captures;
};

// "no match", or the match and then each capture as offsets into the text: "{1,4}{1,3}{-}".
std::string Describe(const std::vector<Span>& spans)
{
    std::string description = spans.empty() ? "no match" : "";
    for (const Span& span : spans)
        description += span.start == kNone || span.end == kNone
                           ? "{-}"
                           : "{" + std::to_string(span.start) + "," + std::to_string(span.end) + "}";
    return description;
}

struct MatchJob
{
    CRegexPattern pattern;
    const wchar_t* text = nullptr;
    CRegexMatchContext context{256, kStackLimit};
    const wchar_t* end = nullptr;
    bool matched = false;
};

DWORD WINAPI RunMatchJob(void* parameter)
{
    // The worker holds its own reference: a job that never ends outlives the test that gave up.
    const std::unique_ptr<std::shared_ptr<MatchJob>> owner(
        static_cast<std::shared_ptr<MatchJob>*>(parameter));
    MatchJob& job = **owner;
    job.matched = job.pattern.Match(job.text, job.context, &job.end);
    return 0;
}

// Runs the job on a worker thread, so that a match that never ends (a loop whose turns push
// nothing in net never fills the stack) fails its row instead of stalling the whole program.
bool EndsInTime(const std::shared_ptr<MatchJob>& job)
{
    auto* reference = new std::shared_ptr<MatchJob>(job);
    Kelvra::UniqueThread thread(::CreateThread(nullptr, 0, &RunMatchJob, reference, 0, nullptr));
    if (!thread)
    {
        delete reference;
        ADD_FAILURE() << "CreateThread failed";
        return false;
    }
    return ::WaitForSingleObject(thread.get(), 10000) == WAIT_OBJECT_0;
}

Span SpanIn(const std::wstring& text, const wchar_t* start, const wchar_t* end)
{
    if (start == nullptr || end == nullptr)
        return Span{kNone, kNone};
    return Span{static_cast<size_t>(start - text.c_str()), static_cast<size_t>(end - text.c_str())};
}

} // namespace

testing::AssertionResult AgreesWithReference(const std::wstring& pattern, const std::wstring& text)
{
    KelvraRegex::SyntaxTree tree;
    if (KelvraRegex::ParseRegex(pattern.c_str(), tree) != 0)
        return testing::AssertionSuccess();
    CRegexPattern engine;
    CRegexMatchContext context(256, kStackLimit);
    std::vector<Span> spans;
    if (engine.Parse(pattern.c_str()) == 0 && engine.Match(text.c_str(), context))
    {
        spans.push_back(SpanIn(text, context.MatchStart(), context.MatchEnd()));
        for (std::uint32_t group = 0; group < context.GroupCount(); ++group)
            spans.push_back(SpanIn(text, context.Group(group).start, context.Group(group).end));
    }
    const std::string engineSays = Describe(spans);
    const std::string referenceSays = Describe(Interpreter(text).Search(tree));
    if (engineSays == referenceSays)
        return testing::AssertionSuccess();
    return testing::AssertionFailure()
           << "pattern " << PrintToString(pattern) << " text " << PrintToString(text) << ": engine "
           << engineSays << ", reference " << referenceSays;
}

testing::AssertionResult ExtractionAgreesWithReference(const std::wstring& pattern, const std::wstring& text)
{
    std::vector<std::wstring> results;
    const bool threw = ThrownCode([&] { ExtractPatternGroups(pattern, text, results); }) != 0;
    std::vector<std::wstring> expected;
    bool expectThrow = false;
    KelvraRegex::SyntaxTree tree;
    const bool compiles = !pattern.empty() && KelvraRegex::ParseRegex(pattern.c_str(), tree) == 0;
    const std::wstring whole = text.c_str();
    for (size_t from = 0; compiles && from < whole.size();)
    {
        const std::vector<Span> spans = Interpreter(whole.substr(from)).Search(tree);
        // A pattern without a group throws at its first match.
        expectThrow = !spans.empty() && tree.groupCount == 0;
        if (spans.empty() || expectThrow)
            break;
        const Span capture = spans[1];
        if (capture.start != kNone && capture.end != kNone && capture.end >= capture.start)
        {
            const std::wstring value = whole.substr(from + capture.start, capture.end - capture.start);
            if (std::none_of(expected.begin(), expected.end(),
                             [&](const std::wstring& earlier) { return Folded(earlier) == Folded(value); }))
                expected.push_back(value);
        }
        // An empty match moves the search one character on.
        from += std::max(spans[0].end, spans[0].start + 1);
    }
    if (threw == expectThrow && results == expected)
        return testing::AssertionSuccess();
    return testing::AssertionFailure()
           << "pattern " << PrintToString(pattern) << " text " << PrintToString(text) << ": engine gives "
           << PrintToString(results) << (threw ? " and throws" : "") << ", reference "
           << PrintToString(expected) << (expectThrow ? " and throws" : "");
}

void ExpectMatches(const std::vector<MatchRow>& rows)
{
    for (const MatchRow& row : rows)
    {
        SCOPED_TRACE("pattern " + PrintToString(row.pattern) + " text " + PrintToString(row.text));
        const auto job = std::make_shared<MatchJob>();
        ASSERT_EQ(job->pattern.Parse(row.pattern), 0);
        job->text = row.text;
        ASSERT_TRUE(EndsInTime(job)) << "the match does not end";
        const CRegexMatchContext& context = job->context;
        const wchar_t* const end = job->end;
        const bool matched = job->matched;
        EXPECT_LT(context.StackSize(), kStackLimit) << "the match ran away";
        EXPECT_TRUE(AgreesWithReference(row.pattern, row.text));
        // Nothing is read past the terminator: the matcher stops within the text, or one step past
        // its end after "$".
        const size_t length = std::wcslen(row.text);
        ASSERT_NE(end, nullptr);
        EXPECT_LE(static_cast<size_t>(end - row.text), length + (matched ? 1 : 0));
        EXPECT_EQ(matched, row.match != kNoMatch);
        if (!matched || row.match == kNoMatch)
            continue;
        EXPECT_EQ(end, context.MatchEnd());
        EXPECT_EQ(static_cast<size_t>(context.MatchStart() - row.text), row.at);
        EXPECT_EQ(std::wstring(context.MatchStart(), std::min(end, row.text + length)), row.match);
        ASSERT_EQ(context.GroupCount(), row.captures.size());
        for (std::uint32_t group = 0; group < context.GroupCount(); ++group)
        {
            const CRegexMatchContext::Capture capture = context.Group(group);
            const std::wstring captured =
                capture.start == nullptr ? L"(not captured)" : std::wstring(capture.start, capture.end);
            EXPECT_EQ(captured, row.captures[group] == kNotCaptured ? L"(not captured)" : row.captures[group])
                << "group " << group;
        }
    }
}

void ExpectExtractions(const std::vector<ExtractionRow>& rows)
{
    for (const ExtractionRow& row : rows)
    {
        SCOPED_TRACE("pattern " + PrintToString(row.pattern) + " text " + PrintToString(row.text));
        std::vector<std::wstring> results{L"left over"};
        EXPECT_TRUE(ExtractPatternGroups(row.pattern, row.text, results));
        EXPECT_EQ(results, row.entries);
        EXPECT_TRUE(ExtractionAgreesWithReference(row.pattern, row.text));
    }
}

} // namespace KelvraTest
