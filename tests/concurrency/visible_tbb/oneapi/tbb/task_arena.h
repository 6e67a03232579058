// A stand-in for the parts of TBB that the builder uses, for the thread sanitizer alone: it keeps
// what TBB promises of order between tasks, by mutexes and threads that the sanitizer sees, while
// TBB's own library is not instrumented and every hand-over in it looks like a race.
//
// Here: the arena, whose worker threads help with loops. They end with the arena.
#ifndef ZMC_TESTS_VISIBLE_TBB_TASK_ARENA_H
#define ZMC_TESTS_VISIBLE_TBB_TASK_ARENA_H

#include <condition_variable>
#include <deque>
#include <functional>
#include <mutex>
#include <new>
#include <thread>
#include <vector>

namespace tbb {

class task_arena {
public:
    explicit task_arena(int threads) : size(threads) {
        for (int i = 1; i < threads; ++i) workers.emplace_back([this] { Help(); });
    }
    ~task_arena() {
        {
            const std::lock_guard<std::mutex> lock(mutex);
            closed = true;
        }
        changed.notify_all();
        for (std::thread& worker : workers) worker.join();
    }
    task_arena(const task_arena&) = delete;
    task_arena& operator=(const task_arena&) = delete;

    template <class Task>
    void execute(const Task& task) {
        const Entered entered(this);
        task();
    }

    // The arena that the thread works in.
    static task_arena*& Current() {
        static thread_local task_arena* current = nullptr;
        return current;
    }
    class Entered {
    public:
        explicit Entered(task_arena* arena) : before(Current()) { Current() = arena; }
        ~Entered() { Current() = before; }
        Entered(const Entered&) = delete;
        Entered& operator=(const Entered&) = delete;

    private:
        task_arena* before;
    };

    int Size() const { return size; }
    void Offer(std::function<void()> help) {
        {
            const std::lock_guard<std::mutex> lock(mutex);
            offers.push_back(std::move(help));
        }
        changed.notify_one();
    }

private:
    int size;
    std::mutex mutex;
    std::condition_variable changed;
    std::deque<std::function<void()>> offers;
    bool closed = false;
    std::vector<std::thread> workers;

    void Help() {
        const Entered entered(this);
        for (;;) {
            std::unique_lock<std::mutex> lock(mutex);
            changed.wait(lock, [this] { return closed || !offers.empty(); });
            if (offers.empty()) return;
            const std::function<void()> help = std::move(offers.front());
            offers.pop_front();
            lock.unlock();
            help();
        }
    }
};

}  // namespace tbb

namespace oneapi {
namespace tbb = ::tbb;
}

#endif
