#include "KelvraStrings.h"

#include "support/TestData.h"

#include <gtest/gtest.h>

#include <fstream>
#include <random>
#include <sstream>

using KelvraStrings::Strings;

namespace
{

std::string FromHex(const std::string& hex)
{
    std::string bytes;
    for (size_t i = 0; i + 1 < hex.size(); i += 2)
        bytes += static_cast<char>(std::stoi(hex.substr(i, 2), nullptr, 16));
    return bytes;
}

std::string Encode(const std::string& bytes)
{
    return Strings::ToBase64(reinterpret_cast<const unsigned char*>(bytes.data()),
                             static_cast<std::uint32_t>(bytes.size()));
}

} // namespace

TEST(Base64, MatchesRfc4648Vectors)
{
    const std::pair<std::string, std::string> vectors[] = {
        {"", ""},         {"f", "Zg=="},         {"fo", "Zm8="},         {"foo", "Zm9v"},
        {"foob", "Zm9vYg=="}, {"fooba", "Zm9vYmE="}, {"foobar", "Zm9vYmFy"},
    };
    for (const auto& [plain, encoded] : vectors)
    {
        EXPECT_EQ(Encode(plain), encoded);
        EXPECT_EQ(Strings::FromBase64(encoded), plain);
    }
}

TEST(Base64, AgreesWithPythonOnEveryLengthUpTo64)
{
    const std::string file = KelvraTest::ReadBinaryFile(KelvraTest::DataPath(L"base64_vectors.txt"));
    std::istringstream lines(file);
    std::string line;
    int cases = 0;
    while (std::getline(lines, line))
    {
        const size_t blank = line.find(' ');
        ASSERT_NE(blank, std::string::npos);
        const std::string bytes = FromHex(line.substr(0, blank));
        const std::string encoded = line.substr(blank + 1);
        EXPECT_EQ(Encode(bytes), encoded) << "length " << bytes.size();
        EXPECT_EQ(Strings::FromBase64(encoded), bytes) << encoded;
        ++cases;
    }
    EXPECT_EQ(cases, 65 * 8);
}

TEST(Base64, AgreesWithPythonOnMegabytes)
{
    const std::string bytes = KelvraTest::ReadBinaryFile(KelvraTest::DataPath(L"base64_large.bin"));
    const std::string encoded = KelvraTest::ReadBinaryFile(KelvraTest::DataPath(L"base64_large.b64"));
    ASSERT_GT(bytes.size(), 3u * 1024 * 1024);
    EXPECT_TRUE(Encode(bytes) == encoded);
    EXPECT_TRUE(Strings::FromBase64(encoded) == bytes);
}

TEST(Base64, EncodingZeroBytesReadsNothing)
{
    EXPECT_EQ(Strings::ToBase64(nullptr, 0), "");
    const unsigned char byte = 0;
    EXPECT_EQ(Strings::ToBase64(&byte, 0), "");
}

TEST(Base64, DecoderStopsWhereTheSpecialCharactersSay)
{
    struct Case
    {
        std::string text;
        std::string expected;
    };
    const Case cases[] = {
        {"Zm9v=Zm9v", "foo"},           // the first '=' ends decoding, even mid-text
        {"Zm9vYmFy\nZm9v", "foobar"},   // so does a line break
        {"Zm9v Zm9v", "foo"},           // a blank
        {"Zm9v\tZm9v", "foo"},          // a tab
        {"Zm-9v", "f"},                 // '-' of the URL-safe alphabet
        {"Zm_9v", "f"},                 // '_' likewise
        {"Zm\xc3\xa9", "f"},            // bytes above 0x7F
        {std::string("Zm\0v", 4), "f"}, // a NUL byte
        {"Zm9vYg", "foob"},             // no padding: as if padded
        {"Zm9vY", "foo"},               // one character left in the last group: ignored
        {"Zh==", "f"},                  // leftover low bits of the last character: ignored
        {"Zm9=", "fo"},
        {"=Zm9v", ""},
        {"", ""},
        {"AAAA", std::string(3, '\0')}, // NUL bytes stay and count
    };
    for (const Case& c : cases)
        EXPECT_EQ(Strings::FromBase64(c.text), c.expected) << c.text;
}

TEST(Base64, DecodesAnyBytesAsTheirLongestAlphabetPrefix)
{
    // Random byte strings mostly made of alphabet characters: the result must be the decoding
    // of the prefix before the first other byte, never more, and never a crash.
    std::mt19937 rng(424242);
    const std::string alphabet = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
    for (int round = 0; round < 20000; ++round)
    {
        std::string text(rng() % 40, '\0');
        for (char& c : text)
            c = rng() % 8 == 0 ? static_cast<char>(rng() % 256) : alphabet[rng() % 64];
        size_t prefix = 0;
        while (prefix < text.size() && alphabet.find(text[prefix]) != std::string::npos)
            ++prefix;
        const std::string decoded = Strings::FromBase64(text);
        ASSERT_EQ(decoded.size(), prefix / 4 * 3 + (prefix % 4 == 0 ? 0 : prefix % 4 - 1)) << text;
        ASSERT_EQ(decoded, Strings::FromBase64(text.substr(0, prefix))) << text;
        if (prefix % 4 == 0)
        {
            ASSERT_EQ(Encode(decoded), text.substr(0, prefix));
        }
    }
}
