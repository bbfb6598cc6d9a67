#include "appliance/vornd/worker_pool.h"

#include <utility>

namespace appliance {

WorkerPool::WorkerPool(std::size_t threads, std::size_t waiting) : limit_(waiting), free_(threads) {
    for (std::size_t index = 0; index < threads; ++index) {
        threads_.emplace_back([this] { Work(); });
    }
}

WorkerPool::~WorkerPool() {
    Drain();
    for (std::thread& thread : threads_) {
        thread.join();
    }
}

bool WorkerPool::Submit(Job& job) {
    {
        const std::lock_guard<std::mutex> lock(mutex_);
        // A job for which a thread is free does not wait, even if the thread has not woken up yet.
        if (ending_ || waiting_.size() >= limit_ + free_) {
            return false;
        }
        waiting_.push_back(std::move(job));
    }
    changed_.notify_one();
    return true;
}

void WorkerPool::Drain() {
    std::deque<Job> refused;
    {
        const std::lock_guard<std::mutex> lock(mutex_);
        ending_ = true;
        refused.swap(waiting_);
    }
    changed_.notify_all();
    for (const Job& job : refused) {
        job.refuse();
    }
}

std::size_t WorkerPool::Running() const {
    const std::lock_guard<std::mutex> lock(mutex_);
    return running_;
}

std::size_t WorkerPool::Waiting() const {
    const std::lock_guard<std::mutex> lock(mutex_);
    return waiting_.size();
}

void WorkerPool::Work() {
    std::unique_lock<std::mutex> lock(mutex_);
    for (;;) {
        changed_.wait(lock, [this] { return ending_ || !waiting_.empty(); });
        if (waiting_.empty()) {
            return;
        }
        {
            const Job job = std::move(waiting_.front());
            waiting_.pop_front();
            ++running_;
            --free_;
            lock.unlock();
            job.run();
        }
        lock.lock();
        --running_;
        ++free_;
    }
}

}  // namespace appliance
