// The HTTP client's five header patterns through ExtractPatternGroups, against std::wregex (icase,
// the same extraction) in the same run: a realistic 8 KiB header block, a 1 MiB block with 20,000
// Set-Cookie lines, and a 64 KiB block of near misses against a normal 64 KiB block.
#include "http/HeaderPatterns.h"
#include "http/pattern/PatternExtraction.h"

#include "BenchSupport.h"

#include <cstdio>
#include <regex>
#include <string>
#include <unordered_set>
#include <vector>

using namespace KelvraBench;

namespace
{

using Entries = std::vector<std::wstring>;

const wchar_t* const kPatterns[] = {
    KelvraHeaderPatterns::kCharset,  KelvraHeaderPatterns::kContentLength,
    KelvraHeaderPatterns::kLocation, KelvraHeaderPatterns::kLocationValue,
    KelvraHeaderPatterns::kCookies,
};

// The same five in ECMAScript syntax. "." of our matcher also takes CR and LF, "\n" is a line end.
const wchar_t* const kStandardPatterns[] = {
    L"charset=([A-Za-z0-9\\-_]+)",
    L"Content-Length: ([0-9]+)",
    L"Location: ([0-9]+)",
    L"(?:\\r|\\r?\\n)Location:[ \\t]*([\\s\\S]+?)(?:\\r|\\r?\\n)",
    L"Set-Cookie:[ \\t]*([\\s\\S]+?)(?:\\r|\\r?\\n)",
};

// A response as a busy web application sends it: 8 KiB, two dozen cookies, long policies.
std::wstring RealisticBlock()
{
    std::wstring block = L"HTTP/1.1 302 Found\r\n"
                         L"Date: Sun, 06 Dec 2026 07:04:43 GMT\r\n"
                         L"Content-Type: text/html; charset=UTF-8\r\n"
                         L"Content-Length: 48213\r\n"
                         L"Connection: keep-alive\r\n"
                         L"Server: nginx/1.24.0\r\n"
                         L"Location: https://www.example.com/account/overview?session=renewed&lang=en-US\r\n"
                         L"Cache-Control: private, no-cache, no-store, must-revalidate, max-age=0\r\n"
                         L"Pragma: no-cache\r\n"
                         L"Expires: Thu, 01 Jan 1970 00:00:00 GMT\r\n"
                         L"Vary: Accept-Encoding, Cookie, Authorization\r\n"
                         L"ETag: W/\"5e15153d-4a3b9c1f7e2d\"\r\n"
                         L"Strict-Transport-Security: max-age=63072000; includeSubDomains; preload\r\n"
                         L"X-Content-Type-Options: nosniff\r\n"
                         L"X-Frame-Options: SAMEORIGIN\r\n"
                         L"Referrer-Policy: strict-origin-when-cross-origin\r\n"
                         L"Permissions-Policy: geolocation=(), microphone=(), camera=(), payment=()\r\n";
    for (int i = 0; block.size() < 3500; ++i)
    {
        block += L"Content-Security-Policy-Report-Only: default-src 'self'; script-src 'self' 'nonce-r4nd0m" +
                 std::to_wstring(i) +
                 L"' https://cdn.example.com; style-src 'self' 'unsafe-inline'; img-src * data:; "
                 L"connect-src 'self' https://api.example.com wss://push.example.com\r\n";
    }
    const wchar_t* const cookieNames[] = {L"sessionid", L"csrftoken", L"_ga",     L"_gid",
                                          L"lang",      L"theme",     L"consent", L"ab_test",
                                          L"tracking",  L"cart",      L"region",  L"tz"};
    for (int i = 0; block.size() < 8192 - 200; ++i)
    {
        block += L"Set-Cookie: " + std::wstring(cookieNames[i % 12]) + std::to_wstring(i) +
                 L"=a3f9c2e1b7d4058e6f1a2b3c4d5e6f70" + std::to_wstring(i * 7919) +
                 L"; Domain=.example.com; Path=/; Expires=Mon, 06 Dec 2027 07:04:43 GMT; Secure; HttpOnly; "
                 L"SameSite=Lax\r\n";
    }
    block += L"X-Request-Id: 7f3c2a9e-51b4-4d6a-9e0f-3b8c1d2e4f5a\r\nX-Padding: ";
    block.resize(8192 - 4, L'x');
    return block + L"\r\n\r\n";
}

// 20,000 distinct Set-Cookie lines of 52 characters: a hostile 1 MiB.
std::wstring CookieFlood()
{
    std::wstring block =
        L"HTTP/1.1 200 OK\r\nContent-Type: text/html; charset=utf-8\r\nContent-Length: 0\r\n";
    for (int i = 0; i < 20000; ++i)
    {
        wchar_t line[64];
        std::swprintf(line, 64, L"Set-Cookie: c%05d=%015d; Path=/; Secure\r\n", i, i * 104729);
        block += line;
    }
    block += L"X-Padding: ";
    block.resize(1024 * 1024 - 4, L'x');
    return block + L"\r\n\r\n";
}

std::wstring NormalBlock(size_t size)
{
    const std::wstring realistic = RealisticBlock();
    std::wstring block;
    while (block.size() < size)
        block += realistic;
    block.resize(size);
    return block;
}

// Near misses for every pattern, then one long line after "Set-Cookie:" that never ends.
std::wstring AdversarialBlock(size_t size)
{
    std::wstring block = L"HTTP/1.1 200 OK\r\n";
    for (int i = 0; block.size() < 4 * 1024; ++i)
    {
        block += L"Set-Cookie c" + std::to_wstring(i) + L"=1\r\n";
        block += L"Content-Type: text/html; charset utf-8; charset:latin1\r\n";
        block += L"Content-Length:" + std::wstring(40, L'7') + L"\r\n";
        block += L"Location:/redirect/" + std::to_wstring(i) + L"\r\n";
    }
    block += L"Set-Cookie:";
    block.resize(size, L'v');
    return block;
}

bool Extract(const std::wstring& block, std::vector<Entries>& results)
{
    results.assign(5, Entries());
    bool ok = true;
    for (size_t i = 0; i < 5; ++i)
        ok = ExtractPatternGroups(kPatterns[i], block, results[i]) && ok;
    return ok;
}

std::wstring Lowered(std::wstring text)
{
    for (wchar_t& c : text)
    {
        if (c >= L'A' && c <= L'Z')
            c = static_cast<wchar_t>(c - L'A' + L'a');
    }
    return text;
}

// Every match's group 1, each once ignoring case, as ExtractPatternGroups collects group 0.
void ExtractStandard(const std::vector<std::wregex>& patterns, const std::wstring& block,
                     std::vector<Entries>& results)
{
    results.assign(patterns.size(), Entries());
    for (size_t i = 0; i < patterns.size(); ++i)
    {
        std::unordered_set<std::wstring> seen;
        for (std::wsregex_iterator match(block.begin(), block.end(), patterns[i]), end; match != end; ++match)
        {
            const std::wstring value = (*match)[1].str();
            if (seen.insert(Lowered(value)).second)
                results[i].push_back(value);
        }
    }
}

struct Figures
{
    double seconds;
    double megabytesPerSecond;
};

Figures Measure(const std::wstring& block, int runs, std::vector<Entries>& results)
{
    const double seconds = BestSeconds(runs, [&] { Extract(block, results); });
    return Figures{seconds, MegabytesPerSecond(static_cast<double>(block.size()), seconds)};
}

Figures MeasureStandard(const std::vector<std::wregex>& patterns, const std::wstring& block, int runs,
                        std::vector<Entries>& results)
{
    const double seconds = BestSeconds(runs, [&] { ExtractStandard(patterns, block, results); });
    return Figures{seconds, MegabytesPerSecond(static_cast<double>(block.size()), seconds)};
}

} // namespace

int main()
{
    std::vector<std::wregex> standard;
    for (const wchar_t* pattern : kStandardPatterns)
        standard.emplace_back(pattern, std::regex_constants::ECMAScript | std::regex_constants::icase);

    const std::wstring realistic = RealisticBlock();
    const std::wstring flood = CookieFlood();
    const std::wstring normal = NormalBlock(64 * 1024);
    const std::wstring adversarial = AdversarialBlock(64 * 1024);

    std::vector<Entries> ours, theirs, scratch;
    const Figures realisticOurs = Measure(realistic, 200, ours);
    const Figures realisticTheirs = MeasureStandard(standard, realistic, 20, theirs);
    const bool realisticSame = ours == theirs;
    const Figures floodOurs = Measure(flood, 5, ours);
    const size_t floodCookies = ours[4].size();
    const Figures floodTheirs = MeasureStandard(standard, flood, 2, theirs);
    const bool floodSame = ours == theirs;
    const Figures normalOurs = Measure(normal, 20, scratch);
    const Figures adversarialOurs = Measure(adversarial, 20, scratch);
    const bool adversarialEmpty =
        scratch[0].empty() && scratch[1].empty() && scratch[2].empty() && scratch[4].empty();

    std::printf(
        "Header field extraction, the five header patterns per block (MB/s of header text, one byte a "
        "character; best of several runs)\n");
    std::printf("  %-40s %10s %12s %12s\n", "block", "size", "Kelvra", "std::wregex");
    std::printf("  %-40s %9.0fK %12.1f %12.2f\n", "realistic response", realistic.size() / 1024.0,
                realisticOurs.megabytesPerSecond, realisticTheirs.megabytesPerSecond);
    std::printf("  %-40s %9.0fK %12.1f %12.2f\n", "20,000 Set-Cookie lines", flood.size() / 1024.0,
                floodOurs.megabytesPerSecond, floodTheirs.megabytesPerSecond);
    std::printf("  %-40s %9.0fK %12.1f %12s\n", "normal (realistic blocks repeated)", normal.size() / 1024.0,
                normalOurs.megabytesPerSecond, "-");
    std::printf("  %-40s %9.0fK %12.1f %12s\n", "near misses, 60 KiB unended cookie line",
                adversarial.size() / 1024.0, adversarialOurs.megabytesPerSecond, "-");
    std::printf("Ratios\n");
    bool met = true;
    const double realisticPerByte = realisticOurs.seconds / static_cast<double>(realistic.size());
    const double floodPerByte = floodOurs.seconds / static_cast<double>(flood.size());
    met &= ReportTarget("time per byte, 1 MiB / 8 KiB block", floodPerByte / realisticPerByte, "<=", 2);
    met &= ReportTarget("time, near misses / normal 64 KiB block",
                        adversarialOurs.seconds / normalOurs.seconds, "<=", 10);
    met &= ReportTarget("throughput / std::wregex, 8 KiB block",
                        realisticOurs.megabytesPerSecond / realisticTheirs.megabytesPerSecond, ">=", 3);
    met &= ReportTarget("throughput / std::wregex, 1 MiB block",
                        floodOurs.megabytesPerSecond / floodTheirs.megabytesPerSecond, ">=", 3);
    std::printf("Results: same entries as std::wregex: %s (8 KiB), %s (1 MiB, %zu cookies); near misses give "
                "nothing: %s\n",
                realisticSame ? "yes" : "NO", floodSame ? "yes" : "NO", floodCookies,
                adversarialEmpty ? "yes" : "NO");
    return met && realisticSame && floodSame && adversarialEmpty && floodCookies == 20000 ? 0 : 1;
}
