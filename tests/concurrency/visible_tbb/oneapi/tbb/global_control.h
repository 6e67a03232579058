// Stand-ins without effect: the arena alone decides how many threads there are, and waits for them.
// See task_arena.h.
#ifndef ZMC_TESTS_VISIBLE_TBB_GLOBAL_CONTROL_H
#define ZMC_TESTS_VISIBLE_TBB_GLOBAL_CONTROL_H

#include <cstddef>
#include <new>

namespace tbb {

struct attach {};

class task_scheduler_handle {
public:
    explicit task_scheduler_handle(attach) {}
};

inline bool finalize(task_scheduler_handle&, const std::nothrow_t&) noexcept { return true; }

class global_control {
public:
    enum parameter { max_allowed_parallelism };
    global_control(parameter, std::size_t) {}
};

}  // namespace tbb

namespace oneapi {
namespace tbb = ::tbb;
}

#endif
