// A hostile file and a hostile sidecar in the hands of GDAL's user: opened, read by every road,
// asked for all that GDAL asks for, and updated.
//
// The sidecar stands behind the file, with its length in two bytes, in front of the script.
#include <cpl_vsi.h>
#include <gdal_priv.h>

#include <algorithm>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "fuzz/support/Expect.h"
#include "fuzz/support/Gdal.h"
#include "fuzz/support/HostileFile.h"

namespace {

using zmcfuzz::InputBytes;

const char* const kName = "/vsimem/a.pyr";
const char* const kSidecar = "/vsimem/a.pyr.aux.xml";
constexpr int kMostSide = 300;
constexpr int kMostBands = 6;
constexpr std::uint64_t kMostFile = 16 << 20;
// Whether GDAL says yes or no is for it to say.
void Drop(CPLErr) {}

constexpr std::int64_t kMostPixels = 1 << 18;  // that a whole band is gone through for

void Put(const char* name, const std::string& bytes) {
    VSIUnlink(name);
    VSILFILE* const file = VSIFOpenL(name, "wb");
    ZMC_EXPECT(file && VSIFWriteL(bytes.data(), 1, bytes.size(), file) == bytes.size());
    VSIFCloseL(file);
}

class Session {
public:
    Session(GDALDataset& opened, InputBytes& steps) : dataset(opened), script(steps) {}

    void Run() {
        for (int step = 0; step < 8 && !script.AtEnd(); ++step) Step();
    }

private:
    GDALDataset& dataset;
    InputBytes& script;

    GDALRasterBand& TakeBand() {
        const auto count = static_cast<std::uint32_t>(dataset.GetRasterCount());
        GDALRasterBand* band = dataset.GetRasterBand(1 + static_cast<int>(script.UpTo(count - 1)));
        const int levels = band->GetOverviewCount();
        if (levels > 0 && script.UpTo(3) == 0)
            if (GDALRasterBand* const level = band->GetOverview(
                    static_cast<int>(script.UpTo(static_cast<std::uint32_t>(levels)))))
                band = level;
        return *band;
    }

    static bool IsSmall(GDALRasterBand& band) {
        return std::int64_t{band.GetXSize()} * band.GetYSize() <= kMostPixels;
    }

    struct Part {
        int x, y, width, height;
    };
    Part TakePart(int width, int height) {
        const auto some = [&](int whole, int& start) {
            start =
                script.Flag() ? 0 : static_cast<int>(script.Size() % static_cast<unsigned>(whole));
            return std::min({whole - start, kMostSide, 1 + static_cast<int>(script.UpTo(255)) * 2});
        };
        Part part{};
        part.width = some(width, part.x);
        part.height = some(height, part.y);
        return part;
    }

    GDALDataType TakeType(GDALRasterBand& band) {
        static constexpr GDALDataType kTypes[] = {GDT_Byte,  GDT_Int16,    GDT_Float32,
                                                  GDT_Int64, GDT_CFloat64, GDT_UInt16};
        return script.UpTo(2) != 0 ? band.GetRasterDataType() : script.OneOf(kTypes);
    }

    void Step() {
        switch (script.UpTo(13)) {
            case 0:
            case 1:
                return ReadBand(TakeBand());
            case 2:
            case 3:
                return ReadDataset();
            case 4:
                return ReadBlock(TakeBand());
            case 5:
                return ReadBand(*TakeBand().GetMaskBand());
            case 6:
                return AskForRecords(TakeBand());
            case 7:
                return AskForMetadata(TakeBand());
            case 8:
                return StoreStatistics(TakeBand());
            case 9:
                return StoreHistogram(TakeBand());
            case 10:
                return StoreColors(TakeBand());
            case 11:
                return Write(TakeBand());
            case 12:
                return SetNoData(TakeBand());
            default:
                return RenewLevels();
        }
    }

    // Into a block of the very size, so that a sanitizer sees the first byte beyond.
    void ReadBand(GDALRasterBand& band) {
        const Part part = TakePart(band.GetXSize(), band.GetYSize());
        const GDALDataType type = TakeType(band);
        const int shrink = script.UpTo(3) == 0 ? 2 : 1;
        const int width = std::max(part.width / shrink, 1);
        const int height = std::max(part.height / shrink, 1);
        std::vector<unsigned char> pixels(static_cast<std::size_t>(width) *
                                          static_cast<std::size_t>(height) *
                                          static_cast<std::size_t>(GDALGetDataTypeSizeBytes(type)));
        Drop(band.RasterIO(GF_Read, part.x, part.y, part.width, part.height, pixels.data(), width,
                           height, type, 0, 0, nullptr));
    }

    void ReadDataset() {
        const Part part = TakePart(dataset.GetRasterXSize(), dataset.GetRasterYSize());
        const int bands = std::min(dataset.GetRasterCount(), kMostBands);
        const GDALDataType type = TakeType(*dataset.GetRasterBand(1));
        const GSpacing size = GDALGetDataTypeSizeBytes(type);
        std::vector<int> list;
        for (int i = 0; i < bands; ++i)
            list.push_back(script.Flag() ? i + 1 : 1 + static_cast<int>(script.UpTo(255)) % bands);
        const bool together = script.Flag();
        std::vector<unsigned char> pixels(
            static_cast<std::size_t>(GSpacing{part.width} * part.height * bands * size));
        const GSpacing pixel = together ? size * bands : size;
        Drop(dataset.RasterIO(GF_Read, part.x, part.y, part.width, part.height, pixels.data(),
                              part.width, part.height, type, bands, list.data(), pixel,
                              pixel * part.width, together ? size : size * part.width * part.height,
                              nullptr));
    }

    void ReadBlock(GDALRasterBand& band) {
        int width = 0, height = 0;
        band.GetBlockSize(&width, &height);
        std::vector<unsigned char> block(
            static_cast<std::size_t>(width) * static_cast<std::size_t>(height) *
            static_cast<std::size_t>(GDALGetDataTypeSizeBytes(band.GetRasterDataType())));
        const int columns = (band.GetXSize() - 1) / width, rows = (band.GetYSize() - 1) / height;
        const auto one = [&](int last) {
            return static_cast<int>(script.UpTo(static_cast<std::uint32_t>(last)));
        };
        const int column = one(columns);
        Drop(band.ReadBlock(column, one(rows), block.data()));
    }

    void AskForRecords(GDALRasterBand& band) {
        double low = 0, high = 0, mean = 0, deviation = 0;
        const int force = IsSmall(band) && script.Flag() ? TRUE : FALSE;
        static_cast<void>(band.GetStatistics(FALSE, force, &low, &high, &mean, &deviation));
        int buckets = 0;
        GUIntBig* counts = nullptr;
        static_cast<void>(
            band.GetDefaultHistogram(&low, &high, &buckets, &counts, force, nullptr, nullptr));
        CPLFree(counts);
        if (const GDALColorTable* const table = band.GetColorTable())
            ZMC_EXPECT(table->GetColorEntryCount() <= 65536);
        static_cast<void>(band.GetColorInterpretation());
        static_cast<void>(band.GetMinimum() + band.GetMaximum());
    }

    void AskForMetadata(GDALRasterBand& band) {
        const CPLStringList domains(band.GetMetadataDomainList());
        for (int i = 0; i < domains.Count(); ++i) static_cast<void>(band.GetMetadata(domains[i]));
        static_cast<void>(band.GetMetadataItem("STATISTICS_MEAN"));
        const CPLStringList own(dataset.GetMetadataDomainList());
        for (int i = 0; i < own.Count(); ++i) static_cast<void>(dataset.GetMetadata(own[i]));
        static_cast<void>(band.GetNoDataValue());
        static_cast<void>(band.GetMaskFlags());
    }

    void StoreStatistics(GDALRasterBand& band) {
        const double low = script.Byte(), high = script.Word();
        static_cast<void>(band.SetStatistics(low, high, script.Byte() - 7.5, script.Byte()));
    }
    void StoreHistogram(GDALRasterBand& band) {
        std::vector<GUIntBig> counts(1 + script.UpTo(300), script.Word());
        static_cast<void>(band.SetDefaultHistogram(-0.5, static_cast<double>(script.Word()),
                                                   static_cast<int>(counts.size()), counts.data()));
    }
    void StoreColors(GDALRasterBand& band) {
        GDALColorTable table;
        const auto part = [&] { return static_cast<short>(script.Byte() * 3 - 100); };
        for (std::uint32_t i = script.UpTo(20); i-- != 0;) {
            const GDALColorEntry entry{part(), part(), part(), part()};
            table.SetColorEntry(static_cast<int>(i), &entry);
        }
        static_cast<void>(band.SetColorTable(script.Flag() ? &table : nullptr));
    }
    void Write(GDALRasterBand& band) {
        const Part part = TakePart(band.GetXSize(), band.GetYSize());
        std::vector<unsigned char> pixels(
            static_cast<std::size_t>(part.width) * static_cast<std::size_t>(part.height),
            script.Byte());
        Drop(band.RasterIO(GF_Write, part.x, part.y, part.width, part.height, pixels.data(),
                           part.width, part.height, GDT_Byte, 0, 0, nullptr));
    }
    void SetNoData(GDALRasterBand& band) {
        static_cast<void>(band.SetNoDataValue(script.Byte() - 3.0));
    }
    void RenewLevels() {
        if (!IsSmall(*dataset.GetRasterBand(1))) return;
        static constexpr const char* kMethods[] = {"NEAREST", "AVERAGE", "MODE", "CUBIC", "X"};
        const int factors[] = {1 << script.UpTo(30), static_cast<int>(script.Word())};
        static_cast<void>(dataset.BuildOverviews(script.OneOf(kMethods), script.Flag() ? 2 : 1,
                                                 factors, 0, nullptr, nullptr, nullptr));
    }
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    zmcfuzz::StartGdal();
    zmcfuzz::FileAndScript input = zmcfuzz::FileAndScript::Take(data, size);
    const std::string sidecar = input.TakeSecond();
    const auto header = zmcfuzz::HeaderIn(input.file);
    if (header && !zmcfuzz::IsAffordable(*header)) return 0;
    Put(kName, input.file);
    if (sidecar.empty())
        VSIUnlink(kSidecar);
    else
        Put(kSidecar, sidecar);
    // A write behind the end of a file in memory takes all the memory up to there.
    const bool mayGrow = header && header->tileDataEnd <= kMostFile;
    const unsigned update = input.script.Flag() && mayGrow ? unsigned{GDAL_OF_UPDATE} : 0u;
    const std::unique_ptr<GDALDataset> dataset(GDALDataset::Open(kName, GDAL_OF_RASTER | update));
    if (!dataset) return 0;
    ZMC_EXPECT(header && dataset->GetRasterXSize() > 0 && dataset->GetRasterYSize() > 0);
    ZMC_EXPECT(dataset->GetRasterCount() == static_cast<int>(header->bandCount));
    Session(*dataset, input.script).Run();
    return 0;
}
