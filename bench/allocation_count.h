// Counts what the process allocates: the C++ library's operator new and jsoncpp come by malloc as well.

#ifndef VORN_BENCH_ALLOCATION_COUNT_H
#define VORN_BENCH_ALLOCATION_COUNT_H

#include <cstddef>

// Calls of malloc, calloc and realloc since the start of the process.
std::size_t AllocationCount();

#endif
