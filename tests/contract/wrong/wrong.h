// Platforms that are wrong in one way: the operations in front of the real ones, each right until VORN_WRONG in the
// environment names what it is to do wrong. notices_check.py runs the contract's tests on each and sees them fail.

#ifndef VORN_TESTS_CONTRACT_WRONG_WRONG_H
#define VORN_TESTS_CONTRACT_WRONG_WRONG_H

#include <dlfcn.h>

#include <cstdlib>
#include <cstring>

inline bool IsWrong(const char* way) {
    const char* named = std::getenv("VORN_WRONG");
    return named != nullptr && std::strcmp(named, way) == 0;
}

// The operation as the platform under test has it.
#define REAL(operation) reinterpret_cast<decltype(&operation)>(dlsym(RTLD_NEXT, #operation))

#endif
