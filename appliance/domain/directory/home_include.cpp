#include "appliance/domain/directory/home_include.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>

#include "appliance/base/conf_file.h"
#include "appliance/base/conf_lines.h"
#include "appliance/base/file.h"
#include "appliance/base/paths.h"
#include "appliance/domain/membership/membership.h"

namespace appliance {

namespace {

constexpr std::chrono::milliseconds kLockWait{5000};
constexpr mode_t kMode = 0644;

// The share of a user's own folder. The folder is made when the user comes for the first time; who gets none, a local
// account among them, gets no share. The file-sharing service turns what a shell would act on into "_" inside the
// quotes.
std::string HomesSection() {
    return "# Made by the appliance: the home folders of domain users.\n"
           "[homes]\n"
           "    comment = Home folder of %U\n"
           "    browseable = no\n"
           "    read only = no\n"
           "    create mask = 0600\n"
           "    directory mask = 0700\n"
           "    valid users = %D%w%S\n"
           "    root preexec = " +
           Path(kVornwin) +
           " -makeHome -- \"%u\"\n"
           "    root preexec close = yes\n"
           "\n"
           "[global]\n";
}

bool IsInclude(const ConfLine& line, const std::string& path) {
    return line.kind == ConfLine::Kind::Entry && SameKey(line.key, "include") && line.value == path;
}

std::optional<std::string> Added(const std::string& conf, const std::string& path) {
    // Behind the last header or entry of the first [global], so that keys which are added to it later still follow it.
    std::optional<ConfLine> last;
    for (const ConfLine& line : ConfLines(conf)) {
        if (line.kind == ConfLine::Kind::Header && !SameKey(line.section, "global")) {
            break;
        }
        const bool header = line.kind == ConfLine::Kind::Header;
        if (header || (line.kind == ConfLine::Kind::Entry && last)) {
            last = line;
        }
    }
    if (!last) {
        return std::nullopt;
    }
    const std::string raw = conf.substr(last->begin, last->end - last->begin);
    const std::string line = "    include = " + path;
    const bool ended = raw.back() == '\n';
    const bool carriage = raw.size() > 1 && raw[raw.size() - 2] == '\r';
    const std::size_t content = raw.find_last_not_of("\r\n");
    if (content != std::string::npos && raw[content] == '\\') {
        return std::nullopt;  // the file breaks off within a line
    }
    const std::string text = ended ? line + (carriage ? "\r\n" : "\n") : "\n" + line;
    return conf.substr(0, last->end) + text + conf.substr(last->end);
}

std::string Removed(const std::string& conf, const std::string& path) {
    std::string text;
    for (const ConfLine& line : ConfLines(conf)) {
        if (!IsInclude(line, path)) {
            text += conf.substr(line.begin, line.end - line.begin);
        } else if (line.end == conf.size() && conf.back() != '\n' && !text.empty() && text.back() == '\n') {
            text.pop_back();  // the end of the line before came with it
        }
    }
    return text;
}

std::error_code LastError() {
    return {errno, std::generic_category()};
}

}  // namespace

std::optional<std::string> WithUserHomes(const std::string& conf, const std::string& path, bool include) {
    const std::vector<ConfLine> lines = ConfLines(conf);
    const auto present =
        std::count_if(lines.begin(), lines.end(), [&path](const ConfLine& line) { return IsInclude(line, path); });
    if (include) {
        return present > 0 ? conf : Added(conf, path);
    }
    return present > 0 ? Removed(conf, path) : conf;
}

std::error_code IncludeUserHomes(bool include, bool& changed) {
    changed = false;
    const std::optional<FileLock> lock = LockSmbConf(kLockWait);
    if (!lock) {
        return LastError();
    }
    const std::string path = Path(kUserHomeConf);
    std::string conf;
    if (const std::error_code error = ReadFile(Path(kSmbConf), conf)) {
        return error;
    }
    const std::optional<std::string> wanted = WithUserHomes(conf, path, include);
    if (!wanted) {
        return std::make_error_code(std::errc::invalid_argument);
    }
    std::string present;
    if (include && (ReadFile(path, present) || present != HomesSection())) {
        if (const std::error_code error = ReplaceFile(path, HomesSection(), kMode)) {
            return error;
        }
    }
    if (*wanted == conf) {
        return {};
    }
    if (const std::error_code error = ReplaceFile(Path(kSmbConf), *wanted, kMode)) {
        return error;
    }
    changed = true;
    return {};
}

}  // namespace appliance
