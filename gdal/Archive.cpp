#include "gdal/Archive.h"

#include <algorithm>
#include <cmath>
#include <span>

#include "colour/ColorList.h"
#include "core/ElementTypes.h"
#include "gdal/ColorTables.h"
#include "gdal/NearestValue.h"
#include "host/file/Limits.h"
#include "host/file/StoredRecords.h"

namespace zmcgdal {
namespace {

// Colours that pixels can have: GDAL keeps and writes a table for each band, at a hundred times
// what a colour takes in the file. Bands that share theirs there would make a small file large.
template <class T>
inline constexpr std::size_t kMaxColors = sizeof(T) == 1 ? 256 : 65536;

template <class T>
double ToDouble(const T& value) {
    if constexpr (zelm::kIsComplex<T>)
        return static_cast<double>(value.re);
    else
        return static_cast<double>(value);
}

template <class T>
inline constexpr bool kIsInteger = std::is_integral_v<T>;

template <class T>
StoredStatistics Convert(const zelm::RasterBandStats<T>& record) {
    return {record.flags, ToDouble(record.minimum), ToDouble(record.maximum),
            record.mean,  record.standardDeviation, 0};
}

// Of a record among those of its kind.
template <class Record>
std::uint32_t PlaceOf(const Record& record, std::span<const Record> all) {
    return static_cast<std::uint32_t>(&record - all.data());
}

// Bins of integers divide [minimum, maximum + 1) as a rule. Where their width is a whole number it
// changes nothing to draw each value in the middle of its unit, as GDAL does.
template <class T>
StoredHistogram Convert(const zelm::RasterBandHistogram<T>& record) {
    StoredHistogram histogram;
    histogram.band = record.band;
    histogram.level = record.level;
    const auto count = std::min(record.binCount, record.counts.shape.elements);
    if (record.counts.data) histogram.counts.assign(record.counts.data, record.counts.data + count);
    histogram.lower = ToDouble(record.minimum);
    const double extent = ToDouble(record.maximum) - histogram.lower;
    double width = record.binSize * record.binCount;
    if (!(width > 0)) width = extent > 0 ? extent : 1;
    if (kIsInteger<T> && width == extent + 1 && record.binSize == std::floor(record.binSize))
        histogram.lower -= 0.5;
    histogram.upper = histogram.lower + width;
    return histogram;
}

template <class T>
void Fill(zelm::RasterBandHistogram<T>& record, const StoredHistogram& histogram) {
    const auto count = static_cast<std::uint32_t>(histogram.counts.size());
    record.band = histogram.band;
    record.level = histogram.level;
    record.source = zelm::HistogramSource::ORVA;
    record.binCount = count;
    record.binSize = (histogram.upper - histogram.lower) / count;
    // The first and the last integer inside.
    const bool whole = kIsInteger<T>;
    record.minimum = NearestValue<T>(whole ? std::ceil(histogram.lower) : histogram.lower);
    record.maximum = NearestValue<T>(whole ? std::ceil(histogram.upper) - 1 : histogram.upper);
    record.counts.SetShape(zelm::ArrayShape(count));
    if (record.counts.data)
        std::copy(histogram.counts.begin(), histogram.counts.end(), record.counts.data);
}

GDALColorEntry EntryOf(zelm::ColorList::Rgba color) {
    const auto channel = [&](int index) { return zelm::ColorList::Channel(color, index); };
    return {channel(0), channel(1), channel(2), channel(3)};
}

// The last one comes first, so that the table grows once.
std::unique_ptr<GDALColorTable> TableOf(const zelm::ColorList& palette, std::size_t most) {
    auto table = std::make_unique<GDALColorTable>();
    const auto colors = palette.Colors();
    for (std::size_t i = std::min(colors.size(), most); i-- != 0;) {
        const GDALColorEntry entry = EntryOf(colors[i]);
        table->SetColorEntry(static_cast<int>(i), &entry);
    }
    return table;
}

}  // namespace

bool StoredStatistics::IsFull() const {
    constexpr std::uint32_t kNeeded = zelm::StatsFlag::Minimum | zelm::StatsFlag::Maximum |
                                      zelm::StatsFlag::Mean | zelm::StatsFlag::StandardDeviation;
    return (flags & kNeeded) == kNeeded;
}

Archive::Archive(LazyRaster& pyramid, bool hasDocument, const zmchost::Limits& openedBy)
    : raster(pyramid), documentExists(hasDocument), limits(openedBy) {}

bool Archive::RemembersStatistics(std::uint32_t band) const {
    return !documentExists || statistics.count(band) != 0;
}

template <class Look>
bool Archive::LookAtRecords(Look&& look) const {
    bool settled = false;
    const bool told = raster.Visit([&]<class T>(zelm::RasterReader<T>&) {
        const std::shared_ptr<const zmchost::StoredRecords<T>> held = raster.Get().Records<T>();
        const zmchost::StoredRecords<T>& records = *held;
        look(records);
        if (records.IsSettled()) settled = true;
        const std::string& fault = records.Fault();
        if (!settled && !fault.empty())
            CPLError(CE_Warning, CPLE_FileIO, "its records are not known now: %s", fault.c_str());
    });
    return told && settled;
}

template <class Map, class Look>
auto* Archive::Recall(Map& known, const typename Map::key_type& key, Look&& look) {
    if (documentExists && known.count(key) == 0) {
        typename Map::mapped_type found;
        if (LookAtRecords([&](const auto& records) { found = look(records); }))
            known.emplace(key, std::move(found));
    }
    const auto place = known.find(key);
    return place != known.end() && place->second ? &*place->second : nullptr;
}

const StoredStatistics* Archive::Statistics(std::uint32_t band) {
    return Recall(statistics, band, [&](const auto& records) {
        const auto* const newest = records.NewestStatistics(band);
        if (!newest) return std::optional<StoredStatistics>();
        StoredStatistics found = Convert(*newest);
        found.place = PlaceOf(*newest, records.Statistics());
        return std::optional(found);
    });
}

// The newest of those that have counts.
const StoredHistogram* Archive::Histogram(std::uint32_t band, std::uint32_t level) {
    return Recall(histograms, {band, level}, [&](const auto& records) {
        const auto all = records.Histograms();
        const auto newest = std::find_if(all.rbegin(), all.rend(), [&](const auto& each) {
            return each.band == band && each.level == level && each.binCount != 0 &&
                   each.counts.data && each.counts.shape.elements != 0;
        });
        if (newest == all.rend()) return std::optional<StoredHistogram>();
        StoredHistogram found = Convert(*newest);
        found.place = PlaceOf(*newest, all);
        return std::optional(std::move(found));
    });
}

void Archive::Forget() {
    raster.Forget();
    documentExists = true;
    elements.reset();
    statistics.clear();
    histograms.clear();
    colorTables.clear();
}

RecordCounts Archive::Counts() const {
    RecordCounts counts;
    if (documentExists)
        LookAtRecords([&](const auto& records) {
            counts = {static_cast<std::uint32_t>(records.Statistics().size()),
                      static_cast<std::uint32_t>(records.Histograms().size())};
        });
    return counts;
}

GDALColorTable* Archive::ColorTable(std::uint32_t band) {
    return Recall(colorTables, band, [&]<class T>(const zmchost::StoredRecords<T>& records) {
        const zelm::ColorList* const palette = records.BandPalette(band);
        return palette ? TableOf(*palette, kMaxColors<T>) : nullptr;
    });
}

// The module's setters answer true for a file that they cannot write. A store that fails may have
// left a document where there was none.
template <class Setter>
bool Archive::Store(Setter&& setter) {
    bool stored = false;
    raster.Visit([&](auto& reader) {
        if (!raster.Get().IsWritable()) return;
        bool taken = false;
        CheckElements();
        documentExists = true;
        raster.Get().Store([&] { taken = setter(reader); });
        stored = taken;
    });
    return stored;
}

void Archive::CheckElements() {
    if (!elements) elements = documentExists ? raster.Get().DocumentElements() : 0;
    const std::string wrong = limits.Judge(&zmchost::Limits::elements, *elements,
                                           "it has " + std::to_string(*elements) + " elements");
    if (!wrong.empty())
        throw zmchost::Error(raster.Name(), "store into its metadata document", wrong);
}

bool Archive::StoreStatistics(std::uint32_t band, const StoredStatistics& given) {
    const bool stored = Store([&]<class T>(zelm::RasterReader<T>& reader) {
        zelm::RasterBandStats<T> record;
        record.band = band;
        record.flags = given.flags;
        record.minimum = NearestValue<T>(given.minimum);
        record.maximum = NearestValue<T>(given.maximum);
        record.mean = given.mean;
        record.standardDeviation = given.standardDeviation;
        zelm::Array<zelm::RasterBandStats<T>> records;
        return records.Append(record) && reader.SetBandStats(records);
    });
    statistics.clear();
    return stored;
}

bool Archive::StoreHistogram(const StoredHistogram& histogram) {
    if (histogram.counts.empty()) return false;
    const bool stored = Store([&]<class T>(zelm::RasterReader<T>& reader) {
        zelm::RasterBandHistogram<T> record;
        Fill(record, histogram);
        zelm::Array<zelm::RasterBandHistogram<T>> records;
        return record.counts.data && records.Append(record) && reader.SetHistograms(records);
    });
    histograms.clear();
    return stored;
}

bool Archive::StoreColorTable(std::uint32_t band, const GDALColorTable* table) {
    const bool stored = Store([&](auto& reader) {
        zelm::Palette palette;
        if (table) ColorsOf(*table).CopyTo(palette);
        return reader.SetPalette(band, palette);
    });
    colorTables.erase(band);
    return stored;
}

}  // namespace zmcgdal
