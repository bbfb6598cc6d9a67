// The join tool's jobs from the lock to the end, in an NT4-style domain whose controller and tools are made by the
// test.

#include "appliance/domain/join/membership_job.h"

#include <arpa/inet.h>
#include <json/json.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <sstream>

#include "appliance/base/file.h"
#include "appliance/base/file_lock.h"
#include "appliance/base/paths.h"
#include "appliance/base/process.h"
#include "tests/appliance/join/join_test.h"

namespace {

using appliance::JobResult;
using appliance::JoinRequest;
using join_test::kWorkgroupConf;
using join_test::SecretsOf;
using testing::Contains;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;
using testing::SizeIs;

constexpr char kLive[] = "/var/lib/samba/private/secrets.tdb";
constexpr char kCanary[] = "canary-5519";

class JobTest : public join_test::JoinTest {
protected:
    JobTest() {
        // An address of this test's own in the loopback network, with an open port for sessions.
        address_ = "127.77." + std::to_string(getpid() / 250 % 250 + 1) + "." + std::to_string(getpid() % 250 + 1);
        listener_.Reset(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
        sockaddr_in place{};
        place.sin_family = AF_INET;
        place.sin_port = htons(445);
        inet_pton(AF_INET, address_.c_str(), &place.sin_addr);
        const int yes = 1;
        setsockopt(listener_.get(), SOL_SOCKET, SO_REUSEADDR, &yes, sizeof(yes));
        bound_ = bind(listener_.get(), reinterpret_cast<sockaddr*>(&place), sizeof(place)) == 0 &&
                 listen(listener_.get(), 5) == 0;
        Tool("/usr/bin/nmblookup", "case \"$*\" in *NT4DOM#1B) echo '" + address_ + " NT4DOM<1b>';; *) exit 1;; esac");
        Tool("/usr/bin/rpcclient", "echo 'result was NT_STATUS_NONE_MAPPED'; exit 1");
        Tool("/usr/bin/wbinfo", "exit 0");
        Net("");
        std::map<std::string, std::string> records = {{"SECRETS/SID/NAS1", "machine sid"}};
        PutSecrets(kLive, records);
        // What a join of the tool's would store.
        PutSecrets("/joined.tdb", SecretsOf("NT4DOM", "", "new"));
    }

    void SetUp() override {
        ASSERT_TRUE(bound_) << address_;
    }

    // The tool "net": each verb succeeds as a controller's would, unless `first` has answered before.
    void Net(const std::string& first) {
        Tool("/usr/bin/net", "echo \"$PASSWD\" >> $R/passwords\n" + first +
                                 "\ncase \"$*\" in\n"
                                 "*'rpc info'*) echo 'Domain Name: NT4DOM';;\n"
                                 "*'rpc join'*) cp $R/joined.tdb $R/usr/vorn/etc/private/join/staging/secrets.tdb;;\n"
                                 "*testjoin*) echo \"Join to 'NT4DOM' is OK\";;\n"
                                 "*'user delete'*) exit 0;;\n"
                                 "*) exit 255;;\nesac");
    }

    JobResult Join(const std::string& user = "admin", const std::string& domain = "NT4DOM") {
        JoinRequest request;
        request.domain = domain;
        request.credentials = {user, appliance::Secret(kCanary)};
        return appliance::RunJob(request, {});
    }
    JobResult Leave() {
        JoinRequest request;
        request.action = JoinRequest::Action::Leave;
        request.domain = "WORKGROUP";
        return appliance::RunJob(request, {});
    }

    Json::Value Steps() const {
        Json::Value record;
        std::istringstream(Content(appliance::kJoinSteps)) >> record;
        return record;
    }

    void ExpectUntouched() {
        EXPECT_EQ(Content(appliance::kSmbConf), kWorkgroupConf);
        struct stat file {};
        ASSERT_EQ(stat(At(appliance::kSmbConf).c_str(), &file), 0);
        EXPECT_EQ(file.st_mode & 0777, 0640U);
        EXPECT_EQ(Secrets(kLive), (std::map<std::string, std::string>{{"SECRETS/SID/NAS1", "machine sid"}}));
        EXPECT_TRUE(std::filesystem::is_empty(At(appliance::kJoinJournal)));
        EXPECT_FALSE(Exists("/usr/vorn/etc/private/former_keys.json"));
        EXPECT_FALSE(Exists("/run/samba/winbindd.pid") && winbindRuns());
        EXPECT_THAT(Content(appliance::kSettings), Not(HasSubstr("domain_dns")));
    }
    bool winbindRuns() const {
        const int pid = std::atoi(Content("/run/samba/winbindd.pid").c_str());
        return pid > 1 && appliance::ProcessStart(pid).has_value();
    }
    // The password is nowhere under the root but where the fake tool wrote what it got by its environment.
    void ExpectNoCanary() {
        for (const auto& entry : std::filesystem::recursive_directory_iterator(root)) {
            if (entry.is_regular_file() && entry.path().filename() != "passwords") {
                std::ifstream file(entry.path());
                std::stringstream text;
                text << file.rdbuf();
                EXPECT_THAT(text.str(), Not(HasSubstr(kCanary))) << entry.path();
            }
        }
    }

    std::string address_;
    appliance::FileDescriptor listener_;
    bool bound_ = false;
};

TEST_F(JobTest, JoinsAndLeaves) {
    const JobResult result = Join();
    ASSERT_TRUE(result.success) << result.status.message;
    appliance::Membership membership;
    ASSERT_FALSE(appliance::ReadMembership(membership));
    EXPECT_EQ(membership.kind, appliance::DomainKind::Nt4);
    EXPECT_EQ(membership.domain, "NT4DOM");
    EXPECT_TRUE(membership.Joined());
    EXPECT_THAT(Content(appliance::kSettings), HasSubstr("domain_dns=192.0.2.1,192.0.2.2"));
    EXPECT_TRUE(winbindRuns());
    EXPECT_TRUE(std::filesystem::is_empty(At(appliance::kJoinJournal)));
    const Json::Value steps = Steps();
    EXPECT_EQ(steps["success"], true);
    EXPECT_EQ(steps["domain"], "NT4DOM");
    EXPECT_GT(steps["steps"].size(), 8U);
    for (const Json::Value& step : steps["steps"]) {
        EXPECT_EQ(step["outcome"], "ok") << step["name"];
    }
    EXPECT_THAT(Content("/passwords"), HasSubstr(kCanary));
    ExpectNoCanary();

    ASSERT_TRUE(Leave().success);
    EXPECT_EQ(Content(appliance::kSmbConf), kWorkgroupConf);
    EXPECT_THAT(Steps()["leftovers"][0].asString(), HasSubstr("NAS1$"));
    EXPECT_FALSE(winbindRuns());
    EXPECT_EQ(Secrets(kLive), (std::map<std::string, std::string>{{"SECRETS/SID/NAS1", "machine sid"}}));
    EXPECT_THAT(Content(appliance::kSettings), Not(HasSubstr("domain_dns")));
}

TEST_F(JobTest, TheToolsAreAskedWithASeparateConfigurationUntilTheJoinWorks) {
    ASSERT_TRUE(Join().success);
    EXPECT_THAT(Calls("rpc join"), testing::ElementsAre(HasSubstr("/usr/vorn/etc/private/join/staging/smb.conf")));
    EXPECT_THAT(Calls("testjoin"), testing::ElementsAre(HasSubstr("/usr/vorn/etc/private/join/staging/smb.conf")));
}

struct Failure {
    const char* name;
    const char* net;
    const char* wbinfo;
    const char* message;
    const char* step;
    bool namesServer = false;
};

class JobFailures : public JobTest, public testing::WithParamInterface<Failure> {};

TEST_P(JobFailures, LeaveEverythingAsItWas) {
    Net(GetParam().net);
    Tool("/usr/bin/wbinfo", GetParam().wbinfo);
    const JobResult result = Join();
    EXPECT_FALSE(result.success);
    const std::string message = std::string(GetParam().message) + (GetParam().namesServer ? address_ : "");
    EXPECT_EQ(result.status.message, message);
    EXPECT_EQ(result.status.key, GetParam().step);
    appliance::JoinStatus status;
    ASSERT_FALSE(appliance::ReadJoinStatus(status));
    EXPECT_EQ(status.message, message);
    EXPECT_EQ(Steps()["message"], message);
    EXPECT_EQ(Steps()["success"], false);
    ExpectUntouched();
    ExpectNoCanary();
    if (std::string(GetParam().step) != "credentials") {
        EXPECT_THAT(Calls("user delete"), testing::ElementsAre(HasSubstr("-- NAS1$")));
    }
}

INSTANTIATE_TEST_SUITE_P(
    Each, JobFailures,
    testing::Values(
        Failure{"password",
                "case \"$*\" in *'rpc info'*) echo 'The username or password was not correct.' >&2; exit 255;; esac",
                "exit 0", "The username or password was not correct.", "credentials"},
        Failure{"right",
                "case \"$*\" in *'rpc join'*) echo 'Failed to join domain: {Access Denied} x'; exit 255;; esac",
                "exit 0", "Unable to join domain: {Access Denied} x", "join"},
        Failure{"late failure of the tool",
                "case \"$*\" in *'rpc join'*) cp $R/joined.tdb $R/usr/vorn/etc/private/join/staging/secrets.tdb; "
                "echo 'Failed to join domain: odd'; exit 255;; esac",
                "exit 0", "Failed to join domain: odd", "join"},
        Failure{"killed tool", "case \"$*\" in *'rpc join'*) kill -9 $$;; esac", "exit 0", "Error System.", "join"},
        Failure{"not confirmed", "case \"$*\" in *testjoin*) exit 255;; esac", "exit 0", "Could not connect to server ",
                "confirm join", true},
        Failure{"no trust", "", "case \"$*\" in *check-secret*) exit 1;; esac",
                "Wbinfo fail. It might be domain name error.", "trust"}),
    [](const testing::TestParamInfo<Failure>& row) {
        std::string name;
        for (const char* letter = row.param.name; *letter != '\0'; ++letter) {
            name += *letter == ' ' ? '_' : *letter;
        }
        return name;
    });

TEST_F(JobTest, AnAccountThatWasThereBeforeStays) {
    Tool("/usr/bin/rpcclient", "echo 'name NAS1$: 0x458 (1)'");
    Net("case \"$*\" in *'rpc join'*) echo 'Failed to join domain: odd'; exit 255;; esac");
    EXPECT_FALSE(Join().success);
    EXPECT_THAT(Calls("user delete"), IsEmpty());
    ExpectUntouched();
}

TEST_F(JobTest, AnAccountThatCannotBeRemovedIsNamed) {
    Net("case \"$*\" in *'rpc join'*) echo 'Failed to join domain: odd'; exit 255;; *'user delete'*) exit 255;; esac");
    EXPECT_FALSE(Join().success);
    ASSERT_THAT(Steps()["leftovers"], SizeIs(1));
    EXPECT_THAT(Steps()["leftovers"][0].asString(), HasSubstr("NAS1$"));
}

// As it does while it looks for a trusted domain that is out of reach: the controller's own word counts then.
class BusyWinbind : public JobTest, public testing::WithParamInterface<const char*> {};

TEST_P(BusyWinbind, FailsNoJoin) {
    Tool("/usr/bin/wbinfo", std::string("case \"$*\" in ") + GetParam() + ") exec sleep 60;; esac");
    EXPECT_TRUE(Join().success);
    const Json::Value recorded = Steps();
    ASSERT_THAT(recorded["leftovers"], SizeIs(1));
    EXPECT_THAT(recorded["leftovers"][0].asString(), HasSubstr("winbind"));
    EXPECT_TRUE(winbindRuns());
    EXPECT_THAT(Calls("testjoin"), SizeIs(2));
}

INSTANTIATE_TEST_SUITE_P(Asked, BusyWinbind, testing::Values("*check-secret*", "*"),
                         [](const auto& row) { return row.index == 0 ? "ForTheTrust" : "ForAnything"; });

TEST_F(JobTest, ABusyWinbindIsNoExcuseForATrustThatDoesNotWork) {
    Tool("/usr/bin/wbinfo", "case \"$*\" in *check-secret*) exec sleep 60;; esac");
    Net("case \"$*\" in *testjoin*) case \"$*\" in *staging*) ;; *) echo NT_STATUS_ACCESS_DENIED; exit 255;; esac;; "
        "esac");
    const JobResult result = Join();
    EXPECT_FALSE(result.success);
    EXPECT_EQ(result.status.message, "Wbinfo fail. It might be domain name error.");
    ExpectUntouched();
}

TEST_F(JobTest, AMemberOfAnotherDomainStaysOneWhenTheTrustIsNotConfirmed) {
    MakeMember("ads", "CORP", "CORP.TEST");
    Put("/etc/krb5.keytab", "");
    unlink(At("/etc/krb5.keytab").c_str());
    const std::string before = Content(appliance::kSmbConf);
    const auto secrets = Secrets(kLive);
    Tool("/usr/bin/wbinfo", "case \"$*\" in *check-secret*) exit 1;; esac");
    EXPECT_FALSE(Join().success);
    EXPECT_EQ(Content(appliance::kSmbConf), before);
    EXPECT_EQ(Secrets(kLive), secrets);
    EXPECT_TRUE(winbindRuns());
}

TEST_F(JobTest, ARejoinThatFailsLateKeepsTheSecretThatTheControllerHas) {
    ASSERT_TRUE(Join().success);
    const std::string before = Content(appliance::kSmbConf);
    PutSecrets("/joined.tdb", SecretsOf("NT4DOM", "", "newer"));
    Tool("/usr/bin/rpcclient", "echo 'name NAS1$: 0x458 (1)'");
    Tool("/usr/bin/wbinfo", "case \"$*\" in *check-secret*) exit 1;; esac");
    EXPECT_FALSE(Join().success);
    EXPECT_EQ(Content(appliance::kSmbConf), before);
    EXPECT_EQ(Secrets(kLive)["SECRETS/MACHINE_PASSWORD/NT4DOM"], "newer");
    EXPECT_TRUE(winbindRuns());
    EXPECT_TRUE(std::filesystem::is_empty(At(appliance::kJoinJournal)));
}

TEST_F(JobTest, ARejoinWhoseToolFailsAsksWhichSecretWorks) {
    ASSERT_TRUE(Join().success);
    Tool("/usr/bin/rpcclient", "echo 'name NAS1$: 0x458 (1)'");
    PutSecrets("/joined.tdb", SecretsOf("NT4DOM", "", "newer"));
    Net("case \"$*\" in *'rpc join'*) cp $R/joined.tdb $R/usr/vorn/etc/private/join/staging/secrets.tdb; exit 255;; "
        "*testjoin*) case \"$*\" in *staging*) ;; *) echo NT_STATUS_ACCESS_DENIED; exit 255;; esac;; esac");
    EXPECT_FALSE(Join().success);
    EXPECT_EQ(Secrets(kLive)["SECRETS/MACHINE_PASSWORD/NT4DOM"], "newer");
}

// The account was deleted on the controller: the old secret is dead anyway, and what the failed join made goes again.
TEST_F(JobTest, ARejoinOfALostAccountThatFailsRemovesWhatItMade) {
    ASSERT_TRUE(Join().success);
    const std::string before = Content(appliance::kSmbConf);
    PutSecrets("/joined.tdb", SecretsOf("NT4DOM", "", "newer"));
    const char* const joinFails =
        "case \"$*\" in *'rpc join'*) cp $R/joined.tdb $R/usr/vorn/etc/private/join/staging/secrets.tdb; exit 255;; "
        "esac";
    const char* const trustFails = "case \"$*\" in *check-secret*) exit 1;; esac";
    for (const bool late : {false, true}) {
        unlink(At("/calls").c_str());
        Net(late ? "" : joinFails);
        Tool("/usr/bin/wbinfo", late ? trustFails : "exit 0");
        EXPECT_FALSE(Join().success);
        EXPECT_THAT(Calls("user delete"), testing::ElementsAre(HasSubstr("-- NAS1$")));
        EXPECT_THAT(Steps()["leftovers"], SizeIs(0));
        EXPECT_EQ(Content(appliance::kSmbConf), before);
        EXPECT_EQ(Secrets(kLive)["SECRETS/MACHINE_PASSWORD/NT4DOM"], "new");
        EXPECT_TRUE(winbindRuns());
        EXPECT_TRUE(std::filesystem::is_empty(At(appliance::kJoinJournal)));
    }
}

// A controller that NetBIOS names for the short name is none of the realm that was asked for.
TEST_F(JobTest, ADomainOfTheNt4StyleIsNoneWithADnsName) {
    JoinRequest request;
    request.domain = "NT4DOM";
    request.realm = "nowhere.test";
    request.credentials = {"admin", appliance::Secret(kCanary)};
    const JobResult result = appliance::RunJob(request, {});
    EXPECT_FALSE(result.success);
    EXPECT_EQ(result.status.message, "Neither LDAP server nor PDC can be found.");
    EXPECT_THAT(Steps()["steps"][1]["detail"].asString(), HasSubstr("not of nowhere.test"));
    EXPECT_THAT(Calls("rpc join"), IsEmpty());
    ExpectUntouched();
    request.controller = address_;
    EXPECT_EQ(appliance::RunJob(request, {}).status.message, "Invalid KDC ip.");
    EXPECT_THAT(Calls("rpc join"), IsEmpty());
    ExpectUntouched();
}

TEST_F(JobTest, RequestsThatCannotBeAreRefusedBeforeAnyToolRuns) {
    struct Row {
        JoinRequest request;
        const char* message;
    };
    const auto request = [](const std::string& domain, const std::string& user, const std::string& kdc,
                            const std::string& realm, const std::string& netbios) {
        JoinRequest made;
        made.domain = domain;
        made.credentials = {user, appliance::Secret("x")};
        made.controller = kdc;
        made.realm = realm;
        made.netbiosName = netbios;
        return made;
    };
    std::vector<Row> rows;
    rows.push_back({request("-lab.test", "admin", "", "", ""), "Neither LDAP server nor PDC can be found."});
    rows.push_back({request("lab\n.test", "admin", "", "", ""), "Neither LDAP server nor PDC can be found."});
    rows.push_back({request("", "admin", "", "", ""), "Neither LDAP server nor PDC can be found."});
    rows.push_back({request("lab.test", "admin", "--help", "", ""), "Invalid KDC ip."});
    rows.push_back({request("lab.test", "admin", "a\tb", "", ""), "Invalid KDC ip."});
    rows.push_back({request("lab.test", "admin", "", "a b", ""), "Neither LDAP server nor PDC can be found."});
    rows.push_back({request("lab.test", "admin", "", "", "A\nB"), "Invalid workgroup name."});
    rows.push_back({request("lab.test", "", "", "", ""),
                    "Client not found in Kerberos database while getting initial credentials"});
    for (const Row& row : rows) {
        const JobResult result = appliance::RunJob(row.request, {});
        EXPECT_FALSE(result.success);
        EXPECT_EQ(result.status.message, row.message) << row.request.domain;
    }
    for (const char* user : {"-x", "a%b", "a\nb"}) {
        EXPECT_THAT(Join(user).status.message, HasSubstr("user name")) << user;
    }
    EXPECT_THAT(Calls(), IsEmpty());
    ExpectUntouched();
}

TEST_F(JobTest, AnUnknownDomainIsNotFound) {
    const JobResult result = Join("admin", "NOWHERE");
    EXPECT_EQ(result.status.message, "Neither LDAP server nor PDC can be found.");
    EXPECT_EQ(result.status.key, "discover");
    ExpectUntouched();
}

TEST_F(JobTest, LeavingNeedsNoController) {
    ASSERT_TRUE(Join().success);
    for (const char* tool : {"/usr/bin/net", "/usr/bin/wbinfo", "/usr/bin/rpcclient", "/usr/bin/nmblookup"}) {
        Tool(tool, "sleep 60");
    }
    const auto began = std::chrono::steady_clock::now();
    EXPECT_TRUE(Leave().success);
    EXPECT_LT(std::chrono::steady_clock::now() - began, std::chrono::seconds(10));
    EXPECT_EQ(Content(appliance::kSmbConf), kWorkgroupConf);
}

// The membership that it belonged to can be left, and joined again.
TEST_F(JobTest, ADamagedDatabaseOfSecretsIsNoObstacle) {
    for (const bool leaves : {true, false}) {
        const char* const bytes = leaves ? "" : "no database";
        ASSERT_TRUE(Join().success);
        Put(kLive, bytes, 0600);
        appliance::Membership membership;
        ASSERT_FALSE(appliance::ReadMembership(membership));
        EXPECT_TRUE(membership.DomainMode());
        EXPECT_FALSE(membership.hasSecret);
        if (leaves) {
            EXPECT_TRUE(Leave().success);
            EXPECT_EQ(Content(appliance::kSmbConf), kWorkgroupConf);
            EXPECT_FALSE(Exists(kLive));
        }
        EXPECT_TRUE(Join().success);
        EXPECT_EQ(Secrets(kLive)["SECRETS/MACHINE_PASSWORD/NT4DOM"], "new");
        EXPECT_EQ(Content(std::string(kLive) + ".damaged"), bytes);
    }
}

TEST_F(JobTest, LeavingWithAnAccountThatCannotBeDeletedChangesNothing) {
    ASSERT_TRUE(Join().success);
    const std::string before = Content(appliance::kSmbConf);
    JoinRequest request;
    request.action = JoinRequest::Action::Leave;
    request.domain = "WORKGROUP";
    request.deleteAccount = true;
    request.credentials = {"nobody", appliance::Secret("x")};
    Net("case \"$*\" in *'user delete'*) echo 'Failed to delete user: Access denied' >&2; exit 255;; esac");
    const JobResult result = appliance::RunJob(request, {});
    EXPECT_FALSE(result.success);
    EXPECT_EQ(result.status.message, "ads_join_realm: Insufficient access");
    EXPECT_EQ(Content(appliance::kSmbConf), before);
    EXPECT_TRUE(winbindRuns());
    Net("");
    Put(appliance::kSmbInfo,
        "[global]\n    advanced_domain_option=yes\n    register nic=eth0\n    server signing=yes\n");
    request.resetOptions = true;
    EXPECT_TRUE(appliance::RunJob(request, {}).success);
    EXPECT_THAT(Steps()["leftovers"], SizeIs(0));
    EXPECT_EQ(Content(appliance::kSmbInfo), "[global]\n    advanced_domain_option=no\n    server signing=yes\n");
}

TEST_F(JobTest, OneAtATime) {
    const pid_t child = fork();
    if (child == 0) {
        const auto lock = appliance::FileLock::Take(At(appliance::kJoinLock), std::chrono::milliseconds(1000));
        std::ofstream(At("/locked")) << "x";
        sleep(60);
        _exit(lock ? 0 : 1);
    }
    while (!Exists("/locked")) {
        usleep(1000);
    }
    const JobResult result = Join();
    kill(child, SIGKILL);
    waitpid(child, nullptr, 0);
    EXPECT_FALSE(result.success);
    EXPECT_EQ(result.status.message, "Another join or leave is still running.");
    EXPECT_FALSE(Exists(appliance::kJoinSteps));
    ExpectUntouched();
}

}  // namespace
