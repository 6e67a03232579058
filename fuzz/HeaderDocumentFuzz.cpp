// The header document of a file: whatever text stands there, the answer to opening the file follows
// from its eleven values, in each tile ordering. A header that opens is written again by the module
// and read back.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "core/PixelVocabulary.h"
#include "format/HeaderParser.h"
#include "format/LevelGeometry.h"
#include "format/PyramidFront.h"
#include "format/PyramidLimits.h"
#include "fuzz/support/Expect.h"
#include "fuzz/support/Host.h"
#include "fuzz/support/MemoryFile.h"
#include "fuzz/support/NaiveFile.h"
#include "pyramid/PyramidDataset.h"
#include "tests/support/PyramidFiles.h"

namespace {

using zelm::PyramidDataset;
using zelm::String;
using zmcfuzz::MemoryFile;
using zmcfuzz::Wide;

void AskForGeometry(const PyramidDataset& dataset) {
    for (std::uint32_t level = dataset.LevelMin; level <= dataset.LevelMax; ++level) {
        const zelm::LevelGeometry geometry(dataset.Samples, dataset.Lines, dataset.TileSize, level);
        if (level >= 32 || geometry.tilesAcross == 0 || geometry.tilesDown == 0) continue;
        const std::uint32_t x = geometry.tilesAcross - 1u;
        const std::uint32_t y = geometry.tilesDown - 1u;
        ZMC_EXPECT(geometry.HasTile(x, y) && !geometry.HasTile(x + 1u, y) &&
                   !geometry.HasTile(x, y + 1u));
        const Wide end = Wide{dataset.LevelOffsets[level]} + dataset.GetTileOffset(x, y, level) +
                         Wide{geometry.TileWidth(x)} * geometry.TileHeight(y) *
                             dataset.BytesPerSample * dataset.BandCount;
        const Wide extent =
            Wide{geometry.samples} * geometry.lines * dataset.BytesPerSample * dataset.BandCount;
        ZMC_EXPECT(end == Wide{dataset.LevelOffsets[level]} + extent ||
                   zmcfuzz::TileCountWraps(dataset));
    }
}

// Every tile of a table that is small enough to look at lies in the tile data.
void AskForTable(PyramidDataset& dataset) {
    const Wide bytes = zmcfuzz::TileTableBytes(dataset);
    if (dataset.TileOrdering != zelm::TileOrder::Morton || bytes > zmcfuzz::kComparedTableBytes)
        return;
    dataset.TileCursor = dataset.TileDataStart;
    dataset.BuildTileTable(dataset.Samples, dataset.Lines, dataset.TileSize, dataset.TileSize,
                           dataset.BandCount, dataset.BytesPerSample);
    ZMC_EXPECT(dataset.TileOffsets.data);
    ZMC_EXPECT(bytes == Wide{dataset.TileOffsets.shape.elements} * 8);
    ZMC_EXPECT(dataset.TileCursor <= dataset.TileDataEnd);
    const std::uint64_t* const offsets = dataset.TileOffsets.data;
    ZMC_EXPECT(std::all_of(
        offsets, offsets + dataset.TileOffsets.shape.elements, [&](std::uint64_t offset) {
            return offset == 0 || (offset >= dataset.TileDataStart && offset < dataset.TileDataEnd);
        }));
    // Tiles are square: others leave no table.
    dataset.BuildTileTable(dataset.Samples, dataset.Lines, dataset.TileSize, dataset.TileSize + 1u,
                           dataset.BandCount, dataset.BytesPerSample);
    ZMC_EXPECT(!dataset.TileOffsets.data);
}

// A dataset described by hand makes the same file again, in the ordering asked for.
void WriteAgain(const PyramidDataset& read, std::uint32_t ordering) {
    static MemoryFile file;
    zelm::RasterProps props =
        zmctest::PyramidProps(read.Samples, read.Lines, read.BandCount, read.PixelType);
    props.interleave = read.Interleave;
    PyramidDataset made{String(file.Name().c_str()), props};
    made.TileSize = read.TileSize;
    made.TileOrdering = ordering;
    made.CreateFile(read.LevelMin, read.LevelMax);
    zelm::PyramidHeaderRecord header{1,
                                     1,
                                     read.BandCount,
                                     read.Samples,
                                     read.Lines,
                                     read.TileSize,
                                     read.LevelMin,
                                     read.LevelMax,
                                     read.PixelType,
                                     read.Interleave,
                                     ordering};
    if (!zmcfuzz::MayOpen(header)) {
        ZMC_EXPECT(!made.File);
        return;
    }
    ZMC_EXPECT(made.File && made.Writable);
    ZMC_EXPECT(file.Size() == made.TileDataStart);
    AskForGeometry(made);
    AskForTable(made);
    PyramidDataset again{String(file.Name().c_str())};
    ZMC_EXPECT(!again.ReadHeader());
    ZMC_EXPECT(zmcfuzz::HeaderOf(again) == zmcfuzz::HeaderOf(made));
    ZMC_EXPECT(again.TileDataStart == made.TileDataStart);
    ZMC_EXPECT(again.TileDataEnd == made.TileDataEnd);
    ZMC_EXPECT(again.HasPyramid == (made.TileDataEnd == made.TileDataStart));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    static MemoryFile file;
    const std::string text(reinterpret_cast<const char*>(data), size);
    file.Assign(zmctest::FileWithHeader(text));
    PyramidDataset dataset{String(file.Name().c_str())};
    const bool failed = dataset.ReadHeader();
    // What is refused settles nothing.
    ZMC_EXPECT(dataset.TileDataStart == (failed ? 0 : zelm::PyramidFront::kHeaderOffset + size));
    if (dataset.TileSize > PyramidDataset::kMaxTileSize) {
        ZMC_EXPECT(!failed && !dataset.LevelOffsets);
        return 0;
    }
    // Hosts read the same text without the module.
    zelm::PyramidHeaderRecord told;
    const bool may = zelm::ParseHeaderText(text, told).empty() && zmcfuzz::MayOpen(told);
    ZMC_EXPECT(failed == !may);
    if (failed) return 0;
    ZMC_EXPECT(zmcfuzz::HeaderOf(dataset) == told);
    ZMC_EXPECT(dataset.TileDataEnd ==
               zmcfuzz::TileDataEnd(zmcfuzz::HeaderOf(dataset), dataset.TileDataStart));
    AskForGeometry(dataset);
    AskForTable(dataset);
    for (std::uint32_t ordering = 0; ordering < 3; ++ordering) WriteAgain(dataset, ordering);
    return 0;
}
