// A question that is asked again while the answer is awaited.

#ifndef VORN_APPLIANCE_DOMAIN_JOIN_ATTEMPTS_H
#define VORN_APPLIANCE_DOMAIN_JOIN_ATTEMPTS_H

#include <chrono>
#include <functional>

namespace appliance {

// One attempt, run in a thread of its own: its number from 0, the time that it may take, and a descriptor that can be
// read once nobody waits for it any more; then it returns soon. True: it has brought the answer.
using Attempt = std::function<bool(int number, std::chrono::milliseconds time, int cancel)>;

struct AttemptLimits {
    int attempts = 3;
    std::chrono::milliseconds time{0};   // of all attempts together
    std::chrono::milliseconds least{0};  // no attempt begins with less
    std::chrono::milliseconds pause{0};  // after it the next attempt begins beside those that run
};

// Begins attempts one after the other, the next one when all before it have ended without the answer or the pause has
// passed, until one brings the answer or the time is over. Returns when the last has ended. Each gets all the time that
// is left. What an attempt throws counts as no answer, and so does one that can't begin for want of a thread.
bool Ask(const Attempt& attempt, const AttemptLimits& limits);

}  // namespace appliance

#endif
