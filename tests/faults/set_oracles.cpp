// What "set" must leave behind.

#include <sstream>

#include "tests/faults/appliances.h"
#include "tests/faults/run.h"
#include "tests/faults/set_operation.h"

namespace sweep {

namespace {

std::vector<std::string> TextsOf(const Run& run, const std::string& function) {
    std::vector<std::string> texts;
    for (const std::size_t place : run.PlacesOf(function)) {
        texts.push_back(run.Calls()[place].arguments.at(0));
    }
    return texts;
}

std::string Joined(const std::vector<std::string>& texts) {
    std::string text;
    for (const std::string& one : texts) {
        text += (text.empty() ? "" : " ") + one;
    }
    return text;
}

// "manage_mode" as far as it could be read; null when reading it did not come to its end.
std::optional<int> WantedTrust(const Run& run) {
    for (const std::size_t place : run.PlacesOf("VORN::APIRequest::HasParam", "\"manage_mode\"")) {
        if (run.Failed(place)) {
            return std::nullopt;
        }
    }
    for (const std::size_t place : run.PlacesOf("VORN::APIRequest::GetParam", "\"manage_mode\"")) {
        if (run.Failed(place)) {
            return std::nullopt;
        }
    }
    const Json::Value& mode = run.scenario.parameters["manage_mode"];
    return mode.isInt() && mode.asInt() != 0 ? 0 : 1;
}

// ---- DNS servers ----

fake::OptionalTexts Split(const std::string& text) {
    fake::OptionalTexts pieces;
    std::istringstream stream(text);
    for (std::string piece; std::getline(stream, piece, ',');) {
        pieces.emplace_back(piece);
    }
    return pieces;
}

// The old servers as they could be read.
fake::OptionalTexts OldServers(const Run& run) {
    fake::OptionalTexts read;
    const std::vector<std::size_t> reads = run.PlacesOf("VLIBCSzListGet");
    for (std::size_t i = 0; i < run.Before().dnsServers.size(); ++i) {
        if (run.Before().dnsServers[i] && i < reads.size() && run.Worked(reads[i])) {
            read.push_back(run.Before().dnsServers[i]);
        }
    }
    return read;
}

std::string ListText(const fake::OptionalTexts& texts) {
    std::string text;
    for (const fake::OptionalText& entry : texts) {
        text += (text.empty() ? "" : ", ") + Quoted(entry.value_or(""));
    }
    return "[" + text + "]";
}

// The servers that were set, as the calls of one SetDNSList tell: from the allocation at `alloc` on.
bool SetWorked(const Run& run, std::size_t alloc, std::size_t end) {
    for (std::size_t place = alloc; place < end; ++place) {
        const std::string& function = run.Calls()[place].function;
        const bool belongs =
            function == "VLIBCSzListAlloc" || function == "VLIBCSzListPush" || function == "VORNNetDNSListSet";
        if (belongs && run.Failed(place)) {
            return false;
        }
    }
    return true;
}

}  // namespace

JoinFacts::JoinFacts(const Run& run) {
    const std::optional<std::size_t> reading = run.FirstOf("VORNWinIsEnableTrustDomain");
    if (!reading) {
        return;
    }
    attempted = true;
    const fake::Fault* fault = run.FaultAt(*reading);
    savedTrust = fault != nullptr ? fault->result : run.Before().trustSetting;
    bool copied = true;
    for (const std::size_t copy : run.PlacesOf("strdup")) {
        copied = copied && run.Worked(copy);
    }
    const std::optional<std::size_t> join = run.FirstOf("VORNWinJoin1");
    joined = join && run.Worked(*join) && copied && run.Before().joinResult == 0;
}

void CheckTrustSetting(const Run& run, Findings& findings) {
    const JoinFacts join(run);
    const std::vector<std::string> calls = TextsOf(run, "VORNWinSetTrustDomain");
    std::vector<std::string> expected;
    int setting = run.Before().trustSetting;
    if (join.attempted) {
        const std::vector<std::size_t> places = run.PlacesOf("VORNWinSetTrustDomain");
        const auto worked = [&](std::size_t nth) { return nth < places.size() && run.Worked(places[nth]); };
        const std::optional<int> read = WantedTrust(run);
        const int wanted = read.value_or(1);
        if (wanted != join.savedTrust && read) {
            expected.push_back(std::to_string(wanted));
            setting = worked(0) ? wanted : setting;
        }
        if (wanted != join.savedTrust && !join.joined) {
            setting = worked(expected.size()) ? join.savedTrust : setting;
            expected.push_back(std::to_string(join.savedTrust));
        }
    }
    if (calls != expected) {
        findings.Add("put back", "trust setting: expected " + Joined(expected) + ", got " + Joined(calls));
    }
    if (run.After().trustSetting != setting) {
        findings.Add("put back", "trust setting is " + std::to_string(run.After().trustSetting));
    }
}

void CheckDnsServers(const Run& run, Findings& findings) {
    const JoinFacts join(run);
    const fake::OptionalTexts oldServers = OldServers(run);
    const Json::Value& dns = run.scenario.parameters["dns"];
    const fake::OptionalTexts newServers = dns.isString() ? Split(dns.asString()) : fake::OptionalTexts();

    // One allocation reads the old list, one is for the new list, one puts the old list back.
    std::vector<std::size_t> allocations = run.PlacesOf("VLIBCSzListAlloc");
    const std::size_t end = run.Calls().size();
    const auto place = [&](std::size_t nth) { return nth < allocations.size() ? allocations[nth] : end; };
    const bool reachedOptions = run.Called("VLIBCSzHashAlloc");
    const bool differs = !newServers.empty() && newServers != oldServers;
    const bool triedNew = allocations.size() > 1;
    if ((reachedOptions && triedNew != differs) || (triedNew && !differs)) {
        findings.Add("put back", triedNew ? "servers set without need" : "servers not set");
    }
    const bool newSet = triedNew && SetWorked(run, place(1), place(2));
    const bool mustPutBack = newSet && !join.joined;
    if ((allocations.size() > 2) != mustPutBack) {
        findings.Add("put back", mustPutBack ? "servers not put back" : "servers put back without need");
    }
    const bool oldSet = mustPutBack && SetWorked(run, place(2), end);

    const std::vector<std::string> calls = TextsOf(run, "VORNNetDNSListSet");
    for (std::size_t i = 0; i < calls.size(); ++i) {
        const std::string expected = ListText(i == 0 ? newServers : oldServers);
        if (calls[i] != expected) {
            findings.Add("put back", "servers: expected " + expected + ", got " + calls[i]);
        }
    }
    const fake::OptionalTexts& servers = oldSet ? oldServers : newSet ? newServers : run.Before().dnsServers;
    if (run.After().dnsServers != servers) {
        findings.Add("put back", "servers are " + ListText(run.After().dnsServers));
    }
}

void CheckJoinStatus(const Run& run, Findings& findings) {
    const JoinFacts join(run);
    if (!join.attempted) {
        return;
    }
    const std::vector<std::size_t> looks = run.PlacesOf("access");
    const std::vector<std::size_t> removals = run.PlacesOf("unlink");
    const bool looked = !looks.empty() && run.Worked(looks.back());
    const bool removalFailed = !removals.empty() && removals.back() > looks.back() && run.Failed(removals.back());
    if (run.After().Exists(kJoinStatus) && looked && !removalFailed) {
        findings.Add("join status", "still there");
    }
    if (looks.empty()) {
        findings.Add("join status", "nobody looked for it");
    }
}

void CheckFilesOfSet(const Run& run, Findings& findings) {
    const fake::State& before = run.Before();
    const fake::State& after = run.After();

    const std::optional<std::size_t> removal = run.FirstOf("VLIBCFileRemoveKey");
    const std::optional<std::size_t> lock = run.FirstOf("VLIBCFileLock");
    const bool left = run.Called("VORNWinJoin1", "joinMode 0");
    const bool lockHeld = lock && run.FaultAt(*lock) == nullptr && before.heldLocks.empty();
    fake::State expected = before;
    if (removal && run.Worked(*removal) && left && before.keyValueFiles.count(kSettings) != 0) {
        fake::RemoveKey(Global(expected, kSettings), "domain_dns");
    }
    const auto fileOf = [](const fake::State& state, const char* path) {
        const auto found = state.keyValueFiles.find(path);
        return found == state.keyValueFiles.end() ? fake::KeyValueFile() : found->second;
    };
    if (fileOf(after, kSettings) != fileOf(expected, kSettings)) {
        findings.Add("files", "the settings file is not as expected");
    }
    if (lock && (removal.has_value() != lockHeld || run.Called("VLIBCFileUnlock") != lockHeld)) {
        findings.Add("files", "the settings were changed without the lock, or the lock was kept");
    }
    const std::optional<std::size_t> rename = run.FirstOf("VLIBCSysRename");
    if ((!rename || run.Failed(*rename)) && fileOf(after, kSmbInfo) != fileOf(before, kSmbInfo)) {
        findings.Add("files", "the domain-information file changed without a rename");
    }
    if (!(rename && run.Failed(*rename)) && after.keyValueFiles.count("/usr/vorn/etc/smbinfo.conf.tmp") != 0) {
        findings.Add("files", "a temporary file stays");
    }
}

}  // namespace sweep
