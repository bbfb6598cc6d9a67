// The figures of the server and the appliance.

#include "appliance/vornd/metrics.h"

#include <fcntl.h>
#include <signal.h>
#include <sys/stat.h>
#include <tdb.h>

#include <ctime>
#include <regex>
#include <set>
#include <thread>

#include "appliance/base/paths.h"
#include "appliance/base/sqlite.h"
#include "appliance/domain/membership/last_test.h"
#include "appliance/vornd/figures.h"
#include "tests/appliance/vornd/door.h"

namespace vornd_test {
namespace {

using appliance::Metrics;
using appliance::Reply;
using std::chrono::microseconds;
using ::testing::HasSubstr;
using ::testing::Not;

Reply ReplyOf(const char* api, const char* method, int code = 0) {
    Reply reply;
    reply.api = api;
    reply.method = method;
    reply.code = code;
    return reply;
}

// Each line is a comment or a figure, each figure has a help and a type in front of it and stands there once.
void ExpectWellFormed(const std::string& text) {
    ASSERT_FALSE(text.empty());
    EXPECT_EQ(text.back(), '\n');
    const std::regex figure(R"(([a-z_]+)(\{[a-z]+="[^"\\\n]*"(,[a-z]+="[^"\\\n]*")*\})? (-?[0-9.e+-]+))");
    std::set<std::string> seen;
    std::string typed;
    std::size_t begin = 0;
    while (begin < text.size()) {
        const std::size_t end = text.find('\n', begin);
        const std::string line = text.substr(begin, end - begin);
        begin = end + 1;
        std::smatch match;
        if (line.rfind("# TYPE ", 0) == 0) {
            typed = line.substr(7, line.find(' ', 7) - 7);
            EXPECT_TRUE(seen.insert(line).second) << line;
        } else if (line.rfind("# HELP ", 0) != 0) {
            ASSERT_TRUE(std::regex_match(line, match, figure)) << line;
            EXPECT_EQ(match[1].str().rfind(typed, 0), 0u) << line;
            EXPECT_TRUE(seen.insert(match[1].str() + match[2].str()).second) << line;
        }
    }
}

TEST(MetricsTest, CountsByMethodAndCode) {
    Metrics metrics;
    metrics.Count(ReplyOf("Api", "get"), microseconds(1500));
    metrics.Count(ReplyOf("Api", "get"), microseconds(40000));
    metrics.Count(ReplyOf("Api", "get", 2607), microseconds(400000000));
    metrics.Count(ReplyOf("", "", 200), microseconds(1));
    const std::string text = metrics.Render({1, 2, 3, 4, 5, 6});
    ExpectWellFormed(text);
    for (const char* line : {"vorn_requests_total{api=\"Api\",method=\"get\",code=\"0\"} 2\n",
                             "vorn_requests_total{api=\"Api\",method=\"get\",code=\"2607\"} 1\n",
                             "vorn_requests_total{api=\"\",method=\"\",code=\"200\"} 1\n",
                             "vorn_request_seconds_bucket{api=\"Api\",method=\"get\",le=\"0.002\"} 1\n",
                             "vorn_request_seconds_bucket{api=\"Api\",method=\"get\",le=\"0.01\"} 1\n",
                             "vorn_request_seconds_bucket{api=\"Api\",method=\"get\",le=\"0.05\"} 2\n",
                             "vorn_request_seconds_bucket{api=\"Api\",method=\"get\",le=\"300\"} 2\n",
                             "vorn_request_seconds_bucket{api=\"Api\",method=\"get\",le=\"+Inf\"} 3\n",
                             "vorn_request_seconds_sum{api=\"Api\",method=\"get\"} 400.0415\n",
                             "vorn_request_seconds_count{api=\"Api\",method=\"get\"} 3\n", "vorn_calls_running 1\n",
                             "vorn_calls_waiting 2\n", "vorn_log_ins_running 3\n", "vorn_log_ins_waiting 4\n",
                             "vorn_connections 5\n", "vorn_sessions 6\n"}) {
        EXPECT_THAT(text, HasSubstr(line));
    }
    EXPECT_THAT(text, Not(HasSubstr("seconds_count{api=\"\"")));
}

TEST(MetricsTest, DoNotGrowWithoutEnd) {
    Metrics metrics;
    for (int code = 0; code < 10000; ++code) {
        metrics.Count(ReplyOf("Api", "get", code), microseconds(1));
    }
    const std::string text = metrics.Render({});
    EXPECT_LT(text.size(), 200000u);
    EXPECT_THAT(text, HasSubstr("code=\"other\"} 8000\n"));
}

// What a join leaves: the machine's password for the domain.
void StoreSecret(const Tree& tree, const std::string& domain) {
    for (const char* folder : {"/var/lib/samba", "/var/lib/samba/private"}) {
        mkdir(tree.At(folder).c_str(), 0755);
    }
    const std::string path = tree.At("/var/lib/samba/private/secrets.tdb");
    tdb_context* database = tdb_open(path.c_str(), 0, TDB_DEFAULT, O_RDWR | O_CREAT, 0600);
    ASSERT_NE(database, nullptr);
    std::string key = "SECRETS/MACHINE_PASSWORD/" + domain;
    std::string value = "secret";
    const auto bytes = [](std::string& text) {
        const auto begin = static_cast<unsigned char*>(static_cast<void*>(text.data()));
        return TDB_DATA{begin, text.size()};
    };
    EXPECT_EQ(tdb_store(database, bytes(key), bytes(value), TDB_REPLACE), 0);
    tdb_close(database);
}

TEST(FiguresTest, OfAWorkgroupAndOfAMember) {
    Tree tree;
    appliance::SetRoot(tree.root());
    tree.Write("/usr/vorn/etc/smb.conf", "[global]\n    workgroup = WORKGROUP\n    security = user\n");
    std::string text = appliance::Figures().Text();
    ExpectWellFormed(text);
    EXPECT_THAT(text, HasSubstr("vorn_member 0\n"));
    EXPECT_THAT(text, HasSubstr("vorn_domain_kind{kind=\"workgroup\"} 1\n"));
    EXPECT_THAT(text, HasSubstr("vorn_lists{kind=\"user\"} 0\n"));
    EXPECT_THAT(text, HasSubstr("vorn_tasks_running 0\n"));
    EXPECT_THAT(text, HasSubstr("vorn_build_info{version=\"" VORN_VERSION "\"} 1\n"));
    EXPECT_THAT(text, Not(HasSubstr("last_test")));
    EXPECT_THAT(text, Not(HasSubstr("age")));

    tree.Write("/usr/vorn/etc/smb.conf",
               "[global]\n    workgroup = CANARY\n    realm = CANARY.TEST\n    security = ads\n");
    for (const char* folder : {"/usr/vorn/etc/private", "/usr/vorn/etc/private/directory", "/var/lib/vorn"}) {
        mkdir(tree.At(folder).c_str(), 0700);
    }
    const auto list = [&](const std::string& name, const std::string& kind, int count, std::int64_t age) {
        const std::string own = name.substr(5, name.find('.') - 5);
        appliance::Database database(tree.At("/usr/vorn/etc/private/directory/") + name,
                                     appliance::Database::Mode::ReadWrite);
        database.Execute(
            "CREATE TABLE entries(name TEXT, id INTEGER, display TEXT, PRIMARY KEY(name)) WITHOUT ROWID;"
            "CREATE TABLE meta(key TEXT PRIMARY KEY, value TEXT);"
            "INSERT INTO meta VALUES('domain','" +
            own + "'),('kind','" + kind + "'),('count','" + std::to_string(count) + "'),('fetched','" +
            std::to_string(std::time(nullptr) - age) + "'),('source','ldap'),('controller','dc1')");
    };
    list("user_CANARY.db", "user", 7, 100);
    list("user_OTHER.db", "user", 5, 5000);
    {
        appliance::Database tasks(tree.At("/var/lib/vorn/tasks.db"), appliance::Database::Mode::ReadWrite);
        tasks.Execute("CREATE TABLE tasks(state INTEGER); INSERT INTO tasks VALUES(0),(1),(3),(3)");
    }
    text = appliance::Figures().Text();
    ExpectWellFormed(text);
    EXPECT_THAT(text, HasSubstr("vorn_member 0\n")) << "it has no secret";
    EXPECT_THAT(text, HasSubstr("vorn_domain_kind{kind=\"active_directory\"} 1\n"));
    EXPECT_THAT(text, HasSubstr("vorn_lists{kind=\"user\"} 2\n"));
    EXPECT_THAT(text, HasSubstr("vorn_list_entries{kind=\"user\"} 12\n"));
    EXPECT_THAT(text, ::testing::ContainsRegex("vorn_list_age_seconds\\{kind=\"user\",of=\"own_domain\"\\} 10[0-5]\n"));
    EXPECT_THAT(text, ::testing::ContainsRegex("vorn_list_age_seconds\\{kind=\"user\",of=\"oldest\"\\} 500[0-5]\n"));
    EXPECT_THAT(text, Not(HasSubstr("kind=\"group\",of")));
    EXPECT_THAT(text, HasSubstr("vorn_tasks_running 2\n"));
    EXPECT_THAT(text, Not(HasSubstr("CANARY")));
    EXPECT_THAT(text, Not(HasSubstr("dc1")));

    list("group_CANARY.db", "group", 1, -1000);
    text = appliance::Figures().Text();
    EXPECT_THAT(text, HasSubstr("vorn_list_age_seconds{kind=\"group\",of=\"own_domain\"} 0\n"))
        << "the clock went back";

    StoreSecret(tree, "CANARY");
    appliance::Membership membership;
    ASSERT_FALSE(appliance::ReadMembership(membership));
    appliance::RecordTest(membership, {1764230400, false, 1250});
    text = appliance::Figures().Text();
    ExpectWellFormed(text);
    EXPECT_THAT(text, HasSubstr("vorn_member 1\n"));
    EXPECT_THAT(text, HasSubstr("vorn_last_test_time_seconds 1764230400\n"));
    EXPECT_THAT(text, HasSubstr("vorn_last_test_success 0\n"));
    EXPECT_THAT(text, HasSubstr("vorn_last_test_duration_seconds 1.25\n"));
    appliance::SetRoot("");
}

TEST(FiguresTest, WhatCannotBeReadIsLeftOut) {
    Tree tree;
    appliance::SetRoot(tree.root());
    mkdir(tree.At("/var/lib/vorn").c_str(), 0700);
    tree.Write("/var/lib/vorn/tasks.db", "no database");
    tree.Write("/var/lib/vorn/last_test.json", "{");
    const std::string text = appliance::Figures().Text();
    ExpectWellFormed(text);
    EXPECT_THAT(text, HasSubstr("vorn_build_info"));
    EXPECT_THAT(text, Not(HasSubstr("vorn_member")));
    EXPECT_THAT(text, Not(HasSubstr("vorn_tasks")));
    EXPECT_THAT(text, Not(HasSubstr("last_test")));
    appliance::SetRoot("");
}

TEST(FiguresTest, AreNotReadAnewEachTime) {
    Tree tree;
    appliance::SetRoot(tree.root());
    tree.Write("/usr/vorn/etc/smb.conf", "[global]\n    workgroup = WORKGROUP\n");
    appliance::Figures figures;
    const std::string first = figures.Text();
    unlink(tree.At("/usr/vorn/etc/smb.conf").c_str());
    EXPECT_EQ(figures.Text(), first);
    std::this_thread::sleep_for(appliance::Figures::kFresh);
    EXPECT_THAT(figures.Text(), Not(HasSubstr("vorn_member")));
    appliance::SetRoot("");
}

using MetricsOfAServerTest = DoorTest;

TEST_F(MetricsOfAServerTest, AreForEveryUserOfTheMachine) {
    const Headers headers = Session();
    Call(headers);
    Call(headers, "fail");
    Call({});
    LogIn("canary", "unknown");
    for (const uid_t user : {uid_t{0}, kDoorUser, kStranger}) {
        Client client = server_->Connect(user);
        client.Send(RequestText("GET", "/metrics", "", ""));
        const Response response = client.Receive();
        EXPECT_EQ(response.status, 200);
        EXPECT_EQ(response.header.at("content-type"), "text/plain; version=0.0.4");
        ExpectWellFormed(response.body);
        for (const char* line :
             {"{api=\"Test.Plain\",method=\"nothing\",code=\"0\"} 1\n",
              "{api=\"Test.Plain\",method=\"fail\",code=\"2607\"} 1\n", "{api=\"\",method=\"\",code=\"220\"} 1\n",
              "{api=\"session\",method=\"login\",code=\"0\"} 1\n",
              "{api=\"session\",method=\"login\",code=\"222\"} 1\n", "vorn_sessions 1\n", "vorn_connections 1\n",
              "vorn_member 0\n"}) {
            EXPECT_THAT(response.body, HasSubstr(line));
        }
        EXPECT_THAT(response.body, Not(HasSubstr("anna")));
        EXPECT_THAT(response.body, Not(HasSubstr("canary")));
        if (user != kStranger) {
            client.Send(RequestText("POST", "/metrics", "{}", ""));
            ExpectError(client.Receive(), 405, 214);
        }
    }
    ExpectError(Ask("POST", "/metrics", "{}", {}, kStranger), 401, 205);
    // A refused log-in counts with the time of its answer, not with what it took to find out.
    const std::string text = Ask("GET", "/metrics", {}, {}, kStranger).body;
    std::smatch sum;
    const std::regex wanted("vorn_request_seconds_sum\\{api=\"session\",method=\"login\"\\} ([0-9.]+)");
    ASSERT_TRUE(std::regex_search(text, sum, wanted));
    EXPECT_GT(std::stod(sum[1]), 2);
}

TEST_F(MetricsOfAServerTest, AreThereWhenEveryThreadForCallsIsTaken) {
    std::vector<Client> clients;
    for (int busy = 0; busy < 20; ++busy) {
        clients.push_back(server_->Connect());
        clients.back().Send(PostText("sleep", R"({"milliseconds":4000})"));
    }
    EXPECT_TRUE(Eventually(
        [this] {
            const std::string text = Ask("GET", "/metrics", {}, {}, kStranger).body;
            return text.find("vorn_calls_running 16\n") != std::string::npos &&
                   text.find("vorn_calls_waiting 4\n") != std::string::npos;
        },
        milliseconds(3500)));
    EXPECT_EQ(LogIn("anna", "right").status, 200) << "and so are log-ins";
    for (Client& client : clients) {
        EXPECT_EQ(client.Receive().status, 200);
    }
}

}  // namespace
}  // namespace vornd_test
