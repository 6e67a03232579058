// Stores that keep copies of the metadata document, by a host and by the driver, on a disk that
// loses power: the old document or the new one comes back, and no pixel changes.
#include <gdal_priv.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>

#include "host/journal/MetadataJournal.h"
#include "host/raster/Raster.h"
#include "tests/campaigns/PowerTrial.h"
#include "tests/campaigns/Silence.h"
#include "tests/gdal/GdalTest.h"
#include "tests/support/CampaignLength.h"
#include "tests/support/ChildProcess.h"
#include "tests/support/MemorySource.h"

namespace zmctest {
namespace {

using zmchost::Access;
using zmchost::Raster;
using Pixel = unsigned char;

constexpr std::uint32_t kWidth = 64, kHeight = 48;
constexpr std::uint32_t kBins = 1200;  // so that the document has some pages

std::string Trimmed(std::string text) {
    while (text.ends_with('\n')) text.pop_back();
    return text;
}

void StoreStatistics(Raster& raster) {
    zelm::RasterBandStats<Pixel> record;
    record.flags = zelm::StatsFlag::Mean;
    record.mean = 7;
    raster.SetStatistics<Pixel>({record});
}

void StoreHistogram(Raster& raster) {
    zelm::RasterBandHistogram<Pixel> histogram;
    histogram.binCount = kBins;
    for (std::uint32_t bin = 0; bin < kBins; ++bin)
        if (!histogram.counts.Append(std::uint64_t{bin} * 37)) throw std::bad_alloc();
    raster.SetHistograms<Pixel>({histogram});
}

void StorePalette(Raster& raster) {
    zelm::Palette palette;
    Pixel channels[4] = {1, 2, 3, 4};
    palette.AddColor(zelm::RGBAColor(zelm::Array<Pixel>(channels, zelm::ArrayShape(4))));
    raster.SetBandPalette(0, palette);
}

class PowerLossInStores : public GdalTest {
protected:
    PowerLossInStores() {
        const MemorySource<Pixel> source(kWidth, kHeight, 1);
        Raster raster = Raster::Create(Module(), file, source.props, 0);
        raster.Write<Pixel>(0, {0, 0, kWidth, kHeight}, std::vector<Pixel>(kWidth * kHeight, 7));
        front = raster.Header().tileDataEnd;
        pixels = ReadText(file);
        pixels.resize(front);
        documents.push_back("");
    }

    static zmchost::ModulePtr Module() {
        static const zmchost::ModulePtr module = TestModule();
        return module;
    }
    std::string Document() const {
        const std::string bytes = ReadText(file);
        return bytes.size() > front ? Trimmed(bytes.substr(front)) : "";
    }
    // The document as it is becomes one of those that may be found.
    void Remember() { documents.push_back(Document()); }
    bool IsKnown(const std::string& document) const {
        return std::find(documents.begin(), documents.end(), document) != documents.end();
    }

    // The documents of stores, one behind the other; then the same on record.
    void Record(const std::function<void()>& before,
                const std::vector<std::function<void()>>& stores) {
        before();
        documents = {Document()};
        const std::string start = ReadText(file);
        for (const auto& store : stores) {
            store();
            Remember();
        }
        WriteText(file, start);
        trial.Record([&] {
            for (const auto& store : stores) store();
        });
        ASSERT_EQ(Document(), documents.back());
        ASSERT_FALSE(std::filesystem::exists(copy));
    }
    static std::function<void()> ByHost(const std::string& name, void (*store)(Raster&)) {
        return [=] {
            Raster raster = Raster::Open(Module(), name);
            raster.KeepCopies(true);
            store(raster);
        };
    }

    std::string Judge(const DiskState& state) {
        if (ReadText(file).substr(0, front) != pixels) return "pixels changed";
        const bool known = IsKnown(Document());
        {
            const Raster raster = Raster::Open(Module(), file, Access::Read);
            if (!known && raster.RecoveryNote().empty()) return "who reads is told of nothing";
        }
        if (++looked % commandEvery == 0)
            if (const std::string complaint = JudgeByCommands(); !complaint.empty())
                return complaint;
        PutInOrder();
        if (std::filesystem::exists(copy)) return "the copy stays";
        if (ReadText(file).substr(0, front) != pixels) return "pixels changed as it was recovered";
        if (!IsKnown(Document())) return "the document is none of those that were stored";
        if (state.atEnd && Document() != documents.back()) return "what was stored is gone";
        if (looked % 16 == 0) ByHost(file, StorePalette)();
        return "";
    }

    // By whoever opens for update.
    virtual void PutInOrder() { Raster::Open(Module(), file); }

    // They say what they find, change nothing before they are to, and then all is well.
    std::string JudgeByCommands() const {
        for (const char* const command : {"info", "verify", "recover", "verify"}) {
            const bool mustDoWell = std::string(command) == "recover" || IsKnown(Document());
            const ChildResult result =
                RunChild({ZMC_PROGRAM_PATH, command, file}, {"ZMCRASTER_MODULE=" ZMC_MODULE_PATH});
            const bool told = result.status > 0 && !(result.err + result.out).empty();
            if (result.status != 0 && (mustDoWell || !told))
                return std::string(command) + " ends with " + std::to_string(result.status) + ": " +
                       result.err;
        }
        return "";
    }

    void Expect(const char* what) {
        const auto judge = [this](const DiskState& state) { return Judge(state); };
        ASSERT_EQ(trial.Try(judge), "");
        ReportPower(what, trial.Figures());
    }

    const Silence silence;
    PowerTrial trial;
    std::string file = trial / "scene.pyr", copy = trial / "scene.pyr.zmcmeta";
    std::uint64_t front = 0;
    std::string pixels;
    std::vector<std::string> documents;  // in the order of their stores
    std::size_t looked = 0, commandEvery = CampaignLength<std::size_t>(25, 40);
};

TEST_F(PowerLossInStores, FirstDocuments) {
    Record([] {}, {ByHost(file, StoreStatistics)});
    Expect("the first store of a host");
}

TEST_F(PowerLossInStores, OfAHost) {
    Record(
        [&] { ByHost(file, StoreHistogram)(); },
        {ByHost(file, StoreStatistics), ByHost(file, StoreHistogram), ByHost(file, StorePalette)});
    Expect("three stores of a host");
}

TEST_F(PowerLossInStores, FlushesThatAreLeftOutAreMissed) {
    Record([&] { ByHost(file, StoreHistogram)(); }, {ByHost(file, StoreStatistics)});
    commandEvery = ~std::size_t{0};
    const auto judge = [this](const DiskState& state) { return Judge(state); };
    EXPECT_TRUE(trial.FailsWithoutFlushes(judge));
    trial.ReportNeededFlushes("a store", judge);
}

// Of what was found in the middle of a store the recovery loses power too.
TEST_F(PowerLossInStores, RecoveriesOfAHost) {
    Record([&] { ByHost(file, StoreHistogram)(); }, {ByHost(file, StoreStatistics)});
    std::vector<DiskState> damaged;
    ASSERT_EQ(trial.Try([&](const DiskState& state) {
        if (state.names.count("scene.pyr.zmcmeta") != 0 && !IsKnown(Document()))
            damaged.push_back(state);
        return "";
    }),
              "");
    ASSERT_FALSE(damaged.empty());
    documents.resize(1);
    commandEvery = ~std::size_t{0};
    const std::size_t step =
        std::max<std::size_t>(1, damaged.size() / CampaignLength<std::size_t>(3, 40));
    DiskFigures sum;
    for (std::size_t i = 0; i < damaged.size(); i += step) {
        trial.Put(damaged[i]);
        trial.Record([&] { zmchost::RecoverMetadata(file); });
        ASSERT_EQ(trial.Try([this](const DiskState& state) { return Judge(state); }), "");
        sum.changes += trial.Figures().changes;
        sum.flushes += trial.Figures().flushes;
        sum.made += trial.Figures().made;
        sum.different += trial.Figures().different;
    }
    ReportPower("recoveries of stores", sum);
}

class PowerLossInTheDriver : public PowerLossInStores {
protected:
    static DatasetPtr OpenForUpdate(const std::string& name) {
        const char* const options[] = {"KEEP_COPIES=YES", nullptr};
        return DatasetPtr(GDALDataset::Open(name.c_str(), GDAL_OF_RASTER | GDAL_OF_UPDATE, nullptr,
                                            options, nullptr));
    }
    static void Store(const std::string& name, bool histogram) {
        const DatasetPtr dataset = OpenForUpdate(name);
        if (!dataset) throw std::runtime_error(CPLGetLastErrorMsg());
        GDALRasterBand& band = *dataset->GetRasterBand(1);
        GUIntBig counts[256] = {};
        counts[7] = kWidth * kHeight;
        const CPLErr result = histogram ? band.SetDefaultHistogram(-0.5, 255.5, 256, counts)
                                        : band.SetStatistics(7, 7, 7, 0);
        if (result != CE_None) throw std::runtime_error(CPLGetLastErrorMsg());
    }
    void PutInOrder() override {
        const DatasetPtr dataset = OpenForUpdate(file);
        if (!dataset) throw std::runtime_error(CPLGetLastErrorMsg());
        Pixel row[kWidth] = {};
        const CPLErr read = dataset->GetRasterBand(1)->RasterIO(
            GF_Read, 0, kHeight - 1, kWidth, 1, row, kWidth, 1, GDT_Byte, 0, 0, nullptr);
        if (read != CE_None || row[kWidth - 1] != 7) throw std::runtime_error("pixels do not read");
    }
};

TEST_F(PowerLossInTheDriver, Stores) {
    Record([&] { Store(file, true); }, {[&] { Store(file, false); }, [&] { Store(file, true); }});
    Expect("two stores of the driver");
}

}  // namespace
}  // namespace zmctest
