// What the HTTP client's tests share: the local servers (tests/support/http_server.py, started by
// ctest) and the trace log of this program, c:\keltrace\http_tests.log (HttpClientTest.cpp opens it).
#pragma once

#include "KelvraStrings.h"

#include "common/UniqueHandle.h"
#include "support/TestData.h"

#include <share.h>

#include <string>
#include <vector>

namespace KelvraHttpTest
{

// "http://127.0.0.1:<port>" or "https://127.0.0.1:<port>" followed by path.
inline std::wstring ServerUrl(const std::wstring& path, bool secure = false)
{
    const std::string port =
        KelvraTest::ReadBinaryFile(KelvraTest::DataPath(secure ? L"https_server.port" : L"http_server.port"));
    return (secure ? L"https://127.0.0.1:" : L"http://127.0.0.1:") + std::wstring(port.begin(), port.end()) +
           path;
}

// The trace lines written since the previous call, each as "<tag> <message>" ("[TRC] [1] try").
inline std::vector<std::wstring> NewTraceLines()
{
    static long offset = 0;
    Kelvra::UniqueFile log(::_wfsopen(L"c:\\keltrace\\http_tests.log", L"rb", _SH_DENYNO));
    std::string text;
    char buffer[65536];
    if (log && std::fseek(log.get(), offset, SEEK_SET) == 0)
        for (size_t got; (got = std::fread(buffer, 1, sizeof(buffer), log.get())) > 0;)
            text.append(buffer, got);
    offset += static_cast<long>(text.size());
    // "[TRC][<stamp>][<file>:<line>] <message>", each line ended by CR LF, after a session banner.
    std::vector<std::wstring> lines;
    for (size_t start = 0, end; (end = text.find("\r\n", start)) != std::string::npos; start = end + 2)
    {
        const size_t message = text.find("] ", text.find(']', start + 5) + 1);
        if (text[start] == '[' && message < end)
            lines.push_back(KelvraStrings::Strings::ToString(text.substr(start, 5) + ' ' +
                                                             text.substr(message + 2, end - message - 2)));
    }
    return lines;
}

} // namespace KelvraHttpTest
