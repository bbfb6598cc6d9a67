// Work that may never end, done in a child process that can be killed: a controller that stalls, a library that blocks.

#ifndef VORN_APPLIANCE_DOMAIN_DIRECTORY_WORKER_H
#define VORN_APPLIANCE_DOMAIN_DIRECTORY_WORKER_H

#include <json/value.h>

#include <chrono>
#include <cstdint>
#include <functional>
#include <stdexcept>
#include <string>

#include "appliance/base/error_code.h"
#include "appliance/base/file.h"

namespace appliance {

// Why a controller's answer could not be had, or could not be used, as one line for the log.
class DirectoryError : public std::runtime_error {
public:
    DirectoryError(ErrorCode code, const std::string& what) : std::runtime_error(what), code_(code) {}
    ErrorCode code() const {
        return code_;
    }

private:
    ErrorCode code_;
};

// How long to wait for the child.
struct Patience {
    std::chrono::milliseconds silence;  // since its last sign of progress
    std::chrono::milliseconds overall;  // in all
};

// In the child: how it says that it is getting on.
class ProgressReport {
public:
    explicit ProgressReport(int descriptor) : descriptor_(descriptor) {}

    // `count` things are done. Tells the parent at most once per 100 milliseconds. Ends the child when nobody listens.
    void Tell(std::int64_t count);

private:
    int descriptor_;
    std::chrono::steady_clock::time_point told_{};
};

// Runs `work` in a child process and answers what it returns. The child stays in the caller's process group, so that
// stopping the group stops it, and is killed when the caller's thread ends or the patience does. `progress` is called
// in the parent with each count that the child tells; it may be empty. Throws DirectoryError: the one that `work`
// threw, or one for any other exception, for a child that died and for one that was killed (TimedOut). The process
// should have one thread only: the child has no other.
Json::Value RunWorker(const Patience& patience, const std::function<Json::Value(ProgressReport&)>& work,
                      const std::function<void(std::int64_t)>& progress = {});

}  // namespace appliance

#endif
