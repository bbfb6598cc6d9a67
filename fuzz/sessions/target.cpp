// The fuzzer's entry for a target of the servers; the build names it.

#include <cstdint>
#include <cstdio>
#include <cstdlib>

#include "fuzz/sessions/targets.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    static const fuzz::ServerTarget& target = fuzz::FindServerTarget(FUZZ_TARGET);
    try {
        target.run({static_cast<const char*>(static_cast<const void*>(data)), size});
    } catch (const fuzz::ServerRuleBroken& broken) {
        std::fprintf(stderr, "broken rule: %s\n", broken.what());
        std::abort();
    }
    return 0;
}
