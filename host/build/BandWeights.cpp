#include "host/build/BandWeights.h"

#include <algorithm>

#include "host/base/Error.h"

namespace zmchost {

BandWeights BandWeights::Of(const SampleWeights* weights, const std::string& name,
                            std::uint32_t sourceBands, std::span<const std::uint32_t> bands,
                            Resampling method, std::vector<zelm::PalettePtr> bandPalettes) {
    BandWeights settled;
    settled.palettes = std::move(bandPalettes);
    settled.alpha.assign(bands.size(), BandWeighing::kNoBand);
    if (!weights || method == Resampling::Nearest) return settled;
    for (std::uint32_t place = 0; place < bands.size(); ++place) {
        const auto alpha = weights->AlphaBand(bands[place]);
        if (alpha && *alpha >= sourceBands)
            throw Error(name, "take band " + std::to_string(*alpha) + ", counted from 0, for alpha",
                        "there are " + std::to_string(sourceBands));
        bool masked = weights->HasMask(bands[place]);
        if (alpha && *alpha != bands[place]) {
            const auto found = std::find(bands.begin(), bands.end(), *alpha);
            if (found == bands.end())
                masked = true;
            else
                settled.alpha[place] = static_cast<std::uint32_t>(found - bands.begin());
        }
        if (masked) settled.masked.push_back(place);
    }
    return settled;
}

}  // namespace zmchost
