// The heap that each operation takes at most, and whether it gives all of it back: case|peak|left, in bytes. The code is
// 1 when one has left something.

#include <cstdio>

#include "bench/cases.h"
#include "bench/heap_count.h"

namespace {

bool Measure(const bench::Case& aCase) {
    bench::Fixture fixture(aCase, cheap::Sizes());
    // What is made once, by the operation or below it, is no part of a call.
    fixture.Call();
    const std::ptrdiff_t before = LiveBytes();
    ResetPeak();
    fixture.Call();
    const std::ptrdiff_t left = LiveBytes() - before;
    std::printf("%s|%td|%td\n", aCase.name, PeakBytes() - before, left);
    return left == 0;
}

}  // namespace

int main() {
    // The stream's buffer is not to come and go among the calls.
    std::setvbuf(stdout, nullptr, _IONBF, 0);
    bool clean = true;
    for (const bench::Case& aCase : bench::Cases()) {
        clean = Measure(aCase) && clean;
    }
    return clean ? 0 : 1;
}
