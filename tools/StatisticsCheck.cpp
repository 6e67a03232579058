#include <algorithm>
#include <cmath>
#include <limits>
#include <map>
#include <span>
#include <utility>
#include <vector>

#include "host/build/SampleGathering.h"
#include "host/statistics/BandStatistics.h"
#include "host/statistics/Histogram.h"
#include "host/statistics/ValueCounter.h"
#include "tools/Interrupt.h"
#include "tools/Message.h"
#include "tools/RasterView.h"
#include "tools/Verification.h"

namespace zmctools {
namespace {

// Reals stand in files with 15 significant digits, samples of type Single with 6.
constexpr double kRealError = 1e-14;
constexpr double kSingleError = 1e-5;

std::string Digits(double value) {
    char text[40];
    static_cast<void>(std::snprintf(text, sizeof text, "%.15g", value));
    return text;
}

bool Near(double stored, double computed, double error) {
    if (stored == computed || (std::isnan(stored) && std::isnan(computed))) return true;
    return std::fabs(stored - computed) <=
           error * std::max(std::fabs(stored), std::fabs(computed)) +
               std::numeric_limits<double>::denorm_min();
}

template <class T>
class StatisticsChecker {
public:
    StatisticsChecker(zmchost::Raster& pyramid, const CheckManner& how, CheckResult& into)
        : raster(pyramid), manner(how), result(into) {}

    void Run() {
        const auto histograms = raster.Histograms<T>();
        bool any = !histograms.empty();
        for (std::uint32_t band = 0; band < raster.Bands(); ++band)
            any = any || raster.HasStatistics(band);
        if (!any) {
            result.skipped = "the file has no statistics";
            return;
        }
        if constexpr (zmchost::kCountsEveryValue<T>) {
            CheckByValues(histograms);
        } else {
            CheckRecords();
            if constexpr (!zelm::kIsComplex<T>) CheckHistograms(histograms);
        }
    }

private:
    zmchost::Raster& raster;
    const CheckManner& manner;
    CheckResult& result;

    // Exact sums and tables of values are large.
    static constexpr std::size_t kBandsAtOnce = 128;

    template <class Check>
    static void InGroups(const std::vector<std::uint32_t>& bands, Check&& check) {
        const std::span<const std::uint32_t> all(bands);
        for (std::size_t done = 0; done < all.size(); done += kBandsAtOnce)
            check(all.subspan(done, std::min(kBandsAtOnce, all.size() - done)));
    }

    // Lets each of `gatherers`, which take so many bytes together, have its band of level 0.
    template <class Gatherer>
    void Gather(const char* label, std::span<const std::uint32_t> bands, std::uint64_t bytes,
                std::vector<Gatherer>& gatherers) {
        TerminalProgress bar(label, !manner.quiet);
        const std::uint64_t total = std::uint64_t{raster.Width()} * raster.Height();
        std::uint64_t done = 0;
        zmchost::GatherSamples<T>(raster, manner.threads, bytes, bands, gatherers,
                                  [&](std::uint64_t pixels) {
                                      done += pixels;
                                      if (!bar.Show(done, total)) throw Interruption(raster.Name());
                                  });
    }

    std::vector<std::uint32_t> RecordedBands() const {
        std::vector<std::uint32_t> bands;
        for (std::uint32_t band = 0; band < raster.Bands(); ++band)
            if (raster.HasStatistics(band)) bands.push_back(band);
        return bands;
    }

    // How often each value occurs tells both records and histograms.
    void CheckByValues(const std::vector<zelm::RasterBandHistogram<T>>& stored) {
        std::vector<Histogram> histograms = UsualOnes(stored);
        ByBand byBand = ByBandOf(histograms);
        for (const std::uint32_t band : RecordedBands()) byBand[band];
        InGroups(BandsOf(byBand), [&](std::span<const std::uint32_t> group) {
            using Counter = zmchost::ValueCounter<T>;
            std::vector<Counter> counters(group.size());
            Gather("statistics", group, group.size() * Counter::kBytes, counters);
            for (std::size_t i = 0; i < group.size(); ++i) {
                if (raster.HasStatistics(group[i]))
                    Compare(raster.Statistics<T>(group[i]),
                            counters[i].Statistics().Stats(group[i]));
                for (Histogram* const each : byBand[group[i]]) counters[i].AddTo(each->computed);
            }
        });
        for (const Histogram& each : histograms) Compare(*each.stored, each.computed);
    }

    void CheckRecords() {
        InGroups(RecordedBands(),
                 [this](std::span<const std::uint32_t> group) { CheckRecords(group); });
    }

    void CheckRecords(std::span<const std::uint32_t> bands) {
        using Sums = zmchost::BandAccumulator<T>;
        std::vector<Sums> sums(bands.size());
        Gather("statistics", bands, bands.size() * Sums::kBytes, sums);
        for (std::size_t i = 0; i < bands.size(); ++i)
            Compare(raster.Statistics<T>(bands[i]), sums[i].Stats(bands[i]));
    }

    void Compare(const zelm::RasterBandStats<T>& stored, const zelm::RasterBandStats<T>& computed) {
        namespace Flag = zelm::StatsFlag;
        const auto expect = [&](std::uint32_t flag, const char* what, double a, double b,
                                double error) {
            if ((stored.flags & flag) == 0) return;
            if ((computed.flags & flag) != 0 && Near(a, b, error)) return;
            const bool has = (computed.flags & flag) != 0;
            result.problems.push_back("band " + std::to_string(stored.band + 1) + ": " + what +
                                      " is " + Digits(a) + " in the file, and " +
                                      (has ? Digits(b) : std::string("none")) + " in the pixels");
        };
        if constexpr (!zelm::kIsComplex<T>) {
            // Readers take the ends of 64-bit ranges through a double, which those near the limits
            // of the type do not survive.
            const bool lost = std::is_integral_v<T> && sizeof(T) == 8 &&
                              static_cast<double>(computed.maximum) >=
                                  static_cast<double>(std::numeric_limits<T>::max());
            const double error = std::is_same_v<T, float> ? kSingleError : kRealError;
            expect(Flag::Minimum, "minimum", static_cast<double>(stored.minimum),
                   static_cast<double>(computed.minimum), error);
            if (!lost)
                expect(Flag::Maximum, "maximum", static_cast<double>(stored.maximum),
                       static_cast<double>(computed.maximum), error);
        }
        expect(Flag::Mean, "mean", stored.mean, computed.mean, kRealError);
        expect(Flag::StandardDeviation, "standard deviation", stored.standardDeviation,
               computed.standardDeviation, kRealError);
        expect(Flag::Sum, "sum", stored.sum, computed.sum, kRealError);
        expect(Flag::SumOfSquares, "sum of squares", stored.sumOfSquares, computed.sumOfSquares,
               kRealError);
        expect(Flag::RootMeanSquare, "root mean square", stored.rootMeanSquare,
               computed.rootMeanSquare, kRealError);
    }

    // Ends of the range that lost digits on storing move samples from bin to bin, so only types
    // whose values a file keeps exactly are counted anew.
    static constexpr bool kExactEnds = std::is_integral_v<T> && sizeof(T) <= 4;

    struct Histogram {
        const zelm::RasterBandHistogram<T>* stored;
        zmchost::HistogramAccumulator<T> computed;
    };

    std::vector<Histogram> UsualOnes(
        const std::vector<zelm::RasterBandHistogram<T>>& stored) const {
        std::vector<Histogram> histograms;
        for (const auto& record : stored)
            if (IsUsual(record))
                histograms.push_back({&record, zmchost::HistogramAccumulator<T>(Bins(record))});
        return histograms;
    }

    void CheckHistograms(const std::vector<zelm::RasterBandHistogram<T>>& stored) {
        if constexpr (kExactEnds) {
            std::vector<Histogram> histograms = UsualOnes(stored);
            const ByBand byBand = ByBandOf(histograms);
            InGroups(BandsOf(byBand),
                     [&](std::span<const std::uint32_t> group) { Count(byBand, group); });
            for (const Histogram& each : histograms) Compare(*each.stored, each.computed);
        } else {
            static_cast<void>(stored);
        }
    }

    // A number of bins takes memory only where the file has as many counts.
    bool IsUsual(const zelm::RasterBandHistogram<T>& record) const {
        return record.counts.shape.elements == record.binCount && record.level == 0 &&
               record.band < raster.Bands() && record.minimum <= record.maximum &&
               record.binCount > 0 && Near(Bins(record).Size(), record.binSize, kRealError);
    }

    static zmchost::HistogramBins<T> Bins(const zelm::RasterBandHistogram<T>& record) {
        return {record.minimum, record.maximum, record.binCount};
    }

    // A file may have several of one band.
    using ByBand = std::map<std::uint32_t, std::vector<Histogram*>>;

    static ByBand ByBandOf(std::vector<Histogram>& histograms) {
        ByBand found;
        for (Histogram& each : histograms) found[each.stored->band].push_back(&each);
        return found;
    }

    static std::vector<std::uint32_t> BandsOf(const ByBand& byBand) {
        std::vector<std::uint32_t> bands;
        for (const auto& entry : byBand) bands.push_back(entry.first);
        return bands;
    }

    // What gathers the histograms of a band.
    struct BandHistograms {
        std::vector<zmchost::HistogramAccumulator<T>> counted;

        void AddRow(const T* row, const unsigned char* mask, std::uint32_t band,
                    std::uint32_t bands, std::uint32_t width) {
            for (auto& each : counted) each.AddRow(row, mask, band, bands, width);
        }
        void Merge(const BandHistograms& other) {
            for (std::size_t i = 0; i < counted.size(); ++i) counted[i].Merge(other.counted[i]);
        }
    };

    // Counts those of these bands.
    void Count(const ByBand& byBand, std::span<const std::uint32_t> bands) {
        std::vector<BandHistograms> gatherers(bands.size());
        std::uint64_t bytes = 0;
        for (std::size_t i = 0; i < bands.size(); ++i)
            for (const Histogram* const each : byBand.at(bands[i])) {
                gatherers[i].counted.push_back(each->computed);
                bytes += each->computed.Counts().size() * sizeof(std::uint64_t);
            }
        Gather("histograms", bands, bytes, gatherers);
        for (std::size_t i = 0; i < bands.size(); ++i)
            for (std::size_t k = 0; Histogram* const each : byBand.at(bands[i]))
                each->computed = std::move(gatherers[i].counted[k++]);
    }

    void Compare(const zelm::RasterBandHistogram<T>& stored,
                 const zmchost::HistogramAccumulator<T>& computed) {
        const auto& counts = computed.Counts();
        std::size_t wrong = 0;
        for (std::size_t i = 0; i < counts.size(); ++i)
            if (stored.counts.data[i] != counts[i]) ++wrong;
        if (wrong != 0)
            result.problems.push_back("band " + std::to_string(stored.band + 1) + ": " +
                                      std::to_string(wrong) +
                                      " bins of the histogram differ from the pixels");
    }
};

}  // namespace

CheckResult CheckStatistics(zmchost::Raster& raster, const CheckManner& manner) {
    CheckResult result{"statistics", {}, {}};
    zelm::VisitElementType(raster.PixelType(), [&]<class T>(std::type_identity<T>) {
        StatisticsChecker<T>(raster, manner, result).Run();
    });
    return result;
}

}  // namespace zmctools
