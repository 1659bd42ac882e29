#include "http/ProxySelection.h"

#include "KelvraHttp.h"
#include "KelvraTrace.h"

#include "http/WinHttpPlatform.h"

namespace
{

void Release(wchar_t*& text, const wchar_t* message)
{
    if (text == nullptr)
        return;
    KELVRA_TRC(L"%s", message);
    KelvraHttp::Platform().GlobalFree(text);
    text = nullptr;
}

} // namespace

namespace KelvraHttp
{

void ReleaseUserProxyConfig(WINHTTP_CURRENT_USER_IE_PROXY_CONFIG& config)
{
    Release(config.lpszAutoConfigUrl, L"Releasing lpszAutoConfigUrl");
    Release(config.lpszProxy, L"Releasing lpszProxy");
    Release(config.lpszProxyBypass, L"Releasing lpszProxyBypass");
}

} // namespace KelvraHttp

// Nothing is chosen yet: every request goes out with the session's default proxy configuration
// (access type 0).
void CWinHttpClient::SelectProxy(void*, void*) {}
