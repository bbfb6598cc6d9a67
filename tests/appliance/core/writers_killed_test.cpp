// Every writer of a file that others read, killed at each of its system calls: afterwards the old file stands or the new
// one, whole, and the next writer goes through. Where a writer changes two files, it does so in one order.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sched.h>
#include <sys/mount.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <functional>
#include <map>
#include <set>
#include <string>
#include <vector>

#include "appliance/base/conf_file.h"
#include "appliance/base/file.h"
#include "appliance/base/paths.h"
#include "appliance/base/settings.h"
#include "appliance/platform/system/dns_servers.h"
#include "appliance/platform/system/task_store.h"
#include "platform/domain.h"
#include "platform/network.h"
#include "tests/appliance/base/traced_child.h"
#include "tests/appliance/core/core_test.h"

using appliance::Path;
using appliance_test::Hash;

namespace {

namespace fs = std::filesystem;

using Files = std::map<std::string, std::string>;  // by their path on the appliance
using State = std::vector<std::string>;            // the contents of files

constexpr char kOther[] = "/mnt/other";              // a file system of its own
constexpr char kInOther[] = "/mnt/other/info.conf";  // where a link leads
constexpr int kMostCalls = 2000;

const std::string kFiller(9000, 'k');  // more than a write might put there at once

struct Writer {
    std::string name;
    Files before;
    std::vector<std::string> order;  // the files that change, in that order
    std::function<bool()> write;
    std::function<bool()> mend = nullptr;  // what the server's start does: all files are old then, or all new
};

bool SetServers(const std::vector<std::string>& servers) {
    VLIBSZLIST* list = VLIBCSzListAlloc(4);
    for (const std::string& server : servers) {
        VLIBCSzListPush(&list, server.c_str());
    }
    const bool done = VORNNetDNSListSet(list) == 0;
    VLIBCSzListFree(list);
    return done;
}

bool WriteSection(const std::string& path) {
    Hash hash;
    char name[4095] = {};
    return VLIBCFileGetSection(path.c_str(), "global", hash.address()) == 0 &&
           VLIBCSzHashSetValue(hash.address(), "a", "new") == 0 &&
           VLIBCFileITmpName(path.c_str(), name, sizeof(name)) == 0 &&
           VLIBCFileAddSection(name, "global", hash.get(), "    %s=%s\n") != 0 &&
           VLIBCSysRename(name, path.c_str()) == 0;
}

appliance::TaskFile OneTask(int hour) {
    appliance::ScheduledTask task;
    task.id = 1;
    task.command = "/bin/true";
    task.schedule.dateType = appliance::kOnWeekdays;
    task.schedule.weekName = "1";
    task.schedule.hour = hour;
    return {{task}, 2};
}

bool SaveTask(int id) {
    appliance::ScheduledTask task = OneTask(17).tasks[0];
    task.id = id;
    return !appliance::SaveTask(task);
}

bool RepairTable() {
    return !appliance::RepairCronTable();
}

const std::string kSection = "[global]\n    a=old\n    kept=" + kFiller + "\n";

const std::vector<Writer> kWriters = {
    {"ReplaceFile",
     {{"/etc/file", kFiller}},
     {"/etc/file"},
     [] { return !appliance::ReplaceFile(Path("/etc/file"), std::string(200000, 'n')); }},
    {"ConfFile",
     {{"/etc/file", "# kept\n[global]\n    a=1\n    b=2\n"}},
     {"/etc/file"},
     [] {
         appliance::ConfFile file;
         return !appliance::ConfFile::Load(Path("/etc/file"), file) && file.Set("global", "b", "3") &&
                !file.Save(Path("/etc/file"));
     }},
    {"Section",
     {{appliance::kSmbInfo, kSection}},
     {appliance::kSmbInfo},
     [] { return WriteSection(Path(appliance::kSmbInfo)); }},
    {"SectionOfANewFile", {}, {appliance::kSmbInfo}, [] { return WriteSection(Path(appliance::kSmbInfo)); }},
    {"SectionInAnotherFileSystem", {{kInOther, kSection}}, {kInOther}, [] { return WriteSection(Path("/etc/link")); }},
    {"RemovedKey",
     {{appliance::kSettings, "a=1\ndomain_dns=10.0.0.1\nkept=" + kFiller + "\n"}},
     {appliance::kSettings},
     [] { return VLIBCFileRemoveKey(Path(appliance::kSettings).c_str(), "domain_dns") == 0; }},
    {"Setting",
     {{appliance::kSettings, "a=1\ntrustdomain=no\nkept=" + kFiller + "\n"}},
     {appliance::kSettings},
     [] { return !appliance::SetSetting("trustdomain", "yes"); }},
    {"KeyOfTheFileSharingService",
     {{appliance::kSmbConf, "[global]\n\tworkgroup = HOME\n\tx:kept = " + kFiller + "\n[share]\n\tpath = /srv\n"}},
     {appliance::kSmbConf},
     [] { return VORNWinsSetSectionKey("global", "server signing", "mandatory") == 0; }},
    {"NameServers",
     {{appliance::kResolvConf, "search lab.test\nnameserver 10.0.0.1\n# kept\n"}},
     {appliance::kResolvCopy, appliance::kResolvConf},
     [] {
         return SetServers({"192.0.2.1", "192.0.2.2"});
     }},
    {"NewTask", {}, {appliance::kSchedule, appliance::kCronTable}, [] { return SaveTask(-1); }, RepairTable},
    {"ChangedTask",
     {{appliance::kSchedule, appliance::FormatTasks(OneTask(3))},
      {appliance::kCronTable, appliance::CronTable(OneTask(3), appliance::Today())}},
     {appliance::kSchedule, appliance::kCronTable},
     [] { return SaveTask(1); },
     RepairTable},
};

class WritersKilled : public appliance_test::CoreTest {
protected:
    WritersKilled() {
        for (const char* name : {"/etc/cron.d", "/usr/vorn/etc/private", "/run/vorn", kOther}) {
            fs::create_directories(Path(name));
        }
        // For this process and what it starts alone.
        EXPECT_EQ(unshare(CLONE_NEWNS), 0);
        EXPECT_EQ(mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr), 0);
        EXPECT_EQ(mount("tmpfs", Path(kOther).c_str(), "tmpfs", 0, nullptr), 0);
    }
    ~WritersKilled() override {
        umount2(Path(kOther).c_str(), MNT_DETACH);
    }

    // The appliance with these files and no others.
    void Reset(const Files& files) {
        for (const std::string& path : Names()) {
            unlink(Path(path).c_str());
        }
        for (const auto& [path, content] : files) {
            Put(Path(path), content);
        }
        ASSERT_EQ(symlink(Path(kInOther).c_str(), Path("/etc/link").c_str()), 0);
    }
    // All that is no folder.
    std::set<std::string> Names() const {
        std::set<std::string> names;
        for (const auto& entry : fs::recursive_directory_iterator(folder.path())) {
            if (!fs::is_directory(entry.symlink_status())) {
                names.insert(entry.path().string().substr(folder.path().size()));
            }
        }
        return names;
    }
    static State Now(const std::vector<std::string>& paths) {
        State state;
        for (const std::string& path : paths) {
            state.push_back(Got(Path(path)));
        }
        return state;
    }
    void Sweep() const {
        for (const auto& entry : fs::recursive_directory_iterator(folder.path())) {
            if (entry.is_directory()) {
                appliance::RemoveStaleTemporaries(entry.path());
            }
        }
    }

    // Kills the writer at its first system call, at its second one, and so on, until it comes to its end. `look` is told
    // the state that each kill left, with what was left over swept away.
    void Kill(const Writer& writer, const std::function<void(const State&)>& look) {
        Reset(writer.before);
        ASSERT_TRUE(writer.write());
        const std::set<std::string> known = Names();
        bool killed = true;
        for (int calls = 0; killed && calls < kMostCalls && !HasFailure(); ++calls) {
            Reset(writer.before);
            killed = appliance_test::KilledAtCall(calls, writer.write);
            const State left = Now(writer.order);
            Sweep();
            ASSERT_EQ(Now(writer.order), left) << "no reader took for the file what was swept away";
            for (const std::string& name : Names()) {
                ASSERT_TRUE(known.count(name) != 0 || writer.before.count(name) != 0) << name;
            }
            look(left);
        }
        EXPECT_FALSE(killed) << "the writer does not end";
    }
};

class AllWritersKilled : public WritersKilled, public testing::WithParamInterface<Writer> {};

TEST_P(AllWritersKilled, OldOrNewAndNeverMixed) {
    const Writer& writer = GetParam();
    Reset(writer.before);
    const State before = Now(writer.order);
    ASSERT_TRUE(writer.write());
    const State after = Now(writer.order);
    std::set<State> expected = {before};
    for (std::size_t changed = 0; changed < after.size(); ++changed) {
        State between = before;
        std::copy_n(after.begin(), changed + 1, between.begin());
        ASSERT_TRUE(expected.insert(between).second) << writer.order[changed] << " does not change";
    }
    std::set<State> seen;
    Kill(writer, [&](const State& left) {
        seen.insert(left);
        ASSERT_EQ(expected.count(left), 1U) << testing::PrintToString(left);
        if (writer.mend) {
            ASSERT_TRUE(writer.mend());
            const State mended = Now(writer.order);
            ASSERT_TRUE(mended == before || mended == after) << testing::PrintToString(mended);
            Reset(writer.before);
        }
        // Nothing that the dead one held is in the way of the next.
        ASSERT_TRUE(writer.write());
        ASSERT_EQ(Now(writer.order), after);
    });
    EXPECT_EQ(seen, expected);
}

// A join that dies while it changes the servers: whoever puts the old list back finds the file as it was, to the byte.
TEST_F(WritersKilled, NameServersCanBeTakenBack) {
    const std::string old = "nameserver 10.0.0.1\r\n# kept\n";
    const Writer writer = {
        "", {{appliance::kResolvConf, old}}, {appliance::kResolvConf}, [] { return SetServers({"192.0.2.1"}); }};
    Kill(writer, [&](const State& left) {
        ASSERT_TRUE(SetServers({"10.0.0.1"})) << left[0];
        ASSERT_EQ(Got(Path(appliance::kResolvConf)), old) << left[0];
    });
}

INSTANTIATE_TEST_SUITE_P(Writers, AllWritersKilled, testing::ValuesIn(kWriters),
                         [](const auto& writer) { return writer.param.name; });

}  // namespace
