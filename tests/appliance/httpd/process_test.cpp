// The program itself, as a user without rights: how it starts, what it says, and how it ends.

#include <arpa/inet.h>
#include <gmock/gmock.h>
#include <netinet/in.h>
#include <openssl/x509v3.h>
#include <signal.h>
#include <sys/socket.h>
#include <sys/stat.h>

#include <fstream>

#include "appliance/httpd/certificate.h"
#include "tests/appliance/httpd/support.h"

namespace httpd_test {
namespace {

using ::testing::HasSubstr;
using ::testing::Not;

class ProcessTest : public ::testing::Test {
protected:
    ProcessTest() {
        WritePage(folder_);
    }
    void StartVornd(FakeVornd::Answer answer = {}) {
        vornd_ = std::make_unique<FakeVornd>(folder_.At("vornd.sock"), std::move(answer));
    }
    // What it says when it does not start, and its exit status.
    std::pair<std::string, int> Fails(std::vector<std::string> arguments, uid_t user = 65534) {
        DoorProcess door(folder_, std::move(arguments), false, user);
        const int status = door.End().value_or(-1);
        return {door.Output(), status};
    }
    static Client Connect(const DoorProcess& door) {
        return Client(door.port(), Client::Kind::Tls);
    }

    Folder folder_;
    std::unique_ptr<FakeVornd> vornd_;
};

TEST_F(ProcessTest, AFirstStartMakesTheCertificate) {
    StartVornd();
    std::string first;
    {
        const DoorProcess door(folder_);
        EXPECT_THAT(door.Output(), HasSubstr("made a certificate"));
        EXPECT_EQ(Connect(door).Ask(GetText("/")).status(), 200);
        first = folder_.Read("state/certificate.pem");
        struct stat found {};
        ASSERT_EQ(stat(folder_.At("state/key.pem").c_str(), &found), 0);
        EXPECT_EQ(found.st_mode & 07777, 0600u);
        EXPECT_EQ(found.st_uid, 65534u);
    }
    const DoorProcess again(folder_);
    EXPECT_THAT(again.Output(), Not(HasSubstr("made a certificate")));
    EXPECT_EQ(folder_.Read("state/certificate.pem"), first);
}

TEST_F(ProcessTest, RootIsRefused) {
    const auto [output, status] = Fails({}, 0);
    EXPECT_EQ(status, 1);
    EXPECT_THAT(output, HasSubstr("vorn-httpd: root must not run this server: start it as the user vorn-httpd\n"));
    EXPECT_NE(access(folder_.At("state/key.pem").c_str(), F_OK), 0);
}

TEST_F(ProcessTest, WrongCommandLines) {
    for (const std::vector<std::string>& arguments : std::vector<std::vector<std::string>>{
             {"--nonsense"}, {"word"}, {"--listen", "nowhere"}, {"--certificate", "x"}}) {
        const auto [output, status] = Fails(arguments);
        EXPECT_EQ(status, 2) << arguments.front();
        EXPECT_THAT(output, ::testing::MatchesRegex("vorn-httpd: [^\n]+\n"));
    }
    EXPECT_EQ(Fails({"--clear-text", "--listen", "0.0.0.0:0"}).second, 2);
    EXPECT_EQ(Fails({"--help"}).second, 0);
    EXPECT_THAT(Fails({"--version"}).first, ::testing::MatchesRegex("vorn-httpd [0-9.]+\n"));
}

TEST_F(ProcessTest, StartsThatFail) {
    const auto [missing, missingStatus] = Fails({"--certificate", folder_.At("no"), "--key", folder_.At("no")});
    EXPECT_EQ(missingStatus, 1);
    EXPECT_THAT(missing, HasSubstr("vorn-httpd: the certificate " + folder_.At("no") + " can't be used"));
    folder_.Write("state/key.pem", "x");
    chmod(folder_.At("state").c_str(), 0500);
    const auto [readOnly, readOnlyStatus] = Fails({});
    EXPECT_EQ(readOnlyStatus, 1);
    EXPECT_THAT(readOnly, HasSubstr("can't be written"));
    chmod(folder_.At("state").c_str(), 0777);
}

TEST_F(ProcessTest, ATakenAddress) {
    const DoorProcess first(folder_);
    const std::string address = "127.0.0.1:" + std::to_string(first.port());
    const auto [output, status] = Fails({"--listen", address});
    EXPECT_EQ(status, 1);
    EXPECT_THAT(output, HasSubstr("vorn-httpd: can't listen on " + address + ": Address already in use\n"));
}

TEST_F(ProcessTest, BothFamilies) {
    const DoorProcess door(folder_, {"--clear-text", "--listen", "[::1]:0"});
    const std::string word = "listens on http://[::1]:";
    // It counts as up as soon as it says so of the first address.
    ASSERT_TRUE(Eventually([&] { return door.Output().find(word) != std::string::npos; })) << door.Output();
    const std::string output = door.Output();
    EXPECT_THAT(output, HasSubstr("listens on http://127.0.0.1:"));
    sockaddr_in6 address{};
    address.sin6_family = AF_INET6;
    address.sin6_port = htons(static_cast<std::uint16_t>(std::stoi(output.substr(output.find(word) + word.size()))));
    address.sin6_addr = in6addr_loopback;
    const appliance::FileDescriptor socket(::socket(AF_INET6, SOCK_STREAM, 0));
    EXPECT_EQ(connect(socket.get(), static_cast<const sockaddr*>(static_cast<const void*>(&address)), sizeof address),
              0);
}

TEST_F(ProcessTest, TheLogHasNoSecrets) {
    const std::string answer =
        R"({"success": true, "data": {"session": "secret-session-token", "csrf": "secret-csrf-token"}})";
    StartVornd([&answer](const Message&) { return FakeVornd::Reply(answer); });
    const DoorProcess door(folder_);
    Client client = Connect(door);
    const std::string header = "Cookie: __Host-vorn=secret-session-token\r\nX-CSRF-Token: secret-csrf-token\r\n";
    client.Ask(PostText("/session/login", R"({"user": "secret-user", "password": "secret-password"})"));
    client.Ask(PostText("/session/link", R"({"token": "secret-link"})"));
    client.Ask(PostText("/webapi/A/1/set", R"({"password": "secret-password"})", header));
    client.Ask(GetText("/?secret-query=1", header));
    client.Ask(GetText("/webapi?secret-query=1", header));
    client.Ask(GetText("/bad\x1B[31m", header));
    client.Ask("secret-nonsense\r\n\r\n");
    ASSERT_TRUE(Eventually([&] { return door.Output().find(" - - 400 ") != std::string::npos; })) << door.Output();
    const std::string output = door.Output();
    EXPECT_THAT(output, Not(HasSubstr("secret")));
    EXPECT_THAT(output, HasSubstr(": 127.0.0.1 POST /session/login 200 "));
    EXPECT_THAT(output, HasSubstr(": 127.0.0.1 POST /webapi/A/1/set 200 "));
    EXPECT_THAT(output, ::testing::ContainsRegex(": 127\\.0\\.0\\.1 GET / 200 34 bytes [0-9]+ ms\n"));
    EXPECT_THAT(output, HasSubstr(": 127.0.0.1 GET /webapi 404 "));
    EXPECT_EQ(output.find('\x1B'), std::string::npos);
}

TEST_F(ProcessTest, NothingOfItLeaksIntoItsMemoryForLong) {
    StartVornd();
    const DoorProcess door(folder_);
    const std::string password = "canary-4711-password-in-memory";
    for (int count = 0; count < 3; ++count) {
        Client client = Connect(door);
        EXPECT_EQ(client.Ask(PostText("/webapi/A/1/set", "{\"p\": \"" + password + "\"}", kCookie)).status(), 200);
    }
    usleep(100000);
    // Only what can be written to: the text of the program is known.
    std::ifstream maps("/proc/" + std::to_string(door.pid()) + "/maps");
    std::ifstream memory("/proc/" + std::to_string(door.pid()) + "/mem", std::ios::binary);
    int found = 0;
    std::size_t looked = 0;
    for (std::string line; std::getline(maps, line);) {
        if (line.find(" rw") == std::string::npos) {
            continue;
        }
        const std::size_t begin = std::stoul(line, nullptr, 16);
        const std::size_t end = std::stoul(line.substr(line.find('-') + 1), nullptr, 16);
        if (end - begin > std::size_t{64} << 20) {
            continue;
        }
        std::string bytes(end - begin, '\0');
        memory.clear();
        memory.seekg(static_cast<std::streamoff>(begin));
        memory.read(bytes.data(), static_cast<std::streamsize>(bytes.size()));
        looked += static_cast<std::size_t>(memory.gcount());
        for (std::size_t place = bytes.find(password); place != std::string::npos;
             place = bytes.find(password, place + 1)) {
            ++found;
        }
    }
    EXPECT_GT(looked, std::size_t{1} << 17);
    EXPECT_EQ(found, 0);
}

TEST_F(ProcessTest, EndsInOrder) {
    StartVornd();
    for (const int signal : {SIGTERM, SIGINT}) {
        DoorProcess door(folder_);
        Client idle = Connect(door);
        EXPECT_EQ(idle.Ask(GetText("/")).status(), 200);
        Client silent(door.port());
        door.Signal(signal);
        EXPECT_EQ(door.End(milliseconds(4000)), 0) << door.Output();
        EXPECT_TRUE(idle.Ends());
        EXPECT_TRUE(silent.Ends());
    }
}

TEST_F(ProcessTest, RunningRequestsAreAnsweredAndOthersRefused) {
    std::atomic<bool> go{false};
    StartVornd([&go](const Message&) {
        Eventually([&go] { return go.load(); });
        return FakeVornd::Reply("\"done\"");
    });
    DoorProcess door(folder_);
    Client running = Connect(door);
    running.Send(PostText("/webapi/A/1/b", "{}", kCookie) + GetText("/"));
    Client sending = Connect(door);
    sending.Send("GET / HTTP/1.1\r\n");
    ASSERT_TRUE(Eventually([&] { return vornd_->Requests().size() == 1; }));
    EXPECT_EQ(Connect(door).Ask(GetText("/")).status(), 200) << "and the half request was there before";
    door.Signal(SIGTERM);
    const Message refused = sending.Receive();
    EXPECT_EQ(refused.status(), 503);
    EXPECT_EQ(refused.Code(), 241);
    EXPECT_TRUE(Eventually([&] { return !Client(door.port()).isOpen(); })) << "nobody new is taken on";
    EXPECT_EQ(door.End(milliseconds(500)), std::nullopt);
    go = true;
    const Message last = running.Receive();
    EXPECT_EQ(last.body, "\"done\"");
    EXPECT_EQ(last.header.at("connection"), "close");
    EXPECT_EQ(door.End(), 0);
}

TEST_F(ProcessTest, ASecondSignalEndsItAtOnce) {
    std::atomic<bool> go{false};
    StartVornd([&go](const Message&) {
        Eventually([&go] { return go.load(); });
        return FakeVornd::Reply("{}");
    });
    DoorProcess door(folder_);
    Client running = Connect(door);
    running.Send(PostText("/webapi/A/1/b", "{}", kCookie));
    ASSERT_TRUE(Eventually([&] { return vornd_->Requests().size() == 1; }));
    door.Signal(SIGTERM);
    ASSERT_TRUE(Eventually([&] { return door.Output().find("ending on signal") != std::string::npos; }));
    door.Signal(SIGTERM);
    EXPECT_EQ(door.End(milliseconds(10000)), 1);
    go = true;
    vornd_.reset();
}

TEST_F(ProcessTest, ReadsTheCertificateAnew) {
    StartVornd();
    std::string reason;
    const appliance::CertificateFiles files{folder_.At("state/given.pem"), folder_.At("state/given.key")};
    const auto make = [&](const char* name) {
        ASSERT_TRUE(appliance::MakeCertificate(files, {{name}, {}}, reason)) << reason;
        chmod(files.key.c_str(), 0644);
    };
    folder_.Write("state/empty", "");
    make("first");
    DoorProcess door(folder_, {"--certificate", files.certificate, "--key", files.key});
    const auto shows = [&](const Client& client) {
        X509* certificate = SSL_get1_peer_certificate(client.ssl());
        const int first = X509_check_host(certificate, "first", 0, 0, nullptr);
        X509_free(certificate);
        return first == 1 ? "first" : "second";
    };
    Client before = Connect(door);
    EXPECT_STREQ(shows(before), "first");
    make("second");
    EXPECT_STREQ(shows(Connect(door)), "first");
    door.Signal(SIGHUP);
    ASSERT_TRUE(Eventually([&] { return door.Output().find("read anew") != std::string::npos; })) << door.Output();
    EXPECT_STREQ(shows(Connect(door)), "second");
    EXPECT_EQ(before.Ask(GetText("/")).status(), 200) << "open connections go on";
    folder_.Write("state/given.pem", "nonsense");
    door.Signal(SIGHUP);
    ASSERT_TRUE(Eventually([&] { return door.Output().find("stays in use") != std::string::npos; }));
    EXPECT_STREQ(shows(Connect(door)), "second");
}

TEST_F(ProcessTest, ServesWithoutPageAndWithoutVornd) {
    const DoorProcess door(folder_, {"--page", folder_.At("missing")});
    EXPECT_EQ(Connect(door).Ask(GetText("/")).status(), 404);
    EXPECT_THAT(door.Output(), HasSubstr("can't be opened: No such file"));
    EXPECT_EQ(Connect(door).Ask(PostText("/session/login")).Code(), 250);
}

}  // namespace
}  // namespace httpd_test
