#include "http/WinHttpPlatform.h"

#include <atomic>

namespace KelvraHttp
{

namespace
{

class NativeWinHttp final : public WinHttpPlatform
{
public:
    HINTERNET Open(const wchar_t* userAgent, DWORD accessType, const wchar_t* proxyName,
                   const wchar_t* proxyBypass, DWORD flags) override
    {
        return ::WinHttpOpen(userAgent, accessType, proxyName, proxyBypass, flags);
    }
    BOOL SetTimeouts(HINTERNET session, int resolveTimeout, int connectTimeout, int sendTimeout,
                     int receiveTimeout) override
    {
        return ::WinHttpSetTimeouts(session, resolveTimeout, connectTimeout, sendTimeout, receiveTimeout);
    }
    BOOL CrackUrl(const wchar_t* url, DWORD urlLength, DWORD flags, URL_COMPONENTS* components) override
    {
        return ::WinHttpCrackUrl(url, urlLength, flags, components);
    }
    HINTERNET Connect(HINTERNET session, const wchar_t* serverName, INTERNET_PORT port,
                      DWORD reserved) override
    {
        return ::WinHttpConnect(session, serverName, port, reserved);
    }
    HINTERNET OpenRequest(HINTERNET connection, const wchar_t* verb, const wchar_t* objectName,
                          const wchar_t* version, const wchar_t* referrer, const wchar_t** acceptTypes,
                          DWORD flags) override
    {
        return ::WinHttpOpenRequest(connection, verb, objectName, version, referrer, acceptTypes, flags);
    }
    BOOL SetOption(HINTERNET handle, DWORD option, void* buffer, DWORD bufferLength) override
    {
        return ::WinHttpSetOption(handle, option, buffer, bufferLength);
    }
    BOOL AddRequestHeaders(HINTERNET request, const wchar_t* headers, DWORD headersLength,
                           DWORD modifiers) override
    {
        return ::WinHttpAddRequestHeaders(request, headers, headersLength, modifiers);
    }
    BOOL SendRequest(HINTERNET request, const wchar_t* headers, DWORD headersLength, void* optional,
                     DWORD optionalLength, DWORD totalLength, DWORD_PTR context) override
    {
        return ::WinHttpSendRequest(request, headers, headersLength, optional, optionalLength, totalLength,
                                    context);
    }
    BOOL WriteData(HINTERNET request, const void* buffer, DWORD bytesToWrite, DWORD* bytesWritten) override
    {
        return ::WinHttpWriteData(request, buffer, bytesToWrite, bytesWritten);
    }
    BOOL ReceiveResponse(HINTERNET request, void* reserved) override
    {
        return ::WinHttpReceiveResponse(request, reserved);
    }
    BOOL QueryHeaders(HINTERNET request, DWORD infoLevel, const wchar_t* name, void* buffer,
                      DWORD* bufferLength, DWORD* index) override
    {
        return ::WinHttpQueryHeaders(request, infoLevel, name, buffer, bufferLength, index);
    }
    BOOL QueryDataAvailable(HINTERNET request, DWORD* bytesAvailable) override
    {
        return ::WinHttpQueryDataAvailable(request, bytesAvailable);
    }
    BOOL ReadData(HINTERNET request, void* buffer, DWORD bytesToRead, DWORD* bytesRead) override
    {
        return ::WinHttpReadData(request, buffer, bytesToRead, bytesRead);
    }
    BOOL CloseHandle(HINTERNET handle) override { return ::WinHttpCloseHandle(handle); }
    BOOL GetIEProxyConfigForCurrentUser(WINHTTP_CURRENT_USER_IE_PROXY_CONFIG* config) override
    {
        return ::WinHttpGetIEProxyConfigForCurrentUser(config);
    }
    BOOL GetProxyForUrl(HINTERNET session, const wchar_t* url, WINHTTP_AUTOPROXY_OPTIONS* options,
                        WINHTTP_PROXY_INFO* proxyInfo) override
    {
        return ::WinHttpGetProxyForUrl(session, url, options, proxyInfo);
    }
    HGLOBAL GlobalFree(HGLOBAL memory) override { return ::GlobalFree(memory); }
    int MultiByteToWideChar(UINT codePage, DWORD flags, const char* bytes, int byteCount, wchar_t* text,
                            int textLength) override
    {
        return ::MultiByteToWideChar(codePage, flags, bytes, byteCount, text, textLength);
    }
    DWORD GetLastError() override { return ::GetLastError(); }
};

NativeWinHttp native;
std::atomic<WinHttpPlatform*> installed{nullptr};

} // namespace

WinHttpPlatform& NativePlatform()
{
    return native;
}

WinHttpPlatform& Platform()
{
    WinHttpPlatform* binding = installed.load(std::memory_order_acquire);
    return binding != nullptr ? *binding : native;
}

WinHttpPlatform* InstallPlatform(WinHttpPlatform* binding)
{
    return installed.exchange(binding, std::memory_order_acq_rel);
}

} // namespace KelvraHttp
