#include "appliance/domain/join/join_status.h"

#include "appliance/base/file.h"
#include "appliance/base/paths.h"
#include "appliance/base/text.h"

namespace appliance {

namespace {

constexpr std::size_t kLargestFile = 4096;

std::string OneLine(const std::string& text, std::size_t length) {
    std::string line;
    for (const char letter : text) {
        const auto byte = static_cast<unsigned char>(letter);
        line += byte < 0x20 || byte == 0x7F ? ' ' : letter;
    }
    line = Trim(line);
    if (line.size() > length) {
        // A byte 10xxxxxx goes on with a character that has begun before.
        while (length > 0 && (static_cast<unsigned char>(line[length]) & 0xC0U) == 0x80U) {
            --length;
        }
        line.resize(length);
    }
    return line;
}

}  // namespace

JoinStatus CleanStatus(const JoinStatus& status) {
    return {OneLine(status.key, kStatusKeyLength), OneLine(status.message, kStatusMessageLength)};
}

std::error_code WriteJoinStatus(const JoinStatus& status) {
    const JoinStatus clean = CleanStatus(status);
    return ReplaceFile(Path(kJoinStatus), clean.key + "\t" + clean.message + "\n", 0600);
}

std::error_code ReadJoinStatus(JoinStatus& status) {
    std::string text;
    if (const std::error_code error = ReadFile(Path(kJoinStatus), text, kLargestFile)) {
        return error;
    }
    const std::size_t tab = text.find('\t');
    if (tab == std::string::npos) {
        return std::make_error_code(std::errc::bad_message);
    }
    status = CleanStatus({text.substr(0, tab), text.substr(tab + 1)});
    return {};
}

}  // namespace appliance
