#include "config/IniParser.h"

#include <climits>
#include <cwchar>

namespace Kelvra
{

namespace
{

// One read: at most 199 characters plus the terminating NUL.
constexpr int kLineSize = 200;
// Current section and previous name: at most 49 characters plus the terminating NUL.
constexpr size_t kNameSize = 50;

bool IsSpace(wchar_t c)
{
    return c == L' ' || (c >= L'\t' && c <= L'\r');
}

wchar_t* SkipSpace(wchar_t* text)
{
    while (IsSpace(*text))
        ++text;
    return text;
}

void StripTrailingSpace(wchar_t* text)
{
    wchar_t* end = text + std::wcslen(text);
    while (end > text && IsSpace(end[-1]))
        *--end = L'\0';
}

// Stops at the end of the text, at `stop`, or at an inline comment: a ';' right after white
// space seen in this scan (so the first character scanned never opens a comment).
wchar_t* ScanFor(wchar_t* text, wchar_t stop)
{
    bool afterSpace = false;
    while (*text != L'\0' && *text != stop && !(afterSpace && *text == L';'))
    {
        afterSpace = IsSpace(*text);
        ++text;
    }
    return text;
}

// Refuses a name that does not fit rather than cutting it: a cut name would file its values
// under a section or key the file never wrote.
bool CopyName(wchar_t (&target)[kNameSize], const wchar_t* name)
{
    const size_t length = std::wcslen(name);
    if (length >= kNameSize)
        return false;
    std::wmemcpy(target, name, length + 1);
    return true;
}

// A text-mode file, read by the runtime: each byte one character, CR LF as LF.
class FileLineReader : public IniLineReader
{
public:
    explicit FileLineReader(std::FILE* stream) : m_stream(stream) {}

    bool ReadLine(wchar_t* buffer, int size) override
    {
        return std::fgetws(buffer, size, m_stream) != nullptr;
    }

    std::wint_t Peek() override
    {
        const std::wint_t next = std::fgetwc(m_stream);
        if (next != WEOF)
            std::ungetwc(next, m_stream);
        return next;
    }

private:
    std::FILE* m_stream;
};

enum class Piece
{
    End,   // nothing more to read
    Whole, // the read holds the rest of its physical line
    Cut,   // the physical line goes on beyond the read
};

// What a physical line holds beyond its first read.
enum class Rest
{
    None,          // nothing: the line ended within the read
    Blank,         // white space only
    InlineComment, // white space, then an inline comment
    Text,          // more of the line's content
};

class Parser
{
public:
    Parser(IniHandler handler, void* user) : m_handler(handler), m_user(user) {}

    int Run(IniLineReader& lines)
    {
        wchar_t line[kLineSize];
        for (;;)
        {
            const Piece piece = Read(lines, line);
            if (piece == Piece::End)
                return m_firstError;
            const int lineNumber = m_lineNumber;
            const Rest rest =
                piece == Piece::Cut ? SkipRest(lines, IsSpace(line[kLineSize - 2])) : Rest::None;
            if (!ParseLine(line, lineNumber == 1, rest) && m_firstError == 0)
                m_firstError = lineNumber;
        }
    }

private:
    // Reads at most 199 characters, which count as one line.
    Piece Read(IniLineReader& lines, wchar_t (&piece)[kLineSize])
    {
        // fgetws writes its terminating NUL into the last slot only when a read fills the
        // buffer; the line itself may hold NUL characters, so its length cannot tell.
        piece[kLineSize - 1] = L'\x1';
        if (!lines.ReadLine(piece, kLineSize))
            return Piece::End;
        if (m_lineNumber < INT_MAX)
            ++m_lineNumber;
        const bool filled = piece[kLineSize - 1] == L'\0' && piece[kLineSize - 2] != L'\n';
        return filled && LineGoesOn(lines) ? Piece::Cut : Piece::Whole;
    }

    // After a read that filled the buffer without reaching a line end: whether the physical line
    // has more characters. A line end that just missed the buffer is left for the next read,
    // which then counts as a line of its own.
    static bool LineGoesOn(IniLineReader& lines)
    {
        const std::wint_t next = lines.Peek();
        return next != WEOF && next != L'\n';
    }

    // Reads the rest of a cut line and tells what it holds. afterSpace: the first read ended in
    // white space, so that a ';' right at the start of the rest opens an inline comment.
    Rest SkipRest(IniLineReader& lines, bool afterSpace)
    {
        wchar_t piece[kLineSize];
        Rest rest = Rest::Blank;
        Piece read = Piece::Cut;
        while (read == Piece::Cut && (read = Read(lines, piece)) != Piece::End)
        {
            for (const wchar_t* c = piece; rest == Rest::Blank && *c != L'\0'; ++c)
            {
                if (*c == L';' && afterSpace)
                    rest = Rest::InlineComment;
                else if (!IsSpace(*c))
                    rest = Rest::Text;
                afterSpace = true;
            }
        }
        return rest;
    }

    // Parses the first read of a line; rest tells what the line holds beyond it. False: a bad
    // line.
    bool ParseLine(wchar_t* line, bool firstLine, Rest rest)
    {
        wchar_t* start = line;
        if (firstLine && start[0] == 0xEF && start[1] == 0xBB && start[2] == 0xBF)
            start += 3; // a UTF-8 byte-order mark, read byte by byte
        StripTrailingSpace(start);
        start = SkipSpace(start);
        if (*start == L';' || *start == L'#')
            return true;
        if (m_sectionRefused && *start != L'[')
            return true; // no known section: its header's line is the error
        if (*start != L'\0' && start > line)
        {
            // An indented line continues the previous pair, whole, inline comments included.
            if (m_pairRefused)
                return true; // the refused line is the error
            if (m_previousName[0] != L'\0')
                return rest == Rest::None || rest == Rest::Blank ? Report(m_previousName, start)
                                                                 : RefusePair();
        }
        if (*start == L'[')
            return ParseHeader(start, rest);
        if (*start == L'\0')
            return rest != Rest::Text || RefusePair(); // blank in this read, but not beyond it
        return ParsePair(start, rest);
    }

    bool ParseHeader(wchar_t* start, Rest rest)
    {
        wchar_t* end = ScanFor(start + 1, L']');
        if (*end != L']')
            return rest == Rest::Text ? RefuseHeader() : false;
        *end = L'\0';
        if (!CopyName(m_section, start + 1))
            return RefuseHeader();
        m_previousName[0] = L'\0';
        m_pairRefused = false;
        m_sectionRefused = false;
        return true;
    }

    bool ParsePair(wchar_t* start, Rest rest)
    {
        wchar_t* separator = ScanFor(start, L'=');
        if (*separator != L'=')
        {
            separator = ScanFor(start, L':');
            if (*separator != L':')
                return rest == Rest::Text ? RefusePair() : false;
        }
        *separator = L'\0';
        StripTrailingSpace(start);
        wchar_t* value = SkipSpace(separator + 1);
        wchar_t* valueEnd = ScanFor(value, L'\0');
        if (*valueEnd != L';' && rest == Rest::Text)
            return RefusePair(); // the value goes on beyond this read
        *valueEnd = L'\0';
        StripTrailingSpace(value);
        if (!CopyName(m_previousName, start))
            return RefusePair();
        m_pairRefused = false;
        return Report(start, value);
    }

    // A line the parser does not take because of its own limits (read size, name size). What
    // follows must not be filed under the names before it: a refused pair ends the previous
    // pair, and a refused header leaves no known section until the next good one.
    bool RefusePair()
    {
        m_previousName[0] = L'\0';
        m_pairRefused = true;
        return false;
    }

    bool RefuseHeader()
    {
        m_previousName[0] = L'\0';
        m_pairRefused = false;
        m_sectionRefused = true;
        return false;
    }

    bool Report(const wchar_t* name, const wchar_t* value)
    {
        return m_handler(m_user, m_section, name, value) != 0;
    }

    IniHandler m_handler;
    void* m_user;
    wchar_t m_section[kNameSize] = L"";
    wchar_t m_previousName[kNameSize] = L"";
    bool m_pairRefused = false;
    bool m_sectionRefused = false;
    int m_lineNumber = 0;
    int m_firstError = 0;
};

} // namespace

int ParseIniLines(IniLineReader& lines, IniHandler handler, void* user)
{
    return Parser(handler, user).Run(lines);
}

int ParseIniStream(std::FILE* stream, IniHandler handler, void* user)
{
    FileLineReader lines(stream);
    return ParseIniLines(lines, handler, user);
}

} // namespace Kelvra
