// The contract's operations of the directory, compiled into the test.

#include "appliance/platform/contract.h"
//
#include <gmock/gmock.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstring>
#include <memory>

#include "appliance/base/error_code.h"
#include "appliance/base/paths.h"
#include "appliance/base/process.h"
#include "appliance/domain/directory/domain_list.h"
#include "appliance/domain/directory/fetch.h"
#include "appliance/domain/directory/home_include.h"
#include "appliance/domain/directory/time_sync.h"
#include "appliance/platform/domain/time_task.h"
#include "tests/appliance/directory/directory_test.h"

namespace {

// The services that were told to read their configuration again.
std::vector<std::string> reloaded;

}  // namespace

extern "C" int VLIBServiceReload(const char* service) {
    reloaded.emplace_back(service);
    return 0;
}

namespace appliance_test {
namespace {

using appliance::EntryKind;
using appliance::ErrorCode;
using appliance::Path;
using testing::ElementsAre;
using testing::IsEmpty;
using Names = std::vector<std::string>;

constexpr char kTrusts[] =
    "Domain Name     DNS Domain                                                       Trust Type\n"
    "LAB             lab.test                                                         Workstation\n"
    "OTHER           other.test                                                       Forest\n";
constexpr char kUnits[] = "Got 1 replies\n\ndistinguishedName: OU=R\\, D,DC=lab,DC=test\n\n";

class List {
public:
    explicit List(const Names& names = {}) : list_(VLIBCSzListAlloc(1)) {
        for (const std::string& name : names) {
            EXPECT_EQ(VLIBCSzListPush(&list_, name.c_str()), 0);
        }
    }
    ~List() {
        VLIBCSzListFree(list_);
    }
    List(const List&) = delete;
    List& operator=(const List&) = delete;

    VLIBSZLIST* get() {
        return list_;
    }
    VLIBSZLIST** address() {
        return &list_;
    }
    Names names() const {
        Names names;
        for (int index = 0; index < list_->count; ++index) {
            names.emplace_back(VLIBCSzListGet(list_, index));
        }
        return names;
    }

private:
    VLIBSZLIST* list_;
};

class OperationsTest : public DirectoryTest {
protected:
    OperationsTest() {
        reloaded.clear();
        MakeMember(true);
        // Winbind lists the trusted domains, and is connected.
        Put(folder / "trusts", kTrusts);
        PutProgram("wbinfo", "case \"$*\" in *online*) echo 'LAB : active connection';; *) cat '" + folder / "trusts" +
                                 "';; esac");
    }
    static ErrorCode LastError() {
        return static_cast<ErrorCode>(VLIBCErrGet());
    }
    static void BeNoMember() {
        Put(Path(appliance::kSmbConf), "[global]\n    workgroup = WORKGROUP\n    security = user\n");
    }
    static std::string DnsNameOf(const char* domain) {
        char name[64] = {};
        return VORNWinsGetDomainFQDN(domain, name, sizeof(name)) < 0 ? "<none>" : name;
    }
};

TEST_F(OperationsTest, ListsTheDomainsInSight) {
    List domains;
    EXPECT_EQ(VORNWinsEnumAllDomains(domains.address()), 0);
    EXPECT_THAT(domains.names(), ElementsAre("LAB", "OTHER"));
    Put(Path(appliance::kSettings), "trustdomain=no\n");
    List own;
    EXPECT_EQ(VORNWinsEnumAllDomains(own.address()), 0);
    EXPECT_THAT(own.names(), ElementsAre("LAB"));
    BeNoMember();
    List none;
    EXPECT_EQ(VORNWinsEnumAllDomains(none.address()), -1);
    EXPECT_EQ(LastError(), ErrorCode::NotMember);
    unlink(Path(appliance::kSmbConf).c_str());
    EXPECT_EQ(VORNWinsEnumAllDomains(none.address()), -1);
    EXPECT_EQ(LastError(), ErrorCode::FileRead);
    EXPECT_THAT(none.names(), IsEmpty());
    EXPECT_EQ(VORNWinsEnumAllDomains(nullptr), -1);
    EXPECT_EQ(LastError(), ErrorCode::BadArgument);
}

TEST_F(OperationsTest, TellsDnsNamesWithoutAskingAnyone) {
    ASSERT_TRUE(
        appliance::SaveDomains({{"LAB", "lab.test", true}, {"OTHER", "other.test", false}, {"OLD", "", false}}));
    PutProgram("wbinfo", "touch '" + folder / "asked" + "'");
    EXPECT_EQ(DnsNameOf("LAB"), "lab.test");
    EXPECT_EQ(DnsNameOf("other"), "other.test");
    EXPECT_EQ(DnsNameOf("OLD"), "<none>");
    EXPECT_EQ(LastError(), ErrorCode::NotFound);
    EXPECT_EQ(DnsNameOf("NOWHERE"), "<none>");
    EXPECT_EQ(DnsNameOf(nullptr), "<none>");
    EXPECT_EQ(Got(folder / "asked"), "<missing>");
    char small[5] = {};
    EXPECT_EQ(VORNWinsGetDomainFQDN("LAB", small, sizeof(small)), 0);
    EXPECT_STREQ(small, "lab.");
    EXPECT_EQ(VORNWinsGetDomainFQDN("LAB", small, 0), -1);
    BeNoMember();
    EXPECT_EQ(DnsNameOf("LAB"), "<none>");
}

TEST_F(OperationsTest, ListsOrganisationalUnitsAsTheyAreOrWere) {
    PutAnswer("net", "", 255);
    List names;
    List values;
    EXPECT_EQ(VORNWinsEnumOU(names.address(), values.address()), -1);
    EXPECT_EQ(LastError(), ErrorCode::Unreachable);
    PutAnswer("net", kUnits);
    EXPECT_EQ(VORNWinsEnumOU(names.address(), values.address()), 0);
    EXPECT_THAT(names.names(), ElementsAre("R, D"));
    EXPECT_THAT(values.names(), ElementsAre("OU=R\\, D,DC=lab,DC=test"));
    PutAnswer("net", "", 255);
    List known;
    List knownValues;
    EXPECT_EQ(VORNWinsEnumOU(known.address(), knownValues.address()), 0);
    EXPECT_THAT(known.names(), ElementsAre("R, D"));
    MakeMember(false);
    List none;
    List noneValues;
    EXPECT_EQ(VORNWinsEnumOU(none.address(), noneValues.address()), 0);
    EXPECT_THAT(none.names(), IsEmpty());
    EXPECT_EQ(VORNWinUpdateOU(), 0);
}

TEST_F(OperationsTest, RefreshesWhatIsKnownAndGivesRanges) {
    MakeMember(false);
    Put(folder / "trusts",
        std::string(kTrusts) +
            "NEW             new.test                                                         Forest\n");
    EXPECT_EQ(VORNWinUpdateAllDomains(), 0);
    EXPECT_EQ(DnsNameOf("NEW"), "new.test");
    EXPECT_NE(Got(Path(appliance::kSmbConf)).find("idmap config NEW : range = 3000000-3999999"), std::string::npos);
    EXPECT_THAT(reloaded, ElementsAre("winbindd"));
    EXPECT_EQ(VORNWinUpdateAllDomains(), 0);
    EXPECT_THAT(reloaded, ElementsAre("winbindd"));
    PutAnswer("wbinfo", "", 1);
    EXPECT_EQ(VORNWinUpdateAllDomains(), -1);
    EXPECT_EQ(LastError(), ErrorCode::Unreachable);
    EXPECT_EQ(DnsNameOf("NEW"), "new.test");
    BeNoMember();
    EXPECT_EQ(VORNWinUpdateAllDomains(), -1);
    EXPECT_EQ(LastError(), ErrorCode::NotMember);
    EXPECT_EQ(VORNWinUpdateOU(), -1);
    EXPECT_EQ(LastError(), ErrorCode::NotMember);
}

TEST_F(OperationsTest, FetchRefusesWhatItCannotDo) {
    List domains({"LAB"});
    List empty;
    EXPECT_EQ(VORNWinGetDomainUGByDomain(2, domains.get()), -1);
    EXPECT_EQ(LastError(), ErrorCode::BadArgument);
    EXPECT_EQ(VORNWinGetDomainUGByDomain(-1, domains.get()), -1);
    EXPECT_EQ(VORNWinGetDomainUGByDomain(0, nullptr), -1);
    EXPECT_EQ(VORNWinGetDomainUGByDomain(0, empty.get()), -1);
    BeNoMember();
    EXPECT_EQ(VORNWinGetDomainUGByDomain(0, domains.get()), -1);
    EXPECT_EQ(LastError(), ErrorCode::NotMember);
}

TEST_F(OperationsTest, FetchTellsAFailureAndKeepsTheList) {
    MakeMember(false);
    PutAnswer("nmblookup", "", 1);
    Publish(EntryKind::Group, "OTHER", {"zgroup"});
    List domains({"OTHER", "other", "OTHER"});
    EXPECT_EQ(VORNWinGetDomainUGByDomain(1, domains.get()), -1);
    EXPECT_EQ(LastError(), ErrorCode::Unreachable);
    EXPECT_THAT(Listed(EntryKind::Group, "OTHER"), ElementsAre("zgroup"));
    EXPECT_NE(Got(Path(appliance::kRefreshProgress)).find("\"domains\":1"), std::string::npos);
}

TEST_F(OperationsTest, AFetchThatStoresAPartIsAFailureOfItsOwn) {
    MakeMember(false);
    const appliance::FileDescriptor controller = ListenAsController();
    PutAnswer("nmblookup", "", 1);
    PutAnswer("rpcclient", "index: 0x1 RID: 0x3e8 acb: 0x00000010 Account: alice\tName: Alice\tDesc: \n");
    Publish(EntryKind::User, "OTHER", {"zed"});
    List domains({"OTHER", "LAB"});
    EXPECT_EQ(VORNWinGetDomainUGByDomain(0, domains.get()), 1);
    EXPECT_EQ(LastError(), ErrorCode::Unreachable);
    EXPECT_THAT(Listed(EntryKind::User, "LAB"), ElementsAre("alice"));
    EXPECT_THAT(Listed(EntryKind::User, "OTHER"), ElementsAre("zed"));
    PutAnswer("rpcclient", "", 1);
    EXPECT_EQ(VORNWinGetDomainUGByDomain(0, domains.get()), -1);
}

// As callers that look at the pid file first do, it counts a fetch that runs as its own.
TEST_F(OperationsTest, FetchStepsAsideForOneThatRuns) {
    int ends[2];
    ASSERT_EQ(pipe(ends), 0);
    const pid_t other = Fork([&ends] {
        close(ends[1]);
        char byte = 0;
        return appliance::WritePidFile(appliance::FetchPidFile(EntryKind::User)) && read(ends[0], &byte, 1) == 0;
    });
    ASSERT_TRUE(Eventually([other] { return appliance::ReadPidFile(Path(appliance::kUserPid)) == other; }));
    List domains({"NOWHERE"});
    EXPECT_EQ(VORNWinGetDomainUGByDomain(0, domains.get()), 0);
    close(ends[1]);
    EXPECT_EQ(WaitFor(other), 0);
    close(ends[0]);
    EXPECT_EQ(VORNWinGetDomainUGByDomain(0, domains.get()), -1);
}

TEST_F(OperationsTest, IncludesHomeFoldersAndReloadsOnce) {
    const std::string before = Got(Path(appliance::kSmbConf));
    EXPECT_EQ(VORNDomainUserHomeInclude(1), 0);
    EXPECT_EQ(VORNDomainUserHomeInclude(1), 0);
    EXPECT_THAT(reloaded, ElementsAre("samba"));
    EXPECT_NE(Got(Path(appliance::kSmbConf)), before);
    EXPECT_EQ(VORNDomainUserHomeInclude(0), 0);
    EXPECT_EQ(VORNDomainUserHomeInclude(0), 0);
    EXPECT_THAT(reloaded, ElementsAre("samba", "samba"));
    EXPECT_EQ(Got(Path(appliance::kSmbConf)), before);
    EXPECT_EQ(VORNDomainUserHomeInclude(2), -1);
    EXPECT_EQ(LastError(), ErrorCode::BadArgument);
    Put(Path(appliance::kSmbConf), "[data]\n");
    EXPECT_EQ(VORNDomainUserHomeInclude(1), -1);
    EXPECT_EQ(LastError(), ErrorCode::FileWrite);
}

TEST_F(OperationsTest, TellsThatAdministratorsCannotBeChanged) {
    PutAnswer("net", "", 255);
    EXPECT_EQ(VORNGroupAddDomainAdminGroup(), -1);
    EXPECT_EQ(LastError(), ErrorCode::CommandFailed);
    BeNoMember();
    EXPECT_EQ(VORNGroupAddDomainAdminGroup(), -1);
    EXPECT_EQ(LastError(), ErrorCode::NotMember);
}

class StartTest : public OperationsTest {
protected:
    StartTest() {
        for (const char* path : {"/usr/vorn/sbin", "/etc/cron.d"}) {
            mkdir(Path(path).c_str(), 0755);
        }
        Put(Path(appliance::kVornwin), "#!/bin/sh\necho \"$*\" >> '" + folder / "started" + "'\n");
        chmod(Path(appliance::kVornwin).c_str(), 0755);
    }
};

TEST_F(StartTest, AdministratorsAreChangedLaterWhileWinbindIsBusy) {
    PutAnswer("net", "", 255);
    EXPECT_EQ(VORNGroupAddDomainAdminGroup(), -1);
    EXPECT_EQ(Got(folder / "started"), "<missing>");
    PutProgram("net", "sleep 30");
    EXPECT_EQ(VORNGroupAddDomainAdminGroup(), -1);
    EXPECT_EQ(LastError(), ErrorCode::TimedOut);
    EXPECT_TRUE(Eventually([this] { return Got(folder / "started") == "-domainAdmins\n"; }));
}

class TimeTaskTest : public StartTest {
protected:
    static void Switch(const std::string& value) {
        Put(Path(appliance::kSmbConf), "[global]\n    workgroup = LAB\n    vorn sync dctime = " + value + "\n");
    }
    static int SyncTasks() {
        struct _tag_vorn_sched_task_* list = nullptr;
        static int count;
        count = 0;
        EXPECT_GE(VORNSchedTaskListGet(&list,
                                       [](struct _tag_vorn_sched_task_* task) {
                                           char command[256] = {};
                                           if (VORNSchedCTaskGetCommand(command, sizeof(command), task) >= 0 &&
                                               strcmp(command, appliance::kSyncTimeCommand) == 0) {
                                               ++count;
                                           }
                                           return 0;
                                       }),
                  0);
        VORNSchedTaskListFree(&list);
        return count;
    }
};

TEST_F(TimeTaskTest, FollowsTheSwitch) {
    Switch("yes");
    EXPECT_EQ(appliance::ApplyTimeSynchronisation(), 0);
    EXPECT_EQ(SyncTasks(), 1);
    EXPECT_TRUE(Eventually([this] { return Got(folder / "started") == "-syncTime\n"; }));
    EXPECT_NE(Got(Path(appliance::kCronTable)).find("vornwin -syncTime"), std::string::npos);
    EXPECT_EQ(appliance::ApplyTimeSynchronisation(), 0);
    EXPECT_EQ(SyncTasks(), 1);
    EXPECT_TRUE(Eventually([this] { return Got(folder / "started") == "-syncTime\n-syncTime\n"; }));
    Switch("no");
    EXPECT_EQ(appliance::ApplyTimeSynchronisation(), 0);
    EXPECT_EQ(SyncTasks(), 0);
    EXPECT_EQ(appliance::ApplyTimeSynchronisation(), 0);
    EXPECT_EQ(Got(folder / "started"), "-syncTime\n-syncTime\n");
}

}  // namespace
}  // namespace appliance_test
