// MosaicLayout: many rasters as one, as a plain value: the grid of the whole, what its bands are,
// and of each scene its name, its place and what tells it again.
//
// A survey makes it (MosaicSurvey.h), a dataset reads by it (Mosaic.h), and as bytes it is kept for
// those who read parts of the whole later and elsewhere, so that nobody opens all scenes twice.
#ifndef ZMC_GDAL_MOSAICLAYOUT_H
#define ZMC_GDAL_MOSAICLAYOUT_H

#include <gdal.h>

#include <array>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "format/Rectangle.h"

namespace zmcgdal {

// The most scenes of one mosaic.
inline constexpr std::uint64_t kMostScenes = std::uint64_t{1} << 20;

// What a sample is where scenes lie over each other: that of the first or last scene that shows
// one, or made of all that are shown. Means are rounded half away from zero in integers; the median
// of an even count is the lower of the two in the middle.
enum class Overlap : std::uint32_t { Last, First, Mean, Minimum, Maximum, Median };

using GeoTransform = std::array<double, 6>;

struct MosaicBand {
    int interpretation = GCI_Undefined;  // GDALColorInterp
    std::optional<double> noData;
    std::vector<GDALColorEntry> colors;  // of a palette
    std::string description;
    std::string unit;
    double offset = 0;
    double scale = 1;
};

struct MosaicScene {
    std::string name;
    std::vector<std::string> companions;  // further files that its pixels or its place come from
    std::uint64_t state = 0;              // of all of its files, when it was surveyed
    zelm::Rectangle place;                // of the mosaic's pixels
    std::uint32_t driver = 0;             // in MosaicLayout::drivers
    bool alone = false;                   // no file belongs to it but itself
    bool warped = false;                  // its pixels are not those of the mosaic's grid

    // As `state` is made.
    std::uint64_t StateNow() const;
};

struct MosaicLayout {
    struct LeftOut {
        std::string name;
        std::string reason;
    };

    std::uint32_t width = 0;
    std::uint32_t height = 0;
    GeoTransform transform{};
    std::string system;           // as WKT; empty: unknown
    std::string systemKeys;       // by which GeoTIFFs tell it; empty: the first scene is none
    std::uint32_t pixelType = 0;  // code, of all bands
    Overlap overlap = Overlap::Last;
    std::string resampling;            // of scenes that are warped, as GDAL calls it
    std::optional<double> hidden;      // marks samples of scenes that have no mark of their own
    std::vector<MosaicBand> bands;     // of the whole: no-data values are what gaps are filled with
    std::vector<std::string> drivers;  // of GDAL
    std::vector<MosaicScene> scenes;   // in the order given
    std::vector<LeftOut> leftOut;      // that could not be read, in the order given

    // The signed byte, which GDAL has no type of its own for.
    bool IsSigned() const;
    // A band that is alpha is there, so that gaps are seen.
    bool HasAlpha() const;
    // Whether areas without any scene are certain.
    bool HasGaps() const;

    std::string Pack() const;
    // Nothing where that is no layout, or one that cannot be.
    static std::optional<MosaicLayout> Unpack(std::string_view bytes);
};

// What all bands of a scene tell, as bytes that are equal where these are.
std::string PackBands(std::uint32_t pixelType, const std::vector<MosaicBand>& bands);

}  // namespace zmcgdal

#endif
