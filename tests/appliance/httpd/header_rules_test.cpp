// The rules for fields of a header, by themselves.

#include "appliance/httpd/header_rules.h"

#include <gtest/gtest.h>

namespace httpd_test {
namespace {

using appliance::AcceptedEncodings;
using appliance::HasJsonBody;
using appliance::HasPlainLines;
using appliance::IsFromOwnPage;
using appliance::IsToken;
using appliance::NamesTag;
using appliance::SessionToken;
using appliance::TokenField;
using Fields = boost::beast::http::fields;

Fields With(std::initializer_list<std::pair<const char*, const char*>> lines) {
    Fields fields;
    for (const auto& [name, value] : lines) {
        fields.insert(name, value);
    }
    return fields;
}

TEST(HeaderRulesTest, HeaderLength) {
    const std::string text = "GET / HTTP/1.1\r\nHost: x\r\n\r\nbody";
    std::size_t scanned = 0;
    for (std::size_t length = 0; length < text.size() - 4; ++length) {
        EXPECT_FALSE(appliance::HeaderLength(text.substr(0, length), scanned)) << length;
    }
    EXPECT_EQ(appliance::HeaderLength(text, scanned), text.size() - 4);
    scanned = 0;
    EXPECT_EQ(appliance::HeaderLength(text, scanned), text.size() - 4);
}

TEST(HeaderRulesTest, PlainLines) {
    EXPECT_TRUE(HasPlainLines("GET / HTTP/1.1\r\nHost: x\r\nName:\tb c\r\n\r\n"));
    EXPECT_TRUE(HasPlainLines("GET / HTTP/1.1\r"));
    EXPECT_TRUE(HasPlainLines("GET / HTTP/1.1\r\nName: \xC3\xA4\r\n"));
    for (const std::string text :
         {"GET / HTTP/1.1\nHost: x\r\n", "GET / HTTP/1.1\rHost: x\r\n", "GET / HTTP/1.1\r\nHost: x\n\r\n",
          "GET / HTTP/1.1\r\nHost: x\r\n folded\r\n", "GET / HTTP/1.1\r\nHost: x\r\n\tfolded\r\n",
          "GET / HTTP/1.1\r\n Host: x\r\n", "GET /\t HTTP/1.1\r\n", "GET /\xC3\xA4 HTTP/1.1\r\n",
          "GET /\x7F HTTP/1.1\r\n", "GET / HTTP/1.1\r\nHost: a\x01\r\n"}) {
        EXPECT_FALSE(HasPlainLines(text)) << text;
    }
    EXPECT_FALSE(HasPlainLines(std::string("GET / HTTP/1.1\r\nHost: a\0b\r\n", 27)));
}

TEST(HeaderRulesTest, Tokens) {
    EXPECT_TRUE(IsToken("a"));
    EXPECT_TRUE(IsToken("AZaz09-_"));
    EXPECT_TRUE(IsToken(std::string(64, 'x')));
    for (const std::string& text : {std::string(), std::string(65, 'x'), std::string("a b"), std::string("a="),
                                    std::string("a\r\nVorn-Session: b"), std::string("a/b"), std::string("a+b")}) {
        EXPECT_FALSE(IsToken(text)) << text;
    }
}

TEST(HeaderRulesTest, SessionCookie) {
    EXPECT_EQ(SessionToken(With({{"Cookie", "__Host-vorn=abc"}})), "abc");
    EXPECT_EQ(SessionToken(With({{"Cookie", "other=1; __Host-vorn=abc;theme=dark"}})), "abc");
    EXPECT_EQ(SessionToken(With({{"Cookie", "other=1"}, {"Cookie", "__Host-vorn=abc"}})), "abc");
    EXPECT_EQ(SessionToken(With({})), "");
    EXPECT_EQ(SessionToken(With({{"Cookie", "__host-vorn=abc"}})), "") << "names of cookies know case";
    EXPECT_EQ(SessionToken(With({{"Cookie", "x__Host-vorn=abc"}})), "");
    EXPECT_EQ(SessionToken(With({{"Cookie", "__Host-vorn"}})), "");
    EXPECT_EQ(SessionToken(With({{"Cookie", "__Host-vorn="}})), "");
    EXPECT_EQ(SessionToken(With({{"Cookie", "__Host-vorn=\"abc\""}})), "");
    EXPECT_EQ(SessionToken(With({{"Cookie", "__Host-vorn=a=b"}})), "");
    EXPECT_EQ(SessionToken(With({{"Cookie", "__Host-vorn=abc; __Host-vorn=abc"}})), "") << "which one is meant?";
    EXPECT_EQ(SessionToken(With({{"Cookie", "__Host-vorn=abc"}, {"Cookie", "__Host-vorn=abd"}})), "");
    EXPECT_EQ(SessionToken(With({{"Cookie", "__Host-vorn=; __Host-vorn=abc"}})), "");
}

TEST(HeaderRulesTest, TokenFields) {
    EXPECT_EQ(TokenField(With({{"x-csrf-token", "abc"}}), "X-CSRF-Token"), "abc");
    EXPECT_EQ(TokenField(With({}), "X-CSRF-Token"), "");
    EXPECT_EQ(TokenField(With({{"X-CSRF-Token", "abc"}, {"X-CSRF-Token", "abc"}}), "X-CSRF-Token"), "");
    EXPECT_EQ(TokenField(With({{"X-CSRF-Token", "a, b"}}), "X-CSRF-Token"), "");
}

TEST(HeaderRulesTest, Origins) {
    const std::string own = "https://nas:8443";
    EXPECT_TRUE(IsFromOwnPage(With({}), own));
    EXPECT_TRUE(IsFromOwnPage(With({{"Origin", "https://nas:8443"}}), own));
    EXPECT_TRUE(IsFromOwnPage(With({{"Origin", "https://NAS:8443"}, {"Sec-Fetch-Site", "same-origin"}}), own));
    EXPECT_TRUE(IsFromOwnPage(With({{"Sec-Fetch-Site", "none"}}), own));
    EXPECT_TRUE(IsFromOwnPage(With({{"Origin", "https://nas"}}), "https://nas:443"));
    EXPECT_TRUE(IsFromOwnPage(With({{"Origin", "http://[::1]"}}), "http://[::1]:80"));
    for (const char* origin :
         {"http://nas:8443", "https://nas", "https://nas:8444", "https://evil", "null", "", "https://nas:8443.evil",
          "https://nas:8443/", "nas:8443", "https://evil https://nas:8443"}) {
        EXPECT_FALSE(IsFromOwnPage(With({{"Origin", origin}}), own)) << origin;
    }
    EXPECT_FALSE(IsFromOwnPage(With({{"Origin", "https://nas:8443"}, {"Origin", "https://nas:8443"}}), own));
    for (const char* site : {"cross-site", "same-site", "", "same-origin, cross-site", "None"}) {
        EXPECT_FALSE(IsFromOwnPage(With({{"Sec-Fetch-Site", site}}), own)) << site;
    }
    EXPECT_FALSE(IsFromOwnPage(With({{"Sec-Fetch-Site", "none"}, {"Sec-Fetch-Site", "none"}}), own));
}

TEST(HeaderRulesTest, JsonBodies) {
    EXPECT_TRUE(HasJsonBody(With({{"Content-Type", "application/json"}})));
    EXPECT_TRUE(HasJsonBody(With({{"Content-Type", "Application/JSON ; charset=utf-8"}})));
    EXPECT_FALSE(HasJsonBody(With({})));
    EXPECT_FALSE(HasJsonBody(With({{"Content-Type", "text/plain"}})));
    EXPECT_FALSE(HasJsonBody(With({{"Content-Type", "text/plain;application/json"}})));
    EXPECT_FALSE(HasJsonBody(With({{"Content-Type", "application/json"}, {"Content-Type", "text/plain"}})));
    EXPECT_FALSE(HasJsonBody(With({{"Content-Type", "application/json"}, {"Content-Encoding", "gzip"}})));
}

TEST(HeaderRulesTest, Encodings) {
    const auto accepted = [](const char* value) {
        const appliance::Encodings encodings = AcceptedEncodings(With({{"Accept-Encoding", value}}));
        return std::string(encodings.brotli ? "b" : "") + (encodings.gzip ? "g" : "");
    };
    EXPECT_EQ(accepted("gzip, deflate, br, zstd"), "bg");
    EXPECT_EQ(accepted("GZIP"), "g");
    EXPECT_EQ(accepted("br;q=0, gzip;q=0.5"), "g");
    EXPECT_EQ(accepted("br;q=0.000,gzip; q=0.001"), "g");
    EXPECT_EQ(accepted("identity"), "");
    EXPECT_EQ(accepted("*"), "");
    EXPECT_EQ(accepted(",,;;,gzipped"), "");
}

TEST(HeaderRulesTest, Tags) {
    EXPECT_TRUE(NamesTag(With({{"If-None-Match", "\"a\""}}), "\"a\""));
    EXPECT_TRUE(NamesTag(With({{"If-None-Match", "\"b\", W/\"a\""}}), "\"a\""));
    EXPECT_TRUE(NamesTag(With({{"If-None-Match", "*"}}), "\"a\""));
    EXPECT_FALSE(NamesTag(With({{"If-None-Match", "\"ab\""}}), "\"a\""));
    EXPECT_FALSE(NamesTag(With({}), "\"a\""));
}

}  // namespace
}  // namespace httpd_test
