// The library's one case folding: A-Z become a-z, every other code unit stays as it is. Free of
// platform headers, so that the text logic built on it also compiles outside Windows.
#pragma once

#include <string>

namespace Kelvra
{

// Every unit is written back, changed or not: the compiler then turns the loop into vector code,
// which matters for the matcher's copy of a whole header block.
inline void LowerAscii(std::wstring& text)
{
    for (wchar_t& c : text)
        c = c >= L'A' && c <= L'Z' ? static_cast<wchar_t>(c + (L'a' - L'A')) : c;
}

} // namespace Kelvra
