#include "appliance/vornd/module.h"

#include <dirent.h>
#include <dlfcn.h>
#include <fcntl.h>
#include <link.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstring>
#include <string_view>

#include "appliance/base/file.h"
#include "appliance/base/text.h"

namespace appliance {
namespace {

using ElfHeader = ElfW(Ehdr);
using ElfSegment = ElfW(Phdr);

constexpr const char* kTableSymbol = "_Z11GetAPITablev";  // const VORN::APIEntry* GetAPITable()
constexpr std::size_t kLongestTable = 1024;
constexpr std::size_t kLongestName = 128;

struct FreeText {
    void operator()(char* text) const {
        free(text);
    }
};

struct CloseFolder {
    void operator()(DIR* folder) const {
        closedir(folder);
    }
};

std::string Reason(const std::string& path, const std::string& what) {
    return "module " + path + " refused: " + what;
}

// Nobody but root may be able to replace what is about to run as root.
bool IsSafe(const std::string& path, std::string& what) {
    struct stat found {};
    if (stat(path.c_str(), &found) != 0) {
        what = std::strerror(errno);
        return false;
    }
    if (!S_ISREG(found.st_mode)) {
        what = "it is no regular file";
        return false;
    }
    std::string place = path;
    for (bool last = false;;) {
        // In a folder such as /tmp others may add files, but not replace those of root.
        const bool shared = S_ISDIR(found.st_mode) && (found.st_mode & S_ISVTX) != 0;
        if (found.st_uid != 0) {
            what = place + " does not belong to root";
            return false;
        }
        if ((found.st_mode & (S_IWGRP | S_IWOTH)) != 0 && !shared) {
            what = place + " is writable by others than root";
            return false;
        }
        if (last) {
            return true;
        }
        place = FolderOf(place);
        last = place == "/" || place == ".";
        if (stat(place.c_str(), &found) != 0) {
            what = place + ": " + std::strerror(errno);
            return false;
        }
    }
}

template <typename Value>
bool ReadAt(const FileDescriptor& file, std::size_t place, Value& value) {
    return pread(file.get(), &value, sizeof value, static_cast<off_t>(place)) == static_cast<ssize_t>(sizeof value);
}

bool ReadHeader(const FileDescriptor& file, ElfHeader& header) {
    constexpr unsigned char kOwnClass = sizeof(void*) == 8 ? ELFCLASS64 : ELFCLASS32;
    return file && ReadAt(file, 0, header) && std::memcmp(header.e_ident, ELFMAG, SELFMAG) == 0 &&
           header.e_ident[EI_CLASS] == kOwnClass && header.e_phentsize == sizeof(ElfSegment);
}

// A library of another machine the loader calls missing, and one that was cut short ends the process that loads it. What
// is no library at all it names itself.
bool IsWhole(const std::string& path, std::string& what) {
    const FileDescriptor file(open(path.c_str(), O_RDONLY | O_CLOEXEC));
    struct stat found {};
    ElfHeader header{};
    if (!ReadHeader(file, header) || fstat(file.get(), &found) != 0) {
        return true;
    }
    ElfHeader own{};
    if (ReadHeader(FileDescriptor(open("/proc/self/exe", O_RDONLY | O_CLOEXEC)), own) &&
        header.e_machine != own.e_machine) {
        what = "it is made for another kind of processor";
        return false;
    }
    const auto size = static_cast<std::uint64_t>(found.st_size);
    for (std::size_t index = 0; index < header.e_phnum; ++index) {
        ElfSegment segment{};
        const bool read = ReadAt(file, header.e_phoff + index * sizeof segment, segment);
        if (!read ||
            (segment.p_type == PT_LOAD && (segment.p_offset > size || segment.p_filesz > size - segment.p_offset))) {
            what = "it is cut short";
            return false;
        }
    }
    return true;
}

bool IsName(const char* name) {
    const std::size_t length = strnlen(name, kLongestName + 1);
    return length > 0 && length <= kLongestName && std::all_of(name, name + length, [](char letter) {
               return (letter >= 'a' && letter <= 'z') || (letter >= 'A' && letter <= 'Z') ||
                      (letter >= '0' && letter <= '9') || letter == '_' || letter == '-' || letter == '.';
           });
}

// Is this address inside the library that was loaded at `base`?
bool IsIn(const void* base, const void* address) {
    Dl_info found{};
    return dladdr(address, &found) != 0 && found.dli_fbase == base;
}

bool IsSame(const VORN::APIEntry& first, const VORN::APIEntry& second) {
    return std::strcmp(first.api, second.api) == 0 && std::strcmp(first.method, second.method) == 0 &&
           first.version == second.version;
}

}  // namespace

void Module::Unload::operator()(void* library) const {
    dlclose(library);
}

std::unique_ptr<Module> Module::Load(const std::string& path, std::string& reason) {
    const std::unique_ptr<char, FreeText> real(realpath(path.c_str(), nullptr));
    if (!real) {
        reason = Reason(path, std::strerror(errno));
        return nullptr;
    }
    std::unique_ptr<Module> module(new Module);
    module->path_ = real.get();
    std::string what;
    if (!IsSafe(module->path_, what) || !IsWhole(module->path_, what)) {
        reason = Reason(path, what);
        return nullptr;
    }
    return module->OpenLibrary(reason) && module->ReadTable(reason) ? std::move(module) : nullptr;
}

bool Module::OpenLibrary(std::string& reason) {
    library_.reset(dlopen(path_.c_str(), RTLD_NOW | RTLD_LOCAL));
    if (library_) {
        return true;
    }
    const char* error = dlerror();
    std::string what = error == nullptr ? "it can't be loaded" : error;
    // The loader names the file in front, and so does the line that this becomes a part of.
    if (StartsWith(what, path_ + ": ")) {
        what.erase(0, path_.size() + 2);
    }
    constexpr std::string_view kUndefined = "undefined symbol: ";
    if (StartsWith(what, kUndefined)) {
        what = "the platform lacks the symbol " + what.substr(kUndefined.size());
    }
    reason = Reason(path_, what);
    return false;
}

bool Module::ReadTable(std::string& reason) {
    using GetTable = const VORN::APIEntry* (*)();
    void* symbol = dlsym(library_.get(), kTableSymbol);
    Dl_info self{};
    if (symbol == nullptr || dladdr(symbol, &self) == 0) {
        reason = Reason(path_, "it is no web-API module, for it has no GetAPITable()");
        return false;
    }
    const VORN::APIEntry* entry = reinterpret_cast<GetTable>(symbol)();
    for (;; ++entry) {
        const auto* end = reinterpret_cast<const char*>(entry + 1) - 1;
        if (entries_.size() > kLongestTable || !IsIn(self.dli_fbase, entry) || !IsIn(self.dli_fbase, end)) {
            reason = Reason(path_, "its API table has no end");
            return false;
        }
        if (entry->api == nullptr && entry->version == 0 && entry->method == nullptr && entry->function == nullptr) {
            break;
        }
        const bool sound = IsIn(self.dli_fbase, entry->api) && IsName(entry->api) && entry->version > 0 &&
                           IsIn(self.dli_fbase, entry->method) && IsName(entry->method) &&
                           IsIn(self.dli_fbase, reinterpret_cast<const void*>(entry->function));
        if (!sound) {
            reason = Reason(path_, "row " + std::to_string(entries_.size() + 1) + " of its API table makes no sense");
            return false;
        }
        if (std::any_of(entries_.begin(), entries_.end(), [&](const auto& other) { return IsSame(other, *entry); })) {
            reason = Reason(path_, "its API table has " + std::string(entry->api) + "/" +
                                       std::to_string(entry->version) + "/" + entry->method + " twice");
            return false;
        }
        entries_.push_back(*entry);
    }
    if (entries_.empty()) {
        reason = Reason(path_, "its API table is empty");
        return false;
    }
    return true;
}

VORN::APITaskFunction Module::FindTask(const std::string& symbol) const {
    return reinterpret_cast<VORN::APITaskFunction>(dlsym(library_.get(), symbol.c_str()));
}

std::vector<std::string> ModuleFiles(const std::string& folder) {
    std::vector<std::string> files;
    const std::unique_ptr<DIR, CloseFolder> open(opendir(folder.c_str()));
    while (const dirent* entry = open ? readdir(open.get()) : nullptr) {
        const std::string name = entry->d_name;
        constexpr std::string_view kEnding = ".so";
        if (name.front() != '.' && name.size() > kEnding.size() &&
            name.compare(name.size() - kEnding.size(), kEnding.size(), kEnding) == 0) {
            files.push_back(folder + "/" + name);
        }
    }
    std::sort(files.begin(), files.end());
    return files;
}

}  // namespace appliance
