#include "appliance/base/kept_copy.h"

#include <charconv>
#include <cstddef>

#include "appliance/base/file.h"

namespace appliance {

namespace {

constexpr std::size_t kLargestFile = std::size_t{4} << 20;
constexpr std::size_t kLargestCopy = 2 * kLargestFile + 64;
constexpr char kKept[] = "kept";
constexpr char kMissing[] = "missing";

// "kept SIZE\n" or "missing 0\n", the bytes of the one, then the bytes of the other: whatever stands in the file, it
// comes back as it was.
std::string Format(const KeptCopy& copy) {
    const std::string before = copy.before.value_or("");
    return std::string(copy.before ? kKept : kMissing) + " " + std::to_string(before.size()) + "\n" + before +
           copy.after;
}

std::optional<KeptCopy> Parse(const std::string& text) {
    const std::size_t end = text.find('\n');
    const std::size_t blank = text.find(' ');
    if (end == std::string::npos || blank > end) {
        return std::nullopt;
    }
    std::size_t size = 0;
    const auto [rest, error] = std::from_chars(text.data() + blank + 1, text.data() + end, size);
    const std::string word = text.substr(0, blank);
    if (error != std::errc() || rest != text.data() + end || size > text.size() - end - 1 ||
        (word != kKept && word != kMissing)) {
        return std::nullopt;
    }
    KeptCopy copy;
    if (word == kKept) {
        copy.before = text.substr(end + 1, size);
    }
    copy.after = text.substr(end + 1 + size);
    return copy;
}

std::error_code Read(const std::string& path, Content& content, std::size_t limit) {
    std::string text;
    const std::error_code error = ReadFile(path, text, limit);
    if (error == std::errc::no_such_file_or_directory) {
        content.reset();
        return {};
    }
    content = std::move(text);
    return error;
}

}  // namespace

std::error_code ReadContent(const std::string& path, Content& content) {
    return Read(path, content, kLargestFile);
}

std::error_code WriteKeptCopy(const std::string& path, const KeptCopy& copy) {
    if (const std::error_code error = MakeFolder(FolderOf(path), 0700)) {
        return error;
    }
    return ReplaceFile(path, Format(copy), 0600);
}

std::optional<KeptCopy> ReadKeptCopy(const std::string& path) {
    Content text;
    return Read(path, text, kLargestCopy) || !text ? std::nullopt : Parse(*text);
}

}  // namespace appliance
