#include "appliance/vornd/authenticator.h"

#include <algorithm>

#include "appliance/base/command.h"
#include "appliance/base/paths.h"
#include "appliance/base/text.h"
#include "appliance/tools/vornauth/exit_code.h"

namespace appliance {
namespace {

constexpr std::size_t kLongestPassword = 511;  // PAM takes no longer one
constexpr std::size_t kOutputLimit = 4096;
constexpr std::string_view kNul("\0", 1);

Verdict Refused(const char* reason) {
    return {Verdict::Kind::Refused, reason};
}

}  // namespace

bool CanBeUser(std::string_view user) {
    const auto isPlain = [](char letter) {
        const auto byte = static_cast<unsigned char>(letter);
        return byte >= 0x80 || (byte >= '0' && byte <= '9') || (byte >= 'A' && byte <= 'Z') ||
               (byte >= 'a' && byte <= 'z') || std::string_view(" ._-+@\\$").find(letter) != std::string_view::npos;
    };
    return IsAccountName(user) && std::all_of(user.begin(), user.end(), isPlain);
}

bool CanBePassword(std::string_view password) {
    return !password.empty() && password.size() <= kLongestPassword && password.find('\0') == std::string_view::npos;
}

Verdict Authenticate(const std::string& user, const Secret& password) {
    Command command;
    command.arguments = {Path(kVornauth)};
    command.deadline = kLogInDeadline;
    command.input = Secret::Joined({user, kNul, password.view(), kNul});
    command.outputLimit = kOutputLimit;
    const CommandResult result = Run(command);
    if (result.end == CommandResult::End::Exited) {
        switch (result.code) {
            case auth::kAccepted:
                return {Verdict::Kind::Accepted, {}};
            case auth::kWrongPassword:
                return Refused("wrong password");
            case auth::kUnknownUser:
                return Refused("unknown user");
            case auth::kAccountRefused:
                return Refused("the account is locked or expired, or the password is");
            case auth::kNoAdministrator:
                return Refused("not in the group \"administrators\"");
            default:
                break;
        }
    }
    return {Verdict::Kind::Failed, command.arguments.front() + " " + result.Describe()};
}

}  // namespace appliance
