#include "pyramid/TileGather.h"

#include <algorithm>
#include <bit>
#include <cstring>
#include <utility>

namespace zelm {
namespace {

using Source = SampleBlock<const unsigned char>;
using Target = SampleBlock<unsigned char>;

// memcpy of a fixed size is one move, and minds no alignment: a complex sample has the alignment
// of its parts.
template <std::size_t Size>
void CopyStrided(const unsigned char* from, std::size_t fromStep, unsigned char* to,
                 std::size_t toStep, std::uint32_t count) {
    for (std::uint32_t i = 0; i < count; ++i, from += fromStep, to += toStep)
        std::memcpy(to, from, Size);
}

// Without such registers, as on the oldest 32-bit processors, lanes would move byte by byte.
#if defined(__SSE2__) || defined(__ARM_NEON) || defined(__VEC__)
constexpr bool kHasLanes = true;
#else
constexpr bool kHasLanes = false;
#endif

// Sixteen bytes of samples that lie one behind the other. Operations of the compiler's own vectors
// number bytes as they lie in memory, on every processor.
using Lane = unsigned char __attribute__((vector_size(16)));

// Samples of Size bytes from the first or the second halves of two lanes, in turns.
template <std::size_t Size, std::size_t Half, std::size_t... At>
Lane InTurns(Lane even, Lane odd, std::index_sequence<At...>) {
    return __builtin_shufflevector(
        even, odd, (Half * 8 + At / (2 * Size) * Size + At % Size + At / Size % 2 * 16)...);
}

// A lane as words of so many bytes.
template <std::size_t Bytes>
struct WordsOf;
template <>
struct WordsOf<2> {
    using Each = std::uint16_t;
    using Type = Each __attribute__((vector_size(16)));
};
template <>
struct WordsOf<4> {
    using Each = std::uint32_t;
    using Type = Each __attribute__((vector_size(16)));
};
template <>
struct WordsOf<8> {
    using Each = std::uint64_t;
    using Type = Each __attribute__((vector_size(16)));
};

// Samples of 16 / Size pixels in a power of two of bands: one lane for each band, or pixel by
// pixel. Either way they are one sequence, whose places are numbers of a few bits; a perfect
// shuffle of all lanes rotates these bits by one. As many shuffles as the number of bands has bits
// lead from bands to pixels, and as many as that of pixels has from there to bands.
//
// Loops over lanes are written as packs: in registers they have no index.
template <std::size_t Size, std::size_t Bands>
struct SampleLanes {
    static constexpr std::size_t kPixels = 16 / Size;
    static constexpr std::size_t kPixelBytes = Bands * Size;
    static constexpr std::size_t kBandBits = std::bit_width(Bands) - 1;
    static constexpr std::size_t kPixelBits = std::bit_width(kPixels) - 1;
    static constexpr std::make_index_sequence<Bands> kEachBand{};
    static constexpr std::make_index_sequence<kPixels> kEachPixel{};

    Lane lanes[Bands];

    template <std::size_t... I>
    SampleLanes Shuffled(std::index_sequence<I...>) const {
        return {{InTurns<Size, I % 2>(lanes[I / 2], lanes[I / 2 + Bands / 2],
                                      std::make_index_sequence<16>())...}};
    }
    template <std::size_t Times>
    SampleLanes Shuffled() const {
        if constexpr (Times == 0)
            return *this;
        else
            return Shuffled(kEachBand).template Shuffled<Times - 1>();
    }

    template <std::size_t... I>
    static SampleLanes OfBands(const unsigned char* from, std::size_t bandStep,
                               std::index_sequence<I...>) {
        return {{At<Lane>(from + I * bandStep)...}};
    }
    template <std::size_t... I>
    void StoreBands(unsigned char* to, std::size_t bandStep, std::index_sequence<I...>) const {
        (std::memcpy(to + I * bandStep, &lanes[I], sizeof(Lane)), ...);
    }

    template <std::size_t... I>
    static SampleLanes OfPixels(const unsigned char* from, std::size_t pixelStep,
                                std::index_sequence<I...>) {
        return {{LaneOfPixels(from + I * kPixelsOfLane * pixelStep, pixelStep,
                              std::make_index_sequence<kPixelsOfLane>())...}};
    }
    template <std::size_t... I>
    void StorePixels(unsigned char* to, std::size_t pixelStep, std::index_sequence<I...>) const {
        unsigned char bytes[sizeof lanes];
        std::memcpy(bytes, lanes, sizeof bytes);
        (std::memcpy(to + I * pixelStep, bytes + I * kPixelBytes, kPixelBytes), ...);
    }

private:
    static constexpr std::size_t kPixelsOfLane = 16 / kPixelBytes;

    template <class Word>
    static Word At(const unsigned char* from) {
        Word word;
        std::memcpy(&word, from, sizeof word);
        return word;
    }
    // Put together of words, as a lane that is read back from single stores waits for them.
    template <std::size_t... I>
    static Lane LaneOfPixels(const unsigned char* from, std::size_t pixelStep,
                             std::index_sequence<I...>) {
        if constexpr (kPixelsOfLane == 1) {
            return At<Lane>(from);
        } else {
            using Words = WordsOf<kPixelBytes>;
            return reinterpret_cast<Lane>(
                typename Words::Type{At<typename Words::Each>(from + I * pixelStep)...});
        }
    }
};

// One row of neighbouring bands.
template <std::size_t Size, std::size_t Bands>
void MoveNeighbours(const Source& from, const unsigned char* source, const Target& to,
                    unsigned char* target, std::uint32_t columns) {
    using Lanes = SampleLanes<Size, Bands>;
    const bool interleaves = from.pixelStep == Size;
    std::uint32_t column = 0;
    for (; column + Lanes::kPixels <= columns; column += Lanes::kPixels) {
        const unsigned char* const at = source + column * from.pixelStep;
        unsigned char* const into = target + column * to.pixelStep;
        if (interleaves)
            Lanes::OfBands(at, from.bandStep, Lanes::kEachBand)
                .template Shuffled<Lanes::kBandBits>()
                .StorePixels(into, to.pixelStep, Lanes::kEachPixel);
        else
            Lanes::OfPixels(at, from.pixelStep, Lanes::kEachBand)
                .template Shuffled<Lanes::kPixelBits>()
                .StoreBands(into, to.bandStep, Lanes::kEachBand);
    }
    for (std::size_t band = 0; band < Bands; ++band)
        CopyStrided<Size>(source + column * from.pixelStep + band * from.bandStep, from.pixelStep,
                          target + column * to.pixelStep + band * to.bandStep, to.pixelStep,
                          columns - column);
}

// Between a plane for each band on one side and whole pixels on the other.
template <std::size_t Size>
bool MovesNeighbours(const Source& from, const Target& to) {
    const bool interleaves = from.pixelStep == Size && to.bandStep == Size;
    const bool separates = from.bandStep == Size && to.pixelStep == Size;
    return !from.bands && !to.bands && (interleaves || separates) &&
           !(from.pixelStep == Size && to.pixelStep == Size);
}

// All bands of a row: as many at a time as fill a lane with a pixel, or as many as there are, to
// the next smaller power of two. The last of them begin early enough to be as many.
template <std::size_t Size, std::size_t Bands>
void MoveRow(const Source& from, const unsigned char* source, const Target& to,
             unsigned char* target, std::uint32_t columns, std::uint32_t bands) {
    if constexpr (Bands > 2)
        if (bands < Bands)
            return MoveRow<Size, Bands / 2>(from, source, to, target, columns, bands);
    for (std::uint32_t first = 0; first < bands; first += Bands) {
        const std::size_t band = std::min<std::size_t>(first, bands - Bands);
        MoveNeighbours<Size, Bands>(from, source + band * from.bandStep, to,
                                    target + band * to.bandStep, columns);
    }
}

// Row by row, so that the target of a row stays in the nearest cache for all bands.
template <std::size_t Size>
void CopyBands(const Source& from, const Target& to, std::uint32_t rows, std::uint32_t columns,
               std::uint32_t bands) {
    [[maybe_unused]] const bool byNeighbours = bands > 1 && MovesNeighbours<Size>(from, to);
    for (std::uint32_t row = 0; row < rows; ++row) {
        const unsigned char* const source = from.data + row * from.rowStep;
        unsigned char* const target = to.data + row * to.rowStep;
        if constexpr (kHasLanes && Size < 8)
            if (byNeighbours) {
                MoveRow<Size, 16 / Size>(from, source, to, target, columns, bands);
                continue;
            }
        for (std::uint32_t i = 0; i < bands; ++i)
            CopyStrided<Size>(source + from.BandOffset(i), from.pixelStep,
                              target + to.BandOffset(i), to.pixelStep, columns);
    }
}

void CopyPackedRows(const Source& from, const Target& to, std::uint32_t rows,
                    std::size_t rowBytes) {
    for (std::uint32_t row = 0; row < rows; ++row)
        std::memcpy(to.data + row * to.rowStep, from.data + row * from.rowStep, rowBytes);
}

}  // namespace

void MoveSamples(const Source& from, const Target& to, std::uint32_t rows, std::uint32_t columns,
                 std::uint32_t bands, std::uint32_t sampleBytes) {
    if (from.IsPacked(bands, sampleBytes) && to.IsPacked(bands, sampleBytes))
        return CopyPackedRows(from, to, rows, columns * from.pixelStep);
    switch (sampleBytes) {
        case 1:
            return CopyBands<1>(from, to, rows, columns, bands);
        case 2:
            return CopyBands<2>(from, to, rows, columns, bands);
        case 4:
            return CopyBands<4>(from, to, rows, columns, bands);
        case 8:
            return CopyBands<8>(from, to, rows, columns, bands);
        case 16:
            return CopyBands<16>(from, to, rows, columns, bands);
    }
}

}  // namespace zelm
