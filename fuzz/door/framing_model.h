// Where requests end, seen by somebody else: a second opinion on what a client's bytes mean.

#ifndef VORN_FUZZ_DOOR_FRAMING_MODEL_H
#define VORN_FUZZ_DOOR_FRAMING_MODEL_H

#include <string>
#include <string_view>
#include <vector>

namespace fuzz {

// The bodies of the whole requests at the front of the bytes, up to the first that is not clearly one. Looks at nothing
// but where they end.
std::vector<std::string> BodiesOf(std::string_view bytes);

}  // namespace fuzz

#endif
