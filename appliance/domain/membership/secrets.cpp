#include "appliance/domain/membership/secrets.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <tdb.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstdlib>
#include <cstring>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <system_error>
#include <thread>

#include "appliance/base/file.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/text.h"

namespace appliance {

namespace {

constexpr mode_t kMode = 0600;
constexpr char kDamaged[] = ".damaged";
constexpr std::chrono::milliseconds kLockWait{3000};
constexpr std::chrono::milliseconds kLockPause{10};

// The database library opens a file once in a process and keeps its list of open ones without a lock, so one caller at a
// time. A mutex is not enough: the server, the platform's library and a module have this code, and so the mutex, each
// for itself. They share a byte of a file, the one at the number of their process: other processes are not in the way.
class OneAtATime {
public:
    OneAtATime() : guard_(Mutex()) {
        // Without it, on a file system that takes no file, callers of the same library still wait for each other.
        static_cast<void>(MakeFolder(Path(kRun), 0755));
        file_ = FileDescriptor(open(Path(kSecretsLock).c_str(), O_RDWR | O_CREAT | O_CLOEXEC, kMode));
        while (file_.get() >= 0 && Change(F_OFD_SETLKW, F_WRLCK) != 0 && errno == EINTR) {
        }
    }
    ~OneAtATime() {
        // Not by closing alone: a child that was forked meanwhile has the file open, too.
        static_cast<void>(Change(F_OFD_SETLK, F_UNLCK));
    }
    OneAtATime(const OneAtATime&) = delete;
    OneAtATime& operator=(const OneAtATime&) = delete;

private:
    static std::mutex& Mutex() {
        static std::mutex mutex;
        return mutex;
    }
    int Change(int command, short type) const {
        struct flock byte {};
        byte.l_type = type;
        byte.l_whence = SEEK_SET;
        byte.l_start = getpid();
        byte.l_len = 1;
        return fcntl(file_.get(), command, &byte);
    }

    std::lock_guard<std::mutex> guard_;
    FileDescriptor file_;
};

struct CloseTdb {
    void operator()(tdb_context* context) const {
        tdb_close(context);
    }
};
using Tdb = std::unique_ptr<tdb_context, CloseTdb>;

// Bytes that are wiped when they go.
class Bytes {
public:
    explicit Bytes(TDB_DATA data) : text_(reinterpret_cast<const char*>(data.dptr), data.dsize) {}
    ~Bytes() {
        explicit_bzero(text_.data(), text_.size());
    }
    Bytes(const Bytes&) = delete;
    Bytes& operator=(const Bytes&) = delete;

    TDB_DATA data() {
        return {reinterpret_cast<unsigned char*>(text_.data()), text_.size()};
    }

private:
    std::string text_;
};
using Records = std::map<std::string, std::unique_ptr<Bytes>>;

TDB_DATA KeyOf(std::string& key) {
    return {reinterpret_cast<unsigned char*>(key.data()), key.size()};
}

[[noreturn]] void Throw(const std::string& path, int error) {
    throw std::system_error(error != 0 ? error : EIO, std::generic_category(), path);
}

Tdb Open(const std::string& path, int openFlags) {
    // A database whose last writer was killed in a transaction is only put right by one who may write it.
    return Tdb(tdb_open(path.c_str(), 0, TDB_DEFAULT, openFlags | O_CLOEXEC, kMode));
}

Tdb OpenForReading(const std::string& path) {
    Tdb tdb = Open(path, O_RDONLY);
    if (!tdb && errno != ENOENT) {
        tdb = Open(path, O_RDWR);
    }
    return tdb;
}

std::string PasswordKey(const std::string& domain) {
    return "SECRETS/MACHINE_PASSWORD/" + Upper(domain);
}

// Tries until it succeeds or the wait is over. What stands in the way is held by other programs for moments.
template <typename Attempt>
bool WithinWait(const Attempt& attempt) {
    const auto end = std::chrono::steady_clock::now() + kLockWait;
    while (!attempt()) {
        if (std::chrono::steady_clock::now() >= end) {
            return false;
        }
        std::this_thread::sleep_for(kLockPause);
    }
    return true;
}

int CollectRecord(tdb_context* /*tdb*/, TDB_DATA key, TDB_DATA value, void* records) {
    std::string name(reinterpret_cast<const char*>(key.dptr), key.dsize);
    (*static_cast<Records*>(records))[name] = std::make_unique<Bytes>(value);
    return 0;
}

// The disk gives the file's bytes, and they are no database: nobody can make anything of them any more.
bool IsDamaged(const std::string& path, tdb_context* tdb) {
    std::string bytes;
    const bool readable = !ReadFile(path, bytes);
    explicit_bzero(bytes.data(), bytes.size());
    return readable && (tdb == nullptr || tdb_check(tdb, nullptr, nullptr) != 0);
}

// Did opening fail for what the file holds, and not for a want of rights, room or descriptors?
bool IsNoDatabase(const std::string& path, int error) {
    return error == EIO && IsDamaged(path, nullptr);
}

Records ReadAll(const std::string& path) {
    Records records;
    Tdb tdb = Open(path, O_RDWR);
    if (!tdb) {
        const int error = errno;
        if (IsNoDatabase(path, error)) {
            Log(LOG_WARNING, path + ": damaged, so that it holds no secrets");
        } else if (error != ENOENT) {
            Throw(path, error);
        }
        return records;
    }
    if (!WithinWait([&] { return tdb_lockall_read_nonblock(tdb.get()) == 0; })) {
        Throw(path, EAGAIN);
    }
    const int count = tdb_traverse_read(tdb.get(), CollectRecord, &records);
    tdb_unlockall_read(tdb.get());
    if (count < 0) {
        if (!IsDamaged(path, tdb.get())) {
            Throw(path, EIO);
        }
        Log(LOG_WARNING, path + ": damaged, so that it holds no secrets");
        records.clear();
    }
    return records;
}

// A damaged database, which counts as missing from here on.
void SetAside(const std::string& path) {
    const std::string aside = path + kDamaged;
    if (const std::error_code error = RenameFile(path, aside)) {
        throw std::system_error(error, path);
    }
    Log(LOG_WARNING, path + ": damaged; kept as " + aside);
}

bool EndsWith(std::string_view text, const std::string& ending) {
    return text.size() >= ending.size() && text.substr(text.size() - ending.size()) == ending;
}

bool Owns(const SecretsOwner& owner, const std::string& recordKey) {
    // Some programs store keys with their NUL.
    const std::string key = Upper(recordKey.substr(0, recordKey.find('\0')));
    if (!owner.machine.empty() && key == "SECRETS/SID/" + Upper(owner.machine)) {
        return false;
    }
    return (!owner.domain.empty() && EndsWith(key, "/" + Upper(owner.domain))) ||
           (!owner.realm.empty() && EndsWith(key, "/" + Upper(owner.realm)));
}

bool OwnedByAny(const std::vector<SecretsOwner>& owners, const std::string& key) {
    for (const SecretsOwner& owner : owners) {
        if (Owns(owner, key)) {
            return true;
        }
    }
    return false;
}

std::optional<std::string> StoredPassword(const std::string& path, const std::string& domain) {
    const Tdb tdb = OpenForReading(path);
    if (!tdb) {
        return std::nullopt;
    }
    std::string key = PasswordKey(domain);
    const TDB_DATA value = tdb_fetch(tdb.get(), KeyOf(key));
    if (value.dptr == nullptr) {
        return std::nullopt;
    }
    std::string text(reinterpret_cast<const char*>(value.dptr), value.dsize);
    explicit_bzero(value.dptr, value.dsize);
    std::free(value.dptr);
    return text;
}

// A database leaves the bytes of what is removed where they were, and a transaction keeps a copy of what it changes. So
// values go in place, before the transaction that removes their records: the account's password is good until somebody
// removes the account. A value that can't be overwritten is removed all the same.
void Overwrite(tdb_context* tdb, const std::vector<SecretsOwner>& owners) {
    Records present;
    if (tdb_traverse_read(tdb, CollectRecord, &present) < 0) {
        return;
    }
    for (auto& [name, bytes] : present) {
        std::string key = name;
        if (OwnedByAny(owners, key)) {
            const TDB_DATA value = bytes->data();
            explicit_bzero(value.dptr, value.dsize);
            if (WithinWait([&] { return tdb_chainlock_nonblock(tdb, KeyOf(key)) == 0; })) {
                static_cast<void>(tdb_store(tdb, KeyOf(key), value, TDB_MODIFY));
                tdb_chainunlock(tdb, KeyOf(key));
            }
        }
    }
}

}  // namespace

bool HasMachineSecret(const std::string& path, const std::string& domain) {
    const OneAtATime only;
    const Tdb tdb = OpenForReading(path);
    if (!tdb) {
        return false;
    }
    std::string key = PasswordKey(domain);
    return tdb_exists(tdb.get(), KeyOf(key)) == 1;
}

void CopySecrets(const std::string& from, const std::string& to) {
    const OneAtATime only;
    const Records records = ReadAll(from);
    const std::string temporary = to + ".new";
    if (unlink(temporary.c_str()) != 0 && errno != ENOENT) {
        Throw(temporary, errno);
    }
    {
        Tdb tdb = Open(temporary, O_RDWR | O_CREAT | O_EXCL);
        if (!tdb || tdb_transaction_start(tdb.get()) != 0) {
            Throw(temporary, errno);
        }
        for (const auto& [name, bytes] : records) {
            std::string key = name;
            if (tdb_store(tdb.get(), KeyOf(key), bytes->data(), TDB_REPLACE) != 0) {
                Throw(temporary, errno);
            }
        }
        if (tdb_transaction_commit(tdb.get()) != 0) {
            Throw(temporary, errno);
        }
    }
    if (const std::error_code error = RenameFile(temporary, to)) {
        unlink(temporary.c_str());
        throw std::system_error(error, to);
    }
}

namespace {

// Changes the records in one transaction. False, with errno, when the database takes it or gives them not.
bool ChangeRecords(tdb_context* tdb, const Records& wanted, const std::vector<SecretsOwner>& owners) {
    errno = 0;
    if (!WithinWait([&] { return tdb_transaction_start_nonblock(tdb) == 0; })) {
        errno = EAGAIN;
        return false;
    }
    Records present;
    bool good = tdb_traverse_read(tdb, CollectRecord, &present) >= 0;
    for (auto record = present.begin(); good && record != present.end(); ++record) {
        std::string key = record->first;
        if (OwnedByAny(owners, key)) {
            good = tdb_delete(tdb, KeyOf(key)) == 0;
        }
    }
    for (auto record = wanted.begin(); good && record != wanted.end(); ++record) {
        std::string key = record->first;
        if (OwnedByAny(owners, key)) {
            good = tdb_store(tdb, KeyOf(key), record->second->data(), TDB_REPLACE) == 0;
        }
    }
    if (good) {
        return tdb_transaction_commit(tdb) == 0;
    }
    const int error = errno;
    tdb_transaction_cancel(tdb);
    errno = error;
    return false;
}

}  // namespace

void ReplaceSecrets(const std::string& path, const std::string& source, const std::vector<SecretsOwner>& owners) {
    const OneAtATime only;
    const bool removes = source.empty();
    const Records wanted = removes ? Records() : ReadAll(source);
    for (bool again = false;; again = true) {
        // With O_CREAT, the library would make a damaged one anew.
        Tdb tdb = Open(path, O_RDWR);
        if (!tdb && errno == ENOENT) {
            if (removes) {
                return;
            }
            tdb = Open(path, O_RDWR | O_CREAT);
        }
        if (tdb && removes) {
            Overwrite(tdb.get(), owners);
        }
        if (tdb && ChangeRecords(tdb.get(), wanted, owners)) {
            return;
        }
        const int error = errno;
        if (again || !(tdb ? error != EAGAIN && IsDamaged(path, tdb.get()) : IsNoDatabase(path, error))) {
            Throw(path, error);
        }
        SetAside(path);
    }
}

void KeepDamagedSecrets(const std::string& path) {
    const OneAtATime only;
    const Tdb tdb = Open(path, O_RDWR);
    if (tdb || !IsNoDatabase(path, errno)) {
        return;
    }
    try {
        SetAside(path);
    } catch (const std::system_error& error) {
        Log(LOG_ERR, error.what());
    }
}

bool SameMachineSecret(const std::string& first, const std::string& second, const std::string& domain) {
    const OneAtATime only;
    std::optional<std::string> one = StoredPassword(first, domain);
    std::optional<std::string> other = StoredPassword(second, domain);
    const bool same = one == other;
    for (std::optional<std::string>* text : {&one, &other}) {
        if (text->has_value()) {
            explicit_bzero((*text)->data(), (*text)->size());
        }
    }
    return same;
}

}  // namespace appliance
