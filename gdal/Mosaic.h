// Mosaic: a dataset that shows many rasters as one, by a layout.
//
// A window opens the scenes that it touches and no other; as many stay open as were asked for, and
// those that were not wanted for longest are closed. What is asked for in the mosaic's own type
// goes from the scenes to the caller's buffer without blocks between, and a pixel is the same
// whatever window it is asked for in. A scene that cannot be read, or is not what it was when it
// was surveyed, fails the window by its name. One thread at a time.
#ifndef ZMC_GDAL_MOSAIC_H
#define ZMC_GDAL_MOSAIC_H

#include <cpl_quad_tree.h>
#include <gdal_priv.h>
#include <ogr_spatialref.h>

#include <list>
#include <map>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "gdal/MosaicLayout.h"
#include "gdal/OverlapWork.h"
#include "gdal/SceneFile.h"

namespace zmcgdal {

class Mosaic final : public GDALDataset {
public:
    Mosaic(const std::string& name, MosaicLayout mosaicLayout, std::size_t mostOpen);

    const MosaicLayout& Layout() const { return layout; }
    // Whether each scene that was read since the last call is still what it was when it was
    // surveyed; and each scene of all. Throw zmchost::Error with its name if not.
    void CheckRead();
    void CheckAll() const;

    CPLErr GetGeoTransform(double* transform) override;
    const OGRSpatialReference* GetSpatialRef() const override;
    CPLErr IRasterIO(GDALRWFlag flag, int x, int y, int width, int height, void* data,
                     int bufferWidth, int bufferHeight, GDALDataType type, int bandCount,
                     int* bandMap, GSpacing pixelSpace, GSpacing lineSpace, GSpacing bandSpace,
                     GDALRasterIOExtraArg* extra) override;

private:
    friend class MosaicRasterBand;
    class Area;

    struct CloseTree {
        void operator()(CPLQuadTree* unused) const { CPLQuadTreeDestroy(unused); }
    };
    struct OpenScene {
        std::uint32_t scene;
        std::unique_ptr<SceneFile> file;
    };

    // The window, pixel-interleaved and without gaps.
    void Compose(const zelm::Rectangle& window, std::span<const int> chosen, std::byte* pixels);
    std::vector<std::uint32_t> ScenesIn(const zelm::Rectangle& window) const;
    SceneFile& FileOf(std::uint32_t scene);
    void Fill(const zelm::Rectangle& window, std::span<const int> chosen, std::byte* pixels) const;
    void Paint(std::uint32_t scene, const Area& area);
    void Combine(const Area& area, const zelm::Rectangle& block);
    Layer ReadLayer(std::uint32_t scene, const zelm::Rectangle& part, std::span<const int> chosen);

    const MosaicLayout layout;
    OGRSpatialReference system;
    std::size_t sampleSize;
    GDALDataType sampleType;
    std::unique_ptr<CPLQuadTree, CloseTree> tree;
    const std::size_t most;
    std::list<OpenScene> open;  // the last one wanted in front
    std::map<std::uint32_t, std::list<OpenScene>::iterator> places;
    std::vector<bool> wasRead;
};

}  // namespace zmcgdal

#endif
