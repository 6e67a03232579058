// WorkQueue: jobs that wait for a fixed number of threads, and no more of them than are told.
//
// Every job that is taken runs, also when the queue ends: whoever ends it sees to it that jobs do
// little then. Any thread may call.
#ifndef ZMC_SERVE_WORKQUEUE_H
#define ZMC_SERVE_WORKQUEUE_H

#include <condition_variable>
#include <cstddef>
#include <deque>
#include <functional>
#include <mutex>
#include <thread>
#include <vector>

#include "serve/Metrics.h"

namespace zmcserve {

class WorkQueue {
public:
    using Job = std::function<void()>;

    // `mostWaiting` jobs may wait beside those that threads are at. Jobs throw nothing.
    WorkQueue(std::size_t threads, std::size_t mostWaiting, Metrics& counts);
    // Takes no more jobs, and waits for those that were taken.
    ~WorkQueue();
    WorkQueue(const WorkQueue&) = delete;
    WorkQueue& operator=(const WorkQueue&) = delete;

    // Promises room for one job, which Add has to follow; false where there is none.
    bool Reserve();
    void Add(Job job);

private:
    void Run();

    const std::size_t most;
    Metrics& metrics;
    mutable std::mutex mutex;  // guards what follows
    std::condition_variable changed;
    std::deque<Job> jobs;
    std::size_t reserved = 0;  // promised, those that wait and those that run included
    bool ending = false;
    std::vector<std::thread> workers;
};

}  // namespace zmcserve

#endif
