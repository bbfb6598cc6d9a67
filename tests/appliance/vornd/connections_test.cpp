// The limits of connections, requests and calls.

#include <gmock/gmock.h>
#include <unistd.h>

#include <atomic>
#include <cstdio>
#include <thread>

#include "appliance/web/limits.h"
#include "tests/appliance/vornd/support.h"

namespace vornd_test {
namespace {

using std::chrono::steady_clock;

// A header of so many bytes, all in all.
std::string HeaderOf(std::size_t size) {
    const std::string begin = "POST /webapi/Test.Plain/1/nothing HTTP/1.1\r\nHost: x\r\nContent-Length: 0\r\nPadding: ";
    const std::string end = "\r\n\r\n";
    return begin + std::string(size - begin.size() - end.size(), 'p') + end;
}

// A body of so many bytes.
std::string BodyOf(std::size_t size) {
    const std::string begin = "{\"value\":\"";
    const std::string end = "\"}";
    return begin + std::string(size - begin.size() - end.size(), 'v') + end;
}

class ConnectionsTest : public ::testing::Test {
protected:
    Response Ask(const std::string& bytes) const {
        Client client = server_.Connect();
        client.Send(bytes);
        return client.Receive();
    }

    Tree tree_;
    Server server_{tree_};
};

TEST_F(ConnectionsTest, HeaderUpToItsLimit) {
    EXPECT_EQ(Ask(HeaderOf(appliance::kHeaderLimit)).status, 200);
    const Response large = Ask(HeaderOf(appliance::kHeaderLimit + 1));
    EXPECT_EQ(large.status, 413);
    EXPECT_EQ(large.Code(), 216);
    EXPECT_EQ(large.header.at("connection"), "close");
    EXPECT_EQ(Ask(HeaderOf(1 << 20)).Code(), 216);
    EXPECT_EQ(Ask("POST /" + std::string(20000, 'x')).Code(), 216);
}

TEST_F(ConnectionsTest, BodyUpToItsLimit) {
    EXPECT_EQ(Ask(PostText("nothing", BodyOf(appliance::kBodyLimit))).status, 200);
    const Response large = Ask(PostText("nothing", BodyOf(appliance::kBodyLimit + 1)));
    EXPECT_EQ(large.status, 413);
    EXPECT_EQ(large.Code(), 217);
    EXPECT_EQ(Ask(PostText("nothing", BodyOf(1 << 20))).Code(), 217);
}

TEST_F(ConnectionsTest, ChunkedBodyUpToItsLimit) {
    const auto chunked = [&](std::size_t size) {
        std::string text =
            "POST /webapi/Test.Plain/1/nothing HTTP/1.1\r\nHost: x\r\nContent-Type: application/json\r\n"
            "Transfer-Encoding: chunked\r\n\r\n";
        const std::string body = BodyOf(size);
        char length[20];
        for (std::size_t place = 0; place < body.size(); place += 1000) {
            const std::string piece = body.substr(place, 1000);
            snprintf(length, sizeof length, "%zx", piece.size());
            text += std::string(length) + "\r\n" + piece + "\r\n";
        }
        return text + "0\r\n\r\n";
    };
    EXPECT_EQ(Ask(chunked(appliance::kBodyLimit)).status, 200);
    EXPECT_EQ(Ask(chunked(appliance::kBodyLimit + 1)).Code(), 217);
}

TEST_F(ConnectionsTest, StaysOpenForTheNextRequest) {
    Client client = server_.Connect();
    for (int index = 0; index < 50; ++index) {
        client.Send(PostText("nothing", "{}"));
        EXPECT_EQ(client.Receive().status, 200);
    }
    client.Send(PostText("nothing", "{}", "1", "Test.Plain", "Connection: close\r\n"));
    EXPECT_EQ(client.Receive().header["connection"], "close");
    EXPECT_TRUE(client.Ends());
}

TEST_F(ConnectionsTest, AnswersRequestsThatCameTogetherInTheirOrder) {
    Client client = server_.Connect();
    std::string all;
    for (int index = 0; index < 100; ++index) {
        all += PostText("echo", "{\"value\":" + std::to_string(index) + "}");
    }
    client.Send(all);
    for (int index = 0; index < 100; ++index) {
        EXPECT_EQ(client.Receive().Data()["value"], Json::Value(index));
    }
}

TEST_F(ConnectionsTest, TakesARequestByteByByte) {
    Client client = server_.Connect();
    for (const char byte : PostText("echo", "{\"value\": 5}")) {
        client.Send(std::string(1, byte));
        usleep(500);
    }
    EXPECT_EQ(client.Receive().Data()["value"], Json::Value(5));
}

TEST_F(ConnectionsTest, AnswersAClientThatHasEndedItsSide) {
    Client client = server_.Connect();
    client.Send(PostText("nothing", "{}"));
    client.CloseSending();
    EXPECT_EQ(client.Receive().status, 200);
    EXPECT_TRUE(client.Ends());
}

TEST_F(ConnectionsTest, GivesASlowSenderFifteenSeconds) {
    Client header = server_.Connect();
    Client body = server_.Connect();
    Client idle = server_.Connect();
    const auto begin = steady_clock::now();
    header.Send("POST /webapi");
    body.Send(
        "POST /webapi/Test.Plain/1/nothing HTTP/1.1\r\nHost: x\r\nContent-Type: application/json\r\n"
        "Content-Length: 100\r\n\r\n{");
    // Single bytes now and then gain no time.
    std::thread drip([&] {
        for (int index = 0; index < 13; ++index) {
            sleep(1);
            header.Send("x");
        }
    });
    for (Client* client : {&header, &body}) {
        const Response response = client->Receive(milliseconds(30000));
        EXPECT_EQ(response.status, 408);
        EXPECT_EQ(response.Code(), 215);
    }
    drip.join();
    const auto took = std::chrono::duration_cast<milliseconds>(steady_clock::now() - begin).count();
    EXPECT_GT(took, 14500);
    EXPECT_LT(took, 25000);
    idle.Send(PostText("nothing", "{}"));
    EXPECT_EQ(idle.Receive().status, 200) << "a connection without a request may wait";
}

TEST_F(ConnectionsTest, TheOldestIdleConnectionMakesRoom) {
    std::vector<Client> clients;
    for (int index = 0; index < 300; ++index) {
        clients.push_back(server_.Connect());
        clients.back().Send(PostText("nothing", "{}"));
        ASSERT_EQ(clients.back().Receive().status, 200) << index;
    }
    for (std::size_t index = 0; index < 44; ++index) {
        EXPECT_TRUE(clients[index].Ends()) << index;
    }
    EXPECT_FALSE(clients[44].Ends(milliseconds(100)));
    for (std::size_t index = 44; index < 300; ++index) {
        clients[index].Send(PostText("nothing", "{}"));
        EXPECT_EQ(clients[index].Receive().status, 200) << index;
    }
}

TEST_F(ConnectionsTest, ConnectionsThatAreBusyDoNotMakeRoom) {
    std::vector<Client> clients;
    for (std::size_t index = 1; index < appliance::kConnections; ++index) {
        clients.push_back(server_.Connect());
        clients.back().Send("POST /");
    }
    const std::string file = tree_.At("/tmp/running");
    clients.push_back(server_.Connect());
    clients.back().Send(PostText("sleep", R"({"milliseconds": 15000, "file": ")" + file + "\"}"));
    // Once the last one's call runs, the first bytes of those before it have been seen: they are busy.
    ASSERT_TRUE(Eventually([&] { return PidsIn(file).size() == 1; }));
    Client late = server_.Connect();
    const Response refused = late.Receive();
    EXPECT_EQ(refused.status, 503);
    EXPECT_EQ(refused.Code(), 242);
    clients.clear();
    EXPECT_TRUE(Eventually([&] { return server_.Call("nothing").status == 200; }));
}

TEST_F(ConnectionsTest, RefusesCallsWhenSixtyFourWait) {
    const std::string file = tree_.At("/tmp/running");
    const std::string call = PostText("sleep", R"({"milliseconds": 6000, "file": ")" + file + "\"}");
    std::vector<Client> clients;
    for (std::size_t index = 0; index < appliance::kWorkers; ++index) {
        clients.push_back(server_.Connect());
        clients.back().Send(call);
    }
    ASSERT_TRUE(Eventually([&] { return PidsIn(file).size() == appliance::kWorkers; }));
    for (std::size_t index = 0; index < appliance::kWaitingCalls; ++index) {
        clients.push_back(server_.Connect());
        clients.back().Send(PostText("nothing", "{}"));
    }
    const std::string full = "vorn_calls_waiting " + std::to_string(appliance::kWaitingCalls) + "\n";
    ASSERT_TRUE(Eventually([&] { return server_.Figures().find(full) != std::string::npos; }));
    for (int index = 0; index < 5; ++index) {
        const Response refused = server_.Call("nothing");
        EXPECT_EQ(refused.status, 503);
        EXPECT_EQ(refused.Code(), 240);
    }
    Client list = server_.Connect();
    list.Send("GET /webapi HTTP/1.1\r\nHost: x\r\n\r\n");
    EXPECT_EQ(list.Receive(milliseconds(4000)).status, 200) << "what needs no module never waits";
    for (Client& client : clients) {
        EXPECT_EQ(client.Receive().status, 200);
    }
}

TEST_F(ConnectionsTest, AClientThatGoesAwayDuringItsCallHarmsNobody) {
    for (int index = 0; index < 20; ++index) {
        Client client = server_.Connect();
        client.Send(PostText("sleep", R"({"milliseconds": 50})"));
    }
    usleep(200000);
    EXPECT_EQ(server_.Call("nothing").status, 200);
}

TEST_F(ConnectionsTest, EightClientsLeaveNothingOpen) {
    server_.Call("nothing");
    const int before = server_.Descriptors();
    constexpr int kThreads = 8;
    constexpr int kRounds = 300;
    std::atomic<int> right{0};
    std::vector<std::thread> threads;
    for (int index = 0; index < kThreads; ++index) {
        threads.emplace_back([&, index] {
            for (int round = index; round < index + kRounds; ++round) {
                Client client = server_.Connect();
                const bool refused = round % 5 == 0;
                client.Send(round % 3 == 0 ? PostText("throw", "{}") : PostText("nothing", refused ? "{" : "{}"));
                const int status = client.Receive().status;
                const int expected = round % 3 == 0 ? 500 : refused ? 400 : 200;
                right += status == expected ? 1 : 0;
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(right, kThreads * kRounds);
    EXPECT_TRUE(Eventually([&] { return server_.Descriptors() <= before; })) << before << " " << server_.Descriptors();
}

}  // namespace
}  // namespace vornd_test
