#include "tools/PlannedBuild.h"

#include <utility>

#include "gdal/Dataset.h"
#include "platform/FileSystem.h"
#include "tools/Message.h"
#include "tools/SourceState.h"

namespace zmctools {

std::string PartList(const std::vector<std::uint64_t>& parts) {
    constexpr std::size_t kMost = 20;
    std::string text;
    std::size_t ranges = 0;
    for (std::size_t i = 0; i < parts.size(); ++ranges) {
        std::size_t last = i;
        while (last + 1 < parts.size() && parts[last + 1] == parts[last] + 1) ++last;
        if (ranges == kMost) return text + ", ...";
        text += (i == 0 ? "" : ", ") + std::to_string(parts[i]);
        if (last != i) text += '-' + std::to_string(parts[last]);
        i = last + 1;
    }
    return text;
}

PlannedBuild::PlannedBuild(PyramidPlan openedPlan, std::uint32_t threads)
    : plan(std::move(openedPlan)),
      dataset(plan.OpenSource()),
      mosaic(dynamic_cast<zmcgdal::Mosaic*>(dataset.get())),
      pixels(*dataset),
      options(plan.words.Options(pixels.Props())),
      records(plan.Records()) {
    options.threads = threads;
    options.progress = [this](const zmchost::BuildProgress& state) {
        return !progress || progress(state);
    };
    plan.CheckFile();
    CheckSource();
    if (plan.IsInStore()) store.emplace(plan);
}

void PlannedBuild::UseScratch(const std::string& folder) {
    if (store)
        store->UseScratch(folder);
    else if (!folder.empty())
        throw UsageError("--scratch", "the target is a file, which is written in its place");
}

// Of many rasters those that were read since the last call.
void PlannedBuild::CheckSource() const {
    if (mosaic) return mosaic->CheckRead();
    if (SourceState(*dataset) != plan.sourceState)
        throw Failure(plan.words.source, "it changed since the plan was made");
}

void PlannedBuild::Open(std::optional<zmchost::PartBuild>& opened) {
    opened.emplace(zmcgdal::SharedModule(), pixels, plan.words.target, options,
                   store ? store->Path() : plan.PyramidPath());
    opened->SetGrid(plan.grid);
}

void PlannedBuild::Start() {
    Open(build);
    if (build->Facts() != plan.facts)
        throw Failure(plan.words.source, "it is not what the plan was made for");
    KeepBlocksForStrips(*dataset, plan.grid.PartWidth() + plan.grid.PartWidth() / 50);
}

void PlannedBuild::Keep(Kind kind, std::uint64_t part, const zmchost::PartResult& result) const {
    const bool written =
        !plan.durable || kind == Kind::Count || platform::SyncFile(plan.PyramidPath());
    const std::string reason = platform::LastErrorText();
    CheckSource();
    // What was finished meanwhile is not there to be written any more.
    plan.CheckFile();
    if (!written) throw Failure(plan.words.target, "it cannot be written to the disk: " + reason);
    records.Keep(kind, part, result);
}

void PlannedBuild::Make(std::uint64_t part) {
    CheckSource();
    plan.CheckFile();
    if (store) store->Clear();
    const zmchost::PartResult result = build->Make(part);
    if (store) store->Send(part);
    Keep(Kind::Part, part, result);
}

bool PlannedBuild::IsWhole(std::uint64_t part) {
    const auto result = records.Find(Kind::Part, part);
    return result && (!store || store->Restore(part)) && build->Take(part, *result);
}

void PlannedBuild::Gather() {
    std::vector<std::uint64_t> missing;
    for (std::uint64_t part = 0; part < plan.grid.Count(); ++part)
        if (!IsWhole(part)) missing.push_back(part);
    if (missing.empty()) return;
    throw Failure(plan.path, std::to_string(missing.size()) + " of " +
                                 std::to_string(plan.grid.Count()) +
                                 " parts are missing: " + PartList(missing));
}

// The tiles that a store has are made once more to be counted.
void PlannedBuild::Count(std::uint64_t part) {
    if (store) {
        std::optional<zmchost::PartBuild> again;
        Open(again);
        again->Make(part);
    }
    Keep(Kind::Count, part, {0, build->Count(part)});
    if (store) store->Drop(part);
}

// All of it before any is taken.
void PlannedBuild::CountInStore() {
    for (std::uint64_t part = 0; part < plan.grid.Count(); ++part)
        if (!records.Find(Kind::Count, part)) Count(part);
}

// What was not counted yet, or not with these minima and maxima, is counted now.
zmchost::BuildReport PlannedBuild::Finish(zmchost::BuildFile& file) {
    if (store && NeedsCounts()) CountInStore();
    for (std::uint64_t part = 0; NeedsCounts() && part < plan.grid.Count(); ++part) {
        const auto counts = records.Find(Kind::Count, part);
        const bool taken = counts && build->TakeCounts(part, counts->sums);
        if (store && !taken)
            throw Failure(plan.path, "the counts of part " + std::to_string(part) +
                                         " are of other pixels; make them anew with part " +
                                         std::to_string(part) + " --count");
    }
    const zmchost::BuildReport report = build->Finish(file);
    if (mosaic)
        mosaic->CheckAll();
    else
        CheckSource();
    return report;
}

}  // namespace zmctools
