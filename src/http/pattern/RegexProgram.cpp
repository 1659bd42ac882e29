#include "http/pattern/RegexProgram.h"

#include <algorithm>
#include <cassert>
#include <new>

namespace KelvraRegex
{

namespace
{

// Each level of nested '+' doubles the code of its body (x+ is x, then x* over a second copy of
// x), so that a pattern of 60 characters could ask for millions of instructions. A program beyond
// this size is refused as if memory ran out, like a pattern nested too deep.
constexpr size_t kMaxInstructions = 1 << 14;

// How many instructions the first-character search of one Branch visits before it gives up and
// admits everything: the answer only saves work, and without a bound a program of many choices
// would take time in the square of its size to build.
constexpr size_t kFirstCharsReach = 1024;

// Emits the code templates of each construct. Indices in comments are relative to the first
// instruction of the construct; "after" is the index just past its code.
//
// Every template keeps one rule, on which the matcher's first-character shortcut relies: the
// resume point of a Branch (the instruction after it, where a failed target comes back), after
// restoring at most captures and slots, fails, restores the position the Branch saw (PopPos,
// RestorePos) or begins the next attempt (Advance, Stop). Going on at the resume point at once,
// instead of trying a target that must fail on the character at hand, then ends where the try
// would have ended. BuildProgram checks the rule in debug builds.
class Builder
{
public:
    explicit Builder(Program& program) : m_program(program) {}

    void Emit(const Node& node);

private:
    size_t Here() const { return m_program.code.size(); }

    size_t Add(OpCode op, std::uint64_t operand = 0)
    {
        if (m_program.code.size() >= kMaxInstructions)
            throw std::bad_alloc();
        m_program.code.push_back(Instruction{op, operand});
        return m_program.code.size() - 1;
    }

    void PointAt(size_t at, size_t target) { m_program.code[at].operand = target; }

    std::uint32_t NewSlot() { return m_program.slotCount++; }

    void EmitGroupBody(const Node& sequence);
    void EmitRepeat(const Node& repeat);
    void EmitGreedyLoop(const Node& body, bool repeatBody);
    void EmitLazyLoop(const Node& body);

    Program& m_program;
};

void Builder::Emit(const Node& node)
{
    switch (node.kind)
    {
    case NodeKind::Sequence:
        for (const auto& unit : node.children)
            Emit(*unit);
        break;
    case NodeKind::Char:
        Add(OpCode::Char, static_cast<std::uint16_t>(node.character));
        break;
    case NodeKind::AnyChar:
        Add(OpCode::AnyChar);
        break;
    case NodeKind::Class:
    {
        // The class instruction, then one pair of bound slots per item.
        const size_t test = Add(node.negated ? OpCode::NotCharClass : OpCode::CharClass);
        for (const ClassRange& range : node.ranges)
        {
            Add(OpCode::Nop, static_cast<std::uint16_t>(range.low));
            Add(OpCode::Nop, static_cast<std::uint16_t>(range.high));
        }
        PointAt(test, Here());
        break;
    }
    case NodeKind::Capture:
    {
        // 0 PushGroup, 1 GroupStart, 2 Branch body, 3 PopGroup, 4 Backtrack, body, GroupEnd:
        // backtracking out of the group restores the capture it had before.
        Add(OpCode::PushGroup, node.group);
        Add(OpCode::GroupStart, node.group);
        const size_t branch = Add(OpCode::Branch);
        Add(OpCode::PopGroup, node.group);
        Add(OpCode::Backtrack);
        PointAt(branch, Here());
        EmitGroupBody(*node.children[0]);
        Add(OpCode::GroupEnd, node.group);
        break;
    }
    case NodeKind::Group:
    {
        const size_t branch = Add(OpCode::Branch);
        Add(OpCode::Backtrack);
        PointAt(branch, Here());
        EmitGroupBody(*node.children[0]);
        break;
    }
    case NodeKind::NotAhead:
    {
        // 0 SavePos a, 1 SaveDepth b, 2 Branch atom, 3 RestorePos a, 4 RestoreDepth b, 5 Jump
        // after, atom, RestorePos a, RestoreDepth b, Backtrack. An atom that matches drops its
        // own choices and fails the whole look-ahead.
        const std::uint32_t position = NewSlot();
        const std::uint32_t depth = NewSlot();
        Add(OpCode::SavePos, position);
        Add(OpCode::SaveDepth, depth);
        const size_t branch = Add(OpCode::Branch);
        Add(OpCode::RestorePos, position);
        Add(OpCode::RestoreDepth, depth);
        const size_t jump = Add(OpCode::Jump);
        PointAt(branch, Here());
        Emit(*node.children[0]);
        Add(OpCode::RestorePos, position);
        Add(OpCode::RestoreDepth, depth);
        Add(OpCode::Backtrack);
        PointAt(jump, Here());
        break;
    }
    case NodeKind::Alternation:
    {
        // 0 PushPos, 1 Branch 4, 2 PopPos, 3 Jump second, 4 first, Jump after, second.
        Add(OpCode::PushPos);
        const size_t branch = Add(OpCode::Branch);
        Add(OpCode::PopPos);
        const size_t toSecond = Add(OpCode::Jump);
        PointAt(branch, Here());
        Emit(*node.children[0]);
        const size_t toAfter = Add(OpCode::Jump);
        PointAt(toSecond, Here());
        Emit(*node.children[1]);
        PointAt(toAfter, Here());
        break;
    }
    case NodeKind::Repeat:
        EmitRepeat(node);
        break;
    case NodeKind::BackRef:
        Add(OpCode::BackRef, node.group);
        break;
    }
}

void Builder::EmitGroupBody(const Node& sequence)
{
    if (sequence.children.empty())
        Add(OpCode::Nop);
    else
        Emit(sequence);
}

// x+ is x followed by x* over a second copy of x: same groups, slots of its own.
void Builder::EmitRepeat(const Node& repeat)
{
    const Node& body = *repeat.children[0];
    switch (repeat.quantifier)
    {
    case Quantifier::Star:
        repeat.lazy ? EmitLazyLoop(body) : EmitGreedyLoop(body, true);
        break;
    case Quantifier::Plus:
        Emit(body);
        repeat.lazy ? EmitLazyLoop(body) : EmitGreedyLoop(body, true);
        break;
    case Quantifier::Optional:
        if (repeat.lazy)
        {
            // 0 PushPos, 1 Branch after, 2 PopPos, 3 body: going on without the body is tried
            // first; the body then starts where the loop was, whatever that attempt consumed.
            Add(OpCode::PushPos);
            const size_t branch = Add(OpCode::Branch);
            Add(OpCode::PopPos);
            Emit(body);
            PointAt(branch, Here());
        }
        else
        {
            EmitGreedyLoop(body, false);
        }
        break;
    }
}

// 0 PushSlot m, 1 SavePos m, 2 PushPos, 3 Branch 7, 4 PopPos, 5 PopSlot m, 6 Jump after, 7 body,
// FailIfNoProgress m, and for '*' Jump 0. A turn of the body that consumed nothing fails, which
// ends the loop. Slot m holds the start of the current turn: a turn that gives up restores the
// start of the one before it, so that a later way through that turn's body is held to that turn's
// own start. (Saving the position into m again after the check would leave the end of the earlier
// turn there instead, and a way back to the earlier turn's start would then count as progress and
// turn the loop forever.)
void Builder::EmitGreedyLoop(const Node& body, bool repeatBody)
{
    const std::uint32_t slot = NewSlot();
    const size_t start = Add(OpCode::PushSlot, slot);
    Add(OpCode::SavePos, slot);
    Add(OpCode::PushPos);
    const size_t branch = Add(OpCode::Branch);
    Add(OpCode::PopPos);
    Add(OpCode::PopSlot, slot);
    const size_t toAfter = Add(OpCode::Jump);
    PointAt(branch, Here());
    Emit(body);
    Add(OpCode::FailIfNoProgress, slot);
    if (repeatBody)
        Add(OpCode::Jump, start);
    PointAt(toAfter, Here());
}

// 0 PushPos, 1 Branch after, 2 PopPos, 3 body, Jump 0: what follows the loop is tried first, one
// more turn only when it fails, from the position the turn began at (what follows may have
// consumed text before failing). A body that can finish without consuming text (a back-reference
// to an empty capture, a look-ahead) would turn forever, so it gets a progress check on its own
// slot: 0 PushPos, 1 Branch after, 2 PopPos, 3 PushSlot m, 4 SavePos m, 5 Branch 8, 6 PopSlot m,
// 7 Backtrack, 8 body, FailIfNoProgress m, Jump 0.
void Builder::EmitLazyLoop(const Node& body)
{
    const size_t start = Add(OpCode::PushPos);
    const size_t branch = Add(OpCode::Branch);
    Add(OpCode::PopPos);
    if (body.mayConsumeNothing)
    {
        const std::uint32_t slot = NewSlot();
        Add(OpCode::PushSlot, slot);
        Add(OpCode::SavePos, slot);
        const size_t turn = Add(OpCode::Branch);
        Add(OpCode::PopSlot, slot);
        Add(OpCode::Backtrack);
        PointAt(turn, Here());
        Emit(body);
        Add(OpCode::FailIfNoProgress, slot);
    }
    else
    {
        Emit(body);
    }
    Add(OpCode::Jump, start);
    PointAt(branch, Here());
}

// The first characters of the ways from instruction start. Instructions that move nothing are
// followed; both ways of a Branch count, since by the rule of the templates its resume point
// fails or restores the position the Branch saw. Anything that can succeed, or restore a position,
// without consuming (Accept, a look-ahead, a back-reference) makes the answer Anything.
// visitedBy holds, for each instruction, the last search that visited it; search names this one.
FirstChars FirstCharsFrom(const std::vector<Instruction>& code, size_t start, std::vector<size_t>& visitedBy,
                          size_t search)
{
    FirstChars first;
    size_t visits = 0;
    std::vector<size_t> pending{start};
    while (!pending.empty())
    {
        const size_t at = pending.back();
        pending.pop_back();
        if (at >= code.size())
            return FirstChars::Anything();
        if (visitedBy[at] == search)
            continue;
        if (++visits > kFirstCharsReach)
            return FirstChars::Anything();
        visitedBy[at] = search;
        const Instruction& instruction = code[at];
        const auto operand = static_cast<std::uint16_t>(instruction.operand);
        switch (instruction.op)
        {
        case OpCode::Char:
            first.AddRange(operand, operand);
            break;
        case OpCode::AnyChar:
            first.AddRange(1, 0xFFFF);
            break;
        case OpCode::CharClass:
        case OpCode::NotCharClass:
        {
            FirstChars items;
            for (size_t bound = at + 1; bound + 1 < instruction.operand && bound + 1 < code.size();
                 bound += 2)
                items.AddRange(static_cast<std::uint16_t>(code[bound].operand),
                               static_cast<std::uint16_t>(code[bound + 1].operand));
            if (instruction.op == OpCode::CharClass)
                first.Add(items);
            else
                first.AddAllBut(items);
            break;
        }
        case OpCode::Jump:
            pending.push_back(static_cast<size_t>(instruction.operand));
            break;
        case OpCode::Branch:
            pending.push_back(static_cast<size_t>(instruction.operand));
            pending.push_back(at + 1);
            break;
        case OpCode::Backtrack:
            break;
        case OpCode::Nop:
        case OpCode::PushPos:
        case OpCode::PopPos:
        case OpCode::PushSlot:
        case OpCode::PopSlot:
        case OpCode::SavePos:
        case OpCode::SaveDepth:
        case OpCode::FailIfNoProgress:
        case OpCode::GroupStart:
        case OpCode::GroupEnd:
        case OpCode::PushGroup:
        case OpCode::PopGroup:
            pending.push_back(at + 1);
            break;
        case OpCode::RestorePos:
        case OpCode::RestoreDepth:
        case OpCode::BackRef:
        case OpCode::Advance:
        case OpCode::Stop:
        case OpCode::Accept:
            return FirstChars::Anything();
        }
    }
    return first;
}

// The rule of the templates (see Builder): each Branch's resume point, past PopGroup and
// PopSlot, fails or restores the position.
[[maybe_unused]] bool ResumePointsFailOrRestore(const std::vector<Instruction>& code)
{
    for (size_t at = 0; at < code.size(); ++at)
    {
        if (code[at].op != OpCode::Branch)
            continue;
        size_t resume = at + 1;
        while (resume < code.size() &&
               (code[resume].op == OpCode::PopGroup || code[resume].op == OpCode::PopSlot))
            ++resume;
        const OpCode op = resume < code.size() ? code[resume].op : OpCode::Nop;
        if (op != OpCode::Backtrack && op != OpCode::PopPos && op != OpCode::RestorePos &&
            op != OpCode::Advance && op != OpCode::Stop)
            return false;
    }
    return true;
}

} // namespace

FirstChars FirstChars::Anything()
{
    FirstChars anything;
    anything.m_anything = true;
    return anything;
}

void FirstChars::AddRange(std::uint16_t low, std::uint16_t high)
{
    for (unsigned c = low; c <= high && c < 128; ++c)
        m_ascii[c >> 6] |= std::uint64_t{1} << (c & 63);
    if (high >= 128)
        m_beyondAscii = true;
}

void FirstChars::AddAllBut(const FirstChars& excluded)
{
    // Any character but the excluded ones and the end of the text.
    m_ascii[0] |= ~excluded.m_ascii[0] & ~std::uint64_t{1};
    m_ascii[1] |= ~excluded.m_ascii[1];
    m_beyondAscii = true;
}

void FirstChars::Add(const FirstChars& other)
{
    m_anything = m_anything || other.m_anything;
    m_beyondAscii = m_beyondAscii || other.m_beyondAscii;
    m_ascii[0] |= other.m_ascii[0];
    m_ascii[1] |= other.m_ascii[1];
}

Program BuildProgram(const SyntaxTree& tree)
{
    // 0 Branch 2, 1 Advance (Stop when anchored), 2 the pattern, Accept.
    Program program;
    program.groupCount = tree.groupCount;
    Builder builder(program);
    program.code.push_back(Instruction{OpCode::Branch, 2});
    program.code.push_back(Instruction{tree.anchored ? OpCode::Stop : OpCode::Advance, 0});
    builder.Emit(*tree.root);
    program.code.push_back(Instruction{OpCode::Accept, 0});
    assert(ResumePointsFailOrRestore(program.code));
    if (!tree.anchored && program.code[2].op == OpCode::Char)
        program.leadingChar = static_cast<wchar_t>(program.code[2].operand);
    // A way that fails can still leave a capture end behind (GroupEnd is undone only when the
    // whole group is backtracked out of), and a back-reference inside the group sees it: with
    // back-references every way is tried.
    program.branchFirstChars.assign(program.code.size(), FirstChars::Anything());
    const bool backReferences =
        std::any_of(program.code.begin(), program.code.end(),
                    [](const Instruction& instruction) { return instruction.op == OpCode::BackRef; });
    std::vector<size_t> visitedBy(program.code.size(), program.code.size());
    for (size_t at = 0; at < program.code.size() && !backReferences; ++at)
    {
        if (program.code[at].op == OpCode::Branch)
            program.branchFirstChars[at] =
                FirstCharsFrom(program.code, static_cast<size_t>(program.code[at].operand), visitedBy, at);
    }
    return program;
}

} // namespace KelvraRegex
