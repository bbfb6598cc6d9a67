// Questions to the one who sits at the terminal.

#ifndef VORN_APPLIANCE_TOOLS_VORNCTL_TERMINAL_H
#define VORN_APPLIANCE_TOOLS_VORNCTL_TERMINAL_H

#include <string>

#include "appliance/base/secret.h"

namespace appliance::ctl {

// Asks for a password on the controlling terminal, without an echo. The terminal is as before whatever ends the
// question. Throws Failure: kUsage when there is no terminal or the password can't be one, kInterrupted after Ctrl-C.
Secret AskPassword(const std::string& prompt);

// The first line of standard input as a password. Throws Failure as above.
Secret ReadPasswordFromInput();

// Waits until there is something to read, or the end of it. Throws Failure (kInterrupted) after Ctrl-C.
void WaitForInput(int descriptor);

// Is there a terminal to ask on?
bool CanAsk();

// Asks on the controlling terminal and returns the line that was typed, without blanks around it, in lower case. Throws
// Failure: kUsage without a terminal, kInterrupted after Ctrl-C.
std::string Ask(const std::string& question);

}  // namespace appliance::ctl

#endif
