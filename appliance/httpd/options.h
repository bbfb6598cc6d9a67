// The command line of vorn-httpd.

#ifndef VORN_APPLIANCE_HTTPD_OPTIONS_H
#define VORN_APPLIANCE_HTTPD_OPTIONS_H

#include <string>
#include <vector>

#include "appliance/httpd/listen_address.h"

namespace appliance {

struct DoorOptions {
    enum class Action { Serve, Help, Version };
    Action action = Action::Serve;
    bool foreground = false;
    bool clearText = false;
    std::vector<ListenAddress> addresses;
    bool hasOwnAddresses = false;  // they were named, and are not those that go without saying
    std::string page = "/usr/vorn/share/console";
    std::string vornd;  // its socket
    std::string state = "/var/lib/vorn-httpd";
    std::string certificate;  // with the key; empty: the one that the server makes
    std::string key;
};

// Reads the command line. False, and the reason in one line, when it is wrong.
bool ParseDoorOptions(int count, char** arguments, DoorOptions& options, std::string& reason);

extern const char* const kDoorHelp;

}  // namespace appliance

#endif
