#include "pyramid/TileGather.h"

#include <bit>
#include <cstring>

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

// Transposes the square of samples that K words of K samples make, by swapping ever smaller parts
// of pairs of words. Samples of one word are numbered from its low end, as they lie in memory on
// little-endian machines.
template <class Word, std::size_t Size>
void TransposeSquare(Word (&words)[sizeof(Word) / Size]) {
    constexpr std::size_t kSide = sizeof(Word) / Size;
    for (std::size_t half = kSide / 2; half != 0; half /= 2) {
        const std::size_t shift = half * Size * 8;
        const Word low = static_cast<Word>(~Word{0}) / static_cast<Word>((Word{1} << shift) + 1u);
        for (std::size_t i = 0; i < kSide; ++i) {
            if (i & half) continue;
            const Word swapped = static_cast<Word>((words[i] >> shift) ^ words[i + half]) & low;
            words[i + half] ^= swapped;
            words[i] ^= static_cast<Word>(swapped << shift);
        }
    }
}

// One row of K bands, a square of K x K samples at a time: in one of the layouts the samples of a
// band are neighbours, in the other those of a pixel, and either way the square is K whole words.
template <class Word, std::size_t Size>
void CopySquares(const unsigned char* from, std::size_t fromColumn, std::size_t fromBand,
                 unsigned char* to, std::size_t toColumn, std::size_t toBand,
                 std::uint32_t columns) {
    constexpr std::uint32_t kSide = sizeof(Word) / Size;
    const std::size_t fromWord = fromColumn == Size ? fromBand : fromColumn;
    const std::size_t toWord = toColumn == Size ? toBand : toColumn;
    std::uint32_t column = 0;
    for (; column + kSide <= columns; column += kSide) {
        Word words[kSide];
        for (std::uint32_t i = 0; i < kSide; ++i)
            std::memcpy(&words[i], from + column * fromColumn + i * fromWord, sizeof(Word));
        TransposeSquare<Word, Size>(words);
        for (std::uint32_t i = 0; i < kSide; ++i)
            std::memcpy(to + column * toColumn + i * toWord, &words[i], sizeof(Word));
    }
    for (std::uint32_t band = 0; band < kSide; ++band)
        CopyStrided<Size>(from + column * fromColumn + band * fromBand, fromColumn,
                          to + column * toColumn + band * toBand, toColumn, columns - column);
}

// Between a plane for each band on one side and whole pixels on the other.
template <std::size_t Size>
bool CanTranspose(const Source& from, const Target& to) {
    const bool interleaves = from.pixelStep == Size && to.bandStep == Size;
    const bool separates = from.bandStep == Size && to.pixelStep == Size;
    return std::endian::native == std::endian::little && Size < 8 && !from.bands && !to.bands &&
           (interleaves || separates) && !(from.pixelStep == Size && to.pixelStep == Size);
}

// Copies as many bands of a row as fill whole squares, and answers how many.
template <class Word, std::size_t Size>
std::uint32_t TransposeBands(const Source& from, const Target& to, std::uint32_t row,
                             std::uint32_t columns, std::uint32_t first, std::uint32_t bands) {
    constexpr std::uint32_t kSide = sizeof(Word) / Size;
    for (; first + kSide <= bands; first += kSide)
        CopySquares<Word, Size>(
            from.data + row * from.rowStep + from.BandOffset(first), from.pixelStep, from.bandStep,
            to.data + row * to.rowStep + to.BandOffset(first), to.pixelStep, to.bandStep, columns);
    return first;
}

// Row by row, so that the target of a row stays in the nearest cache for all bands.
template <std::size_t Size>
void CopyBands(const Source& from, const Target& to, std::uint32_t rows, std::uint32_t columns,
               std::uint32_t bands) {
    const bool transposes = CanTranspose<Size>(from, to);
    for (std::uint32_t row = 0; row < rows; ++row) {
        std::uint32_t i = 0;
        if constexpr (Size < 8) {
            if (transposes) {
                i = TransposeBands<std::uint64_t, Size>(from, to, row, columns, i, bands);
                if constexpr (Size < 4)
                    i = TransposeBands<std::uint32_t, Size>(from, to, row, columns, i, bands);
            }
        }
        for (; i < bands; ++i)
            CopyStrided<Size>(from.data + row * from.rowStep + from.BandOffset(i), from.pixelStep,
                              to.data + row * to.rowStep + to.BandOffset(i), to.pixelStep, columns);
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
