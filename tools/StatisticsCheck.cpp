#include <algorithm>
#include <cmath>
#include <limits>
#include <set>
#include <span>
#include <utility>
#include <vector>

#include "host/statistics/BandStatistics.h"
#include "host/statistics/Histogram.h"
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

// Samples and masks that are held at once.
constexpr std::uint64_t kStripBytes = std::uint64_t{48} << 20;

// Calls take(row, mask, width) for every line of level 0, or the parts of each, with those bands.
template <class T, class Take>
void WalkLines(zmchost::Raster& raster, std::span<const std::uint32_t> bands, const char* label,
               bool quiet, Take&& take) {
    const Strips strips{{0, 0, raster.Width(), raster.Height()},
                        bands.size() * (sizeof(T) + 1),
                        kStripBytes,
                        raster.TileSide()};
    TerminalProgress bar(label, !quiet);
    std::vector<T> pixels;
    std::vector<unsigned char> mask;
    strips.Walk(raster.Name(), bar, [&](const zmchost::Window& strip) {
        const std::size_t stride = std::size_t{strip.width} * bands.size();
        pixels.resize(stride * strip.height);
        mask.assign(stride * strip.height, 0);
        raster.Read(0, strip, bands, pixels.data(), mask.data());
        for (std::uint32_t row = 0; row < strip.height; ++row)
            take(pixels.data() + row * stride, mask.data() + row * stride, strip.width);
    });
}

template <class T>
class StatisticsChecker {
public:
    StatisticsChecker(zmchost::Raster& pyramid, bool beQuiet, CheckResult& into)
        : raster(pyramid), quiet(beQuiet), result(into) {}

    void Run() {
        const auto histograms = raster.Histograms<T>();
        bool any = !histograms.empty();
        for (std::uint32_t band = 0; band < raster.Bands(); ++band)
            any = any || raster.HasStatistics(band);
        if (!any) {
            result.skipped = "the file has no statistics";
            return;
        }
        CheckRecords();
        if constexpr (!zelm::kIsComplex<T>) CheckHistograms(histograms);
    }

private:
    zmchost::Raster& raster;
    bool quiet;
    CheckResult& result;

    // Exact sums of reals take up to 200 kB for each band.
    static constexpr std::size_t kBandsAtOnce = 128;

    template <class Check>
    static void InGroups(std::span<const std::uint32_t> bands, Check&& check) {
        for (std::size_t done = 0; done < bands.size(); done += kBandsAtOnce)
            check(bands.subspan(done, std::min(kBandsAtOnce, bands.size() - done)));
    }

    void CheckRecords() {
        std::vector<std::uint32_t> bands;
        for (std::uint32_t band = 0; band < raster.Bands(); ++band)
            if (raster.HasStatistics(band)) bands.push_back(band);
        InGroups(bands, [this](std::span<const std::uint32_t> group) { CheckRecords(group); });
    }

    void CheckRecords(std::span<const std::uint32_t> bands) {
        const auto count = static_cast<std::uint32_t>(bands.size());
        std::vector<zmchost::BandAccumulator<T>> sums(count);
        WalkLines<T>(raster, bands, "statistics", quiet,
                     [&](const T* row, const unsigned char* mask, std::uint32_t width) {
                         for (std::uint32_t i = 0; i < count; ++i)
                             sums[i].AddRow(row, mask, i, count, width);
                     });
        for (std::uint32_t i = 0; i < count; ++i)
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

    void CheckHistograms(const std::vector<zelm::RasterBandHistogram<T>>& stored) {
        if constexpr (kExactEnds) {
            std::vector<Histogram> histograms;
            for (const auto& record : stored)
                if (IsUsual(record))
                    histograms.push_back({&record, zmchost::HistogramAccumulator<T>(Bins(record))});
            const std::vector<std::uint32_t> bands = BandsOf(histograms);
            InGroups(bands,
                     [&](std::span<const std::uint32_t> group) { Count(histograms, group); });
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

    static std::vector<std::uint32_t> BandsOf(const std::vector<Histogram>& histograms) {
        std::set<std::uint32_t> bands;
        for (const Histogram& each : histograms) bands.insert(each.stored->band);
        return {bands.begin(), bands.end()};
    }

    // Counts those of these bands, which are in order.
    void Count(std::vector<Histogram>& histograms, std::span<const std::uint32_t> bands) {
        std::vector<std::pair<Histogram*, std::uint32_t>> counted;
        for (Histogram& each : histograms) {
            const auto found = std::lower_bound(bands.begin(), bands.end(), each.stored->band);
            if (found != bands.end() && *found == each.stored->band)
                counted.emplace_back(&each, static_cast<std::uint32_t>(found - bands.begin()));
        }
        const auto count = static_cast<std::uint32_t>(bands.size());
        WalkLines<T>(raster, bands, "histograms", quiet,
                     [&](const T* row, const unsigned char* mask, std::uint32_t width) {
                         for (const auto& [histogram, place] : counted)
                             histogram->computed.AddRow(row, mask, place, count, width);
                     });
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

CheckResult CheckStatistics(zmchost::Raster& raster, bool quiet) {
    CheckResult result{"statistics", {}, {}};
    zelm::VisitElementType(raster.PixelType(), [&]<class T>(std::type_identity<T>) {
        StatisticsChecker<T>(raster, quiet, result).Run();
    });
    return result;
}

}  // namespace zmctools
