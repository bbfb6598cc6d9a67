#include "appliance/domain/directory/fetch_source.h"

#include <algorithm>
#include <system_error>

#include "appliance/base/file.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/text.h"
#include "appliance/domain/directory/line_command.h"
#include "appliance/domain/directory/list_writer.h"
#include "appliance/domain/directory/rpc_parser.h"
#include "appliance/domain/directory/utf8.h"
#include "appliance/domain/directory/worker.h"
#include "appliance/domain/membership/kerberos.h"
#include "appliance/domain/membership/samba.h"

namespace appliance {

namespace {

constexpr std::size_t kMostControllers = 4;
constexpr std::chrono::milliseconds kDiscoveryTime{8000};
constexpr std::chrono::milliseconds kConnectTime{3000};
constexpr std::chrono::milliseconds kAnswerTime{30000};
constexpr std::chrono::milliseconds kKeytabTime{10000};
constexpr int kLdapPort = 389;
constexpr int kSmbPort = 445;
constexpr int kKerberosPort = 88;

constexpr char kUserFilter[] = "(sAMAccountType=805306368)";
// Groups without those that the system made for itself (BUILTIN).
constexpr char kGroupFilter[] = "(&(objectClass=group)(!(groupType:1.2.840.113556.1.4.803:=1)))";

bool SameHost(const Controller& controller, const std::string& text) {
    return EqualIgnoringCase(controller.name, text) || controller.address == text;
}

// The name that a controller gives itself; a Kerberos service has no other. Proved by the bind that follows.
std::string AskName(const std::string& address) {
    std::string name;
    LdapSession session({address, kLdapPort, true}, kConnectTime);
    session.Search({"", false, "(objectClass=*)", {"dnsHostName"}},
                   [&name](const LdapEntry& entry) { name = entry.First("dnsHostName"); });
    return IsDnsName(name) ? name : "";
}

// The entries of "password server": names or addresses, perhaps with a port, "*" for those that are found.
std::vector<std::string> PreferredServers(const Membership& membership) {
    std::string text = membership.passwordServer;
    std::replace_if(
        text.begin(), text.end(), [](char letter) { return letter == ',' || letter == '\t'; }, ' ');
    std::vector<std::string> servers;
    for (const std::string& word : Split(text, " ")) {
        if (IsAddress(word)) {
            servers.push_back(word);
            continue;
        }
        const std::string server = word.substr(0, word.find(':'));
        if (IsAddress(server) || IsDnsName(server)) {
            servers.push_back(server);
        }
    }
    return servers;
}

[[noreturn]] void NoneKnown(const FetchDomain& domain) {
    throw DirectoryError(ErrorCode::Unreachable, "no domain controller of " + domain.name + " can be found");
}

// The Kerberos servers to try: the controllers of the appliance's own domain. Those that the administrator has named, or
// else those that DNS knows.
std::vector<std::string> KerberosServers(const FetchDomain& domain, const Membership& membership,
                                         const Controller& controller) {
    if (domain.own) {
        return {controller.address};
    }
    std::vector<std::string> servers = PreferredServers(membership);
    if (servers.empty()) {
        for (const Controller& found : FindControllers(Lower(membership.realm), kDiscoveryTime)) {
            servers.push_back(found.address);
        }
    }
    if (servers.size() > kMostControllers) {
        servers.resize(kMostControllers);
    }
    return servers;
}

// The Kerberos library tries a silent server for a quarter of a minute, so one that answers is named to it. Answers the
// configuration; `reason` says why no server answers, and is empty when one does.
std::string PrepareKerberos(const FetchDomain& domain, const Membership& membership, const Controller& controller,
                            std::string& reason) {
    const std::vector<std::string> servers = KerberosServers(domain, membership, controller);
    std::string kdc;
    std::string reasons;
    for (const std::string& server : servers) {
        if (CanConnect(server, kKerberosPort, kConnectTime, reason)) {
            kdc = server;
            break;
        }
        reasons += (reasons.empty() ? "" : "; ") + server + ": port 88: " + reason;
    }
    if (kdc.empty()) {
        reason = servers.empty() ? "no Kerberos server of " + membership.realm + " can be found" : reasons;
    }
    const std::string folder = Path(kRun) + "/kerberos";
    if (const std::error_code error = MakeFolder(folder, 0755)) {
        throw std::system_error(error, "cannot make " + folder);
    }
    return WriteKerberosConfiguration(folder, membership.realm, kdc);
}

// The groups of an Active Directory domain are of two sorts; an NT4-style domain's second sort is of no use to others.
std::string RpcQuestion(EntryKind kind, const FetchDomain& domain) {
    if (kind == EntryKind::User) {
        return "querydispinfo";
    }
    return domain.dns.empty() ? "querydispinfo 3" : "querydispinfo 3; enumalsgroups domain";
}

// Why each of several controllers failed, in one line; the last one's code stands for all.
class Reasons {
public:
    void Add(ErrorCode code, const std::string& reason) {
        code_ = code;
        text_ += (text_.empty() ? "" : "; ") + reason;
    }
    [[noreturn]] void Throw() const {
        throw DirectoryError(code_, text_);
    }

private:
    ErrorCode code_ = ErrorCode::Unreachable;
    std::string text_;
};

// A keytab that fell behind the secret, as after a join that could not write it, is made anew.
std::string TicketOfMachine(const Membership& membership) {
    bool keyIsWrong = false;
    std::string reason = TakeMachineTicket(membership.Account(), membership.realm, keyIsWrong);
    if (reason.empty() || !keyIsWrong) {
        return reason;
    }
    SambaCall call;
    call.arguments = {"ads", "keytab", "create", "--machine-pass"};
    call.deadline = kKeytabTime;
    const CommandResult made = RunNet(call);
    if (!made.Succeeded()) {
        return reason;
    }
    reason = TakeMachineTicket(membership.Account(), membership.realm, keyIsWrong);
    if (reason.empty()) {
        Log(LOG_NOTICE,
            "the keys of " + membership.Account() + " in " + Path(kKeytab) + " were not the domain's; they are now");
    }
    return reason;
}

}  // namespace

std::vector<Controller> ControllersOf(const FetchDomain& domain, const Membership& membership) {
    std::vector<Controller> found = domain.dns.empty() ? FindPrimaryController(domain.name, kDiscoveryTime)
                                                       : FindControllers(domain.dns, kDiscoveryTime);
    std::vector<Controller> controllers;
    if (domain.own) {
        for (const std::string& server : PreferredServers(membership)) {
            const auto known = std::find_if(found.begin(), found.end(), [&server](const Controller& controller) {
                return SameHost(controller, server);
            });
            if (known != found.end()) {
                controllers.push_back(*known);
                found.erase(known);
                continue;
            }
            const std::vector<std::string> addresses = AddressesOf(server, kConnectTime);
            if (!addresses.empty()) {
                controllers.push_back({IsAddress(server) ? "" : server, addresses.front()});
            }
        }
    }
    controllers.insert(controllers.end(), found.begin(), found.end());
    if (controllers.size() > kMostControllers) {
        controllers.resize(kMostControllers);
    }
    if (controllers.empty()) {
        NoneKnown(domain);
    }
    return controllers;
}

std::unique_ptr<LdapSession> OpenSession(const FetchDomain& domain, const Membership& membership,
                                         std::chrono::milliseconds patience, ProgressReport& report,
                                         std::string& controller) {
    const std::vector<Controller> controllers = ControllersOf(domain, membership);
    bool hasTicket = false;
    Reasons reasons;
    for (const Controller& candidate : controllers) {
        report.Tell(0);
        const std::string& shown = candidate.name.empty() ? candidate.address : candidate.name;
        std::string reason;
        if (!CanConnect(candidate.address, kLdapPort, kConnectTime, reason)) {
            reasons.Add(ErrorCode::Unreachable, shown + ": port 389: " + reason);
            continue;
        }
        if (!hasTicket) {
            UseKerberosConfiguration(PrepareKerberos(domain, membership, candidate, reason));
            if (!reason.empty()) {
                reasons.Add(ErrorCode::Unreachable, reason);
                if (domain.own) {
                    continue;
                }
                break;  // the servers are the same for each controller of another domain
            }
            reason = TicketOfMachine(membership);
            if (!reason.empty()) {
                throw DirectoryError(ErrorCode::Refused,
                                     "no Kerberos ticket for " + membership.Account() + ": " + reason);
            }
            hasTicket = true;
        }
        try {
            const std::string name = candidate.name.empty() ? AskName(candidate.address) : candidate.name;
            if (name.empty()) {
                reasons.Add(ErrorCode::BadData, shown + " does not say its name");
                continue;
            }
            auto session = std::make_unique<LdapSession>(LdapSession::Server{name}, patience);
            controller = name;
            return session;
        } catch (const DirectoryError& error) {
            reasons.Add(error.code(), error.what());
        }
    }
    reasons.Throw();
}

std::string FetchByLdap(EntryKind kind, const FetchDomain& domain, const Membership& membership, ListWriter& writer,
                        ProgressReport& report) {
    std::string controller;
    const std::unique_ptr<LdapSession> session = OpenSession(domain, membership, kAnswerTime, report, controller);
    LdapSearch search;
    search.base = BaseOfDomain(domain.dns);
    search.filter = kind == EntryKind::User ? kUserFilter : kGroupFilter;
    search.attributes = {"sAMAccountName", "displayName", "cn", "objectSid"};
    session->Search(search, [&](const LdapEntry& entry) {
        const std::optional<std::uint32_t> rid = RidOfSid(entry.First("objectSid"));
        std::string display = entry.First("displayName");
        if (display.empty()) {
            display = entry.First("cn");
        }
        writer.Add(entry.First("sAMAccountName"), rid ? IdOf(domain, *rid) : std::nullopt, display);
        report.Tell(writer.added());
    });
    return controller;
}

std::string FetchByRpc(EntryKind kind, const FetchDomain& domain, const Membership& membership, ListWriter& writer,
                       ProgressReport& report) {
    Reasons reasons;
    for (const Controller& candidate : ControllersOf(domain, membership)) {
        report.Tell(0);
        const std::string& shown = candidate.name.empty() ? candidate.address : candidate.name;
        std::string reason;
        if (!CanConnect(candidate.address, kSmbPort, kConnectTime, reason)) {
            reasons.Add(ErrorCode::Unreachable, shown + ": port 445: " + reason);
            continue;
        }
        SambaCall call;
        // The machine account; by name, as Kerberos wants it, except for an NT4-style controller. Neither a name nor an
        // address can begin with "-".
        call.arguments = {"-P", "-c", RpcQuestion(kind, domain), domain.dns.empty() ? candidate.address : shown};
        call.deadline = kAnswerTime;
        if (membership.kind == DomainKind::ActiveDirectory) {
            // Without a Kerberos server the tool has another way to log in.
            call.kerberosConfiguration = PrepareKerberos(domain, membership, candidate, reason);
        }
        RpcParser parser;
        const CommandResult result = RunLines(SambaCommand(kRpcclient, call), [&](const std::string& line) {
            if (const std::optional<RpcAccount> account = parser.Take(line)) {
                writer.Add(account->name, IdOf(domain, account->rid), account->display);
                report.Tell(writer.added());
            }
        });
        if (result.Succeeded()) {
            writer.CountRefused(parser.damaged());
            return shown;
        }
        const std::vector<std::string> lines = Lines(result.errors);
        reason = shown + ": rpcclient " + result.Describe() + (lines.empty() ? "" : ": " + CleanText(lines.back()));
        if (writer.added() > 0) {
            throw DirectoryError(ErrorCode::CommandFailed, reason);  // half a list can't be continued elsewhere
        }
        reasons.Add(ErrorCode::CommandFailed, reason);
    }
    reasons.Throw();
}

std::optional<std::int64_t> IdOf(const FetchDomain& domain, std::uint32_t rid) {
    if (!domain.range || rid > domain.range->second - domain.range->first) {
        return std::nullopt;
    }
    return static_cast<std::int64_t>(domain.range->first) + rid;
}

}  // namespace appliance
