// Sessions as a browser sees them: a cookie that no script reads, and nothing of it anywhere else.

#include <gmock/gmock.h>

#include "appliance/httpd/site.h"
#include "tests/appliance/httpd/support.h"

namespace httpd_test {
namespace {

using ::testing::HasSubstr;
using ::testing::Not;

const std::string kLogInAnswer = R"({"success": true, "data": {"session": ")" + kToken +
                                 R"(", "csrf": "csrf-token", "user": "anna", "idle_seconds": 900, "expires": 5}})";

class SessionTest : public ::testing::Test {
protected:
    void Serve(FakeVornd::Answer answer) {
        WritePage(folder_);
        vornd_ = std::make_unique<FakeVornd>(folder_.At("vornd.sock"), std::move(answer));
        door_ = std::make_unique<DoorThread>(
            DoorThread::Wishes{folder_.At("page"), folder_.At("vornd.sock"), nullptr, {}, "127.0.0.1:0"});
    }
    Message Ask(const std::string& request) {
        return Client(door_->port()).Ask(request);
    }

    Folder folder_;
    std::unique_ptr<FakeVornd> vornd_;
    std::unique_ptr<DoorThread> door_;
};

TEST_F(SessionTest, LogInSetsTheCookieAndShowsNoToken) {
    Serve([](const Message&) { return FakeVornd::Reply(kLogInAnswer); });
    for (const char* target : {"/session/login", "/session/link"}) {
        const Message answer = Ask(PostText(target, R"({"user": "anna", "password": "secret"})"));
        EXPECT_EQ(answer.status(), 200);
        EXPECT_EQ(answer.header.at("set-cookie"),
                  "__Host-vorn=" + kToken + "; Path=/; Secure; HttpOnly; SameSite=Strict");
        EXPECT_EQ(answer.header.at("cache-control"), "no-store");
        EXPECT_THAT(answer.body, Not(HasSubstr(kToken)));
        const Json::Value data = answer.json()["data"];
        EXPECT_EQ(data.getMemberNames(), (std::vector<std::string>{"csrf", "expires", "idle_seconds", "user"}));
        EXPECT_EQ(data["csrf"], "csrf-token");
        EXPECT_EQ(data["expires"], 5);
        EXPECT_EQ(vornd_->Requests().back().body, R"({"user": "anna", "password": "secret"})");
        EXPECT_EQ(vornd_->Requests().back().header.at("vorn-client"), "127.0.0.1");
    }
}

TEST_F(SessionTest, ACookieBroughtAlongIsNeverTheNewSession) {
    Serve([](const Message&) { return FakeVornd::Reply(kLogInAnswer); });
    const Message answer = Ask(PostText("/session/login", "{}", "Cookie: __Host-vorn=planted\r\nX-CSRF-Token: c\r\n"));
    EXPECT_THAT(answer.header.at("set-cookie"), ::testing::StartsWith("__Host-vorn=" + kToken + ";"));
    // vornd ends the session before.
    EXPECT_EQ(vornd_->Requests().back().header.at("vorn-session"), "planted");
    EXPECT_EQ(vornd_->Requests().back().header.count("vorn-csrf"), 0u);
}

TEST_F(SessionTest, ARefusedLogInSetsNoCookie) {
    Serve([](const Message&) {
        return FakeVornd::Reply(R"({"success": false, "error": {"code": 222, "errors": null}})", 401);
    });
    const Message answer = Ask(PostText("/session/login"));
    EXPECT_EQ(answer.status(), 401);
    EXPECT_EQ(answer.Code(), 222);
    EXPECT_EQ(answer.header.count("set-cookie"), 0u);
}

TEST_F(SessionTest, AnswersToALogInThatAreNone) {
    std::string body;
    Serve([&body](const Message&) { return FakeVornd::Reply(body); });
    for (const char* wrong :
         {"", "[]", "{}", "null", "\"text\"", R"({"data": 5})", R"({"data": {"session": 5}})",
          R"({"data": {"session": ""}})", R"({"data": {"session": "a b"}})",
          R"({"data": {"session": "a\r\nSet-Cookie: b"}})", R"({"data": {"session": "a)",
          R"({"data": {"session": "aaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaa"}})"}) {
        body = wrong;
        const Message answer = Ask(PostText("/session/login"));
        EXPECT_EQ(answer.status(), 503) << wrong;
        EXPECT_EQ(answer.Code(), 250) << wrong;
        EXPECT_EQ(answer.header.count("set-cookie"), 0u) << wrong;
    }
}

TEST_F(SessionTest, LogOutClearsTheCookie) {
    Serve([](const Message&) { return FakeVornd::Reply(R"({"success": true, "data": null})"); });
    const Message answer = Ask(PostText("/session/logout", "{}", kCookie + "X-CSRF-Token: c\r\n"));
    EXPECT_EQ(answer.status(), 200);
    EXPECT_EQ(answer.header.at("set-cookie"), "__Host-vorn=; Max-Age=0; Path=/; Secure; HttpOnly; SameSite=Strict");
    EXPECT_EQ(vornd_->Requests().back().header.at("vorn-csrf"), "c");
    EXPECT_EQ(Ask(PostText("/session/logout")).Code(), 220);
}

TEST_F(SessionTest, ASessionThatHasEndedKeepsTheCookieOfAnotherTab) {
    Serve([](const Message&) {
        return FakeVornd::Reply(R"({"success": false, "error": {"code": 220, "errors": null}})", 401);
    });
    const Message answer = Ask(PostText("/webapi/A/1/b", "{}", kCookie));
    EXPECT_EQ(answer.status(), 401);
    EXPECT_EQ(answer.header.count("set-cookie"), 0u);
}

TEST_F(SessionTest, OddCookiesAreNone) {
    Serve({});
    for (const std::string cookie : {"__Host-vorn=a; __Host-vorn=b", "__Host-vorn=a b", "vorn=a",
                                     "__Host-vorn=", "__Host-vorn=\"a\"", "__HOST-VORN=a"}) {
        EXPECT_EQ(Ask(GetText("/session", "Cookie: " + cookie + "\r\n")).Code(), 220) << cookie;
    }
    EXPECT_EQ(Ask(GetText("/session", "Cookie: __Host-vorn=a\r\nCookie: __Host-vorn=a\r\n")).Code(), 220);
    EXPECT_TRUE(vornd_->Requests().empty());
}

TEST_F(SessionTest, OddCsrfTokensAreNone) {
    Serve({});
    const std::vector<std::string> lines{"X-CSRF-Token: a\r\nX-CSRF-Token: a\r\n", "X-CSRF-Token: a b\r\n",
                                         "X-CSRF-Token:\r\n", "X-CSRF-Token: " + std::string(65, 'a') + "\r\n"};
    for (const std::string& line : lines) {
        EXPECT_EQ(Ask(PostText("/webapi/A/1/b", "{}", kCookie + line)).status(), 200);
        EXPECT_EQ(vornd_->Requests().back().header.count("vorn-csrf"), 0u) << line;
    }
}

// A request from another machine, which a test has none of.
class RemoteTest : public ::testing::Test, public appliance::Backend {
protected:
    void Ask(appliance::BackendRequest request, Handler handler) override {
        asked_.push_back(request.target + " " + request.session + (request.background ? " background" : ""));
        appliance::BackendReply reply;
        reply.outcome = appliance::BackendReply::Outcome::Answered;
        reply.isJson = true;
        reply.status = request.target == "/metrics" || request.session == "good" ? 200 : 401;
        handlers_.emplace_back([handler, reply] { handler(reply); });
    }
    int Metrics(const std::string& cookie, bool loopback = false) {
        asked_.clear();
        appliance::ClientRequest request;
        request.verb = "GET";
        request.target = "/metrics";
        request.client = {"10.0.0.5", loopback};
        request.header.insert("Cookie", cookie);
        int status = 0;
        site_.Handle(std::move(request), [&status](const appliance::DoorReply& reply) { status = reply.status; });
        for (std::size_t index = 0; index < handlers_.size(); ++index) {
            std::exchange(handlers_[index], {})();
        }
        handlers_.clear();
        return status;
    }

    std::vector<std::string> asked_;
    std::vector<std::function<void()>> handlers_;
    appliance::DoorLimits limits_;
    appliance::Page page_{"/nonexistent"};
    appliance::Site site_{page_, *this, limits_, [] { return std::string(); }};
};

TEST_F(RemoteTest, MetricsNeedASessionOrLoopback) {
    handlers_.reserve(8);
    EXPECT_EQ(Metrics(""), 401);
    EXPECT_TRUE(asked_.empty());
    EXPECT_EQ(Metrics("__Host-vorn=bad"), 401);
    EXPECT_EQ(asked_, (std::vector<std::string>{"/session bad background"}));
    EXPECT_EQ(Metrics("__Host-vorn=good"), 200);
    EXPECT_EQ(asked_, (std::vector<std::string>{"/session good background", "/metrics  background"}));
    EXPECT_EQ(Metrics("", true), 200);
}

}  // namespace
}  // namespace httpd_test
