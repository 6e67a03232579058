// What a reader has to say about a file of given bytes, told by the letter of docs/format.md.
//
// The bytes may be anything. Nothing here is shared with the module but the model of the Morton
// curve, which is a test's own too.
#ifndef ZMC_TESTS_CAMPAIGNS_FILEORACLE_H
#define ZMC_TESTS_CAMPAIGNS_FILEORACLE_H

#include <cstdint>
#include <memory>
#include <vector>

#include "tests/campaigns/DocumentOracle.h"
#include "tests/support/PyramidModel.h"

namespace zmctest {

struct Rect {
    std::uint32_t x, y, width, height;
};

class FileOracle {
public:
    enum class Opening { Refused, Open, Unsure };
    enum class Answer { Refused, Given, Unknown };

    explicit FileOracle(const Bytes& file);

    Opening opening = Opening::Refused;
    HeaderFields header;
    bool hasTiles = false;  // false for tiles that are too large: all requests are refused
    bool complete = false;
    bool hasReader = false;  // the pixel type is one of the twelve
    std::uint32_t sampleBytes = 1;
    std::uint64_t tileDataStart = 0, tileDataEnd = 0;
    // The metadata document. Without one it is sound and empty.
    bool hasDocument = false;
    Trust documentTrust = Trust::Sound;
    Trust documentValues = Trust::Sound;
    MetaRecords meta;

    std::uint32_t Width(std::uint32_t level) const { return header.width >> (level & 31); }
    std::uint32_t Height(std::uint32_t level) const { return header.height >> (level & 31); }
    // In the 32 bits of the format.
    std::uint32_t Across(std::uint32_t level) const { return TilesOver(Width(level)); }
    std::uint32_t Down(std::uint32_t level) const { return TilesOver(Height(level)); }

    // What a request for the listed bands (none listed: all) leaves in `buffer`, which has the
    // right size and content from before.
    Answer Read(const Rect& rect, const std::vector<int>& list, std::int64_t level,
                Bytes& buffer) const;
    // Where that sample lies; false if nothing can be said.
    bool SampleAt(std::uint32_t level, std::uint32_t x, std::uint32_t y, std::uint32_t band,
                  std::uint64_t& offset) const;

    // What the documented limits allow on top of what every file may take.
    std::uint64_t TableBytes() const;
    std::uint64_t AllowedBytes() const;

private:
    static constexpr std::uint64_t kMaxTable = std::uint64_t{4} << 30;

    std::uint32_t TilesOver(std::uint32_t extent) const {
        return header.tileSize == 0 ? 0 : (extent + header.tileSize - 1u) / header.tileSize;
    }
    std::uint64_t LevelBytes(std::uint32_t level) const;
    bool WithinLimits() const;
    bool Accepts(const Rect& rect, const std::vector<int>& list, std::int64_t level) const;
    void ReadDocument();

    // The samples of one band in one tile.
    struct Tile {
        std::uint64_t start = 0, width = 0, pixelBytes = 0;
    };
    bool TileAt(std::uint32_t level, std::uint64_t tx, std::uint64_t ty, std::uint32_t band,
                Tile& tile) const;
    void Copy(std::uint64_t offset, unsigned char* sample, bool keeps) const;

    const Bytes& bytes;
    std::uint64_t headerBytes = 0;
    std::unique_ptr<zmctest::MortonModel> morton;
};

}  // namespace zmctest

#endif
