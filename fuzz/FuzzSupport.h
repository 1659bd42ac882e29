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

// Each byte is the unit of its value (as a text-mode file reads on Windows), but 0xFF and the two
// bytes after it give one unit, high byte first: seeds stay readable and every 16-bit unit can
// occur, none beyond 0xFFFF (where Windows text ends, though wchar_t has 32 bits here).
inline std::wstring WideText(const std::uint8_t* data, size_t size)
{
    std::wstring text;
    for (size_t i = 0; i < size; ++i)
        text += data[i] == 0xFF && i + 2 < size ? (i += 2, static_cast<wchar_t>(data[i - 1] << 8 | data[i]))
                                                : static_cast<wchar_t>(data[i]);
    return text;
}

} // namespace KelvraFuzz
