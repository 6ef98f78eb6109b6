#include "weights/control_file.h"

#include <algorithm>
#include <fstream>
#include <string_view>

#include "weights/bounded_reader.h"

namespace MORVA::UTILS {

namespace {

// Fixed, so that the host's locale cannot change how a file is read.
constexpr std::string_view whitespace = " \t\n\v\f\r";

bool isSkipped(std::string_view line) {
    return line.starts_with('#') || line.find_first_not_of(whitespace) == std::string_view::npos;
}

}  // namespace

std::pair<std::string, std::string> getKeyValue(std::string const& line) {
    auto const keyStart = std::min(line.find_first_not_of(whitespace), line.size());
    auto const keyEnd = std::min(line.find_first_of(whitespace, keyStart), line.size());
    auto const valueStart = std::min(line.find_first_not_of(whitespace, keyEnd), line.size());
    auto const valueEnd = std::max(line.find_last_not_of(whitespace) + 1, valueStart);
    return {line.substr(keyStart, keyEnd - keyStart),
            line.substr(valueStart, valueEnd - valueStart)};
}

bool readControlFile(std::vector<std::pair<std::string, std::string>>& out, Path const& path) {
    std::ifstream file;
    if (!path.openIfstream(file, std::ios::openmode{})) return false;
    std::string text;
    if (!BoundedReader(file).readRest(text)) return false;

    for (std::size_t start = 0; start < text.size();) {
        auto const end = std::min(text.find('\n', start), text.size());
        auto const line = text.substr(start, end - start);
        start = end + 1;
        if (isSkipped(line)) continue;
        auto entry = getKeyValue(line);
        if (entry.first.empty() || entry.second.empty()) return false;
        out.push_back(std::move(entry));
    }
    return true;
}

}  // namespace MORVA::UTILS
