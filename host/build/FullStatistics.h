// FullStatistics: of one band, with all digits that the samples have. A file keeps six of a real of
// 32 bits and fifteen of other reals, and rounds: what it tells of a minimum may lie above it.
#ifndef ZMC_HOST_BUILD_FULLSTATISTICS_H
#define ZMC_HOST_BUILD_FULLSTATISTICS_H

#include <cstdint>

#include "core/ElementTypes.h"
#include "raster/RasterBandStats.h"

namespace zmchost {

struct FullStatistics {
    std::uint32_t band = 0;  // from 0
    bool known = false;      // some sample is valid, and all four numbers are doubles
    double minimum = 0;
    double maximum = 0;
    double mean = 0;
    double standardDeviation = 0;

    // T is no complex type.
    template <class T>
    static FullStatistics Of(const zelm::RasterBandStats<T>& record) {
        constexpr std::uint32_t kNeeded = zelm::StatsFlag::Minimum | zelm::StatsFlag::Maximum |
                                          zelm::StatsFlag::Mean |
                                          zelm::StatsFlag::StandardDeviation;
        return {record.band,
                (record.flags & kNeeded) == kNeeded,
                static_cast<double>(record.minimum),
                static_cast<double>(record.maximum),
                record.mean,
                record.standardDeviation};
    }
};

}  // namespace zmchost

#endif
