#include "appliance/httpd/header_rules.h"

#include <algorithm>
#include <boost/beast/http/field.hpp>

#include "appliance/base/text.h"

namespace appliance {
namespace {

namespace http = boost::beast::http;

constexpr std::size_t kLongestToken = 64;
constexpr std::string_view kHeaderEnd = "\r\n\r\n";

std::string_view View(boost::beast::string_view text) {
    return {text.data(), text.size()};
}

std::string_view WithoutBlanks(std::string_view text) {
    const std::size_t first = text.find_first_not_of(" \t");
    if (first == std::string_view::npos) {
        return {};
    }
    return text.substr(first, text.find_last_not_of(" \t") - first + 1);
}

// Calls `use` with each piece of a list until it answers false.
template <typename Use>
void ForEach(std::string_view list, char separator, const Use& use) {
    while (!list.empty()) {
        const std::size_t end = std::min(list.find(separator), list.size());
        const std::string_view piece = WithoutBlanks(list.substr(0, end));
        if (!piece.empty() && !use(piece)) {
            return;
        }
        list.remove_prefix(std::min(end + 1, list.size()));
    }
}

// An origin in lower case, without the port that goes without saying.
std::string PlainOrigin(std::string_view text) {
    std::string origin = Lower(text);
    for (const auto& [scheme, port] :
         {std::pair<const char*, std::string_view>{"https://", ":443"}, {"http://", ":80"}}) {
        if (StartsWith(origin, scheme) && origin.size() > port.size() &&
            origin.compare(origin.size() - port.size(), port.size(), port) == 0) {
            origin.erase(origin.size() - port.size());
        }
    }
    return origin;
}

// Zero is the only weight that counts: it forbids.
bool IsForbidden(std::string_view parameters) {
    bool forbidden = false;
    ForEach(parameters, ';', [&forbidden](std::string_view parameter) {
        if (parameter.size() > 2 && (parameter[0] == 'q' || parameter[0] == 'Q') && parameter[1] == '=') {
            forbidden = parameter.find_first_not_of("0.", 2) == std::string_view::npos;
        }
        return true;
    });
    return forbidden;
}

}  // namespace

std::optional<std::size_t> HeaderLength(std::string_view text, std::size_t& scanned) {
    const std::size_t from = scanned < kHeaderEnd.size() ? 0 : scanned - kHeaderEnd.size() + 1;
    const std::size_t end = text.find(kHeaderEnd, from);
    scanned = text.size();
    if (end == std::string_view::npos) {
        return std::nullopt;
    }
    return end + kHeaderEnd.size();
}

bool HasPlainLines(std::string_view text) {
    bool firstLine = true;
    for (std::size_t place = 0; place < text.size(); ++place) {
        const auto byte = static_cast<unsigned char>(text[place]);
        if (byte == '\r') {
            if (place + 1 < text.size() && text[place + 1] != '\n') {
                return false;
            }
            // What is behind the line's end, when it is there already.
            if (place + 2 < text.size() && (text[place + 2] == ' ' || text[place + 2] == '\t')) {
                return false;
            }
            firstLine = false;
            ++place;
        } else if ((byte < 0x20 && (byte != '\t' || firstLine)) || byte == 0x7F || (byte >= 0x80 && firstLine)) {
            return false;
        }
    }
    return true;
}

bool IsToken(std::string_view text) {
    return !text.empty() && text.size() <= kLongestToken && std::all_of(text.begin(), text.end(), [](char letter) {
        return (letter >= '0' && letter <= '9') || (letter >= 'A' && letter <= 'Z') ||
               (letter >= 'a' && letter <= 'z') || letter == '-' || letter == '_';
    });
}

std::string SessionToken(const http::fields& header) {
    std::string token;
    int found = 0;
    const auto range = header.equal_range(http::field::cookie);
    for (auto field = range.first; field != range.second; ++field) {
        ForEach(View(field->value()), ';', [&](std::string_view cookie) {
            const std::size_t equals = std::min(cookie.find('='), cookie.size());
            if (WithoutBlanks(cookie.substr(0, equals)) == kSessionCookie) {
                ++found;
                token = std::string(WithoutBlanks(cookie.substr(std::min(equals + 1, cookie.size()))));
            }
            return true;
        });
    }
    return found == 1 && IsToken(token) ? token : std::string();
}

std::string TokenField(const http::fields& header, std::string_view name) {
    const boost::beast::string_view key(name.data(), name.size());
    if (header.count(key) != 1) {
        return {};
    }
    const std::string_view value = View(header[key]);
    return IsToken(value) ? std::string(value) : std::string();
}

bool IsFromOwnPage(const http::fields& header, std::string_view own) {
    const std::size_t origins = header.count(http::field::origin);
    if (origins > 1 || (origins == 1 && PlainOrigin(View(header[http::field::origin])) != PlainOrigin(own))) {
        return false;
    }
    const std::size_t sites = header.count("Sec-Fetch-Site");
    const std::string_view site = View(header["Sec-Fetch-Site"]);
    return sites == 0 || (sites == 1 && (site == "same-origin" || site == "none"));
}

bool HasJsonBody(const http::fields& header) {
    if (header.count(http::field::content_type) != 1 || header.count(http::field::content_encoding) > 0) {
        return false;
    }
    const std::string_view type = View(header[http::field::content_type]);
    return EqualIgnoringCase(WithoutBlanks(type.substr(0, type.find(';'))), "application/json");
}

Encodings AcceptedEncodings(const http::fields& header) {
    Encodings accepted;
    const auto range = header.equal_range(http::field::accept_encoding);
    for (auto field = range.first; field != range.second; ++field) {
        ForEach(View(field->value()), ',', [&accepted](std::string_view coding) {
            const std::size_t end = std::min(coding.find(';'), coding.size());
            const std::string_view name = WithoutBlanks(coding.substr(0, end));
            const bool allowed = !IsForbidden(coding.substr(end));
            if (EqualIgnoringCase(name, "br")) {
                accepted.brotli = allowed;
            } else if (EqualIgnoringCase(name, "gzip")) {
                accepted.gzip = allowed;
            }
            return true;
        });
    }
    return accepted;
}

bool NamesTag(const http::fields& header, std::string_view tag) {
    bool named = false;
    const auto range = header.equal_range(http::field::if_none_match);
    for (auto field = range.first; field != range.second && !named; ++field) {
        ForEach(View(field->value()), ',', [&named, tag](std::string_view entry) {
            if (StartsWith(entry, "W/")) {
                entry.remove_prefix(2);
            }
            named = entry == tag || entry == "*";
            return !named;
        });
    }
    return named;
}

}  // namespace appliance
