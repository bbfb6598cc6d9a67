// Writes to the file that MUTANT_RECORD names which mutants each test reaches: a line for what is reached before the
// first test, then a line for each test, "Suite.Name <milliseconds> <number> <number> ...".

#include <gtest/gtest.h>

#include <cstdio>
#include <cstdlib>
#include <string>

#include "runtime.h"

namespace {

class Recorder : public testing::EmptyTestEventListener {
public:
    explicit Recorder(const char* path) : out_(std::fopen(path, "w")) {}

private:
    void OnTestProgramStart(const testing::UnitTest& /*program*/) override {
        Write("-", 0);
    }

    void OnTestEnd(const testing::TestInfo& test) override {
        Write(std::string(test.test_suite_name()) + "." + test.name(),
              static_cast<long>(test.result()->elapsed_time()));
    }

    void Write(const std::string& name, long milliseconds) {
        std::fprintf(out_, "%s %ld", name.c_str(), milliseconds);
        for (int number = 1; mutant::reached != nullptr && number < mutant::kMost; ++number) {
            if (mutant::reached[number] != 0) {
                std::fprintf(out_, " %d", number);
                mutant::reached[number] = 0;
            }
        }
        std::fputc('\n', out_);
        std::fflush(out_);
    }

    std::FILE* out_;
};

const bool kListening = [] {
    if (const char* path = std::getenv("MUTANT_RECORD")) {
        testing::UnitTest::GetInstance()->listeners().Append(new Recorder(path));
    }
    return true;
}();

}  // namespace
