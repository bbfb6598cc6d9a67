// Runs the corpus as ordinary tests.

#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <sstream>

#include "fuzz/door/door.h"

namespace {

class DoorCorpus : public ::testing::TestWithParam<fuzz::DoorTarget> {};

TEST_P(DoorCorpus, HoldsEveryRule) {
    std::vector<std::filesystem::path> files;
    for (const auto& entry : std::filesystem::directory_iterator(std::string(FUZZ_CORPUS) + "/" + GetParam().name)) {
        files.push_back(entry.path());
    }
    std::sort(files.begin(), files.end());
    ASSERT_FALSE(files.empty());
    for (const auto& file : files) {
        std::ifstream stream(file, std::ios::binary);
        std::ostringstream content;
        content << stream.rdbuf();
        const std::string bytes = content.str();
        try {
            GetParam().run(reinterpret_cast<const std::uint8_t*>(bytes.data()), bytes.size());
        } catch (const fuzz::DoorRuleBroken& broken) {
            ADD_FAILURE() << file << " breaks a rule: " << broken.what();
        }
    }
}

INSTANTIATE_TEST_SUITE_P(Targets, DoorCorpus, ::testing::ValuesIn(fuzz::DoorTargets()),
                         [](const auto& target) { return target.param.name; });

}  // namespace
