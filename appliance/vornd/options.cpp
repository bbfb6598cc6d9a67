#include "appliance/vornd/options.h"

#include <getopt.h>

#include <array>
#include <charconv>
#include <string_view>

namespace appliance {

namespace {

bool ReadSeconds(std::string_view text, std::chrono::seconds& seconds) {
    unsigned number = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    seconds = std::chrono::seconds(number);
    return error == std::errc() && end == text.data() + text.size() && seconds <= kDrainLimit;
}

}  // namespace

const char* const kHelp =
    "Usage: vornd [OPTION]...\n"
    "Serves the appliance's web API on a unix socket, as root. Stays in the foreground of whatever starts it.\n"
    "\n"
    "  --foreground    log to the terminal, too, also when standard error is none\n"
    "  --socket FILE   listen on FILE instead of /run/vorn/vornd.sock\n"
    "  --module FILE   load FILE beside the modules in /usr/vorn/lib/modules; may be given several times\n"
    "  --door ACCOUNT  whose processes may log administrators in, instead of vorn-httpd; for tests\n"
    "  --drain SECONDS leave running calls behind so long after the signal to end, instead of 300; for tests\n"
    "  --root FOLDER   look for the appliance's files under FOLDER; for tests\n"
    "  --task ID       run the recorded background task ID and end; used by the server itself\n"
    "  --help          show this text and end\n"
    "  --version       show the version and end\n"
    "\n"
    "SIGTERM, SIGINT and SIGHUP end the server: waiting calls are refused, running ones are answered.\n"
    "Exit status: 0 ended in order, 1 could not start or left calls behind, 2 wrong command line.\n";

bool ParseOptions(int count, char** arguments, Options& options, std::string& reason) {
    enum Option : int { Foreground = 256, Socket, ModuleFile, Door, Drain, Root, Task, Help, Version };
    const std::array<option, 10> known{{{"foreground", no_argument, nullptr, Foreground},
                                        {"socket", required_argument, nullptr, Socket},
                                        {"module", required_argument, nullptr, ModuleFile},
                                        {"door", required_argument, nullptr, Door},
                                        {"drain", required_argument, nullptr, Drain},
                                        {"root", required_argument, nullptr, Root},
                                        {"task", required_argument, nullptr, Task},
                                        {"help", no_argument, nullptr, Help},
                                        {"version", no_argument, nullptr, Version},
                                        {nullptr, 0, nullptr, 0}}};
    optind = 1;
    opterr = 0;
    for (;;) {
        const int place = optind;
        const int option = getopt_long(count, arguments, ":", known.data(), nullptr);
        if (option < 0) {
            break;
        }
        if (option != Foreground && option != Help && option != Version && option != '?' && option != ':' &&
            *optarg == '\0') {
            reason = std::string("option \"") + arguments[place] + "\" needs a value";
            return false;
        }
        switch (option) {
            case Foreground:
                options.foreground = true;
                break;
            case Socket:
                options.socket = optarg;
                break;
            case ModuleFile:
                options.modules.emplace_back(optarg);
                break;
            case Door:
                options.door = optarg;
                break;
            case Drain:
                if (!ReadSeconds(optarg, options.patience)) {
                    reason = std::string("option \"--drain\" takes a number of seconds up to ") +
                             std::to_string(kDrainLimit.count());
                    return false;
                }
                break;
            case Root:
                options.root = optarg;
                break;
            case Task:
                options.action = Options::Action::Task;
                options.task = optarg;
                break;
            case Help:
                options.action = Options::Action::Help;
                return true;
            case Version:
                options.action = Options::Action::Version;
                return true;
            case ':':
                reason = std::string("option \"") + arguments[place] + "\" needs a value";
                return false;
            default:
                reason = std::string("option \"") + arguments[place] + "\" is unknown or wrong; try --help";
                return false;
        }
    }
    if (optind < count) {
        reason = std::string("\"") + arguments[optind] + "\" is one argument too many; try --help";
        return false;
    }
    return true;
}

}  // namespace appliance
