// PyramidBuilder: from any raster to a finished pyramid file, in one pass over the source.
//
// Lines are read one row of tiles at a time; as soon as the rows of a level that a coarser row
// depends on are there, that row is made, so all levels grow together. Reading, reduction and
// writing overlap on as many threads as asked for, and none of these threads is left behind. The
// result depends on neither their number nor the budget, bit for bit.
//
// The memory that pixels, masks and counts are held in keeps below the budget, whatever the size of
// the raster: a raster too wide for it is walked through in columns (see host/build/BuildPlan.h).
// The least budget is about four rows of tiles of 512 pixels' width; a smaller one is refused, and
// the text says how much is needed. The module's own tables, 8 bytes for each tile, level and band,
// come on top, and so does what the source holds.
//
// The file is built under a temporary name, flushed, opened again and checked, and only then
// renamed: whatever happens, the target's name shows the old file or the new one, whole.
//
// Pixels that come in no order are not read from a source: LayOut makes the file with all its
// levels, whoever has the pixels writes them into level 0 of it, each tile at its final place, and
// Complete does the rest in the same file. The result is that of Build, bit for bit, and the disk
// never holds more than it.
#ifndef ZMC_HOST_BUILD_PYRAMIDBUILDER_H
#define ZMC_HOST_BUILD_PYRAMIDBUILDER_H

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "host/base/Error.h"
#include "host/build/BuildFile.h"
#include "host/build/FullStatistics.h"
#include "host/raster/Module.h"
#include "host/raster/RasterSource.h"
#include "host/reduce/Reduction.h"

namespace zmchost {

// How tiles lie in the file. Files of more than eight bands are in Morton order, others never.
enum class Ordering { Auto, Scanline, Blocked, Morton };

// How far a build is, in pixels of all that has to be passed over.
struct BuildProgress {
    std::uint64_t done = 0;
    std::uint64_t total = 0;
};

struct BuildOptions {
    // The coarsest level; without a value the first that fits one tile. Not beyond the last level
    // that has a pixel, nor beyond 8 in the Morton ordering.
    std::optional<std::uint32_t> levels;
    // Without a value Mode for a source with a palette and Average for others.
    std::optional<Resampling> resampling;
    Ordering ordering = Ordering::Auto;
    // Replaces the no-data values of the source where it has a value: `noData` for all bands, or
    // none at all if that is empty.
    struct NoData {
        std::optional<double> value;
    };
    std::optional<NoData> noData;
    std::vector<std::uint32_t> bands;  // of the source, from 0, in the order wanted; empty: all
    std::uint32_t bins = 256;          // of a histogram; one per value for 8-bit types
    // Whether the alpha bands and masks of the source weigh its samples in the levels (see
    // host/reduce/Weighing.h). Level 0 and the statistics do not go by them.
    bool weights = true;
    bool statistics = true;     // statistics and histograms, which complex types never get
    std::uint32_t threads = 0;  // 0: as many as the machine has processors; at
                                // most 1024, which more are taken for
    std::uint64_t memory = std::uint64_t{256} << 20;  // budget in bytes
    bool overwrite = false;
    // Whether Build waits until the file is on the disk before it gives it its name. Without, a
    // system that stops within the next minute or so may be left with the name and a file that
    // lacks pixels or all of it, where an older file with that name may be gone too; what ends the
    // process alone harms nothing.
    bool flush = true;
    // Called now and then, one call at a time, on one of the build's threads; false cancels.
    std::function<bool(const BuildProgress&)> progress;
    // Called once, before beforeNaming, with the statistics that were stored, of all bands.
    std::function<void(const std::vector<FullStatistics>&)> takeStatistics;
    // Called once with the path of the finished file, before it gets its name: the last moment to
    // put beside the target, or into the file, what belongs to it. What it writes into the file it
    // brings to the disk itself. What it throws ends the build.
    std::function<void(const std::string& finished)> beforeNaming;
};

struct BuildReport {
    std::uint32_t width = 0;
    std::uint32_t height = 0;
    std::uint32_t bands = 0;
    std::uint32_t maxLevel = 0;
    Resampling resampling = Resampling::Average;
    std::uint32_t tileOrdering = 0;  // code
    std::uint64_t fileSize = 0;
    std::uint64_t peakMemory = 0;  // most bytes that strips, tiles and counts held at one time
    double seconds = 0;
};

class PyramidBuilder {
public:
    explicit PyramidBuilder(ModulePtr loadedModule) : module(std::move(loadedModule)) {}

    // Builds `target` from `source`. Throws Error, Cancelled, or what the source threw; the target
    // is then what it was, and no temporary file stays. Builds may run on several threads.
    BuildReport Build(RasterSource& source, const std::string& target,
                      const BuildOptions& options = {}) const;

    // Lays `file` out, anew if it was before, for a source that tells all but pixels, and takes the
    // room on the disk for all of it. `target` stands for the file in messages. Throws Error.
    void LayOut(RasterSource& source, BuildFile& file, const std::string& target,
                const BuildOptions& options) const;

    // Makes all of the file that is not pixels of level 0, which were all written since it was laid
    // out: what Build does but for BuildFile::Commit, which is left to the caller. The source is
    // not read; its weights, palettes and no-data values, and the options, are those of Build, and
    // lead to the same size, bands, type, ordering and levels as when the file was laid out. Throws
    // as Build does; the file is of no use then.
    BuildReport Complete(RasterSource& source, BuildFile& file, const std::string& target,
                         const BuildOptions& options) const;

    // Throws Error where Build would refuse the options before it touches anything.
    void Check(RasterSource& source, const std::string& target, const BuildOptions& options) const;

private:
    ModulePtr module;
};

}  // namespace zmchost

#endif
