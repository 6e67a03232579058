#include <algorithm>
#include <cstddef>
#include <cstring>

#include "core/ElementTypes.h"
#include "host/reduce/AverageRow.h"
#include "host/reduce/Reduction.h"
#include "host/reduce/ReductionCells.h"
#include "host/reduce/ReductionWindow.h"

namespace zmchost {
namespace {

// Whether the masks of some rows mark none, or all, of the bytes [first, first + count). A null
// mask marks nothing.
bool NoneMarked(const unsigned char* const* masks, std::size_t rows, std::size_t first,
                std::size_t count) {
    unsigned char any = 0;
    for (std::size_t r = 0; r < rows; ++r) {
        if (!masks[r]) continue;
        for (std::size_t i = first; i < first + count; ++i) any |= masks[r][i];
    }
    return (any & 1) == 0;
}

bool AllMarked(const unsigned char* const* masks, std::size_t rows, std::size_t first,
               std::size_t count) {
    unsigned char all = 1;
    for (std::size_t r = 0; r < rows; ++r) {
        if (!masks[r]) return false;
        for (std::size_t i = first; i < first + count; ++i) all &= masks[r][i];
    }
    return all != 0;
}

template <class T>
struct PartOf {
    using Type = T;
    static constexpr std::size_t kCount = 1;
};
template <class P>
struct PartOf<zelm::Complex<P>> {
    using Type = P;
    static constexpr std::size_t kCount = 2;
};

// One call of ReduceRow. Runs of cells without a marked sample take loops over whole rows, runs
// without a valid one are filled, and only what lies between is done cell by cell.
template <class T>
class RowReducer {
    using Part = typename PartOf<T>::Type;
    static constexpr std::size_t kParts = PartOf<T>::kCount;
    static constexpr std::size_t kBlock = 512;      // cells that are judged together,
    static constexpr std::size_t kShortBlock = 32;  // and if they differ, these

public:
    RowReducer(std::uint32_t bandCount, std::uint32_t pixels, const ReductionRows<T>& rows,
               const zelm::NoDataRule<T>* rules, T* row, unsigned char* rowMask)
        : bands(bandCount),
          width(pixels),
          cells(pixels / 2),
          source(rows),
          noData(rules),
          out(row),
          outMask(rowMask) {}

    template <Resampling method>
    void Cells() {
        run = &RowReducer::template CellRun<method>;
        each = &RowReducer::template EachCell<method>;
        one = &RowReducer::template OneCell<method>;
        Reduce(0, cells, 2, 0, source.rows[0] && source.rows[1]);
    }

    template <class Kernel>
    void Window() {
        constexpr std::size_t rows = 2 * Kernel::kReach;
        run = &RowReducer::template WindowRunOf<Kernel>;
        each = &RowReducer::template EachWindow<Kernel>;
        one = &RowReducer::template OneWindow<Kernel>;
        center = Kernel::kReach - 1;
        for (std::size_t r = 0; r < rows; ++r)
            parts[r] = reinterpret_cast<const Part*>(source.rows[r]);
        // Cells whose taps all lie inside the level.
        const std::size_t from = std::min<std::size_t>(cells, Kernel::kReach / 2);
        const std::size_t beyond = width > Kernel::kReach ? (width - Kernel::kReach + 1) / 2 : 0;
        const std::size_t to = std::clamp<std::size_t>(beyond, from, cells);
        const bool allRows = std::all_of(parts, parts + rows, [](const Part* r) { return r; });
        Reduce(0, from, rows, 0, false);
        Reduce(from, to, rows, Kernel::kReach - 1, allRows);
        Reduce(to, cells, rows, 0, false);
    }

private:
    // Cells [from, to), of which runs may be taken if `runs`.
    void Reduce(std::size_t from, std::size_t to, std::size_t rows, std::size_t halo, bool runs) {
        if (!source.masks && runs) return ReduceRun(from, to - from);
        for (std::size_t x = from; x < to; x += kBlock) {
            const std::size_t n = std::min(kBlock, to - x);
            if (runs && Full(x, n, rows, halo))
                ReduceRun(x, n);
            else
                ReduceMixed(x, n, rows, halo, runs);
        }
    }

    // A long run that is not wholly valid, in short ones.
    void ReduceMixed(std::size_t from, std::size_t count, std::size_t rows, std::size_t halo,
                     bool runs) {
        for (std::size_t x = from; x < from + count; x += kShortBlock) {
            const std::size_t n = std::min(kShortBlock, from + count - x);
            if (Empty(x, n))
                FillInvalid(x, n);
            else if (runs && Full(x, n, rows, halo))
                ReduceRun(x, n);
            else
                (this->*each)(x, n);
        }
    }

    bool Empty(std::size_t x, std::size_t n) const {
        return source.masks && AllMarked(source.masks + center, 2, 2 * x * bands, 2 * n * bands);
    }

    bool Full(std::size_t x, std::size_t n, std::size_t rows, std::size_t halo) const {
        return !source.masks ||
               NoneMarked(source.masks, rows, (2 * x - halo) * bands, 2 * (n + halo) * bands);
    }

    void ReduceRun(std::size_t x, std::size_t n) {
        if (n == 0) return;
        (this->*run)(x, n);
        if (outMask) std::memset(outMask + x * bands, 0, n * bands);
        for (std::uint32_t band = 0; noData && band < bands; ++band) {
            if (noData[band].hasValue) MoveOffNoData(x, n, band);
        }
    }

    // Results that read as no data are rare: they are looked for in a loop of its own, and computed
    // again for the side on which the exact result lies.
    void MoveOffNoData(std::size_t x, std::size_t n, std::uint32_t band) {
        const zelm::NoDataRule<T>& rule = noData[band];
        const T* const results = out + x * bands + band;
        bool found = false;
        for (std::size_t i = 0; i < n; ++i) found |= results[i * bands] == rule.value;
        if (!found) return;
        for (std::size_t i = x; i < x + n; ++i) {
            T& result = out[i * bands + band];
            if (result == rule.value)
                result = KeptValid((this->*one)(ValidSamples(i, band), i, band), rule);
        }
    }

    template <class Compute>
    void ReduceEach(std::size_t x, std::size_t n, Compute compute) {
        for (std::size_t i = x; i < x + n; ++i) {
            for (std::uint32_t band = 0; band < bands; ++band) {
                const Cell<T> cell = ValidSamples(i, band);
                const std::size_t at = i * bands + band;
                out[at] = cell.count == 0 ? InvalidValue(Rule(band))
                                          : KeptValid(compute(cell, i, band), Rule(band));
                if (outMask) outMask[at] = cell.count == 0 ? 1 : 0;
            }
        }
    }

    void FillInvalid(std::size_t x, std::size_t n) {
        for (std::size_t i = x; i < x + n; ++i) {
            for (std::uint32_t band = 0; band < bands; ++band)
                out[i * bands + band] = InvalidValue(Rule(band));
        }
        if (outMask) std::memset(outMask + x * bands, 1, n * bands);
    }

    // The cell's valid samples in reading order, without a branch per sample.
    Cell<T> ValidSamples(std::size_t x, std::uint32_t band) const {
        Cell<T> cell;
        const std::size_t left = 2 * x * bands + band;
        for (std::size_t r = center; r < center + 2; ++r) {
            const T* const row = source.rows[r];
            if (!row) continue;
            const unsigned char* const mask = source.masks ? source.masks[r] : nullptr;
            cell.values[cell.count] = row[left];
            cell.count += mask ? 1 - (mask[left] & 1) : 1;
            cell.values[cell.count] = row[left + bands];
            cell.count += mask ? 1 - (mask[left + bands] & 1) : 1;
        }
        return cell;
    }

    template <Resampling method>
    void CellRun(std::size_t x, std::size_t n) {
        const std::size_t first = 2 * x * bands;
        const T* const upper = source.rows[0] + first;
        const T* const lower = source.rows[1] + first;
        T* const results = out + x * bands;
        if constexpr (method == Resampling::Average) {
            AverageRow(reinterpret_cast<const Part*>(upper), reinterpret_cast<const Part*>(lower),
                       kParts * bands, n, reinterpret_cast<Part*>(results));
        } else {
            for (std::size_t i = 0; i < n; ++i) {
                for (std::size_t band = 0; band < bands; ++band) {
                    const std::size_t a = 2 * i * bands + band;
                    const std::size_t b = a + bands;
                    const Cell<T> cell{{upper[a], upper[b], lower[a], lower[b]}, 4};
                    results[i * bands + band] = ReduceCell<method>(cell).value;
                }
            }
        }
    }

    template <Resampling method>
    Rounded<T> OneCell(const Cell<T>& cell, std::size_t, std::uint32_t) const {
        return ReduceCell<method>(cell);
    }

    template <Resampling method>
    void EachCell(std::size_t x, std::size_t n) {
        ReduceEach(x, n, [](const Cell<T>& cell, std::size_t, std::uint32_t) {
            return ReduceCell<method>(cell);
        });
    }

    PartRows<Part> TapRows() const { return {parts, source.masks, kParts * bands, bands, width}; }

    template <class Kernel>
    void WindowRunOf(std::size_t x, std::size_t n) {
        const PartRows<Part> rows = TapRows();
        for (std::size_t p = 0; p < rows.stride; ++p)
            WindowRun<Kernel>(rows, p, static_cast<std::uint32_t>(x), n,
                              reinterpret_cast<Part*>(out + x * bands));
    }

    template <class Kernel>
    static Rounded<T> WindowCell(const PartRows<Part>& rows, const Cell<T>& cell, std::size_t x,
                                 std::uint32_t band) {
        const auto at = static_cast<std::uint32_t>(x);
        if constexpr (zelm::kIsComplex<T>)
            return Joined(
                WindowPart<Kernel>(rows, 2 * std::size_t{band}, band, at, cell.values[0].re),
                WindowPart<Kernel>(rows, 2 * std::size_t{band} + 1, band, at, cell.values[0].im));
        else
            return WindowPart<Kernel>(rows, band, band, at, cell.values[0]);
    }

    template <class Kernel>
    Rounded<T> OneWindow(const Cell<T>& cell, std::size_t x, std::uint32_t band) const {
        return WindowCell<Kernel>(TapRows(), cell, x, band);
    }

    template <class Kernel>
    void EachWindow(std::size_t x, std::size_t n) {
        const PartRows<Part> rows = TapRows();
        ReduceEach(x, n, [&rows](const Cell<T>& cell, std::size_t i, std::uint32_t band) {
            return WindowCell<Kernel>(rows, cell, i, band);
        });
    }

    zelm::NoDataRule<T> Rule(std::uint32_t band) const {
        return noData ? noData[band] : zelm::NoDataRule<T>{};
    }

    const std::size_t bands;
    const std::uint32_t width;
    const std::size_t cells;
    const ReductionRows<T>& source;
    const zelm::NoDataRule<T>* const noData;
    T* const out;
    unsigned char* const outMask;
    std::size_t center = 0;                             // the first row of the pair
    const Part* parts[2 * LanczosKernel::kReach] = {};  // the rows of a window

    // The method, as what is called for many cells, so that all around it is compiled once.
    // Fills cells that are valid with all samples that their windows tap:
    void (RowReducer::*run)(std::size_t x, std::size_t n) = nullptr;
    // fills any cells one by one:
    void (RowReducer::*each)(std::size_t x, std::size_t n) = nullptr;
    // computes any one:
    Rounded<T> (RowReducer::*one)(const Cell<T>& cell, std::size_t x,
                                  std::uint32_t band) const = nullptr;
};

// The methods that need an order, or a root of squares.
template <class T>
void ReduceOrdered(Resampling method, RowReducer<T>& reducer) {
    switch (method) {
        case Resampling::Rms:
            return reducer.template Cells<Resampling::Rms>();
        case Resampling::Mode:
            return reducer.template Cells<Resampling::Mode>();
        case Resampling::Minimum:
            return reducer.template Cells<Resampling::Minimum>();
        case Resampling::Maximum:
            return reducer.template Cells<Resampling::Maximum>();
        case Resampling::Median:
            return reducer.template Cells<Resampling::Median>();
        default:
            return;
    }
}

}  // namespace

template <class T>
void ReduceRow(Resampling method, std::uint32_t bands, std::uint32_t sourceWidth,
               const ReductionRows<T>& source, const zelm::NoDataRule<T>* noData, T* out,
               unsigned char* outMask) {
    RowReducer<T> reducer(bands, sourceWidth, source, noData, out, outMask);
    switch (method) {
        case Resampling::Nearest:
            return reducer.template Cells<Resampling::Nearest>();
        case Resampling::Average:
            return reducer.template Cells<Resampling::Average>();
        case Resampling::Bilinear:
            return reducer.template Window<BilinearKernel>();
        case Resampling::Cubic:
            return reducer.template Window<CubicKernel>();
        case Resampling::Lanczos:
            return reducer.template Window<LanczosKernel>();
        case Resampling::Gauss:
            return reducer.template Window<GaussKernel>();
        case Resampling::CubicSpline:
            return reducer.template Window<CubicSplineKernel>();
        default:
            if constexpr (!zelm::kIsComplex<T>) ReduceOrdered(method, reducer);
    }
}

#define ZMC_X(type, name, code)                                                                   \
    template void ReduceRow(Resampling, std::uint32_t, std::uint32_t, const ReductionRows<type>&, \
                            const zelm::NoDataRule<type>*, type*, unsigned char*);
ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X

}  // namespace zmchost
