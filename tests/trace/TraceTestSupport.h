// What the trace tests and the client's tests share: the marker directory c:\keltrace, its files,
// and trace lines.
#pragma once

#include <gtest/gtest.h>

#include <filesystem>
#include <string>
#include <vector>

namespace KelvraTraceTest
{

using Lines = std::vector<std::string>;

extern const std::filesystem::path kMarker;
std::string ReadMarkerFile(const std::wstring& fileName);

// "TAG message" of each CR LF terminated trace line; fails the calling test on any other line.
Lines TaggedMessages(const std::string& lines);

} // namespace KelvraTraceTest
