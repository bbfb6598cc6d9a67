// The contract's questions about the membership, and the settings that belong to it.

#include "appliance/platform/contract.h"
//
#include <chrono>
#include <ctime>
#include <string>
#include <string_view>

#include "appliance/base/conf_file.h"
#include "appliance/base/file.h"
#include "appliance/base/paths.h"
#include "appliance/base/settings.h"
#include "appliance/base/text.h"
#include "appliance/domain/join/machine_account.h"
#include "appliance/domain/join/provisional.h"
#include "appliance/domain/membership/last_test.h"
#include "appliance/domain/membership/membership.h"
#include "appliance/platform/domain/time_task.h"
#include "appliance/platform/last_error.h"

namespace {

using appliance::DomainKind;
using appliance::Membership;
using appliance::Path;

constexpr std::chrono::milliseconds kTestDeadline{12000};
constexpr std::chrono::milliseconds kLockWait{5000};
constexpr char kNsswitch[] = "/etc/nsswitch.conf";
constexpr std::size_t kLargestNsswitch = 1 << 20;
constexpr char kSyncKey[] = "vorn sync dctime";
constexpr char kGlobal[] = "global";

// The membership; an unreadable configuration is none, and logged.
Membership MembershipOrNone() {
    Membership membership;
    if (const std::error_code error = appliance::ReadMembership(membership)) {
        appliance::Log(LOG_ERR, Path(appliance::kSmbConf) + ": " + error.message());
        return {};
    }
    return membership;
}

// "passwd:  files ldap [NOTFOUND=return] # why" names "ldap".
bool NamesDirectory(std::string_view line) {
    const std::string text = appliance::Trim(line.substr(0, line.find('#')));
    const std::size_t colon = text.find(':');
    if (colon == std::string::npos || appliance::Trim(text.substr(0, colon)) != "passwd") {
        return false;
    }
    std::string rest = text.substr(colon + 1);
    for (char& letter : rest) {
        letter = letter == '\t' ? ' ' : letter;
    }
    for (const std::string& source : appliance::Split(rest, " ")) {
        if (source == "ldap" || source == "sss") {
            return true;
        }
    }
    return false;
}

bool ReadOrLog(Membership& membership) {
    const std::error_code error = appliance::ReadMembership(membership);
    if (error) {
        const bool unnamed = error == std::errc::invalid_argument;
        appliance::Log(LOG_ERR, appliance::Path(appliance::kSmbConf) + ": " +
                                    (unnamed ? "no file that names a workgroup" : error.message()));
    }
    return !error;
}

// Asks the domain as one of this kind. `words` become the tool's.
appliance::SecretState TestAndRecord(const Membership& membership, DomainKind kind, std::string& words) {
    Membership asked = membership;
    asked.kind = kind;
    const auto began = std::chrono::steady_clock::now();
    const appliance::SecretState state = appliance::TestSecret(asked, "", "", kTestDeadline, &words);
    const auto took = std::chrono::steady_clock::now() - began;
    appliance::RecordTest(membership, {std::time(nullptr), state == appliance::SecretState::Works,
                                       std::chrono::duration_cast<std::chrono::milliseconds>(took).count()});
    return state;
}

}  // namespace

extern "C" {

int WINIQuery1(char* name, int size, int* first, int* second) {
    VORN_GUARD(-1, {
        if (first == nullptr) {
            return VORN_FAIL(BadArgument);
        }
        Membership membership;
        if (!ReadOrLog(membership)) {
            return VORN_FAIL(FileRead);
        }
        if (!appliance::CopyToBuffer(membership.domain, name, size)) {
            return VORN_FAIL(BadArgument);
        }
        *first = membership.DomainMode() ? 1 : 0;
        if (second != nullptr) {
            *second = membership.Joined() ? 1 : 0;
        }
        return 0;
    })
}

int VORNWorkgroupGet(char* workgroup, int size) {
    VORN_GUARD(-1, {
        Membership membership;
        if (!ReadOrLog(membership)) {
            return VORN_FAIL(FileRead);
        }
        if (!appliance::CopyToBuffer(membership.domain, workgroup, size)) {
            return VORN_FAIL(BadArgument);
        }
        return 0;
    })
}

int VORNWinsIsJoined(void) {
    VORN_GUARD(0, { return MembershipOrNone().Joined() ? 1 : 0; })
}

int VORNWinADSJoined(void) {
    VORN_GUARD(0, { return MembershipOrNone().kind == DomainKind::ActiveDirectory ? 1 : 0; })
}

int VORNWinsIsOwnDomain(const char* domain) {
    VORN_GUARD(0, {
        if (domain == nullptr || *domain == '\0') {
            return 0;
        }
        const Membership membership = MembershipOrNone();
        const bool own = membership.DomainMode() && (appliance::EqualIgnoringCase(domain, membership.domain) ||
                                                     appliance::EqualIgnoringCase(domain, membership.realm));
        return own ? 1 : 0;
    })
}

int VORNWinTestJoin(int ads) {
    VORN_GUARD(-1, {
        const Membership membership = MembershipOrNone();
        if (!membership.Joined()) {
            return VORN_FAIL(NotMember);
        }
        std::string words;
        switch (TestAndRecord(membership, ads != 0 ? DomainKind::ActiveDirectory : DomainKind::Nt4, words)) {
            case appliance::SecretState::Works:
                return 0;
            case appliance::SecretState::Refused:
                appliance::Log(LOG_WARNING, "the domain refuses the machine account: " + words);
                return VORN_FAIL(Refused);
            case appliance::SecretState::Unknown:
                break;
        }
        appliance::Log(LOG_WARNING, "the membership could not be tested: " + words);
        return VORN_FAIL(Unreachable);
    })
}

int VORNWinIsEnableTrustDomain(void) {
    VORN_GUARD(0, { return appliance::TrustedDomainsEnabled() ? 1 : 0; })
}

int VORNWinSetTrustDomain(int setting) {
    VORN_GUARD(-1, {
        if (setting != 0 && setting != 1) {
            return VORN_FAIL(BadArgument);
        }
        // smb.conf is left alone: the join that this belongs to writes it, when it succeeds.
        if (const std::error_code error = appliance::ChangeTrustSetting(setting == 1)) {
            appliance::Log(LOG_ERR, Path(appliance::kSettings) + ": " + error.message());
            return error == std::errc::timed_out ? VORN_FAIL(FileLock) : VORN_FAIL(FileWrite);
        }
        return 0;
    })
}

int VORNWinsSetSectionKey(const char* section, const char* key, const char* value) {
    VORN_GUARD(-1, {
        if (section == nullptr || key == nullptr || value == nullptr) {
            return VORN_FAIL(BadArgument);
        }
        {
            const auto lock = appliance::LockSmbConf(kLockWait);
            if (!lock) {
                return VORN_FAIL(FileLock);
            }
            appliance::ConfFile conf;
            if (appliance::ConfFile::Load(Path(appliance::kSmbConf), conf, false)) {
                return VORN_FAIL(FileRead);
            }
            const std::string before = conf.text();
            if (!conf.Set(section, key, value)) {
                return VORN_FAIL(BadData);
            }
            if (conf.text() != before) {
                if (const std::error_code error = conf.Save(Path(appliance::kSmbConf))) {
                    appliance::Log(LOG_ERR, Path(appliance::kSmbConf) + ": " + error.message());
                    return VORN_FAIL(FileWrite);
                }
            }
        }
        // The key is written; what it asks for is done by a task, whose failure is in the log.
        if (appliance::SameKey(section, kGlobal) && appliance::SameKey(key, kSyncKey) &&
            appliance::ApplyTimeSynchronisation() < 0) {
            appliance::Log(LOG_ERR, "the task that synchronises the clock could not be set up");
        }
        return 0;
    })
}

int VORNLDAPIsBinded(int /*flags*/) {
    VORN_GUARD(0, {
        std::string text;
        if (appliance::ReadFile(Path(kNsswitch), text, kLargestNsswitch)) {
            return 0;
        }
        for (const std::string& line : appliance::Lines(text)) {
            if (NamesDirectory(line)) {
                return 1;
            }
        }
        return 0;
    })
}

}  // extern "C"
