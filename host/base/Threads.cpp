#include "host/base/Threads.h"

#include <oneapi/tbb/global_control.h>
#include <oneapi/tbb/info.h>
#include <oneapi/tbb/task_arena.h>

#include <algorithm>

namespace zmchost {
namespace {

namespace tbb = oneapi::tbb;

// Waits for the worker threads when it goes, whatever happened.
class WorkersEnd {
public:
    WorkersEnd() : handle(tbb::attach{}) {}
    ~WorkersEnd() { tbb::finalize(handle, std::nothrow); }
    WorkersEnd(const WorkersEnd&) = delete;
    WorkersEnd& operator=(const WorkersEnd&) = delete;

private:
    tbb::task_scheduler_handle handle;
};

}  // namespace

std::uint32_t AvailableThreads() {
    return static_cast<std::uint32_t>(std::max(1, tbb::info::default_concurrency()));
}

void RunWithThreads(std::uint32_t threads, const std::function<void()>& task) {
    const WorkersEnd workersEnd;
    const tbb::global_control limit(tbb::global_control::max_allowed_parallelism, threads);
    tbb::task_arena arena(static_cast<int>(threads));
    arena.execute(task);
}

}  // namespace zmchost
