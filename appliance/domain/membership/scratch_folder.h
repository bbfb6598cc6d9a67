// A folder for what one call of Samba's tools remembers.
//
// They share what they know of controllers with all other programs of Samba, and leave one that did not answer alone for
// a minute. Who asks whether a controller is back must not be told what was known before.

#ifndef VORN_APPLIANCE_DOMAIN_MEMBERSHIP_SCRATCH_FOLDER_H
#define VORN_APPLIANCE_DOMAIN_MEMBERSHIP_SCRATCH_FOLDER_H

#include <string>

namespace appliance {

class ScratchFolder {
public:
    // Makes the folder. What a killed program has left is removed.
    ScratchFolder();
    ~ScratchFolder();
    ScratchFolder(const ScratchFolder&) = delete;
    ScratchFolder& operator=(const ScratchFolder&) = delete;

    // The folder; empty when it could not be made, with a line in the log.
    const std::string& path() const {
        return path_;
    }

private:
    std::string path_;
};

}  // namespace appliance

#endif
