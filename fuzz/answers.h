// An appliance made of the bytes of a fuzz input: what it answers, and which of its calls fail.

#ifndef VORN_FUZZ_ANSWERS_H
#define VORN_FUZZ_ANSWERS_H

#include "fuzz/input.h"
#include "tests/double/appliance.h"

namespace fuzz {

// Sets the state and the faults of a fresh appliance.
void DecodeAnswers(Input& input, fake::Appliance& appliance);

}  // namespace fuzz

#endif
