// Base64 of 64 MiB: our codec against the platform's (crypt32) and against memcpy of the data.
#include <Kelvra.h>

#include "BenchSupport.h"

#include <wincrypt.h>

#include <cstring>
#include <random>
#include <string>
#include <vector>

using namespace KelvraBench;
using KelvraStrings::Strings;

namespace
{

const DWORD kPlatformFlags = CRYPT_STRING_BASE64 | CRYPT_STRING_NOCRLF;

std::string PlatformEncode(const std::vector<unsigned char>& data)
{
    DWORD length = 0;
    ::CryptBinaryToStringA(data.data(), static_cast<DWORD>(data.size()), kPlatformFlags, nullptr, &length);
    std::string text(length, '\0');
    if (!::CryptBinaryToStringA(data.data(), static_cast<DWORD>(data.size()), kPlatformFlags, &text[0], &length))
        return std::string();
    text.resize(length);
    return text;
}

std::string PlatformDecode(const std::string& text)
{
    DWORD length = 0;
    ::CryptStringToBinaryA(text.data(), static_cast<DWORD>(text.size()), CRYPT_STRING_BASE64, nullptr, &length,
                           nullptr, nullptr);
    std::string bytes(length, '\0');
    if (!::CryptStringToBinaryA(text.data(), static_cast<DWORD>(text.size()), CRYPT_STRING_BASE64,
                                reinterpret_cast<BYTE*>(&bytes[0]), &length, nullptr, nullptr))
        return std::string();
    bytes.resize(length);
    return bytes;
}

} // namespace

int main()
{
    const size_t size = 64u * 1024 * 1024;
    const int runs = 7;
    std::vector<unsigned char> data(size);
    std::mt19937 rng(7);
    for (unsigned char& byte : data)
        byte = static_cast<unsigned char>(rng());
    std::vector<unsigned char> copy(size);

    std::string encoded = Strings::ToBase64(data.data(), static_cast<std::uint32_t>(size));
    std::string decoded, platformEncoded, platformDecoded;
    const auto [memcpySeconds, encodeSeconds, decodeSeconds, platformEncodeSeconds, platformDecodeSeconds] =
        BestSecondsInTurn(
            runs, [&] { std::memcpy(copy.data(), data.data(), size); },
            [&] { encoded = Strings::ToBase64(data.data(), static_cast<std::uint32_t>(size)); },
            [&] { decoded = Strings::FromBase64(encoded); }, [&] { platformEncoded = PlatformEncode(data); },
            [&] { platformDecoded = PlatformDecode(encoded); });

    const bool sameText = encoded == platformEncoded;
    const bool roundTrip = decoded.size() == size && std::memcmp(decoded.data(), data.data(), size) == 0;
    const bool platformAgrees = platformDecoded == decoded;

    std::printf("Base64, 64 MiB of random bytes (MB/s of raw data, best of %d runs taking turns)\n", runs);
    std::printf("  %-28s %10s\n", "operation", "MB/s");
    std::printf("  %-28s %10.0f\n", "memcpy", MegabytesPerSecond(size, memcpySeconds));
    std::printf("  %-28s %10.0f\n", "Kelvra encode", MegabytesPerSecond(size, encodeSeconds));
    std::printf("  %-28s %10.0f\n", "Kelvra decode", MegabytesPerSecond(size, decodeSeconds));
    std::printf("  %-28s %10.0f\n", "crypt32 encode", MegabytesPerSecond(size, platformEncodeSeconds));
    std::printf("  %-28s %10.0f\n", "crypt32 decode", MegabytesPerSecond(size, platformDecodeSeconds));
    std::printf("Ratios\n");
    bool met = true;
    met &= ReportTarget("encode time / memcpy time", encodeSeconds / memcpySeconds, "<=", 8);
    met &= ReportTarget("decode time / memcpy time", decodeSeconds / memcpySeconds, "<=", 10);
    met &= ReportTarget("encode throughput / crypt32 encode", platformEncodeSeconds / encodeSeconds, ">=", 3);
    met &= ReportTarget("decode throughput / crypt32 decode", platformDecodeSeconds / decodeSeconds, ">=", 3);
    std::printf("Results: text identical to crypt32's: %s; round trip exact: %s; crypt32 decodes the same: %s\n",
                sameText ? "yes" : "NO", roundTrip ? "yes" : "NO", platformAgrees ? "yes" : "NO");
    return met && sameText && roundTrip && platformAgrees ? 0 : 1;
}
