// A root folder of the test's own, with the folders that an appliance has.

#ifndef VORN_TESTS_APPLIANCE_SYSTEM_SYSTEM_TEST_H
#define VORN_TESTS_APPLIANCE_SYSTEM_SYSTEM_TEST_H

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/types.h>

#include <functional>
#include <optional>
#include <string>

namespace system_test {

class SystemTest : public ::testing::Test {
protected:
    SystemTest();
    ~SystemTest() override;

    // A fixed path under the test's root.
    std::string At(const std::string& path) const {
        return root + path;
    }

    // The file's bytes; nothing when it is missing.
    std::optional<std::string> Content(const std::string& path) const;
    // Makes the file and its folders.
    void Put(const std::string& path, const std::string& content, mode_t mode = 0644) const;

    std::string root;
};

// Runs the body in a child process, which the body does not leave; returns its pid.
pid_t StartChild(const std::function<void()>& body);
// Waits for the child; its exit status, or -1 for one that was killed.
int EndOf(pid_t child);

}  // namespace system_test

#endif
