#include "appliance/domain/directory/fetch.h"

#include <json/reader.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <sstream>
#include <thread>

#include "appliance/base/file.h"
#include "appliance/base/paths.h"
#include "appliance/base/process.h"
#include "appliance/domain/directory/domain_list.h"
#include "appliance/domain/directory/fetch_source.h"
#include "tests/appliance/directory/directory_test.h"

namespace appliance_test {
namespace {

using appliance::EntryKind;
using appliance::ErrorCode;
using appliance::FetchDirectory;
using appliance::FetchResult;
using Names = std::vector<std::string>;

constexpr char kAlice[] = "index: 0x1 RID: 0x3e8 acb: 0x00000010 Account: alice\tName: Alice\tDesc: \n";
constexpr char kMachine[] = "index: 0x2 RID: 0x3e9 acb: 0x00000010 Account: NAS1$\tName: \tDesc: \n";
constexpr char kBob[] =
    "index: 0x3 RID: 0xf4240 acb: 0x00000010 Account: bob\tName: Bob\tDesc: \n";  // beyond the range

// An NT4-style member whose controller is a port on the loopback and a program that prints what rpcclient would.
class FetchTest : public DirectoryTest {
protected:
    FetchTest() {
        MakeMember(false);
        EXPECT_TRUE(appliance::SaveDomains({{"LAB", "", true}, {"OTHER", "", false}}));
        PutAnswer("nmblookup", "", 1);
        PutAnswer("wbinfo", "", 1);
        listener_ = ListenAsController();
    }

    static Json::Value Progress() {
        Json::Value value;
        std::istringstream text(Got(appliance::Path(appliance::kRefreshProgress)));
        EXPECT_TRUE(Json::parseFromStream(Json::CharReaderBuilder(), text, &value, nullptr));
        return value;
    }

    appliance::FileDescriptor listener_;
};

TEST_F(FetchTest, StoresTheUsersOfTheOwnDomain) {
    PutAnswer("rpcclient", std::string(kAlice) + kMachine + kBob);
    const FetchResult result = FetchDirectory(EntryKind::User, {"lab"});
    EXPECT_TRUE(result.started);
    EXPECT_EQ(result.stored, 1);
    EXPECT_TRUE(result.failures.empty());
    const auto page = appliance::ReadEntries(EntryKind::User, "LAB", 0, 10);
    ASSERT_TRUE(page);
    ASSERT_EQ(page->entries.size(), 2u);
    EXPECT_EQ(page->entries[0].name, "alice");
    EXPECT_EQ(page->entries[0].id, 1001000);
    EXPECT_EQ(page->entries[0].display, "Alice");
    EXPECT_EQ(page->entries[1].name, "bob");
    EXPECT_FALSE(page->entries[1].id);
    EXPECT_EQ(page->list.source, "rpc");
    EXPECT_EQ(page->list.controller, ControllerAddress());
    const Json::Value progress = Progress();
    EXPECT_EQ(progress["kind"].asString(), "user");
    EXPECT_EQ(progress["count"].asInt(), 2);
    EXPECT_EQ(progress["domains"].asInt(), 1);
    EXPECT_EQ(progress["domains_done"].asInt(), 1);
    EXPECT_TRUE(progress["errors"].isArray());
    EXPECT_EQ(progress["errors"].size(), 0u);
    EXPECT_LE(progress["started"].asInt64(), progress["updated"].asInt64());
    EXPECT_EQ(Got(appliance::FetchPidFile(EntryKind::User)), "<missing>");
}

TEST_F(FetchTest, AsksForGroupsByTheirOwnQuestion) {
    PutProgram("rpcclient", "echo \"$*\" > '" + folder / "asked" +
                                "'\nprintf 'index: 0x1 RID: 0x201 acb: 0x00000007 Account: Domain Users\\tDesc: x\\n'");
    EXPECT_EQ(FetchDirectory(EntryKind::Group, {"LAB"}).stored, 1);
    EXPECT_EQ(Listed(EntryKind::Group, "LAB"), Names{"Domain Users"});
    EXPECT_EQ(Got(folder / "asked"), "--configfile=" + appliance::Path(appliance::kSmbConf) +
                                         " -P -c querydispinfo 3 " + ControllerAddress() + "\n");
}

TEST_F(FetchTest, StoresTheOthersWhenOneDomainIsDead) {
    PutAnswer("rpcclient", kAlice);
    Publish(EntryKind::User, "OTHER", {"zed"});
    ASSERT_EQ(unlink(appliance::ListLinkPath(EntryKind::User, "OTHER").c_str()), 0);
    const FetchResult result = FetchDirectory(EntryKind::User, {"OTHER", "LAB"});
    EXPECT_TRUE(result.started);
    EXPECT_EQ(result.stored, 1);
    EXPECT_EQ(result.code, ErrorCode::Unreachable);
    ASSERT_EQ(result.failures.size(), 1u);
    EXPECT_EQ(result.failures[0].domain, "OTHER");
    EXPECT_EQ(Listed(EntryKind::User, "LAB"), Names{"alice"});
    EXPECT_EQ(Listed(EntryKind::User, "OTHER"), Names{"zed"});
    EXPECT_NE(Got(appliance::ListLinkPath(EntryKind::User, "OTHER")), "<missing>");
    const Json::Value errors = Progress()["errors"];
    ASSERT_EQ(errors.size(), 1u);
    EXPECT_EQ(errors[0]["domain"].asString(), "OTHER");
    EXPECT_EQ(errors[0]["kind"].asString(), "user");
    EXPECT_EQ(errors[0]["reason"].asString(), "no domain controller of OTHER can be found");
}

// It answers in the end: its list is new, too, but no other domain has waited for it.
TEST_F(FetchTest, ASilentDomainLetsTheOthersGoFirst) {
    EXPECT_TRUE(appliance::SaveDomains({{"LAB", "", true}, {"OTHER", "", false}}));
    PutProgram("nmblookup", "echo '" + ControllerAddress() + " OTHER<1b>'");
    // The first question, which is about OTHER, has no answer.
    PutProgram("rpcclient", "if [ ! -e '" + folder / "asked" + "' ]; then touch '" + folder / "asked" +
                                "'; exec sleep 60; fi\nprintf '" + kAlice + "'");
    const FetchResult result = FetchDirectory(EntryKind::User, {"OTHER", "LAB"});
    EXPECT_EQ(result.stored, 2);
    EXPECT_TRUE(result.failures.empty());
    const auto lab = appliance::ReadEntries(EntryKind::User, "LAB", 0, 1);
    const auto other = appliance::ReadEntries(EntryKind::User, "OTHER", 0, 1);
    ASSERT_TRUE(lab && other);
    struct stat first {};
    struct stat second {};
    ASSERT_EQ(stat(appliance::ListPath(EntryKind::User, "LAB").c_str(), &first), 0);
    ASSERT_EQ(stat(appliance::ListPath(EntryKind::User, "OTHER").c_str(), &second), 0);
    EXPECT_LT(std::pair(first.st_mtim.tv_sec, first.st_mtim.tv_nsec),
              std::pair(second.st_mtim.tv_sec, second.st_mtim.tv_nsec));
    EXPECT_EQ(Progress()["domains_done"].asInt(), 2);
}

TEST_F(FetchTest, KeepsTheGoodListFromBadAnswers) {
    Publish(EntryKind::User, "LAB", {"old"});
    const std::pair<std::string, int> answers[] = {
        {"", 0},                          // empty
        {kMachine, 0},                    // begins in the middle
        {std::string(kAlice) + kBob, 0},  // a line is missing
        {kAlice, 1},                      // ended badly
        {std::string(kAlice) + "result was NT_STATUS_IO_TIMEOUT\n", 0},
        {"Cannot connect to server.  Error was NT_STATUS_LOGON_FAILURE\n", 1},
    };
    for (const auto& [output, code] : answers) {
        PutAnswer("rpcclient", output, code);
        const FetchResult result = FetchDirectory(EntryKind::User, {"LAB"});
        EXPECT_EQ(result.stored, 0) << output;
        EXPECT_EQ(result.failures.size(), 1u) << output;
        EXPECT_EQ(Listed(EntryKind::User, "LAB"), Names{"old"}) << output;
    }
}

TEST_F(FetchTest, StepsAsideForAFetchThatRuns) {
    PutProgram("rpcclient", "touch '" + folder / "running" + "'\nwhile [ ! -e '" + folder / "go" +
                                "' ]; do sleep 0.02; done\nprintf '" + kAlice + "'");
    const pid_t other = Fork([] { return FetchDirectory(EntryKind::User, {"LAB"}).stored == 1; });
    ASSERT_TRUE(Eventually([this] { return Got(folder / "running") != "<missing>"; }));
    EXPECT_EQ(appliance::ReadPidFile(appliance::FetchPidFile(EntryKind::User)), other);
    const FetchResult result = FetchDirectory(EntryKind::User, {"LAB"});
    EXPECT_FALSE(result.started);
    EXPECT_EQ(result.code, ErrorCode::FileLock);
    Put(folder / "go", "");
    EXPECT_EQ(WaitFor(other), 0);
    EXPECT_EQ(Listed(EntryKind::User, "LAB"), Names{"alice"});
    EXPECT_LT(appliance::ReadPidFile(appliance::FetchPidFile(EntryKind::User)), 0);
}

TEST_F(FetchTest, GoesAwayWithItsProcessGroup) {
    PutProgram("rpcclient", "echo $$ > '" + folder / "pid" + "'\nexec sleep 60");
    const pid_t task = Fork([] {
        setpgid(0, 0);
        FetchDirectory(EntryKind::User, {"LAB"});
        return true;
    });
    pid_t program = 0;
    ASSERT_TRUE(Eventually([&] {
        program = std::atoi(Got(folder / "pid").c_str());
        return program > 0;
    }));
    EXPECT_EQ(kill(-task, SIGTERM), 0);
    EXPECT_EQ(WaitFor(task), 1000 + SIGTERM);
    EXPECT_TRUE(Eventually([program] { return !appliance::ProcessStart(program); }));
    EXPECT_LT(appliance::ReadPidFile(appliance::FetchPidFile(EntryKind::User)), 0);
}

// A killed fetch takes its helpers with it, and leaves nothing that blocks the next.
TEST_F(FetchTest, MayBeKilled) {
    PutProgram("rpcclient", "echo $$ > '" + folder / "pid" + "'\nexec sleep 60");
    const pid_t task = Fork([] {
        FetchDirectory(EntryKind::User, {"LAB"});
        return true;
    });
    pid_t program = 0;
    ASSERT_TRUE(Eventually([&] {
        program = std::atoi(Got(folder / "pid").c_str());
        return program > 0;
    }));
    kill(task, SIGKILL);
    EXPECT_EQ(WaitFor(task), 1000 + SIGKILL);
    EXPECT_TRUE(Eventually([program] { return !appliance::ProcessStart(program); }));
    const std::string data = appliance::Path(appliance::kDirectoryData);
    Put(data + "/.group_LAB.db.AbCdEf", "another fetch's");
    const auto files = [&data] {
        Names names;
        for (const auto& file : std::filesystem::directory_iterator(data)) {
            names.push_back(file.path().filename());
        }
        std::sort(names.begin(), names.end());
        return names;
    };
    EXPECT_EQ(files().size(), 2u);
    PutAnswer("rpcclient", kAlice);
    EXPECT_EQ(FetchDirectory(EntryKind::User, {"LAB"}).stored, 1);
    EXPECT_EQ(files(), (Names{".group_LAB.db.AbCdEf", "user_LAB.db"}));
}

TEST_F(FetchTest, RefusesDomainsThatAreNotInSight) {
    for (const char* domain : {"NOWHERE", "", "../LAB", "-P", "a\nb"}) {
        const FetchResult result = FetchDirectory(EntryKind::User, {domain});
        EXPECT_EQ(result.stored, 0);
        EXPECT_EQ(result.code, ErrorCode::NotFound);
    }
    EXPECT_TRUE(appliance::FindLists().empty());
}

TEST_F(FetchTest, NeedsAMembership) {
    Put(appliance::Path(appliance::kSmbConf), "[global]\n    workgroup = LAB\n    security = user\n");
    FetchResult result = FetchDirectory(EntryKind::User, {"LAB"});
    EXPECT_FALSE(result.started);
    EXPECT_EQ(result.code, ErrorCode::NotMember);
    unlink(appliance::Path(appliance::kSmbConf).c_str());
    result = FetchDirectory(EntryKind::User, {"LAB"});
    EXPECT_FALSE(result.started);
    EXPECT_EQ(result.code, ErrorCode::FileRead);
    EXPECT_EQ(Got(appliance::FetchPidFile(EntryKind::User)), "<missing>");
}

TEST_F(FetchTest, GivesANewDomainARangeOfIds) {
    Put(appliance::Path(appliance::kSmbConf),
        "[global]\n    workgroup = LAB\n    netbios name = NAS1\n    security = domain\n    password server = " +
            ControllerAddress() + "\n");
    PutAnswer("rpcclient", kAlice);
    const FetchResult result = FetchDirectory(EntryKind::User, {"LAB"});
    EXPECT_TRUE(result.newRanges);
    EXPECT_EQ(appliance::ReadEntries(EntryKind::User, "LAB", 0, 1)->entries.at(0).id, 1001000);
    EXPECT_FALSE(FetchDirectory(EntryKind::User, {"LAB"}).newRanges);
}

TEST(IdTest, CountsFromTheLowEndOfTheRange) {
    appliance::FetchDomain domain;
    EXPECT_FALSE(appliance::IdOf(domain, 500));
    domain.range.emplace(1000000, 1999999);
    EXPECT_EQ(appliance::IdOf(domain, 500), 1000500);
    EXPECT_EQ(appliance::IdOf(domain, 999999), 1999999);
    EXPECT_FALSE(appliance::IdOf(domain, 1000000));
    EXPECT_FALSE(appliance::IdOf(domain, 0xFFFFFFFF));
}

}  // namespace
}  // namespace appliance_test
