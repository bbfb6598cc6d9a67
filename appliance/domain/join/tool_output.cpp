#include "appliance/domain/join/tool_output.h"

#include <array>
#include <vector>

#include "appliance/base/text.h"
#include "appliance/domain/join/join_status.h"

namespace appliance {

namespace {

constexpr char kFailedToJoin[] = "Failed to join domain: ";

bool Unfinished(const CommandResult& result) {
    return result.end == CommandResult::End::NotStarted || result.end == CommandResult::End::TimedOut ||
           result.end == CommandResult::End::Signalled;
}

// The rest of the first line that begins so; empty when there is none.
std::string AfterBeginning(const std::string& text, const std::string& beginning) {
    for (const std::string& line : Lines(text)) {
        if (StartsWith(Trim(line), beginning)) {
            return Trim(Trim(line).substr(beginning.size()));
        }
    }
    return "";
}

struct Reason {
    const char* part;
    const char* message;
};

// What may stand behind "Failed to join domain: ". The first that is contained decides.
constexpr std::array kReasons = {
    Reason{"The attempted logon is invalid", status::kWrongNameOrPassword},
    Reason{"The referenced account is currently disabled", status::kDisabled},
    Reason{"has been automatically locked", status::kRevoked},
    Reason{"The user account has expired", status::kRevoked},
    Reason{"The user password must be changed before", status::kExpired},
    Reason{"user account's password has expired", status::kExpired},
    Reason{"{Device Timeout}", status::kPort445},
    Reason{"The transport-connection attempt was refused", status::kPort445},
    Reason{"Invalid configuration (\"workgroup\" set to", status::kWorkgroup},
    Reason{"failed to find DC for domain", status::kNoController},
};

constexpr std::array kRightsMissing = {
    "NT_STATUS_ACCESS_DENIED", "{Access Denied}",  "does not have administrator privileges",
    "WERR_ACCESS_DENIED",      "Access is denied",
};

// What every one of Samba's tools says about keys that are not its own.
bool IsNoise(const std::string& line) {
    return line.empty() || StartsWith(line, "Ignoring unknown parameter") ||
           StartsWith(line, "Unknown parameter encountered") || StartsWith(line, "Can't find include file");
}

}  // namespace

std::string JoinFailureMessage(const CommandResult& result) {
    if (Unfinished(result)) {
        return status::kSystem;
    }
    const std::string all = result.output + "\n" + result.errors;
    const std::string words = AfterBeginning(all, kFailedToJoin);
    for (const Reason& reason : kReasons) {
        if (Contains(words, reason.part)) {
            return reason.message;
        }
    }
    for (const char* part : kRightsMissing) {
        if (Contains(words, part)) {
            return std::string(status::kUnableToJoin) + ": " + words;
        }
    }
    if (Contains(all, "Insufficient access")) {
        return status::kNoRight;
    }
    return words.empty() ? LastWords(result) : kFailedToJoin + words;
}

std::string AccountFailureMessage(const CommandResult& result, const std::string& server) {
    if (result.Succeeded()) {
        return "";
    }
    if (result.end == CommandResult::End::NotStarted || result.end == CommandResult::End::Signalled) {
        return status::kSystem;
    }
    const std::string noConnection = std::string(status::kNoConnection) + " " + server;
    if (result.end == CommandResult::End::TimedOut) {
        return noConnection;
    }
    const std::string all = result.errors + "\n" + result.output;
    if (Contains(all, status::kDisabled) || Contains(all, "NT_STATUS_ACCOUNT_DISABLED")) {
        return status::kDisabled;
    }
    if (Contains(all, status::kWrongNameOrPassword) || Contains(all, "NT_STATUS_LOGON_FAILURE") ||
        Contains(all, "NT_STATUS_WRONG_PASSWORD") || Contains(all, "NT_STATUS_NO_SUCH_USER")) {
        return status::kWrongNameOrPassword;
    }
    if (Contains(all, "The account was locked out.") || Contains(all, "NT_STATUS_ACCOUNT_LOCKED_OUT") ||
        Contains(all, "NT_STATUS_ACCOUNT_EXPIRED") || Contains(all, "NT_STATUS_ACCOUNT_RESTRICTION")) {
        return status::kRevoked;
    }
    if (Contains(all, "NT_STATUS_PASSWORD_MUST_CHANGE") || Contains(all, "NT_STATUS_PASSWORD_EXPIRED")) {
        return status::kExpired;
    }
    const std::string reason = AfterBeginning(all, "Connection failed: ");
    return reason.empty() ? noConnection : noConnection + " (" + reason + ")";
}

bool ProvesMembership(const CommandResult& result) {
    if (!result.Succeeded()) {
        return false;
    }
    for (const std::string& line : Lines(result.output)) {
        const std::string text = Trim(line);
        if (text == "Join is OK" || (StartsWith(text, "Join to '") && Contains(text, "' is OK"))) {
            return true;
        }
    }
    return false;
}

ControllerInfo ParseLookup(const CommandResult& result) {
    ControllerInfo info;
    if (!result.Succeeded()) {
        return info;
    }
    info.realm = AfterBeginning(result.output, "Domain:");
    info.domain = AfterBeginning(result.output, "Pre-Win2k Domain:");
    info.name = AfterBeginning(result.output, "Domain Controller:");
    if (!IsDnsName(info.realm) || !IsNetbiosName(info.domain)) {
        return {};
    }
    if (!IsDnsName(info.name)) {
        info.name.clear();
    }
    return info;
}

std::string LastWords(const CommandResult& result) {
    const bool good = result.Succeeded();
    for (const std::string* text : {good ? &result.output : &result.errors, good ? &result.errors : &result.output}) {
        const std::vector<std::string> lines = Lines(*text);
        for (auto line = lines.rbegin(); line != lines.rend(); ++line) {
            if (!IsNoise(Trim(*line))) {
                return Trim(*line);
            }
        }
    }
    return result.Describe();
}

}  // namespace appliance
