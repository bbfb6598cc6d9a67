#include "appliance/tools/vornctl/interrupt.h"

#include <csignal>
#include <initializer_list>

namespace appliance::ctl {

namespace {

volatile std::sig_atomic_t interrupted = 0;
volatile std::sig_atomic_t mustEnd = 0;

void Note(int number) {
    interrupted = 1;
    if (number != SIGINT) {
        mustEnd = 1;
    }
}

}  // namespace

void WatchInterrupts() {
    for (const int number : {SIGINT, SIGTERM, SIGHUP}) {
        struct sigaction old {};
        if (sigaction(number, nullptr, &old) == 0 && old.sa_handler == SIG_IGN) {
            continue;
        }
        // Without SA_RESTART, so that a read from the terminal ends.
        struct sigaction action {};
        action.sa_handler = Note;
        sigemptyset(&action.sa_mask);
        sigaction(number, &action, nullptr);
    }
}

bool Interrupted() {
    return interrupted != 0;
}

void ForgetInterrupts() {
    interrupted = 0;
}

bool MustEnd() {
    return mustEnd != 0;
}

}  // namespace appliance::ctl
