// Files that exist, are touched, renamed and removed; pid files.

#include <fcntl.h>
#include <signal.h>
#include <sys/stat.h>
#include <unistd.h>

#include <ctime>

#include "contract_test.h"

using contract::ReadFile;

namespace {

class PlainFiles : public testing::Test {
protected:
    std::string Pid(const std::string& content) {
        return folder.Put("pid", content);
    }

    contract::Folder folder;
};

TEST_F(PlainFiles, ExistOrNot) {
    EXPECT_NE(VLIBCFileExist(folder.Put("file", "").c_str()), 0);
    EXPECT_NE(VLIBCFileExist((folder / "").c_str()), 0) << "a folder";
    EXPECT_EQ(VLIBCFileExist((folder / "none").c_str()), 0);
    EXPECT_EQ(VLIBCFileExist((folder / "file/none").c_str()), 0);
    EXPECT_EQ(VLIBCFileExist(""), 0);
    EXPECT_EQ(VLIBCFileExist((folder / std::string(5000, 'x')).c_str()), 0);
}

TEST_F(PlainFiles, TouchMakesAnEmptyFile) {
    ASSERT_GE(SUCCEEDING(VLIBCFileTouch((folder / "new").c_str())), 0);
    EXPECT_EQ(ReadFile(folder / "new"), "");
}

TEST_F(PlainFiles, TouchKeepsTheContentAndSetsTheTime) {
    const std::string path = folder.Put("file", "content");
    const timespec old[] = {{1000000, 0}, {1000000, 0}};
    ASSERT_EQ(utimensat(AT_FDCWD, path.c_str(), old, 0), 0);
    const std::time_t before = std::time(nullptr);
    ASSERT_GE(VLIBCFileTouch(path.c_str()), 0);
    struct stat found {};
    ASSERT_EQ(stat(path.c_str(), &found), 0);
    EXPECT_GE(found.st_mtime, before - 1);
    EXPECT_LE(found.st_mtime, std::time(nullptr) + 1);
    EXPECT_EQ(ReadFile(path), "content");
}

TEST_F(PlainFiles, TouchFailsWithoutAFolder) {
    EXPECT_EQ(FAILING(VLIBCFileTouch((folder / "none/file").c_str())), -1);
}

TEST_F(PlainFiles, RenameReplacesItsTarget) {
    const std::string from = folder.Put("from", "new");
    const std::string to = folder.Put("to", "old");
    ASSERT_EQ(SUCCEEDING(VLIBCSysRename(from.c_str(), to.c_str())), 0);
    EXPECT_EQ(ReadFile(to), "new");
    EXPECT_EQ(ReadFile(from), "(missing)");
}

TEST_F(PlainFiles, RenameNeedsNoTarget) {
    const std::string from = folder.Put("from", "new");
    ASSERT_EQ(VLIBCSysRename(from.c_str(), (folder / "to").c_str()), 0);
    EXPECT_EQ(ReadFile(folder / "to"), "new");
}

TEST_F(PlainFiles, ARenameThatFailsLeavesBoth) {
    const std::string to = folder.Put("to", "old");
    EXPECT_NE(FAILING(VLIBCSysRename((folder / "none").c_str(), to.c_str())), 0);
    EXPECT_EQ(ReadFile(to), "old");
    EXPECT_NE(FAILING(VLIBCSysRename(to.c_str(), (folder / "none/to").c_str())), 0);
    EXPECT_EQ(ReadFile(to), "old");
}

// A reader sees the old content or the new one, whole, and never none.
TEST_F(PlainFiles, RenameIsOneStepForAReader) {
    constexpr int kRounds = 300;
    const std::string to = folder.Put("to", std::string(1000, 'a'));
    const pid_t writer = contract::Fork([&] {
        for (int round = 0; round < kRounds; ++round) {
            const std::string from = folder.Put("from", std::string(1000, round % 2 == 0 ? 'b' : 'a'));
            if (VLIBCSysRename(from.c_str(), to.c_str()) != 0) {
                return false;
            }
        }
        contract::WriteFile(folder / "done", "");
        return true;
    });
    int reads = 0;
    EXPECT_TRUE(contract::Eventually([&] {
        const std::string content = ReadFile(to);
        EXPECT_TRUE(content == std::string(1000, 'a') || content == std::string(1000, 'b')) << content.substr(0, 20);
        ++reads;
        return ReadFile(folder / "done").empty() || testing::Test::HasFailure();
    }));
    EXPECT_EQ(contract::Await(writer), 0);
    EXPECT_GT(reads, 0);
}

TEST_F(PlainFiles, RemoveRemoves) {
    const std::string path = folder.Put("file", "content");
    ASSERT_GE(SUCCEEDING(VLIBCSysRemove(path.c_str())), 0);
    EXPECT_EQ(ReadFile(path), "(missing)");
    EXPECT_EQ(FAILING(VLIBCSysRemove(path.c_str())), -1) << "a second time";
}

TEST_F(PlainFiles, APidFileNamesALiveProcess) {
    const std::string own = std::to_string(getpid());
    EXPECT_EQ(SUCCEEDING(VLIBCReadPidFile(Pid(own + "\n").c_str())), getpid());
    EXPECT_EQ(VLIBCReadPidFile(Pid(own).c_str()), getpid()) << "without a line feed";
}

TEST_F(PlainFiles, APidFileOfAnotherProcess) {
    const pid_t child = contract::Fork([] {
        for (int round = 0; round < 60; ++round) {
            sleep(1);
        }
        return true;
    });
    const std::string path = Pid(std::to_string(child) + "\n");
    EXPECT_EQ(VLIBCReadPidFile(path.c_str()), child);
    kill(child, SIGKILL);
    EXPECT_EQ(contract::Await(child), 1000 + SIGKILL);
    EXPECT_EQ(FAILING(VLIBCReadPidFile(path.c_str())), -1) << "the process has ended";
}

TEST_F(PlainFiles, APidFileThatNamesNone) {
    EXPECT_EQ(FAILING(VLIBCReadPidFile((folder / "none").c_str())), -1);
    EXPECT_EQ(FAILING(VLIBCReadPidFile((folder / "").c_str())), -1) << "a folder";
    for (const char* content :
         {"", "\n", "0\n", "-1\n", "nonsense\n", "99999999999999999999\n", "2147483646\n", "x1\n"}) {
        EXPECT_EQ(FAILING(VLIBCReadPidFile(Pid(content).c_str())), -1) << content;
    }
    EXPECT_EQ(VLIBCReadPidFile(Pid("-" + std::to_string(getpid())).c_str()), -1);
    EXPECT_EQ(VLIBCReadPidFile(Pid(std::string(100000, '1')).c_str()), -1);
}

}  // namespace
