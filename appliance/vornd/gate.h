// What a request may do, by whose connection it came on and in whose session. Lives on the server's thread.

#ifndef VORN_APPLIANCE_VORND_GATE_H
#define VORN_APPLIANCE_VORND_GATE_H

#include <functional>
#include <string_view>
#include <variant>

#include "appliance/vornd/access.h"
#include "appliance/vornd/figures.h"
#include "appliance/vornd/lanes.h"
#include "appliance/vornd/metrics.h"
#include "appliance/vornd/router.h"
#include "appliance/vornd/session_store.h"
#include "appliance/vornd/work.h"

namespace appliance {

class SessionRoutes;

class Gate {
public:
    // All of these outlive the gate. `gauges` reads the server's present state.
    struct Parts {
        const Router& router;
        SessionStore& sessions;
        SessionRoutes& sessionRoutes;
        const Metrics& metrics;
        std::function<Metrics::Gauges()> gauges;
    };

    explicit Gate(Parts parts);

    // Known by the header alone: may this peer's request get any further?
    static bool MayEnter(Access access, std::string_view verb, std::string_view target);

    // What a complete request leads to.
    Next Take(Access access, const WebRequest& request);

private:
    Next TakeFigures(const WebRequest& request);
    Next TakeInSession(const WebRequest& request);
    Next RunCall(Call call) const;

    const Parts parts_;
    Figures figures_;
};

}  // namespace appliance

#endif
