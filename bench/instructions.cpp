// Runs every case for callgrind: one call each of the operation and of its platform calls within MeasuredCall, which is
// all that is collected. Callgrind dumps after each; the lines printed here name the dumps in their order, as
// case|length|side with length 0 for an operation in its usual size.

#include <cstdio>

#include "bench/cases.h"

extern "C" __attribute__((noinline)) void MeasuredCall(bench::Fixture& fixture, bool platformOnly);

void MeasuredCall(bench::Fixture& fixture, bool platformOnly) {
    if (platformOnly) {
        fixture.CallPlatform();
    } else {
        fixture.Call();
    }
}

namespace {

void Run(const char* name, int length, const bench::Case& aCase, const cheap::Sizes& sizes) {
    bench::Fixture fixture(aCase, sizes);
    // Ahead of the measured call, so that the loader's and the allocator's first-time work is not in it.
    fixture.Call();
    fixture.CallPlatform();
    MeasuredCall(fixture, false);
    std::printf("%s|%d|call\n", name, length);
    MeasuredCall(fixture, true);
    std::printf("%s|%d|platform\n", name, length);
}

}  // namespace

int main() {
    for (const bench::Case& aCase : bench::Cases()) {
        Run(aCase.name, 0, aCase, cheap::Sizes());
    }
    for (const bench::ListCase& list : bench::ListCases()) {
        for (const int length : {10, 1000, 100000}) {
            cheap::Sizes sizes;
            sizes.*list.length = length;
            Run(list.name, length, bench::FindCase(list.caseName), sizes);
        }
    }
    return 0;
}
