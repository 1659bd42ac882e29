#include "http/LocalServer.h"

#include "common/UniqueHandle.h"
#include "support/TestData.h"

#include <gtest/gtest.h>

#include <windows.h>
#include <winhttp.h>

#include <cstdlib>

namespace KelvraTest
{

namespace
{

bool IsUnreserved(wchar_t c)
{
    return (c >= L'a' && c <= L'z') || (c >= L'A' && c <= L'Z') || (c >= L'0' && c <= L'9') || c == L'-' ||
           c == L'_' || c == L'.' || c == L'~';
}

// Percent-encodes the UTF-16 code units below 0x80 that a query value cannot hold as they are.
std::wstring EncodeQueryValue(const std::wstring& value)
{
    static const wchar_t kHex[] = L"0123456789ABCDEF";
    std::wstring encoded;
    for (wchar_t c : value)
    {
        if (IsUnreserved(c))
        {
            encoded += c;
            continue;
        }
        encoded += L'%';
        encoded += kHex[(c >> 4) & 0xF];
        encoded += kHex[c & 0xF];
    }
    return encoded;
}

} // namespace

unsigned short LocalServerPort()
{
    const std::string text = ReadBinaryFile(DataPath(L"http_server.port"));
    const long port = std::strtol(text.c_str(), nullptr, 10);
    if (port <= 0 || port > 65535)
    {
        ADD_FAILURE() << "no local HTTP server: run the tests through ctest";
        return 0;
    }
    return static_cast<unsigned short>(port);
}

std::wstring RespondPath(const std::vector<std::wstring>& headerLines, const std::wstring& body)
{
    std::wstring path = L"/respond?body=" + EncodeQueryValue(body);
    for (const std::wstring& line : headerLines)
        path += L"&header=" + EncodeQueryValue(line);
    return path;
}

std::wstring FetchHeaderBlock(const std::wstring& path)
{
    const unsigned short port = LocalServerPort();
    if (port == 0)
        return std::wstring();
    Kelvra::UniqueWinHttp session(::WinHttpOpen(L"KelvraTests", WINHTTP_ACCESS_TYPE_NO_PROXY,
                                                WINHTTP_NO_PROXY_NAME, WINHTTP_NO_PROXY_BYPASS, 0));
    Kelvra::UniqueWinHttp connection(session ? ::WinHttpConnect(session.get(), L"127.0.0.1", port, 0)
                                             : nullptr);
    Kelvra::UniqueWinHttp request(connection ? ::WinHttpOpenRequest(connection.get(), L"GET", path.c_str(),
                                                                    nullptr, WINHTTP_NO_REFERER,
                                                                    WINHTTP_DEFAULT_ACCEPT_TYPES, 0)
                                             : nullptr);
    if (!request ||
        !::WinHttpSendRequest(request.get(), WINHTTP_NO_ADDITIONAL_HEADERS, 0, WINHTTP_NO_REQUEST_DATA, 0, 0,
                              0) ||
        !::WinHttpReceiveResponse(request.get(), nullptr))
    {
        const DWORD error = ::GetLastError();
        ADD_FAILURE() << "request to the local HTTP server failed, error " << error;
        return std::wstring();
    }
    DWORD bytes = 0;
    ::WinHttpQueryHeaders(request.get(), WINHTTP_QUERY_RAW_HEADERS_CRLF, WINHTTP_HEADER_NAME_BY_INDEX,
                          WINHTTP_NO_OUTPUT_BUFFER, &bytes, WINHTTP_NO_HEADER_INDEX);
    std::wstring block(bytes / sizeof(wchar_t) + 1, L'\0');
    bytes = static_cast<DWORD>(block.size() * sizeof(wchar_t));
    if (!::WinHttpQueryHeaders(request.get(), WINHTTP_QUERY_RAW_HEADERS_CRLF, WINHTTP_HEADER_NAME_BY_INDEX,
                               &block[0], &bytes, WINHTTP_NO_HEADER_INDEX))
    {
        const DWORD error = ::GetLastError();
        ADD_FAILURE() << "reading the response headers failed, error " << error;
        return std::wstring();
    }
    block.resize(bytes / sizeof(wchar_t));
    return block;
}

} // namespace KelvraTest
