// The program's options.

#ifndef VORN_TESTS_FAULTS_OPTIONS_H
#define VORN_TESTS_FAULTS_OPTIONS_H

#include <string>

#include "tests/faults/run.h"

namespace sweep {

struct Options {
    std::string operation;  // empty: all
    std::string scenario;   // empty: all
    Part part;              // of the scenarios
    Plan plan;
    bool single = false;  // one run with `plan`, shown call by call
    bool pairs = true;
    bool list = false;
    bool selfTest = false;
};

extern const char* const kUsage;

// Throws std::invalid_argument for what it does not know.
Options ParseOptions(int count, const char* const* arguments);

}  // namespace sweep

#endif
