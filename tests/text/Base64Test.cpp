#include "KelvraStrings.h"

#include <gtest/gtest.h>

using KelvraStrings::Strings;

TEST(Base64, EncodesAndDecodesReferenceVectors)
{
    // RFC 4648 section 10, NUL bytes, and 49 bytes that take every alphabet character through the
    // loops over whole groups, then a one-byte tail (encoded by Python's base64 module).
    const std::string long49(
        "\x00\x10\x83\x10\x51\x87\x20\x92\x8b\x30\xd3\x8f\x41\x14\x93\x51\x55\x97\x61\x96\x9b\x71\xd7\x9f\x82"
        "\x18\xa3\x92\x59\xa7\xa2\x9a\xab\xb2\xdb\xaf\xc3\x1c\xb3\xd3\x5d\xb7\xe3\x9e\xbb\xf3\xdf\xbf\xff",
        49);
    const std::string nuls(3, '\0'),
        alphabet = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+//w==";
    const std::pair<std::string, std::string> vectors[] = {
        {"", ""},        {"f", "Zg=="},        {"fo", "Zm8="},
        {"foo", "Zm9v"}, {"foob", "Zm9vYg=="}, {"foobar", "Zm9vYmFy"},
        {nuls, "AAAA"},  {long49, alphabet}};
    for (const auto& [plain, encoded] : vectors)
    {
        const auto* bytes = reinterpret_cast<const unsigned char*>(plain.data());
        EXPECT_EQ(Strings::ToBase64(bytes, static_cast<std::uint32_t>(plain.size())), encoded);
        EXPECT_EQ(Strings::FromBase64(encoded), plain);
    }
    EXPECT_EQ(Strings::ToBase64(nullptr, 0), ""); // zero bytes read nothing
}

TEST(Base64, DecoderStopsWhereTheSpecialCharactersSay)
{
    // The first '=' ends decoding even mid-text, and so does any character outside the alphabet:
    // line break, blank, '-' of the URL-safe alphabet, bytes above 0x7F, NUL. Text
    // without padding decodes as if padded; a lone last character and leftover low bits are ignored.
    const std::pair<std::string, std::string> cases[] = {{"Zm9v=Zm9v", "foo"}, {"Zm9vYmFy\nZm9v", "foobar"},
                                                         {"Zm9v Zm9v", "foo"}, {"Zm-9v", "f"},
                                                         {"Zm\xc3\xa9", "f"},  {std::string("Zm\0v", 4), "f"},
                                                         {"Zm9vYg", "foob"},   {"Zm9vY", "foo"},
                                                         {"Zh==", "f"},        {"=Zm9v", ""}};
    for (const auto& [text, expected] : cases)
        EXPECT_EQ(Strings::FromBase64(text), expected) << text;
}
