// The pipeline, for items that are pointers and filters that are serial and in order: as many
// threads as there may be items under way take one item each through all filters. See task_arena.h.
#ifndef ZMC_TESTS_VISIBLE_TBB_PARALLEL_PIPELINE_H
#define ZMC_TESTS_VISIBLE_TBB_PARALLEL_PIPELINE_H

#include <algorithm>
#include <exception>

#include "oneapi/tbb/task_arena.h"

namespace tbb {

enum class filter_mode { serial_in_order };

class flow_control {
public:
    void stop() { stopped = true; }
    bool stopped = false;
};

using Stage = std::function<void*(void*, flow_control&)>;

template <class In, class Out>
struct filter {
    std::vector<Stage> stages;
};

template <class In, class Out, class Body>
filter<In, Out> make_filter(filter_mode, const Body& body) {
    return {{[&body](void* item, [[maybe_unused]] flow_control& control) -> void* {
        if constexpr (std::is_void_v<In>) {
            return body(control);
        } else if constexpr (std::is_void_v<Out>) {
            body(static_cast<In>(item));
            return nullptr;
        } else {
            return body(static_cast<In>(item));
        }
    }}};
}

template <class In, class Between, class Out>
filter<In, Out> operator&(filter<In, Between> first, const filter<Between, Out>& second) {
    first.stages.insert(first.stages.end(), second.stages.begin(), second.stages.end());
    return {first.stages};
}

class PipelineRun {
public:
    explicit PipelineRun(const std::vector<Stage>& pipelineStages)
        : stages(pipelineStages), turns(pipelineStages.size()) {}

    void TakeItems() {
        for (std::size_t item = 0; TakeItem(item);) {
        }
    }

    void RethrowFailure() const {
        if (failure) std::rethrow_exception(failure);
    }

private:
    const std::vector<Stage>& stages;
    std::mutex mutex;
    std::condition_variable changed;
    std::vector<std::size_t> turns;  // number of the item whose turn it is at each stage
    std::size_t tickets = 0;
    bool over = false;
    std::exception_ptr failure;

    // False when there is nothing left to take.
    bool TakeItem(std::size_t& ticket) {
        void* item = nullptr;
        {
            const std::lock_guard<std::mutex> lock(mutex);
            ticket = tickets++;
        }
        for (std::size_t i = 0; i < stages.size(); ++i) {
            std::unique_lock<std::mutex> lock(mutex);
            changed.wait(lock, [&] { return failure || (turns[i] == ticket); });
            if (failure || (i == 0 && over)) {
                ++turns[i];
                changed.notify_all();
                return false;
            }
            lock.unlock();
            flow_control control;
            std::exception_ptr thrown;
            try {
                item = stages[i](item, control);
            } catch (...) {
                thrown = std::current_exception();
            }
            lock.lock();
            ++turns[i];
            over = over || control.stopped;
            if (thrown && !failure) failure = thrown;
            changed.notify_all();
            if (control.stopped || failure) return false;
        }
        return true;
    }
};

inline void parallel_pipeline(std::size_t items, const filter<void, void>& chain) {
    task_arena* const arena = task_arena::Current();
    const std::size_t most = arena ? static_cast<std::size_t>(arena->Size()) : 1;
    PipelineRun run(chain.stages);
    std::vector<std::thread> threads;
    for (std::size_t i = 1; i < std::min(items, most); ++i)
        threads.emplace_back([&run, arena] {
            const task_arena::Entered entered(arena);
            run.TakeItems();
        });
    run.TakeItems();
    for (std::thread& thread : threads) thread.join();
    run.RethrowFailure();
}

}  // namespace tbb

#endif
