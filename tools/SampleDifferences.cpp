#include "tools/SampleDifferences.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <limits>
#include <numeric>
#include <tuple>

#include "core/ElementTypes.h"
#include "core/PixelVocabulary.h"

namespace zmctools {
namespace {

// Each sample takes some dozen times its bytes then.
constexpr std::size_t kWidenedAtOnce = 65536;

long double Part(long double a, long double b) {
    if (std::isnan(a) && std::isnan(b)) return 0;
    if (std::isnan(a) || std::isnan(b)) return std::numeric_limits<long double>::infinity();
    return a == b ? 0 : std::fabs(a - b);
}

// One more place, before its sample is counted.
void MeetAt(BandDifference& band, std::uint32_t x, std::uint32_t y) {
    if (band.samples == 0 || std::tie(y, x) < std::tie(band.y, band.x))
        std::tie(band.x, band.y) = std::tie(x, y);
}

}  // namespace

SampleDifferences::SampleDifferences(std::uint32_t firstType, std::uint32_t secondType,
                                     std::uint32_t bandCount, double allowed)
    : types{firstType, secondType},
      sizes{zelm::PixelSize(firstType), zelm::PixelSize(secondType)},
      tolerance(allowed),
      bands(bandCount) {}

std::uint64_t SampleDifferences::Samples() const {
    return std::accumulate(
        bands.begin(), bands.end(), std::uint64_t{0},
        [](std::uint64_t sum, const BandDifference& band) { return sum + band.samples; });
}

void SampleDifferences::Take(const zmchost::Window& window, const void* first, const void* second) {
    const std::size_t samples = std::size_t{window.width} * bands.size();
    for (std::uint32_t line = 0; line < window.height; ++line)
        TakeLine(window.x, window.y + line, samples,
                 static_cast<const unsigned char*>(first) + line * samples * sizes[0],
                 static_cast<const unsigned char*>(second) + line * samples * sizes[1]);
}

// Equal bytes of one type are equal numbers, and as a rule all lines are equal.
void SampleDifferences::TakeLine(std::uint32_t x, std::uint32_t y, std::size_t samples,
                                 const unsigned char* first, const unsigned char* second) {
    if (types[0] == types[1] && std::memcmp(first, second, samples * sizes[0]) == 0) return;
    for (std::size_t start = 0; start < samples; start += kWidenedAtOnce) {
        const std::size_t count = std::min(kWidenedAtOnce, samples - start);
        values[0].resize(count);
        values[1].resize(count);
        Widen(types[0], first + start * sizes[0], values[0]);
        Widen(types[1], second + start * sizes[1], values[1]);
        for (std::size_t i = 0; i < count; ++i)
            TakeSample(x, y, start + i, Distance(values[0][i], values[1][i]));
    }
}

void SampleDifferences::TakeSample(std::uint32_t x, std::uint32_t y, std::size_t sample,
                                   long double distance) {
    if (distance == 0) return;
    BandDifference& band = bands[sample % bands.size()];
    band.greatest = std::max(band.greatest, distance);
    if (distance <= static_cast<long double>(tolerance)) return;
    MeetAt(band, x + static_cast<std::uint32_t>(sample / bands.size()), y);
    ++band.samples;
}

void SampleDifferences::Merge(const SampleDifferences& other) {
    for (std::size_t i = 0; i < bands.size(); ++i) {
        const BandDifference& from = other.bands[i];
        bands[i].greatest = std::max(bands[i].greatest, from.greatest);
        if (from.samples != 0) MeetAt(bands[i], from.x, from.y);
        bands[i].samples += from.samples;
    }
}

void SampleDifferences::Widen(std::uint32_t type, const unsigned char* samples,
                              std::vector<Value>& out) {
    zelm::VisitElementType(type, [&]<class T>(std::type_identity<T>) {
        for (std::size_t i = 0; i < out.size(); ++i) {
            T sample;
            std::memcpy(&sample, samples + i * sizeof(T), sizeof(T));
            if constexpr (zelm::kIsComplex<T>)
                out[i] = {static_cast<long double>(sample.re), static_cast<long double>(sample.im)};
            else
                out[i] = {static_cast<long double>(sample), 0};
        }
    });
}

long double SampleDifferences::Distance(const Value& a, const Value& b) {
    const long double re = Part(a.re, b.re);
    const long double im = Part(a.im, b.im);
    return im == 0 ? re : std::hypot(re, im);
}

}  // namespace zmctools
