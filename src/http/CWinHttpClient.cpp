#include "KelvraHttp.h"

#include "KelvraTrace.h"

#include "common/UniqueHandle.h"
#include "http/BodyBuffer.h"
#include "http/WinHttpPlatform.h"

#include <cstdio>
#include <cstring>
#include <new>

CWinHttpClient::CWinHttpClient(const std::wstring& url, bool (*progress)(double))
    : session(nullptr), requireValidSslCertificates(false), url(url), rawResponseContent(nullptr),
      rawResponseReceivedContentLength(0), progressCallback(progress), rawResponseContentLength(0),
      additionalDataToSend(nullptr), additionalDataToSendLength(0), lastError(0), userAgent(L"WinHttpClient"),
      resolveTimeout(0), connectTimeout(60000), sendTimeout(30000), receiveTimeout(30000), forceCharset(false)
{
    KELVRA_INF(L"Constructing the Http client [%s]", url.c_str());
}

CWinHttpClient::~CWinHttpClient()
{
    KELVRA_INF(L"Destructing the Http client");
    KelvraHttp::ReleaseBody(rawResponseContent);
    delete[] additionalDataToSend;
    if (session != nullptr)
        Close(session);
}

bool CWinHttpClient::SetUserAgent(const std::wstring& userAgent)
{
    this->userAgent = userAgent;
    return true;
}

bool CWinHttpClient::SetTimeouts(std::uint32_t resolveTimeout, std::uint32_t connectTimeout,
                                 std::uint32_t sendTimeout, std::uint32_t receiveTimeout)
{
    this->resolveTimeout = resolveTimeout;
    this->connectTimeout = connectTimeout;
    this->sendTimeout = sendTimeout;
    this->receiveTimeout = receiveTimeout;
    return true;
}

bool CWinHttpClient::SetRequireValidSslCertificates(bool require)
{
    requireValidSslCertificates = require;
    return true;
}

bool CWinHttpClient::SetForceCharset(const std::wstring& charset)
{
    responseCharset = charset;
    forceCharset = !charset.empty();
    return true;
}

bool CWinHttpClient::SetProxy(const std::wstring& proxy)
{
    this->proxy = proxy;
    return true;
}

bool CWinHttpClient::SetProxyUsername(const std::wstring& username)
{
    proxyUsername = username;
    return true;
}

bool CWinHttpClient::SetProxyPassword(const std::wstring& password)
{
    proxyPassword = password;
    return true;
}

bool CWinHttpClient::SetAdditionalRequestHeaders(const std::wstring& headers)
{
    additionalRequestHeaders = headers;
    return true;
}

bool CWinHttpClient::SetAdditionalRequestCookies(const std::wstring& cookies)
{
    additionalRequestCookies = cookies;
    return true;
}

bool CWinHttpClient::SetAdditionalDataToSend(const unsigned char* data, std::uint32_t size)
{
    if (data == nullptr || size == 0)
        return false;
    // The size plus its spare zero byte is counted in 64 bits: 4 GiB - 1 must not wrap to 0.
    unsigned char* copy = new (std::nothrow) unsigned char[static_cast<size_t>(size) + 1];
    if (copy == nullptr)
        return false;
    std::memcpy(copy, data, size);
    copy[size] = 0;
    delete[] additionalDataToSend;
    additionalDataToSend = copy;
    additionalDataToSendLength = size;
    return true;
}

bool CWinHttpClient::ResetAdditionalDataToSend()
{
    delete[] additionalDataToSend;
    additionalDataToSend = nullptr;
    additionalDataToSendLength = 0;
    return true;
}

bool CWinHttpClient::UpdateUrl(const std::wstring& url)
{
    this->url = url;
    return ResetAdditionalDataToSend();
}

std::wstring CWinHttpClient::GetResponseHeader() const
{
    return responseHeader;
}

std::wstring CWinHttpClient::GetResponseContent() const
{
    return responseContent;
}

std::wstring CWinHttpClient::GetResponseCharset() const
{
    return responseCharset;
}

std::wstring CWinHttpClient::GetRequestHost() const
{
    return requestHost;
}

std::wstring CWinHttpClient::GetResponseCookies() const
{
    return responseCookies;
}

std::wstring CWinHttpClient::GetResponseStatusCode() const
{
    return responseStatusCode;
}

std::wstring CWinHttpClient::GetResponseLocation() const
{
    return responseLocation;
}

const unsigned char* CWinHttpClient::GetRawResponseContent() const
{
    return rawResponseContent;
}

std::uint32_t CWinHttpClient::GetRawResponseContentLength() const
{
    return rawResponseContentLength;
}

std::uint32_t CWinHttpClient::GetRawResponseReceivedContentLength() const
{
    return rawResponseReceivedContentLength;
}

std::uint32_t CWinHttpClient::GetLastError() const
{
    return lastError;
}

bool CWinHttpClient::SaveResponseToFile(const std::wstring& filePath)
{
    if (rawResponseContent == nullptr || rawResponseReceivedContentLength == 0)
        return false;
    Kelvra::UniqueFile file(::_wfopen(filePath.c_str(), L"wb"));
    if (!file)
        return false;
    // A short write (full disk) leaves a cut file: that is no success. The flush is asked for on
    // its own, since Wine's fclose does not report a failed last flush.
    const bool written = std::fwrite(rawResponseContent, 1, rawResponseReceivedContentLength, file.get()) ==
                             rawResponseReceivedContentLength &&
                         std::fflush(file.get()) == 0;
    return std::fclose(file.release()) == 0 && written;
}

bool CWinHttpClient::SetProgress(std::uint32_t bytesReceived)
{
    if (progressCallback == nullptr || rawResponseContentLength == 0)
        return false;
    progressCallback(static_cast<double>(bytesReceived) * 100.0 /
                     static_cast<double>(rawResponseContentLength));
    return true;
}

void CWinHttpClient::Close(void* handle)
{
    KelvraHttp::Platform().CloseHandle(handle);
}
