// Requests whose end two programs could see in two places, and other shapes that no proper client sends. Each is
// refused and the connection closed, so that nothing behind it is ever taken for a request.

#include <gmock/gmock.h>

#include "tests/appliance/httpd/support.h"

namespace httpd_test {
namespace {

const std::string kHead = "POST /webapi/A/1/b HTTP/1.1\r\n" + kCookie;
const std::string kJson = "Content-Type: application/json\r\n";
const std::string kNext = "GET /session HTTP/1.1\r\nHost: x\r\n" + kCookie + "\r\n";

class SmugglingTest : public ::testing::Test {
protected:
    SmugglingTest()
        : vornd_(folder_.At("vornd.sock")),
          door_({folder_.At("page"), folder_.At("vornd.sock"), nullptr, {}, "127.0.0.1:0"}) {}

    void ExpectRefused(const std::string& bytes, int status = 400, int code = 200) {
        // At once, and in pieces that end where it hurts most.
        for (const std::size_t piece : {bytes.size() + kNext.size(), std::size_t{1}, std::size_t{7}}) {
            Client client(door_.port());
            const std::string all = bytes + kNext;
            for (std::size_t place = 0; place < all.size() && client.Send(all.substr(place, piece)); place += piece) {
                if (piece < all.size() && all.size() < 400) {
                    usleep(50);
                }
            }
            const Message answer = client.Receive();
            EXPECT_EQ(answer.status(), status) << bytes;
            EXPECT_EQ(answer.Code(), code) << bytes;
            EXPECT_EQ(answer.header.count("connection"), 1u) << bytes;
            client.CloseSending();
            EXPECT_TRUE(client.Ends()) << bytes;
        }
        EXPECT_EQ(vornd_.Requests().size(), expected_) << bytes;
    }

    Folder folder_;
    FakeVornd vornd_;
    DoorThread door_;
    std::size_t expected_ = 0;
};

TEST_F(SmugglingTest, Host) {
    ExpectRefused(kHead + kJson + "Content-Length: 2\r\n\r\n{}");
    ExpectRefused(kHead + kJson + "Host: a\r\nHost: a\r\nContent-Length: 2\r\n\r\n{}");
    ExpectRefused(kHead + kJson + "Host:\r\nContent-Length: 2\r\n\r\n{}");
    ExpectRefused(kHead + kJson + "Host: a b\r\nContent-Length: 2\r\n\r\n{}");
    ExpectRefused(kHead + kJson + "Host: a@b\r\nContent-Length: 2\r\n\r\n{}");
    ExpectRefused(kHead + kJson + "Host : a\r\nContent-Length: 2\r\n\r\n{}");
}

TEST_F(SmugglingTest, BothLengthAndEncoding) {
    ExpectRefused(kHead + kJson + "Host: x\r\nContent-Length: 2\r\nTransfer-Encoding: chunked\r\n\r\n0\r\n\r\n");
    ExpectRefused(kHead + kJson + "Host: x\r\nTransfer-Encoding: chunked\r\nContent-Length: 5\r\n\r\n0\r\n\r\n");
}

TEST_F(SmugglingTest, OtherEncodings) {
    for (const char* encoding : {"xchunked", "chunkedx", "chunked, chunked", "gzip, chunked", "chunked, identity",
                                 "identity", "\"chunked\"", "chunked;q=1", "chunked,", ",chunked", "gzip", "",
                                 "\x0B"
                                 "chunked",
                                 "chunked\x0C"}) {
        ExpectRefused(kHead + kJson + "Host: x\r\nTransfer-Encoding: " + encoding + "\r\n\r\n0\r\n\r\n");
    }
    ExpectRefused(kHead + kJson +
                  "Host: x\r\nTransfer-Encoding: chunked\r\nTransfer-Encoding: chunked\r\n\r\n0\r\n\r\n");
    ExpectRefused(kHead + kJson + "Host: x\r\nTransfer-Encoding : chunked\r\n\r\n0\r\n\r\n");
    ExpectRefused(kHead + kJson + "Host: x\r\nTransfer-Encoding:\r\n chunked\r\n\r\n0\r\n\r\n");
    ExpectRefused("POST /webapi/A/1/b HTTP/1.0\r\n" + kJson + "Host: x\r\nTransfer-Encoding: chunked\r\n\r\n0\r\n\r\n");
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
                              "0x2\r\n{}\r\n0\r\n\r\n", "+2\r\n{}\r\n0\r\n\r\n", "fffffffffffffffff\r\n{}\r\n0\r\n\r\n",
                              "2\n{}\n0\n\n", "2\r\n{}\r\n0\n\n", " 2\r\n{}\r\n0\r\n\r\n"}) {
        ExpectRefused(kHead + kJson + "Host: x\r\nTransfer-Encoding: chunked\r\n\r\n" + chunk);
    }
}

TEST_F(SmugglingTest, Lines) {
    const std::string start = "POST /webapi/A/1/b HTTP/1.1";
    ExpectRefused(start + "\nHost: x\n\n");
    ExpectRefused(start + "\r\nHost: x\n\r\n");
    ExpectRefused(start + "\rHost: x\r\n\r\n");
    ExpectRefused(start + "\r\nHost: x\rContent-Length: 5\r\n\r\n");
    ExpectRefused(start + "\r\nHost: x\r\nName: a\r\n b\r\n\r\n");
    ExpectRefused(start + "\r\nHost: x\r\nName: a\r\n\tb\r\n\r\n");
    ExpectRefused(start + "\r\n Host: x\r\n\r\n");
    ExpectRefused("POST  /webapi/A/1/b HTTP/1.1\r\nHost: x\r\n\r\n");
    ExpectRefused("POST /webapi/A/1/b  HTTP/1.1\r\nHost: x\r\n\r\n");
    ExpectRefused(" POST /webapi/A/1/b HTTP/1.1\r\nHost: x\r\n\r\n");
    ExpectRefused("\r\nPOST /webapi/A/1/b HTTP/1.1\r\nHost: x\r\n\r\n");
    ExpectRefused("POST /webapi/A/1/b HTTP/2.0\r\nHost: x\r\n\r\n");
    ExpectRefused("POST /webapi/A/1/b HTTP/0.9\r\nHost: x\r\n\r\n");
    ExpectRefused("POST /webapi/A/1/b HTTP/1.1 \r\nHost: x\r\n\r\n");
    ExpectRefused("POST /webapi/A/1/b http/1.1\r\nHost: x\r\n\r\n");
    ExpectRefused("POST /webapi/A/1/b\r\n\r\n");
    ExpectRefused("POST /webapi/\xC3\xA4/1/b HTTP/1.1\r\nHost: x\r\n\r\n");
    ExpectRefused(kHead + "Host: x\r\nNo colon here\r\n\r\n");
    ExpectRefused(kHead + "Host: x\r\n: no name\r\n\r\n");
    ExpectRefused(kHead + "Host: x\r\nBad\x01Name: 1\r\n\r\n");
    ExpectRefused(kHead + "Host: x\r\nBad Name: 1\r\n\r\n");
    ExpectRefused(kHead + "Host: x\r\nName: a\x01" + "b\r\n\r\n");
    ExpectRefused(kHead + "Host: x\r\nName: a" + std::string(1, '\0') + "b\r\n\r\n");
    ExpectRefused("PRI * HTTP/2.0\r\n\r\nSM\r\n\r\n");
}

TEST_F(SmugglingTest, FieldsBehindTheBodyChangeNothing) {
    const std::string begin = kHead + "Host: x\r\nTransfer-Encoding: chunked\r\n\r\n2\r\n{}\r\n0\r\n";
    Client client(door_.port());
    client.Send(begin + kJson + "Connection: close\r\n\r\n" + kNext);
    EXPECT_EQ(client.Receive().status(), 415);
    EXPECT_EQ(client.Receive().status(), 200);
    client.Send("POST /webapi/A/1/b HTTP/1.1\r\nHost: x\r\nTransfer-Encoding: chunked\r\n" + kJson +
                "\r\n2\r\n{}\r\n0\r\n" + kCookie + "X-CSRF-Token: t\r\n\r\n");
    EXPECT_EQ(client.Receive().Code(), 220) << "a session does not come behind the body";
    expected_ = 1;
    ExpectRefused(begin + "Content-Length: 500\r\n\r\n");
    ExpectRefused(begin + "Transfer-Encoding: chunked\r\n\r\n");
}

TEST_F(SmugglingTest, ChunkedBodiesArriveWhole) {
    Client client(door_.port());
    const std::string request =
        kHead + kJson +
        "Host: x\r\nTransfer-Encoding: chunked\r\n\r\n4\r\n{\"a\"\r\n3;ext=1\r\n: 1\r\n1\r\n}\r\n0\r\n"
        "Trailer: ignored\r\n\r\n";
    for (const char byte : request) {
        client.Send(std::string(1, byte));
    }
    EXPECT_EQ(client.Receive().status(), 200);
    ASSERT_EQ(vornd_.Requests().size(), 1u);
    EXPECT_EQ(vornd_.Requests().front().body, "{\"a\": 1}");
    EXPECT_EQ(vornd_.Requests().front().header.at("content-length"), "8");
}

TEST_F(SmugglingTest, AnUpgradeIsNoneAndTheBodyStillCounts) {
    Client client(door_.port());
    client.Send(kHead + kJson +
                "Host: x\r\nConnection: upgrade, keep-alive\r\nUpgrade: h2c\r\nContent-Length: 2\r\n\r\n{}" + kNext);
    EXPECT_EQ(client.Receive().status(), 200);
    EXPECT_EQ(client.Receive().status(), 200);
    EXPECT_EQ(vornd_.Requests().size(), 2u);
}

}  // namespace
}  // namespace httpd_test
