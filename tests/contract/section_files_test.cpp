// Sections loaded and written, and the temporary names by which a file is replaced in one step.

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <mutex>
#include <set>
#include <sstream>

#include "contract_test.h"

using contract::GuardedBuffer;
using contract::Hash;
using contract::ReadFile;

namespace {

constexpr const char* kLine = "    %s=%s\n";
constexpr int kPathSize = 4095;

std::string TemporaryFor(const std::string& path) {
    GuardedBuffer name(kPathSize);
    EXPECT_GE(VLIBCFileITmpName(path.c_str(), name.data(), name.size()), 0);
    EXPECT_TRUE(name.GuardsStand());
    return name.IsTerminated() ? name.Text() : "";
}

class SectionFiles : public testing::Test {
protected:
    // Loads section "global" of a file with this content.
    void Load(const std::string& content, Hash& hash) {
        const std::string path = folder.Put("file.conf", content);
        ASSERT_GE(SUCCEEDING(VLIBCFileGetSection(path.c_str(), "global", &hash.hash)), 0);
        ASSERT_NE(hash.hash, nullptr);
    }
    static bool Write(const std::string& path, Hash& hash) {
        return VLIBCFileAddSection(path.c_str(), "global", hash.hash, kLine) != 0;
    }
    static bool HasLine(const std::string& text, const std::string& wanted) {
        std::istringstream lines(text);
        for (std::string line; std::getline(lines, line);) {
            if (line == wanted) {
                return true;
            }
        }
        return false;
    }

    contract::Folder folder;
};

TEST_F(SectionFiles, LoadsTheKeysOfASection) {
    Hash hash;
    Load("[other]\nkey=wrong\n[global]\n    key = value \n    register nic=eth0,eth1\n[third]\nkey=wrong\n", hash);
    EXPECT_EQ(hash.Get("key"), "value");
    EXPECT_EQ(hash.Get("register nic"), "eth0,eth1");
}

TEST_F(SectionFiles, LinesBeforeAnySectionAreGlobal) {
    Hash hash;
    Load("first=1\n[global]\nsecond=2\n", hash);
    EXPECT_EQ(hash.Get("first"), "1");
    EXPECT_EQ(hash.Get("second"), "2");
}

TEST_F(SectionFiles, TheLastOfSeveralIsLoaded) {
    Hash hash;
    Load("[global]\nkey=first\nKey=last\n", hash);
    EXPECT_EQ(hash.Get("key"), "last");
}

TEST_F(SectionFiles, LoadsMoreThanTheHashHasRoomFor) {
    std::string content = "[global]\n";
    for (int number = 0; number < 3000; ++number) {
        content += "key" + std::to_string(number) + "=" + std::to_string(number) + "\n";
    }
    Hash hash(1);
    Load(content, hash);
    for (int number = 0; number < 3000; ++number) {
        ASSERT_EQ(hash.Get("key" + std::to_string(number)), std::to_string(number));
    }
}

TEST_F(SectionFiles, CommentsAreNotLoaded) {
    Hash hash;
    Load("[global]\n# key=wrong\n;key=wrong\n", hash);
    EXPECT_EQ(hash.Get("key"), "(null)");
    EXPECT_EQ(hash.Get("# key"), "(null)");
}

TEST_F(SectionFiles, AMissingSectionLoadsNothing) {
    Hash hash;
    ASSERT_TRUE(hash.Set("own", "kept"));
    Load("[other]\nkey=wrong\n", hash);
    EXPECT_EQ(hash.Get("key"), "(null)");
    EXPECT_EQ(hash.Get("own"), "kept");
}

TEST_F(SectionFiles, AMissingFileLoadsNothing) {
    Hash hash;
    VLIBCFileGetSection((folder / "none").c_str(), "global", &hash.hash);
    ASSERT_NE(hash.hash, nullptr);
    EXPECT_TRUE(hash.Set("key", "value"));
    EXPECT_EQ(hash.Get("key"), "value");
}

TEST_F(SectionFiles, AFailureLeavesAHashToGoOnWith) {
    Hash hash;
    EXPECT_EQ(FAILING(VLIBCFileGetSection((folder / "").c_str(), "global", &hash.hash)), -1) << "a folder";
    ASSERT_NE(hash.hash, nullptr);
    EXPECT_EQ(hash.Get("key"), "(null)");
}

TEST_F(SectionFiles, WritesEachEntryInItsFormat) {
    Hash hash;
    ASSERT_TRUE(hash.Set("server signing", "yes"));
    ASSERT_TRUE(hash.Set("winbind expand groups", "3"));
    const std::string path = folder / "new.conf";
    ASSERT_NE(SUCCEEDING(VLIBCFileAddSection(path.c_str(), "global", hash.hash, kLine)), 0);
    const std::string text = ReadFile(path);
    EXPECT_TRUE(HasLine(text, "    server signing=yes")) << text;
    EXPECT_TRUE(HasLine(text, "    winbind expand groups=3")) << text;
    EXPECT_TRUE(HasLine(text, "[global]")) << text;
}

TEST_F(SectionFiles, WhatWasWrittenIsLoadedAgain) {
    constexpr int kKeys = 200;
    Hash written;
    for (int number = 0; number < kKeys; ++number) {
        ASSERT_TRUE(written.Set("key " + std::to_string(number), "value = " + std::to_string(number)));
    }
    const std::string path = folder / "new.conf";
    ASSERT_TRUE(Write(path, written));
    Hash loaded;
    ASSERT_GE(VLIBCFileGetSection(path.c_str(), "global", &loaded.hash), 0);
    for (int number = 0; number < kKeys; ++number) {
        ASSERT_EQ(loaded.Get("key " + std::to_string(number)), "value = " + std::to_string(number));
    }
    char value[64] = {};
    ASSERT_GT(VLIBCFileGetKeyValue(path.c_str(), "key 7", value, sizeof value, 0), 0);
    EXPECT_STREQ(value, "value = 7");
}

// The last switch was turned off: that is a section to write like any other.
TEST_F(SectionFiles, AnEmptyHashIsWritten) {
    Hash hash;
    const std::string path = folder / "new.conf";
    EXPECT_TRUE(Write(path, hash));
    EXPECT_NE(ReadFile(path), "(missing)");
    Hash loaded;
    EXPECT_GE(VLIBCFileGetSection(path.c_str(), "global", &loaded.hash), 0);
}

TEST_F(SectionFiles, WhatCannotBeWrittenAnswersZero) {
    Hash hash;
    ASSERT_TRUE(hash.Set("key", "value"));
    const std::string nowhere = folder / "none/file.conf";
    EXPECT_EQ(FAILING(VLIBCFileAddSection(nowhere.c_str(), "global", hash.hash, kLine)), 0);
    const std::string itself = folder / "";
    EXPECT_EQ(FAILING(VLIBCFileAddSection(itself.c_str(), "global", hash.hash, kLine)), 0) << "a folder";
}

TEST_F(SectionFiles, ATemporaryNameLiesBesideItsFile) {
    const std::string path = folder.Put("file.conf", "old");
    const std::string name = TemporaryFor(path);
    EXPECT_EQ(name.substr(0, name.rfind('/')), path.substr(0, path.rfind('/')));
    EXPECT_NE(name, path);
    EXPECT_EQ(ReadFile(path), "old");
}

TEST_F(SectionFiles, TemporaryNamesOfProcessesAndThreadsDiffer) {
    constexpr int kProcesses = 4;
    constexpr int kThreads = 4;
    const std::string path = folder.Put("file.conf", "");
    std::vector<pid_t> children;
    for (int process = 0; process < kProcesses; ++process) {
        children.push_back(contract::Fork([&] {
            std::mutex mutex;
            std::string names;
            contract::InThreads(kThreads, [&](int) {
                const std::string name = TemporaryFor(path);
                contract::WriteFile(name, "");  // taken from here on
                const std::lock_guard<std::mutex> guard(mutex);
                names += name + "\n";
            });
            contract::WriteFile(folder / ("names" + std::to_string(process)), names);
            return true;
        }));
    }
    std::set<std::string> all;
    for (int process = 0; process < kProcesses; ++process) {
        ASSERT_EQ(contract::Await(children[static_cast<std::size_t>(process)]), 0);
        std::istringstream names(ReadFile(folder / ("names" + std::to_string(process))));
        for (std::string name; std::getline(names, name);) {
            EXPECT_TRUE(all.insert(name).second) << name << " twice";
        }
    }
    EXPECT_EQ(all.size(), static_cast<std::size_t>(kProcesses * kThreads));
}

TEST_F(SectionFiles, ATemporaryNameIsNotWrittenBeyondItsBuffer) {
    const std::string path = folder.Put("file.conf", "");
    for (const int size : {1, 4, 16}) {
        GuardedBuffer name(size);
        const int result = VLIBCFileITmpName(path.c_str(), name.data(), name.size());
        EXPECT_TRUE(name.GuardsStand()) << size;
        EXPECT_TRUE(result < 0 || name.IsTerminated()) << size;
    }
}

// Rewrites a file of options by way of a temporary one, as the module does. An empty `suffix`: under the platform's name.
void RewriteAndLook(const contract::Folder& folder, const std::string& suffix) {
    const std::string path = folder.Put("smbinfo.conf", "[global]\n    key=old\n    gone=1\n");
    ASSERT_EQ(chmod(path.c_str(), 0640), 0);
    ASSERT_EQ(chown(path.c_str(), 12, 34), 0) << "only root can give files away";
    Hash hash;
    ASSERT_GE(VLIBCFileGetSection(path.c_str(), "global", &hash.hash), 0);
    ASSERT_TRUE(hash.Set("key", "new"));
    ASSERT_GE(VLIBCSzHashRemoveKey(hash.hash, "gone"), 0);
    const std::string temporary = suffix.empty() ? TemporaryFor(path) : path + suffix;
    ASSERT_NE(VLIBCFileAddSection(temporary.c_str(), "global", hash.hash, kLine), 0);
    ASSERT_EQ(SUCCEEDING(VLIBCSysRename(temporary.c_str(), path.c_str())), 0);

    Hash loaded;
    ASSERT_GE(VLIBCFileGetSection(path.c_str(), "global", &loaded.hash), 0);
    EXPECT_EQ(loaded.Get("key"), "new");
    EXPECT_EQ(loaded.Get("gone"), "(null)");
    struct stat found {};
    ASSERT_EQ(stat(path.c_str(), &found), 0);
    EXPECT_EQ(found.st_mode & 07777, 0640U);
    EXPECT_EQ(found.st_uid, 12U);
    EXPECT_EQ(found.st_gid, 34U);
    EXPECT_EQ(VLIBCFileExist(temporary.c_str()), 0);
}

TEST_F(SectionFiles, RewrittenUnderAPlatformsNameKeepOwnerAndMode) {
    RewriteAndLook(folder, "");
}

TEST_F(SectionFiles, RewrittenUnderAnOwnNameKeepOwnerAndMode) {
    RewriteAndLook(folder, ".tmp");
}

}  // namespace
