// ReaderRasterMemory<T>: the reader over a raster that lies in the buffer of somebody else.
//
// A thin typed rim: ReadTile and WriteTile are strided copies, the rest answers from the reader's
// own copy of the properties, or with a constant. There are no reduced levels, statistics or
// palettes. The buffer must outlive the reader, and nothing tells the reader if it does not; that
// the connection closes or goes makes no difference to it.
//
// Tiles lie within the raster: nothing is clipped, and what reaches outside of it is the caller's
// fault, as is a null tile buffer in ReadTile; assertions name it in debug builds. ReadTile changes
// nothing in the reader, so that several threads may read through one. No tile allocates, except
// for the properties that the mask step asks for.
#ifndef ZMC_RASTER_READERRASTERMEMORY_H
#define ZMC_RASTER_READERRASTERMEMORY_H

#include "core/Array.h"
#include "raster/RasterProps.h"
#include "raster/RasterReader.h"
#include "raster/TileCopy.h"

namespace zelm {

// The pixels of a memory raster's connection, or null; defined beside that connection, which stands
// above the readers.
void* MemoryRasterPixels(RasterDataConnection* connection);

template <class T>
class ReaderRasterMemory final : public RasterReader<T> {
public:
    Array<T> data;      // view of the buffer in the raster's shape; empty if it could not be bound
    RasterProps props;  // own copy; SetNoDataValues alone changes it

    // Binds to the pixels of `connection`. A null connection, or one without pixels, gives a reader
    // that is not valid.
    ReaderRasterMemory(RasterDataConnection* connection, const RasterProps& props);

    bool IsValid() const override { return data.data != nullptr; }
    std::uint32_t GetCapabilities() const override { return 1; }
    // A record of nothing known, not even an interleave, if memory ran out.
    RasterProps GetRasterProps() const override;
    std::uint32_t GetSamples(std::int32_t) const override { return props.samples; }
    std::uint32_t GetLines(std::int32_t) const override { return props.lines; }
    std::uint32_t GetBands() const override { return props.bands; }
    std::uint32_t GetBaseReduction() const override { return 0; }
    std::uint32_t GetLevelReduction() const override { return 0; }
    std::int32_t GetMinLevel() const override { return 0; }
    std::int32_t GetMaxLevel() const override { return 0; }
    bool HasPyramid() const override { return false; }
    bool BuildPyramid(std::int32_t, std::int32_t, std::int32_t, const std::int32_t*) override {
        return false;
    }
    bool CanBuildPyramid() const override { return false; }
    bool DeletePyramid() override { return false; }
    bool RefreshPyramidState() override { return false; }
    std::uint32_t GetStatsMask() const override { return 0; }
    bool HasBandStats(std::uint32_t) const override { return false; }
    bool CanStoreBandStats() const override { return false; }
    bool CanStoreHistograms() const override { return false; }
    bool HasNoDataValue(std::uint32_t band) const override { return props.HasNoDataValue(band); }
    bool SupportsNoData() const override { return true; }
    // Leaves all values as they are if memory ran out.
    void SetNoDataValues(const RasterProps& source) override;
    bool HasPalette(std::uint32_t) const override { return false; }
    PalettePtr GetPalette(std::uint32_t) const override { return PalettePtr(); }
    bool SetPalette(std::uint32_t, const Palette&) override { return false; }
    bool ReservedReaderQuery() const override { return false; }
    // Level 0, and every negative level too.
    bool IsValidLevel(std::int32_t level) const override { return IsValid() && level < 1; }

    RasterDataConnection* GetConnection() const override { return this->connection; }
    RasterBandStats<T> GetBandStats(std::uint32_t band) const override;
    bool SetBandStats(const Array<RasterBandStats<T>>&) override { return false; }
    Array<RasterBandHistogram<T>> GetHistograms() const override { return {}; }
    bool SetHistograms(const Array<RasterBandHistogram<T>>&) override { return false; }
    T GetNoDataValue(std::uint32_t band) const override;

    // False above level 0, and for a reader that is not bound; negative levels count as 0.
    bool ReadTile(std::int32_t x, std::int32_t y, std::uint32_t width, std::uint32_t height,
                  const Array<int>& bandList, std::int32_t level, T* buffer,
                  unsigned char* mask) override;
    bool WriteTile(std::int32_t x, std::int32_t y, std::uint32_t width, std::uint32_t height,
                   const Array<int>& bandList, std::int32_t level, T* buffer,
                   unsigned char* mask) override;

private:
    bool HasLayout() const;
    bool CanMoveTiles(std::int32_t level) const;
    RasterLayout Layout() const;
};

}  // namespace zelm

#endif
