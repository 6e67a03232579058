#include "render/DatasetFacts.h"

#include <cpl_error.h>

#include <algorithm>

#include "gdal/NoDataValues.h"
#include "host/base/Error.h"

namespace zmcrender {
namespace {

BandMeaning MeaningOf(GDALColorInterp interpretation) {
    switch (interpretation) {
        case GCI_GrayIndex:
            return BandMeaning::Grey;
        case GCI_RedBand:
            return BandMeaning::Red;
        case GCI_GreenBand:
            return BandMeaning::Green;
        case GCI_BlueBand:
            return BandMeaning::Blue;
        case GCI_AlphaBand:
            return BandMeaning::Alpha;
        case GCI_PaletteIndex:
            return BandMeaning::Palette;
        default:
            return BandMeaning::Unknown;
    }
}

void TakeColours(const GDALColorTable& table, BandFacts& facts) {
    const auto channel = [](short value) {
        return static_cast<unsigned char>(std::clamp<int>(value, 0, 255));
    };
    for (int i = 0; i < table.GetColorEntryCount(); ++i) {
        GDALColorEntry entry{};
        table.GetColorEntryAsRGB(i, &entry);
        facts.palette.push_back(
            {channel(entry.c1), channel(entry.c2), channel(entry.c3), channel(entry.c4)});
    }
}

void AddBandFacts(GDALRasterBand& band, BandFacts& facts) {
    zmcgdal::VisitNoData(band, [&](auto value, GDALDataType) {
        if (value) facts.noData = Number(*value);
    });
    const BandMeaning meaning = MeaningOf(band.GetColorInterpretation());
    if (meaning != BandMeaning::Unknown) facts.meaning = meaning;
    if (!facts.palette.empty()) return;
    if (const GDALColorTable* const table = band.GetColorTable()) TakeColours(*table, facts);
}

}  // namespace

void AddDatasetFacts(GDALDataset& dataset, RasterFacts& facts) {
    const auto count =
        std::min(facts.bands.size(), static_cast<std::size_t>(dataset.GetRasterCount()));
    for (std::size_t i = 0; i < count; ++i)
        AddBandFacts(*dataset.GetRasterBand(static_cast<int>(i) + 1), facts.bands[i]);
}

GDALRasterBand* DatasetMask::MaskOf(std::uint32_t level) const {
    GDALRasterBand* band = dataset.GetRasterBand(1);
    if (level != 0) band = band->GetOverview(static_cast<int>(level) - 1);
    return band && (band->GetMaskFlags() & GMF_PER_DATASET) != 0 &&
                   (band->GetMaskFlags() & GMF_ALPHA) == 0
               ? band->GetMaskBand()
               : nullptr;
}

bool DatasetMask::Exists(std::uint32_t minLevel, std::uint32_t maxLevel) const {
    for (std::uint32_t level = 0; level <= maxLevel - minLevel; ++level)
        if (!MaskOf(level)) return false;
    return true;
}

void DatasetMask::Read(std::uint32_t level, const zmchost::Window& window,
                       unsigned char* shown) const {
    const auto x = static_cast<int>(window.x), y = static_cast<int>(window.y),
               width = static_cast<int>(window.width), height = static_cast<int>(window.height);
    CPLErrorReset();
    GDALRasterBand* const mask = MaskOf(level);
    if (!mask || mask->RasterIO(GF_Read, x, y, width, height, shown, width, height, GDT_Byte, 0, 0,
                                nullptr) != CE_None)
        throw zmchost::Error(dataset.GetDescription(), "read its mask", CPLGetLastErrorMsg());
}

}  // namespace zmcrender
