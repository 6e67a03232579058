#include "serve/Warp.h"

#include <cpl_string.h>
#include <gdal_alg.h>
#include <gdal_frmts.h>
#include <gdal_priv.h>
#include <gdalwarper.h>

#include <algorithm>
#include <cmath>
#include <memory>
#include <new>
#include <stdexcept>
#include <string>

#include "gdal/ErrorCatcher.h"
#include "render/Picture.h"
#include "serve/ServedRaster.h"

namespace zmcserve {
namespace {

using zmcrender::Picture;

constexpr double kMostError = 0.125;  // of approximated places, in pixels

struct CloseDataset {
    void operator()(GDALDataset* dataset) const { GDALClose(GDALDataset::ToHandle(dataset)); }
};
using DatasetPtr = std::unique_ptr<GDALDataset, CloseDataset>;

struct DropOptions {
    void operator()(GDALWarpOptions* options) const { GDALDestroyWarpOptions(options); }
};

std::uint32_t ColoursOf(const Picture& picture) {
    return picture.channels - (picture.HasAlpha() ? 1 : 0);
}

GDALDataType TypeOf(const Picture& picture) { return picture.depth == 16 ? GDT_UInt16 : GDT_Byte; }

// The pixels of a picture as a dataset, which borrows them.
DatasetPtr Borrowed(Picture& picture) {
    GDALRegister_MEM();
    GDALDriver* const driver = GetGDALDriverManager()->GetDriverByName("MEM");
    if (!driver) throw std::runtime_error("GDAL has no datasets in memory");
    DatasetPtr dataset(driver->Create("", static_cast<int>(picture.width),
                                      static_cast<int>(picture.height), 0, TypeOf(picture),
                                      nullptr));
    const std::size_t sample = picture.depth / 8;
    for (std::size_t channel = 0; dataset && channel < picture.channels; ++channel) {
        char address[32] = {};
        address[CPLPrintPointer(address, &picture.bytes[channel * sample], sizeof address - 1)] = 0;
        CPLStringList options;
        options.SetNameValue("DATAPOINTER", address);
        options.SetNameValue("PIXELOFFSET", std::to_string(picture.channels * sample).c_str());
        options.SetNameValue("LINEOFFSET", std::to_string(picture.LineBytes()).c_str());
        if (dataset->AddBand(TypeOf(picture), options.List()) != CE_None) dataset.reset();
    }
    if (!dataset) throw std::bad_alloc();
    return dataset;
}

// From pixels of the target to those of the source.
struct Places {
    const Mercator& plane;
    const PlaneExtent& extent;
    const PlaneSource& source;
    double cell;   // metres a pixel of the target
    double scale;  // pixels of the finest level in one of the source's

    void ToSource(std::size_t count, double* x, double* y) const {
        for (std::size_t i = 0; i < count; ++i) {
            x[i] = extent.west + x[i] * cell;
            y[i] = extent.north - y[i] * cell;
        }
        plane.ToPixels(count, x, y);
        for (std::size_t i = 0; i < count; ++i) {
            x[i] = x[i] / scale - source.window.x;
            y[i] = y[i] / scale - source.window.y;
        }
    }
    void ToTarget(std::size_t count, double* x, double* y) const {
        for (std::size_t i = 0; i < count; ++i) {
            x[i] = (x[i] + source.window.x) * scale;
            y[i] = (y[i] + source.window.y) * scale;
        }
        plane.ToPlane(count, x, y);
        for (std::size_t i = 0; i < count; ++i) {
            x[i] = (x[i] - extent.west) / cell;
            y[i] = (extent.north - y[i]) / cell;
        }
    }
};

// As GDAL calls it.
int TransformPlaces(void* how, int toSource, int count, double* x, double* y, double*, int* done) {
    const auto& places = *static_cast<const Places*>(how);
    const auto size = static_cast<std::size_t>(count);
    try {
        toSource ? places.ToSource(size, x, y) : places.ToTarget(size, x, y);
    } catch (const std::bad_alloc&) {
        return FALSE;
    }
    for (std::size_t i = 0; i < size; ++i) done[i] = std::isfinite(x[i]) && std::isfinite(y[i]);
    return TRUE;
}

GDALResampleAlg AlgorithmOf(Resampling resampling) {
    switch (resampling) {
        case Resampling::Nearest:
            return GRA_NearestNeighbour;
        case Resampling::Cubic:
            return GRA_Cubic;
        default:
            return GRA_Bilinear;
    }
}

std::unique_ptr<GDALWarpOptions, DropOptions> OptionsOf(const Picture& from, double shrinking,
                                                        Resampling resampling) {
    std::unique_ptr<GDALWarpOptions, DropOptions> options(GDALCreateWarpOptions());
    options->eResampleAlg = AlgorithmOf(resampling);
    options->eWorkingDataType = TypeOf(from);
    const auto colours = static_cast<int>(ColoursOf(from));
    GDALWarpInitDefaultBandMapping(options.get(), colours);
    options->nSrcAlphaBand = from.HasAlpha() ? colours + 1 : 0;
    options->nDstAlphaBand = colours + 1;
    CPLStringList words;
    words.SetNameValue("INIT_DEST", "0");
    words.SetNameValue("NUM_THREADS", "1");
    // GDAL would conclude from the sizes, of which a part may lie outside of the raster.
    const std::string scale = std::to_string(1 / std::max(shrinking, 1.0));
    words.SetNameValue("XSCALE", scale.c_str());
    words.SetNameValue("YSCALE", scale.c_str());
    if (from.depth == 16) {
        words.SetNameValue("SRC_ALPHA_MAX", "65535");
        words.SetNameValue("DST_ALPHA_MAX", "65535");
    }
    options->papszWarpOptions = words.StealList();
    return options;
}

// Pixels of the target where the raster may be: of all others GDAL would ask in vain.
zmchost::Window Reached(const Places& places, std::uint32_t side) {
    const PlaneExtent &all = places.plane.Bounds(), &extent = places.extent;
    const auto clip = [side](double at) {
        return static_cast<std::uint32_t>(std::clamp(at, 0.0, static_cast<double>(side)));
    };
    const std::uint32_t left = clip(std::floor((all.west - extent.west) / places.cell) - 1);
    const std::uint32_t right = clip(std::ceil((all.east - extent.west) / places.cell) + 1);
    const std::uint32_t top = clip(std::floor((extent.north - all.north) / places.cell) - 1);
    const std::uint32_t bottom = clip(std::ceil((extent.north - all.south) / places.cell) + 1);
    return {left, top, right - left, bottom - top};
}

void Warp(Picture& from, Picture& to, const Places& places, Resampling resampling) {
    const zmchost::Window reached = Reached(places, to.width);
    if (reached.Pixels() == 0) return;
    const DatasetPtr source = Borrowed(from), target = Borrowed(to);
    const auto options = OptionsOf(from, places.source.shrinking, resampling);
    options->hSrcDS = GDALDataset::ToHandle(source.get());
    options->hDstDS = GDALDataset::ToHandle(target.get());
    const std::unique_ptr<void, decltype(&GDALDestroyApproxTransformer)> approximate(
        GDALCreateApproxTransformer(TransformPlaces, const_cast<Places*>(&places), kMostError),
        &GDALDestroyApproxTransformer);
    options->pfnTransformer = GDALApproxTransform;
    options->pTransformerArg = approximate.get();
    const zmcgdal::ErrorCatcher said(CE_Failure);
    GDALWarpOperation operation;
    if (operation.Initialize(options.get()) != CE_None ||
        operation.WarpRegion(static_cast<int>(reached.x), static_cast<int>(reached.y),
                             static_cast<int>(reached.width), static_cast<int>(reached.height), 0,
                             0, static_cast<int>(from.width),
                             static_cast<int>(from.height)) != CE_None)
        throw std::runtime_error("GDAL cannot warp it: " + said.Text());
}

// Without alpha where all of it is opaque.
Picture WithoutNeedlessAlpha(Picture picture) {
    const std::size_t sample = picture.depth / 8, pixel = picture.channels * sample;
    const std::size_t kept = pixel - sample, count = picture.bytes.size() / pixel;
    for (std::size_t i = 0; i < count; ++i)
        for (std::size_t part = kept; part < pixel; ++part)
            if (picture.bytes[i * pixel + part] != 0xFF) return picture;
    for (std::size_t i = 1; i < count; ++i)
        std::copy_n(&picture.bytes[i * pixel], kept, &picture.bytes[i * kept]);
    picture.bytes.resize(count * kept);
    --picture.channels;
    return picture;
}

}  // namespace

Picture WarpToPlane(const Picture& picture, const ServedRaster& raster, const PlaneSource& source,
                    const Mercator& plane, const PlaneExtent& extent, std::uint32_t side,
                    Resampling resampling) {
    const Places places{plane, extent, source, (extent.east - extent.west) / side,
                        std::ldexp(1.0, static_cast<int>(source.level - raster.FinestLevel()))};
    Picture target{side, side, ColoursOf(picture) + 1, picture.depth, {}};
    target.bytes.resize(target.LineBytes() * side);
    // It is read alone.
    Warp(const_cast<Picture&>(picture), target, places, resampling);
    return WithoutNeedlessAlpha(std::move(target));
}

}  // namespace zmcserve
