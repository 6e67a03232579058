#include <algorithm>
#include <cstdio>
#include <filesystem>

#include "gdal/Dataset.h"
#include "platform/FileSystem.h"
#include "tools/Arguments.h"
#include "tools/Command.h"
#include "tools/Interrupt.h"
#include "tools/MosaicSource.h"
#include "tools/PlanMaking.h"
#include "tools/SceneNames.h"
#include "tools/SourceState.h"
#include "tools/StoreParts.h"
#include "tools/StoreTarget.h"

namespace zmctools {
namespace {

namespace fs = std::filesystem;

constexpr const char* kRangeOption = "--upload-part";

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
    std::string planFile;
    std::string rangeSize;
    bool inStore = false;
    std::unique_ptr<zmcstore::ObjectStore> store;

    void CheckOptions();
    std::uint64_t LeastRange() const;
    PartSize Size(GDALDataset& dataset, const zelm::RasterProps& props,
                  const zmchost::BuildOptions& options) const;
    std::string StateInStore() const;
    void ClearTheWay() const;
    void BeginUpload(PyramidPlan& plan, const std::string& pyramid) const;
    void Write(PyramidPlan& plan) const;
    void Report(const PyramidPlan& plan, GDALDataset& dataset) const;
};

void PlanCommand::Describe(OptionTable& table) {
    words.Describe(table);
    table
        .Text("--part-size", partSize,
              "Pixels of a side of a part, or WIDTHxHEIGHT (default 8192, and whole lines of a "
              "source that is stored by lines)")
        .Named("N|WxH");
    table
        .Text("--plan", planFile,
              "File of the plan, for a target in a store (default: the name of the target with "
              ".zmcplan behind, in this folder)")
        .Named("FILE");
    table
        .Text(kRangeOption, rangeSize,
              "Least bytes of a part of the upload, for a target in a store (default 5M)")
        .Named("SIZE");
    table.Footer(
        "Examples:\n"
        "  zmcraster plan scene.tif scene.pyr\n"
        "  zmcraster part scene.pyr.zmcplan 0-7     # on one machine\n"
        "  zmcraster part scene.pyr.zmcplan 8-15    # on another one\n"
        "  zmcraster finish scene.pyr.zmcplan\n"
        "  zmcraster plan scene.tif s3://maps/scene.pyr\n"
        "\n"
        "The plan is TARGET.zmcplan; hidden files beside it hold what is done of the pyramid. "
        "The\n"
        "target appears when it is finished, and is then the one that build would make, byte for\n"
        "byte. --memory is for each process; a plan that is made anew with --overwrite drops what\n"
        "was done of the one before, and finish --discard does so for good.");
}

// What is left of plans that were given up, and with --overwrite the plan itself.
void PlanCommand::ClearTheWay() const {
    const std::string& path = planFile;
    std::error_code ignored;
    if (fs::exists(path, ignored)) {
        if (!words.overwrite)
            throw Failure(path, "there is a plan already; finish it, or drop it with --overwrite");
        DropPlan(PyramidPlan::Read(path));
    }
    zmchost::BuildFile::RemoveAbandoned(
        inStore ? path : words.target, [&](const std::string& name) {
            return fs::exists(path) && PyramidPlan::Read(path).pyramid == name;
        });
}

void PlanCommand::Report(const PyramidPlan& plan, GDALDataset& dataset) const {
    const zmchost::PartGrid& grid = plan.grid;
    if (json) {
        Json document({{"schema", kSchema},
                       {"plan", plan.path},
                       {"source", plan.words.source},
                       {"target", plan.words.target},
                       {"width", grid.width},
                       {"height", grid.height},
                       {"parts", grid.Count()},
                       {"partWidth", std::min<std::uint64_t>(grid.PartWidth(), grid.width)},
                       {"partHeight", std::min<std::uint64_t>(grid.PartHeight(), grid.height)},
                       {"partLevel", grid.level}});
        AddScenes(document, dataset);
        PrintDocument(document);
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

// What a target in a store needs besides, once the file is laid out.
void PlanCommand::BeginUpload(PyramidPlan& plan, const std::string& pyramid) const {
    plan.upload.bounds =
        UploadBounds(words.target, zmchost::PyramidHeader::Read(pyramid), plan.grid, LeastRange());
    plan.upload.mark = HexText(platform::RandomNumber());
    plan.upload.id = store->Begin(plan.upload.mark);
}

std::uint64_t PlanCommand::LeastRange() const {
    if (rangeSize.empty()) return zmcstore::kUsualLeastRange;
    const std::uint64_t size = ParseSize(kRangeOption, rangeSize);
    if (size == 0 || size > zmcstore::kMostRangeBytes / 2)
        throw UsageError(kRangeOption, "a part of an upload has from 1 byte to 2.5 GiB at least");
    return size;
}

// Throws Failure for an object that is not to be replaced; else gives what tells its state.
std::string PlanCommand::StateInStore() const {
    const zmcstore::ObjectState state = store->Look();
    if (state.exists && !words.overwrite)
        throw Failure(words.target, "the object exists already; --overwrite replaces it");
    return state.tag;
}

void PlanCommand::CheckOptions() {
    inStore = IsObjectName(words.target);
    if (!inStore && !(planFile.empty() && rangeSize.empty()))
        throw UsageError(planFile.empty() ? kRangeOption : "--plan",
                         "the target is a file, and its plan stands beside it");
    if (inStore)
        store = OpenStore(words.target);
    else
        words.CheckTarget();
    if (inStore && planFile.empty()) planFile = LastNameOf(words.target) + kPlanFileEnding;
    if (!inStore) planFile = words.target + kPlanFileEnding;
}

PartSize PlanCommand::Size(GDALDataset& dataset, const zelm::RasterProps& props,
                           const zmchost::BuildOptions& options) const {
    if (!partSize.empty()) return ParsePartSize(partSize);
    if (!inStore) return UsualPartSize(dataset);
    return StorePartSize(
        props,
        options.bands.empty() ? props.bands : static_cast<std::uint32_t>(options.bands.size()),
        LeastRange());
}

ExitStatus PlanCommand::Run() {
    const DatasetPtr dataset = words.OpenSource(!quiet);
    zmcgdal::GdalRasterSource pixels(*dataset);
    zmchost::BuildOptions options = words.Options(pixels.Props());
    options.threads = 1;
    CheckOptions();
    const PartSize size = Size(*dataset, pixels.Props(), options);
    CheckInterrupt(words.target);
    zmchost::PyramidBuilder(zmcgdal::SharedModule()).Check(pixels, words.target, options);
    for (const std::string& loss : pixels.Losses())
        Warn(words.source, "a pyramid does not keep " + loss);
    const std::string state = inStore ? StateInStore() : "";
    ClearTheWay();
    using Kind = zmchost::BuildFile::Kind;
    zmchost::BuildFile file(inStore ? planFile : words.target, words.overwrite,
                            inStore ? Kind::Outline : Kind::Plan);
    PyramidPlan plan = MakePlan(words, *dataset, pixels, options, file, size);
    if (inStore) plan.targetState = state;
    plan.path = planFile;
    plan.words.source = FromAnywhere(words.source);
    if (inStore) BeginUpload(plan, file.Path());
    Write(plan);
    file.Keep();
    Report(plan, *dataset);
    TellLeftOut(*dataset);
    return ExitStatus::Done;
}

// An upload that no plan tells of would stay in the store for good.
void PlanCommand::Write(PyramidPlan& plan) const try { plan.Write(); } catch (...) {
    if (inStore) store->Abort(plan.upload.id);
    throw;
}

}  // namespace

std::unique_ptr<Command> MakePlanCommand() { return std::make_unique<PlanCommand>(); }

}  // namespace zmctools
