// HTTP and HTTPS requests over WinHTTP: CWinHttpClient sends one GET or POST at a time to its URL
// and keeps the results of the latest response.
#pragma once

#include "KelvraApi.h"

#include <cstdint>
#include <string>

// One object per target URL, serving one thread at a time; it owns its WinHTTP session (opened by
// the first request, closed by the destructor) and its byte buffers, and cannot be copied. Every
// request and every stage of it is traced (KelvraTrace.h). Setters take effect from the next
// SendHttpRequest; result fields keep their values until a later response supplies new ones.
// Setters and getters copy strings and, like any std::wstring, may throw std::bad_alloc.
class KELVRA_API CWinHttpClient
{
public:
    // progress, when not null, is called on the caller's thread with the percentage of the
    // announced Content-Length received so far (above 100 when more arrives); its result is
    // ignored. It must not throw: one that does fails the request with error 1359.
    explicit CWinHttpClient(const std::wstring& url, bool (*progress)(double) = nullptr);
    ~CWinHttpClient();
    CWinHttpClient(const CWinHttpClient&) = delete;
    CWinHttpClient& operator=(const CWinHttpClient&) = delete;

    // Sends httpVerb ("GET" or "POST", any case) to the URL with the extra headers, cookies and
    // body set, up to five tries. disableAutoRedirect returns a 3xx as the response; otherwise
    // redirects are followed and a GET whose HTML body lacks "</html>" is sent again. True when a
    // response was read, whatever its status (404 included). False with GetLastError: 3 empty
    // URL, 87 other verb, 8 memory ran out at any stage, reading a header field included (a body
    // of 4 GiB or more too), else the WinHTTP error; 0 when every send failed. Never throws.
    bool SendHttpRequest(const std::wstring& httpVerb, bool disableAutoRedirect);

    // The user agent reaches WinHTTP once, when the first request opens the session.
    bool SetUserAgent(const std::wstring& userAgent);
    // Milliseconds, applied to the session at the start of every request.
    bool SetTimeouts(std::uint32_t resolveTimeout, std::uint32_t connectTimeout, std::uint32_t sendTimeout,
                     std::uint32_t receiveTimeout);
    // While false (the default), HTTPS requests ignore an unknown authority, a name mismatch and
    // an expired certificate.
    bool SetRequireValidSslCertificates(bool require);
    // A non-empty name decodes every later body with that charset, whatever the responses name;
    // an empty one releases it (responses' charsets apply again).
    bool SetForceCharset(const std::wstring& charset);
    // A manual proxy list (as WinHTTP reads one, any length) replaces the current user's settings;
    // empty, the default, uses them: their auto-config script, else their proxy and bypass list.
    // The password reaches the proxy only together with a user name.
    bool SetProxy(const std::wstring& proxy);
    bool SetProxyUsername(const std::wstring& username);
    bool SetProxyPassword(const std::wstring& password);
    // Header lines ("Name: value", CR LF between lines) added to every request.
    bool SetAdditionalRequestHeaders(const std::wstring& headers);
    // Sent as "Cookie: " followed by this text with every request.
    bool SetAdditionalRequestCookies(const std::wstring& cookies);
    // Copies size bytes to send as the body of every request. False, keeping the previous body,
    // for a null pointer, a size of 0 or no memory for the copy.
    bool SetAdditionalDataToSend(const unsigned char* data, std::uint32_t size);
    // Drops the body copy.
    bool ResetAdditionalDataToSend();
    // Replaces the URL and drops the body copy; session, settings and results stay.
    bool UpdateUrl(const std::wstring& url);

    // Copies of the latest results. The header block is the raw text WinHTTP reports; cookies
    // collect every Set-Cookie value seen by this object ("a=1; b=2;c=3;"); the location is the
    // whole Location value of the latest response that had one.
    std::wstring GetResponseHeader() const;
    std::wstring GetResponseContent() const;
    std::wstring GetResponseCharset() const;
    std::wstring GetRequestHost() const;
    std::wstring GetResponseCookies() const;
    std::wstring GetResponseStatusCode() const;
    std::wstring GetResponseLocation() const;
    // The body bytes received, followed by a zero byte; owned by the object, valid until the next
    // request starts reading a body. Null before the first body.
    const unsigned char* GetRawResponseContent() const;
    // The latest Content-Length announced (not the bytes received), 0 until one is seen.
    std::uint32_t GetRawResponseContentLength() const;
    // The bytes GetRawResponseContent holds, also after a request that failed while reading.
    std::uint32_t GetRawResponseReceivedContentLength() const;
    // 0 after a request that succeeded or whose every send failed; see SendHttpRequest.
    std::uint32_t GetLastError() const;

    // Writes exactly the received body bytes to filePath (created or truncated). False, with no
    // file, when no body byte was received; false when the file cannot be opened or written.
    bool SaveResponseToFile(const std::wstring& filePath);

private:
    // Reports bytesReceived against the announced length; false, without a call, when there is
    // no callback or no length.
    bool SetProgress(std::uint32_t bytesReceived);
    void Close(void* handle);

    // Stages of SendHttpRequest (src/http/); they hand failures to its single failure path.
    void OpenSession();
    void PrepareRequest(void* connection, void* request, bool secure, bool disableAutoRedirect);
    // userProxyConfig: SendHttpRequest's WINHTTP_CURRENT_USER_IE_PROXY_CONFIG, filled here; the
    // failure path releases what it still holds.
    void SelectProxy(void* connection, void* request, void* userProxyConfig);
    bool SendUntilAccepted(void* connection, void* request, bool isGet, bool disableAutoRedirect);
    void ReadResponse(void* connection, void* request);
    std::uint64_t ReadHeaderBlock(void* request);
    void ReadStatusCode(void* request);
    void ReadBody(void* connection, void* request, std::uint64_t announcedLength);
    void DecodeBody();

    void* session;
    bool requireValidSslCertificates;
    std::wstring url;
    std::wstring requestHost;
    std::wstring responseHeader;
    std::wstring responseContent;
    std::wstring responseCharset;
    unsigned char* rawResponseContent;
    std::uint32_t rawResponseReceivedContentLength;
    bool (*progressCallback)(double);
    std::uint32_t rawResponseContentLength;
    std::wstring responseCookies;
    std::wstring additionalRequestCookies;
    unsigned char* additionalDataToSend;
    std::uint32_t additionalDataToSendLength;
    std::wstring additionalRequestHeaders;
    std::wstring proxy;
    std::uint32_t lastError;
    std::wstring responseStatusCode;
    std::wstring userAgent;
    std::wstring proxyUsername;
    std::wstring proxyPassword;
    std::wstring responseLocation;
    std::uint32_t resolveTimeout;
    std::uint32_t connectTimeout;
    std::uint32_t sendTimeout;
    std::uint32_t receiveTimeout;
    bool forceCharset; // SetForceCharset holds responseCharset against the responses'
};
