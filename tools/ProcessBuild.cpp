#include "tools/ProcessBuild.h"

#include <algorithm>
#include <chrono>
#include <filesystem>
#include <numeric>
#include <utility>

#include "host/base/Threads.h"
#include "platform/FileSystem.h"
#include "tools/BuildEnd.h"
#include "tools/PartQueue.h"
#include "tools/PlanMaking.h"
#include "tools/PlannedBuild.h"
#include "tools/TerminalProgress.h"

namespace zmctools {
namespace {

// The plan and the records of one command.
class PassingPlan {
public:
    PassingPlan(PyramidPlan made, const zmchost::BuildFile& file) : plan(std::move(made)) {
        plan.path = file.Path() + zmchost::BuildFile::kPlanEnding;
        plan.durable = false;
        plan.Write();
    }
    ~PassingPlan() {
        plan.Records().Remove();
        platform::RemoveEntry(plan.path);
    }
    PassingPlan(const PassingPlan&) = delete;
    PassingPlan& operator=(const PassingPlan&) = delete;

    PyramidPlan plan;
};

// One bar for all that pass over the pixels, once or twice.
class CommonBar {
public:
    CommonBar(const std::string& target, std::uint64_t pixels, bool wanted)
        : bar(std::filesystem::path(target).filename().string(), wanted), total(pixels) {}

    bool Pass(std::uint64_t pixels) {
        passed += pixels;
        return bar.Show(std::min(passed, total), total);
    }
    void GoOnWith(std::uint64_t pixels) { total += pixels; }

private:
    TerminalProgress bar;
    std::uint64_t passed = 0;
    std::uint64_t total;
};

BuildWords WithShare(BuildWords words, std::uint64_t memory, std::uint32_t processes) {
    constexpr std::uint64_t kLeast = std::uint64_t{32} << 20;
    words.memory = std::to_string(std::max(memory / processes, std::min(memory, kLeast)));
    return words;
}

}  // namespace

zmchost::BuildReport BuildInProcesses(const BuildWords& words, GDALDataset& dataset,
                                      zmcgdal::GdalRasterSource& pixels,
                                      const zmchost::BuildOptions& options, std::uint32_t processes,
                                      bool showsBar) {
    const auto start = std::chrono::steady_clock::now();
    const BuildWords shared = WithShare(words, options.memory, processes);
    const zelm::RasterProps props = pixels.Props();
    zmchost::BuildFile file(words.target, words.overwrite);
    if (!options.flush) file.LeaveToSystem();
    const PassingPlan passing(MakePlan(shared, dataset, pixels, shared.Options(props), file,
                                       PartSizeFor(props, processes)),
                              file);
    std::vector<std::uint64_t> parts(static_cast<std::size_t>(passing.plan.grid.Count()));
    std::iota(parts.begin(), parts.end(), 0);
    const std::uint64_t all = std::uint64_t{props.samples} * props.lines;
    CommonBar bar(words.target, all, showsBar);
    LocalParts crew{passing.plan.path,
                    words.target,
                    processes,
                    std::max(options.threads, 1u),
                    false,
                    [&](std::uint64_t passed) { return bar.Pass(passed); }};
    crew.Make(parts);
    PlannedBuild planned(passing.plan, zmchost::AvailableThreads());
    planned.progress = [&](const zmchost::BuildProgress&) { return bar.Pass(0); };
    BuildEnd end(*planned.dataset, words, planned.options);
    planned.Start();
    planned.Gather();
    if (planned.NeedsCounts()) {
        bar.GoOnWith(all);
        crew.count = true;
        crew.Make(std::move(parts));
    }
    zmchost::BuildReport report = planned.Finish(file);
    file.Commit();
    end.Settle();
    const auto time = std::chrono::steady_clock::now() - start;
    report.seconds = std::chrono::duration<double>(time).count();
    return report;
}

}  // namespace zmctools
