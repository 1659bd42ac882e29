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

// After a read that filled the buffer without reaching a line end: whether the physical line
// has more characters. A line end that just missed the buffer is left for the next read, which
// then counts as a line of its own.
bool LineGoesOn(std::FILE* stream)
{
    const wint_t next = std::fgetwc(stream);
    if (next == WEOF)
        return false;
    std::ungetwc(next, stream);
    return next != L'\n';
}

class Parser
{
public:
    Parser(IniHandler handler, void* user) : m_handler(handler), m_user(user) {}

    int Run(std::FILE* stream)
    {
        wchar_t line[kLineSize];
        bool inTail = false;
        for (;;)
        {
            // fgetws writes its terminating NUL into the last slot only when a read fills the
            // buffer; the line itself may hold NUL characters, so its length cannot tell.
            line[kLineSize - 1] = L'\x1';
            if (std::fgetws(line, kLineSize, stream) == nullptr)
                return m_firstError;
            if (m_lineNumber < INT_MAX)
                ++m_lineNumber;
            const bool filled = line[kLineSize - 1] == L'\0' && line[kLineSize - 2] != L'\n';
            const bool cut = filled && LineGoesOn(stream);
            if (!inTail && !ParseLine(line, cut) && m_firstError == 0)
                m_firstError = m_lineNumber;
            inTail = cut;
        }
    }

private:
    // Parses one read; `cut` says that the physical line goes on beyond it. False: a bad line.
    bool ParseLine(wchar_t* line, bool cut)
    {
        wchar_t* start = line;
        if (m_lineNumber == 1 && start[0] == 0xEF && start[1] == 0xBB && start[2] == 0xBF)
            start += 3; // a UTF-8 byte-order mark, read byte by byte
        StripTrailingSpace(start);
        start = SkipSpace(start);
        if (*start == L';' || *start == L'#')
            return true;
        if (m_previousName[0] != L'\0' && *start != L'\0' && start > line)
            // A continuation is handed over whole, inline comments included: a cut one is
            // incomplete.
            return !cut && Report(m_previousName, start);
        if (*start == L'[')
            return ParseHeader(start);
        if (*start == L'\0')
            return !cut; // blank so far, but what the line holds lies beyond this read
        return ParsePair(start, cut);
    }

    bool ParseHeader(wchar_t* start)
    {
        wchar_t* end = ScanFor(start + 1, L']');
        if (*end != L']')
            return false;
        *end = L'\0';
        if (!CopyName(m_section, start + 1))
            return false;
        m_previousName[0] = L'\0';
        return true;
    }

    bool ParsePair(wchar_t* start, bool cut)
    {
        wchar_t* separator = ScanFor(start, L'=');
        if (*separator != L'=')
        {
            separator = ScanFor(start, L':');
            if (*separator != L':')
                return false;
        }
        *separator = L'\0';
        StripTrailingSpace(start);
        wchar_t* value = SkipSpace(separator + 1);
        wchar_t* valueEnd = ScanFor(value, L'\0');
        const bool commentFollows = *valueEnd == L';';
        if (cut && !commentFollows)
            return false; // the value goes on beyond this read
        *valueEnd = L'\0';
        StripTrailingSpace(value);
        if (!CopyName(m_previousName, start))
            return false;
        return Report(start, value);
    }

    bool Report(const wchar_t* name, const wchar_t* value)
    {
        return m_handler(m_user, m_section, name, value) != 0;
    }

    IniHandler m_handler;
    void* m_user;
    wchar_t m_section[kNameSize] = L"";
    wchar_t m_previousName[kNameSize] = L"";
    int m_lineNumber = 0;
    int m_firstError = 0;
};

} // namespace

int ParseIniStream(std::FILE* stream, IniHandler handler, void* user)
{
    return Parser(handler, user).Run(stream);
}

} // namespace Kelvra
