#include <algorithm>
#include <cstdio>
#include <filesystem>

#include "gdal/Dataset.h"
#include "tools/Arguments.h"
#include "tools/Command.h"
#include "tools/Interrupt.h"
#include "tools/PlanMaking.h"
#include "tools/SourceState.h"

namespace zmctools {
namespace {

namespace fs = std::filesystem;

class PlanCommand final : public Command {
public:
    PlanCommand() { words.memory = "64M"; }
    const char* Name() const override { return "plan"; }
    const char* Summary() const override {
        return "Lay a pyramid out, to be built in parts by many processes";
    }
    void Describe(OptionTable& table) override;
    ExitStatus Run() override;

private:
    BuildWords words;
    std::string partSize;

    void ClearTheWay() const;
    void Report(const PyramidPlan& plan) const;
};

void PlanCommand::Describe(OptionTable& table) {
    words.Describe(table);
    table
        .Text("--part-size", partSize,
              "Pixels of a side of a part, or WIDTHxHEIGHT (default 8192, and whole lines of a "
              "source that is stored by lines)")
        .Named("N|WxH");
    table.Footer(
        "Examples:\n"
        "  zmcraster plan scene.tif scene.pyr\n"
        "  zmcraster part scene.pyr.zmcplan 0-7     # on one machine\n"
        "  zmcraster part scene.pyr.zmcplan 8-15    # on another one\n"
        "  zmcraster finish scene.pyr.zmcplan\n"
        "\n"
        "The plan is TARGET.zmcplan; hidden files beside it hold what is done of the pyramid. "
        "The\n"
        "target appears when it is finished, and is then the one that build would make, byte for\n"
        "byte. --memory is for each process; a plan that is made anew with --overwrite drops what\n"
        "was done of the one before, and finish --discard does so for good.");
}

// What is left of plans that were given up, and with --overwrite the plan itself.
void PlanCommand::ClearTheWay() const {
    const std::string path = words.target + kPlanFileEnding;
    std::error_code ignored;
    if (fs::exists(path, ignored)) {
        if (!words.overwrite)
            throw Failure(path, "there is a plan already; finish it, or drop it with --overwrite");
        PyramidPlan::Read(path).Discard();
    }
    zmchost::BuildFile::RemoveAbandoned(words.target, [&](const std::string& name) {
        return fs::exists(path) && PyramidPlan::Read(path).pyramid == name;
    });
}

void PlanCommand::Report(const PyramidPlan& plan) const {
    const zmchost::PartGrid& grid = plan.grid;
    if (json) {
        PrintDocument({{"schema", kSchema},
                       {"plan", plan.path},
                       {"source", plan.words.source},
                       {"target", plan.words.target},
                       {"width", grid.width},
                       {"height", grid.height},
                       {"parts", grid.Count()},
                       {"partWidth", std::min<std::uint64_t>(grid.PartWidth(), grid.width)},
                       {"partHeight", std::min<std::uint64_t>(grid.PartHeight(), grid.height)},
                       {"partLevel", grid.level}});
    } else if (!quiet) {
        std::printf(
            "%s: %llu part%s of %llu x %llu pixels at the most, levels 0 to %u of each\n",
            Visible(plan.path).c_str(), static_cast<unsigned long long>(grid.Count()),
            grid.Count() == 1 ? "" : "s",
            static_cast<unsigned long long>(std::min<std::uint64_t>(grid.PartWidth(), grid.width)),
            static_cast<unsigned long long>(
                std::min<std::uint64_t>(grid.PartHeight(), grid.height)),
            grid.level);
    }
}

ExitStatus PlanCommand::Run() {
    const DatasetPtr dataset = words.OpenSource();
    zmcgdal::GdalRasterSource pixels(*dataset);
    zmchost::BuildOptions options = words.Options(pixels.Props());
    options.threads = 1;
    const PartSize size = partSize.empty() ? UsualPartSize(*dataset) : ParsePartSize(partSize);
    words.CheckTarget();
    CheckInterrupt(words.target);
    zmchost::PyramidBuilder(zmcgdal::SharedModule()).Check(pixels, words.target, options);
    for (const std::string& loss : pixels.Losses())
        Warn(words.source, "a pyramid does not keep " + loss);
    ClearTheWay();
    zmchost::BuildFile file(words.target, words.overwrite, zmchost::BuildFile::Kind::Plan);
    PyramidPlan plan = MakePlan(words, *dataset, pixels, options, file, size);
    plan.path = words.target + kPlanFileEnding;
    plan.words.source = words.SourceFromAnywhere();
    plan.Write();
    file.Keep();
    Report(plan);
    return ExitStatus::Done;
}

}  // namespace

std::unique_ptr<Command> MakePlanCommand() { return std::make_unique<PlanCommand>(); }

}  // namespace zmctools
