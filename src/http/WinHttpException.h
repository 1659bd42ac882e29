// The failure record of SendHttpRequest: every stage that fails throws one, and the request's
// single failure path stores the error, releases the proxy record and closes the handles it names.
// It never leaves SendHttpRequest.
#pragma once

#include <windows.h>
#include <winhttp.h>

struct WinHttpException
{
    DWORD error;
    HINTERNET connection;
    HINTERNET request;
    // The current user's proxy configuration whose strings are still to be released, or null.
    WINHTTP_CURRENT_USER_IE_PROXY_CONFIG* proxyConfig;
};

namespace KelvraHttp
{

// Ends a stage that failed: traces message as an error, then throws the failure record with the
// error code of the platform call that just failed, the handles and the proxy record it names.
[[noreturn]] void Fail(const wchar_t* message, HINTERNET connection, HINTERNET request,
                       WINHTTP_CURRENT_USER_IE_PROXY_CONFIG* proxyConfig = nullptr);

} // namespace KelvraHttp
