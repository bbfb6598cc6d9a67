// Membership of a domain, and what is known of the domains in sight.

#include "platform/domain.h"

#include <strings.h>

#include <cstring>

#include "tests/double/containers.h"

using fake::Number;
using fake::Quoted;
using fake::Recording;
using fake::SizeText;
using fake::State;
using fake::TheAppliance;

namespace {

std::string FieldText(const char* field, std::size_t size) {
    return std::string(field, strnlen(field, size));
}

std::string RecordText(const _tag_VORN_WIN2_* record) {
    if (record == nullptr) {
        return "null";
    }
    return "{joinMode " + Number(record->joinMode) + ", " + Quoted(record->domainName) + ", " +
           Quoted(record->userName) + ", " + Quoted(record->password) + ", kdc " +
           Quoted(FieldText(record->kdc, sizeof record->kdc)) + ", fqdn " +
           Quoted(FieldText(record->fqdn, sizeof record->fqdn)) + ", netbiosName " +
           Quoted(FieldText(record->netbiosName, sizeof record->netbiosName)) + "}";
}

fake::OptionalText Copy(const char* text) {
    return text == nullptr ? fake::OptionalText() : fake::OptionalText(text);
}

template <std::size_t kSize>
bool Terminated(const char (&field)[kSize]) {
    return strnlen(field, kSize) < kSize;
}

template <std::size_t kSize>
bool Zero(const char (&field)[kSize]) {
    static const char zeros[kSize] = {};
    return std::memcmp(field, zeros, kSize) == 0;
}

// Whether a record may be given to VORNWinJoin1 at all.
bool GoodRecord(Recording& call, const _tag_VORN_WIN2_& record) {
    if (record.domainName == nullptr || record.userName == nullptr || record.password == nullptr) {
        return false;  // allowed, and refused
    }
    if (record.joinMode != 0 && record.joinMode != 1) {
        call.Misuse("no such mode");
    } else if (record.reserved1 != 0 || !Zero(record.reserved2)) {
        call.Misuse("reserved fields must be 0");
    } else if (!Terminated(record.kdc) || !Terminated(record.fqdn) || !Terminated(record.netbiosName)) {
        call.Misuse("text without an end");
    } else {
        return true;
    }
    return false;
}

void Join(State& state, const _tag_VORN_WIN2_& record) {
    const bool joins = record.joinMode == 1;
    state.domainName = record.domainName;
    state.firstFlag = joins ? 1 : 0;
    state.secondFlag = joins ? 1 : 0;
    state.joinedFlag = joins ? 1 : 0;
    if (joins) {
        state.ownDomain = record.netbiosName[0] == '\0' ? record.domainName : record.netbiosName;
        return;
    }
    state.workgroup = record.domainName;
    state.ownDomain.clear();
    state.adsJoined = 0;
}

// An operation without arguments that only leaves a mark.
int Count(const char* function, int State::*counter) {
    Recording call(function, {});
    if (call.Fails()) {
        return call.Failure(-1);
    }
    ++(TheAppliance().state.*counter);
    return call.Answer(0);
}

}  // namespace

int WINIQuery1(char* name, int size, int* first, int* second) {
    Recording call("WINIQuery1", {SizeText(size), fake::Named(first, "first"), fake::Named(second, "second")});
    if (call.BadBuffer(name, size) || call.Null(first)) {
        return call.Failure(-1);
    }
    if (call.Fails()) {
        call.Spoil(name, size);
        return call.Failure(-1);
    }
    const State& state = TheAppliance().state;
    call.Fill(name, size, state.domainName);
    *first = state.firstFlag;
    if (second != nullptr) {
        *second = state.secondFlag;
    }
    return call.Answer(0);
}

int ErrWINIState1Get(char* key, int keySize, char* message, int messageSize) {
    Recording call("ErrWINIState1Get", {SizeText(keySize), SizeText(messageSize)});
    if (call.BadBuffer(key, keySize) || call.BadBuffer(message, messageSize)) {
        return call.Failure(-1);
    }
    const std::optional<fake::JoinStatus>& status = TheAppliance().state.joinStatus;
    if (call.Fails() || !status) {
        call.Spoil(key, keySize);
        call.Spoil(message, messageSize);
        return call.Failure(-1);
    }
    call.Fill(key, keySize, status->key);
    call.Fill(message, messageSize, status->message);
    return call.Answer(0);
}

int VORNWinJoin1(_tag_VORN_WIN2_* record) {
    Recording call("VORNWinJoin1", {RecordText(record)});
    if (call.Null(record)) {
        return call.Failure(-1);
    }
    State& state = TheAppliance().state;
    state.joins.push_back({*record, Copy(record->domainName), Copy(record->userName), Copy(record->password)});
    if (!GoodRecord(call, *record) || call.Fails()) {
        return call.Failure(-1);
    }
    if (state.onJoin) {
        // A copy: the hook may replace itself.
        const auto hook = state.onJoin;
        hook(*record);
    }
    if (state.joinResult != 0) {
        return call.Failure(state.joinResult);
    }
    Join(state, *record);
    return call.Answer(0);
}

int VORNWinTestJoin(int ads) {
    Recording call("VORNWinTestJoin", {Number(ads)});
    if (call.Fails()) {
        return call.Failure(-1);
    }
    const int result = TheAppliance().state.testJoinResult;
    return result < 0 ? call.Failure(result) : call.Answer(result);
}

int VORNWinADSJoined(void) {
    return Recording("VORNWinADSJoined", {}).Answer(TheAppliance().state.adsJoined);
}

int VORNWinIsEnableTrustDomain(void) {
    return Recording("VORNWinIsEnableTrustDomain", {}).Answer(TheAppliance().state.trustSetting);
}

int VORNWinSetTrustDomain(int setting) {
    Recording call("VORNWinSetTrustDomain", {Number(setting)});
    if (call.Fails()) {
        return call.Failure(-1);
    }
    TheAppliance().state.trustSetting = setting;
    return call.Answer(0);
}

int VORNWinsEnumAllDomains(VLIBSZLIST** domains) {
    Recording call("VORNWinsEnumAllDomains", {fake::Named(domains, "list")});
    if (!fake::LiveList(call, domains)) {
        return call.Failure(-1);
    }
    if (call.Fails()) {
        fake::ReplaceList(domains);
        return call.Failure(-1);
    }
    fake::Append(domains, TheAppliance().state.domains);
    return call.Answer(0);
}

int VORNWinsEnumOU(VLIBSZLIST** names, VLIBSZLIST** values) {
    Recording call("VORNWinsEnumOU", {fake::Named(names, "list"), fake::Named(values, "list")});
    if (!fake::LiveList(call, names) || !fake::LiveList(call, values)) {
        return call.Failure(-1);
    }
    if (call.Fails()) {
        fake::ReplaceList(names);
        fake::ReplaceList(values);
        return call.Failure(-1);
    }
    fake::Append(names, TheAppliance().state.unitNames);
    fake::Append(values, TheAppliance().state.unitValues);
    return call.Answer(0);
}

int VORNWinsGetDomainFQDN(const char* domain, char* fqdn, int size) {
    Recording call("VORNWinsGetDomainFQDN", {Quoted(domain), SizeText(size)});
    if (call.BadBuffer(fqdn, size) || call.Null(domain)) {
        return call.Failure(-1);
    }
    const auto& fqdns = TheAppliance().state.fqdns;
    const auto found = fqdns.find(domain);
    if (call.Fails() || found == fqdns.end()) {
        call.Spoil(fqdn, size);
        return call.Failure(-1);
    }
    call.Fill(fqdn, size, found->second);
    return call.Answer(0);
}

int VORNWinsIsJoined(void) {
    return Recording("VORNWinsIsJoined", {}).Answer(TheAppliance().state.joinedFlag);
}

int VORNWinsIsOwnDomain(const char* domain) {
    Recording call("VORNWinsIsOwnDomain", {Quoted(domain)});
    if (call.Null(domain)) {
        return call.Answer(0);
    }
    const std::string& own = TheAppliance().state.ownDomain;
    return call.Answer(!own.empty() && strcasecmp(own.c_str(), domain) == 0 ? 1 : 0);
}

int VORNWinsSetSectionKey(const char* section, const char* key, const char* value) {
    Recording call("VORNWinsSetSectionKey", {Quoted(section), Quoted(key), Quoted(value)});
    if (call.Null(section, key, value) || call.Fails()) {
        return call.Failure(-1);
    }
    State& state = TheAppliance().state;
    fake::SetKey(state.keyValueFiles[state.sharingConfiguration][section], key, value);
    return call.Answer(0);
}

int VORNWinUpdateAllDomains(void) {
    return Count("VORNWinUpdateAllDomains", &State::domainUpdates);
}

int VORNWinUpdateOU(void) {
    return Count("VORNWinUpdateOU", &State::unitUpdates);
}

int VORNWinGetDomainUGByDomain(int kind, VLIBSZLIST* domains) {
    Recording call("VORNWinGetDomainUGByDomain", {Number(kind), fake::ListText(domains)});
    if (kind != 0 && kind != 1) {
        call.Misuse("no such kind");
    }
    if (!call.Live(domains, fake::HandleKind::kList) || call.Fails()) {
        return call.Failure(-1);
    }
    TheAppliance().state.fetchedDomains.push_back({kind, fake::EntriesOf(domains)});
    return call.Answer(0);
}

int VORNWorkgroupGet(char* workgroup, int size) {
    Recording call("VORNWorkgroupGet", {SizeText(size)});
    if (call.BadBuffer(workgroup, size)) {
        return call.Failure(-1);
    }
    if (call.Fails()) {
        call.Spoil(workgroup, size);
        return call.Failure(-1);
    }
    call.Fill(workgroup, size, TheAppliance().state.workgroup);
    return call.Answer(0);
}

int VORNLDAPIsBinded(int flags) {
    Recording call("VORNLDAPIsBinded", {Number(flags)});
    if (flags != 0) {
        call.Misuse("flags must be 0");
    }
    return call.Answer(TheAppliance().state.ldapBound);
}

int VORNGroupAddDomainAdminGroup(void) {
    return Count("VORNGroupAddDomainAdminGroup", &State::adminGroupUpdates);
}

int VORNDomainUserHomeInclude(int include) {
    Recording call("VORNDomainUserHomeInclude", {Number(include)});
    if (include != 0 && include != 1) {
        call.Misuse("neither 0 nor 1");
    }
    if (call.Fails()) {
        return call.Failure(-1);
    }
    TheAppliance().state.userHomesIncluded = include;
    return call.Answer(0);
}
