#include "http/ResponseText.h"

#include "http/pattern/PatternExtraction.h"

#include <cwchar>

namespace KelvraHttp
{

namespace
{

// tag is lower case and starts with '<', which has no case.
bool ContainsTag(const std::wstring& text, const std::wstring& tag)
{
    const wchar_t* const end = text.data() + text.size();
    for (const wchar_t* at = text.data(); static_cast<size_t>(end - at) >= tag.size(); ++at)
    {
        at = std::wmemchr(at, tag[0], static_cast<size_t>(end - at) - tag.size() + 1);
        if (at == nullptr)
            return false;
        size_t matched = 1;
        while (matched < tag.size() &&
               (at[matched] | (at[matched] >= L'A' && at[matched] <= L'Z' ? 0x20 : 0)) == tag[matched])
            ++matched;
        if (matched == tag.size())
            return true;
    }
    return false;
}

} // namespace

void AppendCookies(std::wstring& cookies, const std::vector<std::wstring>& values)
{
    for (size_t i = 0; i < values.size(); ++i)
    {
        if (i > 0)
            cookies += L"; ";
        cookies += values[i];
    }
    cookies = TrimChars(cookies, L" ");
    if (!cookies.empty() && cookies.back() != L';')
        cookies += L';';
}

bool IsCutOffHtml(const std::wstring& body)
{
    return ContainsTag(body, L"<html>") && !ContainsTag(body, L"</html>");
}

} // namespace KelvraHttp
