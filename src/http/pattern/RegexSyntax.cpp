#include "http/pattern/RegexSyntax.h"

#include "text/AsciiCase.h"

#include <string>

namespace KelvraRegex
{

namespace
{

// Letter, then the pattern text the abbreviation stands for. Only the first quantified atom of
// each text is compiled, so the single-quoted half of "q" never takes part.
const wchar_t* const kAbbreviations[] = {
    L"a([a-zA-Z0-9])",
    L"b([ \\t])",
    L"c([a-zA-Z])",
    L"d([0-9])",
    L"h([0-9a-fA-F])",
    L"n(\r|(\r?\n))",
    L"q(\"[^\"]*\")|('[^']*')",
    L"w([a-zA-Z]+)",
    L"z([0-9]+)",
};

// Groups, look-aheads, abbreviations and alternatives nest by recursion here and in the program
// builder; a deeper pattern is refused as if memory ran out.
const int kMaxNesting = 200;

const wchar_t* FindAbbreviation(wchar_t letter)
{
    for (const wchar_t* entry : kAbbreviations)
    {
        if (entry[0] == letter)
            return entry + 1;
    }
    return nullptr;
}

enum class Parsed
{
    Ok,
    Nothing, // no unit starts here: the sequence ends quietly
    Error,
};

class Parser
{
public:
    Parser(const wchar_t* text, std::uint32_t& groupCount, int nesting)
        : m_text(text), m_groupCount(groupCount), m_nesting(nesting)
    {
    }

    int Error() const { return m_error; }

    Parsed ParseSequence(std::unique_ptr<Node>& out);
    Parsed ParseQuantifiedAtom(std::unique_ptr<Node>& out);

private:
    Parsed ParseUnit(std::unique_ptr<Node>& out);
    Parsed ParseAtom(std::unique_ptr<Node>& out);
    Parsed ParseGroup(std::unique_ptr<Node>& out, bool capture);
    Parsed ParseClass(std::unique_ptr<Node>& out);
    Parsed ParseEscape(std::unique_ptr<Node>& out);

    wchar_t Peek(size_t ahead = 0) const { return m_text[m_pos + ahead]; }

    Parsed Fail(int error)
    {
        m_error = error;
        return Parsed::Error;
    }

    // Counts one level of recursion for as long as it lives.
    class Nested
    {
    public:
        explicit Nested(int& nesting) : m_nesting(++nesting) {}
        ~Nested() { --m_nesting; }
        bool TooDeep() const { return m_nesting > kMaxNesting; }

    private:
        int& m_nesting;
    };

    const wchar_t* m_text;
    size_t m_pos = 0;
    std::uint32_t& m_groupCount;
    int m_nesting;
    int m_error = kCompiled;
};

std::unique_ptr<Node> MakeChar(wchar_t character)
{
    auto node = std::make_unique<Node>(NodeKind::Char);
    node->character = character;
    return node;
}

Parsed Parser::ParseSequence(std::unique_ptr<Node>& out)
{
    auto sequence = std::make_unique<Node>(NodeKind::Sequence);
    sequence->canBeEmpty = true;
    sequence->mayConsumeNothing = true;
    for (;;)
    {
        std::unique_ptr<Node> unit;
        const Parsed result = ParseUnit(unit);
        if (result == Parsed::Error)
            return result;
        if (result == Parsed::Nothing)
            break;
        sequence->canBeEmpty = sequence->canBeEmpty && unit->canBeEmpty;
        sequence->mayConsumeNothing = sequence->mayConsumeNothing && unit->mayConsumeNothing;
        sequence->children.push_back(std::move(unit));
    }
    out = std::move(sequence);
    return Parsed::Ok;
}

// A quantified atom, optionally followed by '|' and another unit. When nothing usable follows
// the '|', the whole unit is dropped: the characters stay read and the sequence ends there.
Parsed Parser::ParseUnit(std::unique_ptr<Node>& out)
{
    const Nested nested(m_nesting);
    if (nested.TooDeep())
        return Fail(kOutOfMemory);
    std::unique_ptr<Node> first;
    Parsed result = ParseQuantifiedAtom(first);
    if (result != Parsed::Ok)
        return result;
    if (Peek() != L'|')
    {
        out = std::move(first);
        return Parsed::Ok;
    }
    ++m_pos;
    std::unique_ptr<Node> second;
    result = ParseUnit(second);
    if (result != Parsed::Ok)
        return result;
    auto alternation = std::make_unique<Node>(NodeKind::Alternation);
    alternation->canBeEmpty = first->canBeEmpty || second->canBeEmpty;
    alternation->mayConsumeNothing = first->mayConsumeNothing || second->mayConsumeNothing;
    alternation->children.push_back(std::move(first));
    alternation->children.push_back(std::move(second));
    out = std::move(alternation);
    return Parsed::Ok;
}

// One quantifier at most: in "a**" the second '*' is the next atom, a literal.
Parsed Parser::ParseQuantifiedAtom(std::unique_ptr<Node>& out)
{
    std::unique_ptr<Node> atom;
    const Parsed result = ParseAtom(atom);
    if (result != Parsed::Ok)
        return result;
    Quantifier quantifier;
    switch (Peek())
    {
    case L'*':
        quantifier = Quantifier::Star;
        break;
    case L'+':
        quantifier = Quantifier::Plus;
        break;
    case L'?':
        quantifier = Quantifier::Optional;
        break;
    default:
        out = std::move(atom);
        return Parsed::Ok;
    }
    ++m_pos;
    const bool lazy = Peek() == L'?';
    if (lazy)
        ++m_pos;
    if (quantifier != Quantifier::Optional && atom->canBeEmpty)
        return Fail(kRepeatedEmpty);
    auto repeat = std::make_unique<Node>(NodeKind::Repeat);
    repeat->quantifier = quantifier;
    repeat->lazy = lazy;
    repeat->canBeEmpty = lazy || quantifier != Quantifier::Plus;
    repeat->mayConsumeNothing = quantifier != Quantifier::Plus || atom->mayConsumeNothing;
    repeat->children.push_back(std::move(atom));
    out = std::move(repeat);
    return Parsed::Ok;
}

Parsed Parser::ParseAtom(std::unique_ptr<Node>& out)
{
    const Nested nested(m_nesting);
    if (nested.TooDeep())
        return Fail(kOutOfMemory);
    const wchar_t c = Peek();
    switch (c)
    {
    case L'\0':
    case L')':
    case L'}':
    case L']':
        return Parsed::Nothing;
    case L'{':
        return ParseGroup(out, true);
    case L'(':
        return ParseGroup(out, false);
    case L'[':
        return ParseClass(out);
    case L'\\':
        return ParseEscape(out);
    case L'!':
    {
        ++m_pos;
        std::unique_ptr<Node> atom;
        const Parsed result = ParseAtom(atom);
        if (result != Parsed::Ok)
            return result;
        auto notAhead = std::make_unique<Node>(NodeKind::NotAhead);
        notAhead->canBeEmpty = atom->canBeEmpty;
        notAhead->mayConsumeNothing = true;
        notAhead->children.push_back(std::move(atom));
        out = std::move(notAhead);
        return Parsed::Ok;
    }
    case L'.':
        ++m_pos;
        out = std::make_unique<Node>(NodeKind::AnyChar);
        return Parsed::Ok;
    case L'$':
        ++m_pos;
        // Only as the very last character does '$' mean the end of the text.
        out = MakeChar(Peek() == L'\0' ? L'\0' : L'$');
        return Parsed::Ok;
    default:
        ++m_pos;
        out = MakeChar(c);
        return Parsed::Ok;
    }
}

Parsed Parser::ParseGroup(std::unique_ptr<Node>& out, bool capture)
{
    ++m_pos;
    auto group = std::make_unique<Node>(capture ? NodeKind::Capture : NodeKind::Group);
    if (capture)
        group->group = m_groupCount++;
    std::unique_ptr<Node> body;
    if (ParseSequence(body) == Parsed::Error)
        return Parsed::Error;
    if (Peek() != (capture ? L'}' : L')'))
        return Fail(capture ? kCaptureNotClosed : kGroupNotClosed);
    ++m_pos;
    group->canBeEmpty = body->canBeEmpty;
    group->mayConsumeNothing = body->mayConsumeNothing;
    group->children.push_back(std::move(body));
    out = std::move(group);
    return Parsed::Ok;
}

Parsed Parser::ParseClass(std::unique_ptr<Node>& out)
{
    ++m_pos;
    auto charClass = std::make_unique<Node>(NodeKind::Class);
    if (Peek() == L'^')
    {
        charClass->negated = true;
        ++m_pos;
    }
    for (;;)
    {
        wchar_t c = Peek();
        if (c == L'\0')
            return Fail(kClassNotClosed);
        if (c == L']')
        {
            if (charClass->ranges.empty())
                return Fail(kEmptyClass);
            ++m_pos;
            break;
        }
        if (c == L'\\')
        {
            ++m_pos;
            c = Peek();
            // A backslash ending the pattern leaves the class open.
            if (c == L'\0')
                return Fail(kClassNotClosed);
            if (c == L't')
                c = L'\t';
        }
        ++m_pos;
        ClassRange range{c, c};
        if (Peek() == L'-')
        {
            // The high end is taken as it stands, backslash included.
            const wchar_t high = Peek(1);
            if (high == L'\0' || high == L']')
                return Fail(kClassNotClosed);
            m_pos += 2;
            if (high < c)
                return Fail(kReversedRange);
            range.high = high;
        }
        charClass->ranges.push_back(range);
    }
    out = std::move(charClass);
    return Parsed::Ok;
}

Parsed Parser::ParseEscape(std::unique_ptr<Node>& out)
{
    ++m_pos;
    const wchar_t c = Peek();
    if (c == L'\0')
    {
        // A backslash ending the pattern stands for itself; the terminator is not read past.
        out = MakeChar(L'\\');
        return Parsed::Ok;
    }
    if (c >= L'0' && c <= L'9')
    {
        std::uint64_t number = 0;
        while (Peek() >= L'0' && Peek() <= L'9')
        {
            if (number <= m_groupCount)
                number = number * 10 + static_cast<std::uint64_t>(Peek() - L'0');
            ++m_pos;
        }
        if (number >= m_groupCount)
            return Fail(kUnknownGroup);
        auto backRef = std::make_unique<Node>(NodeKind::BackRef);
        backRef->group = static_cast<std::uint32_t>(number);
        backRef->mayConsumeNothing = true;
        out = std::move(backRef);
        return Parsed::Ok;
    }
    ++m_pos;
    if (const wchar_t* text = FindAbbreviation(c))
    {
        Parser stored(text, m_groupCount, m_nesting);
        if (stored.ParseQuantifiedAtom(out) != Parsed::Ok)
            return Fail(kAbbreviationFailed);
        return Parsed::Ok;
    }
    out = MakeChar(c);
    return Parsed::Ok;
}

} // namespace

int ParseRegex(const wchar_t* pattern, SyntaxTree& tree)
{
    tree = SyntaxTree();
    std::wstring lowered = pattern != nullptr ? pattern : L"";
    Kelvra::LowerAscii(lowered);
    const wchar_t* text = lowered.c_str();
    if (text[0] == L'^')
    {
        tree.anchored = true;
        ++text;
    }
    Parser parser(text, tree.groupCount, 0);
    // At the top level the first character that cannot start a unit ends the pattern quietly.
    parser.ParseSequence(tree.root);
    return parser.Error();
}

} // namespace KelvraRegex
