// Base64 on any bytes: encoding and decoding give them back, and as text they decode to the bytes
// of their leading alphabet characters, whose whole groups encode to the same text again.
#include "FuzzSupport.h"
#include "KelvraStrings.h"

#include <algorithm>

using KelvraFuzz::Check;
using KelvraStrings::Strings;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, size_t size)
{
    const std::string bytes(reinterpret_cast<const char*>(data), size);
    const std::string encoded = Strings::ToBase64(data, static_cast<std::uint32_t>(size));
    Check(encoded.size() == (size + 2) / 3 * 4 && Strings::FromBase64(encoded) == bytes);

    const size_t valid = std::min(
        bytes.find_first_not_of("ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/"), size);
    const std::string decoded = Strings::FromBase64(bytes);
    Check(decoded.size() == valid * 3 / 4);
    const size_t wholeGroups = valid / 4 * 4;
    const std::string again = Strings::ToBase64(reinterpret_cast<const unsigned char*>(decoded.data()),
                                                static_cast<std::uint32_t>(decoded.size()));
    Check(again.compare(0, wholeGroups, bytes, 0, wholeGroups) == 0);
    return 0;
}
