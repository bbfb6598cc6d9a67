// The appliance's capabilities and settings.

#include <cstring>

#include "appliance/base/conf_file.h"
#include "appliance/base/paths.h"
#include "appliance/platform/contract.h"
#include "appliance/platform/last_error.h"

namespace {

constexpr char kGlobal[] = "global";

// The value of a key of one of the two files. A file that can't be read has no keys, and the log says why.
std::optional<std::string> ValueIn(const std::string& path, const char* key) {
    appliance::ConfFile file;
    if (const std::error_code error = appliance::ConfFile::Load(path, file)) {
        appliance::Log(LOG_ERR, path + ": " + error.message());
        return std::nullopt;
    }
    return file.Get(kGlobal, key);
}

}  // namespace

class VornConf::Impl {
public:
    const char* Answer(const char* path, const char* key, const char* fallback) {
        std::optional<std::string> value;
        if (key != nullptr) {
            value = ValueIn(appliance::Path(path), key);
        }
        answer_ = value ? *value : std::string(fallback == nullptr ? "" : fallback);
        return answer_.c_str();
    }

private:
    std::string answer_;
};

VornConf::VornConf() : impl(std::make_unique<Impl>()) {}

VornConf::~VornConf() = default;

const char* VornConf::Def(const char* key, const char* fallback) {
    return impl->Answer(appliance::kCapabilities, key, fallback);
}

const char* VornConf::Info(const char* key, const char* fallback) {
    return impl->Answer(appliance::kSettings, key, fallback);
}

extern "C" int VLIBCSupportGet(const char* capability) {
    VORN_GUARD(0, {
        if (capability == nullptr) {
            return VORN_FAIL_WITH(BadArgument, 0);
        }
        return ValueIn(appliance::Path(appliance::kCapabilities), capability) == "yes" ? 1
                                                                                       : VORN_FAIL_WITH(NotFound, 0);
    })
}
