// One file, three readers: what the module, the host library and the driver of GDAL say of it is
// the same: size, bands, type, levels, completeness, pixels, statistics and palettes.
#include <cpl_vsi.h>
#include <gdal_priv.h>

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include "files/Lending.h"
#include "format/PyramidLayout.h"
#include "fuzz/support/Expect.h"
#include "fuzz/support/Gdal.h"
#include "fuzz/support/Host.h"
#include "fuzz/support/HostileFile.h"
#include "gdal/SampleType.h"
#include "host/file/PresentTiles.h"
#include "host/file/PyramidFileInfo.h"
#include "host/file/StoredRecords.h"
#include "host/raster/Raster.h"

namespace {

using zmcfuzz::InputBytes;
using zmchost::Raster;
using zmchost::Window;

const char* const kName = "/vsimem/d.pyr";
constexpr std::uint32_t kMostSide = 200;

// Equal, or neither of them a number.
template <class T>
bool Same(const T& one, const T& other) {
    return one == other || (one != one && other != other);
}

template <class T>
double AsDouble(const T& value) {
    if constexpr (zelm::kIsComplex<T>)
        return static_cast<double>(value.re);
    else
        return static_cast<double>(value);
}

template <class T>
class Comparison {
public:
    Comparison(zelm::RasterReader<T>& modulesReader, Raster& hostsRaster, GDALDataset* dataset,
               InputBytes& steps)
        : reader(modulesReader), raster(hostsRaster), gdal(dataset), script(steps) {}

    void Run() {
        for (std::uint32_t band = 0; band < std::min(raster.Bands(), 12u); ++band) {
            Statistics(band);
            Palette(band);
        }
        for (int step = 0; step < 3; ++step) Pixels();
    }

private:
    zelm::RasterReader<T>& reader;
    Raster& raster;
    GDALDataset* gdal;  // null where GDAL does not show such files
    InputBytes& script;

    GDALRasterBand& Band(std::uint32_t band) {
        return *gdal->GetRasterBand(static_cast<int>(band) + 1);
    }

    void Statistics(std::uint32_t band) {
        const bool has = reader.HasBandStats(band);
        ZMC_EXPECT(has == raster.HasStatistics(band));
        const auto records = raster.Records<T>();
        const zelm::RasterBandStats<T> atPlace = reader.GetBandStats(band);
        if (band < records->Statistics().size()) {
            const zelm::RasterBandStats<T>& same = records->Statistics()[band];
            ZMC_EXPECT(atPlace.band == same.band && atPlace.flags == same.flags &&
                       Same(atPlace.mean, same.mean) && Same(atPlace.minimum, same.minimum));
        }
        if (!gdal || !raster.Header().fileSize) return;
        const zelm::RasterBandStats<T>* const newest = records->NewestStatistics(band);
        constexpr std::uint32_t kFull = zelm::StatsFlag::Minimum | zelm::StatsFlag::Maximum |
                                        zelm::StatsFlag::Mean | zelm::StatsFlag::StandardDeviation;
        const bool full = newest && (newest->flags & kFull) == kFull;
        double low = 0, high = 0, mean = 0, deviation = 0;
        const CPLErr told = Band(band).GetStatistics(FALSE, FALSE, &low, &high, &mean, &deviation);
        ZMC_EXPECT((told == CE_None) == full);
        if (full)
            ZMC_EXPECT(Same(low, AsDouble(newest->minimum)) &&
                       Same(high, AsDouble(newest->maximum)) && Same(mean, newest->mean) &&
                       Same(deviation, newest->standardDeviation));
    }

    void Palette(std::uint32_t band) {
        ZMC_EXPECT(reader.HasPalette(band) == raster.HasPalette(band));
        const auto records = raster.Records<T>();
        const zelm::ColorList* const colors = records->BandPalette(band);
        ZMC_EXPECT((colors != nullptr) == raster.HasPalette(band));
        if (!gdal) return;
        const GDALColorTable* const table = Band(band).GetColorTable();
        ZMC_EXPECT((table != nullptr) == (colors != nullptr));
        if (!table) return;
        const std::size_t count = std::min<std::size_t>(colors->Colors().size(), 65536);
        ZMC_EXPECT(static_cast<std::size_t>(table->GetColorEntryCount()) == count);
        for (std::size_t i = 0; i < count; ++i) {
            const GDALColorEntry& entry = *table->GetColorEntry(static_cast<int>(i));
            const auto color = colors->Colors()[i];
            ZMC_EXPECT(entry.c1 == zelm::ColorList::Channel(color, 0) &&
                       entry.c4 == zelm::ColorList::Channel(color, 3));
        }
    }

    void Pixels() {
        const std::uint32_t base = raster.MinLevel();
        const std::uint32_t width = raster.Width(base), height = raster.Height(base);
        if (width == 0 || height == 0) return;
        Window window{};
        window.x = script.UpTo(std::min(width - 1, 255u));
        window.y = script.UpTo(std::min(height - 1, 255u));
        window.width = std::min({width - window.x, kMostSide, 1 + script.UpTo(255)});
        window.height = std::min({height - window.y, kMostSide, 1 + script.UpTo(255)});
        const std::uint32_t band = script.UpTo(raster.Bands() - 1);
        const std::size_t count = std::size_t{window.width} * window.height;
        std::vector<T> modules(count), hosts(count);
        int list[] = {static_cast<int>(band)};
        const bool read = reader.ReadTile(
            static_cast<std::int32_t>(window.x), static_cast<std::int32_t>(window.y), window.width,
            window.height, zelm::Array<int>(list, zelm::ArrayShape(1u)),
            static_cast<std::int32_t>(base), modules.data(), nullptr);
        bool readByHost = true;
        const std::uint32_t bands[] = {band};
        try {
            raster.Read(base, window, bands, hosts.data());
        } catch (const zmchost::Error&) {
            readByHost = false;
        }
        // The module leaves a buffer as it was where the file has ended.
        const zmchost::PyramidHeader& header = raster.Header();
        const bool there = zmchost::PresentTiles(header).Have(base, window, bands, header.fileSize);
        ZMC_EXPECT(readByHost == (read && there));
        const std::size_t bytes = count * sizeof(T);
        if (readByHost) ZMC_EXPECT(std::memcmp(modules.data(), hosts.data(), bytes) == 0);
        if (!gdal) return;
        const GDALDataType type = Band(band).GetRasterDataType();
        std::vector<unsigned char> gdals(count *
                                         static_cast<std::size_t>(GDALGetDataTypeSizeBytes(type)));
        const CPLErr told = Band(band).RasterIO(
            GF_Read, static_cast<int>(window.x), static_cast<int>(window.y),
            static_cast<int>(window.width), static_cast<int>(window.height), gdals.data(),
            static_cast<int>(window.width), static_cast<int>(window.height), type, 0, 0, nullptr);
        ZMC_EXPECT((told == CE_None) == readByHost);
        if (readByHost) ExpectSame(modules, gdals);
    }

    static void ExpectSame(const std::vector<T>& samples, const std::vector<unsigned char>& gdals) {
        if constexpr (std::is_same_v<T, char>) {
            for (std::size_t i = 0; i < samples.size(); ++i) {
                std::int16_t value = 0;
                std::memcpy(&value, gdals.data() + i * sizeof value, sizeof value);
                ZMC_EXPECT(value == static_cast<signed char>(samples[i]));
            }
        } else {
            ZMC_EXPECT(samples.size() * sizeof(T) == gdals.size());
            ZMC_EXPECT(std::memcmp(samples.data(), gdals.data(), gdals.size()) == 0);
        }
    }
};

// What GDAL has room for.
bool IsForGdal(const zmchost::PyramidHeader& header) {
    const auto info = zmchost::DescribePyramidFile(header);
    const auto* const base = info.FindLevel(header.levelMin);
    return base && base->width != 0 && base->height != 0 && header.bandCount != 0 &&
           header.width <= INT32_MAX && header.height <= INT32_MAX;
}

void ExpectSameLayout(const zmchost::PyramidHeader& header, Raster& raster,
                      const zelm::BasicRasterReader& reader, GDALDataset* gdal) {
    const zelm::RasterProps props = reader.GetRasterProps();
    const zmchost::PyramidFileInfo info = zmchost::DescribePyramidFile(header);
    ZMC_EXPECT(props.samples == header.width && props.lines == header.height &&
               props.bands == header.bandCount && props.pixelType == header.pixelType &&
               props.interleave == header.interleave);
    ZMC_EXPECT(raster.Bands() == header.bandCount && raster.PixelType() == header.pixelType);
    ZMC_EXPECT(static_cast<std::uint32_t>(reader.GetMinLevel()) == header.levelMin &&
               static_cast<std::uint32_t>(reader.GetMaxLevel()) == header.levelMax);
    ZMC_EXPECT(reader.HasPyramid() == info.complete && raster.IsComplete() == info.complete);
    ZMC_EXPECT((gdal != nullptr) == IsForGdal(header));
    if (!gdal) return;
    const zmchost::PyramidLevelInfo& base = *info.FindLevel(header.levelMin);
    ZMC_EXPECT(gdal->GetRasterXSize() == static_cast<int>(base.width) &&
               gdal->GetRasterYSize() == static_cast<int>(base.height) &&
               gdal->GetRasterCount() == static_cast<int>(header.bandCount));
    GDALRasterBand& band = *gdal->GetRasterBand(1);
    ZMC_EXPECT(band.GetRasterDataType() ==
               zmcgdal::GdalTypeOf(header.pixelType, zmcgdal::SignedByteAs::Int16));
    const char* const complete = gdal->GetMetadataItem("COMPLETE", "ZMCPYRAMID");
    ZMC_EXPECT(complete && EQUAL(complete, info.complete ? "YES" : "NO"));
    // Of an incomplete file those levels that are there from end to end.
    const zmchost::PresentTiles present(header);
    const bool mayHave =
        zelm::PyramidLayout::MayHaveLevels(header.versionMajor, header.versionMinor);
    int coarser = 0;
    for (const zmchost::PyramidLevelInfo& level : info.levels)
        if (mayHave && level.level > header.levelMin && level.width != 0 && level.height != 0 &&
            present.HaveLevel(level.level, header.fileSize))
            ++coarser;
    ZMC_EXPECT(band.GetOverviewCount() == coarser);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    zmcfuzz::StartGdal();
    zmcfuzz::FileAndScript input = zmcfuzz::FileAndScript::Take(data, size);
    const zmchost::ModulePtr& module = zmcfuzz::TheModule();
    const auto header = zmcfuzz::HeaderIn(input.file);
    if (header && !zmcfuzz::IsAffordable(*header)) return 0;
    VSIFCloseL(VSIFileFromMemBuffer(kName, reinterpret_cast<GByte*>(input.file.data()),
                                    input.file.size(), FALSE));
    const std::unique_ptr<GDALDataset> gdal(GDALDataset::Open(kName, GDAL_OF_RASTER));
    const zelm::files::LentName lent = zelm::files::Lend(zmcfuzz::SourceOf(input.file));
    const zelm::RasterDataConnectionPtr connection = module->OpenPyramid(lent.Utf8());
    if (!header) {
        ZMC_EXPECT(!gdal);
        return 0;
    }
    // Whatever the host takes for a pyramid the module opens.
    ZMC_EXPECT(connection);
    const zelm::RasterReaderDispatchPtr dispatch = connection->GetReader();
    Raster raster = Raster::Open(module, zmcfuzz::SourceOf(input.file), "d.pyr");
    dispatch->Visit([&]<class T>(zelm::RasterReader<T>& reader) {
        ExpectSameLayout(*header, raster, reader, gdal.get());
        if (raster.Bands() != 0) Comparison<T>(reader, raster, gdal.get(), input.script).Run();
    });
    return 0;
}
