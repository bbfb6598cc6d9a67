#include "appliance/httpd/door_reply.h"

#include <boost/beast/http/status.hpp>
#include <ctime>

#include "appliance/web/json_text.h"

namespace appliance {
namespace {

// The page is made of its own files alone. Nothing else is loaded, and no other page may frame, open or read it.
constexpr std::string_view kAlways =
    "Content-Security-Policy: default-src 'none'; script-src 'self'; style-src 'self'; img-src 'self' data:; "
    "font-src 'self'; connect-src 'self'; manifest-src 'self'; form-action 'none'; base-uri 'none'; "
    "frame-ancestors 'none'\r\n"
    "X-Content-Type-Options: nosniff\r\n"
    "X-Frame-Options: DENY\r\n"
    "Referrer-Policy: no-referrer\r\n"
    "Cross-Origin-Opener-Policy: same-origin\r\n"
    "Cross-Origin-Resource-Policy: same-origin\r\n"
    "Permissions-Policy: accelerometer=(), camera=(), display-capture=(), geolocation=(), gyroscope=(), hid=(), "
    "magnetometer=(), microphone=(), midi=(), payment=(), serial=(), usb=()\r\n";
constexpr std::string_view kStrictTransport = "Strict-Transport-Security: max-age=31536000\r\n";

// Made once a second.
const std::string& DateField() {
    static std::string field;
    static std::time_t made = 0;
    const std::time_t now = std::time(nullptr);
    if (field.empty() || now != made) {
        std::tm parts{};
        gmtime_r(&now, &parts);
        char text[64] = {};
        std::strftime(text, sizeof text, "Date: %a, %d %b %Y %H:%M:%S GMT\r\n", &parts);
        field = text;
        made = now;
    }
    return field;
}

bool HasContent(int status) {
    return status != 204 && status != 304;
}

}  // namespace

DoorReply DoorError(ServerCode code) {
    Json::Value answer(Json::objectValue);
    answer["success"] = false;
    answer["error"]["code"] = static_cast<int>(code);
    answer["error"]["errors"] = Describe(code);
    DoorReply reply;
    reply.status = HttpStatus(code);
    reply.type = kJsonType;
    reply.body = WriteJson(answer);
    reply.fields.emplace_back("Cache-Control", "no-store");
    return reply;
}

DoorReply WrongVerb(std::string_view allow) {
    DoorReply reply = DoorError(ServerCode::WrongVerb);
    reply.fields.emplace_back("Allow", allow);
    return reply;
}

std::string WriteHeader(const DoorReply& reply, const ReplyForm& form) {
    std::string text;
    text.reserve(1024);
    text += "HTTP/1.1 ";
    text += std::to_string(reply.status);
    text += ' ';
    const boost::beast::string_view reason =
        boost::beast::http::obsolete_reason(static_cast<boost::beast::http::status>(reply.status));
    text.append(reason.data(), reason.size());
    text += "\r\n";
    text += DateField();
    if (!reply.type.empty()) {
        text += "Content-Type: ";
        text += reply.type;
        text += "\r\n";
    }
    for (const auto& [name, value] : reply.fields) {
        text += name;
        text += ": ";
        text += value;
        text += "\r\n";
    }
    if (HasContent(reply.status)) {
        text += "Content-Length: ";
        text += std::to_string(reply.Content().size());
        text += "\r\n";
    }
    if (!form.keepOpen) {
        text += "Connection: close\r\n";
    } else if (form.oldVersion) {
        text += "Connection: keep-alive\r\n";
    }
    text += kAlways;
    if (form.strictTransport) {
        text += kStrictTransport;
    }
    text += "\r\n";
    return text;
}

}  // namespace appliance
