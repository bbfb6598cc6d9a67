// Threads for calls, which may block for as long as a domain controller lets them wait.

#ifndef VORN_APPLIANCE_VORND_WORKER_POOL_H
#define VORN_APPLIANCE_VORND_WORKER_POOL_H

#include <condition_variable>
#include <cstddef>
#include <deque>
#include <functional>
#include <mutex>
#include <thread>
#include <vector>

namespace appliance {

class WorkerPool {
public:
    // One piece of work. Either `run` is called, on a thread of the pool, or `refuse`, on the thread that refuses.
    struct Job {
        std::function<void()> run;
        std::function<void()> refuse;
    };

    // At most `waiting` jobs wait beside those that run.
    WorkerPool(std::size_t threads, std::size_t waiting);
    // Waits for the jobs that run; the waiting ones are refused.
    ~WorkerPool();
    WorkerPool(const WorkerPool&) = delete;
    WorkerPool& operator=(const WorkerPool&) = delete;

    // False when the queue is full or the pool is ending; the job is untouched then.
    bool Submit(Job& job);

    // Refuses what waits and takes no more. What runs goes on.
    void Drain();

    // How many jobs run, and how many wait.
    std::size_t Running() const;
    std::size_t Waiting() const;

private:
    void Work();

    const std::size_t limit_;
    mutable std::mutex mutex_;
    std::condition_variable changed_;
    std::deque<Job> waiting_;
    std::size_t running_ = 0;
    std::size_t free_ = 0;  // threads without a job
    bool ending_ = false;
    std::vector<std::thread> threads_;
};

}  // namespace appliance

#endif
