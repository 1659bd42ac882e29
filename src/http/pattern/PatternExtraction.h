// Field extraction for the HTTP client: every match of a pattern in a header block or body, and
// trimming of the joined result.
#pragma once

#include <string>
#include <vector>

// Collects, in order of appearance, the text of capture group 0 of every match of pattern (syntax
// in RegexPattern.h, case ignored) in text, up to text's first NUL. Each entry keeps the case it
// has in text; an entry equal to an earlier one, ignoring case, is left out. After an empty match
// the search goes on one character further. Returns false, with results empty, for an empty
// pattern or text, a pattern that does not compile, or memory running out; true otherwise,
// matches or not. A pattern without a capture group throws CRegexException(kFailure) at its
// first match. The text is lowered once per call and every match runs on that copy, so a scan
// costs one pass plus the work of its matches. (An attempt of the cookie pattern runs on to the
// next line end: a long text with many "Set-Cookie:" and no line end at all takes time in the
// square of its length. WinHTTP ends every line of a header block with CR LF.)
bool ExtractPatternGroups(const std::wstring& pattern, const std::wstring& text,
                          std::vector<std::wstring>& results);

// text without the leading and trailing characters that occur in set; an empty set leaves it whole.
std::wstring TrimChars(const std::wstring& text, const std::wstring& set);
