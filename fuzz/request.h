// A request made of the bytes of a fuzz input.

#ifndef VORN_FUZZ_REQUEST_H
#define VORN_FUZZ_REQUEST_H

#include <json/value.h>

#include "fuzz/input.h"

namespace fuzz {

// Any JSON object: the names that the module knows and others, with values of every type and shape.
Json::Value DecodeRequest(Input& input);

// Any JSON value, nested at most `depth` levels.
Json::Value DecodeValue(Input& input, int depth);

}  // namespace fuzz

#endif
