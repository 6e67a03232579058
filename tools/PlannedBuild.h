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

private:
    void CheckSource() const;
    void Keep(Kind kind, std::uint64_t part, const zmchost::PartResult& result) const;

    zmchost::PartFolder records;
    std::optional<zmchost::PartBuild> build;
};

}  // namespace zmctools

#endif
