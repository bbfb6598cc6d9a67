#include "bench/heap_count.h"

#include <malloc.h>

#include <algorithm>
#include <cstdlib>

// The C library's own entry points, so that the counters stand in front of the real allocator.
extern "C" {
void* __libc_malloc(std::size_t size);
void* __libc_calloc(std::size_t count, std::size_t size);
void* __libc_realloc(void* block, std::size_t size);
void __libc_free(void* block);
}

namespace {

std::ptrdiff_t live = 0;
std::ptrdiff_t peak = 0;

std::ptrdiff_t SizeOf(void* block) {
    return static_cast<std::ptrdiff_t>(malloc_usable_size(block));
}

void* Counted(void* block) {
    live += SizeOf(block);
    peak = std::max(peak, live);
    return block;
}

}  // namespace

std::ptrdiff_t LiveBytes() {
    return live;
}

std::ptrdiff_t PeakBytes() {
    return peak;
}

void ResetPeak() {
    peak = live;
}

extern "C" {

void* malloc(std::size_t size) noexcept {
    return Counted(__libc_malloc(size));
}

void* calloc(std::size_t nmemb, std::size_t size) noexcept {
    return Counted(__libc_calloc(nmemb, size));
}

void* realloc(void* ptr, std::size_t size) noexcept {
    const std::ptrdiff_t before = SizeOf(ptr);
    void* const block = __libc_realloc(ptr, size);
    // One that failed has left the old block; a size of zero has freed it.
    if (block != nullptr || size == 0) {
        live -= before;
    }
    return Counted(block);
}

void free(void* ptr) noexcept {
    live -= SizeOf(ptr);
    __libc_free(ptr);
}

}  // extern "C"
