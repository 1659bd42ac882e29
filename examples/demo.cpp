// A tour of the text utilities: formatting with Microsoft rules, Base64, time stamps, parsing.
#include <Kelvra.h>

#include <cstdio>

int main()
{
    using KelvraStrings::Strings;

    // %s takes a wide string in a wide format, as on every Windows compiler.
    const std::wstring logFile = Strings::Format(L"%s\\%s.%d.%s.log", L"c:\\keltrace", L"demo", 4120, L"net");
    std::printf("log file name   : %ls\n", logFile.c_str());

    const char secret[] = "user:pa\0ss"; // binary data, NUL included
    const std::string token = Strings::ToBase64(reinterpret_cast<const unsigned char*>(secret), sizeof(secret) - 1);
    const std::string back = Strings::FromBase64(token);
    std::printf("base64          : %s (%u bytes back)\n", token.c_str(), static_cast<unsigned>(back.size()));

    std::printf("utc now         : %ls\n", KelvraTime::Time::Now().c_str());
    std::printf("trace stamp     : %ls\n", KelvraTime::Time::NowLocal().c_str());

    unsigned long value = 0;
    const int status = Strings::HexToInt(L"7FFFFFFF", &value);
    std::printf("hex 7FFFFFFF    : %lu (status %d)\n", value, status);

    std::printf("split a;b;;c    :");
    for (const std::string& part : Strings::Split("a;b;;c", ";"))
        std::printf(" [%s]", part.c_str());
    std::printf("\n");

    std::wstring header = L"  Content-Type: TEXT/HTML";
    Strings::TrimLeft(header);
    std::printf("lowered header  : %ls\n", Strings::ToLower(header).c_str());
    return 0;
}
