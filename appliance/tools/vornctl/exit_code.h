// How vornctl ends. Scripts rely on the numbers; vornctl(1) lists them.

#ifndef VORN_APPLIANCE_TOOLS_VORNCTL_EXIT_CODE_H
#define VORN_APPLIANCE_TOOLS_VORNCTL_EXIT_CODE_H

#include <stdexcept>
#include <string>

namespace appliance::ctl {

enum ExitCode : int {
    kDone = 0,
    kRefused = 1,       // the appliance refused, or what was asked failed
    kUsage = 2,         // wrong command line
    kNoAnswer = 3,      // vornd does not run, is too slow, or its answer can't be used
    kInterrupted = 4,   // Ctrl-C, or a question answered with no
    kNotWorking = 5,    // "test": the membership does not work
    kOutputFailed = 6,  // standard output can't be written
};

// What ends a command early. The text is one sentence for the administrator, without the program's name.
class Failure : public std::runtime_error {
public:
    Failure(ExitCode code, const std::string& text) : std::runtime_error(text), code_(code) {}

    ExitCode code() const {
        return code_;
    }

private:
    ExitCode code_;
};

}  // namespace appliance::ctl

#endif
