// SceneFile: one scene of a mosaic, open: as it is, or warped to the mosaic's grid.
#ifndef ZMC_GDAL_SCENEFILE_H
#define ZMC_GDAL_SCENEFILE_H

#include <gdal_priv.h>

#include <memory>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "gdal/MosaicLayout.h"

namespace zmcgdal {

struct CloseScene {
    void operator()(GDALDataset* dataset) const { GDALClose(dataset); }
};
using ScenePtr = std::unique_ptr<GDALDataset, CloseScene>;

// Opens a raster for reading: by one driver, unless that is empty, and where `alone` without a look
// at what lies beside it. Throws zmchost::Error with GDAL's reason.
ScenePtr OpenScene(const std::string& name, const std::string& driver, bool alone);

// The error that a scene is refused with, by its name.
[[noreturn]] void FailScene(const std::string& name, const std::string& reason);

// Why a raster of this type is not brought to another grid; empty if it can be. GDAL's warper
// computes in reals, and takes signed bytes for unsigned ones.
std::string WhyNotWarped(std::uint32_t pixelType);

class SceneFile {
public:
    // The layout outlives this object. Throws zmchost::Error, also where the scene is not what it
    // was when it was surveyed.
    SceneFile(const MosaicLayout& mosaic, const MosaicScene& which);

    // Whether all samples of a band are shown, and none is to be looked at.
    bool IsOpaque(std::span<const int> bands) const;
    // A part of the scene's place, in the mosaic's pixels, as samples of the mosaic's type, with
    // such steps in bytes between pixels, lines and bands, which count from 1.
    void Read(const zelm::Rectangle& part, std::span<const int> bands, void* pixels, GSpacing pixel,
              GSpacing line, GSpacing band);
    // Tells of each sample whether it is shown: pixel-interleaved without gaps, not 0 if so.
    // `samples` are those of Read, laid out alike.
    void ReadShown(const zelm::Rectangle& part, std::span<const int> bands, const void* samples,
                   unsigned char* shown);

private:
    // What hides samples of a band: nothing, a value or a mask.
    struct Hiding {
        std::optional<double> value;
        GDALRasterBand* mask = nullptr;
    };

    const MosaicLayout& layout;
    const MosaicScene& scene;
    ScenePtr file;
    ScenePtr warped;  // of it; goes first
    std::vector<Hiding> hidings;

    GDALDataset& Pixels() const { return warped ? *warped : *file; }
    void Warp();
    void FindHidings();
    Hiding HidingOf(GDALRasterBand& band) const;
};

}  // namespace zmcgdal

#endif
