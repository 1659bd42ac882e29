// Rules the HTTP client applies to the text of a response.
#pragma once

#include <string>
#include <vector>

namespace KelvraHttp
{

// Appends one response's Set-Cookie values to the cookies collected so far: "; " between the
// values, blanks trimmed at both ends, and a closing ";" ("a=1; b=2;" then "a=1; b=2;c=3;").
void AppendCookies(std::wstring& cookies, const std::vector<std::wstring>& values);

// Whether a body holds "<html>" but no "</html>" (A-Z case ignored): a page cut off in transit.
// Scans in place, however long the body.
bool IsCutOffHtml(const std::wstring& body);

} // namespace KelvraHttp
