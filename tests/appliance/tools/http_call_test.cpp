#include "appliance/tools/vornctl/http_call.h"

#include <gmock/gmock.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <cstdlib>
#include <cstring>
#include <string>

#include "appliance/base/file.h"
#include "appliance/tools/vornctl/exit_code.h"

namespace appliance::ctl {
namespace {

using std::chrono::milliseconds;
using testing::HasSubstr;

// A listening socket in a folder of its own. What it does is up to the test, step by step.
class HttpCallTest : public testing::Test {
protected:
    void SetUp() override {
        ASSERT_NE(mkdtemp(folder_), nullptr);
        path_ = std::string(folder_) + "/socket";
        listener_ = FileDescriptor(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        std::strncpy(address.sun_path, path_.c_str(), sizeof(address.sun_path) - 1);
        ASSERT_EQ(bind(listener_.get(), reinterpret_cast<const sockaddr*>(&address), sizeof(address)), 0);
        ASSERT_EQ(listen(listener_.get(), 1), 0);
    }
    void TearDown() override {
        unlink(path_.c_str());
        rmdir(folder_);
    }

    FileDescriptor Accept() const {
        return FileDescriptor(accept4(listener_.get(), nullptr, nullptr, SOCK_CLOEXEC));
    }

    static void Send(const FileDescriptor& connection, const std::string& text) {
        ASSERT_EQ(send(connection.get(), text.data(), text.size(), MSG_NOSIGNAL), static_cast<ssize_t>(text.size()));
    }

    static std::string FailureOf(HttpCall& call) {
        try {
            call.Take();
        } catch (const Failure& failure) {
            EXPECT_EQ(failure.code(), kNoAnswer);
            return failure.what();
        }
        return "";
    }

    char folder_[32] = "/tmp/vornctl_test_XXXXXX";
    std::string path_;
    FileDescriptor listener_;
};

TEST_F(HttpCallTest, ReadsARefusalThatCameBeforeTheRequestWasSent) {
    HttpCall call(path_, "/webapi/x", Secret(R"({"a":1})"), milliseconds(5000));
    {
        const FileDescriptor connection = Accept();
        Send(connection, "HTTP/1.1 503 Busy\r\nContent-Length: 2\r\n\r\n{}");
    }
    ASSERT_TRUE(call.RunFor(milliseconds(5000)));
    const HttpAnswer answer = call.Take();
    EXPECT_EQ(answer.status, 503);
    EXPECT_EQ(answer.body, "{}");
}

TEST_F(HttpCallTest, TellsWhetherTheRequestWasRead) {
    HttpCall call(path_, "/webapi/x", Secret("{}"), milliseconds(5000));
    Accept();
    ASSERT_TRUE(call.RunFor(milliseconds(5000)));
    EXPECT_EQ(FailureOf(call), "vornd closed the connection before it had read the request.");
}

TEST_F(HttpCallTest, SendsTheRequestAndReadsTheAnswerInPieces) {
    HttpCall call(path_, "/webapi/x/1/y", Secret(R"({"a":1})"), milliseconds(5000));
    const FileDescriptor connection = Accept();
    EXPECT_FALSE(call.RunFor(milliseconds(20)));
    char request[1000] = {};
    ASSERT_GT(recv(connection.get(), request, sizeof(request) - 1, 0), 0);
    EXPECT_THAT(request, testing::StartsWith("POST /webapi/x/1/y HTTP/1.1\r\n"));
    EXPECT_THAT(request, HasSubstr("Content-Length: 7\r\n"));
    EXPECT_THAT(request, testing::EndsWith("\r\n\r\n{\"a\":1}"));
    for (const char* piece : {"HTTP/1.1 200 O", "K\r\nTransfer-Encoding: chunked\r\n", "\r\n4\r\nab", "cd\r\n0\r\n"}) {
        Send(connection, piece);
        EXPECT_FALSE(call.RunFor(milliseconds(20)));
    }
    Send(connection, "\r\n");
    ASSERT_TRUE(call.RunFor(milliseconds(5000)));
    EXPECT_EQ(call.Take().body, "abcd");
}

TEST_F(HttpCallTest, GivesUpAtItsDeadline) {
    HttpCall call(path_, "/webapi/x", Secret("{}"), milliseconds(1000));
    const FileDescriptor connection = Accept();
    const auto begin = std::chrono::steady_clock::now();
    Send(connection, "HTTP/1.1 200 OK\r\n");
    while (!call.RunFor(milliseconds(50))) {
        Send(connection, "A: b\r\n");  // an answer that trickles in does not extend it
    }
    EXPECT_GE(std::chrono::steady_clock::now() - begin, milliseconds(900));
    EXPECT_EQ(FailureOf(call), "vornd did not answer within 1 s.");
}

TEST_F(HttpCallTest, RefusesAnEndlessAnswer) {
    HttpCall call(path_, "/webapi/x", Secret("{}"), milliseconds(5000));
    const FileDescriptor connection = Accept();
    Send(connection, "HTTP/1.1 200 OK\r\nContent-Length: 99999999\r\n\r\n");
    ASSERT_TRUE(call.RunFor(milliseconds(5000)));
    EXPECT_THAT(FailureOf(call), HasSubstr("does not speak HTTP as vornd does"));
}

TEST_F(HttpCallTest, MayBeDroppedAtAnyTime) {
    HttpCall unstarted(path_, "/webapi/x", Secret("{}"), milliseconds(5000));
    HttpCall sent(path_, "/webapi/x", Secret("{}"), milliseconds(5000));
    EXPECT_FALSE(sent.RunFor(milliseconds(20)));
}

}  // namespace
}  // namespace appliance::ctl
