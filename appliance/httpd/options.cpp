#include "appliance/httpd/options.h"

#include <getopt.h>

#include <algorithm>
#include <array>
#include <optional>
#include <utility>

#include "appliance/base/paths.h"

namespace appliance {
namespace {

enum Option : int {
    Foreground = 256,
    Listen,
    ClearText,
    CertificateFile,
    KeyFile,
    PageFolder,
    Vornd,
    State,
    Help,
    Version
};

bool IsSwitch(int option) {
    return option == Foreground || option == ClearText || option == Help || option == Version;
}

bool AddAddress(const std::string& text, DoorOptions& options, std::string& reason) {
    std::optional<ListenAddress> address = ParseListenAddress(text);
    if (!address) {
        reason = "\"" + text + "\" is no address with a port, like 127.0.0.1:8443 or [::1]:8443";
        return false;
    }
    options.addresses.push_back(std::move(*address));
    options.hasOwnAddresses = true;
    return true;
}

// What the options mean together.
bool Complete(DoorOptions& options, std::string& reason) {
    if (options.certificate.empty() != options.key.empty()) {
        reason = "--certificate and --key go together";
        return false;
    }
    if (options.clearText && !options.certificate.empty()) {
        reason = "--clear-text has no use for a certificate";
        return false;
    }
    if (options.addresses.empty()) {
        for (const char* address : {"127.0.0.1:8443", "[::1]:8443"}) {
            options.addresses.push_back(*ParseListenAddress(address));
        }
    }
    const auto outside = std::find_if(options.addresses.begin(), options.addresses.end(),
                                      [](const ListenAddress& address) { return !address.isLoopback; });
    if (options.clearText && outside != options.addresses.end()) {
        reason = "--clear-text is for this machine alone, and " + outside->text + " can be reached from others";
        return false;
    }
    return true;
}

}  // namespace

const char* const kDoorHelp =
    "Usage: vorn-httpd [OPTION]...\n"
    "Serves the administrator's page and passes calls on to vornd, for users who have logged in. Runs as a user "
    "without\n"
    "rights. Stays in the foreground of whatever starts it.\n"
    "\n"
    "  --listen ADDRESS:PORT  listen there instead of 127.0.0.1:8443 and [::1]:8443; may be given several times\n"
    "  --clear-text           HTTP without TLS; only for addresses of this machine alone\n"
    "  --certificate FILE     show this certificate (PEM, with the chain behind it)\n"
    "  --key FILE             its key\n"
    "  --page FOLDER          the page's files, instead of /usr/vorn/share/console\n"
    "  --vornd FILE           vornd's socket, instead of /run/vorn/vornd.sock\n"
    "  --state FOLDER         where the certificate is kept that is made when none is given; /var/lib/vorn-httpd\n"
    "  --foreground           log to the terminal, too, also when standard error is none\n"
    "  --help                 show this text and end\n"
    "  --version              show the version and end\n"
    "\n"
    "SIGHUP reads the certificate anew. SIGTERM and SIGINT end the server once the requests that run are answered; a\n"
    "second one ends it at once.\n"
    "Exit status: 0 ended in order, 1 could not start or left requests behind, 2 wrong command line.\n";

bool ParseDoorOptions(int count, char** arguments, DoorOptions& options, std::string& reason) {
    const std::array<option, 11> known{{{"foreground", no_argument, nullptr, Foreground},
                                        {"listen", required_argument, nullptr, Listen},
                                        {"clear-text", no_argument, nullptr, ClearText},
                                        {"certificate", required_argument, nullptr, CertificateFile},
                                        {"key", required_argument, nullptr, KeyFile},
                                        {"page", required_argument, nullptr, PageFolder},
                                        {"vornd", required_argument, nullptr, Vornd},
                                        {"state", required_argument, nullptr, State},
                                        {"help", no_argument, nullptr, Help},
                                        {"version", no_argument, nullptr, Version},
                                        {nullptr, 0, nullptr, 0}}};
    options.vornd = kSocket;
    optind = 1;
    opterr = 0;
    for (;;) {
        const int place = optind;
        const int option = getopt_long(count, arguments, ":", known.data(), nullptr);
        if (option < 0) {
            break;
        }
        if (option == ':' || (option != '?' && !IsSwitch(option) && *optarg == '\0')) {
            reason = std::string("option \"") + arguments[place] + "\" needs a value";
            return false;
        }
        switch (option) {
            case Foreground:
                options.foreground = true;
                break;
            case Listen:
                if (!AddAddress(optarg, options, reason)) {
                    return false;
                }
                break;
            case ClearText:
                options.clearText = true;
                break;
            case CertificateFile:
                options.certificate = optarg;
                break;
            case KeyFile:
                options.key = optarg;
                break;
            case PageFolder:
                options.page = optarg;
                break;
            case Vornd:
                options.vornd = optarg;
                break;
            case State:
                options.state = optarg;
                break;
            case Help:
                options.action = DoorOptions::Action::Help;
                return true;
            case Version:
                options.action = DoorOptions::Action::Version;
                return true;
            default:
                reason = std::string("option \"") + arguments[place] + "\" is unknown or wrong; try --help";
                return false;
        }
    }
    if (optind < count) {
        reason = std::string("\"") + arguments[optind] + "\" is one argument too many; try --help";
        return false;
    }
    return Complete(options, reason);
}

}  // namespace appliance
