// Every platform operation the HTTP client uses, behind one interface: the native binding forwards
// to winhttp.dll and the kernel; tests install a recording or fault-injecting binding. The client
// reaches the platform through Platform() only.
#pragma once

#include "common/UniqueHandle.h"

#include <windows.h>
#include <winhttp.h>

namespace KelvraHttp
{

// Same arguments and results as the WinHTTP and kernel functions of the same names. A failed call
// returns false, null or 0, and GetLastError() then gives its error code.
class WinHttpPlatform
{
public:
    virtual ~WinHttpPlatform() = default;

    virtual HINTERNET Open(const wchar_t* userAgent, DWORD accessType, const wchar_t* proxyName,
                           const wchar_t* proxyBypass, DWORD flags) = 0;
    virtual BOOL SetTimeouts(HINTERNET session, int resolveTimeout, int connectTimeout, int sendTimeout,
                             int receiveTimeout) = 0;
    virtual BOOL CrackUrl(const wchar_t* url, DWORD urlLength, DWORD flags, URL_COMPONENTS* components) = 0;
    virtual HINTERNET Connect(HINTERNET session, const wchar_t* serverName, INTERNET_PORT port,
                              DWORD reserved) = 0;
    virtual HINTERNET OpenRequest(HINTERNET connection, const wchar_t* verb, const wchar_t* objectName,
                                  const wchar_t* version, const wchar_t* referrer,
                                  const wchar_t** acceptTypes, DWORD flags) = 0;
    virtual BOOL SetOption(HINTERNET handle, DWORD option, void* buffer, DWORD bufferLength) = 0;
    virtual BOOL AddRequestHeaders(HINTERNET request, const wchar_t* headers, DWORD headersLength,
                                   DWORD modifiers) = 0;
    virtual BOOL SendRequest(HINTERNET request, const wchar_t* headers, DWORD headersLength, void* optional,
                             DWORD optionalLength, DWORD totalLength, DWORD_PTR context) = 0;
    virtual BOOL WriteData(HINTERNET request, const void* buffer, DWORD bytesToWrite,
                           DWORD* bytesWritten) = 0;
    virtual BOOL ReceiveResponse(HINTERNET request, void* reserved) = 0;
    virtual BOOL QueryHeaders(HINTERNET request, DWORD infoLevel, const wchar_t* name, void* buffer,
                              DWORD* bufferLength, DWORD* index) = 0;
    virtual BOOL QueryDataAvailable(HINTERNET request, DWORD* bytesAvailable) = 0;
    virtual BOOL ReadData(HINTERNET request, void* buffer, DWORD bytesToRead, DWORD* bytesRead) = 0;
    virtual BOOL CloseHandle(HINTERNET handle) = 0;
    virtual BOOL GetIEProxyConfigForCurrentUser(WINHTTP_CURRENT_USER_IE_PROXY_CONFIG* config) = 0;
    virtual BOOL GetProxyForUrl(HINTERNET session, const wchar_t* url, WINHTTP_AUTOPROXY_OPTIONS* options,
                                WINHTTP_PROXY_INFO* proxyInfo) = 0;
    virtual HGLOBAL GlobalFree(HGLOBAL memory) = 0;
    virtual int MultiByteToWideChar(UINT codePage, DWORD flags, const char* bytes, int byteCount,
                                    wchar_t* text, int textLength) = 0;
    virtual DWORD GetLastError() = 0;
};

// The binding in force: the one installed last, else the native one.
WinHttpPlatform& Platform();
// The binding that calls winhttp.dll and the kernel.
WinHttpPlatform& NativePlatform();
// Test hook, not exported: makes binding (null: the native one) the one in force for the whole
// process and returns the previous one. Install it while no client holds a session or handle.
WinHttpPlatform* InstallPlatform(WinHttpPlatform* binding);

// WinHTTP handles closed through the binding in force.
struct PlatformHandleTraits
{
    using pointer = HINTERNET;
    static pointer invalid() noexcept { return nullptr; }
    static void close(pointer value) noexcept { Platform().CloseHandle(value); }
};
using UniquePlatformHandle = Kelvra::UniqueHandle<PlatformHandleTraits>;

// Text the proxy calls hand out (GlobalAlloc), freed through the binding in force.
struct PlatformTextTraits
{
    using pointer = wchar_t*;
    static pointer invalid() noexcept { return nullptr; }
    static void close(pointer value) noexcept { Platform().GlobalFree(value); }
};
using UniquePlatformText = Kelvra::UniqueHandle<PlatformTextTraits>;

} // namespace KelvraHttp
