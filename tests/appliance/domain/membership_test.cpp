// The contract's operations on the membership, on files and tools of the test.

#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <thread>

#include "appliance/base/error_code.h"
#include "appliance/base/paths.h"
#include "appliance/domain/membership/last_test.h"
#include "platform/core.h"
#include "platform/domain.h"
#include "tests/appliance/join/join_test.h"

namespace {

using appliance::ErrorCode;
using join_test::kWorkgroupConf;
using testing::HasSubstr;
using testing::Not;

constexpr char kLive[] = "/var/lib/samba/private/secrets.tdb";

int Code(ErrorCode code) {
    return static_cast<int>(code);
}

class Operations : public join_test::JoinTest {
protected:
    Operations() {
        VLIBCErrSetEx(0, "", 0);
    }

    struct Answer {
        int result = 0;
        std::string name;
        int first = -7;
        int second = -7;
    };
    static Answer Query(int size = 128) {
        Answer answer;
        std::string buffer(256, '\0');
        answer.result = WINIQuery1(buffer.data(), size, &answer.first, &answer.second);
        answer.name = buffer.c_str();
        return answer;
    }
};

TEST_F(Operations, AWorkgroupIsNoDomain) {
    const Answer answer = Query();
    EXPECT_EQ(answer.result, 0);
    EXPECT_EQ(answer.name, "WORKGROUP");
    EXPECT_EQ(answer.first, 0);
    EXPECT_EQ(answer.second, 0);
    EXPECT_EQ(VORNWinsIsJoined(), 0);
    EXPECT_EQ(VORNWinADSJoined(), 0);
    EXPECT_EQ(VORNWinsIsOwnDomain("WORKGROUP"), 0);
    EXPECT_EQ(VORNWinTestJoin(0), -1);
    EXPECT_EQ(VLIBCErrGet(), Code(ErrorCode::NotMember));
    EXPECT_THAT(Calls(), testing::IsEmpty());
}

TEST_F(Operations, AMemberOfActiveDirectory) {
    MakeMember("ads", "LAB", "LAB.TEST");
    const Answer answer = Query();
    EXPECT_EQ(answer.name, "LAB");
    EXPECT_NE(answer.first, 0);
    EXPECT_NE(answer.second, 0);
    EXPECT_NE(VORNWinsIsJoined(), 0);
    EXPECT_NE(VORNWinADSJoined(), 0);
    for (const char* name : {"LAB", "lab", "lab.test", "Lab.Test"}) {
        EXPECT_NE(VORNWinsIsOwnDomain(name), 0) << name;
    }
    for (const char* name : {"", "LA", "lab.test.", "OTHER"}) {
        EXPECT_EQ(VORNWinsIsOwnDomain(name), 0) << name;
    }
    EXPECT_EQ(VORNWinsIsOwnDomain(nullptr), 0);
    char workgroup[4] = {};
    EXPECT_EQ(VORNWorkgroupGet(workgroup, sizeof(workgroup)), 0);
    EXPECT_STREQ(workgroup, "LAB");
    EXPECT_EQ(Query(3).name, "LA");
}

TEST_F(Operations, AMemberOfAnNt4StyleDomainHasNoRealm) {
    MakeMember("DOMAIN", "NT4DOM", "");
    EXPECT_NE(Query().second, 0);
    EXPECT_EQ(VORNWinADSJoined(), 0);
    EXPECT_EQ(VORNWinsIsOwnDomain(""), 0);
}

// Without its secret it is still configured as a member, or it could never leave.
TEST_F(Operations, ABrokenMembershipIsConfiguredButNotUsable) {
    MakeMember("ads", "LAB", "LAB.TEST");
    for (const bool damaged : {false, true}) {
        unlink(At(kLive).c_str());
        if (damaged) {
            Put(kLive, "rubbish");
        }
        const Answer answer = Query();
        EXPECT_EQ(answer.result, 0);
        EXPECT_NE(answer.first, 0);
        EXPECT_EQ(answer.second, 0);
        EXPECT_EQ(VORNWinsIsJoined(), 0);
    }
    int first = 0;
    char name[16] = {};
    EXPECT_EQ(WINIQuery1(name, sizeof(name), &first, nullptr), 0);
    EXPECT_NE(first, 0);
}

TEST_F(Operations, WithoutAConfigurationNothingIsKnown) {
    unlink(At(appliance::kSmbConf).c_str());
    EXPECT_EQ(Query().result, -1);
    EXPECT_EQ(VLIBCErrGet(), Code(ErrorCode::FileRead));
    EXPECT_STREQ(VLIBCErrorGetFile(), "membership_ops.cpp");
    EXPECT_GT(VLIBCErrorGetLine(), 0);
    char name[16] = {};
    EXPECT_EQ(VORNWorkgroupGet(name, sizeof(name)), -1);
    EXPECT_EQ(VORNWinsIsJoined(), 0);
    EXPECT_EQ(VORNWinADSJoined(), 0);
    EXPECT_EQ(VORNWinsSetSectionKey("global", "vorn sync dctime", "yes"), -1);
    EXPECT_FALSE(Exists(appliance::kSmbConf));
    int first = 0;
    EXPECT_EQ(WINIQuery1(nullptr, 5, &first, nullptr), -1);
    Put(appliance::kSmbConf, "[global]\n\tsecurity = user\n");
    EXPECT_EQ(Query().result, -1);
}

TEST_F(Operations, TheTestIsTheControllersWord) {
    MakeMember("ads", "LAB", "LAB.TEST");
    Tool("/usr/bin/net", "echo Join is OK");
    EXPECT_EQ(VORNWinTestJoin(1), 0);
    EXPECT_THAT(Calls()[0], HasSubstr("ads testjoin"));
    Tool("/usr/bin/net", "exit 0");
    EXPECT_EQ(VORNWinTestJoin(1), -1);
    EXPECT_EQ(VLIBCErrGet(), Code(ErrorCode::Unreachable));
    Tool("/usr/bin/net", "echo Preauthentication failed >&2; exit 255");
    EXPECT_EQ(VORNWinTestJoin(1), -1);
    EXPECT_EQ(VLIBCErrGet(), Code(ErrorCode::Refused));
    Tool("/usr/bin/net", "echo \"Join to 'LAB' is OK\"");
    EXPECT_EQ(VORNWinTestJoin(0), 0);
    EXPECT_THAT(Calls().back(), HasSubstr("rpc testjoin"));
}

TEST_F(Operations, EveryTestOfAMemberIsKept) {
    EXPECT_EQ(VORNWinTestJoin(1), -1);
    EXPECT_FALSE(Exists(appliance::kLastTest));
    MakeMember("ads", "LAB", "LAB.TEST");
    appliance::Membership membership;
    ASSERT_FALSE(appliance::ReadMembership(membership));
    EXPECT_FALSE(appliance::ReadLastTest(membership));
    struct Row {
        const char* tool;
        bool success;
    };
    for (const Row& row : {Row{"sleep 0.2; echo Join is OK", true}, Row{"exit 1", false},
                           Row{"echo Preauthentication failed >&2; exit 255", false}, Row{"echo Join is OK", true}}) {
        Tool("/usr/bin/net", row.tool);
        const std::time_t before = time(nullptr);
        EXPECT_EQ(VORNWinTestJoin(1), row.success ? 0 : -1);
        const auto test = appliance::ReadLastTest(membership);
        ASSERT_TRUE(test) << row.tool;
        EXPECT_EQ(test->success, row.success) << row.tool;
        EXPECT_GE(test->time, before);
        EXPECT_LE(test->time, time(nullptr));
        EXPECT_GE(test->milliseconds, strstr(row.tool, "sleep") != nullptr ? 200 : 0);
        EXPECT_LT(test->milliseconds, 12000);
    }
    struct stat file {};
    ASSERT_EQ(stat(At(appliance::kLastTest).c_str(), &file), 0);
    EXPECT_EQ(file.st_mode & 07777, 0600U);
    // Of another domain, or of none.
    appliance::Membership other = membership;
    other.domain = "OTHER";
    EXPECT_FALSE(appliance::ReadLastTest(other));
    Put(appliance::kSmbConf, kWorkgroupConf);
    EXPECT_EQ(VORNWinTestJoin(1), -1);
    ASSERT_FALSE(appliance::ReadMembership(other));
    EXPECT_FALSE(appliance::ReadLastTest(other));
}

TEST_F(Operations, ATestThatCanNotBeKeptIsATestNevertheless) {
    MakeMember("ads", "LAB", "LAB.TEST");
    Tool("/usr/bin/net", "echo Join is OK");
    std::filesystem::create_directories(At(appliance::kLastTest));
    EXPECT_EQ(VORNWinTestJoin(1), 0);
    rmdir(At(appliance::kLastTest).c_str());
    appliance::Membership membership;
    ASSERT_FALSE(appliance::ReadMembership(membership));
    for (const char* record : {"", "{", "[]", "{\"time\":1}", "{\"time\":1,\"success\":1,\"milliseconds\":1}"}) {
        Put(appliance::kLastTest, record);
        EXPECT_FALSE(appliance::ReadLastTest(membership)) << record;
    }
    EXPECT_EQ(VORNWinTestJoin(1), 0);
    EXPECT_TRUE(appliance::ReadLastTest(membership));
    appliance::ForgetLastTest();
    EXPECT_FALSE(Exists(appliance::kLastTest));
}

// What was tested is no longer there when the answer comes.
TEST_F(Operations, ATestThatOutlivesItsMembershipIsNotKept) {
    MakeMember("ads", "LAB", "LAB.TEST");
    Put("/workgroup.conf", kWorkgroupConf);
    Tool("/usr/bin/net", "cp $R/workgroup.conf $R/usr/vorn/etc/smb.conf; echo Join is OK");
    EXPECT_EQ(VORNWinTestJoin(1), 0);
    EXPECT_FALSE(Exists(appliance::kLastTest));
}

TEST_F(Operations, AControllerThatIsBackIsAskedThoughSambaLeavesItAlone) {
    MakeMember("ads", "LAB", "LAB.TEST");
    Tool("/usr/bin/net",
         "for word; do case $word in *'lock directory='*) test -d \"${word#*directory=}\" && "
         "test -z \"$(ls \"${word#*directory=}\")\" && touch \"${word#*directory=}/known\" && "
         "echo Join is OK && exit;; esac; done; echo No logon servers >&2; exit 255");
    EXPECT_EQ(VORNWinTestJoin(1), 0);
    EXPECT_EQ(Calls().size(), 2U);
    EXPECT_THAT(Calls()[0], Not(HasSubstr("lock directory")));
    EXPECT_EQ(VORNWinTestJoin(1), 0);
    for (const auto& entry : std::filesystem::directory_iterator(appliance::Path(appliance::kRun))) {
        EXPECT_THAT(entry.path().filename().string(), Not(HasSubstr("samba-call")));
    }
}

TEST_F(Operations, ARefusalIsNotAskedForTwice) {
    MakeMember("ads", "LAB", "LAB.TEST");
    Tool("/usr/bin/net", "echo Preauthentication failed >&2; exit 255");
    EXPECT_EQ(VORNWinTestJoin(1), -1);
    EXPECT_EQ(Calls().size(), 1U);
}

TEST_F(Operations, AHangingControllerDoesNotHoldUpTheTestForEver) {
    MakeMember("ads", "LAB", "LAB.TEST");
    Tool("/usr/bin/net", "sleep 100");
    const auto began = std::chrono::steady_clock::now();
    EXPECT_EQ(VORNWinTestJoin(1), -1);
    EXPECT_LT(std::chrono::steady_clock::now() - began, std::chrono::seconds(25));
}

TEST_F(Operations, TheTrustedDomainSettingIsStored) {
    const std::string conf = Content(appliance::kSmbConf);
    EXPECT_EQ(VORNWinIsEnableTrustDomain(), 1);
    EXPECT_EQ(VORNWinSetTrustDomain(0), 0);
    EXPECT_EQ(Content(appliance::kSettings), "trustdomain=no\nenableduserhome=no\n");
    EXPECT_EQ(VORNWinIsEnableTrustDomain(), 0);
    EXPECT_EQ(VORNWinSetTrustDomain(1), 0);
    EXPECT_EQ(Content(appliance::kSettings), "trustdomain=yes\nenableduserhome=no\n");
    EXPECT_EQ(Content(appliance::kSmbConf), conf);
    EXPECT_EQ(VORNWinSetTrustDomain(2), -1);
    EXPECT_EQ(VORNWinSetTrustDomain(-1), -1);
    EXPECT_EQ(VLIBCErrGet(), Code(ErrorCode::BadArgument));
    Put(appliance::kSettings, "a=b\n");
    EXPECT_EQ(VORNWinIsEnableTrustDomain(), 1);
}

TEST_F(Operations, OneKeyOfTheConfigurationIsWritten) {
    EXPECT_EQ(VORNWinsSetSectionKey("data", "read only", "no"), 0);
    const std::string conf = Content(appliance::kSmbConf);
    EXPECT_EQ(conf, std::string(kWorkgroupConf) + "\tread only = no\n");
    struct stat file {};
    ASSERT_EQ(stat(At(appliance::kSmbConf).c_str(), &file), 0);
    EXPECT_EQ(file.st_mode & 0777, 0640U);
    EXPECT_EQ(VORNWinsSetSectionKey("data", "path", "/x\n[global]"), -1);
    EXPECT_EQ(VLIBCErrGet(), Code(ErrorCode::BadData));
    EXPECT_EQ(VORNWinsSetSectionKey("data", "a=b", "x"), -1);
    EXPECT_EQ(VORNWinsSetSectionKey(nullptr, "a", "x"), -1);
    EXPECT_EQ(VORNWinsSetSectionKey("data", nullptr, "x"), -1);
    EXPECT_EQ(VORNWinsSetSectionKey("data", "a", nullptr), -1);
    EXPECT_EQ(Content(appliance::kSmbConf), conf);
}

TEST_F(Operations, WritersOfTheConfigurationLoseNothing) {
    std::vector<std::thread> threads;
    for (int writer = 0; writer < 4; ++writer) {
        threads.emplace_back([writer] {
            for (int turn = 0; turn < 10; ++turn) {
                const std::string key = "key" + std::to_string(writer) + "x" + std::to_string(turn);
                EXPECT_EQ(VORNWinsSetSectionKey("data", key.c_str(), "1"), 0);
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    for (int writer = 0; writer < 4; ++writer) {
        for (int turn = 0; turn < 10; ++turn) {
            EXPECT_THAT(Content(appliance::kSmbConf),
                        HasSubstr("key" + std::to_string(writer) + "x" + std::to_string(turn) + " = 1\n"));
        }
    }
}

TEST_F(Operations, AnLdapDirectoryIsOneThatPasswdNames) {
    struct Row {
        const char* text;
        int answer;
    };
    for (const Row& row : {Row{"passwd: files ldap\n", 1}, Row{"passwd:\tsss files\n", 1}, Row{"passwd: files\n", 0},
                           Row{"group: ldap\n", 0}, Row{"# passwd: ldap\n", 0}, Row{"passwd: files # ldap\n", 0},
                           Row{"passwd: ldapx\n", 0}, Row{"passwd: files winbind\npasswd: ldap\n", 1}, Row{"", 0}}) {
        Put("/etc/nsswitch.conf", row.text);
        EXPECT_EQ(VORNLDAPIsBinded(0), row.answer) << row.text;
    }
    unlink(At("/etc/nsswitch.conf").c_str());
    EXPECT_EQ(VORNLDAPIsBinded(0), 0);
}

TEST_F(Operations, ARecordWithoutItsTextsIsRefused) {
    const char* texts[3] = {"lab.test", "admin", "password"};
    for (int missing = 0; missing < 3; ++missing) {
        _tag_VORN_WIN2_ record{};
        record.joinMode = 1;
        record.domainName = missing == 0 ? nullptr : texts[0];
        record.userName = missing == 1 ? nullptr : texts[1];
        record.password = missing == 2 ? nullptr : texts[2];
        EXPECT_EQ(VORNWinJoin1(&record), -1);
        EXPECT_EQ(VLIBCErrGet(), Code(ErrorCode::BadArgument));
    }
    EXPECT_EQ(VORNWinJoin1(nullptr), -1);
    _tag_VORN_WIN2_ record{};
    record.joinMode = 2;
    record.domainName = record.userName = record.password = "x";
    EXPECT_EQ(VORNWinJoin1(&record), -1);
    EXPECT_THAT(Calls(), testing::IsEmpty());
}

TEST_F(Operations, TheRecordReachesTheJoinTool) {
    Tool(appliance::kVornjoin, "cat > $R/request; echo '{\"success\":true,\"key\":\"\",\"message\":\"\"}'");
    _tag_VORN_WIN2_ record{};
    record.joinMode = 1;
    record.domainName = "lab.test";
    record.userName = "admin";
    record.password = "canary-9917";
    // A field without its NUL is read to its end and no further.
    memset(record.kdc, 'k', sizeof(record.kdc));
    strcpy(record.fqdn, "LAB.TEST");
    strcpy(record.netbiosName, "LAB");
    EXPECT_EQ(VORNWinJoin1(&record), 0);
    const std::string request = Content("/request");
    EXPECT_THAT(request, HasSubstr("\"domain\":\"lab.test\""));
    EXPECT_THAT(request, HasSubstr("\"kdc\":\"" + std::string(128, 'k') + "\""));
    EXPECT_THAT(request, HasSubstr("\"fqdn\":\"LAB.TEST\""));
    EXPECT_THAT(request, HasSubstr("\"netbios_name\":\"LAB\""));
    EXPECT_THAT(request, HasSubstr("\"action\":\"join\""));
    EXPECT_THAT(request, testing::EndsWith("\ncanary-9917"));
    EXPECT_THAT(Content("/calls"), Not(HasSubstr("canary")));
    record.joinMode = 0;
    record.domainName = "WORKGROUP";
    record.userName = record.password = "";
    EXPECT_EQ(VORNWinJoin1(&record), 0);
    EXPECT_THAT(Content("/request"), HasSubstr("\"action\":\"leave\""));
}

// Two joins at a time, and each caller reads why its own failed, whatever became of the file.
TEST_F(Operations, TheStatusIsTheCallersOwn) {
    Tool(appliance::kVornjoin,
         "read request; case $request in *one.test*) m=one; sleep 0.3;; *) m=two;; esac\n"
         "printf 'join\\t%s\\n' $m > $R/var/log/winlock.state\n"
         "echo '{\"success\":false,\"key\":\"join\",\"message\":\"'$m'\"}'; exit 1");
    const auto join = [this](const char* domain, const char* expected) {
        _tag_VORN_WIN2_ record{};
        record.joinMode = 1;
        record.domainName = domain;
        record.userName = "admin";
        record.password = "x";
        EXPECT_NE(VORNWinJoin1(&record), 0);
        usleep(600000);
        unlink(At(appliance::kJoinStatus).c_str());
        char key[24] = {};
        char message[512] = {};
        EXPECT_EQ(ErrWINIState1Get(key, sizeof(key), message, sizeof(message)), 0);
        EXPECT_STREQ(key, "join");
        EXPECT_STREQ(message, expected);
    };
    std::thread first(join, "one.test", "one");
    std::thread second(join, "two.test", "two");
    first.join();
    second.join();
}

TEST_F(Operations, TheStatusFileOfAnotherProgramIsReadToo) {
    char key[24] = {};
    char message[512] = {};
    EXPECT_EQ(ErrWINIState1Get(key, sizeof(key), message, sizeof(message)), -1);
    EXPECT_EQ(VLIBCErrGet(), Code(ErrorCode::NotFound));
    Put(appliance::kJoinStatus, "join\tInvalid KDC ip.\n");
    EXPECT_EQ(ErrWINIState1Get(key, sizeof(key), message, sizeof(message)), 0);
    EXPECT_STREQ(key, "join");
    EXPECT_STREQ(message, "Invalid KDC ip.");
    EXPECT_EQ(ErrWINIState1Get(nullptr, 0, message, sizeof(message)), -1);
}

}  // namespace
