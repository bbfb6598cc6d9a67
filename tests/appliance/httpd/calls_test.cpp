// What is passed on to vornd, and how; and what is answered without it.

#include <gmock/gmock.h>

#include "tests/appliance/httpd/support.h"

namespace httpd_test {
namespace {

using ::testing::HasSubstr;
using ::testing::Not;

class CallsTest : public ::testing::Test {
protected:
    CallsTest() {
        WritePage(folder_);
    }
    void Serve(FakeVornd::Answer answer = {}) {
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

TEST_F(CallsTest, ACallIsWrittenAnew) {
    Serve([](const Message&) { return FakeVornd::Reply(R"({"success": true, "data": {"a": 1}})"); });
    const Message answer =
        Ask(PostText("/webapi/Some.API/2/get_list", R"({"x": 1})",
                     kCookie + "X-CSRF-Token: csrf-token\r\nX-Background: 1\r\nUser-Agent: somebody\r\n"
                               "Vorn-Session: forged\r\nVorn-Client: 9.9.9.9\r\nVorn-Csrf: forged\r\nX-Other: 1\r\n"
                               "Origin: http://nas:8443\r\nSec-Fetch-Site: same-origin\r\nConnection: keep-alive\r\n"));
    EXPECT_EQ(answer.status(), 200);
    EXPECT_EQ(answer.body, R"({"success": true, "data": {"a": 1}})");
    EXPECT_EQ(answer.header.at("content-type"), "application/json");
    EXPECT_EQ(answer.header.at("cache-control"), "no-store");
    ASSERT_EQ(vornd_->Requests().size(), 1u);
    const Message passed = vornd_->Requests().front();
    EXPECT_EQ(passed.first, "POST /webapi/Some.API/2/get_list HTTP/1.1");
    EXPECT_EQ(passed.body, R"({"x": 1})");
    EXPECT_THAT(passed.lines,
                ::testing::UnorderedElementsAre("Host: localhost", "Vorn-Session: " + kToken, "Vorn-Csrf: csrf-token",
                                                "Vorn-Client: 127.0.0.1", "Vorn-Background: 1",
                                                "Content-Type: application/json", "Content-Length: 8"));
}

TEST_F(CallsTest, DescriptionsNeedASessionToo) {
    Serve();
    for (const char* target : {"/webapi", "/webapi/openapi.json", "/session"}) {
        EXPECT_EQ(Ask(GetText(target)).Code(), 220) << target;
        EXPECT_EQ(Ask(GetText(target)).status(), 401) << target;
        EXPECT_EQ(Ask(GetText(target, kCookie)).status(), 200) << target;
    }
    ASSERT_EQ(vornd_->Requests().size(), 3u) << "what has no session never comes to vornd";
    EXPECT_EQ(vornd_->Requests()[0].first, "GET /webapi HTTP/1.1");
    EXPECT_EQ(vornd_->Requests()[0].header.count("content-length"), 0u);
    EXPECT_EQ(vornd_->Requests()[0].header.count("vorn-background"), 0u);
}

TEST_F(CallsTest, OnlyThePathsThatThereAre) {
    Serve();
    for (const std::string target : {"/session/new-link",
                                     "/session/",
                                     "/session/login/",
                                     "/session/../webapi",
                                     "/webapi/",
                                     "/webapi/a",
                                     "/webapi/a/1",
                                     "/webapi/a/1/b/c",
                                     "/webapi//1/b",
                                     "/webapi/a b/1/c",
                                     "/webapi/a%2F/1/b",
                                     "/webapi/a/1/b?x=1",
                                     "/webapi?x",
                                     "/session?x",
                                     "/session/login?user=x",
                                     "/webapi/openapi.json?x",
                                     "/metrics/",
                                     "/healthz/",
                                     "http://nas:8443/",
                                     "*",
                                     "nas:8443",
                                     "/WEBAPI",
                                     "/webapi#x",
                                     "/webapi/a/1/b#x",
                                     "/webapi/a/1/b;x=1"}) {
        const Message answer = Ask(PostText(target, "{}", kCookie));
        EXPECT_THAT(answer.status(), ::testing::AnyOf(404, 400)) << target;
        EXPECT_EQ(answer.json()["success"], false) << target;
    }
    EXPECT_EQ(Ask(GetText("/unknown")).Code(), 213);
    EXPECT_TRUE(vornd_->Requests().empty());
}

TEST_F(CallsTest, Verbs) {
    Serve();
    const auto allowed = [this](const std::string& verb, const std::string& target) {
        Client client(door_->port());
        client.Send(verb + " " + target + " HTTP/1.1\r\nHost: nas:8443\r\n" + kCookie +
                    "Content-Type: application/json\r\nContent-Length: 2\r\n\r\n{}");
        const Message answer = client.Receive(milliseconds(5000), verb == "HEAD");
        return answer.status() == 405 ? answer.header.at("allow") : std::to_string(answer.status());
    };
    EXPECT_EQ(allowed("GET", "/webapi/A/1/b"), "POST");
    EXPECT_EQ(allowed("PUT", "/webapi/A/1/b"), "POST");
    EXPECT_EQ(allowed("post", "/webapi/A/1/b"), "POST");
    EXPECT_EQ(allowed("GET", "/session/login"), "POST");
    EXPECT_EQ(allowed("GET", "/session/logout"), "POST");
    EXPECT_EQ(allowed("POST", "/session"), "GET");
    EXPECT_EQ(allowed("HEAD", "/webapi/"), "404");
    EXPECT_EQ(allowed("DELETE", "/webapi"), "GET");
    EXPECT_EQ(allowed("POST", "/"), "GET, HEAD");
    EXPECT_EQ(allowed("OPTIONS", "/assets/app.js"), "GET, HEAD");
    EXPECT_EQ(allowed("TRACE", "/"), "GET, HEAD");
    EXPECT_EQ(allowed("POST", "/healthz"), "GET, HEAD");
    EXPECT_EQ(allowed("POST", "/metrics"), "GET");
    EXPECT_TRUE(vornd_->Requests().empty());
}

TEST_F(CallsTest, TypesOfBodies) {
    Serve();
    for (const char* type : {"text/plain", "application/x-www-form-urlencoded", "multipart/form-data", ""}) {
        const Message answer = Ask("POST /webapi/A/1/b HTTP/1.1\r\nHost: x\r\n" + kCookie + "Content-Type: " + type +
                                   "\r\nContent-Length: 2\r\n\r\n{}");
        EXPECT_EQ(answer.status(), 415) << type;
        EXPECT_EQ(answer.Code(), 218) << type;
    }
    EXPECT_EQ(Ask("POST /webapi/A/1/b HTTP/1.1\r\nHost: x\r\n" + kCookie + "Content-Length: 2\r\n\r\n{}").status(),
              415);
    EXPECT_EQ(Ask(PostText("/webapi/A/1/b", "{}", kCookie + "Content-Encoding: gzip\r\n")).status(), 415);
    EXPECT_TRUE(vornd_->Requests().empty());
}

TEST_F(CallsTest, RequestsOfOtherPages) {
    Serve();
    for (const char* line :
         {"Origin: https://evil.example\r\n", "Origin: null\r\n", "Origin: http://nas\r\n",
          "Origin: https://nas:8443\r\n", "Sec-Fetch-Site: cross-site\r\n", "Sec-Fetch-Site: same-site\r\n"}) {
        for (const char* target : {"/webapi/A/1/b", "/session/login", "/session/link", "/session/logout"}) {
            const Message answer = Ask(PostText(target, "{}", kCookie + line));
            EXPECT_EQ(answer.status(), 403) << target << line;
            EXPECT_EQ(answer.Code(), 251) << target << line;
            EXPECT_EQ(answer.header.count("set-cookie"), 0u);
        }
    }
    EXPECT_TRUE(vornd_->Requests().empty());
}

TEST_F(CallsTest, FilesOverTheWire) {
    Serve();
    Client client(door_->port());
    const Message whole = client.Ask(GetText("/assets/app.js?v=1"));
    EXPECT_EQ(whole.body, std::string(100000, 'a'));
    const Message brotli = client.Ask(GetText("/assets/app.js", "Accept-Encoding: br\r\n"));
    EXPECT_EQ(brotli.body, "as brotli");
    EXPECT_EQ(brotli.header.at("content-encoding"), "br");
    client.Send(GetText("/assets/app.js", {}, "HEAD"));
    const Message head = client.Receive(milliseconds(20000), true);
    EXPECT_EQ(head.header.at("content-length"), "100000");
    EXPECT_EQ(head.header.at("etag"), whole.header.at("etag"));
    client.Send(GetText("/assets/app.js", "If-None-Match: " + whole.header.at("etag") + "\r\n"));
    const Message same = client.Receive();
    EXPECT_EQ(same.status(), 304);
    EXPECT_EQ(same.header.count("content-length"), 0u);
    EXPECT_EQ(client.Ask(GetText("/")).body, "<!doctype html><title>page</title>") << "still in step";
}

TEST_F(CallsTest, EveryAnswerForbidsWhatThePageDoesNotNeed) {
    Serve();
    for (const std::string& request :
         {GetText("/"), GetText("/assets/app.js"), GetText("/unknown"), GetText("/healthz"), GetText("/metrics"),
          GetText("/session"), GetText("/session", kCookie), PostText("/session/login", "{"),
          std::string("NONSENSE\r\n\r\n")}) {
        const Message answer = Ask(request);
        EXPECT_EQ(
            answer.header.at("content-security-policy"),
            "default-src 'none'; script-src 'self'; style-src 'self'; img-src 'self' data:; font-src 'self'; "
            "connect-src 'self'; manifest-src 'self'; form-action 'none'; base-uri 'none'; frame-ancestors 'none'");
        EXPECT_EQ(answer.header.at("x-content-type-options"), "nosniff");
        EXPECT_EQ(answer.header.at("x-frame-options"), "DENY");
        EXPECT_EQ(answer.header.at("referrer-policy"), "no-referrer");
        EXPECT_EQ(answer.header.at("cross-origin-opener-policy"), "same-origin");
        EXPECT_EQ(answer.header.at("cross-origin-resource-policy"), "same-origin");
        EXPECT_THAT(answer.header.at("permissions-policy"), HasSubstr("camera=()"));
        EXPECT_EQ(answer.header.count("strict-transport-security"), 0u);
        EXPECT_EQ(answer.header.count("server"), 0u);
        EXPECT_THAT(answer.header.at("date"), HasSubstr(" GMT"));
    }
}

TEST_F(CallsTest, StatusAndFieldsOfVorndThatCount) {
    Serve([](const Message&) {
        return FakeVornd::Reply("{}", 429, "Retry-After: 30\r\nSet-Cookie: a=b\r\nX-Other: 1\r\nConnection: close\r\n");
    });
    Client client(door_->port());
    const Message answer = client.Ask(PostText("/session/login"));
    EXPECT_EQ(answer.status(), 429);
    EXPECT_EQ(answer.header.at("retry-after"), "30");
    EXPECT_EQ(answer.header.count("set-cookie"), 0u);
    EXPECT_EQ(answer.header.count("x-other"), 0u);
    EXPECT_EQ(answer.header.count("connection"), 0u);
    EXPECT_EQ(client.Ask(PostText("/session/login")).status(), 429);
}

TEST_F(CallsTest, Health) {
    Serve([](const Message&) { return FakeVornd::Reply("{}", 401); });
    Client client(door_->port());
    const Message answer = client.Ask(GetText("/healthz"));
    EXPECT_EQ(answer.status(), 200);
    EXPECT_EQ(answer.body, R"({"status":"ok"})");
    client.Send(GetText("/healthz", {}, "HEAD"));
    EXPECT_EQ(client.Receive(milliseconds(20000), true).status(), 200);
    for (int count = 0; count < 50; ++count) {
        EXPECT_EQ(client.Ask(GetText("/healthz")).status(), 200);
    }
    EXPECT_LE(vornd_->Requests().size(), 2u) << "one look a second is enough";
    EXPECT_EQ(vornd_->Requests().front().header.count("vorn-session"), 0u);
}

TEST_F(CallsTest, HealthWithoutVornd) {
    Serve();
    vornd_.reset();
    const Message answer = Ask(GetText("/healthz"));
    EXPECT_EQ(answer.status(), 503);
    EXPECT_EQ(answer.Code(), 250);
}

TEST_F(CallsTest, HealthOfAServerThatEnds) {
    Serve([](const Message&) { return FakeVornd::Reply("{}", 503); });
    EXPECT_EQ(Ask(GetText("/healthz")).status(), 503);
}

TEST_F(CallsTest, Metrics) {
    Serve([](const Message&) { return FakeVornd::Reply("vorn_tasks 3", 200, {}, "text/plain; version=0.0.4"); });
    Client client(door_->port());
    client.Ask(GetText("/"));
    const Message answer = client.Ask(GetText("/metrics"));
    EXPECT_EQ(answer.status(), 200);
    EXPECT_EQ(answer.header.at("content-type"), "text/plain; version=0.0.4; charset=utf-8");
    EXPECT_THAT(answer.body, HasSubstr("\nvorn_httpd_requests_total{verb=\"GET\",status=\"2xx\"} 1\n"));
    EXPECT_THAT(answer.body, HasSubstr("\nvorn_httpd_connections 1\n"));
    EXPECT_THAT(answer.body, HasSubstr("\nvorn_up 1\nvorn_tasks 3\n"));
    vornd_.reset();
    const Message without = client.Ask(GetText("/metrics"));
    EXPECT_EQ(without.status(), 200);
    EXPECT_THAT(without.body, HasSubstr("\nvorn_up 0\n"));
    EXPECT_THAT(without.body, Not(HasSubstr("vorn_tasks")));
}

}  // namespace
}  // namespace httpd_test
