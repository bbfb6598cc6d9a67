#include "appliance/vornd/door_marks.h"

#include <arpa/inet.h>

#include <array>

#include "appliance/base/text.h"
#include "appliance/vornd/session_token.h"

namespace appliance {
namespace {

constexpr std::string_view kSession = "Vorn-Session";
constexpr std::string_view kCsrf = "Vorn-Csrf";
constexpr std::string_view kClient = "Vorn-Client";
constexpr std::string_view kBackground = "Vorn-Background";
constexpr std::array<std::string_view, 4> kMarks{kSession, kCsrf, kClient, kBackground};

std::string TokenOrNone(std::string_view value) {
    return IsToken(value) ? std::string(value) : std::string();
}

// In its usual form, so that one address is one text.
std::string AddressOrNone(std::string_view value) {
    const std::string text(value);
    std::array<unsigned char, sizeof(in6_addr)> bytes{};
    std::array<char, INET6_ADDRSTRLEN> usual{};
    for (const int family : {AF_INET, AF_INET6}) {
        if (text.find('\0') == std::string::npos && inet_pton(family, text.c_str(), bytes.data()) == 1 &&
            inet_ntop(family, bytes.data(), usual.data(), usual.size()) != nullptr) {
            return usual.data();
        }
    }
    return {};
}

}  // namespace

void ReadMark(std::string_view name, std::string_view value, DoorMarks& marks) {
    if (EqualIgnoringCase(name, kSession)) {
        marks.session = TokenOrNone(value);
    } else if (EqualIgnoringCase(name, kCsrf)) {
        marks.csrf = TokenOrNone(value);
    } else if (EqualIgnoringCase(name, kClient)) {
        marks.client = AddressOrNone(value);
    } else if (EqualIgnoringCase(name, kBackground)) {
        marks.background = value == "1";
    }
}

bool ReadMarks(const boost::beast::http::request_header<>& header, DoorMarks& marks) {
    marks = {};
    for (const std::string_view name : kMarks) {
        const auto count = header.count(name);
        if (count > 1) {
            return false;
        }
        if (count == 1) {
            ReadMark(name, header[name], marks);
        }
    }
    return true;
}

}  // namespace appliance
