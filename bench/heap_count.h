// Counts the bytes that the process has allocated: those of operator new and of jsoncpp come by malloc as well. For
// programs of one thread.

#ifndef VORN_BENCH_HEAP_COUNT_H
#define VORN_BENCH_HEAP_COUNT_H

#include <cstddef>

// Bytes that are allocated and not freed, as large as the allocator made the blocks.
std::ptrdiff_t LiveBytes();

// The most that LiveBytes() was since the last ResetPeak().
std::ptrdiff_t PeakBytes();
void ResetPeak();

#endif
