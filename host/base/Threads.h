// RunWithThreads: work on a given number of threads, none of which stays behind.
#ifndef ZMC_HOST_BASE_THREADS_H
#define ZMC_HOST_BASE_THREADS_H

#include <cstdint>
#include <functional>

namespace zmchost {

// Processors of this machine that the process may use, at least 1.
std::uint32_t AvailableThreads();

// The most threads that a task can ask for: each takes a stack and a slot of the arena, and many
// thousands of them end the process.
inline constexpr std::uint32_t kMaxThreads = 1024;

// Runs `task` in a task arena of that many threads, the caller's among them, and waits for the
// other threads to end, unless somebody else in the process is using them. Exceptions of the task
// come out.
void RunWithThreads(std::uint32_t threads, const std::function<void()>& task);

}  // namespace zmchost

#endif
