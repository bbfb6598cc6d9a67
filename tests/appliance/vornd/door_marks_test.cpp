// What the server in front says of a request.

#include "appliance/vornd/door_marks.h"

#include <gtest/gtest.h>

#include "appliance/vornd/session_token.h"

namespace appliance {
namespace {

using Header = boost::beast::http::request_header<>;

TEST(DoorMarksTest, AreReadFromTheHeader) {
    const std::string session = NewToken();
    const std::string csrf = NewToken();
    Header header;
    header.insert("vorn-session", session);
    header.insert("VORN-CSRF", csrf);
    header.insert("Vorn-Client", "2001:DB8:0:0::1");
    header.insert("Vorn-Background", "1");
    DoorMarks marks;
    ASSERT_TRUE(ReadMarks(header, marks));
    EXPECT_EQ(marks.session, session);
    EXPECT_EQ(marks.csrf, csrf);
    EXPECT_EQ(marks.client, "2001:db8::1");
    EXPECT_TRUE(marks.background);
    ASSERT_TRUE(ReadMarks(Header(), marks));
    EXPECT_EQ(marks.session + marks.csrf + marks.client, "");
    EXPECT_FALSE(marks.background);
}

TEST(DoorMarksTest, WhatCannotBeOneIsNone) {
    const std::string token = NewToken();
    for (const std::string& value :
         {std::string(), token + "A", token.substr(1), token.substr(1) + "+", token.substr(1) + " ",
          token.substr(1) + "=", token.substr(1) + std::string(1, '\0')}) {
        DoorMarks marks;
        ReadMark("Vorn-Session", value, marks);
        ReadMark("Vorn-Csrf", value, marks);
        EXPECT_EQ(marks.session + marks.csrf, "") << value;
    }
    for (const std::string& value : {std::string(), std::string("localhost"), std::string("10.0.0.256"),
                                     std::string("10.0.0.1:80"), std::string("10.0.0.1\n"), std::string("fe80::1%eth0"),
                                     std::string("10.0.0.1\0x", 10), std::string(500, ':'), std::string("[::1]")}) {
        DoorMarks marks;
        ReadMark("Vorn-Client", value, marks);
        EXPECT_EQ(marks.client, "") << value;
    }
    for (const char* value : {"", "0", "true", "11", " 1"}) {
        DoorMarks marks;
        ReadMark("Vorn-Background", value, marks);
        EXPECT_FALSE(marks.background) << value;
    }
}

TEST(DoorMarksTest, TwiceIsOneTooMany) {
    for (const char* name : {"Vorn-Session", "Vorn-Csrf", "Vorn-Client", "Vorn-Background"}) {
        Header header;
        header.insert(name, "1");
        DoorMarks marks;
        EXPECT_TRUE(ReadMarks(header, marks));
        header.insert(name, "1");
        EXPECT_FALSE(ReadMarks(header, marks)) << name;
    }
}

TEST(SessionTokenTest, IsLongRandomAndPlain) {
    std::string last;
    for (int time = 0; time < 1000; ++time) {
        const std::string token = NewToken();
        EXPECT_TRUE(IsToken(token)) << token;
        EXPECT_NE(token, last);
        last = token;
    }
}

TEST(SessionTokenTest, IsKeptAsItsHash) {
    const std::string empty = "e3b0c44298fc1c149afbf4c8996fb92427ae41e4649b934ca495991b7852b855";
    EXPECT_EQ(ToHex(HashOf("")), empty);
    ASSERT_TRUE(HashFromHex(empty).has_value());
    EXPECT_TRUE(IsSame(*HashFromHex(empty), HashOf("")));
    EXPECT_FALSE(IsSame(HashOf("a"), HashOf("b")));
    for (const std::string& text : {std::string(), empty.substr(1), empty + "0", "E" + empty.substr(1),
                                    "g" + empty.substr(1), std::string(64, ' ')}) {
        EXPECT_FALSE(HashFromHex(text).has_value()) << text;
    }
}

}  // namespace
}  // namespace appliance
