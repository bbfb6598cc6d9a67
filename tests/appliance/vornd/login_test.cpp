// Log-ins with a password.

#include <algorithm>
#include <thread>

#include "tests/appliance/vornd/door.h"

namespace vornd_test {
namespace {

using std::chrono::duration_cast;
using std::chrono::steady_clock;
using ::testing::HasSubstr;
using ::testing::Not;

using LoginTest = DoorTest;

std::size_t CountOf(const std::string& text, const std::string& part) {
    std::size_t count = 0;
    for (std::size_t place = text.find(part); place != std::string::npos; place = text.find(part, place + 1)) {
        ++count;
    }
    return count;
}

TEST_F(LoginTest, GivesASessionAndItsTokens) {
    const Response response = LogIn("anna", "right");
    EXPECT_EQ(response.status, 200);
    EXPECT_EQ(response.Data().getMemberNames(),
              (std::vector<std::string>{"csrf", "expires", "idle_seconds", "session", "user"}));
    EXPECT_EQ(response.header.at("cache-control"), "no-store");
    EXPECT_EQ(tree_.Read("/asked"), "anna:right\n");
    EXPECT_THAT(server_->Errors(), HasSubstr("anna has logged in from 192.0.2.1 with a password"));
    EXPECT_THAT(server_->Errors(), Not(HasSubstr(response.Data()["session"].asString())));
    EXPECT_THAT(tree_.Read("/run/vorn/sessions.json"), Not(HasSubstr(response.Data()["session"].asString())));
}

TEST_F(LoginTest, APasswordIsOnStandardInputAlone) {
    LogIn("anna", "Canary-7");
    EXPECT_EQ(tree_.Read("/asked"), "anna:Canary-7\n");
    EXPECT_EQ(tree_.Read("/asked.arguments"), tree_.At("/usr/vorn/sbin/vornauth") + " \n");
    EXPECT_THAT(tree_.Read("/asked.environment"), Not(HasSubstr("Canary-7")));
    EXPECT_THAT(server_->Errors(), Not(HasSubstr("Canary-7")));
}

// Whatever is wrong, the answer is the same, and comes at the same time.
TEST_F(LoginTest, DoesNotTellWhatIsWrong) {
    struct Case {
        std::string user;
        std::string password;
        std::string logged;
    };
    const std::vector<Case> cases = {
        {"anna", "wrong", "log-in of anna from 192.0.2.1 refused: wrong password"},
        {"bert", "unknown", "log-in of bert from 192.0.2.2 refused: unknown user"},
        {"carl", "refused", "log-in of carl from 192.0.2.3 refused: the account is locked or expired"},
        {"LAB\\\\dora", "no-administrator",
         "log-in of LAB\\dora from 192.0.2.4 refused: not in the group \"administrators\""},
        {"-emil", "right", "a log-in from 192.0.2.5 refused: no possible user"},
        {"<fritz>", "right", "a log-in from 192.0.2.6 refused: no possible user"},
        {"", "right", "a log-in from 192.0.2.7 refused: no possible user"},
        {"gerd\\u0000", "right", "a log-in from 192.0.2.8 refused: no possible user"},
        {"hans", "", "log-in of hans from 192.0.2.9 refused: no possible password"},
        {"hans", "ri\\u0000ght", "log-in of hans from 192.0.2.10 refused: no possible password"},
        {"ida", std::string(512, 'x'), "log-in of ida from 192.0.2.11 refused: no possible password"}};
    std::vector<std::thread> threads;
    std::vector<Response> responses(cases.size());
    std::vector<milliseconds> times(cases.size());
    for (std::size_t index = 0; index < cases.size(); ++index) {
        threads.emplace_back([&, index] {
            const auto begin = steady_clock::now();
            Headers headers;
            headers.client = "192.0.2." + std::to_string(index + 1);
            responses[index] = LogIn(cases[index].user, cases[index].password, headers);
            times[index] = duration_cast<milliseconds>(steady_clock::now() - begin);
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    for (std::size_t index = 0; index < cases.size(); ++index) {
        EXPECT_EQ(responses[index].body, responses[0].body);
        ExpectError(responses[index], 401, 222);
        EXPECT_GE(times[index].count(), 2000) << cases[index].user;
        EXPECT_LT(times[index].count(), 3900) << cases[index].user;
        EXPECT_THAT(server_->Errors(), HasSubstr(cases[index].logged));
    }
}

TEST_F(LoginTest, OneThatTakesLongerIsAnsweredAtTheNextStep) {
    const auto begin = steady_clock::now();
    ExpectError(LogIn("anna", "slow"), 401, 222);
    const auto took = duration_cast<milliseconds>(steady_clock::now() - begin);
    EXPECT_GE(took.count(), 4000);
    EXPECT_LT(took.count(), 5500);
}

TEST_F(LoginTest, SaysWhenPasswordsCannotBeChecked) {
    ExpectError(LogIn("anna", "broken"), 503, 225);
    ExpectError(LogIn("anna", "killed"), 503, 225);
    unlink(tree_.At("/usr/vorn/sbin/vornauth").c_str());
    for (int time = 0; time < 6; ++time) {
        ExpectError(LogIn("anna", "right"), 503, 225);
    }
    EXPECT_THAT(server_->Errors(), HasSubstr("vornauth exited with 1"));
    EXPECT_THAT(server_->Errors(), HasSubstr("vornauth killed by signal 9"));
    EXPECT_THAT(server_->Errors(), HasSubstr("vornauth cannot be started"));
}

TEST_F(LoginTest, GivesUpAfterTwentySeconds) {
    tree_.Write("/usr/vorn/sbin/vornauth", "#!/bin/sh\nexec sleep 60\n", 0755);
    const auto begin = steady_clock::now();
    Client client = server_->Connect(kDoorUser);
    client.Send(RequestText("POST", "/session/login", R"({"user":"anna","password":"right"})", ""));
    ExpectError(client.Receive(milliseconds(40000)), 503, 225);
    const auto took = duration_cast<milliseconds>(steady_clock::now() - begin);
    EXPECT_GE(took.count(), 20000);
    EXPECT_LT(took.count(), 30000);
    EXPECT_THAT(server_->Errors(), HasSubstr("did not end within"));
}

TEST_F(LoginTest, TakesTextsAlone) {
    for (const char* body : {"{}", R"({"user":"anna"})", R"({"password":"right"})", R"({"user":1,"password":"right"})",
                             R"({"user":"anna","password":null})", R"({"user":["anna"],"password":"right"})"}) {
        ExpectError(Ask("POST", "/session/login", body), 400, 206);
    }
    ExpectError(Ask("POST", "/session/login", "{"), 400, 201);
    ExpectError(Ask("POST", "/session/login", "[]"), 400, 204);
    ExpectError(Ask("POST", "/session/login", R"({"user":"a","user":"b","password":"right"})"), 400, 203);
    ExpectError(Ask("GET", "/session/login"), 405, 214);
    Client client = server_->Connect(kDoorUser);
    client.Send("POST /session/login HTTP/1.1\r\nHost: x\r\nContent-Type: text/plain\r\nContent-Length: 2\r\n\r\n{}");
    ExpectError(client.Receive(), 415, 218);
    EXPECT_EQ(tree_.Read("/asked"), "");
}

TEST_F(LoginTest, BruteForceHasToWait) {
    int refused = 0;
    Response throttled;
    std::vector<std::thread> threads;
    std::vector<Response> responses(20);
    for (std::size_t attempt = 0; attempt < responses.size(); ++attempt) {
        threads.emplace_back([&, attempt] {
            Headers headers;
            headers.client = "198.51.100." + std::to_string(attempt);
            responses[attempt] = LogIn("anna", "wrong" + std::to_string(attempt), headers);
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    for (const Response& response : responses) {
        if (response.Code() == 222) {
            ++refused;
        } else {
            ExpectError(response, 429, 223);
            EXPECT_GT(std::stoi(response.header.at("retry-after")), 0);
        }
    }
    EXPECT_EQ(refused, 5);
    EXPECT_EQ(CountOf(tree_.Read("/asked"), "anna"), 5u);
    throttled = LogIn("anna", "right", {{}, {}, "203.0.113.9"});
    ExpectError(throttled, 429, 223);
    EXPECT_GT(std::stoi(throttled.header.at("retry-after")), 20);
    EXPECT_LE(std::stoi(throttled.header.at("retry-after")), 30);
    EXPECT_EQ(LogIn("bert", "right", {{}, {}, "203.0.113.9"}).status, 200) << "another user is not held up";
    EXPECT_EQ(Ask("POST", "/session/link", R"({"token":")" + NewLink() + "\"}").status, 200) << "nor is a link";
}

TEST_F(LoginTest, OneAddressHasToWaitWhateverTheUsers) {
    std::vector<std::thread> threads;
    std::vector<Response> responses(8);
    for (std::size_t attempt = 0; attempt < responses.size(); ++attempt) {
        threads.emplace_back([&, attempt] {
            Headers headers;
            headers.client = "2001:db8::" + std::to_string(attempt + 1);
            responses[attempt] = LogIn("user" + std::to_string(attempt), "wrong", headers);
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(std::count_if(responses.begin(), responses.end(), [](const Response& one) { return one.Code() == 222; }),
              5);
    ExpectError(LogIn("anna", "right", {{}, {}, "2001:db8::ffff"}), 429, 223);
    EXPECT_EQ(LogIn("anna", "right", {{}, {}, "2001:db8:0:1::1"}).status, 200);
}

TEST_F(LoginTest, TwoAtATimeAndEightWait) {
    const auto logIn = [this](std::size_t attempt) {
        Headers headers;
        headers.client = "198.51.100." + std::to_string(attempt);
        return LogIn("user" + std::to_string(attempt), "right-slow", headers);
    };
    std::vector<std::thread> threads;
    std::vector<Response> responses(10);
    const auto start = [&](std::size_t attempt) {
        threads.emplace_back([&, attempt] { responses[attempt] = logIn(attempt); });
    };
    start(0);
    start(1);
    EXPECT_TRUE(Eventually([this] { return CountOf(tree_.Read("/asked"), "\n") == 2; }));
    for (std::size_t attempt = 2; attempt < responses.size(); ++attempt) {
        start(attempt);
    }
    EXPECT_TRUE(
        Eventually([this] { return server_->Figures().find("vorn_log_ins_waiting 8\n") != std::string::npos; }));
    for (std::size_t attempt = 10; attempt < 14; ++attempt) {
        ExpectError(logIn(attempt), 503, 240);
    }
    // Calls have threads of their own.
    EXPECT_EQ(server_->Call("nothing").status, 200);
    EXPECT_EQ(CountOf(tree_.Read("/asked"), "\n"), 2u);
    tree_.Write("/go", "");
    for (std::thread& thread : threads) {
        thread.join();
    }
    for (const Response& response : responses) {
        EXPECT_EQ(response.status, 200) << response.body;
    }
    EXPECT_EQ(LogIn("user13", "right").status, 200) << "it was no failure of the user's";
}

TEST_F(LoginTest, IsAnsweredWhenTheServerEnds) {
    Client client = server_->Connect(kDoorUser);
    client.Send(RequestText("POST", "/session/login", R"({"user":"anna","password":"wrong"})", ""));
    ASSERT_TRUE(Eventually([this] { return tree_.Read("/asked") == "anna:wrong\n"; }));
    server_->Signal(SIGTERM);
    ExpectError(client.Receive(), 401, 222);
    EXPECT_EQ(server_->End(), 0);
}

TEST_F(LoginTest, AClientThatGoesAwayIsCountedAllTheSame) {
    for (int attempt = 0; attempt < 5; ++attempt) {
        Client client = server_->Connect(kDoorUser);
        client.Send(RequestText("POST", "/session/login", R"({"user":"anna","password":"wrong"})", ""));
        const std::size_t asked = static_cast<std::size_t>(attempt) + 1;
        ASSERT_TRUE(Eventually([&] { return CountOf(tree_.Read("/asked"), "anna") == asked; }));
    }
    EXPECT_TRUE(Eventually([this] { return LogIn("anna", "wrong").status == 429; }));
}

}  // namespace
}  // namespace vornd_test
