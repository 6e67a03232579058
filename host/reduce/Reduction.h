// Reduction of raster rows to the next coarser level: two rows and two columns become one.
//
// A level has half the columns and rows of the one before, rounded down: the pixel (x, y) stands
// for just the cell of (2x, 2y) to (2x + 1, 2y + 1), so that pixels are twice as large from level
// to level and never move. The last column or row of an odd size belongs to no cell; methods on a
// window tap it like any other sample inside the level. What counts beside validity tells
// Weighing.h.
//
// Pure functions on rows of one level, pixel-interleaved; no files, no threads, no state. Every
// method works in the raster's own type, takes valid samples only, and gives a cell without any
// the band's no-data value. Any number of threads may reduce different rows at the same time.
#ifndef ZMC_HOST_REDUCE_REDUCTION_H
#define ZMC_HOST_REDUCE_REDUCTION_H

#include <cstdint>
#include <optional>
#include <string_view>

#include "dispatch/NoDataRule.h"

namespace zmchost {

// Methods on the cell of 2 x 2 samples, in reading order; n of them are valid, 1 <= n <= 4:
//   Nearest   the first valid one, which is the upper left one where all are valid
//   Average   the mean; integers rounded half away from zero. Single is summed in double, Double in
//             long double, and rounded once, so no sum overflows
//   Rms       the root of the mean square, rounded to nearest (integers half away from zero), and
//             clamped where the type holds no such value, as for four times -128 in Char
//   Mode      the value that occurs most often; of several, the first one
//   Minimum, Maximum
//   Median    the value at (n - 1) / 2 of the sorted ones: of an even count the lower middle, so
//             that the result is always a value that occurs
// Methods on a window around the cell, kernels widened by 2, taps at distances 1/4, 3/4, 5/4 ...:
//   Bilinear  4 x 4 samples, weights 1 3 3 1
//   Cubic     8 x 8 samples, convolution with a = -1/2
//   Lanczos   12 x 12 samples, three lobes
//   CubicSpline  8 x 8 samples, the cubic B-spline of radius 2: B(d) = 2/3 - d^2 + d^3 / 2 for d <
//   1
//             and (2 - d)^3 / 6 for d < 2, which is 235 121 27 1 of 384 at the taps. It smooths,
//             and gives back no sample as it was
//   Gauss     3 x 3 samples, weights 1 2 1 in both directions, as GDAL documents its overviews of
//             factor 2 and computes them: around the second sample of the cell, so the taps of cell
//             x are the columns 2x, 2x + 1 and 2x + 2, and pictures move by half a finer pixel
// Their weights are normalised over the valid taps inside the level. Where so few remain that their
// sum is below a quarter of the whole, taps of negative weight are left out as well. A cell whose
// own 2 x 2 samples are all invalid is invalid, whatever lies around it, so that valid areas do not
// grow from level to level. Integers are computed exactly, Single in double and Double in
// long double; a constant raster stays constant. What the type cannot hold is clamped to it.
enum class Resampling {
    Nearest,
    Average,
    Rms,
    Mode,
    Minimum,
    Maximum,
    Median,
    Bilinear,
    Cubic,
    Lanczos,
    Gauss,
    CubicSpline
};

inline constexpr std::uint32_t kResamplings =
    static_cast<std::uint32_t>(Resampling::CubicSpline) + 1;

// "nearest", "average", "rms", "mode", "minimum", "maximum", "median", "bilinear", "cubic",
// "lanczos", "gauss", "cubicspline", in this spelling only.
std::optional<Resampling> ParseResampling(std::string_view word);
const char* ResamplingName(Resampling method);

// Whether the method is defined for a pixel type: complex types, which have no order, know nearest,
// average and the methods on a window. False for a code that is no pixel type.
bool SupportsElementType(Resampling method, std::uint32_t pixelType);

// Rows of the finer level needed above and below the pair (2y, 2y + 1) for coarse row y: 0 for the
// methods on 2 x 2 samples, 1 (bilinear, gauss), 3 (both cubics) and 5 for the others.
std::uint32_t ReductionHalo(Resampling method);
// The largest of them.
inline constexpr std::uint32_t kMaxReductionHalo = 5;

// The rows that one coarse row is made of, top to bottom: 2 + 2 * halo pointers each.
template <class T>
struct ReductionRows {
    const T* const* rows;               // a row outside the level is null and takes no part
    const unsigned char* const* masks;  // bit 0 set = not valid; null when every sample is valid,
                                        // and so may be the mask of a single row
};

// Reduces to one row of the coarser level, of sourceWidth / 2 pixels; the last column of an odd
// width belongs to no cell, but wide kernels tap it.
//
// rows: of sourceWidth pixels with `bands` samples each; masks: of the same shape.
// noData: per band, the rule that the masks were made by. A cell without a valid sample gets
// its value, or, where the band has none, a quiet NaN (0 in integers). A valid result that the rule
// would mark moves to a neighbour that it does not: the next value of the type, on the side of the
// unrounded result, upwards if there is none. Null when no band has a no-data value.
// out: (sourceWidth / 2) * bands samples. outMask: the same shape, or null; a byte becomes 1 where
// the cell held no valid sample and 0 elsewhere.
// The method must support the type; otherwise nothing is written.
template <class T>
void ReduceRow(Resampling method, std::uint32_t bands, std::uint32_t sourceWidth,
               const ReductionRows<T>& source, const zelm::NoDataRule<T>* noData, T* out,
               unsigned char* outMask);

}  // namespace zmchost

#endif
