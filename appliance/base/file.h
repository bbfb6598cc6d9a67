// Files and descriptors. A failure is a std::error_code of the generic category (errno); none of these throws it.

#ifndef VORN_APPLIANCE_BASE_FILE_H
#define VORN_APPLIANCE_BASE_FILE_H

#include <sys/types.h>

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <system_error>

namespace appliance {

// Owns a file descriptor; -1 is none.
class FileDescriptor {
public:
    FileDescriptor() = default;
    explicit FileDescriptor(int descriptor) : descriptor_(descriptor) {}
    ~FileDescriptor() {
        Reset();
    }
    FileDescriptor(FileDescriptor&& other) noexcept : descriptor_(other.Release()) {}
    FileDescriptor& operator=(FileDescriptor&& other) noexcept {
        if (this != &other) {
            Reset(other.Release());
        }
        return *this;
    }
    FileDescriptor(const FileDescriptor&) = delete;
    FileDescriptor& operator=(const FileDescriptor&) = delete;

    explicit operator bool() const {
        return descriptor_ >= 0;
    }
    int get() const {
        return descriptor_;
    }
    int Release() {
        const int descriptor = descriptor_;
        descriptor_ = -1;
        return descriptor;
    }
    void Reset(int descriptor = -1);

private:
    int descriptor_ = -1;
};

// Reads a regular file of at most `limit` bytes into `content` (EFBIG beyond it). A missing file is ENOENT.
std::error_code ReadFile(const std::string& path, std::string& content, std::size_t limit = std::size_t{64} << 20);

// Gives the file this content in one step, so that every reader sees the old content or the new one: writes beside the
// target (mkostemp; mode and owner of the old file, or `mode` and the caller for a new one), fsyncs, renames, fsyncs the
// folder. Keeps extended attributes of the old file. A symbolic link is followed, and its target replaced. On failure
// the old file stands and the temporary one is gone; only when the last step fails, the fsync of the folder, the new
// file stands, and a power cut may bring the old one back.
std::error_code ReplaceFile(const std::string& path, std::string_view content, mode_t mode = 0600);

// As ReplaceFile, but owner, mode and extended attributes are those of the file at `model`, when there is one.
std::error_code ReplaceFileLike(const std::string& path, std::string_view content, const std::string& model,
                                mode_t mode);

// Makes an empty file of the caller's own (0600) beside `path`, with a name that nobody else has: what ReplaceFile writes
// before it renames. The descriptor holds a lock on the file (flock), which tells RemoveStaleTemporaries that somebody
// still writes. None, with errno, when it can't be made. TemporaryTarget tells for which path such a name was made,
// also when that path is a symbolic link; it is empty for any other name.
FileDescriptor MakeTemporary(const std::string& path, std::string& name);
std::string TemporaryTarget(const std::string& name);

// The path that a symbolic link in the last name leads to in the end (which may not exist); any other path as it is.
std::error_code FollowLinks(const std::string& path, std::string& target);

// Gives an open file the owner, mode and extended attributes of the regular file at `path`. ENOENT when there is none.
std::error_code CopyAttributes(const std::string& path, int descriptor);

// Writes all of it.
std::error_code WriteAll(int descriptor, std::string_view content);

// Writes a folder's entries to the disk.
std::error_code SyncFolder(const std::string& folder);

// Renames within a file system and fsyncs the folder of the target.
std::error_code RenameFile(const std::string& from, const std::string& to);

// Removes a file; a missing one is no failure. Fsyncs the folder.
std::error_code RemoveFile(const std::string& path);

// Makes a folder with its parents. The last one gets `mode` also when it is there already.
std::error_code MakeFolder(const std::string& path, mode_t mode);

// In a folder where everybody may make files (a sticky one), what another user has put under the caller's name must not
// stand in its way: it goes, with a line in the log; a folder, which may hold something, under another name. True when it
// is worth to try again: it is gone.
bool ClearForeign(const std::string& path);

// Removes temporary files (".<name>.vorn-XXXXXX", as MakeTemporary makes them) that a killed writer left in `folder` and that
// nobody holds the lock of. Returns how many. One whose maker has closed its descriptor and means to go on with the name
// goes as well, so this is for a start, before such makers begin.
int RemoveStaleTemporaries(const std::string& folder);

// The folder of a path ("." without one) and its last name.
std::string FolderOf(const std::string& path);
std::string NameOf(const std::string& path);

}  // namespace appliance

#endif
