// Requests whose end two programs could see in two places, and other shapes that no proper client sends. Each is
// refused with 400 and the connection closed, so that nothing behind it is ever taken for a request.

#include <gmock/gmock.h>

#include "tests/appliance/vornd/support.h"

namespace vornd_test {
namespace {

const std::string kHead = "POST /webapi/Test.Plain/1/echo HTTP/1.1\r\n";
const std::string kJson = "Content-Type: application/json\r\n";
const std::string kNext = "POST /webapi/Test.Plain/1/nothing HTTP/1.1\r\nHost: x\r\nContent-Length: 0\r\n\r\n";

class SmugglingTest : public ::testing::Test {
protected:
    static void SetUpTestSuite() {
        tree_ = new Tree;
        server_ = new Server(*tree_);
    }
    static void TearDownTestSuite() {
        delete server_;
        delete tree_;
    }
    void ExpectRefused(const std::string& bytes) {
        Client client = server_->Connect();
        client.Send(bytes + kNext);
        Response response = client.Receive();
        EXPECT_EQ(response.status, 400) << bytes;
        EXPECT_EQ(response.Code(), 200) << bytes;
        EXPECT_EQ(response.header["connection"], "close") << bytes;
        client.CloseSending();
        EXPECT_TRUE(client.Ends()) << bytes;
    }

    static Tree* tree_;
    static Server* server_;
};

Tree* SmugglingTest::tree_ = nullptr;
Server* SmugglingTest::server_ = nullptr;

TEST_F(SmugglingTest, Host) {
    ExpectRefused(kHead + kJson + "Content-Length: 2\r\n\r\n{}");
    ExpectRefused(kHead + kJson + "Host: a\r\nHost: a\r\nContent-Length: 2\r\n\r\n{}");
    ExpectRefused(kHead + kJson + "Host:\r\nContent-Length: 2\r\n\r\n{}");
    ExpectRefused(kHead + kJson + "Host: a b\r\nContent-Length: 2\r\n\r\n{}");
    ExpectRefused(kHead + kJson + "Host: a@b\r\nContent-Length: 2\r\n\r\n{}");
}

TEST_F(SmugglingTest, BothLengthAndEncoding) {
    ExpectRefused(kHead + kJson + "Host: x\r\nContent-Length: 2\r\nTransfer-Encoding: chunked\r\n\r\n0\r\n\r\n");
    ExpectRefused(kHead + kJson + "Host: x\r\nTransfer-Encoding: chunked\r\nContent-Length: 5\r\n\r\n0\r\n\r\n");
}

TEST_F(SmugglingTest, OtherEncodings) {
    for (const char* encoding : {"xchunked", "chunkedx", "chunked, chunked", "gzip, chunked", "chunked, identity",
                                 "identity", "\"chunked\"", "chunked;q=1", "chunked,", ",chunked", "gzip", ""}) {
        ExpectRefused(kHead + kJson + "Host: x\r\nTransfer-Encoding: " + encoding + "\r\n\r\n0\r\n\r\n");
    }
    ExpectRefused(kHead + kJson +
                  "Host: x\r\nTransfer-Encoding: chunked\r\nTransfer-Encoding: chunked\r\n\r\n0\r\n\r\n");
    ExpectRefused(kHead + kJson + "Host: x\r\nTransfer-Encoding : chunked\r\n\r\n0\r\n\r\n");
    ExpectRefused("POST /webapi/Test.Plain/1/echo HTTP/1.0\r\n" + kJson +
                  "Host: x\r\nTransfer-Encoding: chunked\r\n\r\n0\r\n\r\n");
}

TEST_F(SmugglingTest, OtherLengths) {
    for (const char* length : {"+2", "-2", "0x2", "2 2", "2,2", "2, 2", "", "99999999999999999999999", "2.0", "two"}) {
        ExpectRefused(kHead + kJson + "Host: x\r\nContent-Length: " + length + "\r\n\r\n{}");
    }
    ExpectRefused(kHead + kJson + "Host: x\r\nContent-Length: 2\r\nContent-Length: 3\r\n\r\n{}");
    ExpectRefused(kHead + kJson + "Host: x\r\nContent-Length: 2\r\nContent-Length: 2\r\n\r\n{}");
    ExpectRefused(kHead + kJson + "Host: x\r\nContent-Length : 2\r\n\r\n{}");
}

TEST_F(SmugglingTest, Chunks) {
    for (const char* chunk : {"x\r\n{}\r\n0\r\n\r\n", "-2\r\n{}\r\n0\r\n\r\n", "2\r\n{}0\r\n\r\n",
                              "fffffffffffffffff\r\n{}\r\n0\r\n\r\n", "2\n{}\n0\n\n"}) {
        ExpectRefused(kHead + kJson + "Host: x\r\nTransfer-Encoding: chunked\r\n\r\n" + chunk);
    }
}

TEST_F(SmugglingTest, Lines) {
    ExpectRefused("POST /webapi/Test.Plain/1/echo HTTP/1.1\nHost: x\n\n");
    ExpectRefused("POST  /webapi/Test.Plain/1/echo HTTP/1.1\r\nHost: x\r\n\r\n");
    ExpectRefused("POST /webapi/Test.Plain/1/echo HTTP/2.0\r\nHost: x\r\n\r\n");
    ExpectRefused("POST /webapi/Test.Plain/1/echo HTTP/0.9\r\nHost: x\r\n\r\n");
    ExpectRefused("POST /webapi/Test.Plain/1/echo\r\n\r\n");
    ExpectRefused(kHead + "Host: x\r\nNo colon here\r\n\r\n");
    ExpectRefused(kHead + "Host: x\r\nBad\x01Name: 1\r\n\r\n");
    ExpectRefused(kHead + "Host: x\r\nName: a\x01" + "b\r\n\r\n");
    ExpectRefused(std::string("\x16\x03\x01\x02\x00\x01\x00\x01\xFC\x03\x03", 11));
}

TEST_F(SmugglingTest, FieldsBehindTheBodyChangeNothing) {
    const std::string begin = kHead + "Host: x\r\nTransfer-Encoding: chunked\r\n\r\n2\r\n{}\r\n0\r\n";
    Client client = server_->Connect();
    client.Send(begin + "Content-Type: application/json\r\nConnection: close\r\n\r\n" + kNext);
    EXPECT_EQ(client.Receive().status, 415);
    EXPECT_EQ(client.Receive().status, 200);
    ExpectRefused(begin + "Content-Length: 500\r\n\r\n");
    ExpectRefused(begin + "Transfer-Encoding: chunked\r\n\r\n");
}

TEST_F(SmugglingTest, AnUpgradeIsNoneAndTheBodyStillCounts) {
    Client client = server_->Connect();
    client.Send(kHead + kJson +
                "Host: x\r\nConnection: upgrade, keep-alive\r\nUpgrade: h2c\r\nContent-Length: 2\r\n\r\n{}" + kNext);
    EXPECT_EQ(client.Receive().status, 200);
    EXPECT_EQ(client.Receive().status, 200);
}

}  // namespace
}  // namespace vornd_test
