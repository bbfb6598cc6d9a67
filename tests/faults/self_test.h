// Whether the checks of the sweep find what they are for.

#ifndef VORN_TESTS_FAULTS_SELF_TEST_H
#define VORN_TESTS_FAULTS_SELF_TEST_H

#include <ostream>

namespace sweep {

// Sweeps small operations that are wrong on purpose, each in one way. True when each was found out.
bool SelfTest(std::ostream& out);

}  // namespace sweep

#endif
