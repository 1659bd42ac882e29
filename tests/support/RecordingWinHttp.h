// A WinHTTP binding in force while it lives: it forwards every call to the native binding, records
// it with its text and number arguments ("SetTimeouts 0 60000 30000 30000"), counts open handles
// and handed-out proxy texts, and fails the calls it is told to.
#pragma once

#include "http/WinHttpPlatform.h"

#include <cstring>
#include <map>
#include <set>
#include <string>
#include <type_traits>
#include <vector>

namespace KelvraTest
{

class RecordingWinHttp final : public KelvraHttp::WinHttpPlatform
{
    using P = KelvraHttp::WinHttpPlatform;
    using Text = const wchar_t*;

public:
    RecordingWinHttp() : m_previous(KelvraHttp::InstallPlatform(this)) {}
    ~RecordingWinHttp() override { KelvraHttp::InstallPlatform(m_previous); }

    // Calls occurrence to occurrence + times - 1 of op from now fail with error without reaching the
    // platform (a failing receive still takes the answer, as WinHTTP does); closes and frees never fail.
    void Fail(const std::wstring& op, DWORD error, int occurrence = 1, int times = 1)
    {
        m_faults.push_back({op, error, m_seen[op] + occurrence, times});
    }
    void ClearFaults() { m_faults.clear(); }
    // Handles left open, closes of handles not open, texts not freed, frees of anything else.
    std::vector<size_t> Imbalance() const { return {open.size(), strayCloses, handedOut.size(), strayFrees}; }

    std::vector<std::wstring> calls;
    std::set<HINTERNET> open;
    // When set, GetProxyForUrl answers these proxy and bypass lists (Wine refuses the look-up).
    std::vector<std::wstring> lookedUpProxy;

    HINTERNET Open(Text agent, DWORD access, Text proxy, Text bypass, DWORD flags) override
    {
        return Call(L"Open", &P::Open, agent, access, proxy, bypass, flags);
    }
    BOOL SetTimeouts(HINTERNET session, int resolve, int connect, int send, int receive) override
    {
        return Call(L"SetTimeouts", &P::SetTimeouts, session, resolve, connect, send, receive);
    }
    BOOL CrackUrl(Text url, DWORD length, DWORD flags, URL_COMPONENTS* parts) override
    {
        return Call(L"CrackUrl", &P::CrackUrl, url, length, flags, parts);
    }
    HINTERNET Connect(HINTERNET session, Text server, INTERNET_PORT port, DWORD reserved) override
    {
        return Call(L"Connect", &P::Connect, session, server, port, reserved);
    }
    HINTERNET OpenRequest(HINTERNET connection, Text verb, Text path, Text version, Text referrer,
                          Text* types, DWORD flags) override
    {
        return Call(L"OpenRequest", &P::OpenRequest, connection, verb, path, version, referrer, types, flags);
    }
    // Records a proxy's access type and lists, a credential as length / 2 characters, or a number.
    BOOL SetOption(HINTERNET handle, DWORD option, void* buffer, DWORD length) override
    {
        const auto* proxy = static_cast<const WINHTTP_PROXY_INFO*>(buffer);
        const bool credential =
            option == WINHTTP_OPTION_PROXY_USERNAME || option == WINHTTP_OPTION_PROXY_PASSWORD;
        return Call(
            option == WINHTTP_OPTION_PROXY ? Line(L"SetOption 38", proxy->dwAccessType,
                                                  Text(proxy->lpszProxy), Text(proxy->lpszProxyBypass))
            : credential ? Line(L"SetOption", option, std::wstring(static_cast<Text>(buffer), length / 2))
                         : Line(L"SetOption", option, *static_cast<DWORD*>(buffer)),
            &P::SetOption, handle, option, buffer, length);
    }
    BOOL AddRequestHeaders(HINTERNET request, Text headers, DWORD length, DWORD modifiers) override
    {
        return Call(L"AddRequestHeaders", &P::AddRequestHeaders, request, headers, length, modifiers);
    }
    BOOL SendRequest(HINTERNET request, Text headers, DWORD headersLength, void* optional,
                     DWORD optionalLength, DWORD total, DWORD_PTR context) override
    {
        return Call(L"SendRequest", &P::SendRequest, request, headers, headersLength, optional,
                    optionalLength, total, context);
    }
    BOOL WriteData(HINTERNET request, const void* data, DWORD length, DWORD* written) override
    {
        return Call(L"WriteData", &P::WriteData, request, data, length, written);
    }
    BOOL ReceiveResponse(HINTERNET request, void* reserved) override
    {
        const bool failing = Failing(L"ReceiveResponse");
        const DWORD error = m_lastError;
        const BOOL received = Native(&P::ReceiveResponse, request, reserved);
        m_lastError = failing ? error : m_lastError;
        return !failing && received;
    }
    BOOL QueryHeaders(HINTERNET request, DWORD level, Text name, void* buffer, DWORD* length,
                      DWORD* index) override
    {
        return Call(L"QueryHeaders", &P::QueryHeaders, request, level, name, buffer, length, index);
    }
    BOOL QueryDataAvailable(HINTERNET request, DWORD* available) override
    {
        return Call(L"QueryDataAvailable", &P::QueryDataAvailable, request, available);
    }
    BOOL ReadData(HINTERNET request, void* buffer, DWORD length, DWORD* read) override
    {
        return Call(L"ReadData", &P::ReadData, request, buffer, length, read);
    }
    BOOL CloseHandle(HINTERNET handle) override
    {
        calls.push_back(L"CloseHandle");
        strayCloses += open.erase(handle) == 0 ? 1 : 0;
        return m_native.CloseHandle(handle);
    }
    BOOL GetIEProxyConfigForCurrentUser(WINHTTP_CURRENT_USER_IE_PROXY_CONFIG* config) override
    {
        const BOOL result =
            Call(L"GetIEProxyConfigForCurrentUser", &P::GetIEProxyConfigForCurrentUser, config);
        return HandedOut(result, {config->lpszAutoConfigUrl, config->lpszProxy, config->lpszProxyBypass});
    }
    BOOL GetProxyForUrl(HINTERNET session, Text url, WINHTTP_AUTOPROXY_OPTIONS* options,
                        WINHTTP_PROXY_INFO* info) override
    {
        const std::wstring text = Line(L"GetProxyForUrl", url, options->dwFlags, options->dwAutoDetectFlags,
                                       options->lpszAutoConfigUrl, options->fAutoLogonIfChallenged);
        BOOL result = FALSE;
        if (lookedUpProxy.empty())
            result = Call(text, &P::GetProxyForUrl, session, url, options, info);
        else if ((result = !Failing(text)))
            *info = {WINHTTP_ACCESS_TYPE_NAMED_PROXY, Copy(lookedUpProxy[0]), Copy(lookedUpProxy[1])};
        return HandedOut(result, {info->lpszProxy, info->lpszProxyBypass});
    }
    HGLOBAL GlobalFree(HGLOBAL memory) override
    {
        calls.push_back(L"GlobalFree");
        strayFrees += handedOut.erase(memory) == 0 ? 1 : 0;
        return m_native.GlobalFree(memory);
    }
    int MultiByteToWideChar(UINT codePage, DWORD flags, const char* bytes, int count, wchar_t* text,
                            int length) override
    {
        return Call(L"MultiByteToWideChar", &P::MultiByteToWideChar, codePage, flags, bytes, count, text,
                    length);
    }
    DWORD GetLastError() override { return m_lastError; }

private:
    // Text in, or null; handles, buffers and output texts are left out.
    static std::wstring Piece(Text text) { return text != nullptr ? text : L"null"; }
    static std::wstring Piece(const std::wstring& text) { return text; }
    static std::wstring Piece(const void*) { return L""; }
    static std::wstring Piece(wchar_t*) { return L""; }
    template <typename Number, typename = std::enable_if_t<std::is_arithmetic_v<Number>>>
    static std::wstring Piece(Number value)
    {
        return std::to_wstring(value);
    }
    template <typename... Args> static std::wstring Line(const std::wstring& name, Args... args)
    {
        std::wstring text = name;
        for (const std::wstring& piece : {Piece(args)...})
            text += piece.empty() ? L"" : L" " + piece;
        return text;
    }

    // Records the call; true when a fault chooses it (its error then stands as the last error).
    bool Failing(const std::wstring& text)
    {
        calls.push_back(text);
        const std::wstring op = text.substr(0, text.find(L' '));
        const int occurrence = ++m_seen[op];
        for (const Fault& fault : m_faults)
            if (fault.op == op && occurrence >= fault.first && occurrence < fault.first + fault.times)
                return m_lastError = fault.error, true;
        return false;
    }
    template <typename Result, typename... Params, typename... Args>
    Result Native(Result (P::*method)(Params...), Args... args)
    {
        const Result result = (m_native.*method)(args...);
        m_lastError = m_native.GetLastError();
        if constexpr (std::is_same_v<Result, HINTERNET>)
            if (result != nullptr)
                open.insert(result);
        return result;
    }
    // The call recorded as name and its arguments (unless name holds them already) and forwarded.
    template <typename Result, typename... Params, typename... Args>
    Result Call(const std::wstring& name, Result (P::*method)(Params...), Args... args)
    {
        return Failing(name.find(L' ') == std::wstring::npos ? Line(name, args...) : name)
                   ? Result{}
                   : Native(method, args...);
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

    struct Fault
    {
        std::wstring op;
        DWORD error;
        int first, times;
    };
    P& m_native = KelvraHttp::NativePlatform();
    P* m_previous;
    std::map<std::wstring, int> m_seen;
    std::vector<Fault> m_faults;
    std::set<HGLOBAL> handedOut;
    size_t strayCloses = 0, strayFrees = 0;
    DWORD m_lastError = 0;
};

} // namespace KelvraTest
