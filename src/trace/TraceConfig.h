// What the trace configuration file says, and the module filter it sets up: plain functions over
// fixed inputs, so that tests drive them without touching the process-wide trace state.
#pragma once

#include <string>
#include <vector>

namespace KelvraTrace
{

struct TraceConfig
{
    int level = 0;                     // highest level word met, 0 when none
    std::vector<std::wstring> modules; // every other line, lower-cased, in file order
};

// Reads the file's bytes as lines: a line feed ends a line, a carriage return right before it is
// dropped, a last line without line feed counts, and one byte is one character (each byte
// becomes the code unit of the same value; a line ends at a NUL byte). Level words are matched
// exactly and case-sensitively; any other line, the empty one included, is a module name.
TraceConfig ParseTraceConfig(const std::string& bytes);

// The module filter over a list that may be null: no list or an empty one lets every module
// through; otherwise the lower-cased name must equal an entry.
bool IsModuleTraced(const std::vector<std::wstring>* modules, std::wstring name);

} // namespace KelvraTrace
