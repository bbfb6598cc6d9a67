#include "appliance/base/file_time.h"

#include <gtest/gtest.h>

#include <string>

#include "tests/appliance/base/temporary_folder.h"

namespace {

using appliance::Moment;
using appliance::WrittenAt;
using std::chrono::system_clock;

class FileTimeTest : public appliance_test::FolderTest {};

// A tick is at most 10 ms long, and the kernel may stamp a file with the last one.
constexpr std::chrono::milliseconds kTwoTicks{20};

TEST_F(FileTimeTest, WhatIsWrittenIsNeverInTheFuture) {
    const std::string path = folder / "file";
    const Moment end = system_clock::now() + 2 * kTwoTicks;
    for (Moment before = system_clock::now(); before < end; before = system_clock::now()) {
        Put(path, "x");
        struct stat written = {};
        ASSERT_EQ(stat(path.c_str(), &written), 0);
        ASSERT_LE(WrittenAt(written), system_clock::now());
        ASSERT_GE(WrittenAt(written), before - kTwoTicks);
    }
}

TEST_F(FileTimeTest, IsToldToTheNanosecond) {
    struct stat file = {};
    file.st_mtim = {1764000000, 123456789};
    EXPECT_EQ(WrittenAt(file).time_since_epoch().count(), 1764000000123456789);
    file.st_mtim.tv_nsec += 1;
    EXPECT_EQ(WrittenAt(file).time_since_epoch().count(), 1764000000123456790);
}

}  // namespace
