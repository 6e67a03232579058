// PartBuild: a build whose parts any number of processes make, in one file and without a word
// between them.
//
// Each tile's place is settled when the file is laid out (PyramidBuilder::LayOut), so who makes a
// part writes its tiles and nothing else: the same bytes however often, in whatever order and at
// whatever time, on any machine that sees the source and the file. What the statistics need of a
// part comes out as numbers that are exact, and are kept by the caller (PartFolder.h). Somebody
// takes all of them in and finishes the file: levels above the parts, statistics, documents. It is
// then that of PyramidBuilder::Build, byte for byte.
//
//     PartBuild build(module, source, "scene.pyr", options, file.Path());
//     const PartGrid grid = build.Plan(8192, 8192);
//     build.SetGrid(grid);
//     for (part = 0; part < grid.Count(); ++part) results[part] = build.Make(part);  // anywhere
//     for (part = 0; part < grid.Count(); ++part) build.Take(part, results[part]);   // in one
//     place build.Finish(file, ...);
//
// Source, target and options are those of PyramidBuilder, and the same in all processes but for
// threads. Histograms of types with more than 16 bits need minimum and maximum of the whole raster
// first, and a second look at the pixels then: Finish takes it, unless others did it part by part
// with Count. One thread at a time. What fails is thrown as PyramidBuilder does, and a part that
// failed can be made again.
#ifndef ZMC_HOST_BUILD_PARTBUILD_H
#define ZMC_HOST_BUILD_PARTBUILD_H

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "host/build/PartGrid.h"
#include "host/build/PyramidBuilder.h"

namespace zmchost {

class BuildRun;

// What making a part tells of it.
struct PartResult {
    std::uint64_t tiles = 0;  // a sum over its tiles of the grid's level, to know them again by
    std::string sums;         // for the statistics, packed; bytes that mean something here alone

    bool operator==(const PartResult&) const = default;
};

class PartBuild {
public:
    // `laidOut` is the file, which LayOut has made for the same source and options.
    PartBuild(ModulePtr module, RasterSource& source, const std::string& target,
              const BuildOptions& options, const std::string& laidOut);
    ~PartBuild();
    PartBuild(const PartBuild&) = delete;
    PartBuild& operator=(const PartBuild&) = delete;

    // Parts of about that many pixels, as the memory in the options has room for.
    PartGrid Plan(std::uint32_t partWidth, std::uint32_t partHeight);
    // The grid that was planned, here or elsewhere. Throws Error for one that is of another raster
    // or cannot be.
    void SetGrid(const PartGrid& planned);
    // A number that is another one, as a rule, where the source tells something else of itself or
    // the options do. Pixels are not looked at.
    std::uint64_t Facts() const;

    // Makes the tiles of a part, which is below the grid's Count(). Progress and cancellation are
    // those of the options, in pixels of the part.
    PartResult Make(std::uint64_t part);

    // Takes in what Make gave for a part; each part once. False, and nothing is taken, where that
    // is no result of this build, or the file does not hold the tiles that it tells of.
    bool Take(std::uint64_t part, const PartResult& result);
    // Whether histograms need a second look at the pixels.
    bool NeedsCounts();
    // Once all results have been taken: looks at a part for the second time; packed as sums are.
    std::string Count(std::uint64_t part);
    // Takes in what Count gave; false, and nothing is taken, where that is of other minima and
    // maxima, or nothing.
    bool TakeCounts(std::uint64_t part, const std::string& counts);

    // Once all results have been taken: finishes the file, but for BuildFile::Commit. What was not
    // counted yet is, with the progress of the options; every call of Count comes before the first
    // of TakeCounts.
    BuildReport Finish(BuildFile& file);

private:
    void BeginCounts();

    std::unique_ptr<BuildRun> run;
    std::string name;
    PartGrid grid;
    std::uint32_t width = 0;
    std::uint32_t height = 0;
    bool counting = false;
    std::vector<bool> counted;  // by part
};

}  // namespace zmchost

#endif
