#include "tests/appliance/vornd/door.h"

#include <sys/stat.h>

namespace vornd_test {
namespace {

// It notes down each question, and its own arguments and environment.
constexpr const char* kAsker = R"(#!/bin/sh
echo "$0 $*" >>"$VORN_TEST_ROOT/asked.arguments"
env >>"$VORN_TEST_ROOT/asked.environment"
tr '\0' '\n' | {
    read -r user
    read -r password
    printf '%s:%s\n' "$user" "$password" >>"$VORN_TEST_ROOT/asked"
    case $password in
        right) exit 0 ;;
        right-slow)
            for _ in $(seq 1000); do
                test -e "$VORN_TEST_ROOT/go" && exit 0
                sleep 0.03
            done
            ;;
        slow) sleep 2.1; exit 10 ;;
        unknown) exit 11 ;;
        refused) exit 12 ;;
        no-administrator) exit 13 ;;
        broken) exit 1 ;;
        killed) kill -9 0 ;;
    esac
    exit 10
}
)";

}  // namespace

std::string Headers::Text() const {
    return (session.empty() ? std::string() : "Vorn-Session: " + session + "\r\n") +
           (csrf.empty() ? std::string() : "Vorn-Csrf: " + csrf + "\r\n") +
           (client.empty() ? std::string() : "Vorn-Client: " + client + "\r\n") +
           (background ? "Vorn-Background: 1\r\n" : "");
}

std::string RequestText(const std::string& verb, const std::string& path, const std::string& body,
                        const std::string& header) {
    const std::string content =
        verb == "POST"
            ? "Content-Type: application/json\r\nContent-Length: " + std::to_string(body.size()) + "\r\n\r\n" + body
            : "\r\n";
    return verb + " " + path + " HTTP/1.1\r\nHost: localhost\r\n" + header + content;
}

void ExpectError(const Response& response, int status, int code) {
    EXPECT_EQ(response.status, status);
    EXPECT_EQ(response.Code(), code) << response.body;
    EXPECT_EQ(response.json["success"], Json::Value(false));
}

DoorTest::DoorTest() {
    // The folder of a test is its own; on an appliance everybody may look into /run/vorn.
    chmod(tree_.root().c_str(), 0755);
    tree_.Write("/usr/vorn/sbin/vornauth", kAsker, 0755);
    Restart();
}

void DoorTest::Restart() {
    if (server_) {
        server_->Signal(SIGTERM);
        EXPECT_EQ(server_->End(), 0);
        server_.reset();
    }
    server_ = std::make_unique<Server>(tree_, std::vector<std::string>{"--door", "nobody"});
}

Response DoorTest::Ask(const std::string& verb, const std::string& path, const std::string& body,
                       const Headers& headers, uid_t user) const {
    Client client = server_->Connect(user);
    client.Send(RequestText(verb, path, body, headers.Text()));
    return client.Receive();
}

Response DoorTest::LogIn(const std::string& user, const std::string& password, const Headers& headers) const {
    return Ask("POST", "/session/login", R"({"user":")" + user + R"(","password":")" + password + R"("})", headers);
}

Headers DoorTest::Session() const {
    const Response response = LogIn("anna", "right");
    EXPECT_EQ(response.status, 200) << response.body;
    return {response.Data()["session"].asString(), response.Data()["csrf"].asString()};
}

Response DoorTest::Call(const Headers& headers, const std::string& method, const std::string& body) const {
    return Ask("POST", "/webapi/Test.Plain/1/" + method, body, headers);
}

std::string DoorTest::NewLink() const {
    return Ask("POST", "/session/new-link", "{}", {}, 0).Data()["token"].asString();
}

}  // namespace vornd_test
