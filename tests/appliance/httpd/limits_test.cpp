// How large, how long and how many.

#include <gmock/gmock.h>
#include <sys/socket.h>

#include "tests/appliance/httpd/support.h"

namespace httpd_test {
namespace {

using Clock = std::chrono::steady_clock;
using ::testing::HasSubstr;

class LimitsTest : public ::testing::Test {
protected:
    void Serve(FakeVornd::Answer answer = {}) {
        WritePage(folder_);
        vornd_ = std::make_unique<FakeVornd>(folder_.At("vornd.sock"), std::move(answer));
        door_ = std::make_unique<DoorThread>(
            DoorThread::Wishes{folder_.At("page"), folder_.At("vornd.sock"), nullptr, limits_, "127.0.0.1:0"});
    }
    Client Connect() {
        return Client(door_->port());
    }

    Folder folder_;
    appliance::DoorLimits limits_;
    std::unique_ptr<FakeVornd> vornd_;
    std::unique_ptr<DoorThread> door_;
};

// A GET request of exactly this many bytes.
std::string RequestOf(std::size_t size) {
    const std::string rest = GetText("/", "Filling: \r\n");
    return GetText("/", "Filling: " + std::string(size - rest.size(), 'x') + "\r\n");
}

TEST_F(LimitsTest, Headers) {
    Serve();
    EXPECT_EQ(Connect().Ask(RequestOf(appliance::kHeaderLimit)).status(), 200);
    const Message answer = Connect().Ask(RequestOf(appliance::kHeaderLimit + 1));
    EXPECT_EQ(answer.status(), 413);
    EXPECT_EQ(answer.Code(), 216);
    EXPECT_EQ(answer.header.at("connection"), "close");
    EXPECT_EQ(Connect().Ask("GET /" + std::string(9000, 'x')).status(), 413);
    EXPECT_EQ(Connect().Ask(GetText("/", std::string(9000, 'x'))).status(), 413);
}

TEST_F(LimitsTest, Bodies) {
    Serve();
    const std::string most = "\"" + std::string(appliance::kBodyLimit - 2, 'x') + "\"";
    Client client = Connect();
    EXPECT_EQ(client.Ask(PostText("/webapi/A/1/b", most, kCookie)).status(), 200);
    EXPECT_EQ(vornd_->Requests().back().body, most);
    const Message answer = client.Ask(PostText("/webapi/A/1/b", most + " ", kCookie));
    EXPECT_EQ(answer.status(), 413);
    EXPECT_EQ(answer.Code(), 217);
    EXPECT_TRUE(client.Ends());
    Client chunked = Connect();
    chunked.Send("POST /webapi/A/1/b HTTP/1.1\r\nHost: x\r\nTransfer-Encoding: chunked\r\n\r\n");
    for (int count = 0; count < 17; ++count) {
        chunked.Send("1000\r\n" + std::string(4096, 'x') + "\r\n");
    }
    EXPECT_EQ(chunked.Receive().Code(), 217);
    Client endless = Connect();
    endless.Send("POST /webapi/A/1/b HTTP/1.1\r\nHost: x\r\nTransfer-Encoding: chunked\r\n\r\n1;" +
                 std::string(40000, 'x'));
    EXPECT_EQ(endless.Receive().status(), 413) << "what follows a chunk's size has a limit as well";
    EXPECT_EQ(vornd_->Requests().size(), 1u);
}

TEST_F(LimitsTest, RequestsThatDrip) {
    limits_.send = milliseconds(600);
    Serve();
    const auto begin = Clock::now();
    Client header = Connect();
    Client body = Connect();
    const std::string request = PostText("/webapi/A/1/b");
    body.Send(request.substr(0, request.size() - 1));
    for (const char byte : std::string("GET / HT")) {
        header.Send(std::string(1, byte));
        usleep(50000);
    }
    for (Client* client : {&header, &body}) {
        const Message answer = client->Receive(milliseconds(10000));
        EXPECT_EQ(answer.status(), 408);
        EXPECT_EQ(answer.Code(), 215);
        EXPECT_TRUE(client->Ends());
    }
    EXPECT_GE(Clock::now() - begin, milliseconds(550));
    EXPECT_LT(Clock::now() - begin, milliseconds(10000));
}

TEST_F(LimitsTest, IdleConnections) {
    limits_.idle = milliseconds(2000);
    Serve();
    Client fresh = Connect();
    Client used = Connect();
    const auto begin = Clock::now();
    EXPECT_EQ(used.Ask(GetText("/")).status(), 200);
    EXPECT_TRUE(used.Ends());
    EXPECT_GE(Clock::now() - begin, limits_.idle);
    EXPECT_TRUE(fresh.Ends());
}

TEST_F(LimitsTest, AClientThatTakesNothing) {
    limits_.stall = milliseconds(500);
    Serve([](const Message& request) {
        return FakeVornd::Reply(request.first == "GET /metrics HTTP/1.1" ? std::string("x")
                                                                         : std::string(std::size_t{20} << 20, 'x'));
    });
    Client client = Connect();
    client.Send(PostText("/webapi/A/1/b", "{}", kCookie));
    Client watcher = Connect();
    const auto isAlone = [&] {
        return watcher.Ask(GetText("/metrics")).body.find("\nvorn_httpd_connections 1\n") != std::string::npos;
    };
    ASSERT_TRUE(Eventually(isAlone, milliseconds(10000)));
    EXPECT_EQ(client.Receive().status(), 0) << "the answer was cut off";
    EXPECT_EQ(Connect().Ask(GetText("/")).status(), 200);
}

TEST_F(LimitsTest, AClientThatTakesItSlowlyButTakesIt) {
    limits_.stall = milliseconds(3000);
    limits_.answer = milliseconds(60000);
    // The system's buffers hold about 5 MB: the others alone take longer than one stall.
    constexpr std::size_t kAll = std::size_t{20} << 20;
    Serve([](const Message&) { return FakeVornd::Reply("\"" + std::string(kAll, 'x') + "\""); });
    Client client = Connect();
    const int small = 65536;
    setsockopt(client.socket(), SOL_SOCKET, SO_RCVBUF, &small, sizeof small);
    client.Send(PostText("/webapi/A/1/b", "{}", kCookie));
    std::size_t got = 0;
    const auto begin = Clock::now();
    std::vector<char> bytes(std::size_t{1} << 20);
    while (got < kAll) {
        const ssize_t some = recv(client.socket(), bytes.data(), bytes.size(), MSG_WAITALL);
        ASSERT_GT(some, 0) << "after " << got;
        got += static_cast<std::size_t>(some);
        usleep(250000);
    }
    EXPECT_GT(Clock::now() - begin, milliseconds(4500));
}

TEST_F(LimitsTest, AWholeAnswerHasALimit) {
    limits_.stall = milliseconds(1000);
    limits_.answer = milliseconds(1200);
    Serve([](const Message&) { return FakeVornd::Reply("\"" + std::string(std::size_t{24} << 20, 'x') + "\""); });
    Client client = Connect();
    const int small = 65536;
    setsockopt(client.socket(), SOL_SOCKET, SO_RCVBUF, &small, sizeof small);
    client.Send(PostText("/webapi/A/1/b", "{}", kCookie));
    std::size_t got = 0;
    std::vector<char> bytes(std::size_t{64} << 10);
    const auto begin = Clock::now();
    for (;;) {
        const ssize_t some = recv(client.socket(), bytes.data(), bytes.size(), 0);
        if (some <= 0) {
            break;
        }
        got += static_cast<std::size_t>(some);
        usleep(20000);
    }
    EXPECT_LT(got, std::size_t{24} << 20);
    EXPECT_LT(Clock::now() - begin, milliseconds(15000));
}

TEST_F(LimitsTest, LargeAnswersPassWhole) {
    std::string content = "\"";
    for (int number = 0; content.size() < (std::size_t{31} << 20); ++number) {
        content += std::to_string(number);
    }
    content += "\"";
    Serve([&content](const Message&) { return FakeVornd::Reply(content); });
    Client client = Connect();
    EXPECT_TRUE(client.Ask(PostText("/webapi/A/1/b", "{}", kCookie)).body == content);
    EXPECT_EQ(client.Ask(GetText("/")).status(), 200);
}

TEST_F(LimitsTest, PipelinedRequestsAreAnsweredInOrder) {
    Serve([](const Message& request) {
        if (request.body == "1") {
            usleep(200000);
        }
        return FakeVornd::Reply(request.body);
    });
    Client client = Connect();
    std::string all;
    for (int number = 0; number < 8; ++number) {
        all += PostText("/webapi/A/1/b", std::to_string(number), kCookie) + GetText("/");
    }
    client.Send(all);
    for (int number = 0; number < 8; ++number) {
        EXPECT_EQ(client.Receive().body, std::to_string(number));
        EXPECT_EQ(client.Receive().body, "<!doctype html><title>page</title>");
    }
}

TEST_F(LimitsTest, ManyPipelinedRequestsLetOthersThrough) {
    Serve();
    Client greedy = Connect();
    std::string all;
    for (int number = 0; number < 2000; ++number) {
        all += GetText("/");
    }
    std::thread sender([&] { greedy.Send(all); });
    EXPECT_EQ(Connect().Ask(GetText("/")).status(), 200);
    for (int number = 0; number < 2000; ++number) {
        ASSERT_EQ(greedy.Receive().status(), 200) << number;
    }
    sender.join();
}

TEST_F(LimitsTest, OldClients) {
    Serve();
    Client client = Connect();
    client.Send("GET / HTTP/1.0\r\nHost: x\r\n\r\n");
    EXPECT_EQ(client.Receive().header.at("connection"), "close");
    EXPECT_TRUE(client.Ends());
    Client kept = Connect();
    kept.Send("GET / HTTP/1.0\r\nHost: x\r\nConnection: keep-alive\r\n\r\n");
    EXPECT_EQ(kept.Receive().header.at("connection"), "keep-alive");
    kept.Send(GetText("/", "Connection: close\r\n"));
    EXPECT_EQ(kept.Receive().header.at("connection"), "close");
    EXPECT_TRUE(kept.Ends());
}

TEST_F(LimitsTest, ExpectContinue) {
    Serve();
    Client client = Connect();
    const std::string request = PostText("/webapi/A/1/b", "{}", kCookie + "Expect: 100-continue\r\n");
    client.Send(request.substr(0, request.size() - 2));
    EXPECT_EQ(client.Receive().first, "HTTP/1.1 100 Continue");
    client.Send("{}");
    EXPECT_EQ(client.Receive().status(), 200);
    client.Send(PostText("/webapi/A/1/b", "{}", kCookie + "Expect: 100-continue\r\n"));
    EXPECT_EQ(client.Receive().status(), 200) << "a body that is there already needs no permission";
    const Message refused = client.Ask(
        "POST /webapi/A/1/b HTTP/1.1\r\nHost: x\r\nExpect: 100-continue\r\n"
        "Content-Length: 70000\r\n\r\n");
    EXPECT_EQ(refused.status(), 413) << "not asked for what would be refused";
}

TEST_F(LimitsTest, TheOldestIdleConnectionMakesRoom) {
    Serve();
    std::vector<Client> clients;
    for (std::size_t index = 0; index < appliance::kConnections; ++index) {
        clients.push_back(Connect());
        ASSERT_EQ(clients.back().Ask(GetText("/")).status(), 200);
    }
    ASSERT_EQ(clients[0].Ask(GetText("/")).status(), 200);
    Client newcomer = Connect();
    EXPECT_EQ(newcomer.Ask(GetText("/")).status(), 200);
    EXPECT_TRUE(clients[1].Ends());
    for (const std::size_t index : {std::size_t{0}, std::size_t{2}, std::size_t{255}}) {
        EXPECT_EQ(clients[index].Ask(GetText("/")).status(), 200) << index;
    }
}

TEST_F(LimitsTest, RequestsThatRunAreNeverPushedOut) {
    std::atomic<bool> go{false};
    limits_.protectedFor = milliseconds(60000);
    Serve([&go](const Message&) {
        while (!go) {
            usleep(5000);
        }
        return FakeVornd::Reply("{}");
    });
    std::vector<Client> dripping;
    for (std::size_t index = 100; index < appliance::kConnections; ++index) {
        dripping.push_back(Connect());
        dripping.back().Send("GET / HT");
    }
    std::vector<Client> running;
    for (std::size_t index = 0; index < 100; ++index) {
        running.push_back(Connect());
        running.back().Send(PostText("/webapi/A/1/b", "{}", kCookie));
    }
    // Then it has read the others' beginnings too, which came before.
    ASSERT_TRUE(Eventually([&] { return vornd_->Requests().size() == running.size(); }));
    const Message refused = Connect().Ask(GetText("/"));
    EXPECT_EQ(refused.status(), 503);
    EXPECT_EQ(refused.Code(), 242);
    go = true;
    for (Client& client : running) {
        EXPECT_EQ(client.Receive().status(), 200);
    }
    EXPECT_EQ(Connect().Ask(GetText("/")).status(), 200);
}

TEST_F(LimitsTest, ThoseThatTakeTheirTimeMakeRoomWhenNobodyIsIdle) {
    limits_.protectedFor = milliseconds(100);
    Serve();
    std::vector<Client> dripping;
    for (std::size_t index = 0; index < appliance::kConnections; ++index) {
        dripping.push_back(Connect());
        dripping.back().Send("GET / HT");
    }
    usleep(400000);
    for (int count = 0; count < 20; ++count) {
        EXPECT_EQ(Connect().Ask(GetText("/", "Connection: close\r\n")).status(), 200);
    }
}

TEST_F(LimitsTest, OthersAreServedBesideIdleAndDrippingConnections) {
    Serve();
    std::vector<Client> idle;
    std::vector<Client> dripping;
    for (int index = 0; index < 100; ++index) {
        idle.push_back(Connect());
        dripping.push_back(Connect());
        dripping.back().Send("GET /");
    }
    Client client = Connect();
    for (int count = 0; count < 200; ++count) {
        if (count % 2 == 0) {
            dripping[static_cast<std::size_t>(count / 2)].Send("x");
        }
        const auto begin = Clock::now();
        ASSERT_EQ(client.Ask(PostText("/webapi/A/1/b", "{}", kCookie)).status(), 200);
        EXPECT_LT(Clock::now() - begin, milliseconds(5000));
    }
}

TEST_F(LimitsTest, AnsweredAlthoughTheClientHasEndedSending) {
    Serve([](const Message&) {
        usleep(200000);
        return FakeVornd::Reply("{}");
    });
    Client client = Connect();
    client.Send(PostText("/webapi/A/1/b", "{}", kCookie));
    client.CloseSending();
    EXPECT_EQ(client.Receive().status(), 200);
    EXPECT_TRUE(client.Ends());
}

TEST_F(LimitsTest, AClientThatGoesLeavesItsCallToItsEnd) {
    Serve([](const Message&) {
        usleep(300000);
        return FakeVornd::Reply("{}");
    });
    {
        Client client = Connect();
        client.Send(PostText("/webapi/A/1/b", "{}", kCookie));
        ASSERT_TRUE(Eventually([&] { return vornd_->Requests().size() == 1; }));
    }
    EXPECT_TRUE(Eventually([&] { return vornd_->Answered() == 1; }));
    EXPECT_EQ(Connect().Ask(PostText("/webapi/A/1/b", "{}", kCookie)).status(), 200);
    EXPECT_EQ(vornd_->Connections(), 1) << "the connection was whole, and used again";
}

}  // namespace
}  // namespace httpd_test
