#include <gtest/gtest.h>
#include <sys/stat.h>

#include <chrono>
#include <string>
#include <thread>

#include "appliance/base/clock.h"
#include "tests/appliance/base/temporary_folder.h"

namespace {

using std::chrono::milliseconds;
using std::chrono::system_clock;

class FileTimeTest : public appliance_test::FolderTest {};

// What has just been written is never in the future, also where one second becomes the next.
TEST_F(FileTimeTest, IsNotAheadOfTheClock) {
    const std::string path = folder / "file";
    const auto next = std::chrono::ceil<std::chrono::seconds>(system_clock::now() + milliseconds(20));
    std::this_thread::sleep_until(next - milliseconds(10));
    std::time_t last = 0;
    while (last < system_clock::to_time_t(next)) {
        Put(path, "x");
        struct stat written = {};
        ASSERT_EQ(stat(path.c_str(), &written), 0);
        last = written.st_mtime;
        ASSERT_LE(last, appliance::TimeNow());
    }
}

}  // namespace
