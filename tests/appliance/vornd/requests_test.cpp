// What a request gets for an answer.

#include <gmock/gmock.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include "tests/appliance/vornd/support.h"

namespace vornd_test {
namespace {

using ::testing::HasSubstr;
using ::testing::Not;

class RequestsTest : public ::testing::Test {
protected:
    // Sends the bytes on a connection of their own.
    Response Ask(const std::string& bytes) const {
        Client client = server_.Connect();
        client.Send(bytes);
        return client.Receive();
    }
    Response Post(const std::string& body, const std::string& type = "Content-Type: application/json\r\n") const {
        return Ask("POST /webapi/Test.Plain/1/echo HTTP/1.1\r\nHost: x\r\n" + type +
                   "Content-Length: " + std::to_string(body.size()) + "\r\n\r\n" + body);
    }
    Response Get(const std::string& target) const {
        return Ask("GET " + target + " HTTP/1.1\r\nHost: x\r\n\r\n");
    }

    Tree tree_;
    Server server_{tree_};
};

void ExpectError(const Response& response, int status, int code) {
    EXPECT_EQ(response.status, status);
    EXPECT_EQ(response.json["success"], Json::Value(false)) << response.body;
    EXPECT_EQ(response.Code(), code) << response.body;
    EXPECT_TRUE(response.json["error"]["errors"].isString()) << response.body;
    EXPECT_EQ(response.header.at("content-type"), "application/json");
}

TEST_F(RequestsTest, AnswersSuccessWithData) {
    const Response response = server_.Call("echo", Object({{"value", 7}}));
    EXPECT_EQ(response.status, 200);
    EXPECT_EQ(response.body, R"({"data":{"has":true,"value":7},"success":true})");
    EXPECT_EQ(response.header.at("content-type"), "application/json");
    EXPECT_EQ(response.header.at("cache-control"), "no-store");
}

TEST_F(RequestsTest, AnswersNullDataAsNull) {
    EXPECT_EQ(server_.Call("nothing").body, R"({"data":null,"success":true})");
}

TEST_F(RequestsTest, AnswersTheLastAnswerOfAMethod) {
    const Response response = server_.Call("fail");
    EXPECT_EQ(response.status, 200);
    EXPECT_EQ(response.body, R"({"error":{"code":2607,"errors":{"detail":7}},"success":false})");
}

TEST_F(RequestsTest, TakesNoBodyForNoParameters) {
    const Response response = Ask("POST /webapi/Test.Plain/1/echo HTTP/1.1\r\nHost: x\r\nContent-Length: 0\r\n\r\n");
    EXPECT_EQ(response.body, R"({"data":{"has":false,"value":"fallback"},"success":true})");
}

TEST_F(RequestsTest, AParameterThatIsNullIsThere) {
    EXPECT_EQ(Post(R"({"value": null})").body, R"({"data":{"has":true,"value":null},"success":true})");
}

TEST_F(RequestsTest, AnswersInAsciiWhateverTheText) {
    EXPECT_EQ(Post("{\"value\": \"\xC3\xA9\\u0000\"}").body,
              R"({"data":{"has":true,"value":"\u00e9\u0000"},"success":true})");
}

TEST_F(RequestsTest, TakesAChunkedBody) {
    const Response response =
        Ask("POST /webapi/Test.Plain/1/echo HTTP/1.1\r\nHost: x\r\nContent-Type: application/json\r\n"
            "Transfer-Encoding: chunked\r\n\r\n5\r\n{\"val\r\n7\r\nue\": 1}\r\n0\r\n\r\n");
    EXPECT_EQ(response.Data()["value"], Json::Value(1)) << response.body;
}

TEST_F(RequestsTest, TakesParametersOfTheContentType) {
    EXPECT_EQ(Post("{}", "Content-Type: Application/JSON; charset=utf-8\r\n").status, 200);
}

TEST_F(RequestsTest, TellsAClientThatAsksToGoOn) {
    Client client = server_.Connect();
    client.Send(
        "POST /webapi/Test.Plain/1/echo HTTP/1.1\r\nHost: x\r\nContent-Type: application/json\r\n"
        "Expect: 100-continue\r\nContent-Length: 2\r\n\r\n");
    EXPECT_EQ(client.Receive().status, 100);
    client.Send("{}");
    EXPECT_EQ(client.Receive().status, 200);
}

TEST_F(RequestsTest, RefusesOtherContentTypes) {
    ExpectError(Post("{}", "Content-Type: text/plain\r\n"), 415, 218);
    ExpectError(Post("{}", "Content-Type: application/x-www-form-urlencoded\r\n"), 415, 218);
    ExpectError(Post("{}", ""), 415, 218);
    ExpectError(Post("", "Content-Type: text/plain\r\n"), 415, 218);
    ExpectError(Post("{}", "Content-Type: application/json\r\nContent-Encoding: gzip\r\n"), 415, 218);
}

TEST_F(RequestsTest, RefusesWhatIsNoObject) {
    ExpectError(Post("{"), 400, 201);
    ExpectError(Post("{} x"), 400, 201);
    ExpectError(Post("[1]"), 400, 204);
    ExpectError(Post("1"), 400, 204);
    ExpectError(Post(R"({"a": 1, "a": 2})"), 400, 203);
    ExpectError(Post(R"({"a": [[[[[[[[[[1]]]]]]]]]]})"), 400, 202);
}

TEST_F(RequestsTest, ConnectionGoesOnAfterARefusedBody) {
    Client client = server_.Connect();
    client.Send(PostText("echo", "{") + PostText("nothing", "{}"));
    EXPECT_EQ(client.Receive().status, 400);
    EXPECT_EQ(client.Receive().status, 200);
}

TEST_F(RequestsTest, KnowsNoOtherPaths) {
    ExpectError(Get("/"), 404, 213);
    ExpectError(Get("/webapix"), 404, 213);
    ExpectError(Get("/webapi/"), 404, 213);
    ExpectError(Get("/webapi?x=1"), 404, 213);
    ExpectError(Get("http://x/webapi"), 404, 213);
    ExpectError(Get("/webapi/../webapi"), 404, 213);
    ExpectError(Get("/webapi/../1/webapi"), 404, 210);
    ExpectError(Get("/webapi/Test.Plain/1"), 404, 213);
    ExpectError(Get("/webapi/Test.Plain/1/echo/"), 404, 213);
    ExpectError(Get("/webapi/Test.Plain/1/%65cho"), 404, 211);
}

TEST_F(RequestsTest, NamesWhatIsMissing) {
    Client client = server_.Connect();
    client.Send(PostText("echo", "{}", "1", "Test.Plai") + PostText("echo", "{}", "1", "test.plain") +
                PostText("ech", "{}") + PostText("echo", "{}", "0") + PostText("echo", "{}", "x") +
                PostText("echo", "{}", "-1") + PostText("echo", "{}", "01") + PostText("echo", "{}", "99999999999"));
    for (const int code : {210, 210, 211, 212, 212, 212, 212, 212}) {
        ExpectError(client.Receive(), 404, code);
    }
}

TEST_F(RequestsTest, MatchesTheHighestVersionNotAboveTheRequested) {
    const auto version = [&](const char* asked) { return Ask(PostText("method", "{}", asked, "Test.Versions")).json; };
    EXPECT_EQ(version("1")["error"]["code"], Json::Value(212));
    EXPECT_EQ(version("2")["data"], Json::Value(2));
    EXPECT_EQ(version("3")["data"], Json::Value(2));
    EXPECT_EQ(version("4")["data"], Json::Value(4));
    EXPECT_EQ(version("999999")["data"], Json::Value(4));
}

TEST_F(RequestsTest, RefusesTheWrongVerb) {
    const Response call = Get("/webapi/Test.Plain/1/echo");
    ExpectError(call, 405, 214);
    EXPECT_EQ(call.header.at("allow"), "POST");
    const Response list = Ask("POST /webapi HTTP/1.1\r\nHost: x\r\nContent-Length: 0\r\n\r\n");
    ExpectError(list, 405, 214);
    EXPECT_EQ(list.header.at("allow"), "GET");
    ExpectError(Ask("DELETE /webapi/Test.Plain/1/echo HTTP/1.1\r\nHost: x\r\n\r\n"), 405, 214);
}

TEST_F(RequestsTest, ListsWhatIsLoaded) {
    const Json::Value apis = Get("/webapi").Data()["apis"];
    ASSERT_EQ(apis.size(), 2u);
    EXPECT_EQ(apis[0]["api"], Json::Value("Test.Plain"));
    EXPECT_EQ(apis[0]["methods"][0]["method"], Json::Value("echo"));
    EXPECT_EQ(apis[1]["methods"][0]["versions"][0], Json::Value(2));
    EXPECT_EQ(apis[1]["methods"][0]["versions"][1], Json::Value(4));
}

TEST_F(RequestsTest, AnExceptionIsTheServersAnswerAndTheServerGoesOn) {
    Client client = server_.Connect();
    client.Send(PostText("throw", "{}") + PostText("throw_number", "{}") + PostText("silent", "{}") +
                PostText("nothing", "{}"));
    ExpectError(client.Receive(), 500, 230);
    ExpectError(client.Receive(), 500, 230);
    ExpectError(client.Receive(), 500, 231);
    EXPECT_EQ(client.Receive().status, 200);
    EXPECT_THAT(server_.Errors(), HasSubstr("Test.Plain/1/throw: an exception left the module: thrown on purpose"));
}

TEST_F(RequestsTest, NoParameterGetsIntoTheLog) {
    server_.Call("fail", Object({{"password", "Canary-7"}}));
    server_.Call("throw", Object({{"password", "Canary-7"}}));
    EXPECT_THAT(server_.Errors(), HasSubstr("Test.Plain/1/fail: answered with error 2607"));
    EXPECT_THAT(server_.Errors(), Not(HasSubstr("Canary-7")));
}

TEST_F(RequestsTest, OthersThanRootAreNobody) {
    // The folder of a test is its own; on an appliance everybody may look into /run/vorn.
    ASSERT_EQ(chmod(tree_.root().c_str(), 0755), 0);
    const pid_t child = fork();
    if (child == 0) {
        if (setgid(65534) != 0 || setuid(65534) != 0) {
            _exit(99);
        }
        Client client(tree_.Socket());
        client.Send(PostText("nothing", "{}"));
        const Response response = client.Receive();
        _exit(response.status == 401 && response.Code() == 205 && client.Ends() ? 0 : 1);
    }
    int status = 0;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(WEXITSTATUS(status), 0);
}

TEST_F(RequestsTest, ProgramsOfAModuleInheritNoConnection) {
    std::vector<Client> clients;
    for (int index = 0; index < 5; ++index) {
        clients.push_back(server_.Connect());
        clients.back().Send("POST");
    }
    EXPECT_EQ(server_.Call("inherited").Data(), Json::Value(0));
}

TEST(DescriptionsTest, AreServedAsAnOpenApiDocument) {
    Tree tree;
    tree.Write("/usr/vorn/share/methods.json", R"([{"api": "Test.Plain", "version": 1, "method": "echo",
        "summary": "Says it again", "parameters": [{"name": "value", "type": "integer", "required": true,
        "description": "What to say"}, {"name": "more", "type": "object", "members": [{"name": "names",
        "type": "array", "items": "string", "required": true}]}], "example_request": {"value": 1}, "example_answer": {"success": true}}])");
    Server server(tree);
    Client client = server.Connect();
    client.Send("GET /webapi/openapi.json HTTP/1.1\r\nHost: x\r\n\r\n");
    const Json::Value document = client.Receive().json;
    EXPECT_EQ(document["openapi"], Json::Value("3.0.3"));
    const Json::Value& echo = document["paths"]["/webapi/Test.Plain/1/echo"]["post"];
    EXPECT_EQ(echo["summary"], Json::Value("Says it again"));
    const Json::Value& content = echo["requestBody"]["content"]["application/json"];
    EXPECT_EQ(content["schema"]["properties"]["value"]["type"], Json::Value("integer"));
    EXPECT_EQ(content["schema"]["required"][0], Json::Value("value"));
    const Json::Value& more = content["schema"]["properties"]["more"];
    EXPECT_EQ(more["properties"]["names"]["items"]["type"], Json::Value("string"));
    EXPECT_EQ(more["required"][0], Json::Value("names"));
    EXPECT_EQ(content["example"]["value"], Json::Value(1));
    EXPECT_TRUE(document["paths"].isMember("/webapi/Test.Versions/4/method"));
}

TEST(DescriptionsTest, ABrokenFileIsLeftOut) {
    Tree tree;
    tree.Write("/usr/vorn/share/methods.json", "[");
    Server server(tree);
    EXPECT_THAT(server.Errors(), HasSubstr("methods.json: no JSON array"));
    EXPECT_EQ(server.Call("nothing").status, 200);
}

}  // namespace
}  // namespace vornd_test
