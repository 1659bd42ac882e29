// The response stage of SendHttpRequest: header block and the fields taken from it, status code,
// body, and the body decoded to wide text.
#include "KelvraHttp.h"

#include "KelvraTrace.h"

#include "http/BodyBuffer.h"
#include "http/HeaderPatterns.h"
#include "http/ResponseText.h"
#include "http/WinHttpException.h"
#include "http/WinHttpPlatform.h"
#include "http/pattern/PatternExtraction.h"

#include <algorithm>
#include <climits>
#include <cwchar>
#include <new>
#include <vector>

using KelvraHttp::Platform;

namespace
{

const std::uint64_t kNoLength = UINT64_MAX;

// The size in bytes a header query at level needs, or false when the platform has none to give.
bool QueryHeaderSize(HINTERNET request, DWORD level, DWORD& size)
{
    size = 0;
    return !Platform().QueryHeaders(request, level, WINHTTP_HEADER_NAME_BY_INDEX, WINHTTP_NO_OUTPUT_BUFFER,
                                    &size, WINHTTP_NO_HEADER_INDEX) &&
           Platform().GetLastError() == ERROR_INSUFFICIENT_BUFFER;
}

// Replaces text by the answer of a header query of size bytes; false, text unchanged, when the
// query fails. The answer ends at its terminator or at the length reported, whichever comes
// first, and is never read beyond the bytes the platform was given.
bool QueryHeaderText(HINTERNET request, DWORD level, DWORD size, std::wstring& text)
{
    std::wstring answer(size / sizeof(wchar_t) + 1, L'\0');
    DWORD length = size;
    if (!Platform().QueryHeaders(request, level, WINHTTP_HEADER_NAME_BY_INDEX, &answer[0], &length,
                                 WINHTTP_NO_HEADER_INDEX))
        return false;
    answer.resize(std::min<size_t>(std::wcslen(answer.c_str()), std::min(length, size) / sizeof(wchar_t)));
    text.swap(answer);
    return true;
}

// The values of one of the client's patterns in a header block. These patterns compile, so over
// a block that is not empty a false from ExtractPatternGroups means that memory ran out: the
// request then fails rather than go on without the field.
std::vector<std::wstring> HeaderValues(const wchar_t* pattern, const std::wstring& header)
{
    std::vector<std::wstring> values;
    if (!ExtractPatternGroups(pattern, header, values) && !header.empty())
        throw std::bad_alloc();
    return values;
}

// A Content-Length value; one beyond 32 bits counts as the largest.
std::uint32_t DecimalLength(const std::wstring& digits)
{
    std::uint64_t value = 0;
    for (const wchar_t digit : digits)
    {
        value = value * 10 + static_cast<std::uint64_t>(digit - L'0');
        if (value > UINT32_MAX)
            return UINT32_MAX;
    }
    return static_cast<std::uint32_t>(value);
}

// How much of the body's block to commit for needed bytes: half as much again as is committed, so
// that commits stay few, but no more than an announced length (and its zero byte) that the body
// has not passed.
std::uint64_t CommitTarget(std::uint64_t committed, std::uint64_t needed, std::uint64_t announced)
{
    const std::uint64_t target = std::max(needed, committed + committed / 2);
    return announced != kNoLength && announced + 1 >= needed ? std::min(target, announced + 1) : target;
}

} // namespace

void CWinHttpClient::ReadResponse(void* connection, void* request)
{
    const std::uint64_t announced = ReadHeaderBlock(request);
    ReadStatusCode(request);
    ReadBody(connection, request, announced);
    DecodeBody();
}

std::uint64_t CWinHttpClient::ReadHeaderBlock(void* request)
{
    KELVRA_TRC(L"Retrieving response header information size");
    DWORD size;
    if (!QueryHeaderSize(request, WINHTTP_QUERY_RAW_HEADERS_CRLF, size))
        return kNoLength;
    KELVRA_TRC(L"Response header information size [%d]", size);
    KELVRA_TRC(L"Retrieving response header information");
    if (!QueryHeaderText(request, WINHTTP_QUERY_RAW_HEADERS_CRLF, size, responseHeader))
        return kNoLength;

    using namespace KelvraHeaderPatterns;
    if (!forceCharset)
    {
        const std::vector<std::wstring> charsets = HeaderValues(kCharset, responseHeader);
        if (!charsets.empty())
            responseCharset = charsets[0];
    }
    std::uint64_t announced = kNoLength;
    const std::vector<std::wstring> lengths = HeaderValues(kContentLength, responseHeader);
    if (!lengths.empty())
    {
        rawResponseContentLength = DecimalLength(lengths[0]);
        announced = rawResponseContentLength;
    }
    const std::vector<std::wstring> locations = HeaderValues(kLocationValue, responseHeader);
    if (!locations.empty())
        responseLocation = locations[0];
    const std::vector<std::wstring> cookies = HeaderValues(kCookies, responseHeader);
    if (!cookies.empty())
        KelvraHttp::AppendCookies(responseCookies, cookies);
    return announced;
}

void CWinHttpClient::ReadStatusCode(void* request)
{
    KELVRA_TRC(L"Retrieving response status header size");
    DWORD size;
    if (!QueryHeaderSize(request, WINHTTP_QUERY_STATUS_CODE, size))
        return;
    KELVRA_TRC(L"Response status header size [%d]", size);
    QueryHeaderText(request, WINHTTP_QUERY_STATUS_CODE, size, responseStatusCode);
}

void CWinHttpClient::ReadBody(void* connection, void* request, std::uint64_t announcedLength)
{
    // The received count describes the block however reading ends: a request that fails while
    // reading leaves the bytes read so far and their count, never a count left from a longer body.
    KelvraHttp::ReleaseBody(rawResponseContent);
    std::uint64_t committed;
    rawResponseContent = KelvraHttp::ReserveBody(committed);
    rawResponseReceivedContentLength = 0;
    std::uint32_t received = 0;
    DWORD available;
    do
    {
        KELVRA_TRC(L"Getting the amount of data, in bytes, available to be read");
        if (!Platform().QueryDataAvailable(request, &available))
        {
            const DWORD error = Platform().GetLastError();
            KELVRA_ERR(L"Failed to get the amount of data, in bytes, available to be read");
            rawResponseReceivedContentLength = received;
            throw WinHttpException{error, connection, request, nullptr};
        }
        KELVRA_TRC(L"[%d] amount of data available to be read", available);
        SetProgress(received);

        // Read straight into the body, with room for the zero byte that always follows it.
        const std::uint64_t needed = std::uint64_t{received} + available + 1;
        if (needed > committed && (rawResponseContent == nullptr ||
                                   !KelvraHttp::CommitBody(rawResponseContent, committed,
                                                           CommitTarget(committed, needed, announcedLength))))
        {
            KELVRA_ERR(L"Response body does not fit in memory [%d]", received);
            rawResponseReceivedContentLength = received;
            throw WinHttpException{ERROR_NOT_ENOUGH_MEMORY, connection, request, nullptr};
        }
        KELVRA_TRC(L"Read the data");
        DWORD read = 0;
        if (Platform().ReadData(request, rawResponseContent + received, available, &read))
        {
            KELVRA_TRC(L"[%d] amount of data was read", read);
            received += std::min(read, available);
        }
        rawResponseContent[received] = 0;
    } while (available != 0);
    KELVRA_TRC(L"Finished reading response available data");
    SetProgress(received);
    rawResponseReceivedContentLength = received;
}

void CWinHttpClient::DecodeBody()
{
    const std::uint32_t received = rawResponseReceivedContentLength;
    // The conversion counts in int.
    if (received >= INT_MAX)
        return;
    const int byteCount = static_cast<int>(received) + 1;
    const char* bytes = reinterpret_cast<const char*>(rawResponseContent);
    // No byte of UTF-8 or of an ANSI code page makes more than one UTF-16 unit, so one unit per
    // byte (the zero byte after the body included) holds the text: one pass, no sizing pass.
    std::wstring text(static_cast<size_t>(byteCount), L'\0');
    const bool utf8 = _wcsnicmp(responseCharset.c_str(), L"utf-8", 5) == 0;
    int count = Platform().MultiByteToWideChar(utf8 ? CP_UTF8 : CP_ACP, utf8 ? 0 : MB_PRECOMPOSED, bytes,
                                               byteCount, &text[0], byteCount);
    if (count < 1 && utf8)
        count = Platform().MultiByteToWideChar(CP_ACP, MB_PRECOMPOSED, bytes, byteCount, &text[0], byteCount);
    if (count < 1)
        return;
    text.resize(std::wcslen(text.c_str()));
    responseContent.swap(text);
}
