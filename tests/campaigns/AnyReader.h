// The reader of a connection without its element type: pixels as bytes, records as the oracles
// tell them.
#ifndef ZMC_TESTS_CAMPAIGNS_ANYREADER_H
#define ZMC_TESTS_CAMPAIGNS_ANYREADER_H

#include <cstdint>
#include <memory>
#include <vector>

#include "dispatch/RasterReaderDispatch.h"
#include "tests/campaigns/FileOracle.h"

namespace zmctest {

class AnyReader {
public:
    // Null if the dispatch holds no reader. The dispatch must outlive the result.
    static std::unique_ptr<AnyReader> Over(const zelm::RasterReaderDispatchPtr& dispatch);

    virtual ~AnyReader() = default;
    virtual zelm::BasicRasterReader& Basic() = 0;
    virtual bool Read(const Rect& rect, const std::vector<int>& list, std::int32_t level,
                      Bytes& buffer) = 0;
    virtual bool Write(const Rect& rect, const std::vector<int>& list, std::int32_t level,
                       Bytes& buffer) = 0;
    virtual StatsRecord Stats(std::uint32_t position) = 0;
    virtual std::vector<HistogramRecord> Histograms() = 0;
    virtual PaletteRecord PaletteOf(std::uint32_t band) = 0;
    virtual bool StoreStats(const StatsRecord& record) = 0;
    virtual bool StorePalette(std::uint32_t band, const PaletteRecord& palette) = 0;
    // A minimum or maximum of a document as it comes back from a pixel; false if that is left open.
    virtual bool AsPixel(double& value) const = 0;
};

}  // namespace zmctest

#endif
