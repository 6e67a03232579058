#include "serve/WorkQueue.h"

namespace zmcserve {

WorkQueue::WorkQueue(std::size_t threads, std::size_t mostWaiting, Metrics& counts)
    : most(threads + mostWaiting), metrics(counts) {
    for (std::size_t i = 0; i < threads; ++i) workers.emplace_back([this] { Run(); });
}

WorkQueue::~WorkQueue() {
    {
        const std::lock_guard lock(mutex);
        ending = true;
    }
    changed.notify_all();
    for (std::thread& worker : workers) worker.join();
}

bool WorkQueue::Reserve() {
    const std::lock_guard lock(mutex);
    if (ending || reserved >= most) return false;
    ++reserved;
    ++metrics.waiting;
    return true;
}

void WorkQueue::Add(Job job) {
    {
        const std::lock_guard lock(mutex);
        jobs.push_back(std::move(job));
    }
    changed.notify_one();
}

void WorkQueue::Run() {
    std::unique_lock lock(mutex);
    for (;;) {
        changed.wait(lock, [this] { return ending || !jobs.empty(); });
        if (jobs.empty()) return;
        const Job job = std::move(jobs.front());
        jobs.pop_front();
        lock.unlock();
        --metrics.waiting;
        ++metrics.working;
        job();
        --metrics.working;
        lock.lock();
        --reserved;
    }
}

}  // namespace zmcserve
