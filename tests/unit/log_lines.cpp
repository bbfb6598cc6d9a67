#include "tests/unit/log_lines.h"

#include <algorithm>
#include <fstream>
#include <iterator>
#include <map>
#include <regex>
#include <sstream>

#include "src/support/log.h"

namespace unit {

namespace {

// The lines of a source, read once.
const std::vector<std::string>& LinesOf(const std::string& file) {
    static std::map<std::string, std::vector<std::string>> known;
    std::vector<std::string>& lines = known[file];
    if (lines.empty()) {
        std::istringstream stream(ReadAll(SourceFolder() / file));
        for (std::string line; std::getline(stream, line);) {
            lines.push_back(line);
        }
    }
    return lines;
}

// A format as the source spells it.
std::string Spelled(const std::string& format) {
    std::string text;
    for (const char byte : format) {
        text += byte == '\n' ? "\\n" : std::string(1, byte);
    }
    return "\"" + text + "\"";
}

}  // namespace

const std::filesystem::path& SourceFolder() {
    static const std::filesystem::path folder = VORN_SOURCE_DIR;
    return folder;
}

std::string ReadAll(const std::filesystem::path& path) {
    std::ifstream stream(path);
    return {std::istreambuf_iterator<char>(stream), std::istreambuf_iterator<char>()};
}

std::vector<ListedFile> ListedFiles() {
    const std::string text = ReadAll(SourceFolder() / "support/log.h");
    static const std::regex pattern(R"(\n    (k\w+) = (\d+), +// ([\w/]+\.cpp)\b)");
    std::vector<ListedFile> listed;
    for (std::sregex_iterator at(text.begin(), text.end(), pattern), end; at != end; ++at) {
        listed.push_back({(*at)[1], std::stoi((*at)[2]), (*at)[3]});
    }
    return listed;
}

std::string AstrayFrom(const fake::LogLine& line) {
    static const std::vector<ListedFile> listed = ListedFiles();
    const int number = line.line / kLogLinesPerFile;
    const auto file = std::find_if(listed.begin(), listed.end(),
                                   [number](const ListedFile& candidate) { return candidate.number == number; });
    const std::string what = line.unit + ":" + std::to_string(line.line) + " " + line.message;
    if (file == listed.end()) {
        return what + ": no file has this number";
    }
    const std::vector<std::string>& lines = LinesOf(file->file);
    const auto place = static_cast<std::size_t>(line.line % kLogLinesPerFile);
    if (place == 0 || place > lines.size() ||
        lines[place - 1].find("LOG_NUMBER(" + file->enumerator + ")") == std::string::npos) {
        return what + ": no number is made there";
    }
    // The statement may begin on the line above its number, or on the one below when the number has a name.
    const std::size_t first = place < 2 ? 0 : place - 2;
    std::string statement;
    for (std::size_t at = first; at < std::min(place + 1, lines.size()); ++at) {
        statement += lines[at];
    }
    return statement.find(Spelled(line.format)) != std::string::npos ? "" : what + ": another statement is there";
}

}  // namespace unit
