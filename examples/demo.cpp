// Fetches a URL with CWinHttpClient, tracing into c:\keltrace\demo.log: a progress bar while the
// body arrives, then what the response said, and the body saved to a file.
//     kelvra_demo URL [FILE]     (FILE: where the body goes, kelvra_demo_body.bin by default)
#include <Kelvra.h>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <string>

namespace
{

// Called for every piece of the body; the bar is drawn again only when its percentage changes.
bool DrawProgress(double percent)
{
    static int drawn = -1;
    const int whole = static_cast<int>(std::min(percent, 100.0));
    if (whole != drawn)
    {
        drawn = whole;
        std::printf("\r  [%-50s] %3d%%", std::string(static_cast<size_t>(whole / 2), '#').c_str(), whole);
        std::fflush(stdout);
    }
    return true;
}

// The first lines of text, each cut to its first 100 characters.
void PrintFirstLines(const std::wstring& text, int lines)
{
    for (size_t start = 0; lines-- > 0 && start < text.size();)
    {
        const size_t end = std::min(text.find(L'\n', start), text.size());
        const std::wstring line = text.substr(start, std::min<size_t>(end - start, 100));
        std::printf("    %ls\n", line.substr(0, line.find(L'\r')).c_str());
        start = end + 1;
    }
}

} // namespace

int main(int argc, char** argv)
{
    if (argc < 2)
    {
        std::printf("usage: kelvra_demo URL [FILE]\n");
        return 2;
    }
    const std::wstring url(argv[1], argv[1] + std::strlen(argv[1]));
    const std::wstring file =
        argc > 2 ? std::wstring(argv[2], argv[2] + std::strlen(argv[2])) : L"kelvra_demo_body.bin";

    // Tracing needs the marker directory; Debug::start then opens c:\keltrace\demo.log.
    std::error_code ignored;
    std::filesystem::create_directory(L"c:\\keltrace", ignored);
    try
    {
        Debug::start(L"demo", false, false);
    }
    catch (const std::exception& e)
    {
        std::printf("no trace: %s\n", e.what());
    }

    bool sent;
    std::printf("GET %s\n", argv[1]);
    {
        CWinHttpClient client(url, &DrawProgress);
        sent = client.SendHttpRequest(L"GET", false);
        std::printf("\n");
        if (!sent)
            std::printf("request failed, error %u\n", client.GetLastError());
        else
        {
            std::printf("status          : %ls\n", client.GetResponseStatusCode().c_str());
            std::printf("charset         : %ls\n", client.GetResponseCharset().c_str());
            std::printf("content length  : %u announced, %u received\n", client.GetRawResponseContentLength(),
                        client.GetRawResponseReceivedContentLength());
            std::printf("cookies         : %ls\n", client.GetResponseCookies().c_str());
            std::printf("response headers:\n");
            PrintFirstLines(client.GetResponseHeader(), 30);
            std::printf("first lines of the body:\n");
            PrintFirstLines(client.GetResponseContent(), 8);
            if (client.SaveResponseToFile(file))
                std::printf("body saved to   : %ls\n", file.c_str());
            else
                std::printf("body not saved (empty, or %ls cannot be written)\n", file.c_str());
        }
    }
    std::printf("trace log       : c:\\keltrace\\demo.log\n");
    Debug::stop();
    return sent ? 0 : 1;
}
