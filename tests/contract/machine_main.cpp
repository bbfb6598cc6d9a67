// Runs the tests that change the machine, and only for somebody who has said that they may.

#include <gtest/gtest.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>

int main(int count, char** arguments) {
    const char* allowed = std::getenv("VORN_CONTRACT_MACHINE");
    if (allowed == nullptr || std::strcmp(allowed, "1") != 0) {
        static_cast<void>(
            std::fprintf(stderr,
                         "These tests change the machine: its settings, DNS servers, scheduled tasks and event log.\n"
                         "They put back what they changed. To run them on a machine where that is all right, set\n"
                         "VORN_CONTRACT_MACHINE=1 in the environment.\n"));
        return 2;
    }
    testing::InitGoogleTest(&count, arguments);
    return RUN_ALL_TESTS();
}
