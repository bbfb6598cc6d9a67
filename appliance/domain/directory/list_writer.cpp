#include "appliance/domain/directory/list_writer.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <system_error>
#include <vector>

#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/text.h"
#include "appliance/domain/directory/utf8.h"

namespace appliance {

namespace {

// A small page cache and no journal: the memory stays the same however long the list gets, and the file is of no use to
// anyone before it is complete.
constexpr char kTables[] =
    "PRAGMA journal_mode=OFF;"
    "PRAGMA synchronous=OFF;"
    "PRAGMA locking_mode=EXCLUSIVE;"
    "PRAGMA temp_store=MEMORY;"
    "PRAGMA cache_size=64;"
    "CREATE TABLE entries(name TEXT NOT NULL COLLATE NOCASE, id INTEGER, display TEXT NOT NULL,"
    " folded TEXT NOT NULL, PRIMARY KEY(name)) WITHOUT ROWID;"
    "CREATE TABLE meta(key TEXT PRIMARY KEY, value TEXT NOT NULL) WITHOUT ROWID;";

[[noreturn]] void Fail(const std::string& what) {
    throw std::system_error(errno, std::generic_category(), what);
}

}  // namespace

ListWriter::ListWriter(EntryKind kind, std::string_view domain) : kind_(kind), domain_(Upper(domain)) {
    const std::string folder = Path(kDirectoryData);
    if (const std::error_code error = MakeFolder(Path(kPrivate), 0700)) {
        throw std::system_error(error, "cannot make " + Path(kPrivate));
    }
    if (const std::error_code error = MakeFolder(folder, 0700)) {
        throw std::system_error(error, "cannot make " + folder);
    }
    // A name that stands under none of the patterns by which lists are found or deleted.
    std::string path;
    file_ = MakeTemporary(ListPath(kind_, domain_), path);
    if (!file_) {
        Fail("cannot make a file in " + folder);
    }
    path_ = path;
    try {
        database_ = std::make_unique<Database>(path_, Database::Mode::ReadWrite);
        database_->Execute(kTables);
        database_->Execute("BEGIN EXCLUSIVE");
        insert_ = std::make_unique<Statement>(
            *database_, "INSERT OR REPLACE INTO entries(name, id, display, folded) VALUES(?1, ?2, ?3, ?4)");
    } catch (...) {
        unlink(path_.c_str());
        throw;
    }
}

ListWriter::~ListWriter() {
    insert_.reset();
    database_.reset();
    if (!path_.empty()) {
        unlink(path_.c_str());
    }
}

void ListWriter::Add(std::string_view name, std::optional<std::int64_t> id, std::string_view display) {
    if (!name.empty() && name.back() == '$') {
        return;
    }
    if (!IsListableName(name)) {
        ++refused_;
        return;
    }
    const std::string shown = CleanText(display);
    insert_->Bind(1, name);
    if (id) {
        insert_->Bind(2, *id);
    } else {
        insert_->BindNull(2);
    }
    // A line feed stands in no name, so a search never matches across the two.
    insert_->Bind(3, shown).Bind(4, FoldCase(std::string(name) + "\n" + shown)).Run();
    ++added_;
}

bool ListWriter::Publish(const std::string& source, const std::string& controller) {
    if (added_ == 0) {
        return false;
    }
    insert_.reset();
    {
        Statement rows(*database_, "SELECT count(*) FROM entries");
        rows.Step();
        count_ = rows.Number(0);
        Statement meta(*database_, "INSERT INTO meta(key, value) VALUES(?1, ?2)");
        meta.Bind(1, "domain").Bind(2, domain_).Run();
        meta.Bind(1, "kind").Bind(2, KindName(kind_)).Run();
        meta.Bind(1, "count").Bind(2, std::to_string(count_)).Run();
        meta.Bind(1, "fetched").Bind(2, std::to_string(time(nullptr))).Run();
        meta.Bind(1, "source").Bind(2, CleanText(source)).Run();
        meta.Bind(1, "controller").Bind(2, CleanText(controller)).Run();
    }
    database_->Execute("COMMIT");
    database_.reset();
    if (fsync(file_.get()) != 0) {
        Fail("cannot write " + path_);
    }
    const std::string path = ListPath(kind_, domain_);
    if (const std::error_code error = RenameFile(path_, path)) {
        throw std::system_error(error, "cannot write " + path);
    }
    path_.clear();
    file_.Reset();
    if (!LinkList(kind_, domain_)) {
        Fail("cannot write " + ListLinkPath(kind_, domain_));
    }
    return true;
}

void RemoveUnfinishedLists(EntryKind kind) {
    const std::string beginning = std::string(".") + KindName(kind) + "_";
    std::error_code error;
    std::vector<std::string> names;
    std::filesystem::directory_iterator files(Path(kDirectoryData), error);
    for (; !error && files != std::filesystem::directory_iterator(); files.increment(error)) {
        names.push_back(files->path().filename().string());
    }
    for (const std::string& name : names) {
        if (StartsWith(name, beginning)) {
            unlink((Path(kDirectoryData) + "/" + name).c_str());
        }
    }
}

bool LinkList(EntryKind kind, std::string_view domain) {
    const std::string path = ListPath(kind, domain);
    const std::string link = ListLinkPath(kind, domain);
    struct stat list {};
    struct stat present {};
    if (lstat(path.c_str(), &list) != 0) {
        return errno == ENOENT;
    }
    if (lstat(link.c_str(), &present) == 0 && present.st_dev == list.st_dev && present.st_ino == list.st_ino) {
        return true;
    }
    // A link can't take the place of another; a second one with a free name, renamed, can.
    const std::string beside = FolderOf(link) + "/." + NameOf(link) + ".new";
    if (unlink(beside.c_str()) != 0 && errno != ENOENT) {
        return false;
    }
    if (::link(path.c_str(), beside.c_str()) != 0) {
        return errno == ENOENT;  // removed meanwhile
    }
    if (rename(beside.c_str(), link.c_str()) != 0) {
        const int reason = errno;
        unlink(beside.c_str());
        errno = reason;
        return false;
    }
    unlink(beside.c_str());  // there still when both were the same file already
    if (const std::error_code error = SyncFolder(FolderOf(link))) {
        errno = error.value();
        return false;
    }
    return true;
}

}  // namespace appliance
