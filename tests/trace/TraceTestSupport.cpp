#include "TraceTestSupport.h"

#include "support/TestData.h"

#include <algorithm>
#include <regex>

namespace KelvraTraceTest
{

const std::filesystem::path kMarker = L"c:\\keltrace";

std::string ReadMarkerFile(const std::wstring& fileName)
{
    return KelvraTest::ReadBinaryFile((kMarker / fileName).wstring());
}

Lines TaggedMessages(const std::string& lines)
{
    static const std::regex pattern(R"(\[(TRC|INF|ERR)\]\[\d{15,17}\]\[[^\]:]*:-?\d+\] (.*))");
    Lines messages;
    for (size_t start = 0, end; start < lines.size(); start = end + 2)
    {
        end = std::min(lines.find("\r\n", start), lines.size());
        const std::string line = lines.substr(start, end - start);
        std::smatch parts;
        EXPECT_TRUE(std::regex_match(line, parts, pattern)) << "not a trace line: [" << line << "]";
        messages.push_back(parts[1].str() + " " + parts[2].str());
    }
    return messages;
}

} // namespace KelvraTraceTest
