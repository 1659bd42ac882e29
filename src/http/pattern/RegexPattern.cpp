#include "http/pattern/RegexPattern.h"

#include "http/pattern/RegexException.h"
#include "text/AsciiCase.h"

#include <algorithm>
#include <cwchar>
#include <new>
#include <string>

using KelvraRegex::Instruction;
using KelvraRegex::OpCode;

namespace KelvraRegex
{

// One allocation: this copy is made once per scan of a header block, which may be large, so it
// does not go through Strings::ToLower and its extra copy. The copy takes the terminator too.
LoweredText::LoweredText(const wchar_t* original)
    : m_original(original), m_length(std::wcslen(original)), m_lowered(original, m_length + 1)
{
    Kelvra::LowerAscii(m_lowered);
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
        m_outOfMemory = true;
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
        m_outOfMemory = true;
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
    context.m_outOfMemory = false;
    if (text == nullptr)
        return false;
    try
    {
        const KelvraRegex::LoweredText lowered(text);
        return Match(lowered, 0, context, end);
    }
    catch (const std::bad_alloc&)
    {
        context.m_outOfMemory = true;
        return false;
    }
}

bool CRegexPattern::Match(const KelvraRegex::LoweredText& text, size_t from, CRegexMatchContext& context,
                          const wchar_t** end) const
{
    if (end != nullptr)
        *end = nullptr;
    context.m_outOfMemory = false;
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

namespace
{

// Where the next attempt may succeed: the first position from `from` on holding leading, or
// `from` itself when the program has no leading character. length when there is none.
size_t NextCandidate(const wchar_t* text, size_t length, size_t from, wchar_t leading)
{
    if (leading == L'\0' || from >= length)
        return from;
    const wchar_t* found = std::char_traits<wchar_t>::find(text + from, length - from, leading);
    return found == nullptr ? length : static_cast<size_t>(found - text);
}

} // namespace

// Every read of the text checks the position against length, so nothing past the terminator is
// read whatever the program does. The stack lives in locals while the program runs. Each case
// of the switch either goes on (continue), ends the run (return) or fails (goto fail).
bool CRegexPattern::Run(const wchar_t* text, size_t length, size_t from, CRegexMatchContext& context,
                        size_t& position) const
{
    using Span = CRegexMatchContext::Span;
    const Instruction* const code = m_program.code.data();
    const size_t count = m_program.code.size();
    const wchar_t leading = m_program.leadingChar;
    std::uint64_t* const slots = context.m_slots.data();
    Span* const captures = context.m_captures.data();
    std::uint64_t* stack = context.m_stack.data();
    size_t capacity = context.m_stack.size();
    size_t depth = 0;
    size_t pc = 0;

    // An attempt that would fail at once on its leading character is not started at all.
    size_t pos = NextCandidate(text, length, from, leading);
    if (leading != L'\0' && pos >= length)
    {
        position = length;
        return false;
    }

    // The stack depth and the position come by value: a capture by reference would keep them
    // out of registers for the whole loop.
    const auto finish = [&context, &position](size_t endDepth, size_t endPosition, bool matched)
    {
        context.m_depth = endDepth;
        position = endPosition;
        return matched;
    };
    const auto push = [&](std::uint64_t value)
    {
        if (++depth >= capacity)
        {
            if (!context.Grow(depth))
            {
                --depth;
                return false;
            }
            stack = context.m_stack.data();
            capacity = context.m_stack.size();
        }
        stack[depth] = value;
        return true;
    };
    // Entry 0 is never used: popping an empty stack yields 0.
    const auto pop = [&]() -> std::uint64_t { return depth == 0 ? 0 : stack[depth--]; };

    for (;;)
    {
        if (pc >= count)
        {
            context.m_depth = depth;
            throw CRegexException(CRegexException::kInvalidArgument);
        }
        if (pc == 0)
            context.m_matchStart = pos;
        const Instruction& instruction = code[pc];
        const std::uint64_t operand = instruction.operand;
        switch (instruction.op)
        {
        case OpCode::Nop:
            ++pc;
            continue;
        case OpCode::Char:
            // Char 0 matches the terminator and steps past it.
            if (pos > length || text[pos] != static_cast<wchar_t>(operand))
                goto fail;
            ++pos;
            ++pc;
            continue;
        case OpCode::AnyChar:
            if (pos >= length)
                goto fail;
            ++pos;
            ++pc;
            continue;
        case OpCode::CharClass:
        case OpCode::NotCharClass:
        {
            if (pos >= length)
                goto fail;
            const std::uint64_t c = static_cast<std::uint16_t>(text[pos]);
            const size_t boundsEnd = std::min(static_cast<size_t>(operand), count);
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
                goto fail;
            ++pos;
            pc = static_cast<size_t>(operand);
            continue;
        }
        case OpCode::Jump:
            pc = static_cast<size_t>(operand);
            continue;
        case OpCode::Branch:
            // A target whose every way fails on this character would only be tried and undone
            // (the rule stated with the code templates in RegexProgram.cpp).
            if (pos <= length && !m_program.branchFirstChars[pc].Admits(text[pos]))
            {
                ++pc;
                continue;
            }
            if (!push(pc + 1))
                return finish(depth, pos, false);
            pc = static_cast<size_t>(operand);
            continue;
        case OpCode::Backtrack:
            goto fail;
        case OpCode::PushPos:
            if (!push(pos))
                return finish(depth, pos, false);
            ++pc;
            continue;
        case OpCode::PopPos:
            pos = static_cast<size_t>(pop());
            ++pc;
            continue;
        case OpCode::PushSlot:
            if (!push(slots[operand]))
                return finish(depth, pos, false);
            ++pc;
            continue;
        case OpCode::PopSlot:
            slots[operand] = pop();
            ++pc;
            continue;
        case OpCode::SavePos:
            slots[operand] = pos;
            ++pc;
            continue;
        case OpCode::SaveDepth:
            slots[operand] = depth;
            ++pc;
            continue;
        case OpCode::RestorePos:
            pos = static_cast<size_t>(slots[operand]);
            ++pc;
            continue;
        case OpCode::RestoreDepth:
            depth = std::min(depth, static_cast<size_t>(slots[operand]));
            ++pc;
            continue;
        case OpCode::FailIfNoProgress:
            if (pos == slots[operand])
                goto fail;
            ++pc;
            continue;
        case OpCode::GroupStart:
            captures[operand].start = pos;
            ++pc;
            continue;
        case OpCode::GroupEnd:
            captures[operand].end = pos;
            ++pc;
            continue;
        case OpCode::PushGroup:
            if (!push(captures[operand].start) || !push(captures[operand].end))
                return finish(depth, pos, false);
            ++pc;
            continue;
        case OpCode::PopGroup:
            captures[operand].end = pop();
            captures[operand].start = pop();
            ++pc;
            continue;
        case OpCode::BackRef:
        {
            // A capture not complete (no end yet, or an end left from an earlier turn before
            // its new start) counts as empty.
            const Span& span = captures[operand];
            const bool complete = span.start != CRegexMatchContext::kNull &&
                                  span.end != CRegexMatchContext::kNull && span.end > span.start;
            const size_t n = complete ? static_cast<size_t>(span.end - span.start) : 0;
            size_t i = 0;
            while (i < n && pos + i < length && text[pos + i] == text[span.start + i])
                ++i;
            if (i < n)
                goto fail;
            pos += n;
            ++pc;
            continue;
        }
        case OpCode::Advance:
        {
            // No attempt starts at the end of a non-empty text, nor past the end of an empty one.
            const size_t next =
                NextCandidate(text, length, static_cast<size_t>(context.m_matchStart) + 1, leading);
            if (next >= length)
            {
                pos = length;
                return finish(depth, pos, false);
            }
            depth = 0;
            pos = next;
            pc = 0;
            continue;
        }
        case OpCode::Stop:
            return finish(depth, pos, false);
        case OpCode::Accept:
            context.m_matchEnd = pos;
            return finish(depth, pos, true);
        }
    fail:
        // Backtrack: resume at the instruction index on top of the stack.
        pc = static_cast<size_t>(pop());
    }
}
