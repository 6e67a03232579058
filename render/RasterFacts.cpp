#include "render/RasterFacts.h"

#include <algorithm>
#include <cmath>

#include "core/ElementTypes.h"
#include "host/base/Int128.h"
#include "host/file/StoredRecords.h"

namespace zmcrender {
namespace {

using zmchost::Int128;

// A number that a record has; complex ones have no order, and what is not finite is none.
template <class T>
std::optional<Number> NumberOf(const T& value) {
    if constexpr (zelm::kIsComplex<T>) {
        return std::nullopt;
    } else {
        if constexpr (std::is_floating_point_v<T>)
            if (!std::isfinite(value)) return std::nullopt;
        using Wide = std::conditional_t<std::is_integral_v<T>, T, double>;
        return Number(static_cast<Wide>(value));
    }
}

template <class T>
void TakeStatistics(const zelm::RasterBandStats<T>& record, BandFacts& band) {
    namespace Flag = zelm::StatsFlag;
    const auto has = [&](std::uint32_t flag) { return (record.flags & flag) != 0; };
    if (has(Flag::Minimum)) band.minimum = NumberOf(record.minimum);
    if (has(Flag::Maximum)) band.maximum = NumberOf(record.maximum);
    if (has(Flag::Mean) && std::isfinite(record.mean)) band.mean = record.mean;
    if (has(Flag::StandardDeviation) && std::isfinite(record.standardDeviation))
        band.deviation = record.standardDeviation;
}

template <class T>
std::optional<HistogramFacts> HistogramOf(const zelm::RasterBandHistogram<T>& record) {
    const auto minimum = NumberOf(record.minimum), maximum = NumberOf(record.maximum);
    if (!minimum || !maximum || !(record.binSize > 0) || !std::isfinite(record.binSize) ||
        !record.counts.data)
        return std::nullopt;
    const std::uint64_t* const counts = record.counts.data;
    return HistogramFacts{
        *minimum, *maximum, record.binSize, {counts, counts + record.counts.shape.elements}};
}

template <class T>
void TakeHistograms(const zmchost::StoredRecords<T>& records, std::vector<BandFacts>& bands) {
    std::vector<std::optional<std::uint32_t>> levels(bands.size());
    for (const auto& record : records.Histograms()) {
        if (record.band >= bands.size()) continue;
        auto& level = levels[record.band];
        if (level && *level <= record.level) continue;
        auto histogram = HistogramOf(record);
        if (!histogram) continue;
        bands[record.band].histogram = std::move(histogram);
        level = record.level;
    }
}

void TakePalette(const zelm::ColorList& colours, BandFacts& band) {
    for (const zelm::ColorList::Rgba colour : colours.Colors()) {
        auto& entry = band.palette.emplace_back();
        for (int i = 0; i < 4; ++i)
            entry[static_cast<std::size_t>(i)] = zelm::ColorList::Channel(colour, i);
    }
    band.meaning = BandMeaning::Palette;
}

template <class T>
void TakeRecords(const zmchost::Raster& raster, std::vector<BandFacts>& bands) {
    const auto records = raster.Records<T>();
    if (!records) return;
    for (std::uint32_t i = 0; i < bands.size(); ++i) {
        if (records->HasStatistics(i)) TakeStatistics(raster.Statistics<T>(i), bands[i]);
        if (const auto* const palette = records->BandPalette(i)) TakePalette(*palette, bands[i]);
    }
    TakeHistograms(*records, bands);
}

std::optional<std::uint32_t> Meant(const RasterFacts& facts, BandMeaning meaning) {
    for (std::uint32_t i = 0; i < facts.bands.size(); ++i)
        if (facts.bands[i].meaning == meaning) return i + 1;
    return std::nullopt;
}

// number + offset, exact where both are whole and the sum has 64 bits.
Number Sum(const Number& number, double offset) {
    if (number.whole && offset == std::trunc(offset) && std::fabs(offset) < 0x1p65) {
        const Int128 base = static_cast<Int128>(number.magnitude) * (number.negative ? -1 : 1);
        const Int128 sum = base + static_cast<Int128>(offset);
        const Int128 size = sum < 0 ? -sum : sum;
        if (size >> 64 == 0) {
            Number exact(static_cast<std::uint64_t>(size));
            exact.negative = sum < 0;
            if (exact.negative) exact.real = -exact.real;
            return exact;
        }
    }
    return Number(number.real + offset);
}

bool IsLess(const Number& a, const Number& b) {
    if (!a.whole || !b.whole) return a.real < b.real;
    if (a.negative != b.negative) return a.negative;
    return a.negative ? a.magnitude > b.magnitude : a.magnitude < b.magnitude;
}

bool IsWholeType(std::uint32_t pixelType) {
    bool whole = false;
    zelm::VisitElementType(pixelType,
                           [&]<class T>(std::type_identity<T>) { whole = std::is_integral_v<T>; });
    return whole;
}

}  // namespace

RasterFacts FactsOf(const zmchost::Raster& raster) {
    RasterFacts facts{raster.Name(), raster.PixelType(), std::vector<BandFacts>(raster.Bands())};
    zelm::VisitElementType(facts.pixelType, [&]<class T>(std::type_identity<T>) {
        TakeRecords<T>(raster, facts.bands);
    });
    for (std::uint32_t i = 0; i < facts.bands.size(); ++i)
        if (const auto value = raster.NoDataValue(i)) facts.bands[i].noData = Number(*value);
    return facts;
}

bool HasUsualPalette(const RasterFacts& facts, std::uint32_t band) {
    return !facts.bands[band].palette.empty() && IsWholeType(facts.pixelType);
}

std::vector<std::uint32_t> UsualBands(const RasterFacts& facts) {
    const auto red = Meant(facts, BandMeaning::Red), green = Meant(facts, BandMeaning::Green),
               blue = Meant(facts, BandMeaning::Blue), alpha = Meant(facts, BandMeaning::Alpha);
    if (red && green && blue) {
        std::vector<std::uint32_t> bands{*red, *green, *blue};
        if (alpha) bands.push_back(*alpha);
        return bands;
    }
    if (facts.bands.size() == 2 && alpha == 2u) return {1, 2};
    if (facts.bands.size() >= 3 && !HasUsualPalette(facts, 0)) return {1, 2, 3};
    return {1};
}

std::optional<Number> PercentileOf(const HistogramFacts& histogram, double percent,
                                   std::uint32_t pixelType) {
    double total = 0;
    for (const std::uint64_t count : histogram.counts) total += static_cast<double>(count);
    if (total == 0) return std::nullopt;
    const double target = percent * total / 100;
    double before = 0, offset = 0;
    for (std::size_t i = 0; i < histogram.counts.size(); ++i) {
        const auto count = static_cast<double>(histogram.counts[i]);
        if (count == 0) continue;
        const double share = std::clamp((target - before) / count, 0.0, 1.0);
        const double inside = IsWholeType(pixelType)
                                  ? std::min(std::floor(share * histogram.binSize),
                                             std::max(histogram.binSize - 1, 0.0))
                                  : share * histogram.binSize;
        offset = static_cast<double>(i) * histogram.binSize + inside;
        before += count;
        if (before >= target) break;
    }
    const Number value = Sum(histogram.minimum, offset);
    return IsLess(histogram.maximum, value) ? histogram.maximum : value;
}

}  // namespace zmcrender
