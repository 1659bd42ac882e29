// INIReader over generated 16 MiB INI files: load one and look every key up once, against a
// plain fgetws loop that only reads the same file (the I/O floor the reader builds on).
#include <Kelvra.h>

#include "BenchSupport.h"

#include <algorithm>
#include <cstdio>
#include <memory>
#include <string>
#include <utility>
#include <vector>

using namespace KelvraBench;

namespace
{

using Key = std::pair<std::wstring, std::wstring>;

std::wstring Widen(const std::string& text)
{
    return std::wstring(text.begin(), text.end());
}

// Sections of pairs of several kinds with inline comments and continuation lines, the way a
// large hand-kept configuration looks. A documented file explains every pair in a comment line
// above it (as php.ini or smb.conf do); a dense one has only a banner per section. Returns
// every (section, name) stored, or nothing when the file cannot be written.
std::vector<Key> WriteFile(const std::wstring& path, size_t size, bool documented)
{
    std::vector<Key> keys;
    std::string text;
    for (int section = 0; text.size() < size; ++section)
    {
        const std::string name = "Section " + std::to_string(section);
        text += "; ------------------------------------------------------------\n"
                "; Settings of " + name + ", kept by hand; see the manual.\n"
                "; ------------------------------------------------------------\n"
                "[" + name + "]\n";
        for (int pair = 0; pair < 24; ++pair)
        {
            const std::string number = std::to_string(section * 100 + pair);
            const std::string key = "Key" + std::to_string(pair);
            if (documented)
                text += "; " + key + ": what it controls, its unit and its default value\n";
            switch (pair % 6)
            {
            case 0: text += key + " = " + number + "\n"; break;
            case 1: text += key + " = C:\\Program Files\\Vendor\\Product\\data\\file" + number + ".dat\n"; break;
            case 2: text += key + " = true ; switched on for " + name + "\n"; break;
            case 3: text += key + ": 0x" + number + "\n"; break;
            case 4: text += key + " = 2.5e" + number.substr(0, 1) + "\n"; break;
            case 5: text += key + " =\n    first line of a long description of " + number + ",\n    second line\n"; break;
            }
            keys.emplace_back(Widen(name), Widen(key));
        }
        text += "\n";
    }
    std::unique_ptr<FILE, int (*)(FILE*)> file(_wfopen(path.c_str(), L"wb"), &std::fclose);
    if (!file || std::fwrite(text.data(), 1, text.size(), file.get()) != text.size())
        keys.clear();
    return keys;
}

size_t ReadAllLines(const std::wstring& path)
{
    std::unique_ptr<FILE, int (*)(FILE*)> file(_wfopen(path.c_str(), L"r"), &std::fclose);
    size_t lines = 0;
    wchar_t buffer[200];
    while (file && std::fgetws(buffer, 200, file.get()) != nullptr)
        ++lines;
    return lines;
}

struct Figures
{
    size_t keys = 0;
    double bytes = 0;
    double readSeconds = 0;
    double loadSeconds = 0;
    double readerSeconds = 0;
    bool correct = false;
};

Figures Measure(const std::wstring& path, bool documented, int runs)
{
    Figures figures;
    const std::vector<Key> keys = WriteFile(path, 16u * 1024 * 1024, documented);
    if (keys.empty())
        return figures;
    WIN32_FILE_ATTRIBUTE_DATA attributes = {};
    ::GetFileAttributesExW(path.c_str(), GetFileExInfoStandard, &attributes);
    figures.keys = keys.size();
    figures.bytes = static_cast<double>(attributes.nFileSizeLow);

    size_t lines = 0;
    int parseError = 0;
    size_t found = 0;
    const auto [readSeconds, loadSeconds, readerSeconds] = BestSecondsInTurn(
        runs, [&] { lines = ReadAllLines(path); }, [&] { parseError = INIReader(path).ParseError(); },
        [&]
        {
            const INIReader reader(path);
            found = 0;
            for (const Key& key : keys)
                found += !reader.Get(key.first, key.second, std::wstring()).empty();
        });
    figures.readSeconds = readSeconds;
    figures.loadSeconds = loadSeconds;
    figures.readerSeconds = readerSeconds;
    _wremove(path.c_str());
    figures.correct = lines > 0 && parseError == 0 && found == keys.size();
    return figures;
}

void PrintRow(const char* label, const Figures& figures)
{
    std::printf("  %-12s %8zu %7.0f %11.1f %11.1f %15.1f %7.2f\n", label, figures.keys, figures.bytes / figures.keys,
                MegabytesPerSecond(figures.bytes, figures.readSeconds),
                MegabytesPerSecond(figures.bytes, figures.loadSeconds),
                MegabytesPerSecond(figures.bytes, figures.readerSeconds), figures.readSeconds / figures.readerSeconds);
}

} // namespace

int main()
{
    const int runs = 5;
    wchar_t folder[MAX_PATH + 1];
    const DWORD length = ::GetTempPathW(MAX_PATH + 1, folder);
    const std::wstring path = std::wstring(folder, length) + L"kelvra_ini_bench.ini";
    const Figures documented = Measure(path, true, runs);
    const Figures dense = Measure(path, false, runs);
    if (documented.keys == 0 || dense.keys == 0)
    {
        std::printf("cannot write %ls\n", path.c_str());
        return 1;
    }

    std::printf("INI files of 16 MiB: MB/s of file, best of %d runs; ratio = read loop time / INIReader time\n", runs);
    std::printf("  %-12s %8s %7s %11s %11s %15s %7s\n", "file", "keys", "B/key", "read loop", "load", "load+look-ups",
                "ratio");
    PrintRow("documented", documented);
    PrintRow("dense", dense);
    std::printf("Ratios\n");
    const bool met = ReportTarget("INIReader / read loop, documented file",
                                  documented.readSeconds / documented.readerSeconds, ">=", 0.5);
    std::printf("Results: every key found, parse result 0: %s\n",
                documented.correct && dense.correct ? "yes" : "NO");
    return met && documented.correct && dense.correct ? 0 : 1;
}
