// The appliance's capabilities and settings.
// See conventions.h for the rules that hold for every declaration.

#ifndef VORN_PLATFORM_SETTINGS_H
#define VORN_PLATFORM_SETTINGS_H

#include <memory>

#include "platform/conventions.h"

// A reader of both. A text that it answers belongs to the reader and is valid until the reader's next call or its end.
class VornConf {
public:
    // Failure: throws.
    VornConf();
    ~VornConf();
    VornConf(const VornConf&) = delete;
    VornConf& operator=(const VornConf&) = delete;

    // What this model of the appliance is capable of: the value of `key`, or `fallback` when there is none. Never null.
    // Failure: throws.
    const char* Def(const char* key, const char* fallback);

    // How the appliance is set at present: the value of `key`, or `fallback` when there is none. Never null.
    // Failure: throws.
    const char* Info(const char* key, const char* fallback);

    class Impl;
    std::unique_ptr<Impl> impl;
};

#endif
