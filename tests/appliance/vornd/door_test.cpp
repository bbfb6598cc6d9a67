// What the door may do, and what it may not.

#include "tests/appliance/vornd/door.h"

#include <signal.h>

#include <thread>

#include "appliance/vornd/access.h"
#include "appliance/vornd/session_token.h"
#include "appliance/web/limits.h"

namespace vornd_test {
namespace {

using ::testing::HasSubstr;
using ::testing::Not;

TEST_F(DoorTest, CanLogInAndNothingElse) {
    const std::vector<std::string> closed = {
        "/",          "/healthz",          "/webap",           "/webapix",         "/session-x",
        "/sessions",  "/metrics/",         "/metrics?x=1",     "//session",        "/Session",
        "/%73ession", "/session%2Flogin",  "http://x/session", "/run/vorn",        "/session/../webapi",
        "*",          "/session/new-link", "/session/",        "/session/login/x", "/session/other"};
    for (const char* verb : {"GET", "POST", "PUT", "DELETE", "PATCH", "OPTIONS", "HEAD", "TRACE"}) {
        for (const std::string& path : closed) {
            const Response response = Ask(verb, path, "{}");
            const bool isWrongVerb = path == "/session/new-link" && response.status == 405;
            EXPECT_TRUE(response.status == 401 || isWrongVerb) << verb << " " << path << " " << response.status;
        }
        for (const char* path : {"/webapi", "/webapi/", "/webapi/openapi.json", "/webapi/Test.Plain/1/nothing",
                                 "/webapi/Test.Plain/1/echo", "/webapi/No.Such/1/thing"}) {
            ExpectError(Ask(verb, path, "{}"), 401, 220);
            ExpectError(Ask(verb, path, "{}", {std::string(43, 'A'), std::string(43, 'B')}), 401, 220);
        }
    }
    ExpectError(Ask("GET", "/session"), 401, 220);
    ExpectError(Ask("POST", "/session/logout", "{}"), 401, 220);
    ExpectError(Ask("POST", "/session/new-link", "{}"), 401, 205);
    ExpectError(Ask("POST", "/session/new-link", "{}", Session()), 401, 205);
}

TEST_F(DoorTest, IsOneAccountAlone) {
    for (const char* path :
         {"/session", "/session/login", "/session/link", "/webapi", "/webapi/Test.Plain/1/nothing"}) {
        Client client = server_->Connect(kStranger);
        client.Send(RequestText("POST", path, "{}", Session().Text()));
        ExpectError(client.Receive(), 401, 205);
        EXPECT_TRUE(client.Ends());
    }
    EXPECT_EQ(appliance::FindDoor("no-such-account"), std::nullopt);
    EXPECT_EQ(appliance::FindDoor("root"), std::nullopt) << "root has all rights by itself";
    EXPECT_EQ(appliance::FindDoor("nobody"), kDoorUser);
}

TEST_F(DoorTest, AnAdministratorCallsWhatRootCalls) {
    const Headers headers = Session();
    const Response response = Ask("GET", "/session", {}, headers);
    EXPECT_EQ(response.status, 200);
    EXPECT_EQ(response.Data()["user"], Json::Value("anna"));
    EXPECT_EQ(response.Data()["csrf"], Json::Value(headers.csrf));
    EXPECT_EQ(response.Data()["idle_seconds"], Json::Value(900));
    EXPECT_NEAR(static_cast<double>(response.Data()["expires"].asInt64() - time(nullptr)), 12 * 60 * 60, 5);
    EXPECT_FALSE(response.Data().isMember("session"));
    EXPECT_EQ(Call(headers, "echo", R"({"value":5})").Data()["value"], Json::Value(5));
    EXPECT_EQ(Call(headers, "fail").status, 200);
    EXPECT_EQ(Ask("GET", "/webapi", {}, headers).Data(), Ask("GET", "/webapi", {}, {}, 0).Data());
    EXPECT_EQ(Ask("GET", "/webapi/openapi.json", {}, headers).json["openapi"], Json::Value("3.0.3"));
    ExpectError(Ask("POST", "/webapi/No.Such/1/thing", "{}", headers), 404, 210);
    ExpectError(Call(headers, "echo", "{"), 400, 201);
}

TEST_F(DoorTest, EveryChangeCarriesTheTokenOfItsSession) {
    const Headers headers = Session();
    const Headers other = Session();
    const std::string open = std::string(headers.csrf).replace(0, 1, headers.csrf.front() == 'A' ? "B" : "A");
    for (const std::string& csrf : {std::string(), other.csrf, headers.session, open, headers.csrf + "A"}) {
        ExpectError(Call({headers.session, csrf}), 403, 221);
        ExpectError(Ask("POST", "/session/logout", "{}", {headers.session, csrf}), 403, 221);
        for (const char* verb : {"PUT", "DELETE", "HEAD", "OPTIONS"}) {
            EXPECT_EQ(Ask(verb, "/webapi/Test.Plain/1/nothing", {}, {headers.session, csrf}).status, 403) << verb;
        }
    }
    EXPECT_EQ(Call(headers).status, 200);
}

TEST_F(DoorTest, ATokenThatTheClientBringsIsNeverTakenOver) {
    const std::string brought = appliance::NewToken();
    const Response response = LogIn("anna", "right", {brought, brought});
    ASSERT_EQ(response.status, 200);
    EXPECT_NE(response.Data()["session"].asString(), brought);
    EXPECT_NE(response.Data()["csrf"].asString(), brought);
    ExpectError(Ask("GET", "/session", {}, {brought}), 401, 220);
    const Response linked = Ask("POST", "/session/link", R"({"token":")" + NewLink() + "\"}", {brought, brought});
    ASSERT_EQ(linked.status, 200);
    EXPECT_NE(linked.Data()["session"].asString(), brought);
    ExpectError(Ask("GET", "/session", {}, {brought}), 401, 220);
}

TEST_F(DoorTest, ALogInEndsTheSessionThatTheBrowserHad) {
    const Headers former = Session();
    const Headers other = Session();
    ASSERT_EQ(LogIn("anna", "right", former).status, 200);
    ExpectError(Ask("GET", "/session", {}, former), 401, 220);
    EXPECT_EQ(Ask("GET", "/session", {}, other).status, 200);
    EXPECT_EQ(LogIn("anna", "wrong", other).status, 401);
    EXPECT_EQ(Ask("GET", "/session", {}, other).status, 200) << "one that fails ends nothing";
}

TEST_F(DoorTest, LogOut) {
    const Headers headers = Session();
    const Headers other = Session();
    const Response response = Ask("POST", "/session/logout", {}, headers);
    EXPECT_EQ(response.status, 200);
    EXPECT_TRUE(response.Data().isNull());
    ExpectError(Call(headers), 401, 220);
    ExpectError(Ask("GET", "/session", {}, headers), 401, 220);
    ExpectError(Ask("POST", "/session/logout", {}, headers), 401, 220);
    EXPECT_EQ(Call(other).status, 200);
    Restart();
    ExpectError(Call(headers), 401, 220);
    EXPECT_EQ(Call(other).status, 200);
}

TEST_F(DoorTest, ARestartKeepsSessionsAlsoAfterAKill) {
    const Headers headers = Session();
    Restart();
    EXPECT_EQ(Call(headers).status, 200);
    server_->Signal(SIGKILL);
    server_->End();
    server_.reset();
    Restart();
    EXPECT_EQ(Call(headers).status, 200);
}

TEST_F(DoorTest, ADamagedFileOfSessionsEndsThemAndNothingElse) {
    const Headers headers = Session();
    server_->Signal(SIGTERM);
    server_->End();
    server_.reset();
    tree_.Write("/run/vorn/sessions.json", "{\"sessions\":[{", 0600);
    Restart();
    EXPECT_THAT(server_->Errors(), HasSubstr("sessions.json is damaged"));
    ExpectError(Call(headers), 401, 220);
    EXPECT_EQ(Call(Session()).status, 200);
}

TEST_F(DoorTest, TheAnswerOfACallIsWithheldWhenItsSessionHasEnded) {
    const Headers headers = Session();
    Client client = server_->Connect(kDoorUser);
    const std::string file = tree_.At("/tmp/running");
    const std::string body = R"({"milliseconds":4000,"file":")" + file + "\"}";
    client.Send(RequestText("POST", "/webapi/Test.Plain/1/sleep", body, headers.Text()));
    ASSERT_TRUE(Eventually([&] { return PidsIn(file).size() == 1; }));
    EXPECT_EQ(Ask("POST", "/session/logout", {}, headers).status, 200);
    EXPECT_EQ(client.Receive(milliseconds(500)).status, 0) << "the call goes on";
    ExpectError(client.Receive(), 401, 220);
    client.Send(RequestText("POST", "/webapi/Test.Plain/1/nothing", "{}", Session().Text()));
    EXPECT_EQ(client.Receive().status, 200) << "the connection goes on";
}

TEST_F(DoorTest, ALinkLogsInOnce) {
    const std::string token = NewLink();
    ASSERT_TRUE(appliance::IsToken(token));
    const std::string body = R"({"token":")" + token + "\"}";
    const Response response = Ask("POST", "/session/link", body);
    ASSERT_EQ(response.status, 200);
    EXPECT_EQ(response.Data()["user"], Json::Value("root"));
    EXPECT_EQ(Call({response.Data()["session"].asString(), response.Data()["csrf"].asString()}).status, 200);
    ExpectError(Ask("POST", "/session/link", body), 401, 224);
    ExpectError(Ask("POST", "/session/link", R"({"token":""})"), 401, 224);
    ExpectError(Ask("POST", "/session/link", R"({"token":7})"), 400, 206);
    ExpectError(Ask("POST", "/session/link", "{}"), 400, 206);
    EXPECT_THAT(server_->Errors(), Not(HasSubstr(token)));
    const std::string kept = R"({"token":")" + NewLink() + "\"}";
    Restart();
    ExpectError(Ask("POST", "/session/link", kept), 401, 224);
}

TEST_F(DoorTest, AMarkThatStandsTwiceLeavesADoubt) {
    const Headers headers = Session();
    for (const std::string& twice : {"Vorn-Session: " + headers.session, "vorn-csrf: " + headers.csrf,
                                     std::string("Vorn-Client: 192.0.2.2"), std::string("Vorn-Background: 1")}) {
        Client client = server_->Connect(kDoorUser);
        Headers all = headers;
        all.background = true;
        client.Send(RequestText("POST", "/webapi/Test.Plain/1/nothing", "{}", all.Text() + twice + "\r\n"));
        ExpectError(client.Receive(), 400, 200);
        EXPECT_TRUE(client.Ends());
    }
}

TEST_F(DoorTest, OtherRequestsOnItsConnectionAreInNoSession) {
    const Headers headers = Session();
    Client client = server_->Connect(kDoorUser);
    client.Send(RequestText("POST", "/webapi/Test.Plain/1/nothing", "{}", headers.Text()) +
                RequestText("POST", "/webapi/Test.Plain/1/nothing", "{}", "") +
                RequestText("POST", "/webapi/Test.Plain/1/nothing", "{}", headers.Text()));
    EXPECT_EQ(client.Receive().status, 200);
    ExpectError(client.Receive(), 401, 220);
    EXPECT_EQ(client.Receive().status, 200);
}

TEST_F(DoorTest, NeverTakesTheAdministratorsConnections) {
    std::vector<Client> doors;
    for (std::size_t count = 1; count < appliance::kDoorConnections; ++count) {
        doors.push_back(server_->Connect(kDoorUser));
        doors.back().Send("POST /session/login HTTP/1.1\r\n");  // busy for 15 s
    }
    doors.push_back(server_->Connect(kDoorUser));
    doors.back().Send(RequestText("POST", "/session/login", R"({"user":"anna","password":"right-slow"})", ""));
    // Once the last one's request has been taken, those before it are busy, too.
    ASSERT_TRUE(Eventually([this] { return tree_.Read("/asked") == "anna:right-slow\n"; }));
    Client more = server_->Connect(kDoorUser);
    more.Send(RequestText("GET", "/session", "", ""));
    EXPECT_EQ(more.Receive().Code(), 242);
    EXPECT_EQ(server_->Call("nothing").status, 200);
    tree_.Write("/go", "");
    EXPECT_EQ(doors.back().Receive().status, 200);
    doors.clear();
    EXPECT_TRUE(Eventually([this] { return Ask("GET", "/session").status == 401; }));
    for (std::size_t count = 0; count <= appliance::kDoorConnections; ++count) {
        doors.push_back(server_->Connect(kDoorUser));
    }
    Client last = server_->Connect(kDoorUser);
    last.Send(RequestText("GET", "/session", "", ""));
    ExpectError(last.Receive(), 401, 220);
    EXPECT_TRUE(doors.front().Ends()) << "the oldest idle one has made room";
}

}  // namespace
}  // namespace vornd_test
