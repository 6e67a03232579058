// Archive: the statistics, histograms and palettes that a pyramid file keeps, in GDAL's terms.
//
// Everything is fetched when it is first asked for and then remembered; the document is parsed once
// for all bands (Raster::Records). What could not be fetched, since the disk failed or another
// process is storing, is asked for again. Bands count from 0. A file keeps every record ever
// stored; the newest one of a band counts here.
#ifndef ZMC_GDAL_ARCHIVE_H
#define ZMC_GDAL_ARCHIVE_H

#include <gdal_priv.h>

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <utility>
#include <vector>

#include "gdal/LazyRaster.h"
#include "host/file/Limits.h"

namespace zmcgdal {

struct StoredStatistics {
    std::uint32_t flags = 0;  // StatsFlag values
    double minimum = 0;
    double maximum = 0;
    double mean = 0;
    double standardDeviation = 0;

    // Minimum, maximum, mean and standard deviation are all there.
    bool IsFull() const;
};

// Buckets of equal width over [lower, upper). For integers the bounds lie half a unit outside the
// first and last value, as GDAL has them.
struct StoredHistogram {
    std::uint32_t band = 0;
    std::uint32_t level = 0;
    double lower = 0;
    double upper = 0;
    std::vector<GUIntBig> counts;
};

class Archive {
public:
    // `pyramid` outlives this object. Without a document in the file nothing is fetched; one of
    // more elements than these limits take on is not stored into.
    Archive(LazyRaster& pyramid, bool hasDocument, const zmchost::Limits& openedBy);

    // Null where the file has none.
    const StoredStatistics* Statistics(std::uint32_t band);
    const StoredHistogram* Histogram(std::uint32_t band, std::uint32_t level);
    GDALColorTable* ColorTable(std::uint32_t band);
    // Whether what Statistics gave last for that band will be given again.
    bool RemembersStatistics(std::uint32_t band) const;

    // Appends a record to the file; false if the module did not take it. A store makes a tree of
    // all that the document has, so that one with more elements than are taken on is left alone.
    // They are counted before the first store: what others put there is judged, and not what is
    // stored here, which has the format's own limit.
    bool StoreStatistics(std::uint32_t band, const StoredStatistics& statistics);
    bool StoreHistogram(const StoredHistogram& histogram);
    // A null table hides the one that is there.
    bool StoreColorTable(std::uint32_t band, const GDALColorTable* table);

private:
    LazyRaster& raster;
    bool documentExists;
    zmchost::Limits limits;
    std::optional<std::uint64_t> elements;  // of the document, before the first store into it
    std::map<std::uint32_t, std::optional<StoredStatistics>> statistics;
    std::map<std::pair<std::uint32_t, std::uint32_t>, std::optional<StoredHistogram>> histograms;
    std::map<std::uint32_t, std::unique_ptr<GDALColorTable>> colorTables;

    // Lets `setter(reader)` store; false where the file cannot be written or it answers false.
    template <class Setter>
    bool Store(Setter&& setter);
    // Calls look(zmchost::StoredRecords<T>). What is thrown goes to GDAL as a failure. False,
    // after a warning, if what was seen, or was not, may be something else the next time.
    template <class Look>
    bool LookAtRecords(Look&& look) const;
    // What is remembered under a key; at first what look(zmchost::StoredRecords<T>) finds, which is
    // remembered where it will be the same the next time. Null where there is none.
    template <class Map, class Look>
    auto* Recall(Map& known, const typename Map::key_type& key, Look&& look);
    void CheckElements();
};

}  // namespace zmcgdal

#endif
