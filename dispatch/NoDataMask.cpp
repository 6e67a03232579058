#include "dispatch/NoDataMask.h"

#include <algorithm>
#include <cstddef>

#include "core/ElementTypes.h"
#include "core/PixelVocabulary.h"
#include "dispatch/NoDataRule.h"

namespace zelm {
namespace {

constexpr unsigned kMarkedBit = 1;
constexpr unsigned kOtherBits = 0xFE;

// Where the samples of one band lie in a tile whose interleave keeps them in runs.
struct BandRuns {
    std::size_t bands;
    std::size_t bandStride;  // from a band's first run to the next band's
    std::size_t runs;
    std::size_t runStride;
    std::size_t length;  // samples of a run
};

// Every interleave but BIP of several bands. None has one plane, whatever the count of bands.
BandRuns RunsOf(std::int32_t interleave, std::size_t width, std::size_t height, std::size_t bands) {
    const std::size_t plane = width * height;
    if (interleave == Interleave::None) return {1, 0, 1, 0, plane};
    if (interleave == Interleave::BIL) return {bands, width, height, bands * width, width};
    return {bands, plane, 1, 0, plane};
}

template <class T>
NoDataRule<T> RuleOf(const RasterReader<T>& reader, std::size_t band) {
    const auto number = static_cast<std::uint32_t>(band);
    if (!reader.HasNoDataValue(number)) return {};
    return {true, reader.GetNoDataValue(number)};
}

// Equality of integers of 64 bits, by halves: the vector units that every processor of this kind
// has compare 32 bits at most.
template <class T>
bool Matches(const T& x, const T& value) {
    if constexpr (std::is_integral_v<T> && sizeof(T) == 8) {
        const std::uint64_t difference =
            static_cast<std::uint64_t>(x) ^ static_cast<std::uint64_t>(value);
        return (static_cast<std::uint32_t>(difference) |
                static_cast<std::uint32_t>(difference >> 32)) == 0;
    } else if constexpr (kIsComplex<T>) {
        return (static_cast<unsigned>(x.re == value.re) &
                static_cast<unsigned>(x.im == value.im)) != 0;
    } else {
        return x == value;
    }
}

// 64-bit floats are judged in two steps, for which see MarkWideFloats.
template <class T>
constexpr bool kIsWideFloat = std::is_same_v<T, double> || std::is_same_v<T, Complex<double>>;

// The verdict on a sample, as a number of half the width: 1 or NaN for a marked one, else a zero of
// either sign. x times 0 is such a zero for what is finite, and NaN otherwise.
float VerdictOn(double x, double value) { return static_cast<float>(x == value ? 1.0 : x * 0); }

float VerdictOn(const Complex<double>& x, const Complex<double>& value) {
    const double finite = x.re * 0 + x.im * 0;
    const double verdict = x.re == value.re ? 1.0 : finite;
    return static_cast<float>(x.im == value.im ? verdict : finite);
}

void SetMark(unsigned char& byte, bool marked) {
    byte = static_cast<unsigned char>((byte & kOtherBits) | static_cast<unsigned>(marked));
}

// Loops in which 64-bit comparisons decide on bytes do not become vector code; one that halves the
// width and one that goes on from there both do.
template <class T, class ValueAt>
void MarkWideFloats(ValueAt valueAt, const T* __restrict samples, unsigned char* __restrict mask,
                    std::size_t count) {
    constexpr std::size_t kBlock = 64;
    float verdicts[kBlock];
    for (std::size_t start = 0; start < count; start += kBlock) {
        const std::size_t length = std::min(kBlock, count - start);
        for (std::size_t i = 0; i < length; ++i)
            verdicts[i] = VerdictOn(samples[start + i], valueAt(start + i));
        for (std::size_t i = 0; i < length; ++i) SetMark(mask[start + i], verdicts[i] != 0);
    }
}

// Sets or clears bit 0 for each sample, against the value that valueAt(i) gives for it. Floating
// bands without a value come with one that no sample equals.
template <class T, class ValueAt>
void MarkSamples(ValueAt valueAt, const T* __restrict samples, unsigned char* __restrict mask,
                 std::size_t count) {
    if constexpr (kIsWideFloat<T>) {
        MarkWideFloats(valueAt, samples, mask, count);
    } else {
        for (std::size_t i = 0; i < count; ++i)
            SetMark(mask[i], (static_cast<unsigned>(Matches(samples[i], valueAt(i))) |
                              static_cast<unsigned>(NoDataRule<T>::NotFinite(samples[i]))) != 0);
    }
}

// The value to compare with; a floating band without one has the value that no sample equals.
template <class T>
T ValueOf(const NoDataRule<T>& rule) {
    if constexpr (!std::is_integral_v<T>)
        return rule.hasValue ? rule.value : NoDataRule<T>::Unmatched();
    else
        return rule.value;
}

void ClearRun(unsigned char* mask, std::size_t count) {
    for (std::size_t i = 0; i < count; ++i)
        mask[i] = static_cast<unsigned char>(mask[i] & kOtherBits);
}

// Integers without a no-data value have no marked sample, so that their pixels need no look.
template <class T>
void MarkOrClearRun(const NoDataRule<T>& rule, const T* pixels, unsigned char* mask,
                    std::size_t count) {
    if (std::is_integral_v<T> && !rule.hasValue)
        ClearRun(mask, count);
    else
        MarkSamples([value = ValueOf(rule)](std::size_t) { return value; }, pixels, mask, count);
}

template <class T>
void StampRun(T value, T* __restrict pixels, const unsigned char* __restrict mask,
              std::size_t count) {
    for (std::size_t i = 0; i < count; ++i)
        pixels[i] = (mask[i] & kMarkedBit) != 0 ? value : pixels[i];
}

// The rules of neighbouring bands of a pixel-interleaved tile, repeated over as many pixels as fit,
// so that the samples of several pixels are compared in one contiguous loop. Bands that do not fit
// together are taken in several patterns.
template <class T>
class BandPattern {
public:
    BandPattern(const RasterReader<T>& reader, std::size_t firstBand, std::size_t bandCount)
        : bands(std::min(bandCount - firstBand, kSamples)) {
        const NoDataRule<T> first = RuleOf(reader, firstBand);
        Put(0, first);
        uniform = true;
        for (std::size_t band = 1; band < bands; ++band) {
            const NoDataRule<T> rule = RuleOf(reader, firstBand + band);
            uniform = uniform && IsSame(rule, first);
            anyValue = anyValue || rule.hasValue;
            allValues = allValues && rule.hasValue;
            Put(band, rule);
        }
        anyValue = anyValue || first.hasValue;
        allValues = allValues && first.hasValue;
        // Only a pattern of all bands may run on into the next pixel.
        if (bands == bandCount) Repeat();
    }

    std::size_t Bands() const { return bands; }
    std::size_t Pixels() const { return pixels; }
    bool IsUniform() const { return uniform; }
    bool HasAnyValue() const { return anyValue; }
    NoDataRule<T> First() const { return {flags[0] != 0, values[0]}; }

    void Mark(const T* samples, unsigned char* mask, std::size_t count) const {
        if (std::is_integral_v<T> && !allValues)
            MarkFlagged(samples, mask, count);
        else
            MarkSamples([this](std::size_t i) { return values[i]; }, samples, mask, count);
    }

    void Stamp(T* __restrict samples, const unsigned char* __restrict mask,
               std::size_t count) const {
        for (std::size_t i = 0; i < count; ++i)
            samples[i] = (mask[i] & flags[i]) != 0 ? values[i] : samples[i];
    }

private:
    static constexpr std::size_t kSamples = 512;
    // A whole number of vectors of any sample size, so that no loop over a pattern has a rest.
    static constexpr std::size_t kAlignedPixels = 16;
    T values[kSamples];
    unsigned char flags[kSamples];  // 1 where the band has a value
    std::size_t bands;
    std::size_t pixels = 1;
    bool uniform = false;
    bool anyValue = false;
    bool allValues = true;

    static bool IsSame(const NoDataRule<T>& a, const NoDataRule<T>& b) {
        return a.hasValue == b.hasValue && (!a.hasValue || a.value == b.value);
    }

    // For integers of which some bands have a value: there is none that no sample equals.
    void MarkFlagged(const T* __restrict samples, unsigned char* __restrict mask,
                     std::size_t count) const {
        for (std::size_t i = 0; i < count; ++i)
            mask[i] = static_cast<unsigned char>(
                (mask[i] & kOtherBits) |
                (static_cast<unsigned>(Matches(samples[i], values[i])) & flags[i]));
    }

    void Put(std::size_t at, const NoDataRule<T>& rule) {
        values[at] = ValueOf(rule);
        flags[at] = rule.hasValue ? 1 : 0;
    }

    void Repeat() {
        pixels = kSamples / bands;
        if (pixels > kAlignedPixels) pixels -= pixels % kAlignedPixels;
        for (std::size_t i = bands; i < pixels * bands; ++i) {
            values[i] = values[i - bands];
            flags[i] = flags[i - bands];
        }
    }
};

// Calls visit(offset, count) for the stretches of a pixel-interleaved tile that a pattern starting
// at band `first` covers, each beginning where the pattern begins.
template <class T, class Visit>
void ForEachStretch(const BandPattern<T>& pattern, std::size_t first, std::size_t pixels,
                    std::size_t bands, Visit&& visit) {
    for (std::size_t pixel = 0; pixel < pixels; pixel += pattern.Pixels())
        visit(pixel * bands + first, std::min(pattern.Pixels(), pixels - pixel) * pattern.Bands());
}

template <class T>
void MarkPixelInterleaved(const RasterReader<T>& reader, std::size_t pixels, std::size_t bands,
                          const T* samples, unsigned char* mask) {
    for (std::size_t first = 0; first < bands;) {
        const BandPattern<T> pattern(reader, first, bands);
        if (pattern.IsUniform() && pattern.Bands() == bands) {
            MarkOrClearRun(pattern.First(), samples, mask, pixels * bands);
        } else {
            ForEachStretch(pattern, first, pixels, bands, [&](std::size_t at, std::size_t count) {
                pattern.Mark(samples + at, mask + at, count);
            });
        }
        first += pattern.Bands();
    }
}

template <class T>
void StampPixelInterleaved(const RasterReader<T>& reader, std::size_t pixels, std::size_t bands,
                           T* samples, const unsigned char* mask) {
    for (std::size_t first = 0; first < bands;) {
        const BandPattern<T> pattern(reader, first, bands);
        if (pattern.HasAnyValue()) {
            ForEachStretch(pattern, first, pixels, bands, [&](std::size_t at, std::size_t count) {
                pattern.Stamp(samples + at, mask + at, count);
            });
        }
        first += pattern.Bands();
    }
}

}  // namespace

template <class T>
void ComputeNoDataMask(const RasterReader<T>& reader, std::uint32_t width, std::uint32_t height,
                       std::uint32_t bandCount, const T* pixels, unsigned char* mask) {
    if (!pixels || !mask || width == 0 || height == 0) return;
    const std::int32_t interleave = reader.GetRasterProps().interleave;
    if (!IsInterleave(interleave)) return;
    if (interleave == Interleave::BIP && bandCount > 1) {
        MarkPixelInterleaved(reader, std::size_t{width} * height, bandCount, pixels, mask);
        return;
    }
    const BandRuns layout = RunsOf(interleave, width, height, bandCount);
    for (std::size_t band = 0; band < layout.bands; ++band) {
        const NoDataRule<T> rule = RuleOf(reader, band);
        std::size_t at = band * layout.bandStride;
        for (std::size_t run = 0; run < layout.runs; ++run, at += layout.runStride)
            MarkOrClearRun(rule, pixels + at, mask + at, layout.length);
    }
}

template <class T>
void ApplyNoDataMask(const RasterReader<T>& reader, std::uint32_t width, std::uint32_t height,
                     std::uint32_t bandCount, T* pixels, const unsigned char* mask) {
    if (!pixels || !mask || width == 0 || height == 0) return;
    const std::int32_t interleave = reader.GetRasterProps().interleave;
    if (!IsInterleave(interleave)) return;
    if (interleave == Interleave::BIP && bandCount > 1) {
        StampPixelInterleaved(reader, std::size_t{width} * height, bandCount, pixels, mask);
        return;
    }
    const BandRuns layout = RunsOf(interleave, width, height, bandCount);
    for (std::size_t band = 0; band < layout.bands; ++band) {
        const NoDataRule<T> rule = RuleOf(reader, band);
        if (!rule.hasValue) continue;
        std::size_t at = band * layout.bandStride;
        for (std::size_t run = 0; run < layout.runs; ++run, at += layout.runStride)
            StampRun(rule.value, pixels + at, mask + at, layout.length);
    }
}

#define ZMC_X(type, name, code)                                                                    \
    template void ComputeNoDataMask<type>(const RasterReader<type>&, std::uint32_t, std::uint32_t, \
                                          std::uint32_t, const type*, unsigned char*);             \
    template void ApplyNoDataMask<type>(const RasterReader<type>&, std::uint32_t, std::uint32_t,   \
                                        std::uint32_t, type*, const unsigned char*);
ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X

}  // namespace zelm
