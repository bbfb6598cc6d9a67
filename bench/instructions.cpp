// Runs every case for callgrind, or for an emulator that tells what it executes: one call each of the operation and of
// its platform calls within MeasuredCall, which is all that is collected, and MeasuredCallEnded after it. The lines
// printed here name the calls in their order, as case|length|side with length 0 for an operation in its usual size.
// With the argument "usual" the lists of other lengths are left out.

#include <cstdio>
#include <cstring>

#include "bench/cases.h"

extern "C" __attribute__((noinline)) void MeasuredCall(bench::Fixture& fixture, bool platformOnly);
extern "C" __attribute__((noinline)) void MeasuredCallEnded();

void MeasuredCall(bench::Fixture& fixture, bool platformOnly) {
    if (platformOnly) {
        fixture.CallPlatform();
    } else {
        fixture.Call();
    }
}

void MeasuredCallEnded() {
    asm volatile("");
}

namespace {

void Run(const char* name, int length, const bench::Case& aCase, const cheap::Sizes& sizes) {
    bench::Fixture fixture(aCase, sizes);
    // Ahead of the measured call, so that the loader's and the allocator's first-time work is not in it.
    fixture.Call();
    fixture.CallPlatform();
    MeasuredCall(fixture, false);
    MeasuredCallEnded();
    std::printf("%s|%d|call\n", name, length);
    MeasuredCall(fixture, true);
    MeasuredCallEnded();
    std::printf("%s|%d|platform\n", name, length);
}

}  // namespace

int main(int count, char** arguments) {
    for (const bench::Case& aCase : bench::Cases()) {
        Run(aCase.name, 0, aCase, cheap::Sizes());
    }
    if (count == 2 && std::strcmp(arguments[1], "usual") == 0) {
        return 0;
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
