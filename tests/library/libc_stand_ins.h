// The program exports functions under the names of those libc functions that would reach the real machine. The loader
// binds a loaded library to the program's functions first, so the module's calls end at the imitated appliance.

#ifndef VORN_TESTS_LIBRARY_LIBC_STAND_INS_H
#define VORN_TESTS_LIBRARY_LIBC_STAND_INS_H

#include <functional>

// What happens while the module sleeps; nothing when empty. No time passes.
extern std::function<void()> whileAsleep;

#endif
