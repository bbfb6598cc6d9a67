// Runs the corpus of the servers' targets as ordinary tests.

#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include "fuzz/sessions/targets.h"

namespace {

class ServerCorpus : public ::testing::TestWithParam<std::string> {};

TEST_P(ServerCorpus, HoldsEveryRule) {
    const fuzz::ServerTarget& target = fuzz::FindServerTarget(GetParam());
    std::size_t files = 0;
    for (const auto& entry : std::filesystem::directory_iterator(std::filesystem::path(FUZZ_CORPUS) / target.name)) {
        std::ifstream stream(entry.path(), std::ios::binary);
        std::ostringstream content;
        content << stream.rdbuf();
        EXPECT_NO_THROW(target.run(content.str())) << entry.path();
        ++files;
    }
    EXPECT_GT(files, 0u);
}

std::vector<std::string> Names() {
    std::vector<std::string> names;
    for (const fuzz::ServerTarget& target : fuzz::ServerTargets()) {
        names.push_back(target.name);
    }
    return names;
}

INSTANTIATE_TEST_SUITE_P(Targets, ServerCorpus, ::testing::ValuesIn(Names()),
                         [](const auto& target) { return target.param; });

}  // namespace
