#include "runtime.h"

#include <sys/resource.h>

#include <cstdlib>

namespace mutant {
namespace {

unsigned char flags[kMost];

// A mutant may loop while it allocates or writes.
void Limit() {
    const rlim_t memory = rlim_t{4} << 30U;
    const rlim_t file = rlim_t{64} << 20U;
    const rlimit limits[] = {{memory, memory}, {file, file}, {0, 0}};
    setrlimit(RLIMIT_AS, &limits[0]);
    setrlimit(RLIMIT_FSIZE, &limits[1]);
    setrlimit(RLIMIT_CORE, &limits[2]);
}

}  // namespace

int active = -1;
unsigned char* reached = nullptr;

void Load() {
    const char* number = std::getenv("MUTANT");
    active = number == nullptr ? 0 : std::atoi(number);
    if (std::getenv("MUTANT_RECORD") != nullptr) {
        reached = flags;
    }
    if (active > 0) {
        Limit();
    }
}

void Mark(int first, int last) {
    for (int number = first; number <= last && number < kMost; ++number) {
        reached[number] = 1;
    }
}

}  // namespace mutant
