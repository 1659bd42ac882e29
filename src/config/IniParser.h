// The line parser behind INIReader: reads an INI file from an open stream and hands every
// name/value pair to a handler.
#pragma once

#include <cstdio>
#include <cwchar>

namespace Kelvra
{

// Called for every pair and every continuation line with the user pointer given to
// ParseIniStream. The texts are NUL-terminated and valid only during the call. Nonzero accepts
// the pair; 0 makes its line bad (parsing goes on).
using IniHandler = int (*)(void* user, const wchar_t* section, const wchar_t* name, const wchar_t* value);

// Reads `stream` (opened in text mode: each byte of the file one wide character) to its end and
// returns 0 when every line was accepted, otherwise the number of the first bad line. Line
// numbers count reads of at most 199 characters, so a longer physical line takes one number per
// piece. The stream stays open; a read error ends the parse like the end of the stream.
//
// Beyond the usual INI rules:
// - White space is U+0009..U+000D and U+0020 only. U+0085 and U+00A0 are not, because they
//   arrive here as the bytes 0x85 and 0xA0, which are also the last bytes of UTF-8 letters
//   such as U+00C5 and U+00E0: stripping them would cut such letters in half.
// - A physical line longer than 199 characters is read in pieces that keep one line number
//   each, but only its first piece is parsed; the other pieces are skipped rather than parsed
//   as lines of their own, so the tail of a long value never turns into a pair. The line is
//   taken when its content ends in the first piece: a comment, a header closed there, or a
//   pair or continuation whose text ends there, with at most white space (and, after a pair,
//   an inline comment) beyond it. Otherwise the line is refused as a bad line.
// - A section name or a pair's name longer than 49 characters is refused too: nothing is cut.
// - Nothing after a refused line is filed under a name or section before it. A refused pair
//   (or continuation) ends the previous pair: indented lines after it continue nothing and are
//   dropped. A refused header leaves no known section: the lines up to the next good header
//   are dropped (the header's line is the error).
int ParseIniStream(std::FILE* stream, IniHandler handler, void* user);

// Where the parser's text comes from: ParseIniStream reads a file with the runtime's wide line
// reader; the native fuzzing build, which has no such file, reads memory.
class IniLineReader
{
public:
    virtual ~IniLineReader() = default;
    // Reads as fgetws does: up to and including the first line end, at most size - 1 characters,
    // then a NUL. False when nothing is left or the read fails.
    virtual bool ReadLine(wchar_t* buffer, int size) = 0;
    // The next character, left unread; WEOF when nothing is left.
    virtual std::wint_t Peek() = 0;
};

// ParseIniStream over the reads of any reader.
int ParseIniLines(IniLineReader& lines, IniHandler handler, void* user);

} // namespace Kelvra
