// Downloads of 256 MiB from a local server, once with a Content-Length and once chunked:
// CWinHttpClient against the loop a careful caller writes with WinHTTP itself (one read loop into
// a buffer allocated for the whole body, then one MultiByteToWideChar of it), taking turns. The
// server runs on a thread of this program.
// Winsock first: <windows.h>, which the others include, would bring in the older Winsock.
#include <winsock2.h>

#include <Kelvra.h>

#include "BenchSupport.h"

#include <windows.h>
#include <psapi.h>
#include <winhttp.h>

#include <atomic>
#include <cstdio>
#include <memory>
#include <string>
#include <thread>

namespace
{

const size_t kBodySize = 256u << 20;
const int kRounds = 5;

// Answers every connection with kBodySize bytes of printable text, "/chunked" in chunks of 64 KiB,
// anything else with a Content-Length, then closes it.
class LocalServer
{
public:
    LocalServer()
    {
        WSADATA data;
        ::WSAStartup(MAKEWORD(2, 2), &data);
        m_listener = ::socket(AF_INET, SOCK_STREAM, IPPROTO_TCP);
        sockaddr_in address{};
        address.sin_family = AF_INET;
        address.sin_addr.s_addr = ::htonl(INADDR_LOOPBACK);
        int length = sizeof(address);
        ::bind(m_listener, reinterpret_cast<sockaddr*>(&address), length);
        ::listen(m_listener, 4);
        ::getsockname(m_listener, reinterpret_cast<sockaddr*>(&address), &length);
        m_port = ::ntohs(address.sin_port);
        for (size_t i = 0; i < sizeof(m_block); ++i)
            m_block[i] = static_cast<char>(33 + i * 7919 % 94);
        m_thread = std::thread([this] { Serve(); });
    }
    ~LocalServer()
    {
        ::closesocket(m_listener);
        m_thread.join();
        ::WSACleanup();
    }
    unsigned short Port() const { return m_port; }

private:
    void Serve()
    {
        for (SOCKET client; (client = ::accept(m_listener, nullptr, nullptr)) != INVALID_SOCKET;
             ::closesocket(client))
        {
            std::string request;
            char buffer[4096];
            for (int got; request.find("\r\n\r\n") == std::string::npos &&
                          (got = ::recv(client, buffer, sizeof(buffer), 0)) > 0;)
                request.append(buffer, static_cast<size_t>(got));
            const bool chunked = request.rfind("GET /chunked ", 0) == 0;
            std::string head = "HTTP/1.1 200 OK\r\nConnection: close\r\n";
            head += chunked ? "Transfer-Encoding: chunked\r\n\r\n"
                            : "Content-Length: " + std::to_string(kBodySize) + "\r\n\r\n";
            bool sent = Send(client, head.data(), head.size());
            for (size_t at = 0; sent && at < kBodySize; at += sizeof(m_block))
                sent = (!chunked || Send(client, "10000\r\n", 7)) && Send(client, m_block, sizeof(m_block)) &&
                       (!chunked || Send(client, "\r\n", 2));
            if (sent && chunked)
                Send(client, "0\r\n\r\n", 5);
        }
    }
    static bool Send(SOCKET client, const char* data, size_t size)
    {
        for (int sent; size > 0; data += sent, size -= static_cast<size_t>(sent))
            if ((sent = ::send(client, data, static_cast<int>(size), 0)) <= 0)
                return false;
        return true;
    }

    SOCKET m_listener;
    unsigned short m_port;
    char m_block[65536];
    std::thread m_thread;
};

bool ClientDownload(const std::wstring& url)
{
    CWinHttpClient client(url);
    return client.SendHttpRequest(L"GET", false) && client.GetRawResponseReceivedContentLength() == kBodySize;
}

// What a careful caller writes: the whole body read into one buffer, then converted in one call.
bool ReferenceDownload(unsigned short port, const wchar_t* path)
{
    const auto close = [](HINTERNET handle) { ::WinHttpCloseHandle(handle); };
    std::unique_ptr<void, decltype(close)> session(::WinHttpOpen(L"reference", WINHTTP_ACCESS_TYPE_NO_PROXY,
                                                                 WINHTTP_NO_PROXY_NAME,
                                                                 WINHTTP_NO_PROXY_BYPASS, 0),
                                                   close);
    std::unique_ptr<void, decltype(close)> connection(::WinHttpConnect(session.get(), L"127.0.0.1", port, 0),
                                                      close);
    std::unique_ptr<void, decltype(close)> request(::WinHttpOpenRequest(connection.get(), L"GET", path,
                                                                        nullptr, WINHTTP_NO_REFERER,
                                                                        WINHTTP_DEFAULT_ACCEPT_TYPES, 0),
                                                   close);
    if (!::WinHttpSendRequest(request.get(), WINHTTP_NO_ADDITIONAL_HEADERS, 0, WINHTTP_NO_REQUEST_DATA, 0, 0,
                              0) ||
        !::WinHttpReceiveResponse(request.get(), nullptr))
        return false;
    std::unique_ptr<char[]> bytes(new char[kBodySize + 1]);
    size_t received = 0;
    for (DWORD available = 0, read = 0;
         ::WinHttpQueryDataAvailable(request.get(), &available) && available > 0 &&
         received + available <= kBodySize &&
         ::WinHttpReadData(request.get(), bytes.get() + received, available, &read);)
        received += read;
    bytes[received] = 0;
    std::unique_ptr<wchar_t[]> text(new wchar_t[received + 1]);
    const int count =
        ::MultiByteToWideChar(CP_ACP, MB_PRECOMPOSED, bytes.get(), static_cast<int>(received + 1), text.get(),
                              static_cast<int>(received + 1));
    return received == kBodySize && count == static_cast<int>(received + 1);
}

size_t PrivateBytes()
{
    PROCESS_MEMORY_COUNTERS_EX counters{};
    ::K32GetProcessMemoryInfo(::GetCurrentProcess(), reinterpret_cast<PROCESS_MEMORY_COUNTERS*>(&counters),
                              sizeof(counters));
    return counters.PagefileUsage;
}

// The most private memory the process held while work ran, beyond what it held before.
template <typename Work> size_t PeakPrivateBytesOf(Work&& work)
{
    const size_t before = PrivateBytes();
    std::atomic<bool> done{false};
    size_t peak = before;
    std::thread sampler(
        [&]
        {
            while (!done)
            {
                peak = std::max(peak, PrivateBytes());
                ::Sleep(1);
            }
        });
    work();
    peak = std::max(peak, PrivateBytes());
    done = true;
    sampler.join();
    return peak - before;
}

} // namespace

int main()
{
    LocalServer server;
    const std::wstring base = L"http://127.0.0.1:" + std::to_wstring(server.Port());
    std::printf("http: %u MiB from a server on this program's thread, best of %d rounds taking turns\n",
                static_cast<unsigned>(kBodySize >> 20), kRounds);

    // What a dropped trace line costs (no log session is open here), in a loop; in the client a
    // line waits behind WinHTTP's own calls to the wineserver, so it costs more there.
    const int lines = 20000;
    const auto dropLines = []
    {
        for (int i = 0; i < lines; ++i)
            KELVRA_TRC(L"Getting the amount of data, in bytes, available to be read");
    };
    const double lineSeconds = KelvraBench::BestSeconds(3, dropLines) / lines;
    // Four lines a read of at most 8 KiB (Wine's piece), about thirty more a request.
    const double traceSeconds = lineSeconds * (4.0 * (kBodySize / 8192 + 1) + 30);
    std::printf("  a dropped trace line costs %.3f us: at least %.2f s of each client download\n",
                lineSeconds * 1e6, traceSeconds);

    bool met = true;
    for (const wchar_t* path : {L"/length", L"/chunked"})
    {
        const bool chunked = path[1] == L'c';
        bool ok = true;
        const double peak =
            static_cast<double>(PeakPrivateBytesOf([&] { ok = ClientDownload(base + path); }));
        const std::array<double, 2> best = KelvraBench::BestSecondsInTurn(
            kRounds, [&] { ok = ClientDownload(base + path) && ok; },
            [&] { ok = ReferenceDownload(server.Port(), path) && ok; });
        if (!ok)
        {
            std::printf("  %ls: a download failed\n", path);
            return 1;
        }
        std::printf("  %-44s %8.1f MB/s\n", chunked ? "client, chunked" : "client, with Content-Length",
                    KelvraBench::MegabytesPerSecond(kBodySize, best[0]));
        std::printf("  %-44s %8.1f MB/s\n", "reference", KelvraBench::MegabytesPerSecond(kBodySize, best[1]));
        met &= KelvraBench::ReportTarget("throughput, client / reference", best[1] / best[0], ">=", 0.9);
        std::printf("  %-44s %8.2f   (at least)\n", "throughput, the trace's share set aside",
                    best[1] / std::max(best[0] - traceSeconds, 1e-9));
        met &= KelvraBench::ReportTarget("peak private bytes / body", peak / kBodySize,
                                         "<=", chunked ? 4.5 : 3.5);
    }
    return met ? 0 : 1;
}
