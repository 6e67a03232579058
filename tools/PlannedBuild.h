// PlannedBuild: a plan with its source and its file open, for those who make parts and those who
// finish it.
//
// All of it is looked at before it is used: the file is the one that was laid out, and the source
// is what it was when the plan was made, before each part and behind it: of many rasters those that
// the part needs, and all of them in the end.
#ifndef ZMC_TOOLS_PLANNEDBUILD_H
#define ZMC_TOOLS_PLANNEDBUILD_H

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "gdal/GdalRasterSource.h"
#include "gdal/Mosaic.h"
#include "host/build/PartBuild.h"
#include "host/build/PartFolder.h"
#include "tools/PyramidPlan.h"
#include "tools/StoreParts.h"

namespace zmctools {

// "0-3, 7" of ascending numbers, cut where there are many.
std::string PartList(const std::vector<std::uint64_t>& parts);

class PlannedBuild {
public:
    using Kind = zmchost::PartFolder::Kind;

    // Throws Failure where plan, source and file are no longer those of each other.
    PlannedBuild(PyramidPlan openedPlan, std::uint32_t threads);
    PlannedBuild(const PlannedBuild&) = delete;
    PlannedBuild& operator=(const PlannedBuild&) = delete;

    // Shows how far a part, or the end, is; false cancels.
    std::function<bool(const zmchost::BuildProgress&)> progress;

    // Makes a part and leaves its record.
    void Make(std::uint64_t part);
    // Of a plan into a store, before Start: parts are made in a file of this process, in that
    // folder or, if it is empty, in the plan's. Throws UsageError for a folder that no plan into a
    // file has a use for.
    void UseScratch(const std::string& folder);
    // Takes the records of all parts. Throws Failure with those that are missing, damaged or not
    // what the file holds.
    void Gather();
    // Behind Gather: whether histograms need a second look at the pixels, and that look at a part,
    // which leaves a record too.
    bool NeedsCounts() { return build->NeedsCounts(); }
    void Count(std::uint64_t part);
    // Finishes the file, but for its name, which BuildEnd and BuildFile see to.
    zmchost::BuildReport Finish(zmchost::BuildFile& file);

    const PyramidPlan plan;
    const DatasetPtr dataset;
    zmcgdal::Mosaic* const mosaic;  // the dataset, if it is one
    zmcgdal::GdalRasterSource pixels;
    zmchost::BuildOptions options;  // what Start makes of it is fixed

    // Opens the file for Make, Gather and Finish, with the options as they are by then.
    void Start();
    // Of a plan into a store, and behind Finish: what sends the file there.
    StoreParts& Store() { return *store; }

private:
    void CheckSource() const;
    void Keep(Kind kind, std::uint64_t part, const zmchost::PartResult& result) const;

    void Open(std::optional<zmchost::PartBuild>& opened);
    bool IsWhole(std::uint64_t part);
    void CountInStore();

    zmchost::PartFolder records;
    std::optional<StoreParts> store;  // of a plan into one
    std::optional<zmchost::PartBuild> build;
};

}  // namespace zmctools

#endif
