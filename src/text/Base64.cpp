#include "KelvraStrings.h"

#include <array>

namespace KelvraStrings
{

namespace
{

constexpr char kAlphabet[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
constexpr unsigned char kNotBase64 = 0xFF;

constexpr std::array<unsigned char, 256> MakeDecodeTable()
{
    std::array<unsigned char, 256> table{};
    for (auto& entry : table)
        entry = kNotBase64;
    for (unsigned char value = 0; value < 64; ++value)
        table[static_cast<unsigned char>(kAlphabet[value])] = value;
    return table;
}

constexpr std::array<unsigned char, 256> kDecode = MakeDecodeTable();

// Two alphabet characters per 12-bit value, first character in the low byte, so that one
// look-up and one 16-bit store write half of a 24-bit group.
struct PairTable
{
    std::uint16_t pairs[4096];
};

constexpr PairTable MakePairTable()
{
    PairTable table{};
    for (int value = 0; value < 4096; ++value)
        table.pairs[value] = static_cast<std::uint16_t>(static_cast<unsigned char>(kAlphabet[value >> 6]) |
                                                        static_cast<unsigned char>(kAlphabet[value & 0x3F]) << 8);
    return table;
}

constexpr PairTable kPairs = MakePairTable();

// Decoding: the value of a character already shifted to its place in the 24-bit group, and
// bit 31 set for every character outside the alphabet, so that one OR of four look-ups gives
// both the group and the verdict.
constexpr std::uint32_t kStopBit = 0x80000000u;

struct ShiftedTables
{
    std::uint32_t place[4][256];
};

constexpr ShiftedTables MakeShiftedTables()
{
    ShiftedTables tables{};
    for (int position = 0; position < 4; ++position)
        for (int c = 0; c < 256; ++c)
            tables.place[position][c] = kDecode[c] == kNotBase64
                                            ? kStopBit
                                            : static_cast<std::uint32_t>(kDecode[c]) << (18 - 6 * position);
    return tables;
}

constexpr ShiftedTables kShifted = MakeShiftedTables();

inline std::uint64_t LoadBigEndian64(const unsigned char* p)
{
    std::uint64_t value = 0;
    for (int i = 0; i < 8; ++i)
        value = value << 8 | p[i];
    return value;
}

inline void StoreLittleEndian64(char* p, std::uint64_t value)
{
    for (int i = 0; i < 8; ++i)
        p[i] = static_cast<char>(value >> (8 * i));
}

inline void StoreBigEndian32(unsigned char* p, std::uint32_t value)
{
    p[0] = static_cast<unsigned char>(value >> 24);
    p[1] = static_cast<unsigned char>(value >> 16);
    p[2] = static_cast<unsigned char>(value >> 8);
    p[3] = static_cast<unsigned char>(value);
}

} // namespace

bool Strings::isBase64(unsigned char c)
{
    return kDecode[c] != kNotBase64;
}

std::string Strings::b64chars()
{
    return std::string(kAlphabet, 64);
}

std::string Strings::ToBase64(const unsigned char* bytes, std::uint32_t count)
{
    std::string result;
    if (count == 0 || bytes == nullptr)
        return result;
    const size_t groups = (static_cast<size_t>(count) + 2) / 3;
    result.resize(groups * 4);
    char* out = &result[0];
    const unsigned char* in = bytes;
    const unsigned char* const fullEnd = bytes + (count - count % 3);
    // Two groups per step from one 8-byte load (of which 6 bytes are used), while 8 bytes of
    // input remain; the byte-wise and 64-bit forms compile to single loads and stores.
    while (fullEnd - in >= 8)
    {
        const std::uint64_t word = LoadBigEndian64(in);
        const std::uint32_t first = static_cast<std::uint32_t>(word >> 40);
        const std::uint32_t second = static_cast<std::uint32_t>(word >> 16) & 0xFFFFFF;
        StoreLittleEndian64(out, static_cast<std::uint64_t>(kPairs.pairs[first >> 12]) |
                                     static_cast<std::uint64_t>(kPairs.pairs[first & 0xFFF]) << 16 |
                                     static_cast<std::uint64_t>(kPairs.pairs[second >> 12]) << 32 |
                                     static_cast<std::uint64_t>(kPairs.pairs[second & 0xFFF]) << 48);
        in += 6;
        out += 8;
    }
    for (; in != fullEnd; in += 3, out += 4)
    {
        const unsigned int group = (static_cast<unsigned int>(in[0]) << 16) |
                                   (static_cast<unsigned int>(in[1]) << 8) | in[2];
        const std::uint16_t high = kPairs.pairs[group >> 12];
        const std::uint16_t low = kPairs.pairs[group & 0xFFF];
        out[0] = static_cast<char>(high);
        out[1] = static_cast<char>(high >> 8);
        out[2] = static_cast<char>(low);
        out[3] = static_cast<char>(low >> 8);
    }
    const unsigned int remaining = count % 3;
    if (remaining != 0)
    {
        const unsigned int b0 = in[0];
        const unsigned int b1 = remaining == 2 ? in[1] : 0;
        out[0] = kAlphabet[b0 >> 2];
        out[1] = kAlphabet[((b0 & 0x03) << 4) | (b1 >> 4)];
        out[2] = remaining == 2 ? kAlphabet[(b1 & 0x0F) << 2] : '=';
        out[3] = '=';
    }
    return result;
}

std::string Strings::FromBase64(const std::string& text)
{
    const unsigned char* in = reinterpret_cast<const unsigned char*>(text.data());
    const unsigned char* const end = in + text.size();
    std::string result;
    result.resize(text.size() / 4 * 3 + 3);
    unsigned char* const first = reinterpret_cast<unsigned char*>(&result[0]);
    unsigned char* out = first;

    // Whole groups of four alphabet characters; '=' and every other character fall out of
    // this loop through the stop bit. Each group stores four bytes of which three count: the
    // result has room for that spare byte.
    while (end - in >= 4)
    {
        const std::uint32_t group = kShifted.place[0][in[0]] | kShifted.place[1][in[1]] |
                                    kShifted.place[2][in[2]] | kShifted.place[3][in[3]];
        if (group & kStopBit)
            break;
        StoreBigEndian32(out, group << 8);
        in += 4;
        out += 3;
    }

    // The last, partial group: the characters before the one that ends decoding. k characters
    // give k - 1 bytes; the leftover low bits of the last one are dropped.
    unsigned int values[4] = {0, 0, 0, 0};
    int k = 0;
    while (in != end && k < 4 && kDecode[*in] != kNotBase64)
        values[k++] = kDecode[*in++];
    if (k >= 2)
        *out++ = static_cast<unsigned char>((values[0] << 2) | ((values[1] & 0x30) >> 4));
    if (k >= 3)
        *out++ = static_cast<unsigned char>(((values[1] & 0x0F) << 4) | ((values[2] & 0x3C) >> 2));
    // k == 4 cannot happen: a full valid group would have been taken by the loop above.
    result.resize(static_cast<size_t>(out - first));
    return result;
}

} // namespace KelvraStrings
