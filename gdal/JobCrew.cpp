#include "gdal/JobCrew.h"

#include <cpl_error.h>

#include <algorithm>
#include <atomic>
#include <exception>
#include <mutex>
#include <optional>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "gdal/ErrorCatcher.h"
#include "gdal/Reporting.h"

namespace zmcgdal {
namespace {

struct Failed {
    std::uint64_t job = 0;
    CPLErrorNum number = CPLE_AppDefined;
    std::string text;
};

struct Warned {
    std::uint64_t job = 0;  // the first that had it
    CaughtWarning warning;
};

class Crew {
public:
    Crew(std::uint64_t jobCount, const MakeWorker& make, const ShareDone& share)
        : jobs(jobCount), makeWorker(make), shareDone(share) {}

    bool Run(std::uint32_t threads);

private:
    const std::uint64_t jobs;
    const MakeWorker& makeWorker;
    const ShareDone& shareDone;
    std::atomic<std::uint64_t> next{0};
    std::atomic<std::uint64_t> done{0};
    std::atomic<bool> ended{false};
    std::uint64_t told = 0;  // jobs; the caller's alone, as is the next
    bool cancelled = false;
    std::mutex mutex;                 // guards what follows
    std::vector<std::uint64_t> left;  // jobs that a thread had no memory for
    std::optional<Failed> first;      // of the failures, by the number of the job
    std::vector<Warned> warned;       // no two texts alike

    std::optional<std::uint64_t> Take();
    std::optional<Failed> Try(const Worker& worker, std::uint64_t job) noexcept;
    void KeepWarnings(std::uint64_t job, std::vector<CaughtWarning> warnings);
    void TellWarnings();
    void Keep(Failed&& failed);
    void Help() noexcept;
    void WorkWith(const Worker& worker);
    void Lead(const Worker& worker);
    void DoLeft(const Worker& worker);
    void Tell();
};

std::optional<std::uint64_t> Crew::Take() {
    if (ended) return std::nullopt;
    const std::uint64_t job = next++;
    return job < jobs ? std::optional(job) : std::nullopt;
}

// Nothing if the job was done. What GDAL is told of it stays here. Without memory for the reason
// that is the reason: a text so short lies in the string itself.
std::optional<Failed> Crew::Try(const Worker& worker, std::uint64_t job) noexcept {
    std::vector<CaughtWarning> warnings;
    std::optional<Failed> failed;
    try {
        const ErrorCatcher errors(CE_Failure, &warnings);
        if (!Reporting(false, [&] { return worker(job); }))
            failed = errors.Text().empty() ? Failed{job, CPLE_AppDefined, "it failed"}
                                           : Failed{job, errors.Number(), errors.Text()};
    } catch (...) {
        failed = Failed{job, CPLE_OutOfMemory, "out of memory"};
    }
    try {
        KeepWarnings(job, std::move(warnings));
    } catch (const std::bad_alloc&) {
        return failed;  // warnings end no work
    }
    return failed;
}

void Crew::KeepWarnings(std::uint64_t job, std::vector<CaughtWarning> warnings) {
    if (warnings.empty()) return;
    const std::lock_guard lock(mutex);
    for (CaughtWarning& warning : warnings) {
        const auto same = std::find_if(warned.begin(), warned.end(), [&](const Warned& known) {
            return known.warning.text == warning.text;
        });
        if (same == warned.end())
            warned.push_back({job, std::move(warning)});
        else
            same->job = std::min(same->job, job);
    }
}

void Crew::TellWarnings() {
    std::stable_sort(warned.begin(), warned.end(),
                     [](const Warned& a, const Warned& b) { return a.job < b.job; });
    for (const Warned& each : warned)
        CPLError(CE_Warning, each.warning.number, "%s", each.warning.text.c_str());
}

void Crew::Keep(Failed&& failed) {
    const std::lock_guard lock(mutex);
    if (!first || failed.job < first->job) first = std::move(failed);
    ended = true;
}

// There is room for one job of each thread.
void Crew::WorkWith(const Worker& worker) {
    while (const auto job = Take()) {
        std::optional<Failed> failed = Try(worker, *job);
        if (failed && failed->number != CPLE_OutOfMemory) return Keep(std::move(*failed));
        if (failed) {
            const std::lock_guard lock(mutex);
            left.push_back(*job);
            return;
        }
        ++done;
    }
}

// Whoever cannot begin leaves all jobs to the others.
void Crew::Help() noexcept {
    try {
        WorkWith(makeWorker());
    } catch (...) {
        return;
    }
}

void Crew::Tell() {
    const std::uint64_t now = done;
    if (cancelled || !shareDone || now == told) return;
    told = now;
    if (shareDone(static_cast<double>(now) / static_cast<double>(jobs))) return;
    cancelled = true;
    ended = true;
}

void Crew::Lead(const Worker& worker) {
    while (const auto job = Take()) {
        if (std::optional<Failed> failed = Try(worker, *job)) return Keep(std::move(*failed));
        ++done;
        Tell();
    }
}

void Crew::DoLeft(const Worker& worker) {
    for (const std::uint64_t job : left) {
        if (ended) return;
        if (std::optional<Failed> failed = Try(worker, job)) return Keep(std::move(*failed));
        ++done;
        Tell();
    }
}

// Joins its threads when it goes, whatever happened.
class Helpers {
public:
    // As many as can be had.
    Helpers(std::uint32_t count, const std::function<void()>& help) {
        try {
            threads.reserve(count);
            while (threads.size() < count) threads.emplace_back(help);
        } catch (const std::exception&) {
            return;
        }
    }
    ~Helpers() {
        for (std::thread& thread : threads) thread.join();
    }
    Helpers(const Helpers&) = delete;
    Helpers& operator=(const Helpers&) = delete;

private:
    std::vector<std::thread> threads;
};

bool Crew::Run(std::uint32_t threads) {
    // No more than there are jobs, and the caller.
    threads = static_cast<std::uint32_t>(
        std::min<std::uint64_t>(threads, std::max<std::uint64_t>(jobs, 1)));
    left.reserve(threads);
    const Worker own = makeWorker();
    {
        const Helpers helpers(threads - 1, [this] { Help(); });
        Lead(own);
    }
    DoLeft(own);
    Tell();
    TellWarnings();
    if (cancelled)
        CPLError(CE_Failure, CPLE_UserInterrupt, "cancelled");
    else if (first)
        CPLError(CE_Failure, first->number, "%s", first->text.c_str());
    return !cancelled && !first;
}

}  // namespace

bool RunJobs(std::uint64_t jobs, std::uint32_t threads, const MakeWorker& makeWorker,
             const ShareDone& shareDone) {
    return Crew(jobs, makeWorker, shareDone).Run(threads);
}

}  // namespace zmcgdal
