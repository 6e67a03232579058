// See task_arena.h.
#ifndef ZMC_TESTS_VISIBLE_TBB_INFO_H
#define ZMC_TESTS_VISIBLE_TBB_INFO_H

#include <thread>

namespace tbb::info {

inline int default_concurrency() { return static_cast<int>(std::thread::hardware_concurrency()); }

}  // namespace tbb::info

namespace oneapi {
namespace tbb = ::tbb;
}

#endif
