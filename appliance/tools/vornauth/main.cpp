// vornauth: is this an administrator's password? Run by the server for each log-in, as root. Standard input holds the
// user and the password, each with a NUL behind it; the exit status is the answer.

#include <string.h>
#include <sys/prctl.h>
#include <syslog.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <exception>
#include <string>
#include <string_view>

#include "appliance/base/secret.h"
#include "appliance/base/text.h"
#include "appliance/tools/vornauth/check.h"

namespace appliance::auth {
namespace {

// More than the longest user and password that PAM takes.
constexpr std::size_t kMostInput = 1024;

// Standard input up to its end; empty when it holds more than fits or can't be read.
Secret ReadInput() {
    std::array<char, kMostInput> buffer;
    std::size_t size = 0;
    ssize_t got = 0;
    while (size < buffer.size()) {
        got = read(STDIN_FILENO, buffer.data() + size, buffer.size() - size);
        if (got > 0) {
            size += static_cast<std::size_t>(got);
        } else if (got == 0 || errno != EINTR) {
            break;
        }
    }
    Secret input(std::string_view(buffer.data(), got == 0 ? size : 0));
    explicit_bzero(buffer.data(), buffer.size());
    return input;
}

int Main() {
    // The password passes through this memory.
    prctl(PR_SET_DUMPABLE, 0);
    openlog("vornauth", LOG_PID, LOG_AUTHPRIV);
    const Secret input = ReadInput();
    const std::string_view all = input.view();
    const std::size_t first = all.find('\0');
    const std::size_t second = first == std::string_view::npos ? first : all.find('\0', first + 1);
    if (second == std::string_view::npos || second + 1 != all.size()) {
        return kUsage;
    }
    const std::string user(all.substr(0, first));
    if (!IsAccountName(user)) {
        return kUsage;
    }
    return Check(user, Secret(all.substr(first + 1, second - first - 1)));
}

}  // namespace
}  // namespace appliance::auth

int main() {
    try {
        return appliance::auth::Main();
    } catch (const std::exception& error) {
        syslog(LOG_ERR, "%s", error.what());
        return appliance::auth::kImpossible;
    }
}
