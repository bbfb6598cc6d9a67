// Writing to a disk that is full, and to one that can only be read: the old file stands, and nothing else is left.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/resource.h>
#include <unistd.h>

#include <csignal>
#include <functional>

#include "appliance/base/conf_file.h"
#include "appliance/base/file.h"
#include "appliance/base/process.h"
#include "appliance/base/settings.h"
#include "tests/appliance/base/temporary_folder.h"

using appliance::ReplaceFile;
using appliance_test::Fork;
using appliance_test::WaitFor;

namespace {

constexpr int kNoNamespace = 77;

class SmallDiskTest : public appliance_test::FolderTest {
protected:
    // Does the work in a mount namespace of its own, with a file system of 64 KiB at the test's folder. `options` are
    // those of a remount that follows `before`.
    int OnSmallDisk(const std::function<void()>& before, unsigned long options, const std::function<bool()>& work) {
        return WaitFor(Fork([&] {
            if (unshare(CLONE_NEWNS) != 0 || mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0 ||
                mount("tmpfs", folder.path().c_str(), "tmpfs", 0, "size=64k") != 0) {
                _exit(kNoNamespace);
            }
            before();
            if (options != 0 && mount(nullptr, folder.path().c_str(), nullptr, MS_REMOUNT | options, "size=64k") != 0) {
                _exit(kNoNamespace);
            }
            return work();
        }));
    }
};

TEST_F(SmallDiskTest, Full) {
    const std::string path = folder / "file";
    const int done = OnSmallDisk([&] { Put(path, "old"); }, 0,
                                 [&] {
                                     const std::string tooMuch(100000, 'x');
                                     return ReplaceFile(path, tooMuch) == std::errc::no_space_on_device &&
                                            Got(path) == "old" && folder.Names().size() == 1 &&
                                            !ReplaceFile(path, "new") && Got(path) == "new";
                                 });
    if (done == kNoNamespace) {
        FAIL() << "no mount namespace here";
    }
    EXPECT_EQ(done, 0);
}

TEST_F(SmallDiskTest, ReadOnly) {
    const std::string path = folder / "file";
    const int done = OnSmallDisk([&] { Put(path, "old"); }, MS_RDONLY,
                                 [&] {
                                     appliance::ConfFile file("a=1\n");
                                     return ReplaceFile(path, "new") == std::errc::read_only_file_system &&
                                            file.Save(path) == std::errc::read_only_file_system &&
                                            appliance::SetSetting("a", "1") &&
                                            appliance::RemoveFile(path) == std::errc::read_only_file_system &&
                                            !appliance::WritePidFile(folder / "pid") && Got(path) == "old" &&
                                            folder.Names().size() == 1;
                                 });
    if (done == kNoNamespace) {
        FAIL() << "no mount namespace here";
    }
    EXPECT_EQ(done, 0);
}

TEST_F(SmallDiskTest, LimitedFileSize) {
    const std::string path = folder / "file";
    Put(path, "old");
    const int done = WaitFor(Fork([&] {
        signal(SIGXFSZ, SIG_IGN);
        const rlimit few = {1000, 1000};
        setrlimit(RLIMIT_FSIZE, &few);
        return ReplaceFile(path, std::string(1001, 'x')) == std::errc::file_too_large && Got(path) == "old" &&
               !ReplaceFile(path, std::string(1000, 'y'));
    }));
    EXPECT_EQ(done, 0);
    EXPECT_EQ(Got(path), std::string(1000, 'y'));
    EXPECT_THAT(folder.Names(), testing::ElementsAre("file"));
}

}  // namespace
