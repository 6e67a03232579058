// RunJobs: numbered jobs, done by several threads that take them in order.
//
// The thread that calls is one of them, and alone if no other can be had. Where a job fails, no
// further one is begun, and GDAL is told once, on the thread that called: of the failed job with
// the lowest number, which is the one that would have failed first without other threads. Warnings
// it is told there before, by the numbers of their jobs, each text once, as far as memory allows.
// What a thread has no memory for, the caller tries again by itself.
#ifndef ZMC_GDAL_JOBCREW_H
#define ZMC_GDAL_JOBCREW_H

#include <cstdint>
#include <functional>

namespace zmcgdal {

// Does the job of a number; false, reported to GDAL, or an exception, where it fails.
using Worker = std::function<bool(std::uint64_t job)>;
// Makes what works on one thread, on that thread.
using MakeWorker = std::function<Worker()>;
// Is told the share of jobs that are done, on the thread that called, never less than before and 1
// in the end; false ends the work.
using ShareDone = std::function<bool(double share)>;

// Does the jobs from 0 to `jobs` - 1 on as many threads, and waits for all of them. False, reported
// to GDAL, where one has failed or `shareDone`, which may be empty, has ended the work. Throws what
// making the caller's own worker throws.
bool RunJobs(std::uint64_t jobs, std::uint32_t threads, const MakeWorker& makeWorker,
             const ShareDone& shareDone);

}  // namespace zmcgdal

#endif
