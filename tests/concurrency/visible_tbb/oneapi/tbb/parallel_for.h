// The loop: the calling thread and those of its arena take the next index until none is left. See
// task_arena.h.
#ifndef ZMC_TESTS_VISIBLE_TBB_PARALLEL_FOR_H
#define ZMC_TESTS_VISIBLE_TBB_PARALLEL_FOR_H

#include <exception>
#include <memory>

#include "oneapi/tbb/task_arena.h"

namespace tbb {

struct simple_partitioner {};

template <class Index, class Body>
class Loop {
public:
    Loop(Index begin, Index end, const Body& loopBody)
        : next(begin), last(end), left(end - begin), body(loopBody) {}

    void Work() {
        std::unique_lock<std::mutex> lock(mutex);
        while (next < last) {
            const Index index = next++;
            lock.unlock();
            std::exception_ptr thrown;
            try {
                body(index);
            } catch (...) {
                thrown = std::current_exception();
            }
            lock.lock();
            if (thrown && !failure) failure = thrown;
            if (--left == 0) finished.notify_all();
        }
    }

    void WorkAndWait() {
        Work();
        std::unique_lock<std::mutex> lock(mutex);
        finished.wait(lock, [this] { return left == 0; });
        if (failure) std::rethrow_exception(failure);
    }

private:
    std::mutex mutex;
    std::condition_variable finished;
    Index next, last, left;
    std::exception_ptr failure;
    const Body& body;
};

template <class Index, class Body>
void parallel_for(Index begin, Index end, const Body& body, simple_partitioner) {
    if (!(begin < end)) return;
    // A helper that comes late finds nothing left to do; it keeps the loop for that.
    const auto loop = std::make_shared<Loop<Index, Body>>(begin, end, body);
    if (task_arena* const arena = task_arena::Current())
        for (int i = 1; i < arena->Size(); ++i) arena->Offer([loop] { loop->Work(); });
    loop->WorkAndWait();
}

}  // namespace tbb

#endif
