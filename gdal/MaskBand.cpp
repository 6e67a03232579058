#include "gdal/MaskBand.h"

#include <algorithm>

#include "core/ElementTypes.h"
#include "dispatch/NoDataRule.h"
#include "gdal/Reporting.h"
#include "gdal/SampleType.h"
#include "host/raster/NoData.h"

namespace zmcgdal {
namespace {

template <class T>
zelm::NoDataRule<T> RuleOf(GDALRasterBand& band) {
    int has = FALSE;
    zelm::NoDataRule<T> rule;
    if constexpr (std::is_same_v<T, std::int64_t>) {
        rule.value = band.GetNoDataValueAsInt64(&has);
    } else if constexpr (std::is_same_v<T, std::uint64_t>) {
        rule.value = band.GetNoDataValueAsUInt64(&has);
    } else {
        const double value = band.GetNoDataValue(&has);
        has = has && zmchost::HoldsValue<T>(value);
        if (has) rule.value = zelm::FromDouble<T>(value);
    }
    rule.hasValue = has != FALSE;
    return rule;
}

// Calls visit with the element type that GDAL's samples of this type have in memory.
template <class Visitor>
void VisitSampleType(GDALDataType type, Visitor&& visit) {
    zelm::VisitElementType(PixelTypeFor(type, false), std::forward<Visitor>(visit));
}

}  // namespace

MaskBand::MaskBand(Band& maskedBand) : band(maskedBand), number(maskedBand.GetBand()) {
    poDS = band.GetDataset();
    nBand = 0;
    nRasterXSize = band.GetXSize();
    nRasterYSize = band.GetYSize();
    eDataType = GDT_Byte;
    band.GetBlockSize(&nBlockXSize, &nBlockYSize);
}

GDALRasterBand* MaskBand::GetOverview(int index) {
    return Reporting<GDALRasterBand*>(nullptr, [&]() -> GDALRasterBand* {
        GDALRasterBand* const overview = band.GetOverview(index);
        return overview ? overview->GetMaskBand() : nullptr;
    });
}

CPLErr MaskBand::ReadMask(int x, int y, int width, int height, unsigned char* out,
                          std::size_t stride) {
    const GDALDataType type = band.GetRasterDataType();
    const auto sampleSize = static_cast<std::size_t>(GDALGetDataTypeSizeBytes(type));
    const auto count = static_cast<std::size_t>(width) * static_cast<std::size_t>(height);
    std::vector<unsigned char> pixels(count * sampleSize);
    GDALRasterIOExtraArg extra;
    INIT_RASTERIO_EXTRA_ARG(extra);
    const CPLErr result = band.RasterIO(GF_Read, x, y, width, height, pixels.data(), width, height,
                                        type, 0, 0, &extra);
    if (result != CE_None) return result;
    VisitSampleType(type, [&]<class T>(std::type_identity<T>) {
        const zelm::NoDataRule<T> rule = RuleOf<T>(band);
        const T* sample = reinterpret_cast<const T*>(pixels.data());
        for (int line = 0; line < height; ++line, out += stride)
            for (int column = 0; column < width; ++column)
                out[column] = rule.Marks(*sample++) ? 0 : 255;
    });
    return CE_None;
}

CPLErr MaskBand::IReadBlock(int blockX, int blockY, void* data) {
    return Reporting(CE_Failure, [&] {
        int width = 0, height = 0;
        GetActualBlockSize(blockX, blockY, &width, &height);
        return ReadMask(blockX * nBlockXSize, blockY * nBlockYSize, width, height,
                        static_cast<unsigned char*>(data), static_cast<std::size_t>(nBlockXSize));
    });
}

CPLErr MaskBand::IRasterIO(GDALRWFlag mode, int x, int y, int width, int height, void* data,
                           int bufferWidth, int bufferHeight, GDALDataType bufferType,
                           GSpacing pixelSpace, GSpacing lineSpace, GDALRasterIOExtraArg* extra) {
    return Reporting(CE_Failure, [&] {
        const bool plain = mode == GF_Read && bufferWidth == width && bufferHeight == height &&
                           bufferType == GDT_Byte && pixelSpace == 1 && lineSpace >= 0;
        if (!plain || !band.Owner().ReadsDirectly(x, y, width, height, std::span(&number, 1)))
            return GDALRasterBand::IRasterIO(mode, x, y, width, height, data, bufferWidth,
                                             bufferHeight, bufferType, pixelSpace, lineSpace,
                                             extra);
        // In strips as high as a block, so that a large window needs no large copy of its pixels.
        for (int done = 0; done < height;) {
            const int lines = std::min(height - done, nBlockYSize - (y + done) % nBlockYSize);
            const CPLErr result = ReadMask(x, y + done, width, lines,
                                           static_cast<unsigned char*>(data) + done * lineSpace,
                                           static_cast<std::size_t>(lineSpace));
            if (result != CE_None) return result;
            done += lines;
            if (extra && extra->pfnProgress &&
                !extra->pfnProgress(static_cast<double>(done) / height, "", extra->pProgressData)) {
                ReportError(CE_Failure, CPLE_UserInterrupt, "cancelled");
                return CE_Failure;
            }
        }
        return CE_None;
    });
}

LevelMask::LevelMask(Band& levelBand, GDALRasterBand& mainBand, std::uint32_t reduction)
    : main(mainBand), step(1 << reduction) {
    poDS = levelBand.GetDataset();
    nBand = 0;
    nRasterXSize = levelBand.GetXSize();
    nRasterYSize = levelBand.GetYSize();
    eDataType = GDT_Byte;
    levelBand.GetBlockSize(&nBlockXSize, &nBlockYSize);
}

// Line by line, so that a block of a coarse level takes the memory of a line of the finest.
CPLErr LevelMask::IReadBlock(int blockX, int blockY, void* data) {
    return Reporting(CE_Failure, [&] {
        int width = 0, height = 0;
        GetActualBlockSize(blockX, blockY, &width, &height);
        std::vector<unsigned char> line(static_cast<std::size_t>(width) *
                                        static_cast<std::size_t>(step));
        auto* out = static_cast<unsigned char*>(data);
        for (int row = 0; row < height; ++row, out += nBlockXSize) {
            const CPLErr read = main.GetMaskBand()->RasterIO(
                GF_Read, blockX * nBlockXSize * step, (blockY * nBlockYSize + row) * step,
                width * step, 1, line.data(), width * step, 1, GDT_Byte, 0, 0, nullptr);
            if (read != CE_None) return read;
            for (int column = 0; column < width; ++column)
                out[column] =
                    line[static_cast<std::size_t>(column) * static_cast<std::size_t>(step)];
        }
        return CE_None;
    });
}

}  // namespace zmcgdal
