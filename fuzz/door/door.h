// The door to the network under arbitrary bytes: those of a client, and those of the server behind it.

#ifndef VORN_FUZZ_DOOR_DOOR_H
#define VORN_FUZZ_DOOR_DOOR_H

#include <cstddef>
#include <cstdint>
#include <stdexcept>
#include <string>
#include <vector>

namespace fuzz {

// What a run must never do; the text says what it did.
class DoorRuleBroken : public std::runtime_error {
public:
    using std::runtime_error::runtime_error;
};

// The first byte says in how large pieces the others come from a client, which then ends sending.
void RunDoorRequest(const std::uint8_t* data, std::size_t size);

// The bytes are what vornd answers to a call, and then it ends the connection; the first one says in how large pieces.
void RunDoorAnswer(const std::uint8_t* data, std::size_t size);

struct DoorTarget {
    std::string name;
    void (*run)(const std::uint8_t* data, std::size_t size);
};
const std::vector<DoorTarget>& DoorTargets();

}  // namespace fuzz

#endif
