// A writer that is killed at each of its system calls: afterwards the old file stands or the new one, whole.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/syscall.h>

#include <algorithm>
#include <functional>
#include <set>

#include "appliance/base/conf_file.h"
#include "appliance/base/file.h"
#include "appliance/base/settings.h"
#include "tests/appliance/base/temporary_folder.h"
#include "tests/appliance/base/traced_child.h"

using appliance_test::KilledAtCall;

namespace {

class WriterKilledTest : public appliance_test::FolderTest {
protected:
    // Kills the writer at its first system call, at its second one, and so on, until it comes to its end. The contents
    // that were found afterwards.
    std::set<std::string> ContentsAfter(const std::string& path, const std::string& old,
                                        const std::function<bool()>& writer) {
        std::set<std::string> contents;
        for (int calls = 0; calls < 2000; ++calls) {
            Put(path, old);
            const bool killed = KilledAtCall(calls, writer);
            contents.insert(Got(path));
            // Whatever it left behind is swept away, and no reader ever took it for the file.
            appliance::RemoveStaleTemporaries(appliance::FolderOf(path));
            EXPECT_EQ(Got(path), *contents.find(Got(path)));
            if (!killed) {
                return contents;
            }
        }
        ADD_FAILURE() << "the writer does not end";
        return contents;
    }
};

TEST_F(WriterKilledTest, ReplaceFile) {
    const std::string old(3000, 'o');
    const std::string fresh(200000, 'n');
    const std::string path = folder / "file";
    const auto contents = ContentsAfter(path, old, [&] { return !appliance::ReplaceFile(path, fresh); });
    EXPECT_EQ(contents, (std::set<std::string>{old, fresh}));
    EXPECT_THAT(folder.Names(), testing::ElementsAre("file"));
}

// A power cut is told from a killed writer by what has reached the disk: the content before the name, and the name before
// the answer.
TEST_F(WriterKilledTest, TheDiskHasTheContentBeforeTheName) {
    const std::string path = folder / "file";
    Put(path, "old");
    const auto replace = [&] { return !appliance::ReplaceFile(path, "new"); };
    std::vector<long> calls = appliance_test::CallsOf(replace, replace);
    const auto isOther = [](long call) { return call != SYS_write && call != SYS_fsync && call != SYS_rename; };
    calls.erase(std::remove_if(calls.begin(), calls.end(), isOther), calls.end());
    EXPECT_THAT(calls, testing::ElementsAre(SYS_write, SYS_fsync, SYS_rename, SYS_fsync));
}

TEST_F(WriterKilledTest, ConfFile) {
    const std::string old = "# kept\n[global]\n    a=1\n    b=2\n";
    const std::string path = folder / "file";
    const auto contents = ContentsAfter(path, old, [&] {
        appliance::ConfFile file;
        return !appliance::ConfFile::Load(path, file) && file.Set("global", "b", "3") && !file.Save(path);
    });
    EXPECT_EQ(contents, (std::set<std::string>{old, "# kept\n[global]\n    a=1\n    b=3\n"}));
}

}  // namespace
