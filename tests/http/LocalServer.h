// The local HTTP server that ctest starts for this program (tests/support/http_server.py), and
// raw response header blocks fetched from it through WinHTTP.
#pragma once

#include <string>
#include <vector>

namespace KelvraTest
{

// Port of the running server, 0 (with a test failure) when there is none.
unsigned short LocalServerPort();

// Path of the server's /respond route answering with these header lines ("Name: value"), in
// this order, and this body.
std::wstring RespondPath(const std::vector<std::wstring>& headerLines, const std::wstring& body = L"");

// GET path from the local server and return the response's raw header block (status line and
// header lines, each ended by CR LF, then an empty line), as WinHTTP reports it. Empty, with a
// test failure, when the request fails.
std::wstring FetchHeaderBlock(const std::wstring& path);

} // namespace KelvraTest
