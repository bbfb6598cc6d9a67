#include "bench/allocation_count.h"

#include <cstdlib>

// The C library's own entry points, so that the counters stand in front of the real allocator.
extern "C" {
void* __libc_malloc(std::size_t size);
void* __libc_calloc(std::size_t count, std::size_t size);
void* __libc_realloc(void* block, std::size_t size);
}

namespace {

std::size_t allocations = 0;  // the benchmarks have one thread

}  // namespace

std::size_t AllocationCount() {
    return allocations;
}

extern "C" {

void* malloc(std::size_t size) noexcept {
    ++allocations;
    return __libc_malloc(size);
}

void* calloc(std::size_t nmemb, std::size_t size) noexcept {
    ++allocations;
    return __libc_calloc(nmemb, size);
}

void* realloc(void* ptr, std::size_t size) noexcept {
    ++allocations;
    return __libc_realloc(ptr, size);
}

}  // extern "C"
