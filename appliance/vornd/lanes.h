// The threads for what may block, apart by kind: log-ins and figures go on when all threads for calls are taken.

#ifndef VORN_APPLIANCE_VORND_LANES_H
#define VORN_APPLIANCE_VORND_LANES_H

#include <cstddef>

#include "appliance/vornd/authenticator.h"
#include "appliance/vornd/worker_pool.h"
#include "appliance/web/limits.h"

namespace appliance {

enum class Lane { Calls, LogIns, Figures };

class Lanes {
public:
    WorkerPool& operator[](Lane lane) {
        return lane == Lane::Calls ? calls_ : lane == Lane::LogIns ? logIns_ : figures_;
    }
    void Drain() {
        calls_.Drain();
        logIns_.Drain();
        figures_.Drain();
    }
    std::size_t Running() const {
        return calls_.Running() + logIns_.Running() + figures_.Running();
    }

private:
    WorkerPool calls_{kWorkers, kWaitingCalls};
    WorkerPool logIns_{kLogInsAtATime, kWaitingLogIns};
    WorkerPool figures_{1, kWaitingCalls};
};

}  // namespace appliance

#endif
