// What the HTTP client's tests share: the local servers (tests/support/http_server.py, started by
// ctest) and the trace log of this program, c:\keltrace\http_tests.log (HttpClientTest.cpp opens it),
// read with the trace tests' helpers.
#pragma once

#include "KelvraStrings.h"

#include "support/TestData.h"
#include "trace/TraceTestSupport.h"

#include <algorithm>
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

// How much of this program's trace log the tests have seen: the session banner, then what
// NewTraceLines returned.
inline size_t traceLogSeen = 0;

// The trace lines written since the previous call, each as "<tag> <message>" ("TRC [1] try").
inline std::vector<std::wstring> NewTraceLines()
{
    const std::string log = KelvraTraceTest::ReadMarkerFile(L"http_tests.log");
    std::vector<std::wstring> lines;
    for (const std::string& line :
         KelvraTraceTest::TaggedMessages(log.substr(std::min(traceLogSeen, log.size()))))
        lines.push_back(KelvraStrings::Strings::ToString(line));
    traceLogSeen = log.size();
    return lines;
}

} // namespace KelvraHttpTest
