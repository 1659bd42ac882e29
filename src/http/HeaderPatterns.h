// The patterns the HTTP client runs through ExtractPatternGroups (syntax in RegexPattern.h).
#pragma once

namespace KelvraHeaderPatterns
{

// Over the raw response header block. "\b" is a blank or tab, "\n" a line end.
constexpr const wchar_t* kCharset = L"charset={[A-Za-z0-9\\-_]+}";
constexpr const wchar_t* kContentLength = L"Content-Length: {[0-9]+}";
// Only a value of digits right after "Location: ".
constexpr const wchar_t* kLocation = L"Location: {[0-9]+}";
// The whole Location value, URL or path, up to its line end; the line must start with the name,
// so that a Content-Location header is not taken for it.
constexpr const wchar_t* kLocationValue = L"\\nLocation:\\b*{.+?}\\n";
// One entry per distinct cookie line: the text after the colon and its blanks, up to the line end.
constexpr const wchar_t* kCookies = L"Set-Cookie:\\b*{.+?}\\n";

// Over the decoded body, as presence tests.
constexpr const wchar_t* kHtmlStart = L"{<html>}";
constexpr const wchar_t* kHtmlEnd = L"{</html>}";

} // namespace KelvraHeaderPatterns
