#include "dispatch/NoDataMask.h"

#include <algorithm>
#include <bit>
#include <cstddef>
#include <cstring>
#include <tuple>
#include <type_traits>

#include "core/ElementTypes.h"
#include "core/PixelVocabulary.h"
#include "dispatch/NoDataRule.h"

namespace zelm {
namespace {

constexpr unsigned kMarkedBit = 1;
constexpr unsigned kOtherBits = 0xFE;

// What stamping takes a sample for: it moves bits, and knows no more of a sample than their count.
struct WideBits {
    std::uint64_t low;
    std::uint64_t high;
    bool operator==(const WideBits&) const = default;
};
template <class T>
using Bits = std::tuple_element_t<
    static_cast<std::size_t>(std::countr_zero(sizeof(T))),
    std::tuple<std::uint8_t, std::uint16_t, std::uint32_t, std::uint64_t, WideBits>>;

// What marking takes a sample for: integers are equal where their bits are.
template <class T>
using Sample = std::conditional_t<std::is_integral_v<T>, Bits<T>, T>;

// Loops of comparisons that decide on bytes become vector code up to 32 bits. Wider integers are
// compared by halves. Of wider reals the outcome is a number, which narrows: a finite sample times
// 0 adds nothing to it, and any other makes it a NaN.
template <class S>
bool IsMarked(const S& x, const S& value) {
    if constexpr (std::is_same_v<S, std::uint64_t>) {
        const std::uint64_t difference = x ^ value;
        return (static_cast<std::uint32_t>(difference) |
                static_cast<std::uint32_t>(difference >> 32)) == 0;
    } else if constexpr (std::is_same_v<S, double>) {
        return static_cast<float>((x == value ? 1.0 : 0.0) + x * 0) != 0;
    } else if constexpr (std::is_same_v<S, Complex<double>>) {
        const double matches = (x.re == value.re ? 1.0 : 0.0) * (x.im == value.im ? 1.0 : 0.0);
        return static_cast<float>(matches + x.re * 0 + x.im * 0) != 0;
    } else if constexpr (kIsComplex<S>) {
        return ((static_cast<unsigned>(x.re == value.re) &
                 static_cast<unsigned>(x.im == value.im)) |
                static_cast<unsigned>(NoDataRule<S>::NotFinite(x))) != 0;
    } else {
        return (static_cast<unsigned>(x == value) |
                static_cast<unsigned>(NoDataRule<S>::NotFinite(x))) != 0;
    }
}

// Puts the value in the sample's place where `bit` is 1. Vector code writes every sample, and takes
// those of 8 bytes by their bits; the widest have no vector code to gain, and are left alone.
template <class B>
void Stamp(unsigned bit, const B& value, unsigned char* sample) {
    if constexpr (std::is_same_v<B, WideBits>) {
        if (bit != 0) std::memcpy(sample, &value, sizeof(B));
    } else {
        B x;
        std::memcpy(&x, sample, sizeof(B));
        if constexpr (sizeof(B) == 8)
            x ^= (x ^ value) & (B{0} - bit);
        else
            x = bit != 0 ? value : x;
        std::memcpy(sample, &x, sizeof(B));
    }
}

// Asks a reader for the rule of the band in one place of a tile, told in what a loop takes samples
// for.
// A floating band without a value gets one that no sample equals.
template <class S>
class RuleSource {
public:
    template <class T>
    explicit RuleSource(const RasterReader<T>& source) : reader(&source), ask(&Ask<T>) {}

    NoDataRule<S> RuleOf(std::size_t band) const {
        return ask(reader, static_cast<std::uint32_t>(band));
    }

private:
    const BasicRasterReader* reader;
    NoDataRule<S> (*ask)(const BasicRasterReader*, std::uint32_t);

    template <class T>
    static NoDataRule<S> Ask(const BasicRasterReader* source, std::uint32_t band) {
        const auto& typed = static_cast<const RasterReader<T>&>(*source);
        if (typed.HasNoDataValue(band)) return {true, std::bit_cast<S>(typed.GetNoDataValue(band))};
        if constexpr (std::is_integral_v<T>)
            return {};
        else
            return {false, std::bit_cast<S>(NoDataRule<T>::Unmatched())};
    }
};

// The rules of a run of samples, by the sample's place in the run: those of a run of one band.
template <class S>
struct BandRules {
    static constexpr unsigned Has(std::size_t) { return kMarkedBit; }
    S Value(std::size_t) const { return rule.value; }
    bool HasAny() const { return rule.hasValue; }

    NoDataRule<S> rule;
};

// Those of a run of several bands.
template <class S>
struct ManyRules {
    unsigned Has(std::size_t at) const { return has[at]; }
    S Value(std::size_t at) const { return values[at]; }
    static constexpr bool HasAny() { return true; }

    const S* values;
    const unsigned char* has;
};

// The same for a short run whose length the compiler knows, so that its loops have no rest and keep
// the values of small samples in registers: as many as are whole vectors and, of the usual counts
// of bands, whole pixels.
template <class S>
struct BlockRules {
    static constexpr std::size_t kLength = sizeof(S) <= 8 ? 48 : 3;

    unsigned Has(std::size_t at) const { return has[at]; }
    S Value(std::size_t at) const { return values[at]; }
    static constexpr bool HasAny() { return true; }

    S values[kLength];
    unsigned char has[kLength];
};

// The rules of neighbouring bands of a pixel-interleaved tile, repeated over as many pixels as fit.
template <class S>
class PixelRules {
public:
    // Bands that do not fit together are taken in several goes, pixel by pixel.
    [[gnu::noinline]] PixelRules(const RuleSource<S>& source, std::size_t first,
                                 std::size_t bandCount, std::size_t pixelCount)
        : bands(std::min(bandCount - first, kMost)) {
        for (std::size_t band = 0; band < bands; ++band) {
            const NoDataRule<S> rule = source.RuleOf(first + band);
            values[band] = rule.value;
            has[band] = rule.hasValue ? kMarkedBit : 0;
            uniform =
                uniform && has[band] == has[0] && (!rule.hasValue || values[band] == values[0]);
        }
        if (bands == bandCount && !uniform) Repeat(pixelCount);
    }

    std::size_t Bands() const { return bands; }
    std::size_t Pixels() const { return pixels; }
    bool IsUniform() const { return uniform; }
    ManyRules<S> All() const { return {values, has}; }
    BandRules<S> First() const { return {{has[0] != 0, values[0]}}; }
    // A block is the first samples, if they are whole pixels: of all bands, and as many as it
    // takes.
    bool HasBlock() const {
        return pixels * bands >= BlockRules<S>::kLength && BlockRules<S>::kLength % bands == 0;
    }
    BlockRules<S> Block() const {
        BlockRules<S> block;
        std::copy_n(values, BlockRules<S>::kLength, block.values);
        std::copy_n(has, BlockRules<S>::kLength, block.has);
        return block;
    }

private:
    static constexpr std::size_t kMost = 4096 / sizeof(S);
    // A whole number of vectors of any sample size, so that no run but the last has a rest.
    static constexpr std::size_t kAligned = 16;

    S values[kMost];
    unsigned char has[kMost];
    std::size_t bands;
    std::size_t pixels = 1;
    bool uniform = true;  // all bands have the same, or none has one

    void Repeat(std::size_t pixelCount) {
        pixels = std::min(kMost / bands, pixelCount);
        if (pixels > kAligned) pixels -= pixels % kAligned;
        const std::size_t samples = pixels * bands;
        for (std::size_t done = bands; done < samples; done *= 2) {
            std::copy_n(values, std::min(done, samples - done), values + done);
            std::copy_n(has, std::min(done, samples - done), has + done);
        }
    }
};

// How the samples of a tile lie.
struct TileShape {
    std::int32_t interleave;
    std::size_t width;
    std::size_t height;
    std::size_t bands;
};

// Runs of samples under the same rules: samples in all of them, samples of a run, of which the last
// may have fewer, and from one run to the next.
struct Runs {
    std::size_t samples;
    std::size_t length;
    std::size_t step;
};

// Reals take longer to compare than to look up what with, and go without blocks.
template <class S>
constexpr bool kBlocks = std::is_integral_v<S> || std::is_same_v<S, WideBits>;

// Calls visit(rules, place of the first sample, runs) for all samples of a tile of several
// pixel-interleaved bands.
template <class S, class Visit>
void VisitPixels(const RuleSource<S>& source, const TileShape& tile, const Visit& visit) {
    const std::size_t pixels = tile.width * tile.height;
    for (std::size_t first = 0; first < tile.bands;) {
        const PixelRules<S> rules(source, first, tile.bands, pixels);
        const std::size_t samples = pixels * rules.Bands();
        const bool hasPixels = rules.Bands() == tile.bands;
        if (hasPixels && rules.IsUniform())
            return visit(rules.First(), 0, Runs{samples, samples, samples});
        std::size_t done = 0;
        if constexpr (kBlocks<S>) {
            if (hasPixels && rules.HasBlock()) {
                done = samples - samples % BlockRules<S>::kLength;
                visit(rules.Block(), 0, Runs{done, BlockRules<S>::kLength, BlockRules<S>::kLength});
            }
        }
        visit(rules.All(), first + done,
              Runs{samples - done, rules.Pixels() * rules.Bands(), rules.Pixels() * tile.bands});
        first += rules.Bands();
    }
}

// The same for any tile. In all other layouts the samples of a band lie in runs of their own: one
// for each line where lines hold the bands, else one. None has one band, whatever their count.
template <class S, class Visit>
void VisitRuns(const RuleSource<S>& source, const TileShape& tile, const Visit& visit) {
    if (!IsInterleave(tile.interleave) || tile.width == 0 || tile.height == 0) return;
    if (tile.interleave == Interleave::BIP && tile.bands > 1)
        return VisitPixels(source, tile, visit);
    const std::size_t bands = tile.interleave == Interleave::None ? 1 : tile.bands;
    const std::size_t plane = tile.width * tile.height;
    const std::size_t length = tile.interleave == Interleave::BIL ? tile.width : plane;
    for (std::size_t band = 0; band < bands; ++band)
        visit(BandRules<S>{source.RuleOf(band)}, band * length,
              Runs{plane, length, bands * length});
}

// The samples of the next run.
template <class Rules>
std::size_t LengthOf(const Rules&, const Runs& runs, std::size_t left) {
    return std::min(runs.length, left);
}
template <class S>
std::size_t LengthOf(const BlockRules<S>&, const Runs&, std::size_t) {
    return BlockRules<S>::kLength;
}

template <class S, class Rules>
[[gnu::noinline]] void MarkSamples(Rules rules, const S* __restrict samples,
                                   unsigned char* __restrict mask, const Runs& runs) {
    for (std::size_t left = runs.samples; left != 0;) {
        const std::size_t length = LengthOf(rules, runs, left);
        left -= length;
        for (std::size_t i = 0; i < length; ++i) {
            const unsigned mark = std::is_integral_v<S> ? rules.Has(i) : kMarkedBit;
            const unsigned marked = IsMarked(samples[i], rules.Value(i)) ? mark : 0;
            mask[i] = static_cast<unsigned char>((mask[i] & kOtherBits) | marked);
        }
        samples += runs.step;
        mask += runs.step;
    }
}

template <class B, class Rules>
[[gnu::noinline]] void StampSamples(Rules rules, unsigned char* __restrict samples,
                                    const unsigned char* __restrict mask, const Runs& runs) {
    for (std::size_t left = runs.samples; left != 0;) {
        const std::size_t length = LengthOf(rules, runs, left);
        left -= length;
        for (std::size_t i = 0; i < length; ++i)
            Stamp<B>(mask[i] & rules.Has(i), rules.Value(i), samples + i * sizeof(B));
        samples += runs.step * sizeof(B);
        mask += runs.step;
    }
}

void ClearMarks(unsigned char* mask, const Runs& runs) {
    for (std::size_t left = runs.samples, length = runs.length; left != 0; left -= length) {
        length = std::min(length, left);
        for (std::size_t i = 0; i < length; ++i)
            mask[i] = static_cast<unsigned char>(mask[i] & kOtherBits);
        mask += runs.step;
    }
}

template <class S>
[[gnu::noinline]] void MarkTile(const RuleSource<S>& source, const TileShape& tile,
                                const S* samples, unsigned char* mask) {
    VisitRuns(source, tile, [=](const auto& rules, std::size_t at, const Runs& runs) {
        // Integers without a value have no marked sample, so that they need no look.
        if (std::is_integral_v<S> && !rules.HasAny())
            ClearMarks(mask + at, runs);
        else
            MarkSamples(rules, samples + at, mask + at, runs);
    });
}

template <class B>
[[gnu::noinline]] void StampTile(const RuleSource<B>& source, const TileShape& tile,
                                 unsigned char* samples, const unsigned char* mask) {
    VisitRuns(source, tile, [=](const auto& rules, std::size_t at, const Runs& runs) {
        if (rules.HasAny()) StampSamples<B>(rules, samples + at * sizeof(B), mask + at, runs);
    });
}

std::int32_t InterleaveOf(const BasicRasterReader& reader) {
    return reader.GetRasterProps().interleave;
}

}  // namespace

template <class T>
void ComputeNoDataMask(const RasterReader<T>& reader, std::uint32_t width, std::uint32_t height,
                       std::uint32_t bandCount, const T* pixels, unsigned char* mask) {
    if (!pixels || !mask) return;
    MarkTile(RuleSource<Sample<T>>(reader), {InterleaveOf(reader), width, height, bandCount},
             reinterpret_cast<const Sample<T>*>(pixels), mask);
}

template <class T>
void ApplyNoDataMask(const RasterReader<T>& reader, std::uint32_t width, std::uint32_t height,
                     std::uint32_t bandCount, T* pixels, const unsigned char* mask) {
    if (!pixels || !mask) return;
    StampTile(RuleSource<Bits<T>>(reader), {InterleaveOf(reader), width, height, bandCount},
              reinterpret_cast<unsigned char*>(pixels), mask);
}

#define ZMC_X(type, name, code)                                                                    \
    template void ComputeNoDataMask<type>(const RasterReader<type>&, std::uint32_t, std::uint32_t, \
                                          std::uint32_t, const type*, unsigned char*);             \
    template void ApplyNoDataMask<type>(const RasterReader<type>&, std::uint32_t, std::uint32_t,   \
                                        std::uint32_t, type*, const unsigned char*);
ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X

}  // namespace zelm
