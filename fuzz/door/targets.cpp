#include "fuzz/door/door.h"

namespace fuzz {

const std::vector<DoorTarget>& DoorTargets() {
    static const std::vector<DoorTarget> targets{{"DoorRequest", RunDoorRequest}, {"DoorAnswer", RunDoorAnswer}};
    return targets;
}

}  // namespace fuzz
