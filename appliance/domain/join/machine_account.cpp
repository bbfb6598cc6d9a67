#include "appliance/domain/join/machine_account.h"

#include <algorithm>
#include <vector>

#include "appliance/base/text.h"
#include "appliance/domain/join/time_budget.h"
#include "appliance/domain/join/tool_output.h"
#include "appliance/domain/membership/discovery.h"
#include "appliance/domain/membership/scratch_folder.h"

namespace appliance {

namespace {

constexpr std::chrono::milliseconds kFindWait{2000};
constexpr std::chrono::milliseconds kLeastAttempt{1000};  // less time is not worth asking in
constexpr std::chrono::milliseconds kLastAttempt{3000};   // kept for it, when that leaves the one before long enough
constexpr std::chrono::milliseconds kLongEnough{6000};
constexpr int kAttempts = 3;

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

SecretState Ask(SambaCall& call, std::chrono::milliseconds time, std::string* words) {
    call.deadline = time;
    const CommandResult result = RunNet(call);
    if (words != nullptr) {
        *words = LastWords(result);
    }
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

// A controller that did not answer is left alone for a minute by all of Samba's programs, whoever asked it; and one whose
// return falls into an attempt can make it wait ten seconds for a lost answer of the name server. So neither the first
// attempt nor the second takes all the time: the next one begins without any memory, and needs a fraction of a second.
std::chrono::milliseconds TimeOfAttempt(std::chrono::milliseconds left) {
    return left >= kLongEnough + kLastAttempt ? left - kLastAttempt : left;
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
    if (!configuration.empty()) {
        return Ask(call, budget.Left(deadline), words);
    }
    SecretState state = Ask(call, TimeOfAttempt(budget.Left(deadline)), words);
    for (int attempt = 1; attempt < kAttempts && state == SecretState::Unknown; ++attempt) {
        const std::chrono::milliseconds left = budget.Left(deadline);
        const ScratchFolder memory;
        if (left < kLeastAttempt || memory.path().empty()) {
            break;
        }
        SambaCall fresh = call;
        fresh.arguments.push_back("--option=lock directory=" + memory.path());
        state = Ask(fresh, TimeOfAttempt(left), words);
    }
    return state;
}

}  // namespace appliance
