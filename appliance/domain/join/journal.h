// The journal of a change of membership: what an interrupted one has to finish or put back. It lies in a folder of its
// own with copies of everything that the change replaces, and every step of it is on the disk before the next begins.

#ifndef VORN_APPLIANCE_DOMAIN_JOIN_JOURNAL_H
#define VORN_APPLIANCE_DOMAIN_JOIN_JOURNAL_H

#include <optional>
#include <string>

#include "appliance/base/conf_file.h"
#include "appliance/domain/join/account_check.h"
#include "appliance/domain/membership/membership.h"

namespace appliance {

struct Journal {
    enum class Phase {
        Prepared,     // copies are made; nothing has been changed anywhere
        Joining,      // the join runs in the staging folder; the controller may change the account's password
        Joined,       // the controller has taken the staged secret
        Swapping,     // secrets, keytab and configuration are being put in place
        Swapped,      // all of it is in place
        Confirmed,    // winbind confirms the trust; only what can't fail the join is left
        PuttingBack,  // the old configuration is being put back
        Leaving,      // the local traces of a membership are being removed
    };
    Phase phase = Phase::Prepared;
    Membership before;                                   // as it was; `hasSecret` says whether it was complete
    Membership after;                                    // as it will be
    AccountState accountBefore = AccountState::Unknown;  // on the controller, before the join
    bool keepNewSecret = false;                          // while putting back: the old secret is dead
    bool resetOptions = false;                           // while leaving: reset the advanced options, too
    std::string controller = {};                         // the address asked

    // The machine account that is joined is the one that the appliance has already, so that joining kills the old
    // secret.
    bool SameAccount() const {
        return EqualName() && accountBefore != AccountState::Absent;
    }
    // The appliance's own account was gone from the controller, so that its old secret was dead before the join.
    bool AccountWasLost() const {
        return EqualName() && accountBefore == AccountState::Absent;
    }
    bool EqualDomain() const;

private:
    bool EqualName() const {
        return before.Joined() && EqualDomain() && before.machine == after.machine;
    }
};

// Files of the journal's folder.
namespace journal {
std::string Folder();         // 0700
std::string Staging();        // the join's private world: configuration, secrets, keytab
std::string OldConf();        // smb.conf as it was
std::string NewConf();        // smb.conf as it will be
std::string OldSecrets();     // secrets.tdb as it was
std::string OldKeytab();      // the keytab as it was; missing when there was none
std::string OldFormerKeys();  // the record of former keys as it was; missing when there was none
std::string NewFormerKeys();
std::string StagedSecrets();
std::string StagedKeytab();
std::string StagedConf();
// The record of former keys itself, not in the journal's folder.
std::string FormerKeysFile();
}  // namespace journal

// Makes the folder anew and empty. Throws std::system_error.
void MakeJournalFolder();

// Writes the journal in one step that is on the disk when this returns. Throws std::system_error.
void WriteJournal(const Journal& journal);

// The journal of an interrupted change; nothing when there is none. An unreadable one counts as none and is logged.
std::optional<Journal> ReadJournal();

// Ends the change: the journal goes first, then everything in its folder, secrets overwritten. Logs what can't go.
void RemoveJournal();

// Overwrites a file's bytes and removes it; a missing one is no failure.
void WipeFile(const std::string& path);

}  // namespace appliance

#endif
