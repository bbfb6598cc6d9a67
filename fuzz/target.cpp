// The fuzzer's entry; the build names the operation.

#include <cstdio>
#include <cstdlib>

#include "fuzz/check.h"
#include "fuzz/operations.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    static const fuzz::Operation& operation = fuzz::FindOperation(FUZZ_OPERATION);
    try {
        fuzz::Run(operation, data, size);
    } catch (const fuzz::RuleBroken& broken) {
        std::fprintf(stderr, "broken rule: %s", broken.what());
        std::abort();
    }
    return 0;
}
