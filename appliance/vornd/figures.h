// What there is to measure of the appliance beside its server: its membership, its tests, its lists, its tasks.

#ifndef VORN_APPLIANCE_VORND_FIGURES_H
#define VORN_APPLIANCE_VORND_FIGURES_H

#include <chrono>
#include <string>

namespace appliance {

// Used by one thread at a time; reads files, and asks no controller.
class Figures {
public:
    // The text form of Prometheus. No name of a domain, a user or a host is in it. What can't be read is left out. Anybody
    // on the machine may ask, so it is read anew after kFresh only.
    const std::string& Text();

    static constexpr std::chrono::seconds kFresh{2};

private:
    std::string text_;
    std::chrono::steady_clock::time_point read_ = {};
};

}  // namespace appliance

#endif
