// Files that are replaced in one step, and what is kept of the old ones.

#include "appliance/base/file.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <csignal>
#include <filesystem>
#include <thread>
#include <vector>

#include "appliance/base/command.h"
#include "tests/appliance/base/temporary_folder.h"
#include "tests/appliance/base/traced_child.h"

using appliance::FileDescriptor;
using appliance::ReadFile;
using appliance::ReplaceFile;
using testing::ElementsAre;
using testing::IsEmpty;

namespace {

class FileTest : public appliance_test::FolderTest {
protected:
    std::string path = folder / "file";

    static struct stat StatOf(const std::string& name) {
        struct stat found = {};
        EXPECT_EQ(lstat(name.c_str(), &found), 0) << name;
        return found;
    }
    static mode_t ModeOf(const std::string& name) {
        return StatOf(name).st_mode & 07777;
    }
};

TEST_F(FileTest, DescriptorsAreClosedOnce) {
    const int number = open("/dev/null", O_RDONLY | O_CLOEXEC);
    {
        FileDescriptor first(number);
        FileDescriptor second(std::move(first));
        EXPECT_FALSE(first);
        EXPECT_EQ(second.get(), number);
        first = std::move(second);
        EXPECT_TRUE(first);
        errno = EIO;
        first.Reset();
        EXPECT_EQ(errno, EIO);
        EXPECT_EQ(fcntl(number, F_GETFD), -1);
    }
    FileDescriptor kept(open("/dev/null", O_RDONLY | O_CLOEXEC));
    const int released = kept.Release();
    EXPECT_FALSE(kept);
    EXPECT_EQ(close(released), 0);
}

TEST_F(FileTest, Read) {
    const std::string bytes("a\0b\n\xFF", 5);
    Put(path, bytes);
    std::string content = "before";
    ASSERT_FALSE(ReadFile(path, content));
    EXPECT_EQ(content, bytes);
    ASSERT_FALSE(ReadFile(path, content, 5));
    EXPECT_EQ(ReadFile(path, content, 4), std::errc::file_too_large);
    EXPECT_EQ(content, bytes);
    EXPECT_EQ(ReadFile(folder / "none", content), std::errc::no_such_file_or_directory);
    EXPECT_EQ(ReadFile(folder.path(), content), std::errc::is_a_directory);
    ASSERT_EQ(mkfifo((folder / "fifo").c_str(), 0600), 0);
    EXPECT_EQ(ReadFile(folder / "fifo", content), std::errc::invalid_argument);
    // Files of the kernel's have no size of their own.
    ASSERT_FALSE(ReadFile("/proc/self/status", content));
    EXPECT_THAT(content, testing::StartsWith("Name:"));
    EXPECT_EQ(ReadFile("/proc/self/status", content, 10), std::errc::file_too_large);
}

TEST_F(FileTest, ANewFileHasTheModeAskedFor) {
    const mode_t before = umask(077);
    EXPECT_FALSE(ReplaceFile(path, "text", 0644));
    umask(before);
    EXPECT_EQ(Got(path), "text");
    EXPECT_EQ(ModeOf(path), 0644U);
    EXPECT_FALSE(ReplaceFile(folder / "own", ""));
    EXPECT_EQ(ModeOf(folder / "own"), 0600U);
    EXPECT_EQ(Got(folder / "own"), "");
    EXPECT_THAT(folder.Names(), ElementsAre("file", "own"));
}

TEST_F(FileTest, TheNewContentHasOwnerModeAndAttributesOfTheOld) {
    Put(path, "old");
    ASSERT_EQ(chown(path.c_str(), 12, 34), 0);
    ASSERT_EQ(chmod(path.c_str(), 02750), 0);
    ASSERT_EQ(setxattr(path.c_str(), "trusted.mark", "value", 5, 0), 0);
    const auto inode = StatOf(path).st_ino;
    ASSERT_FALSE(ReplaceFile(path, "new", 0600));
    EXPECT_EQ(Got(path), "new");
    EXPECT_NE(StatOf(path).st_ino, inode);
    EXPECT_EQ(StatOf(path).st_uid, 12U);
    EXPECT_EQ(StatOf(path).st_gid, 34U);
    EXPECT_EQ(ModeOf(path), 02750U);
    char value[16] = {};
    EXPECT_EQ(getxattr(path.c_str(), "trusted.mark", value, sizeof(value)), 5);
    EXPECT_STREQ(value, "value");
}

TEST_F(FileTest, AccessListsAreKept) {
    Put(path, "old");
    appliance::Command command;
    command.arguments = {"/usr/bin/setfacl", "-m", "u:12:rw", path};
    if (!appliance::Run(command).Succeeded()) {
        FAIL() << "no access lists here";
    }
    ASSERT_FALSE(ReplaceFile(path, "new"));
    command.arguments = {"/usr/bin/getfacl", "-cn", path};
    EXPECT_THAT(appliance::Run(command).output, testing::HasSubstr("user:12:rw-"));
}

TEST_F(FileTest, ASymbolicLinkStaysOne) {
    std::filesystem::create_directory(folder / "deep");
    Put(folder / "deep/real", "old");
    ASSERT_EQ(symlink("deep/link", path.c_str()), 0);
    ASSERT_EQ(symlink("real", (folder / "deep/link").c_str()), 0);
    ASSERT_FALSE(ReplaceFile(path, "new"));
    EXPECT_EQ(Got(folder / "deep/real"), "new");
    EXPECT_TRUE(S_ISLNK(StatOf(path).st_mode));
    EXPECT_TRUE(S_ISLNK(StatOf(folder / "deep/link").st_mode));
    // One that leads nowhere yet.
    ASSERT_EQ(unlink((folder / "deep/real").c_str()), 0);
    ASSERT_FALSE(ReplaceFile(path, "again"));
    EXPECT_EQ(Got(folder / "deep/real"), "again");
    ASSERT_EQ(symlink("circle", (folder / "circle").c_str()), 0);
    EXPECT_EQ(ReplaceFile(folder / "circle", ""), std::errc::too_many_symbolic_link_levels);
}

TEST_F(FileTest, WhatIsNoFileIsNotReplaced) {
    std::filesystem::create_directory(path);
    EXPECT_EQ(ReplaceFile(path, ""), std::errc::is_a_directory);
    EXPECT_EQ(ReplaceFile(path + "/", ""), std::errc::is_a_directory);
    EXPECT_EQ(ReplaceFile("", ""), std::errc::no_such_file_or_directory);
    EXPECT_EQ(ReplaceFile(folder / "none/file", ""), std::errc::no_such_file_or_directory);
    ASSERT_EQ(mkfifo((folder / "fifo").c_str(), 0600), 0);
    EXPECT_EQ(ReplaceFile(folder / "fifo", ""), std::errc::invalid_argument);
    EXPECT_THAT(folder.Names(), ElementsAre("fifo", "file"));
}

TEST_F(FileTest, ReadersSeeOneContentOrTheOther) {
    const std::string first(50000, 'a');
    const std::string second(70000, 'b');
    ASSERT_FALSE(ReplaceFile(path, first));
    const pid_t writer = appliance_test::Fork([&] {
        for (int turn = 0; access((folder / "enough").c_str(), F_OK) != 0; ++turn) {
            if (ReplaceFile(path, turn % 2 == 0 ? second : first)) {
                return false;
            }
        }
        return true;
    });
    int seen[] = {0, 0};
    while (seen[0] < 50 || seen[1] < 50) {
        std::string content;
        ASSERT_FALSE(ReadFile(path, content));
        ASSERT_TRUE(content == first || content == second);
        ++seen[content == first ? 0 : 1];
    }
    Put(folder / "enough", "");
    EXPECT_EQ(appliance_test::WaitFor(writer), 0);
    unlink((folder / "enough").c_str());
    EXPECT_THAT(folder.Names(), ElementsAre("file"));
}

TEST_F(FileTest, ReplaceLikeAnother) {
    Put(folder / "model", "");
    ASSERT_EQ(chmod((folder / "model").c_str(), 0640), 0);
    Put(path, "old");
    ASSERT_FALSE(appliance::ReplaceFileLike(path, "new", folder / "model", 0600));
    EXPECT_EQ(ModeOf(path), 0640U);
    ASSERT_FALSE(appliance::ReplaceFileLike(path, "newer", folder / "none", 0604));
    EXPECT_EQ(ModeOf(path), 0604U);
    EXPECT_EQ(Got(path), "newer");
}

TEST_F(FileTest, TemporaryNames) {
    std::string first;
    std::string second;
    const FileDescriptor one = appliance::MakeTemporary(path, first);
    const FileDescriptor other = appliance::MakeTemporary(path, second);
    ASSERT_TRUE(one && other);
    EXPECT_NE(first, second);
    EXPECT_EQ(ModeOf(first), 0600U);
    EXPECT_EQ(appliance::TemporaryTarget(first), path);
    EXPECT_EQ(appliance::TemporaryTarget(".a.vorn-abcDE1"), "a");
    EXPECT_EQ(appliance::TemporaryTarget("/x/.a.b.vorn-abcDE1.vorn-000000"), "/x/a.b.vorn-abcDE1");
    for (const char* name : {"", "a", "a.vorn-abcDE1", ".vorn-abcDE1", "..vorn-abcDE1", ".a.vorn-abcDE",
                             ".a.vorn-abcD-1", ".a.backup", ".a.vorn-abcDE12", "/.a.vorn-abcDE1/b"}) {
        EXPECT_EQ(appliance::TemporaryTarget(name), "") << name;
    }
    FileDescriptor none = appliance::MakeTemporary(folder / "none/file", first);
    EXPECT_FALSE(none);
    EXPECT_EQ(errno, ENOENT);
}

TEST_F(FileTest, StaleTemporariesGo) {
    std::string left;
    std::string held;
    appliance::MakeTemporary(path, left);
    FileDescriptor writer = appliance::MakeTemporary(path, held);
    Put(folder / ".hidden.backup", "");
    std::filesystem::create_directory(folder / ".folder.vorn-aaaaaa");
    std::filesystem::create_symlink(folder / ".hidden.backup", folder / ".link.vorn-aaaaaa");
    EXPECT_EQ(appliance::RemoveStaleTemporaries(folder.path()), 1);
    EXPECT_EQ(Got(left), "<missing>");
    EXPECT_EQ(Got(held), "");
    writer.Reset();
    EXPECT_EQ(appliance::RemoveStaleTemporaries(folder.path()), 1);
    EXPECT_EQ(appliance::RemoveStaleTemporaries(folder / "none"), 0);
    EXPECT_THAT(folder.Names(), ElementsAre(".folder.vorn-aaaaaa", ".hidden.backup", ".link.vorn-aaaaaa"));
}

// A writer whose new file was taken for one that was left behind makes another one.
TEST_F(FileTest, TemporariesOutliveARemovalBesideThem) {
    std::atomic<bool> done = false;
    std::thread remover([&] {
        while (!done) {
            appliance::RemoveStaleTemporaries(folder.path());
        }
    });
    int lost = 0;
    for (int i = 0; i < 2000; ++i) {
        std::string name;
        const FileDescriptor writer = appliance::MakeTemporary(path, name);
        lost += writer && rename(name.c_str(), path.c_str()) == 0 ? 0 : 1;
    }
    done = true;
    remover.join();
    EXPECT_EQ(lost, 0);
}

TEST_F(FileTest, RenameAndRemove) {
    Put(path, "new");
    Put(folder / "to", "old");
    EXPECT_FALSE(appliance::RenameFile(path, folder / "to"));
    EXPECT_EQ(Got(folder / "to"), "new");
    EXPECT_EQ(appliance::RenameFile(path, folder / "to"), std::errc::no_such_file_or_directory);
    EXPECT_EQ(Got(folder / "to"), "new");
    EXPECT_FALSE(appliance::RemoveFile(folder / "to"));
    EXPECT_FALSE(appliance::RemoveFile(folder / "to"));
    std::filesystem::create_directory(path);
    EXPECT_TRUE(appliance::RemoveFile(path));
    EXPECT_THAT(folder.Names(), ElementsAre("file"));
}

TEST_F(FileTest, Folders) {
    const mode_t before = umask(077);
    EXPECT_FALSE(appliance::MakeFolder(folder / "a/b/c/", 0750));
    umask(before);
    EXPECT_EQ(ModeOf(folder / "a/b/c"), 0750U);
    EXPECT_FALSE(appliance::MakeFolder(folder / "a/b/c", 0700));
    EXPECT_EQ(ModeOf(folder / "a/b/c"), 0700U);
    Put(path, "");
    EXPECT_EQ(appliance::MakeFolder(path, 0700), std::errc::not_a_directory);
    EXPECT_EQ(appliance::MakeFolder(path + "/below", 0700), std::errc::not_a_directory);
    EXPECT_TRUE(appliance::MakeFolder("", 0700));
}

// A power cut is told from a killed writer by what has reached the disk: the content before the name, and the name before
// the answer.
TEST_F(FileTest, TheDiskHasTheContentBeforeTheName) {
    Put(path, "old");
    const auto replace = [&] { return !ReplaceFile(path, "new"); };
    std::vector<long> calls = appliance_test::CallsOf(replace, replace);
    const auto isOther = [](long call) { return call != SYS_write && call != SYS_fsync && call != SYS_rename; };
    calls.erase(std::remove_if(calls.begin(), calls.end(), isOther), calls.end());
    EXPECT_THAT(calls, ElementsAre(SYS_write, SYS_fsync, SYS_rename, SYS_fsync));
}

TEST_F(FileTest, FolderAndName) {
    EXPECT_EQ(appliance::FolderOf("/a/b"), "/a");
    EXPECT_EQ(appliance::FolderOf("/a"), "/");
    EXPECT_EQ(appliance::FolderOf("a"), ".");
    EXPECT_EQ(appliance::NameOf("/a/b"), "b");
    EXPECT_EQ(appliance::NameOf("a"), "a");
    EXPECT_EQ(appliance::NameOf("/a/"), "");
}

}  // namespace
