#include "appliance/base/log.h"

#include <cstdio>

namespace appliance {

void Log(int priority, const std::string& text) {
    std::string line;
    line.reserve(text.size());
    for (const char letter : text) {
        const auto byte = static_cast<unsigned char>(letter);
        if (byte < 0x20 || byte == 0x7F) {
            char shown[5] = {};
            static_cast<void>(std::snprintf(shown, sizeof(shown), "\\x%02X", byte));
            line += shown;
        } else {
            line += letter;
        }
    }
    syslog(priority, "%s", line.c_str());
}

}  // namespace appliance
