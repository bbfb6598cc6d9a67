#include "appliance/domain/membership/scratch_folder.h"

#include <cerrno>
#include <chrono>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <system_error>
#include <vector>

#include "appliance/base/file.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/text.h"

namespace appliance {

namespace {

namespace fs = std::filesystem;

constexpr char kBeginning[] = "samba-call.";
constexpr mode_t kRunMode = 0755;
constexpr std::chrono::minutes kLongestUse{5};

void RemoveOld(const std::string& parent) {
    std::error_code error;
    std::vector<fs::path> old;
    for (fs::directory_iterator entry(parent, error), end; !error && entry != end; entry.increment(error)) {
        std::error_code unknown;
        const fs::file_time_type changed = fs::last_write_time(entry->path(), unknown);
        if (!unknown && StartsWith(entry->path().filename().string(), kBeginning) &&
            changed + kLongestUse < fs::file_time_type::clock::now()) {
            old.push_back(entry->path());
        }
    }
    for (const fs::path& folder : old) {
        fs::remove_all(folder, error);
    }
}

}  // namespace

ScratchFolder::ScratchFolder() {
    const std::string parent = Path(kRun);
    MakeFolder(parent, kRunMode);
    RemoveOld(parent);
    std::string name = parent + "/" + kBeginning + "XXXXXX";
    if (mkdtemp(name.data()) == nullptr) {
        Log(LOG_WARNING, name + ": " + strerror(errno));
        return;
    }
    path_ = name;
}

ScratchFolder::~ScratchFolder() {
    std::error_code error;
    if (!path_.empty() && (fs::remove_all(path_, error), error)) {
        Log(LOG_WARNING, path_ + ": " + error.message());
    }
}

}  // namespace appliance
