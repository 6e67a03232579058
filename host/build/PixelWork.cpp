#include "host/build/PixelWork.h"

#include <algorithm>
#include <vector>

#include "host/raster/NoData.h"
#include "host/raster/Raster.h"
#include "host/statistics/BandStatistics.h"
#include "host/statistics/Histogram.h"
#include "host/statistics/ValueCounter.h"

namespace zmchost {
namespace {

// Statistics and histograms of all bands, gathered in lanes that are merged at the end. Small types
// are counted value by value, if there is memory for the tables; others take a second walk.
template <class T>
class Harvest {
public:
    explicit Harvest(const PixelWorkSetup& setup)
        : lanes(setup.lanes), bands(setup.props.bands), bins(setup.bins) {
        if (!setup.statistics || zelm::kIsComplex<T>) return;
        if constexpr (kCountsEveryValue<T>) {
            const std::uint64_t size = std::uint64_t{lanes} * bands * TableBytes();
            if (size <= setup.countersBudget) {
                counters.resize(std::size_t{lanes} * bands);
                return;
            }
        }
        accumulators.resize(std::size_t{lanes} * bands);
    }

    bool Active() const { return !counters.empty() || !accumulators.empty(); }
    bool NeedsSecondWalk() const { return !accumulators.empty(); }

    void Take(std::uint32_t lane, const T* row, const unsigned char* mask, std::uint32_t width) {
        for (std::uint32_t band = 0; band < bands && Active(); ++band) {
            if constexpr (kCountsEveryValue<T>)
                if (!counters.empty()) {
                    counters[Place(lane, band)].AddRow(row, mask, band, bands, width);
                    continue;
                }
            accumulators[Place(lane, band)].AddRow(row, mask, band, bands, width);
        }
    }

    void BeginSecondWalk() {
        MergeLanes(accumulators);
        BeginCounts();
    }

    void TakeCounts(std::uint32_t lane, const T* row, const unsigned char* mask,
                    std::uint32_t width) {
        if constexpr (!zelm::kIsComplex<T>)
            for (std::uint32_t band = 0; band < bands; ++band)
                histograms[Place(lane, band)].AddRow(row, mask, band, bands, width);
    }

    void ClearCounts() {
        histograms.clear();
        BeginCounts();
    }

    void ClearSums() {
        counters.assign(counters.size(), {});
        accumulators.assign(accumulators.size(), {});
        histograms.clear();
    }

    std::string SaveSums() {
        NumberPacker packer;
        packer.Put(Kind());
        if constexpr (kCountsEveryValue<T>) SaveMerged(counters, packer);
        if constexpr (!zelm::kIsComplex<T>) SaveMerged(accumulators, packer);
        return packer.Bytes();
    }

    bool MergeSums(std::string_view packed) {
        NumberUnpacker numbers(packed);
        if (numbers.Take() != Kind()) return false;
        if constexpr (kCountsEveryValue<T>)
            if (!counters.empty()) return LoadInto(counters, numbers);
        if constexpr (!zelm::kIsComplex<T>)
            if (!accumulators.empty()) return LoadInto(accumulators, numbers);
        return numbers.Good() && numbers.Rest().empty();
    }

    std::string SaveCounts() {
        NumberPacker packer;
        if constexpr (!zelm::kIsComplex<T>) SaveMerged(histograms, packer);
        return packer.Bytes();
    }

    bool MergeCounts(std::string_view packed) {
        NumberUnpacker numbers(packed);
        if constexpr (!zelm::kIsComplex<T>) {
            auto further = histograms;
            for (std::uint32_t band = 0; band < bands; ++band)
                if (!further[band].Load(numbers)) return false;
            if (!numbers.Rest().empty()) return false;
            histograms = std::move(further);
        }
        return true;
    }

    std::vector<FullStatistics> Store(Raster& target) {
        std::vector<FullStatistics> stored;
        if (!Active()) return stored;
        if constexpr (!zelm::kIsComplex<T>) {
            MergeLanes(histograms);
            if constexpr (kCountsEveryValue<T>) MergeLanes(counters);
            std::vector<zelm::RasterBandStats<T>> records;
            std::vector<zelm::RasterBandHistogram<T>> counts;
            for (std::uint32_t band = 0; band < bands; ++band) {
                records.push_back(StatsOf(band));
                counts.push_back(HistogramOf(band));
            }
            target.SetStatistics(records);
            target.SetHistograms(counts);
            for (const auto& record : records) stored.push_back(FullStatistics::Of(record));
        }
        return stored;
    }

    std::uint64_t Memory() const {
        return counters.size() * TableBytes() + accumulators.size() * sizeof(BandAccumulator<T>) +
               histograms.size() * bins * sizeof(std::uint64_t);
    }

private:
    // Complex types have neither tables nor histograms; something has to stand in their place.
    struct Nothing {};
    template <bool Counts, class Dummy = void>
    struct Tables {
        using Counter = Nothing;
    };
    template <class Dummy>
    struct Tables<true, Dummy> {
        using Counter = ValueCounter<T>;
    };
    template <bool Complex, class Dummy = void>
    struct Divisions {
        using Histogram = HistogramAccumulator<T>;
    };
    template <class Dummy>
    struct Divisions<true, Dummy> {
        using Histogram = Nothing;
    };

    static constexpr std::uint64_t TableBytes() {
        if constexpr (kCountsEveryValue<T>)
            return ValueCounter<T>::kBytes;
        else
            return 0;
    }

    std::size_t Place(std::uint32_t lane, std::uint32_t band) const {
        return std::size_t{lane} * bands + band;
    }

    // Leaves the sum of all lanes in the first.
    template <class Gatherer>
    void MergeLanes(std::vector<Gatherer>& gatherers) {
        for (std::size_t i = bands; i < gatherers.size(); ++i)
            gatherers[i % bands].Merge(gatherers[i]);
    }

    void BeginCounts() {
        if constexpr (!zelm::kIsComplex<T>)
            for (std::uint32_t lane = 0; lane < lanes; ++lane)
                for (std::uint32_t band = 0; band < bands; ++band)
                    histograms.emplace_back(BinsOf(band));
    }

    // What the sums of this object are, for those who take them.
    std::uint64_t Kind() const {
        if (!Active()) return 0;
        return bands * std::uint64_t{4} + (counters.empty() ? 1 : 2);
    }

    template <class Gatherer>
    void SaveMerged(std::vector<Gatherer>& gatherers, NumberPacker& packer) {
        if (gatherers.empty()) return;
        MergeLanes(gatherers);
        for (std::uint32_t band = 0; band < bands; ++band) gatherers[band].Save(packer);
    }

    template <class Gatherer>
    bool LoadInto(std::vector<Gatherer>& gatherers, NumberUnpacker& numbers) {
        std::vector<Gatherer> further(bands);
        for (Gatherer& one : further) one.Load(numbers);
        if (!numbers.Good() || !numbers.Rest().empty()) return false;
        for (std::uint32_t band = 0; band < bands; ++band) gatherers[band].Merge(further[band]);
        return true;
    }

    HistogramBins<T> BinsOf(std::uint32_t band) const {
        const zelm::RasterBandStats<T> stats = accumulators[band].Stats(band);
        return HistogramBins<T>::ForBand(stats.minimum, stats.maximum, bins);
    }

    zelm::RasterBandStats<T> StatsOf(std::uint32_t band) const {
        if constexpr (kCountsEveryValue<T>)
            if (!counters.empty()) return counters[band].Statistics().Stats(band);
        return accumulators[band].Stats(band);
    }

    zelm::RasterBandHistogram<T> HistogramOf(std::uint32_t band) const {
        if constexpr (kCountsEveryValue<T>)
            if (!counters.empty()) return counters[band].Histogram(bins).Histogram(band);
        return histograms[band].Histogram(band);
    }

    std::uint32_t lanes;
    std::uint32_t bands;
    std::uint32_t bins;
    std::vector<typename Tables<kCountsEveryValue<T>>::Counter> counters;
    std::vector<BandAccumulator<T>> accumulators;
    std::vector<typename Divisions<zelm::kIsComplex<T>>::Histogram> histograms;
};

template <class T>
class TypedWork : public PixelWork {
public:
    TypedWork(Raster& raster, const PixelWorkSetup& setup)
        : target(raster), method(setup.resampling), bands(setup.props.bands), harvest(setup) {
        if (target.Bands() != bands)
            throw Error(target.Name(), "build it", "it is of another number of bands");
        for (std::uint32_t band = 0; band < bands; ++band) {
            rules.push_back(RuleOfBand<T>(setup.props, band));
            anyValue = anyValue || rules.back().hasValue;
        }
        weighing = WeighingOf<T>(setup.weights, method, rules);
        weighs = weighing.Any();
        if (!allBands.SetShape(zelm::ArrayShape(bands))) throw std::bad_alloc();
        for (std::uint32_t band = 0; band < bands; ++band)
            allBands.data[band] = static_cast<int>(band);
    }

    bool NeedsMasks() const override {
        return anyValue || weighing.hidden || !std::is_integral_v<T>;
    }
    bool MayMark() const override { return anyValue && weighs; }

    bool MarkRow(const std::byte* row, unsigned char* mask, std::uint32_t width) const override {
        const T* samples = Samples(row);
        const std::size_t count = std::size_t{width} * bands;
        unsigned any = 0;
        if (weighing.hidden) {
            for (std::size_t i = 0; i < count; ++i) {
                const int marked = rules[i % bands].Marks(samples[i]) ? kInvalidBit : 0;
                mask[i] = static_cast<unsigned char>((mask[i] & kHiddenBit) | marked);
                any |= mask[i];
            }
            return any != 0;
        }
        if (bands == 1) {
            const zelm::NoDataRule<T> rule = rules[0];
            for (std::size_t i = 0; i < count; ++i) {
                mask[i] = rule.Marks(samples[i]) ? 1 : 0;
                any |= mask[i];
            }
            return any != 0;
        }
        for (std::size_t i = 0; i < count; i += bands)
            for (std::uint32_t band = 0; band < bands; ++band) {
                mask[i + band] = rules[band].Marks(samples[i + band]) ? 1 : 0;
                any |= mask[i + band];
            }
        return any != 0;
    }

    void ReduceRow(const RowWindow& source, std::uint32_t sourceWidth, std::byte* row,
                   unsigned char* mask) const override {
        const T* rows[RowWindow::kMaxRows];
        std::transform(std::begin(source.rows), std::end(source.rows), rows,
                       [](const std::byte* from) { return Samples(from); });
        const ReductionRows<T> typed{rows, source.anyMask ? source.masks : nullptr};
        zmchost::ReduceRow(method, bands, sourceWidth, typed, anyValue ? rules.data() : nullptr,
                           Samples(row), mask);
        if (weighs)
            WeighRow(method, bands, sourceWidth, typed, anyValue ? rules.data() : nullptr, weighing,
                     Samples(row), mask);
    }

    void TakeStatistics(std::uint32_t lane, const std::byte* row, const unsigned char* mask,
                        std::uint32_t width) override {
        harvest.Take(lane, Samples(row), mask, width);
    }
    bool NeedsSecondWalk() const override { return harvest.NeedsSecondWalk(); }
    void BeginSecondWalk() override { harvest.BeginSecondWalk(); }
    void TakeCounts(std::uint32_t lane, const std::byte* row, const unsigned char* mask,
                    std::uint32_t width) override {
        harvest.TakeCounts(lane, Samples(row), mask, width);
    }

    bool ReadTile(std::uint32_t level, const Window& tile, std::byte* pixels) override {
        return Reader().ReadTile(
            static_cast<std::int32_t>(tile.x), static_cast<std::int32_t>(tile.y), tile.width,
            tile.height, allBands, static_cast<std::int32_t>(level), Samples(pixels), nullptr);
    }

    bool WriteTile(std::uint32_t level, const Window& tile, std::byte* pixels,
                   unsigned char* cleanMask) override {
        return Reader().WriteTile(
            static_cast<std::int32_t>(tile.x), static_cast<std::int32_t>(tile.y), tile.width,
            tile.height, allBands, static_cast<std::int32_t>(level), Samples(pixels), cleanMask);
    }

    std::string SaveSums() override { return harvest.SaveSums(); }
    void ClearSums() override { harvest.ClearSums(); }
    bool MergeSums(std::string_view packed) override { return harvest.MergeSums(packed); }
    std::string SaveCounts() override { return harvest.SaveCounts(); }
    bool MergeCounts(std::string_view packed) override { return harvest.MergeCounts(packed); }
    void ClearCounts() override { harvest.ClearCounts(); }

    std::string Failure() override { return target.TakeFailure(); }

    std::vector<FullStatistics> StoreStatistics() override { return harvest.Store(target); }
    std::uint64_t StatisticsMemory() const override { return harvest.Memory(); }

private:
    static const T* Samples(const std::byte* row) {
        return static_cast<const T*>(static_cast<const void*>(row));
    }
    static T* Samples(std::byte* row) { return static_cast<T*>(static_cast<void*>(row)); }

    zelm::RasterReader<T>& Reader() {
        if (!reader)
            target.Visit([this]<class U>(zelm::RasterReader<U>& typed) {
                if constexpr (std::is_same_v<T, U>) reader = &typed;
            });
        if (!reader) throw Error(target.Name(), "build it", "it is of another pixel type");
        return *reader;
    }

    Raster& target;
    Resampling method;
    std::uint32_t bands;
    std::vector<zelm::NoDataRule<T>> rules;
    bool anyValue = false;
    Weighing weighing;
    bool weighs = false;
    zelm::Array<int> allBands;
    zelm::RasterReader<T>* reader = nullptr;
    Harvest<T> harvest;
};

}  // namespace

std::unique_ptr<PixelWork> MakePixelWork(Raster& target, const PixelWorkSetup& setup) {
    std::unique_ptr<PixelWork> work;
    zelm::VisitElementType(setup.props.pixelType, [&]<class T>(std::type_identity<T>) {
        work = std::make_unique<TypedWork<T>>(target, setup);
    });
    if (!work) throw Error(target.Name(), "build it", "its pixel type has no reader");
    return work;
}

}  // namespace zmchost
