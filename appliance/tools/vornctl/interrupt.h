// Ctrl-C and its kin (SIGINT, SIGTERM, SIGHUP): noted, and looked at between two steps of a command.

#ifndef VORN_APPLIANCE_TOOLS_VORNCTL_INTERRUPT_H
#define VORN_APPLIANCE_TOOLS_VORNCTL_INTERRUPT_H

namespace appliance::ctl {

// From here on the signals are noted and no longer end the program. One that the caller ignores (nohup) stays ignored.
void WatchInterrupts();

// True when one came that nobody has taken note of.
bool Interrupted();

// Takes note of all that came: Interrupted is false until the next one.
void ForgetInterrupts();

// True when one came that ends the program without asking: SIGTERM or SIGHUP.
bool MustEnd();

}  // namespace appliance::ctl

#endif
