#include "appliance/domain/join/join_target.h"

#include <algorithm>
#include <filesystem>
#include <system_error>
#include <vector>

#include "appliance/base/conf_file.h"
#include "appliance/base/file.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/text.h"
#include "appliance/domain/join/join_status.h"
#include "appliance/domain/join/tool_output.h"

namespace appliance {

namespace {

using std::chrono::milliseconds;

constexpr milliseconds kDnsWait{3000};
constexpr milliseconds kNetbiosWait{2000};
constexpr milliseconds kPortWait{2500};
constexpr milliseconds kLookupWait{3000};
constexpr std::size_t kMostTried = 3;
constexpr char kProbeFolder[] = "/join_probe";
constexpr mode_t kFolderMode = 0700;
constexpr mode_t kOpenFolderMode = 0755;

// Which of the ports that an Active Directory join needs are closed, with the reason; empty texts are open ports.
struct Ports {
    std::string kerberos;
    std::string ldap;
    std::string smb;

    bool AllOpen() const {
        return kerberos.empty() && ldap.empty() && smb.empty();
    }
    bool AllClosed() const {
        return !kerberos.empty() && !ldap.empty() && !smb.empty();
    }
    std::string Words() const {
        std::string words;
        for (const auto& [name, reason] : {std::pair("88", kerberos), std::pair("389", ldap), std::pair("445", smb)}) {
            words += (words.empty() ? "" : ", ") + std::string(name) + " " + (reason.empty() ? "open" : reason);
        }
        return words;
    }
};

Ports Probe(const std::string& address, milliseconds wait) {
    const std::vector<std::string> reasons = ProbePorts(address, {88, 389, 445}, wait);
    return {reasons[0], reasons[1], reasons[2]};
}

std::string Named(const Controller& controller) {
    if (controller.name.empty()) {
        return controller.address;
    }
    return controller.name + " " + controller.address;
}

bool IsDotted(const std::string& name) {
    return name.find('.') != std::string::npos;
}

class Search {
public:
    Search(const JoinRequest& request, const std::string& probe, StepLog& steps, const TimeBudget& budget)
        : request_(request), probe_(probe), steps_(steps), budget_(budget) {}

    JoinTarget Run() {
        return request_.controller.empty() ? Discover() : AtGivenController();
    }

private:
    [[noreturn]] void Fail(const std::string& message, const std::string& detail) {
        steps_.Failed(detail.empty() ? message : detail);
        throw JoinError(message, detail);
    }

    // ---- a controller was named ----

    JoinTarget AtGivenController() {
        steps_.Begin("discover", request_.controller);
        const std::vector<std::string> addresses = AddressesOf(request_.controller, budget_.Left(kDnsWait));
        if (addresses.empty()) {
            Fail(status::kKdc, "no address is known for " + request_.controller);
        }
        steps_.Ok("given: " + addresses.front());
        const std::string name = IsAddress(request_.controller) ? "" : request_.controller;

        steps_.Begin("ports", addresses.front());
        Controller controller{name, addresses.front()};
        Ports ports = Probe(controller.address, budget_.Left(kPortWait));
        for (std::size_t i = 1; i < std::min(kMostTried, addresses.size()) && !ports.kerberos.empty(); ++i) {
            controller.address = addresses[i];
            ports = Probe(controller.address, budget_.Left(kPortWait));
        }
        steps_.Server(Named(controller));
        if (!ports.kerberos.empty()) {
            if (IsPrimary(addresses)) {
                RequireNoRealm(status::kKdc);
                steps_.Ok("a primary domain controller of an NT4-style domain");
                return Nt4Target(controller);
            }
            Fail(status::kKdc, "TCP ports: " + ports.Words());
        }
        RequirePorts(ports);
        steps_.Ok(ports.Words());

        steps_.Begin("workgroup", Named(controller));
        const ControllerInfo info = LookUp(controller.address);
        if (info.realm.empty()) {
            Fail(status::kNoWorkgroup, lookupWords_);
        }
        return Accept(info, controller, true);
    }

    bool IsPrimary(const std::vector<std::string>& addresses) {
        for (const std::string& name : NetbiosCandidates()) {
            for (const Controller& found : FindPrimaryController(name, budget_.Left(kNetbiosWait), probe_)) {
                if (std::find(addresses.begin(), addresses.end(), found.address) != addresses.end()) {
                    nt4Name_ = name;
                    return true;
                }
            }
        }
        return false;
    }

    // ---- nothing was named: DNS, then NetBIOS ----

    JoinTarget Discover() {
        steps_.Begin("discover");
        for (const std::string& realm : RealmCandidates()) {
            const std::vector<Controller> controllers = FindControllers(realm, budget_.Left(kDnsWait));
            if (controllers.empty()) {
                continue;
            }
            // A search domain of the resolver may be another domain than the one that is asked for.
            const bool guessed = WantedRealm().empty();
            if (guessed && !IsTheShortName(controllers)) {
                continue;
            }
            steps_.Ok("DNS names " + std::to_string(controllers.size()) + " controllers of " + realm);
            return AtOneOf(controllers);
        }
        for (const std::string& name : NetbiosCandidates()) {
            const std::vector<Controller> found = FindPrimaryController(name, budget_.Left(kNetbiosWait), probe_);
            if (found.empty()) {
                continue;
            }
            nt4Name_ = name;
            const Controller& controller = found.front();
            steps_.Server(controller.address);
            const ControllerInfo info = LookUp(controller.address);
            const bool nt4 = info.realm.empty();
            if (nt4) {
                RequireNoRealm(status::kNoController);
            }
            steps_.Ok("NetBIOS names a primary domain controller of " + name);
            return nt4 ? Nt4Target(controller) : AtOneOf({{info.name, controller.address}});
        }
        Fail(status::kNoController, "no service record in DNS and no primary domain controller by NetBIOS");
    }

    // Is the domain behind the first controller that answers the one with the short name that is asked for?
    bool IsTheShortName(const std::vector<Controller>& controllers) {
        for (std::size_t i = 0; i < std::min(kMostTried, controllers.size()); ++i) {
            const ControllerInfo info = LookUp(controllers[i].address);
            if (!info.domain.empty()) {
                return EqualIgnoringCase(info.domain, request_.domain);
            }
        }
        return false;
    }

    JoinTarget AtOneOf(const std::vector<Controller>& controllers) {
        steps_.Begin("ports");
        Ports best;
        bool any = false;
        const Controller* chosen = nullptr;
        for (std::size_t i = 0; i < std::min(kMostTried, controllers.size()) && chosen == nullptr; ++i) {
            const Ports ports = Probe(controllers[i].address, budget_.Left(kPortWait));
            if (!any || (best.AllClosed() && !ports.AllClosed()) || ports.AllOpen()) {
                best = ports;
                any = true;
                steps_.Server(Named(controllers[i]));
            }
            if (ports.AllOpen()) {
                chosen = &controllers[i];
            }
        }
        if (chosen == nullptr) {
            if (best.AllClosed()) {
                Fail(status::kNoController, "no controller answers; TCP ports: " + best.Words());
            }
            RequirePorts(best);
            // Only Kerberos is closed.
            Fail("Cannot contact any KDC for realm '" + Upper(WantedRealm()) + "' while getting initial credentials",
                 "TCP ports: " + best.Words());
        }
        steps_.Ok(best.Words());
        steps_.Begin("workgroup", Named(*chosen));
        const ControllerInfo info = LookUp(chosen->address);
        if (info.realm.empty()) {
            Fail(status::kNoWorkgroup, lookupWords_);
        }
        return Accept(info, *chosen, false);
    }

    // ---- both ----

    void RequirePorts(const Ports& ports) {
        if (!ports.ldap.empty()) {
            Fail(status::kNoController, "TCP ports: " + ports.Words());
        }
        if (!ports.smb.empty()) {
            Fail(status::kPort445, "TCP ports: " + ports.Words());
        }
    }

    JoinTarget Accept(const ControllerInfo& info, const Controller& controller, bool pinned) {
        // What DNS or NetBIOS named need not be what was asked for: the controller's own word counts.
        for (const std::string& realm : {request_.realm, IsDotted(request_.domain) ? request_.domain : ""}) {
            if (!realm.empty() && !EqualIgnoringCase(realm, info.realm)) {
                Fail(pinned ? status::kKdc : status::kNoController,
                     "it is a controller of " + info.realm + ", not of " + realm);
            }
        }
        const std::string domain = Upper(info.domain);
        if (!request_.netbiosName.empty() && !EqualIgnoringCase(request_.netbiosName, domain)) {
            Fail(status::kWorkgroup, "the domain's NetBIOS name is " + domain + ", not " + request_.netbiosName);
        }
        if (!IsDotted(request_.domain) && !EqualIgnoringCase(request_.domain, domain)) {
            Fail(status::kWorkgroup, "the domain's NetBIOS name is " + domain + ", not " + request_.domain);
        }
        steps_.Ok(domain + ", " + info.realm);
        JoinTarget target;
        target.kind = DomainKind::ActiveDirectory;
        target.realm = Upper(info.realm);
        target.domain = domain;
        target.controller = {info.name.empty() ? controller.name : info.name, controller.address};
        target.pinned = pinned;
        return target;
    }

    // A domain of the NT4 style has no DNS name, so it can't be the one that is asked for by such a name.
    void RequireNoRealm(const std::string& message) {
        if (!WantedRealm().empty()) {
            Fail(message, "it is the primary domain controller of " + nt4Name_ + ", an NT4-style domain, not of " +
                              WantedRealm());
        }
    }

    JoinTarget Nt4Target(const Controller& controller) {
        steps_.Begin("ports", Named(controller));
        // Sessions of this kind also work over the older port.
        const std::vector<std::string> reasons = ProbePorts(controller.address, {445, 139}, budget_.Left(kPortWait));
        if (!reasons[0].empty() && !reasons[1].empty()) {
            Fail(status::kPort445, "TCP ports: 445 " + reasons[0] + ", 139 " + reasons[1]);
        }
        steps_.Ok();
        JoinTarget target;
        target.kind = DomainKind::Nt4;
        target.domain = Upper(nt4Name_);
        target.controller = controller;
        target.pinned = !request_.controller.empty();
        return target;
    }

    ControllerInfo LookUp(const std::string& address) {
        SambaCall call;
        call.arguments = {"ads", "lookup", "--server=" + address};
        call.configuration = probe_;
        call.deadline = budget_.Left(kLookupWait);
        const CommandResult result = RunNet(call);
        lookupWords_ = LastWords(result);
        if (result.end == CommandResult::End::NotStarted) {
            Fail(status::kSystem, Path(kNet) + " " + lookupWords_);
        }
        return ParseLookup(result);
    }

    // The realm that is asked for; empty when only a short name is given.
    std::string WantedRealm() const {
        if (!request_.realm.empty()) {
            return request_.realm;
        }
        return IsDotted(request_.domain) ? request_.domain : "";
    }

    std::vector<std::string> RealmCandidates() const {
        const std::string wanted = WantedRealm();
        if (!wanted.empty()) {
            return {wanted};
        }
        std::vector<std::string> candidates;
        for (const std::string& domain : SearchDomains()) {
            candidates.push_back(domain);
            candidates.push_back(Lower(request_.domain) + "." + domain);
            if (candidates.size() >= 2 * kMostTried) {
                break;
            }
        }
        return candidates;
    }

    std::vector<std::string> NetbiosCandidates() const {
        std::vector<std::string> candidates;
        for (const std::string& name : {request_.netbiosName, request_.domain}) {
            if (IsNetbiosName(name) && candidates.empty()) {
                candidates.push_back(Upper(name));
            }
        }
        return candidates;
    }

    const JoinRequest& request_;
    const std::string& probe_;
    StepLog& steps_;
    const TimeBudget& budget_;
    std::string nt4Name_;
    std::string lookupWords_;
};

// A name that the tools would take for an option, or that would break a line of a configuration file.
bool IsDangerous(const std::string& text) {
    return HasControlBytes(text) || (!text.empty() && text.front() == '-');
}

}  // namespace

std::vector<std::pair<std::string, std::string>> PrivateWorld(const std::string& folder) {
    const std::vector<std::pair<std::string, std::string>> places = {
        {"private dir", folder},
        {"state directory", folder + "/state"},
        {"cache directory", folder + "/cache"},
        {"lock directory", folder + "/lock"},
        {"pid directory", folder + "/run"},
    };
    for (const auto& place : places) {
        const mode_t mode = place.second == folder ? kFolderMode : kOpenFolderMode;
        if (const std::error_code error = MakeFolder(place.second, mode)) {
            throw std::system_error(error, place.second);
        }
    }
    return places;
}

ProbeFolder::ProbeFolder() : path_(Path(kRun) + kProbeFolder) {
    ConfFile conf;
    if (const std::error_code error = ConfFile::Load(Path(kSmbConf), conf, false)) {
        throw std::system_error(error, Path(kSmbConf));
    }
    std::string text = "[global]\nworkgroup = WORKGROUP\nsecurity = user\n";
    for (const auto& [key, value] : PrivateWorld(path_)) {
        text += key + " = " + value + "\n";
    }
    // What decides how names are found and which interfaces are used.
    for (const char* key : {"netbios name", "interfaces", "bind interfaces only", "wins server", "name resolve order",
                            "client min protocol", "client max protocol"}) {
        if (const std::optional<std::string> value = conf.Get("global", key)) {
            text += std::string(key) + " = " + *value + "\n";
        }
    }
    if (const std::error_code error = ReplaceFile(Configuration(), text, 0600)) {
        throw std::system_error(error, Configuration());
    }
}

ProbeFolder::~ProbeFolder() {
    std::error_code error;
    std::filesystem::remove_all(path_, error);
    if (error) {
        Log(LOG_WARNING, path_ + ": " + error.message());
    }
}

void CheckRequest(const JoinRequest& request) {
    if (!IsDnsName(request.domain) && !IsNetbiosName(request.domain)) {
        throw JoinError(status::kNoController, "the domain's name can be neither a DNS name nor a NetBIOS name");
    }
    if (!request.realm.empty() && !IsDnsName(request.realm)) {
        throw JoinError(status::kNoController, "the FQDN is no DNS name");
    }
    if (!request.netbiosName.empty() && !IsNetbiosName(request.netbiosName)) {
        throw JoinError(status::kWorkgroup, "the NetBIOS name holds what no such name holds");
    }
    if (!request.controller.empty() && !IsDnsName(request.controller) && !IsAddress(request.controller)) {
        throw JoinError(status::kKdc, "the KDC is neither an address nor a host's name");
    }
    if (IsDangerous(request.domain)) {
        throw JoinError(status::kNoController, "the domain's name begins with \"-\"");
    }
    if (request.credentials.user.empty()) {
        throw JoinError(status::kUnknownAccount, "no user name was given");
    }
    if (!IsToolAccountName(request.credentials.user)) {
        throw JoinError(R"(The user name begins with "-", or holds "%" or a control character, or is too long.)");
    }
}

JoinTarget FindTarget(const JoinRequest& request, const std::string& probe, StepLog& steps, const TimeBudget& budget) {
    return Search(request, probe, steps, budget).Run();
}

}  // namespace appliance
