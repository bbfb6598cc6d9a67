// What a request leads to when it can't be answered at once.

#ifndef VORN_APPLIANCE_VORND_WORK_H
#define VORN_APPLIANCE_VORND_WORK_H

#include <functional>
#include <variant>

#include "appliance/vornd/lanes.h"
#include "appliance/vornd/reply.h"

namespace appliance {

struct Work {
    Lane lane = Lane::Calls;
    // Runs on a thread of the lane, unless there is no room for it or the server ends before.
    std::function<Reply()> run;
    // Runs on the server's thread, exactly once, with what `run` has answered or why it did not run; answers what the
    // client gets.
    std::function<Reply(Reply)> finish;
};

using Next = std::variant<Reply, Work>;

}  // namespace appliance

#endif
