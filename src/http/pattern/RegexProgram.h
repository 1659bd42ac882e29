// Second stage of the pattern matcher: the instruction set and the program built from a syntax
// tree. The matcher (RegexPattern.cpp) runs these programs with a backtracking stack.
#pragma once

#include "http/pattern/RegexSyntax.h"

#include <cstdint>
#include <vector>

namespace KelvraRegex
{

// "Next" continues at the following instruction; "fail" pops the top stack entry and continues
// at the instruction index it holds.
enum class OpCode : std::uint8_t
{
    Nop,              // next; also the bounds of a class item, two at a time
    Char,             // operand c: the character must be c (0: the end of the text), then next
    AnyChar,          // any character but the end of the text, then next
    CharClass,        // a character within one of the bound pairs that follow; then go to operand
    NotCharClass,     // a character within none of them; then go to operand
    Jump,             // go to operand
    Branch,           // push index + 1, go to operand
    Backtrack,        // fail
    PushPos,          // push the position
    PopPos,           // position = pop
    PushSlot,         // push slot operand
    PopSlot,          // slot operand = pop
    SavePos,          // slot operand = position
    SaveDepth,        // slot operand = stack depth
    RestorePos,       // position = slot operand
    RestoreDepth,     // stack depth = slot operand
    FailIfNoProgress, // fail when the position equals slot operand
    GroupStart,       // capture operand starts at the position
    GroupEnd,         // capture operand ends at the position
    PushGroup,        // push start, then end, of capture operand
    PopGroup,         // end, then start, of capture operand = pop
    BackRef,          // the text of capture operand again, ignoring case
    Advance,          // try again one character after the current attempt's start
    Stop,             // no match, no further attempt
    Accept,           // match
};

struct Instruction
{
    OpCode op;
    std::uint64_t operand;
};

// The characters with which a way through the program from some instruction can begin, when
// every such way must consume one before it can succeed. The matcher skips a choice whose ways
// all fail on the character at hand: by the rule the code templates keep (RegexProgram.cpp),
// that changes nothing it reports, only the work.
class FirstChars
{
public:
    // A new object admits nothing; Anything() admits every character (nothing is known).
    static FirstChars Anything();

    bool Admits(wchar_t c) const
    {
        if (m_anything)
            return true;
        if (c < 128)
            return (m_ascii[c >> 6] >> (c & 63)) & 1;
        return m_beyondAscii;
    }

    // Units compare as unsigned 16-bit values, as the class instructions compare them.
    void AddRange(std::uint16_t low, std::uint16_t high);
    void AddAllBut(const FirstChars& excluded);
    void Add(const FirstChars& other);

private:
    bool m_anything = false;
    bool m_beyondAscii = false;
    std::uint64_t m_ascii[2] = {0, 0};
};

struct Program
{
    std::vector<Instruction> code;
    std::uint32_t groupCount = 0;
    std::uint32_t slotCount = 0;
    // The character every attempt must find at its start when the pattern begins with a literal
    // (and is not anchored); 0 otherwise. Attempts at other positions would fail at once.
    wchar_t leadingChar = 0;
    // For each Branch instruction, the first characters of the ways through its target.
    std::vector<FirstChars> branchFirstChars;
};

// Builds the program of a tree that ParseRegex accepted. Throws std::bad_alloc, also for a program
// beyond 16,384 instructions (each level of nested '+' doubles the code of its body).
Program BuildProgram(const SyntaxTree& tree);

} // namespace KelvraRegex
