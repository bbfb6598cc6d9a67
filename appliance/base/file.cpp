#include "appliance/base/file.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <string>
#include <vector>

#include "appliance/base/log.h"

namespace appliance {

namespace {

constexpr std::string_view kTemporaryMark = ".vorn-";
constexpr std::size_t kTemporaryLetters = 6;
constexpr int kMostLinks = 40;

std::error_code Errno() {
    return {errno, std::generic_category()};
}

std::error_code Failure(std::errc code) {
    return std::make_error_code(code);
}

// Removes a temporary file that did not come to its rename.
class TemporaryFile {
public:
    explicit TemporaryFile(std::string name) : name_(std::move(name)) {}
    ~TemporaryFile() {
        if (!name_.empty()) {
            unlink(name_.c_str());
        }
    }
    TemporaryFile(const TemporaryFile&) = delete;
    TemporaryFile& operator=(const TemporaryFile&) = delete;
    void Keep() {
        name_.clear();
    }

private:
    std::string name_;
};

// One attribute after the other; their names and values are as long as the kernel says.
std::error_code CopyExtendedAttributes(const std::string& path, int descriptor) {
    const ssize_t length = listxattr(path.c_str(), nullptr, 0);
    if (length < 0) {
        return errno == ENOTSUP ? std::error_code() : Errno();
    }
    std::vector<char> names(static_cast<std::size_t>(length) + 1);
    const ssize_t listed = listxattr(path.c_str(), names.data(), names.size() - 1);
    if (listed < 0) {
        return Errno();
    }
    const char* end = names.data() + listed;
    for (const char* name = names.data(); name < end; name += std::char_traits<char>::length(name) + 1) {
        const ssize_t size = getxattr(path.c_str(), name, nullptr, 0);
        std::vector<char> value(size < 0 ? 0 : static_cast<std::size_t>(size) + 1);
        const ssize_t got = size < 0 ? -1 : getxattr(path.c_str(), name, value.data(), value.size());
        if (got < 0) {
            return Errno();
        }
        if (fsetxattr(descriptor, name, value.data(), static_cast<std::size_t>(got), 0) != 0) {
            return Errno();
        }
    }
    return {};
}

std::error_code MakeFolders(const std::string& path) {
    if (path.empty() || mkdir(path.c_str(), 0755) == 0) {
        return {};
    }
    if (errno == ENOENT) {
        const std::string parent = FolderOf(path);
        if (parent == path) {
            return Errno();
        }
        if (const std::error_code error = MakeFolders(parent)) {
            return error;
        }
        if (mkdir(path.c_str(), 0755) == 0) {
            return {};
        }
    }
    return errno == EEXIST ? std::error_code() : Errno();
}

}  // namespace

void FileDescriptor::Reset(int descriptor) {
    if (descriptor_ >= 0) {
        const int before = errno;
        close(descriptor_);
        errno = before;
    }
    descriptor_ = descriptor;
}

std::error_code ReadFile(const std::string& path, std::string& content, std::size_t limit) {
    const FileDescriptor file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY | O_NONBLOCK));
    struct stat found = {};
    if (!file || fstat(file.get(), &found) != 0) {
        return Errno();
    }
    if (!S_ISREG(found.st_mode)) {
        return Failure(S_ISDIR(found.st_mode) ? std::errc::is_a_directory : std::errc::invalid_argument);
    }
    if (static_cast<std::size_t>(found.st_size) > limit) {
        return Failure(std::errc::file_too_large);
    }
    // One byte more than it should have, so that the end shows without another look.
    std::string text(static_cast<std::size_t>(found.st_size) + 1, '\0');
    std::size_t length = 0;
    for (;;) {
        const ssize_t got = read(file.get(), &text[length], text.size() - length);
        if (got < 0 && errno == EINTR) {
            continue;
        }
        if (got < 0) {
            return Errno();
        }
        if (got == 0) {
            break;
        }
        length += static_cast<std::size_t>(got);
        if (length > limit) {
            return Failure(std::errc::file_too_large);
        }
        if (length == text.size()) {
            text.resize(2 * length);
        }
    }
    text.resize(length);
    content = std::move(text);
    return {};
}

std::error_code WriteAll(int descriptor, std::string_view content) {
    while (!content.empty()) {
        const ssize_t written = write(descriptor, content.data(), content.size());
        if (written < 0 && errno == EINTR) {
            continue;
        }
        if (written < 0) {
            return Errno();
        }
        content.remove_prefix(static_cast<std::size_t>(written));
    }
    return {};
}

FileDescriptor MakeTemporary(const std::string& path, std::string& name) {
    const std::string folder = FolderOf(path);
    const std::string form = (folder == "/" ? "" : folder) + "/." + NameOf(path) + std::string(kTemporaryMark) +
                             std::string(kTemporaryLetters, 'X');
    for (;;) {
        name = form;
        FileDescriptor made(mkostemp(name.data(), O_CLOEXEC));
        struct stat found = {};
        const bool taken = made && flock(made.get(), LOCK_EX | LOCK_NB) != 0 && errno == EWOULDBLOCK;
        // Between the two calls it looks like one that was left behind, and may have been removed as that.
        if (!taken && (!made || fstat(made.get(), &found) != 0 || found.st_nlink > 0)) {
            return made;
        }
    }
}

std::string TemporaryTarget(const std::string& name) {
    const std::string last = NameOf(name);
    const std::size_t tail = kTemporaryMark.size() + kTemporaryLetters;
    if (last.size() < tail + 2 || last.front() != '.') {
        return {};
    }
    const std::size_t mark = last.size() - tail;
    const auto isLetter = [](char letter) { return std::isalnum(static_cast<unsigned char>(letter)) != 0; };
    if (last.compare(mark, kTemporaryMark.size(), kTemporaryMark) != 0 ||
        !std::all_of(last.end() - kTemporaryLetters, last.end(), isLetter)) {
        return {};
    }
    return name.substr(0, name.size() - last.size()) + last.substr(1, mark - 1);
}

std::error_code FollowLinks(const std::string& path, std::string& target) {
    target = path;
    for (int links = 0; links < kMostLinks; ++links) {
        struct stat found = {};
        if (lstat(target.c_str(), &found) != 0) {
            return errno == ENOENT ? std::error_code() : Errno();
        }
        if (!S_ISLNK(found.st_mode)) {
            return {};
        }
        std::string next(PATH_MAX, '\0');
        const ssize_t length = readlink(target.c_str(), next.data(), next.size());
        if (length < 0) {
            return Errno();
        }
        next.resize(static_cast<std::size_t>(length));
        target = next.empty() || next.front() != '/' ? FolderOf(target) + "/" + next : next;
    }
    return Failure(std::errc::too_many_symbolic_link_levels);
}

std::error_code CopyAttributes(const std::string& path, int descriptor) {
    struct stat old = {};
    if (stat(path.c_str(), &old) != 0) {
        return Errno();
    }
    if (!S_ISREG(old.st_mode)) {
        return Failure(S_ISDIR(old.st_mode) ? std::errc::is_a_directory : std::errc::invalid_argument);
    }
    // The owner first, which clears bits of the mode; the mode again after the attributes, one of which may be an ACL.
    if (fchown(descriptor, old.st_uid, old.st_gid) != 0 || fchmod(descriptor, old.st_mode & 07777) != 0) {
        return Errno();
    }
    return CopyExtendedAttributes(path, descriptor);
}

std::error_code SyncFolder(const std::string& folder) {
    const FileDescriptor opened(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    if (!opened || (fsync(opened.get()) != 0 && errno != EINVAL)) {
        return Errno();
    }
    return {};
}

std::error_code ReplaceFile(const std::string& path, std::string_view content, mode_t mode) {
    return ReplaceFileLike(path, content, path, mode);
}

std::error_code ReplaceFileLike(const std::string& path, std::string_view content, const std::string& model,
                                mode_t mode) {
    std::string target;
    if (const std::error_code error = FollowLinks(path, target)) {
        return error;
    }
    if (NameOf(target).empty()) {
        return Failure(target.empty() ? std::errc::no_such_file_or_directory : std::errc::is_a_directory);
    }
    std::string name;
    const FileDescriptor file = MakeTemporary(target, name);
    if (!file) {
        return Errno();
    }
    TemporaryFile temporary(name);
    std::error_code error = CopyAttributes(model, file.get());
    if (error == std::errc::no_such_file_or_directory) {
        error = fchmod(file.get(), mode) == 0 ? std::error_code() : Errno();
    }
    if (!error) {
        error = WriteAll(file.get(), content);
    }
    if (error) {
        return error;
    }
    if (fsync(file.get()) != 0 || rename(name.c_str(), target.c_str()) != 0) {
        return Errno();
    }
    temporary.Keep();
    return SyncFolder(FolderOf(target));
}

std::error_code RenameFile(const std::string& from, const std::string& to) {
    if (rename(from.c_str(), to.c_str()) != 0) {
        return Errno();
    }
    return SyncFolder(FolderOf(to));
}

std::error_code RemoveFile(const std::string& path) {
    if (unlink(path.c_str()) != 0) {
        return errno == ENOENT ? std::error_code() : Errno();
    }
    return SyncFolder(FolderOf(path));
}

std::error_code MakeFolder(const std::string& path, mode_t mode) {
    std::string folder = path;
    while (folder.size() > 1 && folder.back() == '/') {
        folder.pop_back();
    }
    if (folder.empty()) {
        return Failure(std::errc::no_such_file_or_directory);
    }
    if (folder != "/") {
        if (const std::error_code error = MakeFolders(FolderOf(folder))) {
            return error;
        }
    }
    if (mkdir(folder.c_str(), mode) != 0 && errno != EEXIST) {
        return Errno();
    }
    const FileDescriptor opened(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    struct stat found = {};
    if (!opened || fstat(opened.get(), &found) != 0 ||
        ((found.st_mode & 07777) != mode && fchmod(opened.get(), mode) != 0)) {
        return Errno();
    }
    return {};
}

bool ClearForeign(const std::string& path) {
    struct stat found = {};
    struct stat folder = {};
    if (lstat(path.c_str(), &found) != 0) {
        return errno == ENOENT;  // another program of the appliance has removed it
    }
    if (found.st_uid == geteuid() || stat(FolderOf(path).c_str(), &folder) != 0 || (folder.st_mode & S_ISVTX) == 0) {
        return false;
    }
    if (S_ISDIR(found.st_mode)) {
        std::string aside = path + ".foreign-XXXXXX";
        if (mkdtemp(aside.data()) == nullptr || rename(path.c_str(), aside.c_str()) != 0) {
            rmdir(aside.c_str());
            return false;
        }
    } else if (unlink(path.c_str()) != 0) {
        return false;
    }
    Log(LOG_WARNING, path + " was in the way, of user " + std::to_string(found.st_uid) + ", and has been removed");
    return true;
}

int RemoveStaleTemporaries(const std::string& folder) {
    struct Close {
        void operator()(DIR* opened) const {
            closedir(opened);
        }
    };
    const std::unique_ptr<DIR, Close> opened(opendir(folder.c_str()));
    if (!opened) {
        return 0;
    }
    int removed = 0;
    while (const dirent* entry = readdir(opened.get())) {
        if (TemporaryTarget(entry->d_name).empty()) {
            continue;
        }
        const FileDescriptor file(
            openat(dirfd(opened.get()), entry->d_name, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
        struct stat found = {};
        if (file && fstat(file.get(), &found) == 0 && S_ISREG(found.st_mode) && found.st_uid == geteuid() &&
            flock(file.get(), LOCK_EX | LOCK_NB) == 0 && unlinkat(dirfd(opened.get()), entry->d_name, 0) == 0) {
            ++removed;
        }
    }
    return removed;
}

std::string FolderOf(const std::string& path) {
    const std::size_t slash = path.rfind('/');
    if (slash == std::string::npos) {
        return ".";
    }
    return slash == 0 ? "/" : path.substr(0, slash);
}

std::string NameOf(const std::string& path) {
    return path.substr(path.rfind('/') + 1);
}

}  // namespace appliance
