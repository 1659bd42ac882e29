// Proxy selection, the stage of SendHttpRequest that sets the request's proxy: the manual one with
// its credentials, or the current user's settings (an auto-configuration script, else a fixed
// proxy with its bypass list, else nothing).
#include "http/ProxySelection.h"

#include "KelvraHttp.h"
#include "KelvraTrace.h"

#include "http/WinHttpException.h"
#include "http/WinHttpPlatform.h"

#include <utility>

using KelvraHttp::Fail;
using KelvraHttp::Platform;
using KelvraHttp::UniquePlatformText;

namespace
{

// Frees, after its trace line, text the platform handed out; nothing when there is none.
void Release(UniquePlatformText& text, const wchar_t* message)
{
    if (!text)
        return;
    KELVRA_TRC(L"%s", message);
    text.reset();
}

// The same for a field of a platform record, which is left empty.
void Release(wchar_t*& field, const wchar_t* message)
{
    UniquePlatformText text(std::exchange(field, nullptr));
    Release(text, message);
}

// Sets option on the request, or fails the stage with message (handing on the user's record).
void SetOption(HINTERNET connection, HINTERNET request, DWORD option, void* value, DWORD size,
               const wchar_t* message, WINHTTP_CURRENT_USER_IE_PROXY_CONFIG* userConfig = nullptr)
{
    if (!Platform().SetOption(request, option, value, size))
        Fail(message, connection, request, userConfig);
}

// The proxy list and bypass list go over whole, however long (WinHTTP copies them).
void SetNamedProxy(HINTERNET connection, HINTERNET request, wchar_t* proxy, wchar_t* bypass,
                   const wchar_t* message, WINHTTP_CURRENT_USER_IE_PROXY_CONFIG* userConfig = nullptr)
{
    WINHTTP_PROXY_INFO info{WINHTTP_ACCESS_TYPE_NAMED_PROXY, proxy, bypass};
    SetOption(connection, request, WINHTTP_OPTION_PROXY, &info, sizeof(info), message, userConfig);
}

// A user name or password goes as its characters, 2 bytes each, without a terminator.
void SetCredential(HINTERNET connection, HINTERNET request, DWORD option, std::wstring& text,
                   const wchar_t* message)
{
    SetOption(connection, request, option, &text[0], static_cast<DWORD>(text.size() * sizeof(wchar_t)),
              message);
}

} // namespace

void KelvraHttp::ReleaseUserProxyConfig(WINHTTP_CURRENT_USER_IE_PROXY_CONFIG& config)
{
    Release(config.lpszAutoConfigUrl, L"Releasing lpszAutoConfigUrl");
    Release(config.lpszProxy, L"Releasing lpszProxy");
    Release(config.lpszProxyBypass, L"Releasing lpszProxyBypass");
}

void CWinHttpClient::SelectProxy(void* connection, void* request, void* userProxyConfig)
{
    if (!proxy.empty())
    {
        KELVRA_TRC(L"Setting manual proxy settings [%s]", proxy.c_str());
        SetNamedProxy(connection, request, &proxy[0], nullptr, L"Setting manual proxy settings failed");
        // A password is only ever sent together with a user name.
        if (proxyUsername.empty())
            return;
        KELVRA_TRC(L"Setting manual proxy username");
        SetCredential(connection, request, WINHTTP_OPTION_PROXY_USERNAME, proxyUsername,
                      L"Setting manual proxy username failed");
        if (proxyPassword.empty())
            return;
        KELVRA_TRC(L"Setting manual proxy password");
        SetCredential(connection, request, WINHTTP_OPTION_PROXY_PASSWORD, proxyPassword,
                      L"Setting manual proxy password fialed");
        return;
    }

    auto& user = *static_cast<WINHTTP_CURRENT_USER_IE_PROXY_CONFIG*>(userProxyConfig);
    KELVRA_TRC(L"Setting auto proxy settings");
    user = {};
    if (!Platform().GetIEProxyConfigForCurrentUser(&user))
    {
        if (Platform().GetLastError() != ERROR_FILE_NOT_FOUND)
            Fail(L"Failed to auto detect proxy settings", connection, request);
        KELVRA_TRC(L"No Internet Explorer proxy settings can be found");
    }

    if (user.lpszAutoConfigUrl != nullptr)
    {
        KELVRA_TRC(L"IE Auto Config Url is set to [%s]", user.lpszAutoConfigUrl);
        WINHTTP_AUTOPROXY_OPTIONS options{WINHTTP_AUTOPROXY_AUTO_DETECT | WINHTTP_AUTOPROXY_CONFIG_URL,
                                          WINHTTP_AUTO_DETECT_TYPE_DHCP,
                                          user.lpszAutoConfigUrl,
                                          nullptr,
                                          0,
                                          TRUE};
        WINHTTP_PROXY_INFO found{};
        KELVRA_TRC(L"Retrieving user's proxy data");
        if (!Platform().GetProxyForUrl(session, url.c_str(), &options, &found))
            Fail(L"Failed to retrieve user's proxy data", connection, request, &user);
        // Owned from here, so that a failure to apply them frees them too.
        UniquePlatformText foundProxy(found.lpszProxy);
        UniquePlatformText foundBypass(found.lpszProxyBypass);
        KELVRA_TRC(L"Setting user's proxy data");
        SetOption(connection, request, WINHTTP_OPTION_PROXY, &found, sizeof(found),
                  L"Setting user's proxy data failed", &user);
        Release(foundProxy, L"Releasing lpszProxy");
        Release(foundBypass, L"Releasing lpszProxyBypass");
    }
    else if (user.lpszProxy != nullptr)
    {
        KELVRA_TRC(L"Could not find IE Auto Config Url but IE proxy url is set to [%s]", user.lpszProxy);
        if (user.lpszProxyBypass != nullptr)
            KELVRA_TRC(L"IE optional proxy by-pass server list is set to [%s]", user.lpszProxyBypass);
        KELVRA_TRC(L"Setting IE proxy data to the request");
        SetNamedProxy(connection, request, user.lpszProxy, user.lpszProxyBypass,
                      L"Setting IE proxy data to the request failed", &user);
    }
    KelvraHttp::ReleaseUserProxyConfig(user);
}
