#include "appliance/httpd/page.h"

#include <dirent.h>
#include <fcntl.h>
#include <openssl/sha.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <utility>
#include <vector>

#include "appliance/base/file.h"
#include "appliance/base/log.h"
#include "appliance/base/text.h"
#include "appliance/httpd/header_rules.h"

namespace appliance {
namespace {

constexpr std::size_t kMostFiles = 2000;
constexpr std::size_t kMostBytes = std::size_t{64} << 20;
constexpr int kDeepest = 4;
constexpr std::string_view kLastingFolder = "/assets/";
constexpr std::size_t kTagBytes = 12;  // of the content's SHA-256

bool EndsWith(std::string_view text, std::string_view end) {
    return text.size() > end.size() && text.substr(text.size() - end.size()) == end;
}

bool IsPlainName(std::string_view name) {
    return !name.empty() && name.front() != '.' && std::all_of(name.begin(), name.end(), [](char letter) {
        return (letter >= '0' && letter <= '9') || (letter >= 'A' && letter <= 'Z') ||
               (letter >= 'a' && letter <= 'z') || letter == '-' || letter == '_' || letter == '.';
    });
}

std::string_view TypeOf(std::string_view path) {
    static constexpr std::array<std::pair<std::string_view, std::string_view>, 13> kTypes{{
        {".html", "text/html; charset=utf-8"},
        {".js", "text/javascript; charset=utf-8"},
        {".css", "text/css; charset=utf-8"},
        {".json", "application/json"},
        {".webmanifest", "application/manifest+json"},
        {".svg", "image/svg+xml"},
        {".png", "image/png"},
        {".jpg", "image/jpeg"},
        {".webp", "image/webp"},
        {".ico", "image/x-icon"},
        {".woff2", "font/woff2"},
        {".woff", "font/woff"},
        {".txt", "text/plain; charset=utf-8"},
    }};
    for (const auto& [end, type] : kTypes) {
        if (EndsWith(path, end)) {
            return type;
        }
    }
    return "application/octet-stream";
}

// Reads a regular file of at most `limit` bytes. False, with errno.
bool ReadWhole(int folder, const char* name, std::size_t limit, std::string& content) {
    const FileDescriptor file(openat(folder, name, O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NOCTTY | O_NONBLOCK));
    struct stat found {};
    if (!file || fstat(file.get(), &found) != 0) {
        return false;
    }
    if (!S_ISREG(found.st_mode) || static_cast<std::size_t>(found.st_size) > limit) {
        errno = S_ISREG(found.st_mode) ? EFBIG : EINVAL;
        return false;
    }
    content.resize(static_cast<std::size_t>(found.st_size));
    std::size_t place = 0;
    while (place < content.size()) {
        const ssize_t got = read(file.get(), content.data() + place, content.size() - place);
        if (got < 0 && errno != EINTR) {
            return false;
        }
        if (got == 0) {
            break;
        }
        place += got > 0 ? static_cast<std::size_t>(got) : 0;
    }
    content.resize(place);
    return true;
}

std::string TagOf(std::string_view content, std::string_view form) {
    std::array<unsigned char, SHA256_DIGEST_LENGTH> digest{};
    SHA256(static_cast<const unsigned char*>(static_cast<const void*>(content.data())), content.size(), digest.data());
    constexpr std::string_view kDigits = "0123456789abcdef";
    std::string tag = "\"";
    for (std::size_t index = 0; index < kTagBytes; ++index) {
        tag += kDigits[digest[index] >> 4U];
        tag += kDigits[digest[index] & 0xFU];
    }
    tag += form;
    tag += '"';
    return tag;
}

}  // namespace

Page::Page(const std::string& folder) {
    const FileDescriptor root(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    if (!root) {
        Log(LOG_WARNING, "the page's folder " + folder + " can't be opened: " + std::strerror(errno));
        return;
    }
    TakeFolder(root.get(), "/", 0);
    if (files_.count("/index.html") == 0) {
        Log(LOG_WARNING, "the page's folder " + folder + " has no index.html");
    }
}

void Page::TakeFolder(int folder, const std::string& path, int depth) {
    FileDescriptor own(dup(folder));
    DIR* opened = own ? fdopendir(own.get()) : nullptr;
    if (opened == nullptr) {
        Log(LOG_WARNING, "the page's folder " + path + " can't be read: " + std::strerror(errno));
        return;
    }
    own.Release();
    std::vector<std::string> folders;
    std::vector<std::string> files;
    while (const dirent* entry = readdir(opened)) {
        struct stat found {};
        if (!IsPlainName(entry->d_name) || fstatat(folder, entry->d_name, &found, AT_SYMLINK_NOFOLLOW) != 0) {
            continue;
        }
        if (S_ISDIR(found.st_mode)) {
            folders.emplace_back(entry->d_name);
        } else if (S_ISREG(found.st_mode)) {
            files.emplace_back(entry->d_name);
        }
    }
    closedir(opened);
    // Files before their other forms, which have longer names.
    std::sort(files.begin(), files.end());
    for (const std::string& name : files) {
        TakeFile(folder, path, name);
    }
    for (const std::string& name : folders) {
        const FileDescriptor inner(openat(folder, name.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC | O_NOFOLLOW));
        if (depth < kDeepest && inner) {
            TakeFolder(inner.get(), path + name + "/", depth + 1);
        } else {
            Log(LOG_WARNING, "the page's folder " + path + name + " is left out");
        }
    }
}

void Page::TakeFile(int folder, const std::string& path, const std::string& name) {
    std::string content;
    errno = EMFILE;
    if (files_.size() >= kMostFiles || !ReadWhole(folder, name.c_str(), kMostBytes - bytes_, content)) {
        Log(LOG_WARNING, "the page's file " + path + name + " is left out: " + std::strerror(errno));
        return;
    }
    bytes_ += content.size();
    for (const std::string_view form : {".br", ".gz"}) {
        if (!EndsWith(name, form)) {
            continue;
        }
        const auto base = files_.find(path + name.substr(0, name.size() - form.size()));
        if (base != files_.end()) {
            Form& place = form == ".br" ? base->second.brotli : base->second.gzip;
            place.tag = TagOf(content, form == ".br" ? "-br" : "-gz");
            place.content = std::move(content);
            place.isThere = true;
            return;
        }
    }
    Entry entry;
    entry.type = TypeOf(name);
    entry.isLasting = StartsWith(path, kLastingFolder);
    entry.plain.tag = TagOf(content, "");
    entry.plain.content = std::move(content);
    files_.emplace(path + name, std::move(entry));
}

std::unique_ptr<DoorReply> Page::Find(std::string_view path, const boost::beast::http::fields& header) const {
    const auto found = files_.find(path == "/" ? std::string_view("/index.html") : path);
    if (found == files_.end()) {
        return nullptr;
    }
    const Entry& entry = found->second;
    const Encodings accepted = AcceptedEncodings(header);
    const Form* form = &entry.plain;
    auto reply = std::make_unique<DoorReply>();
    if (accepted.brotli && entry.brotli.isThere) {
        form = &entry.brotli;
        reply->fields.emplace_back("Content-Encoding", "br");
    } else if (accepted.gzip && entry.gzip.isThere) {
        form = &entry.gzip;
        reply->fields.emplace_back("Content-Encoding", "gzip");
    }
    reply->fields.emplace_back("ETag", form->tag);
    reply->fields.emplace_back("Cache-Control", entry.isLasting ? "public, max-age=31536000, immutable" : "no-cache");
    if (entry.brotli.isThere || entry.gzip.isThere) {
        reply->fields.emplace_back("Vary", "Accept-Encoding");
    }
    if (NamesTag(header, form->tag)) {
        reply->status = 304;
    } else {
        reply->type = entry.type;
        reply->file = form->content;
    }
    return reply;
}

}  // namespace appliance
