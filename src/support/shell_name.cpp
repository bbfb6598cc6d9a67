#include "src/support/shell_name.h"

#include <cstring>

bool IsHarmlessToShell(const char* name) {
    if (name[0] == '-') {
        return false;
    }
    for (const char* at = name; *at != '\0'; ++at) {
        const auto byte = static_cast<unsigned char>(*at);
        if (byte <= 0x20 || byte == 0x7F || std::strchr("\"';&|<>()$\\*?[]{}~#!`", *at) != nullptr) {
            return false;
        }
    }
    return true;
}
