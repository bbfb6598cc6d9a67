#include "appliance/web/framing.h"

#include <algorithm>
#include <string_view>

#include "appliance/base/text.h"

namespace appliance {

bool HasSoundFraming(const boost::beast::http::request_header<>& header) {
    using boost::beast::http::field;
    constexpr unsigned kVersion10 = 10;
    constexpr unsigned kVersion11 = 11;
    if (header.version() != kVersion10 && header.version() != kVersion11) {
        return false;
    }
    const auto host = header.find(field::host);
    if (header.count(field::host) != 1 || host->value().empty() ||
        !std::all_of(host->value().begin(), host->value().end(), [](char letter) {
            return letter > ' ' && letter < '\x7F' && letter != '/' && letter != '@' && letter != ',';
        })) {
        return false;
    }
    const std::size_t lengths = header.count(field::content_length);
    const std::size_t encodings = header.count(field::transfer_encoding);
    if (lengths + encodings > 1) {
        return false;
    }
    if (lengths == 1) {
        const std::string_view length = header[field::content_length];
        return !length.empty() &&
               std::all_of(length.begin(), length.end(), [](char letter) { return letter >= '0' && letter <= '9'; });
    }
    return encodings == 0 || (header.version() == kVersion11 &&
                              EqualIgnoringCase(std::string_view(header[field::transfer_encoding]), "chunked"));
}

}  // namespace appliance
