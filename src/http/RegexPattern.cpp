#include "http/RegexPattern.h"

#include "http/RegexException.h"
#include "KelvraStrings.h"

#include <algorithm>
#include <cwchar>
#include <new>

using KelvraRegex::Instruction;
using KelvraRegex::OpCode;

namespace KelvraRegex
{

LoweredText::LoweredText(const wchar_t* original)
    : m_original(original), m_length(std::wcslen(original)), m_lowered(original, m_length)
{
    KelvraStrings::Strings::ToLower(m_lowered);
    // The string's own terminator follows this one.
    m_lowered.push_back(L'\0');
}

} // namespace KelvraRegex

CRegexMatchContext::CRegexMatchContext(size_t initialStackEntries, size_t stackLimit)
    : m_stack(std::min(std::max<size_t>(initialStackEntries, 1), std::max<size_t>(stackLimit, 1))),
      m_stackLimit(stackLimit)
{
}

CRegexMatchContext::Capture CRegexMatchContext::Group(std::uint32_t group) const
{
    if (group >= m_groupCount)
        throw CRegexException(CRegexException::kFailure);
    const Span& span = m_captures[group];
    if (span.start == kNull || span.end == kNull)
        return Capture{nullptr, nullptr};
    return Capture{At(span.start), At(span.end)};
}

bool CRegexMatchContext::Prepare(std::uint32_t groupCount, std::uint32_t slotCount, const wchar_t* text)
{
    m_text = text;
    m_matchStart = kNull;
    m_matchEnd = kNull;
    m_depth = 0;
    try
    {
        m_captures.assign(groupCount, Span{kNull, kNull});
        m_slots.assign(slotCount, 0);
    }
    catch (const std::bad_alloc&)
    {
        m_groupCount = 0;
        return false;
    }
    m_groupCount = groupCount;
    return true;
}

// Twice the new depth plus two entries, within the limit.
bool CRegexMatchContext::Grow(size_t depth)
{
    const size_t doubled = depth <= (kUnlimited - 2) / 2 ? 2 * depth + 2 : kUnlimited;
    const size_t wanted = std::min(doubled, m_stackLimit);
    if (wanted <= depth)
        return false;
    try
    {
        m_stack.resize(wanted);
    }
    catch (const std::bad_alloc&)
    {
        return false;
    }
    return true;
}

int CRegexPattern::Parse(const wchar_t* pattern)
{
    m_program = KelvraRegex::Program();
    m_caseSensitive = false;
    try
    {
        KelvraRegex::SyntaxTree tree;
        m_lastError = KelvraRegex::ParseRegex(pattern, tree);
        if (m_lastError == KelvraRegex::kCompiled)
            m_program = KelvraRegex::BuildProgram(tree);
    }
    catch (const std::bad_alloc&)
    {
        m_program = KelvraRegex::Program();
        m_lastError = KelvraRegex::kOutOfMemory;
    }
    return m_lastError;
}

bool CRegexPattern::Match(const wchar_t* text, CRegexMatchContext& context, const wchar_t** end) const
{
    if (end != nullptr)
        *end = nullptr;
    if (text == nullptr)
        return false;
    try
    {
        const KelvraRegex::LoweredText lowered(text);
        return Match(lowered, 0, context, end);
    }
    catch (const std::bad_alloc&)
    {
        return false;
    }
}

bool CRegexPattern::Match(const KelvraRegex::LoweredText& text, size_t from, CRegexMatchContext& context,
                          const wchar_t** end) const
{
    if (end != nullptr)
        *end = nullptr;
    if (m_program.code.empty() || from > text.Length())
        return false;
    if (!context.Prepare(m_program.groupCount, m_program.slotCount, text.Original()))
        return false;
    size_t position = from;
    const bool matched = Run(text.Lowered(), text.Length(), from, context, position);
    if (end != nullptr)
        *end = text.Original() + position;
    return matched;
}

// Every read of the text checks the position against length, so nothing past the terminator is
// read whatever the program does.
bool CRegexPattern::Run(const wchar_t* text, size_t length, size_t from, CRegexMatchContext& context,
                        size_t& position) const
{
    const Instruction* const code = m_program.code.data();
    const size_t count = m_program.code.size();
    std::uint64_t* const slots = context.m_slots.data();
    CRegexMatchContext::Span* const captures = context.m_captures.data();
    size_t pos = from;
    size_t pc = 0;
    for (;;)
    {
        if (pc >= count)
            throw CRegexException(CRegexException::kInvalidArgument);
        if (pc == 0)
            context.m_matchStart = pos;
        const Instruction& instruction = code[pc];
        bool failed = false;
        switch (instruction.op)
        {
        case OpCode::Nop:
            ++pc;
            break;
        case OpCode::Char:
            // Char 0 matches the terminator and steps past it.
            if (pos > length || text[pos] != static_cast<wchar_t>(instruction.operand))
            {
                failed = true;
                break;
            }
            ++pos;
            ++pc;
            break;
        case OpCode::AnyChar:
            if (pos >= length)
            {
                failed = true;
                break;
            }
            ++pos;
            ++pc;
            break;
        case OpCode::CharClass:
        case OpCode::NotCharClass:
        {
            if (pos >= length)
            {
                failed = true;
                break;
            }
            const std::uint64_t c = static_cast<std::uint16_t>(text[pos]);
            const size_t after = static_cast<size_t>(instruction.operand);
            const size_t boundsEnd = std::min(after, count);
            bool inside = false;
            for (size_t bound = pc + 1; bound + 1 < boundsEnd; bound += 2)
            {
                if (code[bound].operand <= c && c <= code[bound + 1].operand)
                {
                    inside = true;
                    break;
                }
            }
            if (inside != (instruction.op == OpCode::CharClass))
            {
                failed = true;
                break;
            }
            ++pos;
            pc = after;
            break;
        }
        case OpCode::Jump:
            pc = static_cast<size_t>(instruction.operand);
            break;
        case OpCode::Branch:
            if (!context.Push(pc + 1))
                return false;
            pc = static_cast<size_t>(instruction.operand);
            break;
        case OpCode::Backtrack:
            failed = true;
            break;
        case OpCode::PushPos:
            if (!context.Push(pos))
                return false;
            ++pc;
            break;
        case OpCode::PopPos:
            pos = static_cast<size_t>(context.Pop());
            ++pc;
            break;
        case OpCode::PushSlot:
            if (!context.Push(slots[instruction.operand]))
                return false;
            ++pc;
            break;
        case OpCode::PopSlot:
            slots[instruction.operand] = context.Pop();
            ++pc;
            break;
        case OpCode::SavePos:
            slots[instruction.operand] = pos;
            ++pc;
            break;
        case OpCode::SaveDepth:
            slots[instruction.operand] = context.m_depth;
            ++pc;
            break;
        case OpCode::RestorePos:
            pos = static_cast<size_t>(slots[instruction.operand]);
            ++pc;
            break;
        case OpCode::RestoreDepth:
            context.m_depth = std::min(context.m_depth, static_cast<size_t>(slots[instruction.operand]));
            ++pc;
            break;
        case OpCode::FailIfNoProgress:
            if (pos == slots[instruction.operand])
            {
                failed = true;
                break;
            }
            ++pc;
            break;
        case OpCode::GroupStart:
            captures[instruction.operand].start = pos;
            ++pc;
            break;
        case OpCode::GroupEnd:
            captures[instruction.operand].end = pos;
            ++pc;
            break;
        case OpCode::PushGroup:
        {
            const CRegexMatchContext::Span& span = captures[instruction.operand];
            if (!context.Push(span.start) || !context.Push(span.end))
                return false;
            ++pc;
            break;
        }
        case OpCode::PopGroup:
        {
            CRegexMatchContext::Span& span = captures[instruction.operand];
            span.end = context.Pop();
            span.start = context.Pop();
            ++pc;
            break;
        }
        case OpCode::BackRef:
        {
            // A capture not complete (no end yet, or an end left from an earlier turn before
            // its new start) counts as empty.
            const CRegexMatchContext::Span& span = captures[instruction.operand];
            const bool complete = span.start != CRegexMatchContext::kNull &&
                                  span.end != CRegexMatchContext::kNull && span.end > span.start;
            const size_t n = complete ? static_cast<size_t>(span.end - span.start) : 0;
            for (size_t i = 0; i < n; ++i)
            {
                if (pos + i >= length || text[pos + i] != text[span.start + i])
                {
                    failed = true;
                    break;
                }
            }
            if (failed)
                break;
            pos += n;
            ++pc;
            break;
        }
        case OpCode::Advance:
        {
            // No attempt starts at the end of a non-empty text, nor past the end of an empty one.
            const size_t next = static_cast<size_t>(context.m_matchStart) + 1;
            if (next >= length)
            {
                position = length;
                return false;
            }
            context.m_depth = 0;
            pos = next;
            pc = 0;
            break;
        }
        case OpCode::Stop:
            position = pos;
            return false;
        case OpCode::Accept:
            context.m_matchEnd = pos;
            position = pos;
            return true;
        }
        if (failed)
            pc = static_cast<size_t>(context.Pop());
    }
}
