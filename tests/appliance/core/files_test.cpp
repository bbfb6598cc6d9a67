// Plain files, temporary names, pid files.

#include <fcntl.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <functional>
#include <set>
#include <vector>

#include "appliance/base/file.h"
#include "tests/appliance/core/core_test.h"

using appliance_test::Fork;
using appliance_test::WaitFor;
using testing::ElementsAre;

namespace {

class FilesTest : public appliance_test::CoreTest {
protected:
    std::string path = folder / "file";

    static struct stat StatOf(const std::string& name) {
        struct stat found = {};
        EXPECT_EQ(lstat(name.c_str(), &found), 0) << name;
        return found;
    }
    std::string Temporary() {
        char name[4095] = {};
        EXPECT_EQ(VLIBCFileITmpName(path.c_str(), name, sizeof(name)), 0);
        return name;
    }
};

TEST_F(FilesTest, TemporaryNamesAreFreshAndBeside) {
    std::set<std::string> names;
    for (int turn = 0; turn < 20; ++turn) {
        const std::string name = Temporary();
        EXPECT_EQ(appliance::FolderOf(name), folder.path());
        EXPECT_EQ(appliance::TemporaryTarget(name), path);
        EXPECT_EQ(StatOf(name).st_mode, static_cast<mode_t>(S_IFREG | 0600));
        names.insert(name);
    }
    EXPECT_EQ(names.size(), 20U);
    EXPECT_EQ(Got(path), "<missing>");
}

TEST_F(FilesTest, NoTemporaryName) {
    char name[4095] = {};
    EXPECT_FAILS(VLIBCFileITmpName((folder / "none/file").c_str(), name, sizeof(name)), -1, FileWrite);
    EXPECT_FAILS(VLIBCFileITmpName(path.c_str(), name, 10), -1, BadArgument);
    EXPECT_FAILS(VLIBCFileITmpName(path.c_str(), name, 0), -1, BadArgument);
    EXPECT_FAILS(VLIBCFileITmpName(path.c_str(), nullptr, 10), -1, BadArgument);
    EXPECT_FAILS(VLIBCFileITmpName(nullptr, name, 10), -1, BadArgument);
    EXPECT_THAT(folder.Names(), testing::IsEmpty());
}

TEST_F(FilesTest, Exist) {
    EXPECT_EQ(VLIBCFileExist(path.c_str()), 0);
    EXPECT_EQ(VLIBCFileExist(nullptr), 0);
    Put(path, "");
    EXPECT_NE(VLIBCFileExist(path.c_str()), 0);
    EXPECT_NE(VLIBCFileExist(folder.path().c_str()), 0);
    ASSERT_EQ(symlink("file", (folder / "link").c_str()), 0);
    EXPECT_NE(VLIBCFileExist((folder / "link").c_str()), 0);
    ASSERT_EQ(unlink(path.c_str()), 0);
    EXPECT_EQ(VLIBCFileExist((folder / "link").c_str()), 0);
}

TEST_F(FilesTest, TouchMakesAFileAndSetsItsTimes) {
    EXPECT_SUCCEEDS(VLIBCFileTouch(path.c_str()), 0);
    EXPECT_EQ(Got(path), "");
    EXPECT_EQ(StatOf(path).st_uid, 0U);
    Put(path, "content");
    const timespec times[2] = {{1000, 0}, {1000, 0}};
    ASSERT_EQ(utimensat(AT_FDCWD, path.c_str(), times, 0), 0);
    EXPECT_SUCCEEDS(VLIBCFileTouch(path.c_str()), 0);
    EXPECT_EQ(Got(path), "content");
    EXPECT_GT(StatOf(path).st_mtime, time(nullptr) - 10);
    EXPECT_GT(StatOf(path).st_atime, time(nullptr) - 10);
}

TEST_F(FilesTest, TouchFollowsNoLinkAndTakesNoForeignFile) {
    ASSERT_EQ(symlink("target", path.c_str()), 0);
    EXPECT_FAILS(VLIBCFileTouch(path.c_str()), -1, FileWrite);
    EXPECT_EQ(Got(folder / "target"), "<missing>");
    const std::string foreign = folder / "foreign";
    Put(foreign, "");
    ASSERT_EQ(chown(foreign.c_str(), 1, 1), 0);
    EXPECT_FAILS(VLIBCFileTouch(foreign.c_str()), -1, BadData);
    EXPECT_FAILS(VLIBCFileTouch(folder.path().c_str()), -1, FileWrite);
    ASSERT_EQ(mkfifo((folder / "fifo").c_str(), 0600), 0);
    VLIBCErrSetEx(0, "", 0);
    EXPECT_EQ(VLIBCFileTouch((folder / "fifo").c_str()), -1);
    EXPECT_NE(VLIBCErrGet(), 0);
    EXPECT_FAILS(VLIBCFileTouch((folder / "none/file").c_str()), -1, FileWrite);
    EXPECT_FAILS(VLIBCFileTouch(nullptr), -1, BadArgument);
}

// Where everybody may make files, as in /tmp, no other user can keep the appliance from its own.
TEST_F(FilesTest, TouchReplacesWhatAnotherUserPutIntoASharedFolder) {
    ASSERT_EQ(chmod(folder.path().c_str(), 01777), 0);
    Put(folder / "victim", "text");
    const timespec old[2] = {{1000, 0}, {1000, 0}};
    ASSERT_EQ(utimensat(AT_FDCWD, (folder / "victim").c_str(), old, 0), 0);
    const std::vector<std::function<int()>> makers = {
        [&] {
            Put(path, "foreign");
            return 0;
        },
        [&] { return symlink("victim", path.c_str()); },
        [&] { return symlink("nothing", path.c_str()); },
        [&] { return mkfifo(path.c_str(), 0666); },
    };
    for (const auto& make : makers) {
        ASSERT_EQ(make(), 0);
        ASSERT_EQ(lchown(path.c_str(), 1, 1), 0);
        EXPECT_SUCCEEDS(VLIBCFileTouch(path.c_str()), 0);
        EXPECT_EQ(Got(path), "");
        EXPECT_EQ(StatOf(path).st_mode, static_cast<mode_t>(S_IFREG | 0644));
        EXPECT_EQ(StatOf(path).st_uid, 0U);
        EXPECT_THAT(folder.Names(), ElementsAre("file", "victim"));
        ASSERT_EQ(unlink(path.c_str()), 0);
    }
    EXPECT_EQ(Got(folder / "victim"), "text");
    EXPECT_EQ(StatOf(folder / "victim").st_mtime, 1000);
}

TEST_F(FilesTest, TouchPutsAnotherUsersFolderAside) {
    ASSERT_EQ(chmod(folder.path().c_str(), 01777), 0);
    std::filesystem::create_directory(path);
    Put(path + "/kept", "text");
    ASSERT_EQ(chown(path.c_str(), 1, 1), 0);
    EXPECT_SUCCEEDS(VLIBCFileTouch(path.c_str()), 0);
    EXPECT_EQ(Got(path), "");
    ASSERT_EQ(folder.Names().size(), 2U);
    const std::string aside = folder / folder.Names()[1];
    EXPECT_EQ(Got(aside + "/kept"), "text");
    EXPECT_EQ(StatOf(aside).st_uid, 1U);
}

// What the appliance's own user has put there is for an administrator to look at.
TEST_F(FilesTest, TouchLeavesTheOwnUsersThingsInASharedFolder) {
    ASSERT_EQ(chmod(folder.path().c_str(), 01777), 0);
    ASSERT_EQ(symlink("target", path.c_str()), 0);
    EXPECT_FAILS(VLIBCFileTouch(path.c_str()), -1, FileWrite);
    std::filesystem::create_directory(folder / "folder");
    EXPECT_FAILS(VLIBCFileTouch((folder / "folder").c_str()), -1, FileWrite);
    EXPECT_THAT(folder.Names(), ElementsAre("file", "folder"));
}

TEST_F(FilesTest, RenameReplacesTheTarget) {
    Put(path, "old");
    const std::string from = Temporary();
    Put(from, "new");
    EXPECT_SUCCEEDS(VLIBCSysRename(from.c_str(), path.c_str()), 0);
    EXPECT_EQ(Got(path), "new");
    EXPECT_THAT(folder.Names(), ElementsAre("file"));
}

TEST_F(FilesTest, RenameCarriesOwnerAndModeOfTheTarget) {
    Put(path, "old");
    ASSERT_EQ(chown(path.c_str(), 12, 34), 0);
    ASSERT_EQ(chmod(path.c_str(), 0640), 0);
    Put(folder / "from", "new");
    EXPECT_EQ(VLIBCSysRename((folder / "from").c_str(), path.c_str()), 0);
    EXPECT_EQ(Got(path), "new");
    EXPECT_EQ(StatOf(path).st_uid, 12U);
    EXPECT_EQ(StatOf(path).st_gid, 34U);
    EXPECT_EQ(StatOf(path).st_mode & 07777, 0640U);
    // A file that is new keeps its own.
    Put(folder / "from", "new");
    ASSERT_EQ(chmod((folder / "from").c_str(), 0604), 0);
    EXPECT_EQ(VLIBCSysRename((folder / "from").c_str(), (folder / "to").c_str()), 0);
    EXPECT_EQ(StatOf(folder / "to").st_mode & 07777, 0604U);
}

TEST_F(FilesTest, AFailedRenameLeavesTheTarget) {
    Put(path, "old");
    EXPECT_FAILS(VLIBCSysRename((folder / "none").c_str(), path.c_str()), -1, NotFound);
    ASSERT_EQ(symlink("file", (folder / "link").c_str()), 0);
    EXPECT_FAILS(VLIBCSysRename((folder / "link").c_str(), path.c_str()), -1, FileWrite);
    std::filesystem::create_directory(folder / "folder");
    EXPECT_FAILS(VLIBCSysRename((folder / "folder").c_str(), path.c_str()), -1, FileWrite);
    EXPECT_EQ(Got(path), "old");
    Put(folder / "from", "new");
    EXPECT_FAILS(VLIBCSysRename((folder / "from").c_str(), (folder / "folder").c_str()), -1, FileWrite);
    EXPECT_FAILS(VLIBCSysRename((folder / "from").c_str(), (folder / "none/to").c_str()), -1, NotFound);
    EXPECT_FAILS(VLIBCSysRename(nullptr, path.c_str()), -1, BadArgument);
    EXPECT_FAILS(VLIBCSysRename(path.c_str(), nullptr), -1, BadArgument);
    EXPECT_EQ(Got(folder / "from"), "new");
}

TEST_F(FilesTest, RenameFollowsALinkAtTheTarget) {
    Put(folder / "real", "old");
    ASSERT_EQ(symlink("real", path.c_str()), 0);
    const std::string from = Temporary();
    Put(from, "new");
    EXPECT_SUCCEEDS(VLIBCSysRename(from.c_str(), path.c_str()), 0);
    EXPECT_EQ(Got(folder / "real"), "new");
    EXPECT_TRUE(S_ISLNK(StatOf(path).st_mode));
    EXPECT_THAT(folder.Names(), ElementsAre("file", "real"));
}

TEST_F(FilesTest, RenameFollowsALinkToAnotherFileSystem) {
    std::filesystem::create_directory(folder / "other");
    ASSERT_EQ(symlink("other/real", path.c_str()), 0);
    const int done = WaitFor(Fork([&] {
        if (unshare(CLONE_NEWNS) != 0 || mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0 ||
            mount("tmpfs", (folder / "other").c_str(), "tmpfs", 0, "size=64k") != 0) {
            _exit(77);
        }
        Put(folder / "other/real", "old");
        chmod((folder / "other/real").c_str(), 0640);
        const std::string from = Temporary();
        Put(from, "new");
        return VLIBCSysRename(from.c_str(), path.c_str()) == 0 && Got(folder / "other/real") == "new" &&
               (StatOf(folder / "other/real").st_mode & 07777) == 0640 && Got(from) == "<missing>" &&
               S_ISLNK(StatOf(path).st_mode);
    }));
    if (done == 77) {
        FAIL() << "no mount namespace here";
    }
    EXPECT_EQ(done, 0);
}

TEST_F(FilesTest, Remove) {
    Put(path, "");
    ASSERT_EQ(symlink("file", (folder / "link").c_str()), 0);
    EXPECT_SUCCEEDS(VLIBCSysRemove((folder / "link").c_str()), 0);
    EXPECT_EQ(Got(path), "");
    EXPECT_SUCCEEDS(VLIBCSysRemove(path.c_str()), 0);
    EXPECT_FAILS(VLIBCSysRemove(path.c_str()), -1, NotFound);
    EXPECT_FAILS(VLIBCSysRemove(folder.path().c_str()), -1, FileWrite);
    EXPECT_FAILS(VLIBCSysRemove(nullptr), -1, BadArgument);
}

TEST_F(FilesTest, PidFiles) {
    EXPECT_FAILS(VLIBCReadPidFile(path.c_str()), -1, NotFound);
    Put(path, "0\n");
    EXPECT_FAILS(VLIBCReadPidFile(path.c_str()), -1, NotFound);
    Put(path, std::to_string(getpid()));
    EXPECT_SUCCEEDS(VLIBCReadPidFile(path.c_str()), getpid());
    EXPECT_FAILS(VLIBCReadPidFile(nullptr), -1, BadArgument);
}

}  // namespace
