// Which texts are addresses: the rules of the notation, and what the C library reads.

#include <arpa/inet.h>
#include <gtest/gtest.h>

#include <random>
#include <string>
#include <vector>

#include "platform/core.h"

namespace {

bool IsHex(char letter) {
    return (letter >= '0' && letter <= '9') || (letter >= 'a' && letter <= 'f') || (letter >= 'A' && letter <= 'F');
}

std::vector<std::string> Pieces(const std::string& text, char separator) {
    std::vector<std::string> pieces(1);
    for (const char letter : text) {
        if (letter == separator) {
            pieces.emplace_back();
        } else {
            pieces.back() += letter;
        }
    }
    return pieces;
}

// Four numbers of 0 to 255, without a sign, a blank or a zero in front.
bool IsIpv4(const std::string& text) {
    const auto pieces = Pieces(text, '.');
    for (const std::string& piece : pieces) {
        const bool digits = piece.find_first_not_of("0123456789") == std::string::npos;
        if (piece.empty() || piece.size() > 3 || !digits || std::stoi(piece) > 255 ||
            (piece.size() > 1 && piece[0] == '0')) {
            return false;
        }
    }
    return pieces.size() == 4;
}

// Groups of one to four hexadecimal digits; the last two may be an IPv4 address. -1: bad, else how many groups.
int GroupsOf(const std::string& text, bool mayEndInIpv4) {
    if (text.empty()) {
        return 0;
    }
    int groups = 0;
    const auto pieces = Pieces(text, ':');
    for (std::size_t i = 0; i < pieces.size(); ++i) {
        const std::string& piece = pieces[i];
        if (mayEndInIpv4 && i + 1 == pieces.size() && IsIpv4(piece)) {
            return groups + 2;
        }
        if (piece.empty() || piece.size() > 4) {
            return -1;
        }
        for (const char letter : piece) {
            if (!IsHex(letter)) {
                return -1;
            }
        }
        ++groups;
    }
    return groups;
}

bool IsIpv6(const std::string& text) {
    const std::size_t gap = text.find("::");
    if (gap == std::string::npos) {
        return GroupsOf(text, true) == 8;
    }
    const int left = GroupsOf(text.substr(0, gap), false);
    const int right = GroupsOf(text.substr(gap + 2), true);
    return left >= 0 && right >= 0 && left + right < 8;
}

void Check(const std::string& text) {
    in_addr four = {};
    in6_addr six = {};
    const int isFour = inet_pton(AF_INET, text.c_str(), &four);
    const int isSix = inet_pton(AF_INET6, text.c_str(), &six);
    ASSERT_EQ(BlVLIBIsIpAddr(text.c_str()), isFour) << text;
    ASSERT_EQ(BlVLIBIsv6IpAddrValid(text.c_str()), isSix) << text;
    ASSERT_EQ(isFour == 1, IsIpv4(text)) << text;
    ASSERT_EQ(isSix == 1, IsIpv6(text)) << text;
}

TEST(Addresses, Examples) {
    for (const char* text : {"10.0.0.1", "0.0.0.0", "255.255.255.255"}) {
        EXPECT_EQ(BlVLIBIsIpAddr(text), 1) << text;
        EXPECT_EQ(BlVLIBIsv6IpAddrValid(text), 0) << text;
    }
    for (const char* text :
         {"::", "::1", "fe80::1", "2001:DB8::8:800:200c:417a", "1:2:3:4:5:6:7:8", "::ffff:10.0.0.1"}) {
        EXPECT_EQ(BlVLIBIsv6IpAddrValid(text), 1) << text;
        EXPECT_EQ(BlVLIBIsIpAddr(text), 0) << text;
    }
    for (const char* text : {"",           " ",         "lab.test",  "10.0.0",    "10.0.0.0.1",
                             "10.0.0.256", "10.0.0.01", " 10.0.0.1", "10.0.0.1 ", "10.0.0.1\n",
                             "0x0a.0.0.1", "1:2",       ":::",       "::1::",     "fe80::1%eth0",
                             "12345::",    "[::1]",     "1.2.3.4::", "10.0.0.-1", "10.0.0.1/24"}) {
        EXPECT_EQ(BlVLIBIsIpAddr(text), 0) << text;
        EXPECT_EQ(BlVLIBIsv6IpAddrValid(text), 0) << text;
    }
    EXPECT_EQ(BlVLIBIsIpAddr(nullptr), 0);
    EXPECT_EQ(BlVLIBIsv6IpAddrValid(nullptr), 0);
}

TEST(Addresses, GeneratedFromPieces) {
    const std::vector<std::string> pieces = {"0",     "1",  "12", "255", "256", "00",      "f",  "ffff",
                                             "fffff", "A0", "g",  ":",   ":",   ":",       "::", ".",
                                             ".",     ".",  "-",  " ",   "%",   "1.2.3.4", "x",  "1:2:3:4:5:6:7:8"};
    std::mt19937 random(11);
    int four = 0;
    int six = 0;
    for (int turn = 0; turn < 60000; ++turn) {
        std::string text;
        const auto count = 1 + random() % 15;
        for (unsigned i = 0; i < count; ++i) {
            text += pieces[random() % pieces.size()];
        }
        Check(text);
        four += BlVLIBIsIpAddr(text.c_str());
        six += BlVLIBIsv6IpAddrValid(text.c_str());
    }
    EXPECT_GT(four, 10);
    EXPECT_GT(six, 10);
}

TEST(Addresses, GoodOnesAndTheirNeighbours) {
    std::mt19937 random(12);
    for (int turn = 0; turn < 20000; ++turn) {
        std::string text;
        if (turn % 2 == 0) {
            const int numbers = 4;
            for (int i = 0; i < numbers; ++i) {
                text += (i > 0 ? "." : "") + std::to_string(random() % 256);
            }
        } else {
            in6_addr address = {};
            for (auto& byte : address.s6_addr) {
                byte = static_cast<std::uint8_t>(random() % 3 == 0 ? random() % 256 : 0);
            }
            char shown[INET6_ADDRSTRLEN] = {};
            text = inet_ntop(AF_INET6, &address, shown, sizeof(shown));
        }
        Check(text);
        // One byte changed, taken out or put in.
        const std::size_t at = random() % text.size();
        const char letter = "0123456789abcdef:. gG%-/"[random() % 24];
        const auto change = random() % 3;
        if (change == 0) {
            text[at] = letter;
        } else if (change == 1) {
            text.erase(at, 1);
        } else {
            text.insert(at, 1, letter);
        }
        Check(text);
    }
}

}  // namespace
