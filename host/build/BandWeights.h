// BandWeights: what weighs the bands that a build or a level is made of, settled once.
#ifndef ZMC_HOST_BUILD_BANDWEIGHTS_H
#define ZMC_HOST_BUILD_BANDWEIGHTS_H

#include <cstdint>
#include <functional>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "core/ElementTypes.h"
#include "dispatch/NoDataRule.h"
#include "host/raster/RasterSource.h"
#include "host/reduce/Weighing.h"

namespace zmchost {

// By place: the bands of a target, in its own order.
struct BandWeights {
    std::vector<std::uint32_t> alpha;        // place of the band's alpha band, or kNoBand
    std::vector<std::uint32_t> masked;       // places of the bands that masks hide
    std::vector<zelm::PalettePtr> palettes;  // null, or empty, for quantities

    // Of `bands` of the source. An alpha band that is not among them hides where it is 0. Without
    // `weights`, and for Nearest, palettes alone are left. Throws Error for an alpha band that the
    // source of `sourceBands` bands does not have.
    static BandWeights Of(const SampleWeights* weights, const std::string& name,
                          std::uint32_t sourceBands, std::span<const std::uint32_t> bands,
                          Resampling method, std::vector<zelm::PalettePtr> bandPalettes);

    bool IsMasked() const { return !masked.empty(); }
};

// Whether a sample of type T can be this index.
template <class T>
bool HoldsIndex(std::uint32_t index) {
    if constexpr (zelm::kIsComplex<T>)
        return false;
    else if constexpr (std::is_floating_point_v<T>)
        return index < std::uint64_t{1} << std::numeric_limits<T>::digits;
    else
        return index <= static_cast<std::uint64_t>(std::numeric_limits<T>::max());
}

// The weights as rows of type T are reduced by, with palettes made ready for a method that
// computes.
template <class T>
Weighing WeighingOf(const BandWeights& weights, Resampling method,
                    std::span<const zelm::NoDataRule<T>> rules) {
    Weighing weighing;
    weighing.bands.resize(rules.size());
    weighing.hidden = weights.IsMasked();
    for (std::size_t band = 0; band < rules.size(); ++band) {
        BandWeighing& one = weighing.bands[band];
        if (!zelm::kIsComplex<T> && band < weights.alpha.size()) one.alpha = weights.alpha[band];
        if (zelm::kIsComplex<T> || !Computes(method) || band >= weights.palettes.size()) continue;
        const zelm::PalettePtr& palette = weights.palettes[band];
        if (!palette || palette->nextIndex == 0) continue;
        [[maybe_unused]] const zelm::NoDataRule<T>& rule = rules[band];
        if constexpr (!zelm::kIsComplex<T>)
            one.colors = std::make_shared<ColorIndex>(*palette, [&rule](std::uint32_t index) {
                return HoldsIndex<T>(index) && !rule.Marks(static_cast<T>(index));
            });
    }
    return weighing;
}

}  // namespace zmchost

#endif
