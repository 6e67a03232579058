// Weights of samples beside their no-data rules: an alpha band, masks, palettes; and the reduction
// that honours them.
//
// ReduceRow takes all valid samples alike. Where an alpha band, a mask or a palette says that they
// do not count alike, WeighRow makes its results anew. A sample v of band b at a tap of the method,
// whose kernel weighs it k, counts with the weight
//
//     w = k * h * a      h: 0 where a mask hides the sample, else 1
//                        a: the alpha of the same pixel, or 1 where the band has no alpha band
//
// and the result is sum(w v) / sum(w), the mean of premultiplied values. The scale of alpha cancels
// out, so that no type needs to know its greatest value: negative, infinite and undefined alphas,
// and those that are no data, weigh 0; of 64-bit integers no more than 2^32 - 1 counts. Complex
// types have no alpha. As ever, invalid samples take no part.
//
//   Nearest            takes its sample as it is, whatever it weighs
//   Average, Bilinear, Cubic, Lanczos, Gauss, CubicSpline
//                      the mean above, rounded as in ReduceRow. Where sum(w) is below a quarter of
//                      what the whole kernel would have with the largest a of the taps, taps of
//                      negative weight are left out
//   Rms                the root of sum(w v^2) / sum(w)
//   Mode               the value of the greatest sum of weights; of several, the first one
//   Minimum, Maximum, Median
//                      of the samples of the cell whose weight is not 0
//
// Where all taps weigh alike the result is that of ReduceRow, bit for bit. Where none of them
// weighs anything, the cell gets the no-data value of its band, or without one what ReduceRow makes
// of the samples as though nothing weighed: nothing undefined is written. A cell that has samples
// which are not hidden, none of them valid, is invalid.
//
// The weights of the next level: an alpha band is reduced like any other and weighs again. A cell
// is hidden where all of its own 2 x 2 samples are, so that a mask at any level shows a pixel where
// it shows any of those that the pixel stands for, and a mask that was reduced step by step is the
// one that is made of the finest level at once.
//
// A palette, under a method that computes (the means and Rms): the samples are indices. Their
// colours are reduced, with a * (alpha of the entry) as their a, the alpha of the entries as a
// fifth band that is weighed without itself; each component is rounded half away from zero and
// clamped to 0 to 255, and the result is the nearest entry (ColorIndex). Where all taps that weigh
// anything have one index, that is the result: a constant raster stays constant even where colours
// repeat. An index without a colour takes no part. Where no tap has a colour that is seen, the
// result is the first valid sample of the cell that is not hidden. Methods that pick (Nearest,
// Mode, Minimum, Maximum, Median) keep to indices.
#ifndef ZMC_HOST_REDUCE_WEIGHING_H
#define ZMC_HOST_REDUCE_WEIGHING_H

#include <cstdint>
#include <memory>
#include <vector>

#include "host/reduce/ColorIndex.h"
#include "host/reduce/Reduction.h"

namespace zmchost {

// Bits of mask bytes: the sample is not valid; a mask of the source hides it.
inline constexpr unsigned char kInvalidBit = 1;
inline constexpr unsigned char kHiddenBit = 2;

struct BandWeighing {
    static constexpr std::uint32_t kNoBand = ~std::uint32_t{0};
    std::uint32_t alpha = kNoBand;             // another band of the same rows
    std::shared_ptr<const ColorIndex> colors;  // null: samples are quantities
};

struct Weighing {
    std::vector<BandWeighing> bands;  // one per band
    bool hidden = false;              // masks may have kHiddenBit

    // Whether WeighRow has anything to do.
    bool Any() const;
};

// Whether the method computes a value that no sample need have.
constexpr bool Computes(Resampling method) {
    return method == Resampling::Average || method == Resampling::Rms ||
           method >= Resampling::Bilinear;
}

// Called behind ReduceRow with the same arguments. `weighing` has an entry per band.
// outMask: may be null only where no band has a no-data value and no row has a mask; kHiddenBit is
// set in it as well.
template <class T>
void WeighRow(Resampling method, std::uint32_t bands, std::uint32_t sourceWidth,
              const ReductionRows<T>& source, const zelm::NoDataRule<T>* noData,
              const Weighing& weighing, T* out, unsigned char* outMask);

}  // namespace zmchost

#endif
