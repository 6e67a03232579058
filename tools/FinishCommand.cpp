#include <filesystem>

#include "gdal/SidecarStage.h"
#include "host/base/Error.h"
#include "tools/Arguments.h"
#include "tools/BuildEnd.h"
#include "tools/Command.h"
#include "tools/MosaicSource.h"
#include "tools/PlannedBuild.h"
#include "tools/SourceState.h"
#include "tools/TerminalProgress.h"

namespace zmctools {
namespace {

class FinishCommand final : public Command {
public:
    const char* Name() const override { return "finish"; }
    const char* Summary() const override {
        return "Finish a pyramid whose parts have been built, and give it its name";
    }
    void Describe(OptionTable& table) override;
    ExitStatus Run() override;

private:
    std::string file;
    std::string threads = "0";
    bool overwrite = false;
    bool discard = false;

    void CheckTarget(const PyramidPlan& plan) const;
    zmchost::BuildReport Finish(PlannedBuild& build) const;
    void Report(const PlannedBuild& build, const zmchost::BuildReport& report) const;
};

void FinishCommand::Describe(OptionTable& table) {
    table.Text("PLAN", file, "File that plan has made").Required();
    table.Text("--threads", threads, "Threads to work with (default: all processors)").Named("N");
    table.Flag("--overwrite", overwrite, "Replace a target that has come since the plan was made");
    table.Flag("--discard", discard, "Finish nothing: drop the plan and all that was done");
    table.Footer(
        "Examples:\n"
        "  zmcraster finish scene.pyr.zmcplan\n"
        "  zmcraster finish scene.pyr.zmcplan --discard\n"
        "\n"
        "Makes the levels above the parts, stores statistics, histograms and metadata, looks at "
        "the\n"
        "file once more and gives it its name. Parts that are missing are named, and nothing is "
        "lost\n"
        "then: make them, and finish again. The plan goes with the last step.");
}

// A target that the plan did not know of is somebody else's work.
void FinishCommand::CheckTarget(const PyramidPlan& plan) const {
    const std::string state = FileState(plan.words.target);
    if (state.empty() || state == plan.targetState || overwrite) return;
    throw Failure(plan.words.target,
                  "the file has changed since the plan was made; --overwrite replaces it");
}

zmchost::BuildReport FinishCommand::Finish(PlannedBuild& build) const {
    const BuildWords& words = build.plan.words;
    TerminalProgress bar(std::filesystem::path(words.target).filename().string(), !quiet);
    build.progress = [&](const zmchost::BuildProgress& state) {
        return bar.Show(state.done, state.total);
    };
    zmchost::BuildFile made(words.target, words.overwrite || overwrite, build.plan.PyramidPath());
    BuildEnd end(*build.dataset, words, build.options);
    build.Start();
    try {
        build.Gather();
        const zmchost::BuildReport report = build.Finish(made);
        made.Commit();
        end.Settle();
        return report;
    } catch (const zmchost::Cancelled&) {
        throw Interruption(words.target);
    }
}

void FinishCommand::Report(const PlannedBuild& build, const zmchost::BuildReport& report) const {
    const std::uint32_t pixelType = build.pixels.Props().pixelType;
    if (json)
        PrintDocument(BuildDocument(build.plan.words, report, pixelType, *build.dataset));
    else if (!quiet)
        PrintFinished(build.plan.words, report, pixelType);
}

ExitStatus FinishCommand::Run() {
    const PyramidPlan plan = PyramidPlan::Read(file);
    const bool finished = plan.IsFinished();
    if (finished) {
        // By one who was ended right behind that: what stands beside it has yet to get its names.
        const zmcgdal::SidecarStage settled(plan.words.target);
    }
    if (discard || finished) {
        plan.Discard();
        return ExitStatus::Done;
    }
    CheckTarget(plan);
    PlannedBuild build(plan, static_cast<std::uint32_t>(ParseCount("--threads", threads, 1024)));
    const zmchost::BuildReport report = Finish(build);
    plan.Discard();
    Report(build, report);
    TellLeftOut(*build.dataset);
    return ExitStatus::Done;
}

}  // namespace

std::unique_ptr<Command> MakeFinishCommand() { return std::make_unique<FinishCommand>(); }

}  // namespace zmctools
