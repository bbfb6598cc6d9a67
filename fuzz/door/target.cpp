// The fuzzer's entry; the build names the target.

#include <syslog.h>

#include <cstdio>
#include <cstdlib>

#include "fuzz/door/door.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    setlogmask(LOG_UPTO(LOG_EMERG));
    for (const fuzz::DoorTarget& target : fuzz::DoorTargets()) {
        if (target.name != FUZZ_TARGET) {
            continue;
        }
        try {
            target.run(data, size);
        } catch (const fuzz::DoorRuleBroken& broken) {
            std::fprintf(stderr, "broken rule: %s\n", broken.what());
            std::abort();
        }
    }
    return 0;
}
