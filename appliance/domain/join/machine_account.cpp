#include "appliance/domain/join/machine_account.h"

#include <algorithm>
#include <mutex>
#include <optional>
#include <vector>

#include "appliance/base/text.h"
#include "appliance/domain/join/attempts.h"
#include "appliance/domain/join/time_budget.h"
#include "appliance/domain/join/tool_output.h"
#include "appliance/domain/membership/discovery.h"
#include "appliance/domain/membership/scratch_folder.h"

namespace appliance {

namespace {

constexpr std::chrono::milliseconds kFindWait{2000};
constexpr std::chrono::milliseconds kLeastAttempt{1000};  // less time is not worth asking in
constexpr int kAttempts = 3;
constexpr std::chrono::milliseconds kPatience{6000};

std::string PrimaryController(const Membership& membership, const std::string& configuration,
                              std::chrono::milliseconds time) {
    const std::string& given = membership.passwordServer;
    if (IsAddress(given) || IsDnsName(given)) {
        return given;
    }
    const std::vector<Controller> found =
        FindPrimaryController(membership.domain, std::min(kFindWait, time), configuration);
    return found.empty() ? "" : found.front().address;
}

SecretState StateOf(const CommandResult& result) {
    if (ProvesMembership(result)) {
        return SecretState::Works;
    }
    if (result.end != CommandResult::End::Exited) {
        return SecretState::Unknown;
    }
    const std::string all = result.output + "\n" + result.errors;
    for (const char* part : {"Preauthentication failed", "Client not found", "credentials have been revoked",
                             "LDAP_INVALID_CREDENTIALS", "NT_STATUS_LOGON_FAILURE", "NT_STATUS_ACCESS_DENIED",
                             "NT_STATUS_NO_TRUST_SAM_ACCOUNT", "NT_STATUS_WRONG_PASSWORD", "NT_STATUS_ACCOUNT_DISABLED",
                             "NT_STATUS_CANT_ACCESS_DOMAIN_INFO", "NT_STATUS_NO_TRUST_LSA_SECRET"}) {
        if (Contains(all, part)) {
            return SecretState::Refused;
        }
    }
    return SecretState::Unknown;
}

}  // namespace

AccountState LookUpAccountByRpc(const std::string& account, const std::string& controller,
                                const std::string& configuration, const Credentials& credentials,
                                std::chrono::milliseconds deadline) {
    SambaCall call;
    call.arguments = {"--command=samlookupnames domain " + account, "--", controller};
    call.configuration = configuration;
    call.credentials = &credentials;
    call.deadline = deadline;
    const CommandResult result = RunRpcclient(call);
    const std::string all = result.output + result.errors;
    if (Contains(all, "NT_STATUS_NONE_MAPPED")) {
        return AccountState::Absent;
    }
    return result.Succeeded() && Contains(Lower(result.output), "name " + Lower(account) + ":") ? AccountState::Present
                                                                                                : AccountState::Unknown;
}

std::string DeleteMachineAccount(const std::string& account, const std::string& controller,
                                 const std::string& configuration, const Credentials& credentials,
                                 std::chrono::milliseconds deadline) {
    SambaCall call;
    call.arguments = {"rpc", "user", "delete", "--server=" + controller, "--", account};
    call.configuration = configuration;
    call.credentials = &credentials;
    call.deadline = deadline;
    const CommandResult result = RunNet(call);
    const std::string all = result.output + result.errors;
    if (result.Succeeded() || Contains(all, "No mapping between account names") ||
        Contains(all, "NT_STATUS_NO_SUCH_USER") || Contains(all, "NT_STATUS_NONE_MAPPED")) {
        return "";
    }
    return LastWords(result);
}

SecretState TestSecret(const Membership& membership, const std::string& configuration, const std::string& controller,
                       std::chrono::milliseconds deadline, std::string* words) {
    const TimeBudget budget(deadline);
    SambaCall call;
    call.configuration = configuration;
    if (membership.kind == DomainKind::ActiveDirectory) {
        call.arguments = {"ads", "testjoin"};
    } else {
        call.arguments = {"rpc", "testjoin"};
        // Left to itself, the tool looks for the controller of such a domain for ten seconds.
        const std::string server =
            controller.empty() ? PrimaryController(membership, configuration, deadline) : controller;
        if (!server.empty()) {
            call.arguments.push_back("--server=" + server);
        }
    }
    // A controller that did not answer is left alone for a minute by all of Samba's programs, whoever asked it, and one
    // whose return falls into an attempt can make it wait ten seconds for a lost answer of the name server. The further
    // attempts know nothing of what was before.
    AttemptLimits limits;
    limits.attempts = configuration.empty() ? kAttempts : 1;
    limits.time = budget.Left(deadline);
    limits.least = kLeastAttempt;
    // At a controller of the NT4 style each attempt sets up the account's secure channel anew: never two at once.
    limits.pause = membership.kind == DomainKind::ActiveDirectory ? kPatience : deadline;
    std::mutex mutex;
    SecretState state = SecretState::Unknown;
    const auto attempt = [&](int number, std::chrono::milliseconds time, int cancel) {
        std::optional<ScratchFolder> memory;
        SambaCall own = call;
        own.deadline = time;
        own.cancel = cancel;
        if (number > 0) {
            memory.emplace();
            if (memory->path().empty()) {
                return false;
            }
            own.arguments.push_back("--option=lock directory=" + memory->path());
        }
        const CommandResult result = RunNet(own);
        const SecretState found = StateOf(result);
        const std::lock_guard<std::mutex> lock(mutex);
        if (state != SecretState::Unknown) {
            return true;
        }
        state = found;
        if (words != nullptr) {
            *words = LastWords(result);
        }
        return state != SecretState::Unknown;
    };
    Ask(attempt, limits);
    return state;
}

}  // namespace appliance
