// Built against the installed package only: <Kelvra.h> and the import library.
#include <Kelvra.h>

#include <cstdio>

int main()
{
    using KelvraStrings::Strings;
    const std::string encoded = Strings::ToBase64(reinterpret_cast<const unsigned char*>("foobar"), 6);
    Bytes buffer(8);
    const std::wstring name = Strings::Format(L"%s.%d.%s.log", L"host", 4120, L"net");
    std::printf("%s %s %ls %ls\n", encoded.c_str(), Strings::FromBase64(encoded).c_str(),
                Strings::Padd(7, 4).c_str(), name.c_str());
    return static_cast<char*>(buffer) != nullptr ? 0 : 1;
}
