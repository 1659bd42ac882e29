#!/usr/bin/env python3
"""Plants realistic faults in the library one at a time and reports which the test suite catches.

Each fault replaces one exact piece of text in one source file (the text must occur exactly once,
else the fault is stale). For each selected fault the tool applies it to the working tree, builds
with the preset, runs the tests and records:

  caught        the build succeeded and some test failed
  MISSED        the build succeeded and every test passed
  build-broken  the mutation does not compile: a useless fault, fix the list
  stale         the text to find is missing or not unique: fix the list

The file is always restored (also on Ctrl-C or an error) and checked with `git diff --quiet`.

  tools/plant-faults.py                     every fault, whole suite (ctest --preset mingw)
  tools/plant-faults.py --fast              only the test programs each fault's subsystem affects
  tools/plant-faults.py --only id,id        these faults
  tools/plant-faults.py --subsystem trace   the faults of one subsystem
  tools/plant-faults.py --list | --check    print the list | only look for stale faults

Exit status: 0 when every selected fault is caught, 1 when any is missed, stale or build-broken,
2 on bad arguments or an unclean tree, 3 when the suite fails before any fault is planted.
"""

import argparse
import collections
import os
import re
import signal
import subprocess
import sys
import time

ROOT = os.path.dirname(os.path.dirname(os.path.abspath(__file__)))
BUILD_DIR = os.path.join(ROOT, "build", "mingw")
LOG_DIR = os.path.join(BUILD_DIR, "plant-faults")

# The ctest tests that exercise each subsystem, for --fast. ctest adds the fixtures they need
# (the warm wineserver, the HTTP servers) by itself.
SUBSYSTEM_TESTS = {
    "strings": ["text", "trace"],
    "base64": ["text"],
    "timestamps": ["text", "trace"],
    "bytes": ["text"],
    "trace": ["trace", "http"],
    "pattern": ["http"],
    "headers": ["http"],
    "http": ["http"],
    "proxy": ["http"],
    "threading": ["threading"],
    "ini": ["config"],
    "eventlog": ["eventlog", "eventlog.entries"],
    "handles": ["text", "trace", "config", "eventlog", "threading", "http"],
}

Fault = collections.namedtuple("Fault", "id subsystem what file find replace")

FAULTS = [
    # Strings
    Fault("strings.padd-one-short", "strings", "Padd inserts one zero too few",
          "src/text/Strings.cpp",
          "text.insert(0, static_cast<size_t>(width) - text.size(), L'0');",
          "text.insert(0, static_cast<size_t>(width) - text.size() - 1, L'0');"),
    Fault("strings.format-buffer-off-by-one", "strings",
          "Format hands the bounded formatter no room for the terminator",
          "src/text/Strings.cpp",
          "Formatter<Char>::Print(&out[0], out.size() + 1, format, pass);",
          "Formatter<Char>::Print(&out[0], out.size(), format, pass);"),
    Fault("strings.hextoint-no-f", "strings", "HexToInt's lower-case digit range stops before 'f'",
          "src/text/Strings.cpp",
          "if (c >= L'a' && c <= L'f')",
          "if (c >= L'a' && c < L'f')"),
    Fault("strings.split-trailing-empty", "strings", "Split adds an empty token after a final delimiter",
          "src/text/Strings.cpp",
          "if (start < text.size())\n        tokens.emplace_back(text, start, std::string::npos);",
          "if (start <= text.size())\n        tokens.emplace_back(text, start, std::string::npos);"),
    Fault("strings.toint-base-zero", "strings", "ToInt reads in base 0 (leading 0 octal, 0x hex)",
          "src/text/Strings.cpp",
          "std::strtol(text.c_str(), nullptr, 10)",
          "std::strtol(text.c_str(), nullptr, 0)"),
    Fault("strings.widen-sign-extends", "strings", "ToString(narrow) sign-extends bytes from 0x80 up",
          "src/text/Strings.cpp",
          "result[i] = static_cast<wchar_t>(static_cast<unsigned char>(text[i]));",
          "result[i] = static_cast<wchar_t>(text[i]);"),
    Fault("strings.trimleft-blank-and-tab", "strings", "TrimLeft knows only blank and tab as white space",
          "src/text/Strings.cpp",
          "return c == L' ' || (c >= L'\\t' && c <= L'\\r');",
          "return c == L' ' || c == L'\\t';"),
    # Base64
    Fault("base64.groups-off-by-one", "base64", "ToBase64 sizes the output (count + 1) / 3 groups",
          "src/text/Base64.cpp",
          "const size_t groups = (static_cast<size_t>(count) + 2) / 3;",
          "const size_t groups = (static_cast<size_t>(count) + 1) / 3;"),
    Fault("base64.two-byte-tail-mask", "base64", "Third character of a two-byte tail masks 3 bits, not 4",
          "src/text/Base64.cpp",
          "kAlphabet[(b1 & 0x0F) << 2]",
          "kAlphabet[(b1 & 0x07) << 2]"),
    Fault("base64.decoder-stops-only-at-padding", "base64",
          "The decoder's tail stops only at '=', decoding foreign characters",
          "src/text/Base64.cpp",
          "while (in != end && k < 4 && kDecode[*in] != kNotBase64)",
          "while (in != end && k < 4 && *in != '=')"),
    Fault("base64.decoder-drops-one-byte-tail", "base64", "Two tail characters decode to nothing (k > 2)",
          "src/text/Base64.cpp",
          "if (k >= 2)",
          "if (k > 2)"),
    Fault("base64.pair-loop-second-group", "base64",
          "The encoder's two-group loop takes the second group 8 bits too far left",
          "src/text/Base64.cpp",
          "static_cast<std::uint32_t>(word >> 16) & 0xFFFFFF;",
          "static_cast<std::uint32_t>(word >> 8) & 0xFFFFFF;"),
    Fault("base64.decoder-fourth-place", "base64", "The decoder's group loop puts the fourth character third",
          "src/text/Base64.cpp",
          "kShifted.place[3][in[3]];",
          "kShifted.place[2][in[3]];"),
    # Time stamps
    Fault("timestamps.month-first", "timestamps", "Stamp starts with the month instead of the day",
          "src/text/TimeStamp.cpp",
          "stamp += Strings::Padd(time.wDay, 2);",
          "stamp += Strings::Padd(time.wMonth, 2);"),
    Fault("timestamps.hour-unpadded", "timestamps", "Hour written without its padding to two digits",
          "src/text/TimeStamp.cpp",
          "stamp += Strings::Padd(time.wHour, 2);",
          "stamp += Strings::ToString(time.wHour);"),
    Fault("timestamps.millis-padded", "timestamps", "Milliseconds padded to three digits",
          "src/text/TimeStamp.cpp",
          "stamp += Strings::ToString(time.wMilliseconds);",
          "stamp += Strings::Padd(time.wMilliseconds, 3);"),
    Fault("timestamps.now-local", "timestamps", "Now reads local time instead of universal time",
          "src/text/Time.cpp",
          "::GetSystemTime(&now);",
          "::GetLocalTime(&now);"),
    # Bytes
    Fault("bytes.copy-not-counted", "bytes", "Copy construction does not add an owner",
          "src/text/Bytes.cpp",
          "    HeaderOf(m_block)->owners.fetch_add(1, std::memory_order_relaxed);\n",
          ""),
    Fault("bytes.assign-releases-first", "bytes", "Assignment drops its block before sharing the source",
          "src/text/Bytes.cpp",
          "    HeaderOf(other.m_block)->owners.fetch_add(1, std::memory_order_relaxed);\n    release();\n",
          "    release();\n    HeaderOf(other.m_block)->owners.fetch_add(1, std::memory_order_relaxed);\n"),
    Fault("bytes.last-owner-test", "bytes", "The block is freed when the count reaches 0, never (leak)",
          "src/text/Bytes.cpp",
          "fetch_sub(1, std::memory_order_acq_rel) == 1",
          "fetch_sub(1, std::memory_order_acq_rel) == 0"),
    # Trace
    Fault("trace.level-rule-strict", "trace", "A line is written only when the level is below its threshold",
          "src/trace/Debug.cpp",
          "if (_lvl <= threshold && IsTracedUnderLock(moduleBase, caller))",
          "if (_lvl < threshold && IsTracedUnderLock(moduleBase, caller))"),
    Fault("trace.level-rule-before-lock", "trace", "The lock-free drop check drops lines at their own level",
          "src/trace/Debug.cpp",
          "return level > threshold ||",
          "return level >= threshold ||"),
    Fault("trace.filter-case-sensitive", "trace", "The module filter compares without lowering the name",
          "src/trace/TraceConfig.cpp",
          "    KelvraStrings::Strings::ToLower(name);\n    return std::find",
          "    return std::find"),
    Fault("trace.filter-empty-list-drops", "trace", "An empty module list drops every module",
          "src/trace/TraceConfig.cpp",
          "if (modules == nullptr || modules->empty())",
          "if (modules == nullptr)"),
    Fault("trace.config-no-wrn", "trace", "The configuration word \"wrn\" is not known",
          "src/trace/TraceConfig.cpp",
          "if (line == \"warn\" || line == \"wrn\" || line == \"warning\")",
          "if (line == \"warn\" || line == \"warning\")"),
    Fault("trace.config-last-level-wins", "trace", "The last level word wins instead of the highest",
          "src/trace/TraceConfig.cpp",
          "    else if (level > config.level)\n",
          "    else\n"),
    Fault("trace.banner-one-line-feed", "trace", "The session banner starts with one line feed, not two",
          "src/trace/Debug.cpp",
          "L\"\\n\\n*****     NEW LOG SESSION",
          "L\"\\n*****     NEW LOG SESSION"),
    Fault("trace.per-process-name-order", "trace", "Per-process file name puts the name before the pid",
          "src/trace/Debug.cpp",
          "L\"%s.%d.%s.log\", processName.c_str(), ::_getpid(), name.c_str()",
          "L\"%s.%s.%d.log\", processName.c_str(), name.c_str(), ::_getpid()"),
    Fault("trace.last-error-not-restored", "trace", "Emitting a line clears the last error instead of restoring it",
          "src/trace/Debug.cpp",
          "    ::SetLastError(lastError);\n",
          "    ::SetLastError(lastError & 0);\n"),
    Fault("trace.cache-ignores-names", "trace",
          "Dropped-line cache not invalidated when the list's names change in place",
          "src/trace/ModuleFilterCache.cpp",
          "m_level.load(std::memory_order_relaxed) == level &&\n        m_names == names)",
          "m_level.load(std::memory_order_relaxed) == level)"),
    Fault("trace.stop-keeps-list", "trace", "stop leaves the module list in place",
          "src/trace/Debug.cpp",
          "    delete _modules;\n    StoreRelease(_modules, static_cast<std::vector<std::wstring>*>(nullptr));\n",
          ""),
    Fault("trace.module-name-first-dot", "trace", "Module name cut at the first dot, not the last",
          "src/trace/TraceNames.cpp",
          "const size_t dot = name.rfind(L'.');",
          "const size_t dot = name.find(L'.');"),
    Fault("trace.truncating-session-shares", "trace", "A truncating session lets other writers in",
          "src/trace/Debug.cpp",
          "append ? _SH_DENYNO : _SH_DENYWR",
          "_SH_DENYNO"),
    # Pattern matcher
    Fault("pattern.equal-range-reversed", "pattern", "A range with equal ends ([a-a]) is refused as reversed",
          "src/http/pattern/RegexSyntax.cpp",
          "if (high < c)",
          "if (high <= c)"),
    Fault("pattern.dot-shortcut-ascii", "pattern", "The first-character shortcut takes '.' as ASCII only",
          "src/http/pattern/RegexProgram.cpp",
          "first.AddRange(1, 0xFFFF);",
          "first.AddRange(1, 0x7F);"),
    Fault("pattern.plus-as-star", "pattern", "x+ compiles as x* (the first copy of the atom dropped)",
          "src/http/pattern/RegexProgram.cpp",
          "    case Quantifier::Plus:\n        Emit(body);\n",
          "    case Quantifier::Plus:\n"),
    Fault("pattern.lazy-flag-lost", "pattern", "The lazy '?' is read but the loop stays greedy",
          "src/http/pattern/RegexSyntax.cpp",
          "repeat->lazy = lazy;",
          "repeat->lazy = false;"),
    Fault("pattern.class-high-exclusive", "pattern", "A class range excludes its high end",
          "src/http/pattern/RegexPattern.cpp",
          "code[bound].operand <= c && c <= code[bound + 1].operand",
          "code[bound].operand <= c && c < code[bound + 1].operand"),
    Fault("pattern.look-ahead-keeps-position", "pattern",
          "A failed look-ahead atom does not give back the characters it consumed",
          "src/http/pattern/RegexProgram.cpp",
          "        Add(OpCode::RestorePos, position);\n        Add(OpCode::RestoreDepth, depth);\n"
          "        const size_t jump = Add(OpCode::Jump);",
          "        Add(OpCode::RestoreDepth, depth);\n        const size_t jump = Add(OpCode::Jump);"),
    Fault("pattern.capture-restore-swapped", "pattern", "Backtracking out of a group swaps its start and end",
          "src/http/pattern/RegexPattern.cpp",
          "captures[operand].end = pop();\n            captures[operand].start = pop();",
          "captures[operand].start = pop();\n            captures[operand].end = pop();"),
    Fault("pattern.leading-char-when-anchored", "pattern",
          "The first-character shortcut also skips ahead in anchored patterns",
          "src/http/pattern/RegexProgram.cpp",
          "if (!tree.anchored && program.code[2].op == OpCode::Char)",
          "if (program.code[2].op == OpCode::Char)"),
    Fault("pattern.attempt-at-text-end", "pattern",
          "An attempt also starts at the end of a non-empty text (\"$\" matches \"ab\")",
          "src/http/pattern/RegexPattern.cpp",
          "if (next >= length)",
          "if (next > length)"),
    Fault("pattern.hex-abbreviation-to-e", "pattern", "The \\h abbreviation's class stops at 'e'",
          "src/http/pattern/RegexSyntax.cpp",
          "L\"h([0-9a-fA-F])\",",
          "L\"h([0-9a-eA-E])\","),
    Fault("pattern.stack-growth-failure-unreported", "pattern",
          "A backtracking stack that cannot grow ends the match as if nothing matched",
          "src/http/pattern/RegexPattern.cpp",
          "        m_stack.resize(wanted);\n    }\n    catch (const std::bad_alloc&)\n    {\n        m_outOfMemory = true;\n",
          "        m_stack.resize(wanted);\n    }\n    catch (const std::bad_alloc&)\n    {\n"),
    Fault("pattern.compile-out-of-memory-compiled", "pattern",
          "A compile that runs out of memory reports success with an empty program",
          "src/http/pattern/RegexPattern.cpp",
          "        m_lastError = KelvraRegex::kOutOfMemory;",
          "        m_lastError = KelvraRegex::kCompiled;"),
    # Header extraction
    Fault("headers.extraction-out-of-memory-ends-matches", "headers",
          "A match cut short by memory passes for the end of the matches",
          "src/http/pattern/PatternExtraction.cpp",
          "        if (context.OutOfMemory())\n            throw std::bad_alloc();\n",
          ""),
    Fault("headers.cookies-joined-without-blank", "headers", "Cookies of one response joined with \";\"",
          "src/http/ResponseText.cpp",
          "cookies += L\"; \";",
          "cookies += L\";\";"),
    Fault("headers.duplicates-case-sensitive", "headers",
          "Repeated entries compared in their own case, so case variants repeat",
          "src/http/pattern/PatternExtraction.cpp",
          "seen.emplace(lowered.Lowered() + offset, count).second",
          "seen.emplace(lowered.Original() + offset, count).second"),
    Fault("headers.trimchars-drops-last", "headers", "TrimChars drops the last kept character",
          "src/http/pattern/PatternExtraction.cpp",
          "return text.substr(first, last - first + 1);",
          "return text.substr(first, last - first);"),
    Fault("headers.location-anywhere", "headers", "Location pattern also matches inside Content-Location",
          "src/http/HeaderPatterns.h",
          "L\"\\\\nLocation:\\\\b*{.+?}\\\\n\"",
          "L\"Location:\\\\b*{.+?}\\\\n\""),
    Fault("headers.charset-without-dash", "headers", "Charset pattern's class has no '-' (utf-8 -> utf)",
          "src/http/HeaderPatterns.h",
          "L\"charset={[A-Za-z0-9\\\\-_]+}\"",
          "L\"charset={[A-Za-z0-9_]+}\""),
    # HTTP client
    Fault("http.four-tries", "http", "The send loop makes four tries instead of five",
          "src/http/RequestPipeline.cpp",
          "const int kMaxTries = 5;",
          "const int kMaxTries = 4;"),
    Fault("http.12032-retried-past-bound", "http", "Error 12032 on the last try goes round again",
          "src/http/RequestPipeline.cpp",
          "error == ERROR_WINHTTP_RESEND_REQUEST && attempt < kMaxTries",
          "error == ERROR_WINHTTP_RESEND_REQUEST && attempt <= kMaxTries"),
    Fault("http.cut-off-html-post-too", "http", "A POST with a cut-off HTML body is sent again too",
          "src/http/RequestPipeline.cpp",
          "if (isGet && !disableAutoRedirect && KelvraHttp::IsCutOffHtml(responseContent))",
          "if ((isGet || !isGet) && !disableAutoRedirect && KelvraHttp::IsCutOffHtml(responseContent))"),
    Fault("http.end-tag-at-body-end-missed", "http", "The HTML tag scan misses a tag at the very end",
          "src/http/ResponseText.cpp",
          "static_cast<size_t>(end - at) >= tag.size(); ++at)",
          "static_cast<size_t>(end - at) > tag.size(); ++at)"),
    Fault("http.verb-case-sensitive", "http", "The method is compared case-sensitively (\"get\" refused)",
          "src/http/RequestPipeline.cpp",
          "const bool isGet = _wcsicmp(httpVerb.c_str(), L\"GET\") == 0;",
          "const bool isGet = wcscmp(httpVerb.c_str(), L\"GET\") == 0;"),
    Fault("http.empty-url-code", "http", "An empty URL reports ERROR_INVALID_PARAMETER",
          "src/http/RequestPipeline.cpp",
          "lastError = ERROR_PATH_NOT_FOUND;",
          "lastError = ERROR_INVALID_PARAMETER;"),
    Fault("http.security-flags-inverted", "http",
          "Certificate errors are ignored only when valid certificates are required",
          "src/http/RequestPipeline.cpp",
          "if (secure && !requireValidSslCertificates)",
          "if (secure && requireValidSslCertificates)"),
    Fault("http.security-flags-no-date", "http", "The ignored certificate errors leave out an expired date",
          "src/http/RequestPipeline.cpp",
          "SECURITY_FLAG_IGNORE_CERT_CN_INVALID |\n"
          "                                        SECURITY_FLAG_IGNORE_CERT_DATE_INVALID;",
          "SECURITY_FLAG_IGNORE_CERT_CN_INVALID;"),
    Fault("http.cookie-header-before-headers", "http", "The cookie header is added before the extra headers",
          "src/http/RequestPipeline.cpp",
          "    if (!additionalRequestHeaders.empty())\n"
          "    {\n"
          "        KELVRA_TRC(L\"Adding request headers\");\n"
          "        AddHeaders(connection, request, additionalRequestHeaders, L\"Adding request headers failed\");\n"
          "    }\n"
          "    if (!additionalRequestCookies.empty())\n"
          "    {\n"
          "        KELVRA_TRC(L\"Adding request headers cookie\");\n"
          "        AddHeaders(connection, request, L\"Cookie: \" + additionalRequestCookies,\n"
          "                   L\"Adding request headers cookie failed\");\n"
          "    }\n",
          "    if (!additionalRequestCookies.empty())\n"
          "    {\n"
          "        KELVRA_TRC(L\"Adding request headers cookie\");\n"
          "        AddHeaders(connection, request, L\"Cookie: \" + additionalRequestCookies,\n"
          "                   L\"Adding request headers cookie failed\");\n"
          "    }\n"
          "    if (!additionalRequestHeaders.empty())\n"
          "    {\n"
          "        KELVRA_TRC(L\"Adding request headers\");\n"
          "        AddHeaders(connection, request, additionalRequestHeaders, L\"Adding request headers failed\");\n"
          "    }\n"),
    Fault("http.cookie-header-no-blank", "http", "The cookie header text is \"Cookie:\" without the blank",
          "src/http/RequestPipeline.cpp",
          "L\"Cookie: \" + additionalRequestCookies",
          "L\"Cookie:\" + additionalRequestCookies"),
    Fault("http.content-length-reset", "http",
          "A response without Content-Length resets the announced length to 0",
          "src/http/ResponseReading.cpp",
          "    std::uint64_t announced = kNoLength;\n    const std::vector<std::wstring> lengths",
          "    std::uint64_t announced = kNoLength;\n    rawResponseContentLength = 0;\n"
          "    const std::vector<std::wstring> lengths"),
    Fault("http.forced-charset-overwritten", "http", "The response's charset replaces a forced one",
          "src/http/ResponseReading.cpp",
          "    if (!forceCharset)\n    {\n        const std::vector<std::wstring> charsets",
          "    {\n        const std::vector<std::wstring> charsets"),
    Fault("http.utf8-name-case-sensitive", "http", "\"UTF-8\" in capitals decodes with the ANSI code page",
          "src/http/ResponseReading.cpp",
          "_wcsnicmp(responseCharset.c_str(), L\"utf-8\", 5) == 0",
          "wcsncmp(responseCharset.c_str(), L\"utf-8\", 5) == 0"),
    Fault("http.no-final-progress", "http", "No progress report once the body is complete",
          "src/http/ResponseReading.cpp",
          "    SetProgress(received);\n    rawResponseReceivedContentLength = received;\n",
          "    rawResponseReceivedContentLength = received;\n"),
    Fault("http.body-growth-ignores-announced", "http",
          "Body commits grow by half regardless of the announced length",
          "src/http/ResponseReading.cpp",
          "return announced != kNoLength && announced + 1 >= needed ? std::min(target, announced + 1) : target;",
          "return (void)announced, target;"),
    Fault("http.save-text-mode", "http", "SaveResponseToFile opens the file in text mode",
          "src/http/CWinHttpClient.cpp",
          "::_wfopen(filePath.c_str(), L\"wb\")",
          "::_wfopen(filePath.c_str(), L\"w\")"),
    Fault("http.session-per-request", "http", "Every request opens a new session, leaking the last one",
          "src/http/RequestPipeline.cpp",
          "    if (session != nullptr)\n        return;\n    KELVRA_TRC(L\"Creating Http session\");",
          "    KELVRA_TRC(L\"Creating Http session\");"),
    Fault("http.header-match-out-of-memory-ignored", "http",
          "A header match cut short by memory passes for a missing field",
          "src/http/ResponseReading.cpp",
          "        throw std::bad_alloc();\n    return values;",
          "        values.clear();\n    return values;"),
    # Proxy
    Fault("proxy.credential-length-in-chars", "proxy", "Proxy user name and password lengths given in characters",
          "src/http/ProxySelection.cpp",
          "static_cast<DWORD>(text.size() * sizeof(wchar_t))",
          "static_cast<DWORD>(text.size())"),
    Fault("proxy.password-without-user", "proxy", "A password is sent although no user name is set",
          "src/http/ProxySelection.cpp",
          "        if (proxyUsername.empty())\n            return;\n",
          "        if (proxyUsername.empty() && proxyPassword.empty())\n            return;\n"),
    Fault("proxy.release-order", "proxy", "The user's proxy strings are released in another order",
          "src/http/ProxySelection.cpp",
          "    Release(config.lpszAutoConfigUrl, L\"Releasing lpszAutoConfigUrl\");\n"
          "    Release(config.lpszProxy, L\"Releasing lpszProxy\");\n",
          "    Release(config.lpszProxy, L\"Releasing lpszProxy\");\n"
          "    Release(config.lpszAutoConfigUrl, L\"Releasing lpszAutoConfigUrl\");\n"),
    Fault("proxy.error-2-inverted", "proxy",
          "Error 2 (no settings) fails the request and every other error is ignored",
          "src/http/ProxySelection.cpp",
          "if (Platform().GetLastError() != ERROR_FILE_NOT_FOUND)",
          "if (Platform().GetLastError() == ERROR_FILE_NOT_FOUND)"),
    Fault("proxy.failure-keeps-user-texts", "proxy",
          "A request failing after the user's settings were read does not free their texts",
          "src/http/RequestPipeline.cpp",
          "    if (failure.proxyConfig != nullptr)\n        KelvraHttp::ReleaseUserProxyConfig(*failure.proxyConfig);\n",
          ""),
    Fault("proxy.bypass-dropped", "proxy", "The user's fixed proxy is set without its bypass list",
          "src/http/ProxySelection.cpp",
          "SetNamedProxy(connection, request, user.lpszProxy, user.lpszProxyBypass,",
          "SetNamedProxy(connection, request, user.lpszProxy, nullptr,"),
    # Threading
    Fault("threading.flag-never-resets", "threading", "Assigning false to a flag does not reset its event",
          "src/threading/GlobalBooleanFx2.cpp",
          "    else\n        ::ResetEvent(m_event);\n",
          ""),
    Fault("threading.auto-boolean-manual", "threading", "CAutoBoolean's event is manual-reset",
          "src/threading/AutoBoolean.cpp",
          "CAutoBoolean::CAutoBoolean() : CGlobalBooleanFx2(nullptr, false) {}",
          "CAutoBoolean::CAutoBoolean() : CGlobalBooleanFx2(nullptr, true) {}"),
    Fault("threading.stop-ignores-timeout", "threading", "Stop waits the destructor's 5 s, not its time-out",
          "src/threading/ThreadWin32.cpp",
          "Kelvra::WaitMilliseconds(timeout)",
          "Kelvra::WaitMilliseconds(timeout < 0 ? timeout : kDestructorStopTimeout)"),
    Fault("threading.destructor-short-wait", "threading", "The destructor's stop time-out is 500 ms",
          "src/threading/ThreadWin32.cpp",
          "constexpr int kDestructorStopTimeout = 5000;",
          "constexpr int kDestructorStopTimeout = 500;"),
    Fault("threading.self-stop-exit-code", "threading", "A worker stopping itself ends with exit code 0",
          "src/threading/ThreadWin32.cpp",
          "constexpr unsigned int kSelfStopExitCode = 0xA5A5A5A5u;",
          "constexpr unsigned int kSelfStopExitCode = 0;"),
    Fault("threading.running-stays-set", "threading", "The running flag stays set after Run returns",
          "src/threading/ThreadWin32.cpp",
          "    if (t_object == thread)\n        thread->m_running = false;\n",
          ""),
    Fault("threading.assignment-shares-handle", "threading",
          "Assignment takes the other object's thread handle itself, so both close it",
          "src/threading/ThreadWin32.cpp",
          "m_thread = duplicate.release();",
          "m_thread = other.m_thread;"),
    Fault("threading.init-reinitialises-held-section", "threading",
          "CLock::Init of the section it holds initialises it again, losing its recursion count",
          "src/threading/Lock.cpp",
          "if (section == nullptr || section == m_section)",
          "if (section == nullptr)"),
    Fault("threading.scope-lock-only-tries", "threading",
          "CScopeLock takes the lock with TryLock, so it does not wait for another holder",
          "src/threading/ScopeLock.cpp",
          "        m_lock->Lock();",
          "        m_lock->TryLock();"),
    # INI
    Fault("ini.continuation-under-section", "ini",
          "A continuation line is filed under the section's name instead of the previous name",
          "src/config/IniParser.cpp",
          "Report(m_previousName, start)",
          "Report(m_section, start)"),
    Fault("ini.inline-comment-without-space", "ini", "Any ';' opens an inline comment, not only after white space",
          "src/config/IniParser.cpp",
          "    bool afterSpace = false;\n    while (*text != L'\\0' && *text != stop && !(afterSpace && *text == L';'))\n"
          "    {\n        afterSpace = IsSpace(*text);\n        ++text;\n    }\n",
          "    while (*text != L'\\0' && *text != stop && *text != L';')\n        ++text;\n"),
    Fault("ini.lookup-case-sensitive", "ini", "Keys are not lowered, so look-ups are case-sensitive",
          "src/config/INIReader.cpp",
          "    Kelvra::LowerAscii(key);\n    return key;",
          "    return key;"),
    Fault("ini.getboolean-no-on", "ini", "GetBoolean does not know \"on\"",
          "src/config/INIReader.cpp",
          "text == L\"true\" || text == L\"yes\" || text == L\"on\" || text == L\"1\"",
          "text == L\"true\" || text == L\"yes\" || text == L\"1\""),
    Fault("ini.getinteger-base-ten", "ini", "GetInteger reads base 10 only (0x1F, 017 misread)",
          "src/config/INIReader.cpp",
          "std::wcstol(text.c_str(), &end, 0)",
          "std::wcstol(text.c_str(), &end, 10)"),
    Fault("ini.last-value-wins", "ini", "A repeated name overwrites the stored value",
          "src/config/INIReader.cpp",
          "reader->m_values.try_emplace(",
          "reader->m_values.insert_or_assign("),
    Fault("ini.long-line-exact-read", "ini",
          "A line of exactly 199 characters and its line feed counts as cut",
          "src/config/IniParser.cpp",
          "piece[kLineSize - 1] == L'\\0' && piece[kLineSize - 2] != L'\\n'",
          "piece[kLineSize - 1] == L'\\0'"),
    Fault("ini.empty-value-stored", "ini", "An empty value is stored and wins over a later one",
          "src/config/INIReader.cpp",
          "    if (value[0] == L'\\0')\n        return 1;\n",
          ""),
    Fault("ini.name-limit-off-by-one", "ini",
          "A name of 50 characters is taken, overrunning the 50-character buffer by its terminator",
          "src/config/IniParser.cpp",
          "if (length >= kNameSize)",
          "if (length > kNameSize)"),
    # Event log
    Fault("eventlog.type-category-swapped", "eventlog", "Log passes category and type in swapped order",
          "src/eventlog/COSEventLog.cpp",
          "::ReportEventW(static_cast<HANDLE>(m_source), type, category, eventId,",
          "::ReportEventW(static_cast<HANDLE>(m_source), category, type, eventId,"),
    Fault("eventlog.message-cut-at-4094", "eventlog", "Messages are cut at 4094 characters",
          "src/eventlog/COSEventLog.cpp",
          "_vsnwprintf_s(message, kEventMessageCapacity, _TRUNCATE",
          "_vsnwprintf_s(message, kEventMessageCapacity - 1, _TRUNCATE"),
    Fault("eventlog.backslash-source-accepted", "eventlog", "A source name with a backslash is not refused",
          "src/eventlog/COSEventLog.cpp",
          "return name != nullptr && name[0] != L'\\0' && std::wcschr(name, L'\\\\') == nullptr;",
          "return name != nullptr && name[0] != L'\\0';"),
    Fault("eventlog.category-values-always", "eventlog", "Category values are written for 0 categories too",
          "src/eventlog/COSEventLog.cpp",
          "if (status == ERROR_SUCCESS && categoryCount > 0)",
          "if (status == ERROR_SUCCESS)"),
    Fault("eventlog.types-without-information", "eventlog", "TypesSupported leaves out information entries",
          "src/eventlog/COSEventLog.cpp",
          "EVENTLOG_ERROR_TYPE | EVENTLOG_WARNING_TYPE | EVENTLOG_INFORMATION_TYPE;",
          "EVENTLOG_ERROR_TYPE | EVENTLOG_WARNING_TYPE;"),
    # Handle owners
    Fault("handles.move-keeps-source", "handles", "A moved owner keeps its value and closes it again",
          "src/common/UniqueHandle.h",
          "UniqueHandle(UniqueHandle&& other) noexcept : m_value(other.release()) {}",
          "UniqueHandle(UniqueHandle&& other) noexcept : m_value(other.get()) {}"),
    Fault("handles.move-assignment-leaks", "handles", "Move assignment drops the value it held without closing it",
          "src/common/UniqueHandle.h",
          "            reset(other.release());",
          "            m_value = other.release();"),
    Fault("handles.put-keeps-old", "handles", "put() hands out the field without closing what it held",
          "src/common/UniqueHandle.h",
          "    pointer* put() noexcept\n    {\n        reset();\n",
          "    pointer* put() noexcept\n    {\n"),
]


class Interrupted(Exception):
    """SIGTERM, handled like Ctrl-C so that the planted file is restored."""


def on_sigterm(signum, frame):
    raise Interrupted()


def run(command, log):
    """Runs command in the repository, its output appended to log; returns the exit status."""
    log.write("$ " + " ".join(command) + "\n")
    log.flush()
    return subprocess.run(command, cwd=ROOT, stdout=log, stderr=subprocess.STDOUT).returncode


def git(*args):
    return subprocess.run(["git", *args], cwd=ROOT, capture_output=True, text=True)


def tests_of(faults):
    names = []
    for fault in faults:
        for name in SUBSYSTEM_TESTS[fault.subsystem]:
            if name not in names:
                names.append(name)
    return names


def ctest_command(tests):
    command = ["ctest", "--preset", "mingw"]
    if tests is not None:
        command += ["-R", "^(" + "|".join(re.escape(name) for name in tests) + ")$"]
    return command


def failed_tests(log_path):
    """The tests ctest lists as failed, each with the GoogleTest cases that failed in it."""
    with open(log_path, encoding="utf-8", errors="replace") as log:
        text = log.read()
    part = text.rsplit("The following tests FAILED:", 1)
    if len(part) < 2:
        return []
    names = re.findall(r"^\s*\d+ - (\S+)", part[1], re.MULTILINE)
    cases = []
    for case in re.findall(r"^\[  FAILED  \] ([A-Za-z_][\w/]*\.[\w/]+)", text, re.MULTILINE):
        if case not in cases:
            cases.append(case)
    return names + cases


def occurrences(fault):
    path = os.path.join(ROOT, fault.file)
    if not os.path.isfile(path):
        return 0
    with open(path, encoding="utf-8", newline="") as source:
        return source.read().count(fault.find)


def build_and_test(tests, log_path):
    """(build ok, tests ok, seconds) for the tree as it stands."""
    start = time.monotonic()
    with open(log_path, "w", encoding="utf-8") as log:
        built = run(["nice", "cmake", "--build", "--preset", "mingw"], log) == 0
        passed = built and run(["nice"] + ctest_command(tests), log) == 0
    return built, passed, time.monotonic() - start


def plant(fault, tests):
    """Applies fault, builds and tests, restores the file. Returns (result, failed tests, seconds)."""
    path = os.path.join(ROOT, fault.file)
    with open(path, "rb") as source:
        original = source.read()
    text = original.decode("utf-8")
    if text.count(fault.find) != 1:
        return "stale", [], 0.0
    log_path = os.path.join(LOG_DIR, fault.id + ".log")
    try:
        with open(path, "wb") as target:
            target.write(text.replace(fault.find, fault.replace, 1).encode("utf-8"))
        built, passed, seconds = build_and_test(tests, log_path)
    finally:
        # A new modification time, so that the next build compiles the restored file again.
        with open(path, "wb") as target:
            target.write(original)
        if git("diff", "--quiet", "--", fault.file).returncode != 0:
            raise RuntimeError(f"{fault.file} differs from the commit after restoring it: check it by hand")
    if not built:
        return "build-broken", [], seconds
    if passed:
        return "MISSED", [], seconds
    return "caught", failed_tests(log_path), seconds


def select(args):
    faults = FAULTS
    if args.only:
        wanted = [name.strip() for name in args.only.split(",") if name.strip()]
        known = {fault.id for fault in FAULTS}
        unknown = [name for name in wanted if name not in known]
        if unknown:
            sys.exit("unknown fault: " + ", ".join(unknown))
        faults = [fault for fault in faults if fault.id in wanted]
    if args.subsystem:
        if args.subsystem not in SUBSYSTEM_TESTS:
            sys.exit("unknown subsystem: " + args.subsystem + " (one of " + ", ".join(SUBSYSTEM_TESTS) + ")")
        faults = [fault for fault in faults if fault.subsystem == args.subsystem]
    return faults


def table(rows):
    lines = [f"| {'fault':42} | {'subsystem':10} | {'result':12} | {'s':>4} | caught by / mistake |",
             f"|{'-' * 44}|{'-' * 12}|{'-' * 14}|{'-' * 6}|{'-' * 21}|"]
    for fault, result, failed, seconds in rows:
        note = ", ".join(failed) if failed else fault.what
        lines.append(f"| {fault.id:42} | {fault.subsystem:10} | {result:12} | {seconds:4.0f} | {note} |")
    return "\n".join(lines)


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--only", help="comma-separated fault ids")
    parser.add_argument("--subsystem", help="the faults of one subsystem: " + ", ".join(SUBSYSTEM_TESTS))
    parser.add_argument("--fast", action="store_true",
                        help="run only the tests of each fault's subsystem (and their fixtures)")
    parser.add_argument("--list", action="store_true", help="print the selected faults and stop")
    parser.add_argument("--check", action="store_true", help="report stale faults without building")
    parser.add_argument("--summary", default=os.path.join(LOG_DIR, "summary.md"),
                        help="where to write the summary (default: %(default)s)")
    args = parser.parse_args()
    faults = select(args)

    if args.list:
        for fault in faults:
            print(f"{fault.id:42} {fault.subsystem:10} {fault.what}")
        return 0
    stale = [fault for fault in faults if occurrences(fault) != 1]
    if args.check:
        for fault in stale:
            print(f"stale: {fault.id} ({fault.file}: found {occurrences(fault)} times)")
        print(f"{len(faults) - len(stale)} of {len(faults)} faults apply")
        return 1 if stale else 0

    dirty = git("status", "--porcelain", "--", "src", "include").stdout.strip()
    if dirty:
        print("refusing to start: uncommitted changes in src/ or include/:\n" + dirty, file=sys.stderr)
        return 2

    signal.signal(signal.SIGTERM, on_sigterm)
    os.makedirs(LOG_DIR, exist_ok=True)
    started = time.monotonic()
    rows = []
    interrupted = False
    try:
        with open(os.path.join(LOG_DIR, "configure.log"), "w", encoding="utf-8") as log:
            if run(["cmake", "--preset", "mingw"], log) != 0:
                print("configuring failed: see " + log.name, file=sys.stderr)
                return 3
        # Every fault counts only if the suite passes without it.
        clean_tests = tests_of(faults) if args.fast else None
        built, passed, seconds = build_and_test(clean_tests, os.path.join(LOG_DIR, "unplanted.log"))
        print(f"unplanted tree: {'passes' if passed else 'FAILS'} ({seconds:.0f} s)", flush=True)
        if not passed:
            print("the suite must pass before faults are planted: see " + os.path.join(LOG_DIR, "unplanted.log"),
                  file=sys.stderr)
            return 3
        for number, fault in enumerate(faults, 1):
            tests = SUBSYSTEM_TESTS[fault.subsystem] if args.fast else None
            result, failed, seconds = plant(fault, tests)
            rows.append((fault, result, failed, seconds))
            print(f"[{number}/{len(faults)}] {fault.id}: {result} ({seconds:.0f} s)"
                  + (" by " + ", ".join(failed) if failed else ""), flush=True)
    except (KeyboardInterrupt, Interrupted):
        interrupted = True
        print("\ninterrupted: the planted file was restored", file=sys.stderr)
    finally:
        # Leave the build matching the tree, not the last fault.
        with open(os.path.join(LOG_DIR, "rebuild.log"), "w", encoding="utf-8") as log:
            run(["nice", "cmake", "--build", "--preset", "mingw"], log)

    elapsed = time.monotonic() - started
    counts = collections.Counter(result for _, result, _, _ in rows)
    summary = (f"{len(rows)} of {len(faults)} faults planted"
               + (" (interrupted)" if interrupted else "")
               + f" in {elapsed / 60:.0f} min, {'tests of each subsystem' if args.fast else 'whole suite'}: "
               + ", ".join(f"{counts[name]} {name}" for name in ("caught", "MISSED", "build-broken", "stale")))
    report = table(rows) + "\n\n" + summary + "\n"
    print("\n" + report)
    os.makedirs(os.path.dirname(os.path.abspath(args.summary)), exist_ok=True)
    with open(args.summary, "w", encoding="utf-8") as out:
        out.write(report)
    print("summary written to " + args.summary)
    if interrupted:
        return 130
    return 1 if counts["MISSED"] or counts["stale"] or counts["build-broken"] or stale else 0


if __name__ == "__main__":
    sys.exit(main())
