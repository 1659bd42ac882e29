// The one exception the pattern matcher raises, for failures that are not a plain "no match".
#pragma once

#include <cstdint>

class CRegexException
{
public:
    // HRESULT-style codes, as the platform spells them: E_INVALIDARG for an instruction index
    // outside the program, E_FAIL for a group number the match does not have.
    static constexpr std::int32_t kInvalidArgument = static_cast<std::int32_t>(0x80070057);
    static constexpr std::int32_t kFailure = static_cast<std::int32_t>(0x80004005);

    explicit CRegexException(std::int32_t code) noexcept : m_code(code) {}

    std::int32_t Code() const noexcept { return m_code; }

private:
    std::int32_t m_code;
};
