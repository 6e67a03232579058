#include "gdal/SceneFile.h"

#include <cpl_conv.h>
#include <cpl_string.h>
#include <gdal_utils.h>

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <type_traits>

#include "core/PixelVocabulary.h"
#include "gdal/ErrorCatcher.h"
#include "gdal/NoDataValues.h"
#include "gdal/SampleType.h"
#include "host/base/Error.h"
#include "host/raster/NoData.h"

namespace zmcgdal {
namespace {

using zelm::Rectangle;

std::string Exact(double number) {
    char text[40];
    static_cast<void>(std::snprintf(text, sizeof text, "%.17g", number));
    return text;
}

std::string ReasonOr(const ErrorCatcher& errors, const std::string& name) {
    std::string reason = errors.Text();
    if (reason.compare(0, name.size() + 2, name + ": ") == 0) reason.erase(0, name.size() + 2);
    if (reason.find("not recognized as") != reason.npos)
        return "it is in no raster format that GDAL knows";
    if (reason == "No such file or directory") return "there is no such file";
    return reason.empty() ? "GDAL gives no reason" : reason;
}

// Uncompressed lines come straight out of the file, past GDAL's blocks. Of this thread alone.
class StraightLines {
public:
    StraightLines() { CPLSetThreadLocalConfigOption(kOption, "YES"); }
    ~StraightLines() { CPLSetThreadLocalConfigOption(kOption, nullptr); }
    StraightLines(const StraightLines&) = delete;
    StraightLines& operator=(const StraightLines&) = delete;

private:
    static constexpr const char* kOption = "GTIFF_DIRECT_IO";
};

// Samples that are the value, and those that are no number, are not shown.
template <class T>
void MarkShown(const std::optional<double>& value, const T* samples, std::size_t count,
               std::size_t stride, unsigned char* shown) {
    using zelm::kIsComplex;
    const bool has = value && zmchost::HoldsValue<T>(*value);
    const T hidden = has ? zelm::FromDouble<T>(*value) : T{};
    for (std::size_t i = 0; i < count; ++i) {
        const T& sample = samples[i * stride];
        bool isNumber = true;
        if constexpr (kIsComplex<T>)
            isNumber = !std::isnan(sample.re) && !std::isnan(sample.im);
        else if constexpr (std::is_floating_point_v<T>)
            isNumber = !std::isnan(sample);
        shown[i * stride] = isNumber && !(has && sample == hidden) ? 1 : 0;
    }
}

bool IsWhole(std::uint32_t pixelType) {
    bool whole = false;
    zelm::VisitElementType(pixelType,
                           [&]<class T>(std::type_identity<T>) { whole = std::is_integral_v<T>; });
    return whole;
}

}  // namespace

void FailScene(const std::string& name, const std::string& reason) {
    throw zmchost::Error(name, "take it into the mosaic", reason);
}

ScenePtr OpenScene(const std::string& name, const std::string& driver, bool alone) {
    const char* const drivers[] = {driver.c_str(), nullptr};
    CPLStringList siblings;
    if (alone) siblings.AddString(CPLGetFilename(name.c_str()));
    const ErrorCatcher errors(CE_Failure);
    const StraightLines straight;
    ScenePtr opened(GDALDataset::Open(name.c_str(), GDAL_OF_RASTER | GDAL_OF_VERBOSE_ERROR,
                                      driver.empty() ? nullptr : drivers, nullptr,
                                      alone ? siblings.List() : nullptr));
    if (!opened) FailScene(name, ReasonOr(errors, name));
    return opened;
}

std::string WhyNotWarped(std::uint32_t pixelType) {
    const bool inexact = pixelType == zelm::PixelTypeCode::Int64 ||
                         pixelType == zelm::PixelTypeCode::UInt64 ||
                         pixelType == zelm::PixelTypeCode::Char;
    return inexact ? "it does not lie on the grid of the mosaic, and samples of type " +
                         std::string(zelm::PixelTypeName(pixelType)) + " are not warped"
                   : "";
}

SceneFile::SceneFile(const MosaicLayout& mosaic, const MosaicScene& which)
    : layout(mosaic), scene(which) {
    if (scene.StateNow() != scene.state)
        FailScene(scene.name, "it changed since the mosaic was planned");
    file = OpenScene(scene.name, layout.drivers[scene.driver], scene.alone);
    if (scene.warped) Warp();
    GDALDataset& pixels = Pixels();
    const auto side = [](int pixelCount) { return static_cast<std::uint32_t>(pixelCount); };
    if (pixels.GetRasterCount() < static_cast<int>(layout.bands.size()) ||
        side(pixels.GetRasterXSize()) != scene.place.width ||
        side(pixels.GetRasterYSize()) != scene.place.height)
        FailScene(scene.name, "it is not what it was when the mosaic was planned");
    FindHidings();
}

// A virtual raster whose pixels are those of the mosaic's grid: its blocks begin at the scene's
// own corner, so that a pixel is the same whatever rectangle it is asked for in.
void SceneFile::Warp() {
    const GeoTransform& grid = layout.transform;
    const Rectangle& place = scene.place;
    CPLStringList words;
    const auto add = [&](std::initializer_list<std::string> list) {
        for (const std::string& word : list) words.AddString(word.c_str());
    };
    const double left = grid[0] + grid[1] * place.x, top = grid[3] + grid[5] * place.y;
    add({"-of", "VRT", "-r", layout.resampling, "-te", Exact(left),
         Exact(top + grid[5] * place.height), Exact(left + grid[1] * place.width), Exact(top),
         "-ts", std::to_string(place.width), std::to_string(place.height)});
    if (!layout.system.empty()) add({"-t_srs", layout.system});
    const Hiding hiding = HidingOf(*file->GetRasterBand(1));
    const bool hasAlpha =
        file->GetRasterBand(file->GetRasterCount())->GetColorInterpretation() == GCI_AlphaBand;
    if (hiding.value && layout.hidden)
        add({"-srcnodata", Exact(*hiding.value), "-dstnodata", Exact(*hiding.value)});
    else if (!hiding.value && !hasAlpha)
        add({"-dstalpha"});
    const std::unique_ptr<GDALWarpAppOptions, decltype(&GDALWarpAppOptionsFree)> options(
        GDALWarpAppOptionsNew(words.List(), nullptr), &GDALWarpAppOptionsFree);
    const ErrorCatcher errors(CE_Failure);
    GDALDatasetH source = GDALDataset::ToHandle(file.get());
    int misused = FALSE;
    warped.reset(
        GDALDataset::FromHandle(GDALWarp("", nullptr, 1, &source, options.get(), &misused)));
    if (!warped) FailScene(scene.name, ReasonOr(errors, scene.name));
}

SceneFile::Hiding SceneFile::HidingOf(GDALRasterBand& band) const {
    const int flags = band.GetMaskFlags();
    const bool exact =
        band.GetRasterDataType() != GDT_Int64 && band.GetRasterDataType() != GDT_UInt64;
    if (flags == GMF_NODATA && exact) return {NoDataAsDouble(band), nullptr};
    if ((flags & GMF_ALL_VALID) == 0) return {std::nullopt, band.GetMaskBand()};
    return {layout.hidden, nullptr};
}

// Where there is alpha, it hides samples of its own band too.
void SceneFile::FindHidings() {
    GDALDataset& pixels = Pixels();
    GDALRasterBand* alpha = nullptr;
    for (int number = 1; number <= static_cast<int>(layout.bands.size()); ++number) {
        GDALRasterBand& band = *pixels.GetRasterBand(number);
        hidings.push_back(HidingOf(band));
        if ((band.GetMaskFlags() & GMF_ALPHA) != 0) alpha = band.GetMaskBand();
    }
    for (Hiding& hiding : hidings) {
        if (alpha) hiding = {std::nullopt, alpha};
        if (hiding.mask && (hiding.mask->GetXSize() != pixels.GetRasterXSize() ||
                            hiding.mask->GetYSize() != pixels.GetRasterYSize()))
            FailScene(scene.name, "its mask is of another size");
    }
}

bool SceneFile::IsOpaque(std::span<const int> bands) const {
    return IsWhole(layout.pixelType) && std::all_of(bands.begin(), bands.end(), [&](int band) {
               const Hiding& hiding = hidings[static_cast<std::size_t>(band - 1)];
               return !hiding.value && !hiding.mask;
           });
}

void SceneFile::Read(const Rectangle& part, std::span<const int> bands, void* pixels,
                     GSpacing pixel, GSpacing line, GSpacing band) {
    const int width = static_cast<int>(part.width), height = static_cast<int>(part.height);
    GDALRasterIOExtraArg extra;
    INIT_RASTERIO_EXTRA_ARG(extra);
    const ErrorCatcher errors(CE_Failure);
    const CPLErr result = Pixels().RasterIO(
        GF_Read, static_cast<int>(part.x - scene.place.x), static_cast<int>(part.y - scene.place.y),
        width, height, pixels, width, height,
        GdalTypeOf(layout.pixelType,
                   layout.IsSigned() ? SignedByteAs::FlaggedByte : SignedByteAs::Own),
        static_cast<int>(bands.size()), const_cast<int*>(bands.data()), pixel, line, band, &extra);
    if (result != CE_None || !errors.Text().empty())
        FailScene(scene.name, ReasonOr(errors, scene.name));
}

void SceneFile::ReadShown(const Rectangle& part, std::span<const int> bands, const void* samples,
                          unsigned char* shown) {
    const std::size_t count = static_cast<std::size_t>(part.Pixels());
    const int width = static_cast<int>(part.width), height = static_cast<int>(part.height);
    GDALRasterBand* known = nullptr;
    std::vector<unsigned char> mask;
    for (std::size_t i = 0; i < bands.size(); ++i) {
        const Hiding& hiding = hidings[static_cast<std::size_t>(bands[i] - 1)];
        zelm::VisitElementType(layout.pixelType, [&]<class T>(std::type_identity<T>) {
            MarkShown(hiding.value, static_cast<const T*>(samples) + i, count, bands.size(),
                      shown + i);
        });
        if (!hiding.mask) continue;
        if (hiding.mask != known) {
            mask.resize(count);
            GDALRasterIOExtraArg extra;
            INIT_RASTERIO_EXTRA_ARG(extra);
            const ErrorCatcher errors(CE_Failure);
            const CPLErr result =
                hiding.mask->RasterIO(GF_Read, static_cast<int>(part.x - scene.place.x),
                                      static_cast<int>(part.y - scene.place.y), width, height,
                                      mask.data(), width, height, GDT_Byte, 0, 0, &extra);
            if (result != CE_None || !errors.Text().empty())
                FailScene(scene.name, ReasonOr(errors, scene.name));
            known = hiding.mask;
        }
        for (std::size_t pixel = 0; pixel < count; ++pixel)
            if (mask[pixel] == 0) shown[pixel * bands.size() + i] = 0;
    }
}

}  // namespace zmcgdal
