// vornd as it should not be: gone, slow, speaking nonsense. A call is never made twice.

#include <gmock/gmock.h>
#include <sys/socket.h>
#include <sys/un.h>

#include <cstring>

#include "tests/appliance/httpd/support.h"

namespace httpd_test {
namespace {

using Clock = std::chrono::steady_clock;

class UpstreamTest : public ::testing::Test {
protected:
    void Serve(FakeVornd::Answer answer = {}) {
        StartVornd(std::move(answer));
        StartDoor();
    }
    void StartVornd(FakeVornd::Answer answer = {}) {
        vornd_ = std::make_unique<FakeVornd>(folder_.At("vornd.sock"), std::move(answer));
    }
    void StartDoor() {
        door_ = std::make_unique<DoorThread>(
            DoorThread::Wishes{folder_.At("page"), folder_.At("vornd.sock"), nullptr, limits_, "127.0.0.1:0"});
    }
    Message Post(const std::string& body = "{}") {
        return Client(door_->port()).Ask(PostText("/webapi/A/1/b", body, kCookie));
    }
    Message Get() {
        return Client(door_->port()).Ask(GetText("/webapi", kCookie));
    }
    void ExpectUnreachable(const Message& answer) {
        EXPECT_EQ(answer.status(), 503);
        EXPECT_EQ(answer.Code(), 250);
        EXPECT_EQ(answer.json()["success"], false);
    }

    Folder folder_;
    appliance::DoorLimits limits_;
    std::unique_ptr<FakeVornd> vornd_;
    std::unique_ptr<DoorThread> door_;
};

TEST_F(UpstreamTest, ConnectionsAreUsedAgain) {
    Serve();
    for (int count = 0; count < 20; ++count) {
        EXPECT_EQ(Post().status(), 200);
    }
    EXPECT_EQ(vornd_->Connections(), 1);
}

TEST_F(UpstreamTest, AwayIsSaidAtOnce) {
    limits_.upstreamConnect = milliseconds(60000);
    StartDoor();
    const auto begin = Clock::now();
    ExpectUnreachable(Post());
    EXPECT_LT(Clock::now() - begin, milliseconds(10000));
    StartVornd();
    EXPECT_EQ(Post().status(), 200) << "and it may come back";
}

TEST_F(UpstreamTest, AwayWithTheSocketStillThere) {
    Serve();
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    const std::string path = folder_.At("dead.sock");
    std::memcpy(address.sun_path, path.data(), path.size());
    {
        const appliance::FileDescriptor dead(socket(AF_UNIX, SOCK_STREAM, 0));
        ASSERT_EQ(bind(dead.get(), static_cast<const sockaddr*>(static_cast<const void*>(&address)), sizeof address),
                  0);
    }
    door_.reset();
    door_ = std::make_unique<DoorThread>(DoorThread::Wishes{folder_.At("page"), path, nullptr, limits_, "127.0.0.1:0"});
    ExpectUnreachable(Post());
}

TEST_F(UpstreamTest, ConnectionsThatEndedAreNotUsed) {
    Serve();
    EXPECT_EQ(Post().status(), 200);
    vornd_->DropIdle();
    usleep(50000);
    EXPECT_EQ(Post().status(), 200);
    EXPECT_EQ(vornd_->Connections(), 2);
    EXPECT_EQ(vornd_->Requests().size(), 2u);
}

TEST_F(UpstreamTest, ANewServerIsFoundAtOnce) {
    Serve();
    EXPECT_EQ(Post().status(), 200);
    vornd_.reset();
    StartVornd();
    EXPECT_EQ(Post().status(), 200);
}

TEST_F(UpstreamTest, ACallThatMayHaveArrivedIsNotSentAgain) {
    std::atomic<int> count{0};
    Serve([&count](const Message&) { return ++count == 1 ? FakeVornd::Reply("{}") : std::string(); });
    EXPECT_EQ(Post().status(), 200);
    ExpectUnreachable(Post());
    EXPECT_EQ(vornd_->Requests().size(), 2u) << "on the used connection, and never on another";
    ExpectUnreachable(Post());
    EXPECT_EQ(vornd_->Requests().size(), 3u) << "nor is it on a new one";
}

TEST_F(UpstreamTest, AQuestionIsAskedAgainOnce) {
    std::atomic<int> count{0};
    Serve([&count](const Message&) { return ++count == 2 ? std::string() : FakeVornd::Reply("{}"); });
    EXPECT_EQ(Get().status(), 200);
    EXPECT_EQ(Get().status(), 200) << "the used connection ended under it";
    EXPECT_EQ(vornd_->Requests().size(), 3u);
}

TEST_F(UpstreamTest, AQuestionIsNotAskedForEver) {
    std::atomic<int> count{0};
    Serve([&count](const Message&) { return ++count == 1 ? FakeVornd::Reply("{}") : std::string(); });
    EXPECT_EQ(Get().status(), 200);
    ExpectUnreachable(Get());
    EXPECT_EQ(vornd_->Requests().size(), 3u);
}

TEST_F(UpstreamTest, Nonsense) {
    std::string answer;
    limits_.upstreamCall = milliseconds(3000);  // what might go on is waited for
    Serve([&answer](const Message&) { return answer; });
    const std::string ok = "HTTP/1.1 200 OK\r\n";
    const std::string json = "Content-Type: application/json\r\n";
    for (const std::string& nonsense :
         {std::string("nonsense\r\n\r\n"), std::string(1000000, 'x'), ok + json + "\r\n",
          ok + "Content-Length: 2\r\n\r\n{}", ok + json + "Content-Length: x\r\n\r\n{}",
          ok + json + "Content-Length: 2\r\nContent-Length: 3\r\n\r\n{}",
          ok + json + "Content-Length: 2\r\nTransfer-Encoding: chunked\r\n\r\n{}",
          ok + "Content-Type: text/html\r\nContent-Length: 2\r\n\r\n{}",
          "HTTP/1.1 100 Continue\r\n" + json + "Content-Length: 0\r\n\r\n",
          "HTTP/1.1 777 Odd\r\n" + json + "Content-Length: 0\r\n\r\n",
          "HTTP/1.1 099 Odd\r\n" + json + "Content-Length: 0\r\n\r\n",
          ok + json + "Filling: " + std::string(20000, 'x') + "\r\nContent-Length: 2\r\n\r\n{}",
          ok + json + "Content-Length: 99999999999\r\n\r\n{}", std::string("\x16\x03\x01\x02", 4),
          std::string(10, '\0')}) {
        answer = nonsense;
        ExpectUnreachable(Post());
    }
    answer = FakeVornd::Reply("{}");
    EXPECT_EQ(Post().status(), 200);
}

TEST_F(UpstreamTest, TooLargeAnAnswerIsNone) {
    const std::string large(appliance::kAnswerSize + 1, 'x');
    Serve([&large](const Message&) { return FakeVornd::Reply(large); });
    ExpectUnreachable(Post());
}

TEST_F(UpstreamTest, AnswersThatAreCutOff) {
    Serve([](const Message&) {
        return "HTTP/1.1 200 OK\r\nContent-Type: application/json\r\nContent-Length: 20\r\n\r\n{";
    });
    std::thread cutter([this] {
        Eventually([this] { return !vornd_->Requests().empty(); });
        usleep(100000);
        vornd_->DropIdle();
    });
    ExpectUnreachable(Post());
    cutter.join();
}

TEST_F(UpstreamTest, BytesBehindAnAnswerEndTheConnection) {
    std::atomic<int> count{0};
    Serve([&count](const Message&) {
        const std::string own = FakeVornd::Reply("\"" + std::to_string(++count) + "\"");
        return own + FakeVornd::Reply("\"somebody else's\"");
    });
    EXPECT_EQ(Post().body, "\"1\"");
    EXPECT_EQ(Post().body, "\"2\"") << "and not what was left over";
    EXPECT_EQ(vornd_->Connections(), 2);
}

TEST_F(UpstreamTest, ChunkedAnswersAndThoseThatEndTheConnection) {
    std::atomic<int> count{0};
    Serve([&count](const Message&) -> std::string {
        if (++count == 1) {
            return "HTTP/1.1 200 OK\r\nContent-Type: application/json\r\nTransfer-Encoding: chunked\r\n\r\n"
                   "1\r\n{\r\n1\r\n}\r\n0\r\n\r\n";
        }
        return FakeVornd::Reply("{}", 200, "Connection: close\r\n");
    });
    EXPECT_EQ(Post().body, "{}");
    EXPECT_EQ(Post().body, "{}");
    EXPECT_EQ(Post().body, "{}");
    EXPECT_EQ(vornd_->Connections(), 2);
}

TEST_F(UpstreamTest, CallsHaveADeadline) {
    limits_.upstreamCall = milliseconds(3000);
    std::atomic<bool> go{false};
    Serve([&go](const Message&) {
        Eventually([&go] { return go.load(); });
        return FakeVornd::Reply("\"late\"");
    });
    const auto begin = Clock::now();
    ExpectUnreachable(Post());
    EXPECT_GE(Clock::now() - begin, milliseconds(2950));
    EXPECT_LT(Clock::now() - begin, milliseconds(12000));
    go = true;
    EXPECT_EQ(Post().body, "\"late\"") << "of its own request";
    EXPECT_EQ(vornd_->Connections(), 2);
    vornd_.reset();
}

TEST_F(UpstreamTest, AProbeHasAShorterOne) {
    limits_.upstreamProbe = milliseconds(3000);
    std::atomic<bool> go{false};
    Serve([&go](const Message&) {
        Eventually([&go] { return go.load(); });
        return FakeVornd::Reply("{}");
    });
    const auto begin = Clock::now();
    ExpectUnreachable(Client(door_->port()).Ask(GetText("/healthz")));
    const Message metrics = Client(door_->port()).Ask(GetText("/metrics"));
    EXPECT_THAT(metrics.body, ::testing::HasSubstr("\nvorn_up 0\n"));
    EXPECT_GE(Clock::now() - begin, milliseconds(5900)) << "two of them";
    EXPECT_LT(Clock::now() - begin, milliseconds(15000));
    go = true;
    vornd_.reset();
}

TEST_F(UpstreamTest, NobodyTakesTheConnection) {
    limits_.upstreamConnect = milliseconds(3000);
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    const std::string path = folder_.At("vornd.sock");
    std::memcpy(address.sun_path, path.data(), path.size());
    const auto* const plain = static_cast<const sockaddr*>(static_cast<const void*>(&address));
    const appliance::FileDescriptor busy(socket(AF_UNIX, SOCK_STREAM, 0));
    ASSERT_EQ(bind(busy.get(), plain, sizeof address), 0);
    ASSERT_EQ(listen(busy.get(), 0), 0);
    std::vector<appliance::FileDescriptor> filling;
    do {
        filling.emplace_back(socket(AF_UNIX, SOCK_STREAM | SOCK_NONBLOCK, 0));
    } while (connect(filling.back().get(), plain, sizeof address) == 0);
    StartDoor();
    const auto begin = Clock::now();
    ExpectUnreachable(Post());
    EXPECT_GE(Clock::now() - begin, milliseconds(2950));
    EXPECT_LT(Clock::now() - begin, milliseconds(15000));
}

TEST_F(UpstreamTest, NotMoreAtATimeThanVorndHasRoomFor) {
    std::atomic<bool> go{false};
    Serve([&go](const Message&) {
        Eventually([&go] { return go.load(); });
        return FakeVornd::Reply("{}");
    });
    std::vector<Client> running;
    for (std::size_t index = 0; index < appliance::kUpstreamConnections; ++index) {
        running.emplace_back(door_->port());
        running.back().Send(PostText("/webapi/A/1/b", "{}", kCookie));
    }
    ASSERT_TRUE(Eventually([&] { return vornd_->Requests().size() == running.size(); }));
    const Message refused = Post();
    EXPECT_EQ(refused.status(), 503);
    EXPECT_EQ(refused.Code(), 240);
    go = true;
    for (Client& client : running) {
        EXPECT_EQ(client.Receive().status(), 200);
    }
    EXPECT_EQ(Post().status(), 200);
}

TEST_F(UpstreamTest, AnswersInMemoryHaveALimit) {
    const std::string large = "\"" + std::string(std::size_t{30} << 20, 'x') + "\"";
    Serve([&large](const Message&) { return FakeVornd::Reply(large); });
    std::vector<Client> slow;
    for (int index = 0; index < 5; ++index) {
        slow.emplace_back(door_->port());
        slow.back().Send(PostText("/webapi/A/1/b", "{}", kCookie));
    }
    ASSERT_TRUE(Eventually([this] { return vornd_->Answered() == 5; }));
    int whole = 0;
    int refused = 0;
    for (Client& client : slow) {
        const Message answer = client.Receive();
        whole += answer.status() == 200 && answer.body == large ? 1 : 0;
        refused += answer.status() == 503 && answer.Code() == 250 ? 1 : 0;
    }
    EXPECT_EQ(whole + refused, 5);
    EXPECT_GE(whole, 3);
    EXPECT_GE(refused, 1);
    EXPECT_EQ(Post().status(), 200) << "what was taken is free again";
}

}  // namespace
}  // namespace httpd_test
