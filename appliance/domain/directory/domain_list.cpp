#include "appliance/domain/directory/domain_list.h"

#include <json/reader.h>
#include <json/writer.h>

#include <algorithm>
#include <chrono>
#include <sstream>

#include "appliance/base/file.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/text.h"
#include "appliance/domain/directory/fetch_source.h"
#include "appliance/domain/directory/worker.h"
#include "appliance/domain/membership/samba.h"

namespace appliance {

namespace {

constexpr std::chrono::milliseconds kWinbindTime{4000};
constexpr std::chrono::milliseconds kOnlineTime{2000};
constexpr std::chrono::milliseconds kAnswerTime{10000};
constexpr std::chrono::hours kListsKept{7 * 24};
constexpr Patience kPatience{std::chrono::seconds(20), std::chrono::seconds(30)};
constexpr std::size_t kNameWidth = 16;  // of the column of names
constexpr std::size_t kLongestFile = std::size_t{1} << 20;
constexpr mode_t kFolderMode = 0700;
constexpr mode_t kMode = 0600;

KnownDomain OwnDomain(const Membership& membership) {
    return {Upper(membership.domain), membership.kind == DomainKind::ActiveDirectory ? Lower(membership.realm) : "",
            true};
}

bool IsDomain(const KnownDomain& domain) {
    return IsNetbiosName(domain.name) && (domain.dns.empty() || IsDnsName(domain.dns));
}

bool Holds(const std::vector<KnownDomain>& domains, const std::string& name) {
    return std::any_of(domains.begin(), domains.end(),
                       [&name](const KnownDomain& domain) { return EqualIgnoringCase(domain.name, name); });
}

// Appends those of `more` that are not there yet. A DNS name that only `more` knows is taken over.
void Merge(std::vector<KnownDomain>& domains, const std::vector<KnownDomain>& more) {
    for (const KnownDomain& domain : more) {
        const auto same = std::find_if(domains.begin(), domains.end(), [&domain](const KnownDomain& other) {
            return EqualIgnoringCase(other.name, domain.name);
        });
        if (same == domains.end()) {
            domains.push_back(domain);
        } else if (same->dns.empty()) {
            same->dns = domain.dns;
        }
    }
}

struct WinbindAnswer {
    std::vector<KnownDomain> domains;  // the own one first
    bool online = false;               // it is connected to the own domain's controller, so it forgets none
};

std::optional<WinbindAnswer> AskWinbind(const Membership& membership) {
    SambaCall list;
    list.arguments = {"--trusted-domains", "--verbose"};
    list.deadline = kWinbindTime;
    const CommandResult listed = RunWbinfo(list);
    if (!listed.Succeeded()) {
        return std::nullopt;
    }
    std::optional<std::vector<KnownDomain>> trusted = ParseTrustList(listed.output, membership.domain);
    if (!trusted) {
        return std::nullopt;
    }
    SambaCall status;
    status.arguments = {"--online-status"};
    status.deadline = kOnlineTime;
    const CommandResult asked = RunWbinfo(status);
    WinbindAnswer answer;
    answer.domains = {OwnDomain(membership)};
    Merge(answer.domains, *trusted);
    answer.online = asked.Succeeded() && ParseOnline(asked.output, membership.domain);
    return answer;
}

// The trusted domains as the own domain's controller has them.
std::vector<KnownDomain> AskController(const Membership& membership) {
    const Json::Value answer = RunWorker(kPatience, [&membership](ProgressReport& report) {
        const KnownDomain own = OwnDomain(membership);
        FetchDomain domain;
        domain.name = own.name;
        domain.dns = own.dns;
        domain.own = true;
        std::string controller;
        const std::unique_ptr<LdapSession> session = OpenSession(domain, membership, kAnswerTime, report, controller);
        Json::Value found(Json::arrayValue);
        LdapSearch search;
        search.base = "CN=System," + BaseOfDomain(own.dns);
        search.filter = "(objectClass=trustedDomain)";
        search.attributes = {"flatName", "trustPartner", "trustDirection"};
        session->Search(search, [&](const LdapEntry& entry) {
            // Bit 2: the own domain trusts the other, so the other's users are users here.
            const std::string direction = entry.First("trustDirection");
            if (direction == "2" || direction == "3") {
                Json::Value trusted;
                trusted["name"] = entry.First("flatName");
                trusted["dns"] = entry.First("trustPartner");
                found.append(trusted);
            }
            report.Tell(found.size());
        });
        return found;
    });
    std::vector<KnownDomain> domains = {OwnDomain(membership)};
    for (const Json::Value& item : answer) {
        KnownDomain domain{Upper(item["name"].asString()), Lower(item["dns"].asString()), false};
        if (EqualIgnoringCase(domain.name, domain.dns)) {
            domain.dns.clear();  // an NT4-style domain has no other name
        }
        if (IsDomain(domain)) {
            Merge(domains, {domain});
        }
    }
    return domains;
}

}  // namespace

std::vector<KnownDomain> LoadDomains(const Membership& membership) {
    std::vector<KnownDomain> domains = {OwnDomain(membership)};
    std::string text;
    if (ReadFile(Path(kDomainList), text, kLongestFile)) {
        return domains;
    }
    Json::Value list;
    Json::CharReaderBuilder form;
    std::istringstream stream(text);
    try {
        if (!Json::parseFromStream(form, stream, &list, nullptr) || !list.isArray()) {
            return domains;
        }
    } catch (const Json::Exception&) {
        return domains;  // nested too deep
    }
    std::vector<KnownDomain> stored;
    for (const Json::Value& item : list) {
        if (item.isObject() && item["name"].isString() && item["dns"].isString() && item["own"].isBool()) {
            stored.push_back({Upper(item["name"].asString()), Lower(item["dns"].asString()), item["own"].asBool()});
        }
    }
    // Another domain's trusts say nothing of this one's.
    if (stored.empty() || !stored.front().own || stored.front().name != domains.front().name ||
        stored.front().dns != domains.front().dns) {
        return domains;
    }
    for (const KnownDomain& domain : stored) {
        if (!domain.own && IsDomain(domain) && !Holds(domains, domain.name)) {
            domains.push_back(domain);
        }
    }
    return domains;
}

bool SaveDomains(const std::vector<KnownDomain>& domains) {
    Json::Value list(Json::arrayValue);
    for (const KnownDomain& domain : domains) {
        Json::Value item;
        item["name"] = domain.name;
        item["dns"] = domain.dns;
        item["own"] = domain.own;
        list.append(item);
    }
    Json::StreamWriterBuilder form;
    form["indentation"] = "";
    const std::string text = Json::writeString(form, list) + "\n";
    const std::string path = Path(kDomainList);
    std::string present;
    if (!ReadFile(path, present, kLongestFile) && present == text) {
        return true;
    }
    std::error_code error = MakeFolder(Path(kState), kFolderMode);
    if (!error) {
        error = ReplaceFile(path, text, kMode);
    }
    if (error) {
        Log(LOG_ERR, "cannot write " + path + ": " + error.message());
        return false;
    }
    return true;
}

std::vector<KnownDomain> ListDomains(const Membership& membership) {
    std::vector<KnownDomain> known = LoadDomains(membership);
    std::optional<WinbindAnswer> answer = AskWinbind(membership);
    if (!answer) {
        Log(LOG_NOTICE, "winbind does not list the domains in sight; those that are known are taken");
        return known;
    }
    if (!answer->online) {
        Merge(answer->domains, known);
    }
    SaveDomains(answer->domains);
    return answer->domains;
}

bool RefreshDomains(const Membership& membership) {
    const std::optional<WinbindAnswer> answer = AskWinbind(membership);
    std::vector<KnownDomain> domains;
    if (answer) {
        domains = answer->domains;
    }
    bool confirmed = answer && answer->online;
    if (membership.kind == DomainKind::ActiveDirectory) {
        try {
            Merge(domains, AskController(membership));
        } catch (const DirectoryError& error) {
            Log(LOG_WARNING, "no controller of " + membership.domain + " lists the trusted domains: " + error.what());
            confirmed = false;
        }
    }
    if (domains.empty()) {
        Log(LOG_ERR, "the domains in sight of " + membership.domain + " can't be listed");
        return false;
    }
    // Only winbind and the controller together know that there are no more: winbind forgets some, and the controller
    // does not list those that are trusted through another one. So a list goes only when its domain has been out of
    // sight for longer than anybody forgets it.
    if (!confirmed) {
        Merge(domains, LoadDomains(membership));
    }
    const bool saved = SaveDomains(domains);
    if (confirmed && saved) {
        std::vector<std::string> names;
        for (const KnownDomain& domain : domains) {
            names.push_back(domain.name);
        }
        RemoveLists(names, kListsKept);
    }
    return saved;
}

std::optional<KnownDomain> FindDomain(const std::vector<KnownDomain>& domains, const std::string& name) {
    for (const KnownDomain& domain : domains) {
        if (EqualIgnoringCase(domain.name, name) || (!domain.dns.empty() && EqualIgnoringCase(domain.dns, name))) {
            return domain;
        }
    }
    return std::nullopt;
}

// Domain Name     DNS Domain          Trust Type  Transitive  In   Out
// OTHER           other.test          Forest      Yes         Yes  Yes
// OLD                                 External    No          Yes  Yes
std::optional<std::vector<KnownDomain>> ParseTrustList(const std::string& text, const std::string& own) {
    const std::vector<std::string> lines = Lines(text);
    if (lines.empty() || !StartsWith(lines.front(), "Domain Name ")) {
        return std::nullopt;
    }
    std::vector<KnownDomain> domains;
    bool complete = false;
    for (std::size_t line = 1; line < lines.size(); ++line) {
        const std::string& words = lines[line];
        if (words.size() <= kNameWidth || words[kNameWidth - 1] != ' ') {
            continue;
        }
        KnownDomain domain;
        domain.name = Upper(Trim(words.substr(0, kNameWidth)));
        const std::string rest = words.substr(kNameWidth);
        const bool hasDns = rest.front() != ' ';
        domain.dns = hasDns ? Lower(rest.substr(0, rest.find(' '))) : "";
        const std::string type = Trim(hasDns ? rest.substr(std::min(rest.find(' '), rest.size())) : rest);
        if (EqualIgnoringCase(domain.name, own)) {
            complete = true;
        } else if (!StartsWith(type, "Local") && !type.empty() && IsDomain(domain) && !Holds(domains, domain.name)) {
            domains.push_back(std::move(domain));
        }
    }
    if (!complete) {
        return std::nullopt;  // winbind does not even know where it belongs
    }
    return domains;
}

bool ParseOnline(const std::string& text, const std::string& domain) {
    for (const std::string& line : Lines(text)) {
        const std::size_t colon = line.rfind(" : ");
        if (colon != std::string::npos && EqualIgnoringCase(Trim(line.substr(0, colon)), domain)) {
            return Trim(line.substr(colon + 3)) == "active connection";
        }
    }
    return false;
}

}  // namespace appliance
