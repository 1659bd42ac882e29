// What the fuzz targets share: a check that stops the fuzzer, and wide text made from its bytes.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>

namespace KelvraFuzz
{

// A broken invariant is a finding like a crash: abort, and libFuzzer reports the input.
inline void Check(bool condition)
{
    if (!condition)
        std::abort();
}

// Each byte is the code unit of the same value (as a text-mode file reads on Windows), except that
// 0xFF and the two bytes after it give one unit, high byte first: seeds and dictionaries stay
// readable, and every 16-bit unit can occur. No unit exceeds 0xFFFF, where Windows text ends,
// although wchar_t has 32 bits here.
inline std::wstring WideText(const std::uint8_t* data, size_t size)
{
    std::wstring text;
    for (size_t i = 0; i < size; ++i)
    {
        if (data[i] == 0xFF && i + 2 < size)
        {
            text += static_cast<wchar_t>(data[i + 1] << 8 | data[i + 2]);
            i += 2;
        }
        else
        {
            text += static_cast<wchar_t>(data[i]);
        }
    }
    return text;
}

} // namespace KelvraFuzz
