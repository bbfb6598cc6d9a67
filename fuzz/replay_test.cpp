// Runs the corpus, and what the fuzzer once found, as ordinary tests.

#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include "fuzz/check.h"
#include "fuzz/operations.h"

namespace {

std::vector<std::filesystem::path> FilesOf(const std::filesystem::path& folder) {
    std::vector<std::filesystem::path> files;
    for (const auto& entry : std::filesystem::directory_iterator(folder)) {
        files.push_back(entry.path());
    }
    std::sort(files.begin(), files.end());
    return files;
}

std::string Content(const std::filesystem::path& path) {
    std::ifstream stream(path, std::ios::binary);
    std::ostringstream content;
    content << stream.rdbuf();
    return content.str();
}

class Corpus : public ::testing::TestWithParam<std::string> {};

TEST_P(Corpus, HoldsEveryRule) {
    const fuzz::Operation& operation = fuzz::FindOperation(GetParam());
    const auto files = FilesOf(std::filesystem::path(FUZZ_CORPUS) / operation.name);
    ASSERT_FALSE(files.empty());
    for (const auto& file : files) {
        const std::string content = Content(file);
        try {
            fuzz::Run(operation, reinterpret_cast<const std::uint8_t*>(content.data()), content.size());
        } catch (const fuzz::RuleBroken& broken) {
            ADD_FAILURE() << file << " breaks a rule: " << broken.what();
        }
    }
}

std::vector<std::string> Names() {
    std::vector<std::string> names;
    for (const fuzz::Operation& operation : fuzz::Operations()) {
        names.push_back(operation.name);
    }
    return names;
}

INSTANTIATE_TEST_SUITE_P(Operations, Corpus, ::testing::ValuesIn(Names()),
                         [](const auto& operation) { return operation.param; });

}  // namespace
