// A folder for one test, gone with all that is in it when the test ends.

#ifndef VORN_TESTS_APPLIANCE_BASE_TEMPORARY_FOLDER_H
#define VORN_TESTS_APPLIANCE_BASE_TEMPORARY_FOLDER_H

#include <gtest/gtest.h>

#include <sys/types.h>

#include <functional>
#include <string>
#include <vector>

namespace appliance_test {

class TemporaryFolder {
public:
    TemporaryFolder();
    ~TemporaryFolder();
    TemporaryFolder(const TemporaryFolder&) = delete;
    TemporaryFolder& operator=(const TemporaryFolder&) = delete;

    const std::string& path() const {
        return path_;
    }
    std::string operator/(const std::string& name) const {
        return path_ + "/" + name;
    }

    // The names of its entries, sorted.
    std::vector<std::string> Names() const;

private:
    std::string path_;
};

// A test with such a folder, which is also the appliance's root while the test runs.
class FolderTest : public testing::Test {
protected:
    FolderTest();
    ~FolderTest() override;

    // Writes a file as plainly as can be, and reads one; a missing one is "<missing>".
    static void Put(const std::string& path, const std::string& content);
    static std::string Got(const std::string& path);

    TemporaryFolder folder;
};

// Forks; the child does `work` and exits with 0, or with 1 when `work` answers false. It never comes back from here.
pid_t Fork(const std::function<bool()>& work);

// Waits for the child's end, at most 10 s. The exit status, or 1000 plus the signal.
int WaitFor(pid_t child);

// Asks again and again until it holds, at most 10 s.
bool Eventually(const std::function<bool()>& holds);

}  // namespace appliance_test

#endif
