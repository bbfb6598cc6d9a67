#include "appliance/domain/directory/directory_store.h"

#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <filesystem>

#include "appliance/base/file.h"
#include "appliance/base/file_time.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/sqlite.h"
#include "appliance/base/text.h"
#include "appliance/domain/directory/utf8.h"

namespace appliance {

namespace {

constexpr char kListEnd[] = ".db";

// The kind and domain that a file's name stands for; nothing when it is no list's name.
std::optional<ListInfo> ListOfName(const std::string& name) {
    for (const EntryKind kind : {EntryKind::User, EntryKind::Group}) {
        const std::string beginning = std::string(KindName(kind)) + "_";
        const std::size_t length = beginning.size() + sizeof(kListEnd) - 1;
        if (StartsWith(name, beginning) && name.size() > length &&
            name.compare(name.size() - sizeof(kListEnd) + 1, std::string::npos, kListEnd) == 0) {
            ListInfo list;
            list.kind = kind;
            list.domain = name.substr(beginning.size(), name.size() - length);
            if (IsListDomain(list.domain) && list.domain == Upper(list.domain)) {
                return list;
            }
        }
    }
    return std::nullopt;
}

std::vector<ListInfo> ListNames() {
    std::vector<ListInfo> lists;
    std::error_code error;
    std::filesystem::directory_iterator files(Path(kDirectoryData), error);
    for (; !error && files != std::filesystem::directory_iterator(); files.increment(error)) {
        if (std::optional<ListInfo> list = ListOfName(files->path().filename().string())) {
            lists.push_back(std::move(*list));
        }
    }
    std::sort(lists.begin(), lists.end(), [](const ListInfo& first, const ListInfo& second) {
        return first.kind != second.kind ? first.kind < second.kind : first.domain < second.domain;
    });
    return lists;
}

ListInfo ReadInfo(Database& database, EntryKind kind, const std::string& domain) {
    ListInfo list;
    list.kind = kind;
    list.domain = domain;
    Statement statement(database, "SELECT key, value FROM meta");
    while (statement.Step()) {
        const std::string key = statement.Text(0);
        if (key == "count") {
            list.count = statement.Number(1);
        } else if (key == "fetched") {
            list.fetched = statement.Number(1);
        } else if (key == "source") {
            list.source = statement.Text(1);
        } else if (key == "controller") {
            list.controller = statement.Text(1);
        }
    }
    return list;
}

// The list's file, open; nothing when there is none. A file that goes between the look and the opening counts as none.
std::optional<Database> OpenList(EntryKind kind, std::string_view domain) {
    if (!IsListDomain(domain)) {
        return std::nullopt;
    }
    const std::string path = ListPath(kind, domain);
    struct stat status {};
    if (lstat(path.c_str(), &status) != 0 || !S_ISREG(status.st_mode)) {
        return std::nullopt;
    }
    try {
        return Database(path, Database::Mode::Unchanging);
    } catch (const SqliteError&) {
        if (lstat(path.c_str(), &status) != 0 && errno == ENOENT) {
            return std::nullopt;
        }
        throw;
    }
}

}  // namespace

const char* KindName(EntryKind kind) {
    return kind == EntryKind::User ? "user" : "group";
}

bool IsListDomain(std::string_view domain) {
    return IsNetbiosName(domain);
}

std::string ListPath(EntryKind kind, std::string_view domain) {
    return Path(kDirectoryData) + "/" + KindName(kind) + "_" + Upper(domain) + kListEnd;
}

std::string ListLinkPath(EntryKind kind, std::string_view domain) {
    return Path(kPrivate) + "/domain_" + KindName(kind) + "_" + Upper(domain) + kListEnd;
}

std::vector<ListInfo> FindLists() {
    std::vector<ListInfo> lists;
    for (const ListInfo& name : ListNames()) {
        try {
            if (std::optional<ListInfo> list = FindList(name.kind, name.domain)) {
                lists.push_back(std::move(*list));
            }
        } catch (const SqliteError& error) {
            Log(LOG_ERR, std::string("a list of domain ") + KindName(name.kind) + "s is damaged: " + error.what());
        }
    }
    return lists;
}

std::optional<ListInfo> FindList(EntryKind kind, std::string_view domain) {
    std::optional<Database> database = OpenList(kind, domain);
    if (!database) {
        return std::nullopt;
    }
    return ReadInfo(*database, kind, Upper(domain));
}

std::optional<EntryPage> ReadEntries(EntryKind kind, std::string_view domain, std::int64_t offset, std::int64_t limit,
                                     std::string_view search) {
    std::optional<Database> database = OpenList(kind, domain);
    if (!database) {
        return std::nullopt;
    }
    EntryPage page;
    page.list = ReadInfo(*database, kind, Upper(domain));
    if (HasControlBytes(search)) {
        return page;  // no entry holds one
    }
    const std::string folded = FoldCase(search);
    const std::string condition = folded.empty() ? "" : " WHERE instr(folded, ?1) > 0";
    page.total = page.list.count;
    if (!folded.empty()) {
        Statement count(*database, "SELECT count(*) FROM entries" + condition);
        count.Bind(1, folded).Step();
        page.total = count.Number(0);
    }
    Statement rows(*database,
                   "SELECT name, id, display FROM entries" + condition + " ORDER BY name LIMIT ?2 OFFSET ?3");
    if (!folded.empty()) {
        rows.Bind(1, folded);
    }
    rows.Bind(2, std::max<std::int64_t>(limit, 0)).Bind(3, std::max<std::int64_t>(offset, 0));
    while (rows.Step()) {
        DirectoryEntry entry;
        entry.name = rows.Text(0);
        if (!rows.IsNull(1)) {
            entry.id = rows.Number(1);
        }
        entry.display = rows.Text(2);
        page.entries.push_back(std::move(entry));
    }
    return page;
}

int RemoveLists(const std::vector<std::string>& except, std::chrono::seconds age) {
    const Moment stored = std::chrono::system_clock::now() - age;
    int removed = 0;
    bool failed = false;
    for (const ListInfo& list : ListNames()) {
        const bool stays = std::any_of(except.begin(), except.end(), [&list](const std::string& domain) {
            return EqualIgnoringCase(domain, list.domain);
        });
        struct stat file {};
        if (stays || (stat(ListPath(list.kind, list.domain).c_str(), &file) == 0 && WrittenAt(file) > stored)) {
            continue;
        }
        // The link first: while it exists, the list that it stands for exists, too.
        for (const std::string& path : {ListLinkPath(list.kind, list.domain), ListPath(list.kind, list.domain)}) {
            if (const std::error_code error = RemoveFile(path)) {
                Log(LOG_ERR, "cannot remove " + path + ": " + error.message());
                failed = true;
            }
        }
        ++removed;
    }
    return failed ? -1 : removed;
}

}  // namespace appliance
