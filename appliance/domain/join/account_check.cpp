#include "appliance/domain/join/account_check.h"

#include <fcntl.h>
#include <krb5.h>
#include <poll.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <memory>

#include "appliance/base/file.h"
#include "appliance/base/text.h"
#include "appliance/domain/join/join_status.h"
#include "appliance/domain/join/time_budget.h"

namespace appliance {

namespace {

using std::chrono::milliseconds;
using Outcome = TicketResult::Outcome;

// What the child writes into the pipe.
struct Answer {
    krb5_error_code code;
    long clockDifference;
    std::array<char, 400> words;
};

struct FreeContext {
    void operator()(krb5_context context) const {
        krb5_free_context(context);
    }
};

// The account's name and realm, taken apart.
struct Principal {
    std::string name;
    std::string realm;
    bool enterprise = false;  // NAME@SUFFIX with a suffix that is not the realm: the KDC finds out who it is
};

Principal TakeApart(const std::string& user, const std::string& realm, const std::string& domain) {
    const std::size_t backslash = user.find('\\');
    if (backslash != std::string::npos) {
        const std::string owner = user.substr(0, backslash);
        const bool own = EqualIgnoringCase(owner, domain) || EqualIgnoringCase(owner, realm);
        return {user.substr(backslash + 1), own ? Upper(realm) : Upper(owner), false};
    }
    const std::size_t at = user.rfind('@');
    if (at == std::string::npos) {
        return {user, Upper(realm), false};
    }
    if (EqualIgnoringCase(user.substr(at + 1), realm)) {
        return {user.substr(0, at), Upper(realm), false};
    }
    return {user, Upper(realm), true};
}

Answer Ask(const Principal& account, const char* password) {
    Answer answer{};
    krb5_context raw = nullptr;
    answer.code = krb5_init_context(&raw);
    if (answer.code != 0) {
        return answer;
    }
    const std::unique_ptr<std::remove_pointer_t<krb5_context>, FreeContext> context(raw);
    krb5_principal principal = nullptr;
    krb5_get_init_creds_opt* options = nullptr;
    krb5_creds credentials{};
    answer.code = krb5_build_principal(raw, &principal, static_cast<unsigned>(account.realm.size()),
                                       account.realm.c_str(), account.name.c_str(), nullptr);
    if (answer.code == 0) {
        answer.code = krb5_get_init_creds_opt_alloc(raw, &options);
    }
    if (answer.code == 0) {
        if (account.enterprise) {
            principal->type = KRB5_NT_ENTERPRISE_PRINCIPAL;
            krb5_get_init_creds_opt_set_canonicalize(options, 1);
        }
        krb5_get_init_creds_opt_set_change_password_prompt(options, 0);
        answer.code =
            krb5_get_init_creds_password(raw, &credentials, principal, password, nullptr, nullptr, 0, nullptr, options);
    }
    if (answer.code == 0) {
        answer.clockDifference = credentials.times.authtime - std::time(nullptr);
        krb5_free_cred_contents(raw, &credentials);
    } else {
        const char* words = krb5_get_error_message(raw, answer.code);
        std::strncpy(answer.words.data(), words, answer.words.size() - 1);
        krb5_free_error_message(raw, words);
    }
    if (options != nullptr) {
        krb5_get_init_creds_opt_free(raw, options);
    }
    krb5_free_principal(raw, principal);
    return answer;
}

// The library waits as it likes, so it does so in a child that can be ended. Called by programs with one thread only.
bool AskInChild(const Principal& account, const char* password, const std::string& configuration, milliseconds wait,
                Answer& answer) {
    const TimeBudget deadline(wait);
    std::array<int, 2> ends{};
    if (pipe2(ends.data(), O_CLOEXEC) != 0) {
        return false;
    }
    const FileDescriptor reading(ends[0]);
    FileDescriptor writing(ends[1]);
    const pid_t parent = getpid();
    const pid_t child = fork();
    if (child == 0) {
        prctl(PR_SET_PDEATHSIG, SIGKILL);
        if (getppid() == parent) {
            setenv("KRB5_CONFIG", configuration.c_str(), 1);
            const Answer made = Ask(account, password);
            static_cast<void>(!write(writing.get(), &made, sizeof(made)));
        }
        _exit(0);
    }
    if (child < 0) {
        return false;
    }
    writing.Reset();
    pollfd waiting = {reading.get(), POLLIN, 0};
    int ready = 0;
    do {
        ready = poll(&waiting, 1, static_cast<int>(deadline.Left(wait).count()));
    } while (ready < 0 && errno == EINTR);
    // One write of this size into an empty pipe is never split.
    const bool answered =
        ready > 0 && read(reading.get(), &answer, sizeof(answer)) == static_cast<ssize_t>(sizeof(answer));
    kill(child, SIGKILL);
    while (waitpid(child, nullptr, 0) < 0 && errno == EINTR) {
    }
    return answered;
}

Outcome OutcomeOf(krb5_error_code code) {
    switch (code) {
        case 0:
            return Outcome::Granted;
        case KRB5KDC_ERR_PREAUTH_FAILED:
        case KRB5KRB_AP_ERR_BAD_INTEGRITY:
        case KRB5_PREAUTH_FAILED:
            return Outcome::WrongPassword;
        case KRB5KDC_ERR_C_PRINCIPAL_UNKNOWN:
            return Outcome::UnknownAccount;
        case KRB5KDC_ERR_CLIENT_REVOKED:
        case KRB5KDC_ERR_NAME_EXP:
            return Outcome::Revoked;
        case KRB5KDC_ERR_KEY_EXP:
            return Outcome::PasswordExpired;
        case KRB5_KDC_UNREACH:
        case KRB5_REALM_UNKNOWN:
        case KRB5_REALM_CANT_RESOLVE:
        case KRB5KDC_ERR_WRONG_REALM:
            return Outcome::Unreachable;
        default:
            return Outcome::Failed;
    }
}

}  // namespace

TicketResult AskForTicket(const Credentials& credentials, const std::string& realm, const std::string& domain,
                          const std::string& configuration, milliseconds deadline) {
    TicketResult result;
    Answer answer{};
    const TimeBudget budget(deadline);
    if (AskInChild(TakeApart(credentials.user, realm, domain), credentials.password.c_str(), configuration, deadline,
                   answer)) {
        answer.words.back() = '\0';
        result.outcome = OutcomeOf(answer.code);
        result.words = answer.words.data();
        result.clockDifference = answer.clockDifference;
    } else if (budget.Over()) {
        // The library itself would go on for a quarter of a minute and then say this.
        result.outcome = Outcome::Unreachable;
        result.words = "Cannot contact any KDC for realm '" + realm + "'";
    }
    return result;
}

bool KdcKnowsOf(const std::string& user, const std::string& realm, const std::string& domain) {
    const std::size_t backslash = user.find('\\');
    if (backslash == std::string::npos) {
        return true;
    }
    const std::string owner = user.substr(0, backslash);
    return EqualIgnoringCase(owner, domain) || EqualIgnoringCase(owner, realm) || owner.find('.') != std::string::npos;
}

AccountState LookUpAccount(const std::string& account, const std::string& realm, const std::string& configuration,
                           milliseconds deadline) {
    Answer answer{};
    // Without a password and without anybody to ask for it, the library stops after the KDC's first answer.
    if (!AskInChild({account, Upper(realm), false}, nullptr, configuration, deadline, answer)) {
        return AccountState::Unknown;
    }
    switch (OutcomeOf(answer.code)) {
        case Outcome::UnknownAccount:
            return AccountState::Absent;
        case Outcome::Unreachable:
            return AccountState::Unknown;
        default:
            return AccountState::Present;
    }
}

std::string TicketFailureMessage(const TicketResult& result, bool pinned) {
    switch (result.outcome) {
        case Outcome::Granted:
            return "";
        case Outcome::WrongPassword:
            return status::kWrongPassword;
        case Outcome::UnknownAccount:
            return status::kUnknownAccount;
        case Outcome::Revoked:
            return status::kRevoked;
        case Outcome::PasswordExpired:
            return status::kExpired;
        case Outcome::Unreachable:
            if (pinned) {
                return status::kKdc;
            }
            break;
        case Outcome::NotAsked:
            return status::kSystem;
        case Outcome::Failed:
            break;
    }
    return result.words + " while getting initial credentials";
}

}  // namespace appliance
