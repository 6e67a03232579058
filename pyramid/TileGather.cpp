#include "pyramid/TileGather.h"

#include <cstring>
#include <type_traits>

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

// Row by row, so that the target of a row stays in the nearest cache for all bands.
template <std::size_t Size>
void CopyBands(const Source& from, const Target& to, std::uint32_t rows, std::uint32_t columns,
               std::uint32_t bands) {
    for (std::uint32_t row = 0; row < rows; ++row)
        for (std::uint32_t i = 0; i < bands; ++i)
            CopyStrided<Size>(from.data + row * from.rowStep + from.BandOffset(i), from.pixelStep,
                              to.data + row * to.rowStep + to.BandOffset(i), to.pixelStep, columns);
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
