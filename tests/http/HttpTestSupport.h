// What the HTTP client's tests share: the local servers (tests/support/http_server.py, started by
// ctest), the trace session c:\keltrace\http_tests.log read back line by line, and the current
// user's proxy settings.
#pragma once

#include "KelvraStrings.h"
#include "KelvraTrace.h"

#include "support/TestData.h"
#include "trace/TraceTestSupport.h"

#include <windows.h>

#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <string>
#include <vector>

namespace KelvraHttpTest
{

// path on one of the local listeners: "http", "https" or "hostile" (scripted replies, named by path).
inline std::wstring ServerUrl(const std::wstring& path, const std::wstring& listener = L"http")
{
    const std::string port = KelvraTest::ReadBinaryFile(KelvraTest::DataPath(listener + L"_server.port"));
    return (listener == L"https" ? L"https" : L"http") +
           (L"://127.0.0.1:" + std::wstring(port.begin(), port.end())) + path;
}

inline size_t traceLogSeen = 0;

// The trace lines written since the previous call, each as "<tag> <message>" ("TRC [1] try").
inline std::vector<std::wstring> NewTraceLines()
{
    const std::string log = KelvraTraceTest::ReadMarkerFile(L"http_tests.log");
    std::vector<std::wstring> lines;
    for (const std::string& line :
         KelvraTraceTest::TaggedMessages(log.substr(std::min(traceLogSeen, log.size()))))
        lines.push_back(KelvraStrings::Strings::ToString(line));
    traceLogSeen = log.size();
    return lines;
}

// The program's trace session, c:\keltrace\http_tests.log, while its tests run; c:\keltrace is
// left as it was found.
class TraceSession : public testing::Environment
{
public:
    void SetUp() override
    {
        m_created = std::filesystem::create_directory(KelvraTraceTest::kMarker);
        Debug::start(L"http_tests", false, false);
        ASSERT_NE(CLog::_log, nullptr) << "no trace session in c:\\keltrace";
        traceLogSeen = KelvraTraceTest::ReadMarkerFile(L"http_tests.log").size();
    }
    void TearDown() override
    {
        Debug::stop();
        Debug::lock();
        std::fclose(CLog::_log);
        CLog::_log = nullptr;
        Debug::unlock();
        std::filesystem::remove(KelvraTraceTest::kMarker / L"http_tests.log");
        if (m_created)
            std::filesystem::remove(KelvraTraceTest::kMarker);
    }

private:
    bool m_created = false;
};

// The current user's proxy settings, in the registry value Wine's WinHTTP reads (README): none
// while the object lives, unless set; then the value found is put back (ctest lock hkcu_proxy).
class UserProxySettings
{
public:
    UserProxySettings()
    {
        DWORD size = 0;
        m_read = ::RegGetValueW(HKEY_CURRENT_USER, kKey, kValue, RRF_RT_REG_BINARY, nullptr, nullptr, &size);
        m_saved.resize(size);
        if (m_read == ERROR_SUCCESS)
            m_read = ::RegGetValueW(HKEY_CURRENT_USER, kKey, kValue, RRF_RT_REG_BINARY, nullptr, &m_saved[0],
                                    &size);
        Set(L"", L"", L"");
    }
    ~UserProxySettings()
    {
        if (m_read == ERROR_SUCCESS)
            ::RegSetKeyValueW(HKEY_CURRENT_USER, kKey, kValue, REG_BINARY, m_saved.data(),
                              DWORD(m_saved.size()));
        else if (m_read == ERROR_FILE_NOT_FOUND)
            ::RegDeleteKeyValueW(HKEY_CURRENT_USER, kKey, kValue);
    }
    // 0x46, a counter, flags (1 direct, 2 proxy, 4 script), then each text as a length and ANSI bytes.
    static void Set(const std::wstring& proxy, const std::wstring& bypass, const std::wstring& script)
    {
        std::string value;
        const auto add = [&](size_t number) { value.append(reinterpret_cast<const char*>(&number), 4); };
        add(0x46), add(0), add(1 | (proxy.empty() ? 0 : 2) | (script.empty() ? 0 : 4));
        for (const std::wstring* text : {&proxy, &bypass, &script})
            add(text->size()), value.append(text->begin(), text->end());
        ::RegSetKeyValueW(HKEY_CURRENT_USER, kKey, kValue, REG_BINARY, value.data(), DWORD(value.size()));
    }

private:
    static constexpr const wchar_t* kKey =
        L"Software\\Microsoft\\Windows\\CurrentVersion\\Internet Settings\\Connections";
    static constexpr const wchar_t* kValue = L"DefaultConnectionSettings";
    std::string m_saved;
    LONG m_read;
};

} // namespace KelvraHttpTest
