// LevelCascade: makes the coarser levels of one column while the strips of its base level pass.
//
// A row of a level is made as soon as the rows that it depends on are there; those that later rows
// still need, and that leave with their strip, are kept. Full strips of coarser levels come out in
// the order in which they are finished, the coarsest last; none of them has lines of two rows of
// tiles. Where the lines that pass are not all of the level, what lies beyond them counts as
// outside: the first and last rows of the coarser levels are then of no use.
#ifndef ZMC_HOST_BUILD_LEVELCASCADE_H
#define ZMC_HOST_BUILD_LEVELCASCADE_H

#include <cstdint>
#include <memory>
#include <vector>

#include "host/build/BuildPlan.h"
#include "host/build/PixelWork.h"
#include "host/build/Strip.h"

namespace zmchost {

struct CascadeSetup {
    std::uint32_t baseLevel = 0;
    std::uint32_t topLevel = 0;
    std::uint32_t firstLine = 0;  // of the base level, and the one behind the last: what passes
    std::uint32_t endLine = 0;
    std::uint32_t bands = 0;
    std::uint32_t pixelBytes = 0;  // without masks
    std::uint32_t halo = 0;
    std::uint32_t lanes = 1;  // shares into which rows are divided among threads
};

class LevelCascade {
public:
    LevelCascade(const CascadeSetup& cascadeSetup, const Column& column, PixelWork& pixelWork,
                 StripStore& stripStore, MemoryMeter& meter);

    // Takes the next strip of the base level, its masks made, and appends the strips that it
    // completes.
    void Take(const Strip& strip, std::vector<StripStore::Loan>& finished);

private:
    // What is known of a level between two of its strips.
    struct Level {
        std::uint32_t width = 0;  // of the column, with its margins
        std::uint32_t begin = 0;  // first line that is known, and the one behind the last
        std::uint32_t end = 0;
        std::uint32_t nextRow = 0;    // of the coarser level, to be made from this one
        std::unique_ptr<Strip> kept;  // last rows of the strip before
        StripStore::Loan filling;     // strip of this level that is being made
    };

    void MakeRows(std::uint32_t level, const Strip& strip, std::vector<StripStore::Loan>& finished);
    void MakeRow(std::uint32_t level, const Strip& strip, Strip& target, std::uint32_t row) const;
    void TakeSourceRow(const Level& level, const Strip& strip, std::int64_t line,
                       std::uint32_t place, RowWindow& window) const;
    void KeepRows(Level& level, const Strip& strip) const;
    std::uint32_t RowsReady(const Level& level, const Strip& strip) const;
    Strip& Filling(std::uint32_t level);
    Level& At(std::uint32_t level) { return levels[level - setup.baseLevel]; }
    const Level& At(std::uint32_t level) const { return levels[level - setup.baseLevel]; }

    CascadeSetup setup;
    PixelWork& work;
    StripStore& store;
    std::vector<Level> levels;
};

}  // namespace zmchost

#endif
