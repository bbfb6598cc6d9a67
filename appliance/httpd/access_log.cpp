#include "appliance/httpd/access_log.h"

#include <syslog.h>
#include <unistd.h>

#include <utility>

#include "appliance/base/file.h"

namespace appliance {
namespace {

constexpr const char* kProgram = "vorn-httpd";
constexpr std::size_t kLongestPath = 200;
constexpr std::size_t kLongestVerb = 16;

std::string Shown(std::string_view text, std::size_t most) {
    constexpr std::string_view kDigits = "0123456789ABCDEF";
    std::string shown;
    for (const char letter : text.substr(0, most)) {
        const auto byte = static_cast<unsigned char>(letter);
        if (byte <= ' ' || byte >= 0x7F || letter == '\\' || letter == '"') {
            shown += "\\x";
            shown += kDigits[byte >> 4U];
            shown += kDigits[byte & 0xFU];
        } else {
            shown += letter;
        }
    }
    if (text.size() > most) {
        shown += "...";
    }
    return shown.empty() ? "-" : shown;
}

}  // namespace

std::string FormatAccess(const AccessLine& line) {
    const std::string_view path = line.target.substr(0, line.target.find_first_of("?#"));
    return std::string(line.client) + " " + Shown(line.verb, kLongestVerb) + " " + Shown(path, kLongestPath) + " " +
           std::to_string(line.status) + " " + std::to_string(line.bytes) + " bytes " +
           std::to_string(line.took.count()) + " ms";
}

AccessLog::AccessLog(bool terminal, std::string socket)
    : terminal_(terminal), log_(kProgram, LOG_DAEMON, std::move(socket)) {}

void AccessLog::Write(const AccessLine& line) {
    const std::string text = FormatAccess(line);
    if (terminal_) {
        const std::string shown = std::string(kProgram) + "[" + std::to_string(getpid()) + "]: " + text + "\n";
        lost_ += WriteAll(STDERR_FILENO, shown) ? 1U : 0U;
    } else {
        lost_ += log_.Send(LOG_INFO, text) ? 0U : 1U;
    }
}

}  // namespace appliance
