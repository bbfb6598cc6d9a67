// The lists of domain users and groups, one SQLite file for each kind and domain: where they lie, and how they are
// read.
//
// A complete list is /usr/vorn/etc/private/directory/{user,group}_DOMAIN.db. It never changes: a newer one takes its
// place in one step, and who has it open goes on reading the old one. A hard link to it,
// /usr/vorn/etc/private/domain_{user,group}_DOMAIN.db, is what other programs look for and what a full refresh deletes
// at its start; the list itself stays and is served until the new one is complete.

#ifndef VORN_APPLIANCE_DOMAIN_DIRECTORY_DIRECTORY_STORE_H
#define VORN_APPLIANCE_DOMAIN_DIRECTORY_DIRECTORY_STORE_H

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace appliance {

// The numbers are those of the contract's fetch.
enum class EntryKind { User = 0, Group = 1 };

// "user" or "group", as in file names and answers.
const char* KindName(EntryKind kind);

struct DirectoryEntry {
    std::string name;                // the account's name, without its domain
    std::optional<std::int64_t> id;  // uid or gid on this appliance; nothing when it has none
    std::string display;             // may be empty
};

// What a list says of itself.
struct ListInfo {
    EntryKind kind = EntryKind::User;
    std::string domain;        // NetBIOS name in capitals
    std::int64_t count = 0;    // entries
    std::int64_t fetched = 0;  // seconds since 1970
    std::string source;        // "ldap" or "rpc"
    std::string controller;    // the server that answered
};

struct EntryPage {
    ListInfo list;
    std::int64_t total = 0;  // entries that match the search; all of them without one
    std::vector<DirectoryEntry> entries;
};

// May this text stand for a domain in a file's name? A NetBIOS name; its case doesn't count.
bool IsListDomain(std::string_view domain);

// Where the complete list of a domain lies, and its link. `domain` must be an IsListDomain.
std::string ListPath(EntryKind kind, std::string_view domain);
std::string ListLinkPath(EntryKind kind, std::string_view domain);

// The lists that exist, users before groups, by domain. A damaged file is left out, with a line in the log.
std::vector<ListInfo> FindLists();

// What the list of a domain says of itself; nothing when there is none, or `domain` can't be a domain. Throws
// SqliteError when the file is damaged.
std::optional<ListInfo> FindList(EntryKind kind, std::string_view domain);

// `limit` entries from `offset` on, ordered by name, of those whose name or display name contains `search` whatever its
// case (empty: all). Nothing and SqliteError as above.
std::optional<EntryPage> ReadEntries(EntryKind kind, std::string_view domain, std::int64_t offset, std::int64_t limit,
                                     std::string_view search = {});

// Removes the lists and links of every domain but those named (any case): what a leave, or a join of another domain,
// leaves behind is no longer true. A list that was stored less than `age` ago stays, too. Returns how many lists went, -1
// when one could not be removed.
int RemoveLists(const std::vector<std::string>& except = {}, std::chrono::seconds age = std::chrono::seconds(0));

}  // namespace appliance

#endif
