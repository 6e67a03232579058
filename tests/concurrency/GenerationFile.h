// A pyramid file in which every sample, statistics record, histogram and palette tells which
// generation of writing it belongs to, so that a mixture of two shows.
//
// Most tiles are written once, with generation 0. The moving tiles are written again and again; so
// are the archive's three kinds of records, of which a file keeps every set ever stored.
#ifndef ZMC_TESTS_CONCURRENCY_GENERATIONFILE_H
#define ZMC_TESTS_CONCURRENCY_GENERATIONFILE_H

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "host/raster/Module.h"
#include "raster/RasterReader.h"

namespace zmctest {

using Sample = std::uint32_t;
using SampleReader = zelm::RasterReader<Sample>;

struct Rectangle {
    std::int32_t level = 0;
    std::uint32_t x = 0, y = 0, width = 0, height = 0;

    bool Holds(std::uint32_t column, std::uint32_t line) const {
        return column - x < width && line - y < height;
    }
};

// How tiles lie in the file, and what a file of that ordering needs.
struct FileKind {
    const char* name;
    std::uint32_t bands;
    std::uint32_t tileLines;  // of the properties that the file is made from
};
inline constexpr FileKind kFileKinds[] = {
    {"Scanline", 2, 1}, {"Blocked", 2, 256}, {"Morton", 9, 256}};

class GenerationFile {
public:
    static constexpr std::uint32_t kSamples = 520;
    static constexpr std::uint32_t kLines = 300;
    static constexpr std::int32_t kMaxLevel = 1;
    static constexpr std::uint32_t kMovingTiles = 3;
    static constexpr std::uint32_t kMaxGeneration = 0xFFF;
    // A whole tile, an edge tile, and a tile of the coarser level.
    static constexpr Rectangle kMoving[kMovingTiles] = {
        {0, 256, 0, 256, 256}, {0, 512, 256, 8, 44}, {1, 256, 0, 4, 150}};

    // What the archive of a file looks like to a reader. Without a value there is nothing to see.
    struct Sets {
        std::optional<std::uint32_t> statistics, histograms, palettes;
    };

    // Makes the file with generation 0 in all tiles and without records. The connection stays open.
    GenerationFile(zmchost::ModulePtr loaded, const FileKind& kind, const std::string& path);
    // Opens the file that is there; IsOpen tells whether that worked.
    GenerationFile(zmchost::ModulePtr loaded, const std::string& path);
    GenerationFile(const GenerationFile&) = delete;
    GenerationFile& operator=(const GenerationFile&) = delete;

    bool IsOpen() const { return reader != nullptr; }
    std::uint32_t Bands() const { return bands; }

    bool WriteMoving(std::uint32_t tile, std::uint32_t generation);
    bool StoreStatistics(std::uint32_t generation);
    bool StoreHistograms(std::uint32_t generation);
    bool StorePalette(std::uint32_t generation);

    // Reads a rectangle and tells the generations of each moving tile's samples in it, as lowest
    // and highest (lowest above highest if there are none), or what is wrong with a sample.
    struct Seen {
        std::uint32_t lowest[kMovingTiles], highest[kMovingTiles];
        std::string fault;
    };
    Seen Look(const Rectangle& rectangle);

    // How many sets of each kind the archive has; `fault` tells of a set that is not whole. `probe`
    // picks records to be looked at closely.
    Sets Count(std::uint32_t probe, std::string& fault);

private:
    zmchost::ModulePtr module;  // goes last
    zelm::RasterDataConnectionPtr connection;
    zelm::RasterReaderDispatchPtr dispatch;
    SampleReader* reader = nullptr;
    std::uint32_t bands = 0;
    std::vector<int> allBands;

    void TakeReader();
    zelm::Array<int> BandList();
    bool Write(const Rectangle& tile, std::uint32_t generation);
    std::optional<std::uint32_t> CountHistograms(std::string& fault);
    std::optional<std::uint32_t> CountStatistics(std::uint32_t atLeast, std::uint32_t probe,
                                                 std::string& fault);
    std::optional<std::uint32_t> CountPalettes(std::string& fault);
};

}  // namespace zmctest

#endif
