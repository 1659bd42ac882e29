// A WinHTTP binding for the HTTP client's tests: it forwards every call to the native binding,
// records it as text, keeps count of open handles, and fails the calls it is told to. It is the
// binding in force for its lifetime.
#pragma once

#include "http/WinHttpPlatform.h"

#include <cstring>
#include <map>
#include <set>
#include <string>
#include <vector>

namespace KelvraTest
{

// The calls of the operation named op ("ReadData") numbered occurrence to occurrence + times - 1,
// counted from when the fault is added, fail with error without reaching the platform; a failing
// receive takes the server's answer all the same, as WinHTTP does before it asks for a resend.
// A QueryDataAvailable fault with available set succeeds instead, reporting that many bytes.
// Closes and frees never fail.
struct Fault
{
    std::wstring op;
    DWORD error = 0;
    int occurrence = 1;
    int times = 1;
    DWORD available = 0;
};

class RecordingWinHttp final : public KelvraHttp::WinHttpPlatform
{
    using Platform = KelvraHttp::WinHttpPlatform;

public:
    RecordingWinHttp() : m_previous(KelvraHttp::InstallPlatform(this)) {}
    ~RecordingWinHttp() override { KelvraHttp::InstallPlatform(m_previous); }

    void Add(const Fault& fault) { m_faults.emplace_back(fault, m_seen[fault.op]); }
    // The n-th call from now, of any operation, fails with error.
    void FailCall(int n, DWORD error) { m_faults.emplace_back(Fault{L"", error}, int(calls.size()) + n); }
    void ClearFaults() { m_faults.clear(); }

    // Every call in order: its name and the arguments that matter ("SetOption 31 12544").
    std::vector<std::wstring> calls;
    std::set<HINTERNET> open;
    int strayCloses = 0; // of handles not open: closed twice, or never opened
    // Proxy texts handed out and not yet freed, and frees of anything else.
    std::set<HGLOBAL> handedOut;
    int strayFrees = 0;
    // When set, GetProxyForUrl answers a named proxy with these proxy and bypass lists (as Wine
    // cannot: it refuses the auto-detection that comes with a script).
    std::vector<std::wstring> lookedUpProxy;

    HINTERNET Open(const wchar_t* agent, DWORD access, const wchar_t* proxy, const wchar_t* bypass,
                   DWORD flags) override
    {
        return Opened(
            Call(Text(L"Open", agent, access, flags), &Platform::Open, agent, access, proxy, bypass, flags));
    }
    BOOL SetTimeouts(HINTERNET session, int resolve, int connect, int send, int receive) override
    {
        return Call(Text(L"SetTimeouts", resolve, connect, send, receive), &Platform::SetTimeouts, session,
                    resolve, connect, send, receive);
    }
    BOOL CrackUrl(const wchar_t* url, DWORD length, DWORD flags, URL_COMPONENTS* parts) override
    {
        return Call(Text(L"CrackUrl", std::wstring(url, length)), &Platform::CrackUrl, url, length, flags,
                    parts);
    }
    HINTERNET Connect(HINTERNET session, const wchar_t* server, INTERNET_PORT port, DWORD reserved) override
    {
        return Opened(Call(Text(L"Connect", server), &Platform::Connect, session, server, port, reserved));
    }
    HINTERNET OpenRequest(HINTERNET connection, const wchar_t* verb, const wchar_t* path,
                          const wchar_t* version, const wchar_t* referrer, const wchar_t** types,
                          DWORD flags) override
    {
        return Opened(Call(Text(L"OpenRequest", verb, path, flags), &Platform::OpenRequest, connection, verb,
                           path, version, referrer, types, flags));
    }
    // Records a proxy's access type and lists, a credential's length / 2 characters, or a number.
    BOOL SetOption(HINTERNET handle, DWORD option, void* buffer, DWORD length) override
    {
        const auto* proxy = static_cast<const WINHTTP_PROXY_INFO*>(buffer);
        const std::wstring text =
            option == WINHTTP_OPTION_PROXY && length == sizeof(*proxy)
                ? Text(L"SetOption 38", proxy->dwAccessType, static_cast<const wchar_t*>(proxy->lpszProxy),
                       static_cast<const wchar_t*>(proxy->lpszProxyBypass))
            : option == WINHTTP_OPTION_PROXY_USERNAME || option == WINHTTP_OPTION_PROXY_PASSWORD
                ? Text(L"SetOption", option, std::wstring(static_cast<const wchar_t*>(buffer), length / 2))
                : Text(L"SetOption", option, length == sizeof(DWORD) ? *static_cast<DWORD*>(buffer) : 0);
        return Call(text, &Platform::SetOption, handle, option, buffer, length);
    }
    BOOL AddRequestHeaders(HINTERNET request, const wchar_t* headers, DWORD length, DWORD modifiers) override
    {
        return Call(Text(L"AddRequestHeaders", std::wstring(headers, length), modifiers),
                    &Platform::AddRequestHeaders, request, headers, length, modifiers);
    }
    BOOL SendRequest(HINTERNET request, const wchar_t* headers, DWORD headersLength, void* optional,
                     DWORD optionalLength, DWORD total, DWORD_PTR context) override
    {
        return Call(Text(L"SendRequest", total), &Platform::SendRequest, request, headers, headersLength,
                    optional, optionalLength, total, context);
    }
    BOOL WriteData(HINTERNET request, const void* data, DWORD length, DWORD* written) override
    {
        return Call(Text(L"WriteData", length), &Platform::WriteData, request, data, length, written);
    }
    BOOL ReceiveResponse(HINTERNET request, void* reserved) override
    {
        const bool failing = Failing(L"ReceiveResponse");
        const DWORD error = m_lastError;
        const BOOL received = m_native.ReceiveResponse(request, reserved);
        m_lastError = failing ? error : m_native.GetLastError();
        return failing ? FALSE : received;
    }
    BOOL QueryHeaders(HINTERNET request, DWORD level, const wchar_t* name, void* buffer, DWORD* length,
                      DWORD* index) override
    {
        return Call(Text(L"QueryHeaders", level, buffer != nullptr ? *length : 0), &Platform::QueryHeaders,
                    request, level, name, buffer, length, index);
    }
    BOOL QueryDataAvailable(HINTERNET request, DWORD* available) override
    {
        const BOOL result =
            Call(Text(L"QueryDataAvailable"), &Platform::QueryDataAvailable, request, available);
        if (m_reported != 0)
            *available = m_reported;
        return result || m_reported != 0;
    }
    BOOL ReadData(HINTERNET request, void* buffer, DWORD length, DWORD* read) override
    {
        return Call(Text(L"ReadData", length), &Platform::ReadData, request, buffer, length, read);
    }
    BOOL CloseHandle(HINTERNET handle) override
    {
        strayCloses += open.erase(handle) == 0 ? 1 : 0;
        Failing(L"CloseHandle");
        return m_native.CloseHandle(handle);
    }
    BOOL GetIEProxyConfigForCurrentUser(WINHTTP_CURRENT_USER_IE_PROXY_CONFIG* config) override
    {
        const BOOL result =
            Call(Text(L"GetIEProxyConfigForCurrentUser"), &Platform::GetIEProxyConfigForCurrentUser, config);
        return HandedOut(result, {config->lpszAutoConfigUrl, config->lpszProxy, config->lpszProxyBypass});
    }
    BOOL GetProxyForUrl(HINTERNET session, const wchar_t* url, WINHTTP_AUTOPROXY_OPTIONS* options,
                        WINHTTP_PROXY_INFO* info) override
    {
        const std::wstring text = Text(L"GetProxyForUrl", url, options->dwFlags, options->dwAutoDetectFlags,
                                       options->lpszAutoConfigUrl, options->fAutoLogonIfChallenged);
        BOOL result = FALSE;
        if (lookedUpProxy.empty())
            result = Call(text, &Platform::GetProxyForUrl, session, url, options, info);
        else if ((result = !Failing(text)))
            *info = {WINHTTP_ACCESS_TYPE_NAMED_PROXY, Copy(lookedUpProxy[0]), Copy(lookedUpProxy[1])};
        return HandedOut(result, {info->lpszProxy, info->lpszProxyBypass});
    }
    HGLOBAL GlobalFree(HGLOBAL memory) override
    {
        Failing(L"GlobalFree");
        strayFrees += handedOut.erase(memory) == 0 ? 1 : 0;
        return m_native.GlobalFree(memory);
    }
    int MultiByteToWideChar(UINT codePage, DWORD flags, const char* bytes, int count, wchar_t* text,
                            int length) override
    {
        return Call(Text(L"MultiByteToWideChar", codePage, flags, count), &Platform::MultiByteToWideChar,
                    codePage, flags, bytes, count, text, length);
    }
    DWORD GetLastError() override { return m_lastError; }

private:
    static std::wstring Piece(const wchar_t* text) { return text != nullptr ? text : L"null"; }
    static std::wstring Piece(const std::wstring& text) { return text; }
    template <typename Number> static std::wstring Piece(Number value) { return std::to_wstring(value); }
    template <typename... Args> static std::wstring Text(const wchar_t* name, Args... args)
    {
        std::wstring text = name;
        ((text += L' ', text += Piece(args)), ...);
        return text;
    }

    // Records the call; true when a fault chooses it (its error then stands as the last error).
    bool Failing(const std::wstring& text)
    {
        calls.push_back(text);
        const std::wstring op = text.substr(0, text.find(L' '));
        const int occurrence = ++m_seen[op];
        m_reported = 0;
        for (const auto& [fault, base] : m_faults)
        {
            const int at = occurrence - base;
            if (fault.op.empty()
                    ? int(calls.size()) == base
                    : fault.op == op && at >= fault.occurrence && at < fault.occurrence + fault.times)
            {
                m_lastError = fault.error;
                m_reported = fault.available;
                return true;
            }
        }
        return false;
    }
    template <typename Result, typename... Params, typename... Args>
    Result Call(const std::wstring& text, Result (Platform::*method)(Params...), Args... args)
    {
        if (Failing(text))
            return Result{};
        const Result result = (m_native.*method)(args...);
        m_lastError = m_native.GetLastError();
        return result;
    }
    // Text as WinHTTP hands it out.
    static wchar_t* Copy(const std::wstring& text)
    {
        const size_t size = (text.size() + 1) * sizeof(wchar_t);
        return static_cast<wchar_t*>(std::memcpy(::GlobalAlloc(GMEM_FIXED, size), text.c_str(), size));
    }
    BOOL HandedOut(BOOL result, std::initializer_list<wchar_t*> texts)
    {
        for (wchar_t* text : texts)
            if (result && text != nullptr)
                handedOut.insert(text);
        return result;
    }
    HINTERNET Opened(HINTERNET handle)
    {
        if (handle != nullptr)
            open.insert(handle);
        return handle;
    }

    Platform& m_native = KelvraHttp::NativePlatform();
    Platform* m_previous;
    std::map<std::wstring, int> m_seen;
    // Each fault with the count of its operation when added; a fault of no operation holds the
    // number of the call it fails instead.
    std::vector<std::pair<Fault, int>> m_faults;
    DWORD m_lastError = 0;
    DWORD m_reported = 0;
};

} // namespace KelvraTest
