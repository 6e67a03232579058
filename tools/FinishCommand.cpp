#include <filesystem>

#include "gdal/Sidecar.h"
#include "gdal/SidecarStage.h"
#include "host/base/Error.h"
#include "tools/Arguments.h"
#include "tools/BuildEnd.h"
#include "tools/Command.h"
#include "tools/MosaicSource.h"
#include "tools/PlannedBuild.h"
#include "tools/SourceState.h"
#include "tools/StoreTarget.h"
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

    std::uint32_t Threads() const {
        return static_cast<std::uint32_t>(ParseCount("--threads", threads, 1024));
    }
    void CheckTarget(const PyramidPlan& plan) const;
    zmchost::BuildReport Finish(PlannedBuild& build) const;
    zmchost::BuildReport FinishFile(PlannedBuild& build) const;
    zmchost::BuildReport FinishInStore(PlannedBuild& build) const;
    bool IsInStoreAlready(const PyramidPlan& plan) const;
    ExitStatus RunInStore(const PyramidPlan& plan) const;
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

zmchost::BuildReport FinishCommand::FinishFile(PlannedBuild& build) const {
    const BuildWords& words = build.plan.words;
    zmchost::BuildFile made(words.target, words.overwrite || overwrite, build.plan.PyramidPath());
    BuildEnd end(*build.dataset, words, build.options);
    build.Start();
    build.Gather();
    zmchost::BuildReport report = build.Finish(made);
    made.Commit();
    end.Settle();
    return report;
}

// Also by one who was ended right behind that. Throws Failure where the object is somebody else's.
bool FinishCommand::IsInStoreAlready(const PyramidPlan& plan) const {
    const zmcstore::ObjectState state = OpenStore(plan.words.target)->Look();
    if (state.exists && state.mark == plan.upload.mark) return true;
    if (state.exists && state.tag != plan.targetState && !overwrite && !plan.words.overwrite)
        throw Failure(plan.words.target,
                      "the object has changed since the plan was made; --overwrite replaces it");
    return false;
}

// What stands beside the object goes up before it appears.
zmchost::BuildReport FinishCommand::FinishInStore(PlannedBuild& build) const {
    BuildWords local = build.plan.words;
    local.target = build.plan.LocalName();
    zmchost::BuildFile made(local.target, true, build.plan.PyramidPath());
    BuildEnd end(*build.dataset, local, build.options);
    build.Start();
    build.Gather();
    zmchost::BuildReport report = build.Finish(made);
    build.Store().SendRest();
    for (const char* const ending : {zmcgdal::kSidecarEnding, zmcgdal::kMaskEnding})
        build.Store().PutBeside(ending, end.Companions().Written(ending));
    build.Store().Complete();
    return report;
}

ExitStatus FinishCommand::RunInStore(const PyramidPlan& plan) const {
    if (discard) {
        DropPlan(plan);
        return ExitStatus::Done;
    }
    if (IsInStoreAlready(plan)) {
        plan.Discard();
        return ExitStatus::Done;
    }
    PlannedBuild build(plan, Threads());
    const zmchost::BuildReport report = Finish(build);
    plan.Discard();
    Report(build, report);
    return ExitStatus::Done;
}

zmchost::BuildReport FinishCommand::Finish(PlannedBuild& build) const {
    const BuildWords& words = build.plan.words;
    TerminalProgress bar(std::filesystem::path(words.target).filename().string(), !quiet);
    build.progress = [&](const zmchost::BuildProgress& state) {
        return bar.Show(state.done, state.total);
    };
    try {
        return build.plan.IsInStore() ? FinishInStore(build) : FinishFile(build);
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
    if (plan.IsInStore()) return RunInStore(plan);
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
    PlannedBuild build(plan, Threads());
    const zmchost::BuildReport report = Finish(build);
    plan.Discard();
    Report(build, report);
    TellLeftOut(*build.dataset);
    return ExitStatus::Done;
}

}  // namespace

std::unique_ptr<Command> MakeFinishCommand() { return std::make_unique<FinishCommand>(); }

}  // namespace zmctools
