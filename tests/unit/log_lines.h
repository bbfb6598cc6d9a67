// What was logged, taken back to the sources.

#ifndef VORN_TESTS_UNIT_LOG_LINES_H
#define VORN_TESTS_UNIT_LOG_LINES_H

#include <filesystem>
#include <string>
#include <vector>

#include "tests/double/recorder.h"

namespace unit {

// The module's sources.
const std::filesystem::path& SourceFolder();

std::string ReadAll(const std::filesystem::path& path);

// A row of the list in support/log.h: enumerator, number, file.
struct ListedFile {
    std::string enumerator;
    int number;
    std::string file;
};

std::vector<ListedFile> ListedFiles();

// Why the number of a line that was logged does not lead to its statement; empty when it does.
std::string AstrayFrom(const fake::LogLine& line);

}  // namespace unit

#endif
