#include "appliance/platform/system/resolv_conf.h"

#include <arpa/inet.h>
#include <net/if.h>
#include <netinet/in.h>

#include <algorithm>
#include <cctype>
#include <cstddef>

#include "appliance/base/text.h"

namespace appliance {

namespace {

constexpr std::string_view kKeyword = "nameserver";
constexpr std::string_view kOptionsKeyword = "options";
constexpr std::string_view kOptions = "options timeout:1 attempts:1";

bool IsBlank(char byte) {
    return byte == ' ' || byte == '\t';
}

bool HasKeyword(std::string_view line, std::string_view keyword) {
    return line.size() > keyword.size() && line.substr(0, keyword.size()) == keyword && IsBlank(line[keyword.size()]);
}

// The lines with their newlines; the last one may lack its own.
std::vector<std::string_view> WholeLines(std::string_view text) {
    std::vector<std::string_view> lines;
    while (!text.empty()) {
        const std::size_t end = text.find('\n');
        const std::size_t length = end == std::string_view::npos ? text.size() : end + 1;
        lines.push_back(text.substr(0, length));
        text.remove_prefix(length);
    }
    return lines;
}

bool IsInterfaceName(std::string_view name) {
    return !name.empty() && name.size() < IF_NAMESIZE && name != "." && name != ".." &&
           std::all_of(name.begin(), name.end(), [](char byte) {
               return std::isalnum(static_cast<unsigned char>(byte)) != 0 || byte == '.' || byte == '-' || byte == '_';
           });
}

void EndLine(std::string& text) {
    if (!text.empty() && text.back() != '\n') {
        text += '\n';
    }
}

// The last line of options counts for what it sets.
bool EndsWithOptions(std::string_view text) {
    std::string last;
    for (const std::string_view line : WholeLines(text)) {
        if (HasKeyword(line, kOptionsKeyword)) {
            last = Trim(line);
        }
    }
    return last == kOptions;
}

}  // namespace

bool IsServerAddress(const std::string& text) {
    in_addr four = {};
    in6_addr six = {};
    if (inet_pton(AF_INET, text.c_str(), &four) == 1 || inet_pton(AF_INET6, text.c_str(), &six) == 1) {
        return true;
    }
    const std::size_t mark = text.find('%');
    return mark != std::string::npos && inet_pton(AF_INET6, text.substr(0, mark).c_str(), &six) == 1 &&
           IN6_IS_ADDR_LINKLOCAL(&six) && IsInterfaceName(std::string_view(text).substr(mark + 1));
}

std::optional<std::vector<std::string>> CheckedServers(const std::vector<std::string>& entries) {
    std::vector<std::string> servers;
    for (const std::string& entry : entries) {
        const std::size_t start = std::min(entry.find_first_not_of(' '), entry.size());
        servers.push_back(entry.substr(start));
        if (!IsServerAddress(servers.back())) {
            return std::nullopt;
        }
    }
    return servers;
}

std::vector<std::string> Servers(std::string_view text) {
    std::vector<std::string> servers;
    for (std::string_view line : WholeLines(text)) {
        if (!HasKeyword(line, kKeyword)) {
            continue;
        }
        line.remove_prefix(kKeyword.size());
        line.remove_prefix(std::min(line.find_first_not_of(" \t"), line.size()));
        const std::string address(line.substr(0, line.find_first_of(";# \t\r\n")));
        if (IsServerAddress(address)) {
            servers.push_back(address);
        }
    }
    return servers;
}

std::string WithServers(std::string_view text, const std::vector<std::string>& servers) {
    std::string lines;
    for (const std::string& server : servers) {
        lines += std::string(kKeyword) + " " + server + "\n";
    }
    std::string changed;
    bool placed = false;
    for (const std::string_view line : WholeLines(text)) {
        if (!HasKeyword(line, kKeyword)) {
            changed += line;
            continue;
        }
        if (!placed) {
            changed += lines;
            placed = true;
        }
    }
    if (!placed && !servers.empty()) {
        EndLine(changed);
        changed += lines;
    }
    if (!servers.empty() && !EndsWithOptions(changed)) {
        EndLine(changed);
        changed += std::string(kOptions) + "\n";
    }
    return changed;
}

}  // namespace appliance
