// LevelReduction: makes windows of a level anew from the level below it, as the builder makes them.
//
// It holds the part of the finer level that the window's kernels reach, so its memory goes with the
// window and not with the raster, but for masks: those of level 0 are looked at for every level.
// One thread; the raster has to outlive it. Failures to read are thrown as by Raster::Read.
#ifndef ZMC_HOST_BUILD_LEVELREDUCTION_H
#define ZMC_HOST_BUILD_LEVELREDUCTION_H

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <utility>
#include <vector>

#include "host/build/BandWeights.h"
#include "host/build/HiddenSamples.h"
#include "host/raster/NoData.h"
#include "host/raster/Raster.h"
#include "host/reduce/Reduction.h"

namespace zmchost {

// T is the pixel type of the raster, and `method` is defined for it.
template <class T>
class LevelReduction {
public:
    // `weights` tell of the raster's bands what a source tells of its own, and have to outlive this
    // object; null where all samples count alike. Palettes are those of the raster.
    LevelReduction(Raster& finer, Resampling resampling, SampleWeights* sampleWeights = nullptr)
        : raster(finer),
          method(resampling),
          halo(ReductionHalo(resampling)),
          margin((halo + 1) / 2),
          bands(finer.Bands()),
          allBands(finer.AllBands()) {
        if (finer.PixelType() != zelm::ElementTraits<T>::code)
            throw Error(finer.Name(), "reduce it", "it is of another pixel type");
        for (std::uint32_t band = 0; band < bands; ++band)
            rules.push_back(RuleOfBand<T>(finer.Props(), band));
        std::vector<zelm::PalettePtr> palettes;
        for (const std::uint32_t band : allBands)
            palettes.push_back(Computes(method) ? finer.BandPalette(band) : zelm::PalettePtr());
        const BandWeights weights = BandWeights::Of(sampleWeights, finer.Name(), bands, allBands,
                                                    method, std::move(palettes));
        weighing = WeighingOf<T>(weights, method, rules);
        if (sampleWeights != nullptr && weights.IsMasked())
            hidden.emplace(*sampleWeights, allBands, weights.masked);
    }
    LevelReduction(const LevelReduction&) = delete;
    LevelReduction& operator=(const LevelReduction&) = delete;

    // Whether Load asks the weights for masks, which tell one thread at a time.
    bool ReadsMasks() const { return hidden.has_value(); }

    // Reads what `wanted`, a window inside `level`, is made of; `level` is not the finest.
    void Load(std::uint32_t level, const Window& wanted) {
        const auto [x, width] = Reach(wanted.x, wanted.width, raster.Width(level - 1));
        const auto [y, height] = Reach(wanted.y, wanted.height, raster.Height(level - 1));
        window = wanted;
        source = {x, y, width, height};
        fine.resize(std::size_t{width} * height * bands);
        mask.assign(fine.size(), 0);
        raster.Read(level - 1, source, raster.AllBands(), fine.data(), mask.data());
        if (hidden) {
            for (unsigned char& byte : mask) byte &= kInvalidBit;
            hidden->Mark(level - 1, source, mask.data());
        }
        line.resize(std::size_t{width} / 2 * bands);
        lineMask.resize(line.size());
    }

    // Row `row` of the window, counted from its first: its width times the bands, all samples of a
    // pixel together; good until the next call.
    const T* Row(std::uint32_t row) {
        rows.clear();
        masks.clear();
        const std::size_t stride = std::size_t{source.width} * bands;
        const std::int64_t first = (std::int64_t{window.y} + row) * 2 - halo - source.y;
        const std::int64_t end = first + 2 + 2 * std::int64_t{halo};
        for (std::int64_t y = first; y < end; ++y) {
            const bool inside = y >= 0 && y < source.height;
            const std::size_t at = inside ? static_cast<std::size_t>(y) * stride : 0;
            rows.push_back(inside ? fine.data() + at : nullptr);
            masks.push_back(inside ? mask.data() + at : nullptr);
        }
        const ReductionRows<T> reach{rows.data(), masks.data()};
        ReduceRow<T>(method, bands, source.width, reach, rules.data(), line.data(),
                     lineMask.data());
        if (weighing.Any())
            WeighRow<T>(method, bands, source.width, reach, rules.data(), weighing, line.data(),
                        lineMask.data());
        const std::size_t skipped = window.x - source.x / 2;
        return line.data() + skipped * bands;
    }

private:
    Raster& raster;
    Resampling method;
    std::uint32_t halo;
    // Columns and rows of the coarser level that are made beyond the window and dropped: the cells
    // that the halo touches. None of a method that goes by a cell's own samples.
    std::uint32_t margin;
    std::uint32_t bands;
    std::vector<std::uint32_t> allBands;
    std::vector<zelm::NoDataRule<T>> rules;
    Weighing weighing;
    std::optional<HiddenSamples> hidden;
    Window window{}, source{};
    std::vector<T> fine, line;
    std::vector<unsigned char> mask, lineMask;
    std::vector<const T*> rows;
    std::vector<const unsigned char*> masks;

    // First and extent of the finer pixels that [start, start + extent) depends on. They begin at
    // an even coordinate, so that cells are those of the whole level; an odd last line belongs to
    // no cell, but wide kernels tap it.
    std::pair<std::uint32_t, std::uint32_t> Reach(std::uint32_t start, std::uint32_t extent,
                                                  std::uint32_t limit) const {
        const std::uint32_t first = start > margin ? start - margin : 0;
        const std::uint64_t end =
            std::min<std::uint64_t>((std::uint64_t{start} + extent + margin) * 2, limit);
        return {first * 2, static_cast<std::uint32_t>(end - std::uint64_t{first} * 2)};
    }
};

}  // namespace zmchost

#endif
