// SendHttpRequest: session, URL, connection, request and its options, the send loop, and the one
// failure path every stage ends in when it fails.
#include "KelvraHttp.h"

#include "KelvraTrace.h"

#include "http/ProxySelection.h"
#include "http/ResponseText.h"
#include "http/WinHttpException.h"
#include "http/WinHttpPlatform.h"

#include <new>

using KelvraHttp::Fail;
using KelvraHttp::Platform;
using KelvraHttp::UniquePlatformHandle;

namespace
{

const int kMaxTries = 5;
const DWORD kIgnoredCertificateErrors = SECURITY_FLAG_IGNORE_UNKNOWN_CA |
                                        SECURITY_FLAG_IGNORE_CERT_CN_INVALID |
                                        SECURITY_FLAG_IGNORE_CERT_DATE_INVALID;

struct SplitUrl
{
    INTERNET_SCHEME scheme;
    INTERNET_PORT port;
    wchar_t host[300];
    wchar_t path[1500];
};

// Host and path with any query; a host or path too long for its buffer fails here.
SplitUrl Split(const std::wstring& url)
{
    SplitUrl split{};
    URL_COMPONENTS components{};
    components.dwStructSize = sizeof(components);
    components.dwSchemeLength = 1;
    components.lpszHostName = split.host;
    components.dwHostNameLength = ARRAYSIZE(split.host);
    components.lpszUrlPath = split.path;
    components.dwUrlPathLength = ARRAYSIZE(split.path);
    if (!Platform().CrackUrl(url.c_str(), static_cast<DWORD>(url.size()), 0, &components))
        Fail(L"Extracting url failed", nullptr, nullptr);
    split.scheme = components.nScheme;
    split.port = components.nPort;
    return split;
}

// Adds header text to the request, or fails it with message.
void AddHeaders(HINTERNET connection, HINTERNET request, const std::wstring& text, const wchar_t* message)
{
    if (!Platform().AddRequestHeaders(request, text.c_str(), static_cast<DWORD>(text.size()),
                                      WINHTTP_ADDREQ_FLAG_COALESCE_WITH_SEMICOLON))
        Fail(message, connection, request);
}

} // namespace

void KelvraHttp::Fail(const wchar_t* message, HINTERNET connection, HINTERNET request,
                      WINHTTP_CURRENT_USER_IE_PROXY_CONFIG* proxyConfig)
{
    const DWORD error = Platform().GetLastError();
    KELVRA_ERR(L"%s", message);
    throw WinHttpException{error, connection, request, proxyConfig};
}

bool CWinHttpClient::SendHttpRequest(const std::wstring& httpVerb, bool disableAutoRedirect)
{
    KELVRA_TRC(L"Trying to send Http request using method [%s], disable auto redirect [%s]", httpVerb.c_str(),
               disableAutoRedirect ? L"true" : L"false");
    lastError = 0;
    if (url.empty())
    {
        lastError = ERROR_PATH_NOT_FOUND;
        return false;
    }
    const bool isGet = _wcsicmp(httpVerb.c_str(), L"GET") == 0;
    if (!isGet && _wcsicmp(httpVerb.c_str(), L"POST") != 0)
    {
        lastError = ERROR_INVALID_PARAMETER;
        return false;
    }

    UniquePlatformHandle connection;
    UniquePlatformHandle request;
    // Filled by proxy selection; whatever it still holds when the request fails is released below.
    WINHTTP_CURRENT_USER_IE_PROXY_CONFIG userProxyConfig{};
    WinHttpException failure{};
    try
    {
        OpenSession();
        KELVRA_TRC(L"Setting Http timeouts [%d][%d][%d][%d]", resolveTimeout, connectTimeout, sendTimeout,
                   receiveTimeout);
        Platform().SetTimeouts(session, static_cast<int>(resolveTimeout), static_cast<int>(connectTimeout),
                               static_cast<int>(sendTimeout), static_cast<int>(receiveTimeout));
        KELVRA_TRC(L"Extracting url");
        const SplitUrl split = Split(url);

        KELVRA_TRC(L"Connecting to server with host [%s], port [%d]", split.host,
                   static_cast<int>(split.port));
        requestHost = split.host;
        connection.reset(Platform().Connect(session, split.host, split.port, 0));
        if (!connection)
            Fail(L"Connecting failed", nullptr, nullptr);

        KELVRA_TRC(L"Creating the request to [%s]", split.path);
        const bool secure = split.scheme == INTERNET_SCHEME_HTTPS;
        request.reset(Platform().OpenRequest(connection.get(), isGet ? L"GET" : L"POST", split.path, nullptr,
                                             WINHTTP_NO_REFERER, WINHTTP_DEFAULT_ACCEPT_TYPES,
                                             secure ? WINHTTP_FLAG_SECURE : 0));
        if (!request)
            Fail(L"Creating the request failed", connection.get(), nullptr);
        KELVRA_TRC(L"Request was created");

        PrepareRequest(connection.get(), request.get(), secure, disableAutoRedirect);
        KELVRA_TRC(L"Cracking proxy configuration");
        SelectProxy(connection.get(), request.get(), &userProxyConfig);

        const bool accepted = SendUntilAccepted(connection.get(), request.get(), isGet, disableAutoRedirect);
        KELVRA_TRC(L"Closing request");
        Close(request.release());
        KELVRA_TRC(L"Closing connection");
        Close(connection.release());
        return accepted;
    }
    catch (const WinHttpException& stageFailure)
    {
        failure = stageFailure;
    }
    catch (const std::bad_alloc&)
    {
        KELVRA_ERR(L"Out of memory");
        failure =
            WinHttpException{ERROR_NOT_ENOUGH_MEMORY, connection.get(), request.get(), &userProxyConfig};
    }
    catch (...)
    {
        // Only a progress callback that throws, against its contract, gets here.
        KELVRA_ERR(L"Unexpected exception");
        failure = WinHttpException{ERROR_INTERNAL_ERROR, connection.get(), request.get(), &userProxyConfig};
    }

    lastError = failure.error;
    KELVRA_ERR(L"Last documented error [%d]", lastError);
    if (failure.proxyConfig != nullptr)
        KelvraHttp::ReleaseUserProxyConfig(*failure.proxyConfig);
    if (failure.request != nullptr)
    {
        KELVRA_TRC(L"Closing request");
        Close(request.release());
    }
    if (failure.connection != nullptr)
    {
        KELVRA_TRC(L"Closing connection");
        Close(connection.release());
    }
    return false;
}

void CWinHttpClient::OpenSession()
{
    if (session != nullptr)
        return;
    KELVRA_TRC(L"Creating Http session");
    session = Platform().Open(userAgent.c_str(), WINHTTP_ACCESS_TYPE_DEFAULT_PROXY, WINHTTP_NO_PROXY_NAME,
                              WINHTTP_NO_PROXY_BYPASS, 0);
    if (session == nullptr)
        Fail(L"Creating Http session failed", nullptr, nullptr);
}

void CWinHttpClient::PrepareRequest(void* connection, void* request, bool secure, bool disableAutoRedirect)
{
    if (secure && !requireValidSslCertificates)
    {
        KELVRA_INF(L"Setting Https security flags");
        DWORD flags = kIgnoredCertificateErrors;
        Platform().SetOption(request, WINHTTP_OPTION_SECURITY_FLAGS, &flags, sizeof(flags));
    }
    if (!additionalRequestHeaders.empty())
    {
        KELVRA_TRC(L"Adding request headers");
        AddHeaders(connection, request, additionalRequestHeaders, L"Adding request headers failed");
    }
    if (!additionalRequestCookies.empty())
    {
        KELVRA_TRC(L"Adding request headers cookie");
        AddHeaders(connection, request, L"Cookie: " + additionalRequestCookies,
                   L"Adding request headers cookie failed");
    }
    if (disableAutoRedirect)
    {
        KELVRA_TRC(L"Disabling auto redirect option");
        DWORD feature = WINHTTP_DISABLE_REDIRECTS;
        if (!Platform().SetOption(request, WINHTTP_OPTION_DISABLE_FEATURE, &feature, sizeof(feature)))
            Fail(L"Disabling auto redirect option failed", connection, request);
    }
}

bool CWinHttpClient::SendUntilAccepted(void* connection, void* request, bool isGet, bool disableAutoRedirect)
{
    bool accepted = false;
    for (int attempt = 1; attempt <= kMaxTries; ++attempt)
    {
        KELVRA_TRC(L"[%d] try", attempt);
        KELVRA_TRC(L"Sending the Http request, total data to send [%d]", additionalDataToSendLength);
        accepted = false;
        if (!Platform().SendRequest(request, WINHTTP_NO_ADDITIONAL_HEADERS, 0, WINHTTP_NO_REQUEST_DATA, 0,
                                    additionalDataToSendLength, 0))
        {
            KELVRA_TRC(L"Send failed with error [%d]", Platform().GetLastError());
            continue;
        }
        KELVRA_TRC(L"Send succeeded");
        accepted = true;

        if (additionalDataToSend != nullptr)
        {
            KELVRA_TRC(L"Writing data to the request, total data to send [%d]", additionalDataToSendLength);
            DWORD written = 0;
            if (!Platform().WriteData(request, additionalDataToSend, additionalDataToSendLength, &written))
                Fail(L"Writing data to the request failed", connection, request);
            KELVRA_TRC(L"Total data sent [%d]", written);
        }

        KELVRA_TRC(L"Waiting for server's response");
        if (!Platform().ReceiveResponse(request, nullptr))
        {
            const DWORD error = Platform().GetLastError();
            KELVRA_ERR(L"Waiting for server's response failed [%d]", error);
            if (error == ERROR_WINHTTP_RESEND_REQUEST && attempt < kMaxTries)
                continue;
            throw WinHttpException{error, connection, request, nullptr};
        }
        ReadResponse(connection, request);

        if (isGet && !disableAutoRedirect && KelvraHttp::IsCutOffHtml(responseContent))
        {
            KELVRA_ERR(L"Invalid data");
            continue;
        }
        break;
    }
    return accepted;
}
