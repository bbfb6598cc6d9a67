// The writer of a whole section.

#include <fcntl.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <csignal>
#include <filesystem>
#include <random>

#include "appliance/base/command.h"
#include "appliance/base/file.h"
#include "tests/appliance/base/traced_child.h"
#include "tests/appliance/core/core_test.h"

using appliance_test::Fork;
using appliance_test::Hash;
using appliance_test::WaitFor;
using testing::ElementsAre;

namespace {

constexpr char kFormat[] = "    %s=%s\n";

class SectionWriterTest : public appliance_test::CoreTest {
protected:
    std::string path = folder / "smbinfo.conf";
    std::string ownTemporary = path + ".tmp";

    std::string Temporary() {
        char name[4095] = {};
        EXPECT_EQ(VLIBCFileITmpName(path.c_str(), name, sizeof(name)), 0);
        return name;
    }
    static int Write(const std::string& to, const Hash& hash) {
        return VLIBCFileAddSection(to.c_str(), "global", hash.get(), kFormat);
    }
    static struct stat StatOf(const std::string& name) {
        struct stat found = {};
        EXPECT_EQ(lstat(name.c_str(), &found), 0) << name;
        return found;
    }
};

TEST_F(SectionWriterTest, FillsATemporaryFile) {
    const std::string temporary = Temporary();
    Hash hash;
    VLIBCSzHashSetValue(hash.address(), "register nic", "eth0,eth1");
    VLIBCSzHashSetValue(hash.address(), "advanced_domain_option", "yes");
    EXPECT_SUCCEEDS(Write(temporary, hash), 1);
    EXPECT_EQ(Got(temporary), "[global]\n    register nic=eth0,eth1\n    advanced_domain_option=yes\n");
    EXPECT_EQ(StatOf(temporary).st_mode & 07777, 0644U);
    EXPECT_EQ(VLIBCSysRename(temporary.c_str(), path.c_str()), 0);
    EXPECT_THAT(folder.Names(), ElementsAre("smbinfo.conf"));
    Hash read;
    EXPECT_EQ(VLIBCFileGetSection(path.c_str(), "global", read.address()), 0);
    EXPECT_EQ(read.Value("register nic"), "eth0,eth1");
    EXPECT_EQ(read.Value("advanced_domain_option"), "yes");
}

TEST_F(SectionWriterTest, MakesAFileThatIsMissing) {
    EXPECT_EQ(Write(ownTemporary, Hash{{"a", "1"}}), 1);
    EXPECT_EQ(Got(ownTemporary), "[global]\n    a=1\n");
    EXPECT_EQ(Write(folder / "plain", Hash()), 1);
    EXPECT_EQ(Got(folder / "plain"), "[global]\n");
}

TEST_F(SectionWriterTest, KeepsWhatElseAFileHolds) {
    Put(path, "# c\n[x]\na=1\n[global]\nb=2\n");
    EXPECT_EQ(Write(path, Hash{{"n", "v"}}), 1);
    EXPECT_EQ(Got(path), "# c\n[x]\na=1\n[global]\n    n=v\n");
    EXPECT_EQ(VLIBCFileAddSection(path.c_str(), "y", Hash{{"n", "v"}}.get(), "%s = %s\n"), 1);
    EXPECT_EQ(Got(path), "# c\n[x]\na=1\n[global]\n    n=v\n[y]\nn = v\n");
}

TEST_F(SectionWriterTest, TakesOwnerModeAndAttributesOfTheFileToBeReplaced) {
    Put(path, "");
    ASSERT_EQ(chown(path.c_str(), 12, 34), 0);
    ASSERT_EQ(chmod(path.c_str(), 0640), 0);
    ASSERT_EQ(setxattr(path.c_str(), "trusted.mark", "value", 5, 0), 0);
    for (const std::string& temporary : {Temporary(), ownTemporary}) {
        EXPECT_EQ(Write(temporary, Hash{{"a", "1"}}), 1);
        EXPECT_EQ(StatOf(temporary).st_uid, 12U);
        EXPECT_EQ(StatOf(temporary).st_gid, 34U);
        EXPECT_EQ(StatOf(temporary).st_mode & 07777, 0640U);
        EXPECT_EQ(getxattr(temporary.c_str(), "trusted.mark", nullptr, 0), 5);
        EXPECT_EQ(VLIBCSysRename(temporary.c_str(), path.c_str()), 0);
        EXPECT_EQ(StatOf(path).st_mode & 07777, 0640U);
        EXPECT_EQ(StatOf(path).st_uid, 12U);
    }
    EXPECT_EQ(Write(path, Hash{{"a", "2"}}), 1);
    EXPECT_EQ(StatOf(path).st_mode & 07777, 0640U);
}

// Nothing is written, and nothing is left that a rename could put in place.
TEST_F(SectionWriterTest, RefusesWhatALineCannotHold) {
    Put(path, "[global]\n    a=old\n");
    for (const std::string& value :
         {std::string("1\n    evil=2"), std::string("1\r"), std::string("\t1"), std::string("1\x7F"),
          std::string("1\x01"), std::string("1\\"), std::string("1\\ ")}) {
        for (const std::string& temporary : {Temporary(), ownTemporary}) {
            EXPECT_FAILS(Write(temporary, Hash{{"a", value}, {"b", "2"}}), 0, BadData);
            EXPECT_EQ(VLIBCFileExist(temporary.c_str()), 0);
            EXPECT_FAILS(VLIBCSysRename(temporary.c_str(), path.c_str()), -1, NotFound);
        }
        EXPECT_FAILS(Write(path, Hash{{"a", value}}), 0, BadData);
    }
    for (const char* key : {"#a", "a=b", "[a", "a\nb", "a\x02"}) {
        EXPECT_FAILS(Write(ownTemporary, Hash{{key, "1"}}), 0, BadData);
    }
    EXPECT_EQ(Got(path), "[global]\n    a=old\n");
    EXPECT_THAT(folder.Names(), ElementsAre("smbinfo.conf"));
}

TEST_F(SectionWriterTest, RefusesOtherFormatsAndSections) {
    const Hash hash{{"a", "1"}};
    for (const char* format :
         {"", "%s", "%s=%s", "%s=%d\n", "%s=%s%s\n", "%n%s=%s\n", "#%s=%s\n", "%s=%s\\\n", "%s=%.1s\n"}) {
        EXPECT_FAILS(VLIBCFileAddSection(ownTemporary.c_str(), "global", hash.get(), format), 0, BadData);
    }
    for (const char* section : {"", "a]b", "a\n[b"}) {
        EXPECT_FAILS(VLIBCFileAddSection(ownTemporary.c_str(), section, hash.get(), kFormat), 0, BadData);
    }
    EXPECT_FAILS(VLIBCFileAddSection(nullptr, "global", hash.get(), kFormat), 0, BadArgument);
    EXPECT_FAILS(VLIBCFileAddSection(path.c_str(), nullptr, hash.get(), kFormat), 0, BadArgument);
    EXPECT_FAILS(VLIBCFileAddSection(path.c_str(), "global", nullptr, kFormat), 0, BadArgument);
    EXPECT_FAILS(VLIBCFileAddSection(path.c_str(), "global", hash.get(), nullptr), 0, BadArgument);
    EXPECT_FAILS(VLIBCFileAddSection((folder / "none/a").c_str(), "global", hash.get(), kFormat), 0, FileWrite);
    EXPECT_THAT(folder.Names(), testing::IsEmpty());
}

// What could not be read would be lost by the rewriting.
TEST_F(SectionWriterTest, RefusesASectionThatWasNotLoaded) {
    std::filesystem::create_directory(path);
    Hash hash;
    EXPECT_EQ(VLIBCFileGetSection(path.c_str(), "global", hash.address()), -1);
    VLIBCSzHashSetValue(hash.address(), "a", "1");
    const std::string temporary = Temporary();
    EXPECT_FAILS(Write(temporary, hash), 0, FileRead);
    EXPECT_EQ(VLIBCFileExist(temporary.c_str()), 0);
    EXPECT_EQ(VLIBCFileGetSection((folder / "none").c_str(), "global", hash.address()), 0);
    EXPECT_EQ(Write(folder / "other", hash), 1);
}

TEST_F(SectionWriterTest, FollowsNoLinkAtATemporaryName) {
    Put(folder / "victim", "text");
    ASSERT_EQ(symlink("victim", ownTemporary.c_str()), 0);
    EXPECT_EQ(Write(ownTemporary, Hash{{"a", "1"}}), 1);
    EXPECT_EQ(Got(folder / "victim"), "text");
    EXPECT_TRUE(S_ISREG(StatOf(ownTemporary).st_mode));
}

TEST_F(SectionWriterTest, FullDisk) {
    const int done = WaitFor(Fork([&] {
        if (unshare(CLONE_NEWNS) != 0 || mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0 ||
            mount("tmpfs", folder.path().c_str(), "tmpfs", 0, "size=64k") != 0) {
            _exit(77);
        }
        Put(path, "[global]\n    a=old\n");
        const Hash big{{"a", std::string(100000, 'x')}};
        bool right = true;
        for (const std::string& temporary : {Temporary(), ownTemporary}) {
            right = right && Write(temporary, big) == 0 &&
                    VLIBCErrGet() == static_cast<int>(appliance::ErrorCode::FileWrite) &&
                    VLIBCSysRename(temporary.c_str(), path.c_str()) == -1 && Got(path) == "[global]\n    a=old\n" &&
                    folder.Names().size() == 1;
        }
        if (mount(nullptr, folder.path().c_str(), nullptr, MS_REMOUNT | MS_RDONLY, nullptr) != 0) {
            return false;
        }
        char name[100] = {};
        return right && VLIBCFileITmpName(path.c_str(), name, sizeof(name)) == -1 &&
               Write(ownTemporary, Hash{{"a", "1"}}) == 0 && VLIBCFileRemoveKey(path.c_str(), "a") == -1 &&
               VLIBCFileTouch(path.c_str()) == -1 && VLIBCSysRemove(path.c_str()) == -1 &&
               Got(path) == "[global]\n    a=old\n";
    }));
    if (done == 77) {
        FAIL() << "no mount namespace here";
    }
    EXPECT_EQ(done, 0);
}

TEST_F(SectionWriterTest, OnTheDiskBeforeItIsPutInPlace) {
    const std::string temporary = Temporary();
    const auto write = [&] { return Write(temporary, Hash{{"a", "1"}}) == 1; };
    std::vector<long> calls = appliance_test::CallsOf(write, write);
    const auto isOther = [](long call) { return call != SYS_write && call != SYS_fsync && call != SYS_rename; };
    calls.erase(std::remove_if(calls.begin(), calls.end(), isOther), calls.end());
    EXPECT_THAT(calls, ElementsAre(SYS_write, SYS_fsync, SYS_rename, SYS_fsync));
    const std::string another = Temporary();
    ASSERT_TRUE(Write(another, Hash{{"a", "1"}}) == 1);
    const auto rename = [&](const std::string& from) { return VLIBCSysRename(from.c_str(), path.c_str()) == 0; };
    calls = appliance_test::CallsOf([&] { return rename(temporary); }, [&] { return rename(another); });
    calls.erase(std::remove_if(calls.begin(), calls.end(), isOther), calls.end());
    EXPECT_THAT(calls, ElementsAre(SYS_fsync, SYS_rename, SYS_fsync));
}

TEST_F(SectionWriterTest, AHundredThousandKeys) {
    const auto begin = std::chrono::steady_clock::now();
    Hash hash;
    for (int i = 0; i < 100000; ++i) {
        VLIBCSzHashSetValue(hash.address(), ("key" + std::to_string(i)).c_str(), std::to_string(i).c_str());
    }
    EXPECT_EQ(Write(path, hash), 1);
    Hash read;
    EXPECT_EQ(VLIBCFileGetSection(path.c_str(), "global", read.address()), 0);
    EXPECT_EQ(read.Value("KEY 99999"), "99999");
    for (int i = 0; i < 100000; i += 2) {
        VLIBCSzHashRemoveKey(read.get(), ("key" + std::to_string(i)).c_str());
    }
    EXPECT_EQ(Write(path, read), 1);
    char value[16] = {};
    EXPECT_EQ(VLIBCFileGetKeyValue(path.c_str(), "key0", value, sizeof(value), 0), 0);
    EXPECT_EQ(VLIBCFileGetKeyValue(path.c_str(), "key1", value, sizeof(value), 0), 1);
    EXPECT_LT(std::chrono::steady_clock::now() - begin, std::chrono::seconds(30));
}

TEST_F(SectionWriterTest, TheFileSharingServiceReadsIt) {
    ASSERT_EQ(Write(path, Hash{{"server signing", "mandatory"},
                               {"winbind expand groups", "7"},
                               {"register nic", "eth0"},
                               {"vorn:odd", "a \"b\" # ; = [c] \xC3\xA4"}}),
              1);
    Put(folder / "smb.conf", "[global]\n    include = " + path + "\n    realm = AFTER.TEST\n");
    appliance::Command command;
    command.arguments = {"/usr/bin/testparm", "-s", folder / "smb.conf"};
    const appliance::CommandResult result = appliance::Run(command);
    EXPECT_TRUE(result.Succeeded());
    for (const char* line : {"\tserver signing = required\n", "\twinbind expand groups = 7\n", "\trealm = AFTER.TEST\n",
                             "\tvorn:odd = a \"b\" # ; = [c] \xC3\xA4\n"}) {
        EXPECT_THAT(result.output, testing::HasSubstr(line)) << result.errors;
    }
}

}  // namespace
