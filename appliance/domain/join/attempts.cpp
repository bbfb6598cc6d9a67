#include "appliance/domain/join/attempts.h"

#include <sys/eventfd.h>

#include <condition_variable>
#include <exception>
#include <mutex>
#include <system_error>
#include <thread>
#include <vector>

#include "appliance/base/file.h"
#include "appliance/base/log.h"
#include "appliance/domain/join/time_budget.h"

namespace appliance {

namespace {

class Attempts {
public:
    // Where no descriptor is left, attempts can't be called off and take their time.
    explicit Attempts(const Attempt& attempt) : attempt_(attempt), cancel_(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {}
    ~Attempts() {
        static_cast<void>(eventfd_write(cancel_.get(), 1));
        for (std::thread& thread : threads_) {
            thread.join();
        }
    }
    Attempts(const Attempts&) = delete;
    Attempts& operator=(const Attempts&) = delete;

    // False, with a line in the log: the machine has no thread left.
    bool Begin(std::chrono::milliseconds time) {
        const std::lock_guard<std::mutex> lock(mutex_);
        try {
            threads_.emplace_back([this, number = static_cast<int>(threads_.size()), time] { Make(number, time); });
        } catch (const std::system_error& error) {
            Log(LOG_WARNING, std::string("an attempt can't begin: ") + error.what());
            return false;
        }
        ++running_;
        return true;
    }

    // Until the answer is there, none runs or the time has passed. True: the answer is there.
    bool Wait(std::chrono::milliseconds time) {
        std::unique_lock<std::mutex> lock(mutex_);
        changed_.wait_for(lock, time, [this] { return answered_ || running_ == 0; });
        return answered_;
    }

private:
    void Make(int number, std::chrono::milliseconds time) {
        bool answered = false;
        try {
            answered = attempt_(number, time, cancel_.get());
        } catch (const std::exception& error) {
            Log(LOG_ERR, std::string("an attempt has failed: ") + error.what());
        }
        const std::lock_guard<std::mutex> lock(mutex_);
        answered_ = answered_ || answered;
        --running_;
        changed_.notify_all();
    }

    const Attempt& attempt_;
    const FileDescriptor cancel_;
    std::mutex mutex_;
    std::condition_variable changed_;
    int running_ = 0;
    bool answered_ = false;
    std::vector<std::thread> threads_;
};

}  // namespace

bool Ask(const Attempt& attempt, const AttemptLimits& limits) {
    const TimeBudget budget(limits.time);
    Attempts attempts(attempt);
    bool begun = attempts.Begin(limits.time);
    for (int next = 1; begun && next < limits.attempts; ++next) {
        if (attempts.Wait(budget.Left(limits.pause))) {
            return true;
        }
        const std::chrono::milliseconds left = budget.Left(limits.time);
        begun = left >= limits.least && attempts.Begin(left);
    }
    // Each attempt keeps to its time; this is for one that does not.
    return attempts.Wait(budget.Left(limits.time) + limits.least);
}

}  // namespace appliance
