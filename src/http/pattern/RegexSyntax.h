// First stage of the pattern matcher: the pattern text read into a tree, with every compile error
// found here. The program builder turns the tree into instructions; tests also walk it directly.
#pragma once

#include <cstdint>
#include <memory>
#include <vector>

namespace KelvraRegex
{

// Results of compiling a pattern (CRegexPattern::Parse).
enum CompileError : int
{
    kCompiled = 0,
    kOutOfMemory = 1,      // also for a pattern nested too deep or a program too large
    kCaptureNotClosed = 2, // '}' expected
    kGroupNotClosed = 3,   // ')' expected
    kClassNotClosed = 4,   // ']' expected, or a range without its high end
    kAbbreviationFailed = 5,
    kEmptyClass = 6,
    kUnknownGroup = 7, // back-reference to a group not opened yet
    kReversedRange = 8,
    kRepeatedEmpty = 9, // '*', '+', '*?' or '+?' on something that can match nothing
};

enum class NodeKind
{
    Sequence, // children: the units, in order
    Char,     // character; 0 is the end of the text
    AnyChar,
    Class,       // ranges, negated
    Capture,     // group; children[0]: its sequence
    Group,       // children[0]: its sequence
    NotAhead,    // children[0]: the atom that must not match here
    Alternation, // children[0] tried first, then children[1]
    Repeat,      // children[0] repeated as quantifier and lazy say
    BackRef,     // group
};

enum class Quantifier
{
    Star,
    Plus,
    Optional,
};

struct ClassRange
{
    wchar_t low;
    wchar_t high;
};

struct Node
{
    explicit Node(NodeKind nodeKind) : kind(nodeKind) {}

    NodeKind kind;
    wchar_t character = 0;
    bool negated = false;
    std::vector<ClassRange> ranges;
    std::uint32_t group = 0;
    Quantifier quantifier = Quantifier::Star;
    bool lazy = false;
    std::vector<std::unique_ptr<Node>> children;
    // Whether the compiler counts the construct as able to match the empty string; this decides
    // compile error 9. A back-reference counts as not, a look-ahead as its atom does, and every
    // lazy quantifier as able to.
    bool canBeEmpty = false;
    // Whether it really can finish without consuming text: also true for back-references (an
    // empty capture) and look-aheads. Lazy loops over such a body need a progress check.
    bool mayConsumeNothing = false;
};

struct SyntaxTree
{
    std::unique_ptr<Node> root; // a Sequence
    bool anchored = false;      // the pattern began with '^'
    std::uint32_t groupCount = 0;
};

// Reads a pattern (lower-cased first, so that matching ignores case) into tree. Returns
// kCompiled or the first compile error; the tree is complete only on kCompiled. A null pattern
// reads as an empty one. Throws std::bad_alloc when memory runs out.
int ParseRegex(const wchar_t* pattern, SyntaxTree& tree);

} // namespace KelvraRegex
