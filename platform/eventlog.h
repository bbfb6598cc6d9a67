// The event log that the appliance shows to its administrators.
// See conventions.h for the rules that hold for every declaration.

#ifndef VORN_PLATFORM_EVENTLOG_H
#define VORN_PLATFORM_EVENTLOG_H

#include "platform/conventions.h"

extern "C" {

// Writes an event. `kind` and `level` sort it, `event` is the code of its text, and the four strings fill the text's
// places in order; an unused one is empty.
// Failure: -1.
int VORNLogSet1(int kind, int level, int event, const char* arg1, const char* arg2, const char* arg3, const char* arg4);

}  // extern "C"

#endif
