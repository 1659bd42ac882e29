// Proxy selection, the stage of SendHttpRequest that sets the request's proxy.
#pragma once

#include <windows.h>
#include <winhttp.h>

namespace KelvraHttp
{

// Frees, each with its trace line, the strings of a current user's proxy configuration that the
// platform handed out (auto-configuration URL, proxy, bypass list), and nulls them.
void ReleaseUserProxyConfig(WINHTTP_CURRENT_USER_IE_PROXY_CONFIG& config);

} // namespace KelvraHttp
