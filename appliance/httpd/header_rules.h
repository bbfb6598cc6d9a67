// What the fields of a client's header may hold before anything of them is used.

#ifndef VORN_APPLIANCE_HTTPD_HEADER_RULES_H
#define VORN_APPLIANCE_HTTPD_HEADER_RULES_H

#include <boost/beast/http/fields.hpp>
#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

namespace appliance {

inline constexpr const char kSessionCookie[] = "__Host-vorn";

// Length of the header at the front of `text`, with the blank line behind it. Nothing as long as that is missing.
// `scanned` bytes of the text are known to hold no end; it moves on.
std::optional<std::size_t> HeaderLength(std::string_view text, std::size_t& scanned);

// True when a header, or the beginning of one, is made of lines as every program reads them: CR and LF only together, no
// other control byte but a tab, no line that goes on with the field before it, and nothing but ASCII in the first line.
bool HasPlainLines(std::string_view text);

// base64url of 1 to 64 letters: the form of every token.
bool IsToken(std::string_view text);

// The session's token; empty without one, and when there are several cookies of the name or its value is no token.
std::string SessionToken(const boost::beast::http::fields& header);

// The value of a field that holds a token ("X-CSRF-Token"); empty as above.
std::string TokenField(const boost::beast::http::fields& header, std::string_view name);

// May a request that changes something come from where it says? `own` is this server's origin ("https://nas:8443").
bool IsFromOwnPage(const boost::beast::http::fields& header, std::string_view own);

// application/json, with or without parameters, and not encoded.
bool HasJsonBody(const boost::beast::http::fields& header);

// How an answer may be encoded, by "Accept-Encoding".
struct Encodings {
    bool brotli = false;
    bool gzip = false;
};
Encodings AcceptedEncodings(const boost::beast::http::fields& header);

// Does "If-None-Match" name this entity tag (given with its quotes)?
bool NamesTag(const boost::beast::http::fields& header, std::string_view tag);

}  // namespace appliance

#endif
