// How a server ends, and what comes after it.

#include <gmock/gmock.h>
#include <signal.h>
#include <unistd.h>

#include <filesystem>

#include "appliance/web/limits.h"
#include "tests/appliance/vornd/support.h"

namespace vornd_test {
namespace {

using ::testing::HasSubstr;
using ::testing::Not;

std::string SleepText(const Tree& tree, int milliseconds) {
    return PostText("sleep", "{\"milliseconds\": " + std::to_string(milliseconds) + ", \"file\": \"" +
                                 tree.At("/tmp/running") + "\"}");
}

TEST(LifecycleTest, EndsInOrder) {
    for (const int signal : {SIGTERM, SIGINT, SIGHUP}) {
        Tree tree;
        Server server(tree);
        Client idle = server.Connect();
        idle.Send(PostText("nothing", "{}"));
        ASSERT_EQ(idle.Receive().status, 200);
        server.Signal(signal);
        EXPECT_TRUE(server.Hears("STOPPING=1"));
        EXPECT_EQ(server.End(milliseconds(10000)), 0) << server.Errors();
        EXPECT_TRUE(idle.Ends());
        EXPECT_FALSE(std::filesystem::exists(tree.Socket()));
    }
}

TEST(LifecycleTest, RunningCallsAreAnsweredAndWaitingOnesRefused) {
    Tree tree;
    Server server(tree);
    std::vector<Client> running;
    for (std::size_t index = 0; index < appliance::kWorkers; ++index) {
        running.push_back(server.Connect());
        running.back().Send(SleepText(tree, 6000));
    }
    ASSERT_TRUE(Eventually([&] { return PidsIn(tree.At("/tmp/running")).size() == appliance::kWorkers; }));
    Client sending = server.Connect();
    sending.Send("POST /webapi/Test.Plain/1/nothing HTTP/1.1\r\n");
    Client waiting = server.Connect();
    waiting.Send(PostText("nothing", "{}"));
    // Once the later one waits, the first bytes of the other have been seen.
    ASSERT_TRUE(Eventually([&] { return server.Figures().find("vorn_calls_waiting 1\n") != std::string::npos; }));
    const auto begin = std::chrono::steady_clock::now();
    server.Signal(SIGTERM);
    for (Client* client : {&waiting, &sending}) {
        const Response refused = client->Receive();
        EXPECT_EQ(refused.status, 503);
        EXPECT_EQ(refused.Code(), 241);
        EXPECT_EQ(refused.header.at("connection"), "close");
    }
    EXPECT_LT(std::chrono::steady_clock::now() - begin, milliseconds(3000))
        << "at once, not when the others have ended";
    EXPECT_FALSE(server.Connect().connected());
    // A second signal hurries nothing.
    server.Signal(SIGTERM);
    for (Client& client : running) {
        const Response answer = client.Receive();
        EXPECT_EQ(answer.status, 200);
        EXPECT_EQ(answer.header.at("connection"), "close");
    }
    EXPECT_EQ(server.End(), 0);
}

TEST(LifecycleTest, CallsThatDoNotEndAreLeftBehind) {
    Tree tree;
    {
        Server server(tree, {"--drain", "1"});
        std::vector<Client> running;
        for (int index = 0; index < 2; ++index) {
            running.push_back(server.Connect());
            running.back().Send(SleepText(tree, 600000));
        }
        ASSERT_TRUE(Eventually([&] { return PidsIn(tree.At("/tmp/running")).size() == 2; }));
        const auto begin = std::chrono::steady_clock::now();
        server.Signal(SIGTERM);
        EXPECT_EQ(server.End(), 1);
        EXPECT_GE(std::chrono::steady_clock::now() - begin, milliseconds(1000)) << "they had their time";
        EXPECT_THAT(server.Errors(), HasSubstr(": 2 calls did not end and are left behind\n"));
        EXPECT_THAT(server.Errors(), Not(HasSubstr("]: ended\n")));
        for (Client& client : running) {
            EXPECT_TRUE(client.Ends());
        }
        EXPECT_FALSE(std::filesystem::exists(tree.Socket()));
    }
    Server next(tree);
    EXPECT_EQ(next.Call("nothing").status, 200);
}

TEST(LifecycleTest, ASecondServerEndsWithOneLine) {
    Tree tree;
    Server first(tree);
    Server second(tree, {}, false);
    EXPECT_EQ(second.End(), 1);
    EXPECT_EQ(second.Errors(), "vornd: another vornd serves " + tree.Socket() + "\n");
    EXPECT_EQ(first.Call("nothing").status, 200);
}

TEST(LifecycleTest, OnlyTheLockCountsNotWhatIsLeftOfAKilledServer) {
    Tree tree;
    {
        Server first(tree);
        first.Signal(SIGKILL);
        EXPECT_EQ(first.End(), 128 + SIGKILL);
    }
    ASSERT_TRUE(std::filesystem::exists(tree.Socket()));
    Server second(tree);
    EXPECT_EQ(second.Call("nothing").status, 200);
}

TEST(LifecycleTest, AServerMayFollowWhileTheFirstStillAnswers) {
    Tree tree;
    Server first(tree);
    Client slow = first.Connect();
    slow.Send(SleepText(tree, 5000));
    ASSERT_TRUE(Eventually([&] { return PidsIn(tree.At("/tmp/running")).size() == 1; }));
    first.Signal(SIGTERM);
    ASSERT_TRUE(first.Hears("STOPPING=1"));
    Server second(tree, {}, false);
    EXPECT_EQ(second.End(), 1) << "two at a time would be two too many";
    EXPECT_EQ(slow.Receive().status, 200);
    EXPECT_EQ(first.End(), 0);
    Server third(tree);
    EXPECT_EQ(third.Call("nothing").status, 200);
}

TEST(LifecycleTest, TheServiceManagerHearsFromIt) {
    Tree tree;
    Server server(tree);
    EXPECT_TRUE(server.Hears("WATCHDOG=1", milliseconds(3000)));
    Client slow = server.Connect();
    slow.Send(SleepText(tree, 5000));
    ASSERT_TRUE(Eventually([&] { return PidsIn(tree.At("/tmp/running")).size() == 1; }));
    server.Signal(SIGTERM);
    ASSERT_TRUE(server.Hears("STOPPING=1"));
    EXPECT_TRUE(server.Hears("WATCHDOG=1", milliseconds(4000))) << "also while it waits for a call";
    EXPECT_EQ(slow.Receive().status, 200);
}

TEST(LifecycleTest, StartsWithChildrenThatCanBeWaitedFor) {
    // Whoever starts the server may have ignored SIGCHLD; system() would then fail.
    struct sigaction ignored {};
    struct sigaction before {};
    ignored.sa_handler = SIG_IGN;
    sigaction(SIGCHLD, &ignored, &before);
    Tree tree;
    {
        Server server(tree);
        sigaction(SIGCHLD, &before, nullptr);
        EXPECT_EQ(server.Call("inherited").Data(), Json::Value(0));
    }
}

}  // namespace
}  // namespace vornd_test
