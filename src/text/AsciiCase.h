// The library's one case folding: A-Z become a-z, every other code unit stays as it is. Free of
// platform headers, so that the text logic built on it also compiles outside Windows.
#pragma once

#include <string>

namespace Kelvra
{

inline void LowerAscii(std::wstring& text)
{
    for (wchar_t& c : text)
    {
        if (c >= L'A' && c <= L'Z')
            c = static_cast<wchar_t>(c + (L'a' - L'A'));
    }
}

} // namespace Kelvra
