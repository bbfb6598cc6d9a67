// Writes a list of domain users or groups beside the one in use and puts it in its place when it is complete.

#ifndef VORN_APPLIANCE_DOMAIN_DIRECTORY_LIST_WRITER_H
#define VORN_APPLIANCE_DOMAIN_DIRECTORY_LIST_WRITER_H

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "appliance/base/file.h"
#include "appliance/base/sqlite.h"
#include "appliance/domain/directory/directory_store.h"

namespace appliance {

// A list in the making; one that is not published leaves no trace. Takes little memory, however long the list is.
// Throws SqliteError and std::system_error.
class ListWriter {
public:
    // `domain` must be an IsListDomain.
    ListWriter(EntryKind kind, std::string_view domain);
    ~ListWriter();
    ListWriter(const ListWriter&) = delete;
    ListWriter& operator=(const ListWriter&) = delete;

    // Adds an entry. Machine and trust accounts (names that end in "$") are left out, and so are names that can't be
    // listed, which are counted. A name that comes again replaces the earlier one.
    void Add(std::string_view name, std::optional<std::int64_t> id, std::string_view display);

    // Counts names that could not even be read.
    void CountRefused(std::int64_t names) {
        refused_ += names;
    }

    // Entries added so far, repeated ones included, and names that were refused.
    std::int64_t added() const {
        return added_;
    }
    std::int64_t refused() const {
        return refused_;
    }

    // Puts the list in place: in one step for its readers, then, also in one step, for those of its link. Returns
    // false, with the old list untouched, when there is no entry: no domain is empty. To be called once.
    bool Publish(const std::string& source, const std::string& controller);

    // Entries of the published list.
    std::int64_t count() const {
        return count_;
    }

private:
    EntryKind kind_;
    std::string domain_;
    std::string path_;  // of the list in the making; empty once it is published
    FileDescriptor file_;
    std::unique_ptr<Database> database_;
    std::unique_ptr<Statement> insert_;
    std::int64_t added_ = 0;
    std::int64_t refused_ = 0;
    std::int64_t count_ = 0;
};

// Removes the lists in the making of a kind that killed writers left. Only for who knows that no other writer of that
// kind runs.
void RemoveUnfinishedLists(EntryKind kind);

// Makes the link of a domain's list again where it is missing or stands for an older list. A domain without a list is
// no failure. False when it could not be made (errno).
bool LinkList(EntryKind kind, std::string_view domain);

}  // namespace appliance

#endif
