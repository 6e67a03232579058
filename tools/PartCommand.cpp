#include "host/base/Error.h"
#include "platform/Interrupts.h"
#include "tools/Arguments.h"
#include "tools/Command.h"
#include "tools/Interrupt.h"
#include "tools/PartQueue.h"
#include "tools/PlannedBuild.h"
#include "tools/TerminalProgress.h"

namespace zmctools {
namespace {

class PartCommand final : public Command {
public:
    const char* Name() const override { return "part"; }
    const char* Summary() const override { return "Build parts of a pyramid that was planned"; }
    void Describe(OptionTable& table) override;
    ExitStatus Run() override;

private:
    std::string file;
    std::vector<std::string> names;
    std::string threads = "1";
    std::string scratch;
    bool count = false;
    bool queue = false;

    std::vector<std::uint64_t> Numbers(const zmchost::PartGrid& grid) const;
    void Make(PlannedBuild& build, std::uint64_t part) const;
    void MakeNamed(PlannedBuild& build, const std::vector<std::uint64_t>& numbers) const;
    void MakeQueued(PlannedBuild& build) const;
};

void PartCommand::Describe(OptionTable& table) {
    table.Text("PLAN", file, "File that plan has made").Required();
    table.Names("K", names, "Parts, counted from 0; 4-7 are four of them").Named("");
    table.Flag("--count", count,
               "Look at the parts for the second time, for histograms of types of more than 16 "
               "bits; when all parts are made");
    table.Flag("--queue", queue,
               "Take the numbers from standard input, eight digits and an end of line each, until "
               "it ends; processes may share one pipe");
    table.Text("--threads", threads, "Threads to work with (default 1)").Named("N");
    table
        .Text("--scratch", scratch,
              "Folder for the file that a part of a target in a store is made in (default: that of "
              "the plan)")
        .Named("FOLDER");
    table.Footer(
        "Examples:\n"
        "  zmcraster part scene.pyr.zmcplan 0 1 2\n"
        "  zmcraster part scene.pyr.zmcplan 8-15 --threads 4\n"
        "  seq -f %08g 0 15 | zmcraster part scene.pyr.zmcplan --queue\n"
        "\n"
        "A part may be made at any time, also again, or twice at once: its tiles are the same. A\n"
        "record of it appears when its tiles are on the disk. --count is not needed: finish looks "
        "at\n"
        "what nobody has looked at.");
}

std::uint64_t PartNumber(const std::string& text, const zmchost::PartGrid& grid) {
    const std::uint64_t number = ParseCount("K", text, zmchost::kMostParts);
    if (number >= grid.Count())
        throw UsageError("K", "there is no part " + std::to_string(number) + "; the plan has " +
                                  std::to_string(grid.Count()) + ", counted from 0");
    return number;
}

std::vector<std::uint64_t> PartCommand::Numbers(const zmchost::PartGrid& grid) const {
    std::vector<std::uint64_t> numbers;
    for (const std::string& name : names) {
        const std::size_t dash = name.find('-');
        const std::uint64_t first = PartNumber(name.substr(0, dash), grid);
        const std::uint64_t last =
            dash == name.npos ? first : PartNumber(name.substr(dash + 1), grid);
        if (last < first) throw UsageError("K", name + " names no part");
        for (std::uint64_t part = first; part <= last; ++part) numbers.push_back(part);
    }
    return numbers;
}

void PartCommand::Make(PlannedBuild& build, std::uint64_t part) const {
    CheckInterrupt(build.plan.words.target);
    try {
        count ? build.Count(part) : build.Make(part);
    } catch (const zmchost::Cancelled&) {
        throw Interruption(build.plan.words.target);
    }
}

void PartCommand::MakeNamed(PlannedBuild& build, const std::vector<std::uint64_t>& numbers) const {
    TerminalProgress bar(build.plan.words.target, !quiet);
    double done = 0;
    build.progress = [&](const zmchost::BuildProgress& state) {
        const auto all = static_cast<double>(numbers.size());
        return bar.ShowShare(
            (done + static_cast<double>(state.done) / static_cast<double>(state.total)) / all);
    };
    for (const std::uint64_t part : numbers) {
        Make(build, part);
        ++done;
    }
    if (json)
        PrintDocument({{"schema", kSchema},
                       {"plan", build.plan.path},
                       {"parts", numbers},
                       {"counted", count}});
}

// Whoever fills the queue is told of each part as soon as it is done.
void PartCommand::MakeQueued(PlannedBuild& build) const {
    PartQueue::Reports reports;
    build.progress = [&](const zmchost::BuildProgress& state) {
        reports.Passed(state.done);
        return !platform::IsInterrupted();
    };
    for (std::string piece = PartQueue::Take(); !piece.empty(); piece = PartQueue::Take()) {
        const std::uint64_t part = PartNumber(piece, build.plan.grid);
        Make(build, part);
        reports.Done(part);
    }
    CheckInterrupt(build.plan.words.target);
}

ExitStatus PartCommand::Run() {
    if (queue == !names.empty())
        throw UsageError("K", queue ? "--queue takes the numbers from standard input"
                                    : "name the parts to make");
    const auto workers = static_cast<std::uint32_t>(ParseCount("--threads", threads, 1024));
    const PyramidPlan plan = PyramidPlan::Read(file);
    if (!queue) Numbers(plan.grid);
    PlannedBuild build(plan, workers);
    build.UseScratch(scratch);
    build.Start();
    if (count) build.Gather();
    const bool wanted = !count || build.NeedsCounts();
    if (!queue)
        MakeNamed(build, wanted ? Numbers(plan.grid) : std::vector<std::uint64_t>());
    else if (wanted)
        MakeQueued(build);
    return ExitStatus::Done;
}

}  // namespace

std::unique_ptr<Command> MakePartCommand() { return std::make_unique<PartCommand>(); }

}  // namespace zmctools
