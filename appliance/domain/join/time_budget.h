// The time that a whole job has, shared out to its steps.

#ifndef VORN_APPLIANCE_DOMAIN_JOIN_TIME_BUDGET_H
#define VORN_APPLIANCE_DOMAIN_JOIN_TIME_BUDGET_H

#include <algorithm>
#include <chrono>

namespace appliance {

class TimeBudget {
public:
    explicit TimeBudget(std::chrono::milliseconds total) : end_(std::chrono::steady_clock::now() + total) {}

    // What is left, in milliseconds, but no more than `most`; never below 0.
    std::chrono::milliseconds Left(std::chrono::milliseconds most) const {
        const auto left =
            std::chrono::duration_cast<std::chrono::milliseconds>(end_ - std::chrono::steady_clock::now());
        return std::max(std::chrono::milliseconds(0), std::min(left, most));
    }
    bool Over() const {
        return std::chrono::steady_clock::now() >= end_;
    }

private:
    std::chrono::steady_clock::time_point end_;
};

}  // namespace appliance

#endif
