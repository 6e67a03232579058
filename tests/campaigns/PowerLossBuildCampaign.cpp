// Builds on a disk that loses power: no file, the old one or the whole new one, with what stands
// beside it.
#include <gdal_alg.h>
#include <gdal_priv.h>
#include <gtest/gtest.h>

#include <filesystem>

#include "tests/campaigns/BuildSession.h"
#include "tests/campaigns/PowerTrial.h"
#include "tests/campaigns/Silence.h"
#include "tests/gdal/GdalTest.h"
#include "tests/support/ChildProcess.h"
#include "tests/support/Sanitizers.h"

namespace zmctest {
namespace {

class PowerLossInBuilds : public testing::TestWithParam<Layout> {
protected:
    void Record(bool withOld) {
        build.Prepare(withOld);
        hadOld = withOld;
        trial.Record([this] {
            build.Build();
            if (!build.Failure().empty()) throw std::runtime_error(build.Failure());
        });
    }
    std::string Judge(const DiskState& state) {
        std::string outcome;
        const std::string fault = build.FaultOfTarget(outcome);
        if (!fault.empty()) return fault;
        if (outcome == "absent" && hadOld) return "the old file is gone";
        if (state.atEnd && outcome != "new") return "what was built is gone";
        if (++looked % 64 != 0) return "";
        build.Build();
        if (!build.Failure().empty()) return "the next build fails: " + build.Failure();
        return build.Leavings() == 0 ? "" : "the next build leaves the last one's files";
    }

    const Silence silence;
    PowerTrial trial;
    BuildSession build{trial.Folder(), GetParam()};
    bool hadOld = false;
    std::size_t looked = 0;
};

TEST_P(PowerLossInBuilds, OfAHost) {
    for (const bool withOld : {false, true}) {
        Record(withOld);
        const auto judge = [this](const DiskState& state) { return Judge(state); };
        ASSERT_EQ(trial.Try(judge), "");
        ReportPower(withOld ? "a build in place of a file" : "a build", trial.Figures());
        const std::size_t flushes = trial.Figures().flushes;
        EXPECT_TRUE(trial.FailsWithoutFlushes(judge));
        std::printf("campaign: flushes of a build: %zu of %zu are shown to be needed\n",
                    trial.NeededFlushes(judge), flushes);
    }
}

std::string NameOf(const testing::TestParamInfo<Layout>& info) { return info.param.name; }
INSTANTIATE_TEST_SUITE_P(Layouts, PowerLossInBuilds, testing::ValuesIn(kLayouts), NameOf);

// Builds of the command, which leave a sidecar and a mask beside the pyramid.
class PowerLossInCommands : public GdalTest {
protected:
    // The raster of that number, which its samples, its mask and its metadata tell.
    void MakeSource(int number) const {
        const DatasetPtr dataset(
            Driver("GTiff").Create(source.c_str(), kSide, kSide, 1, GDT_Byte, nullptr));
        dataset->GetRasterBand(1)->Fill(number);
        dataset->SetMetadataItem("NUMBER", std::to_string(number).c_str());
        dataset->CreateMaskBand(GMF_PER_DATASET);
        dataset->GetRasterBand(1)->GetMaskBand()->Fill(255);
        std::vector<unsigned char> hidden(static_cast<std::size_t>(number) * 4, 0);
        const CPLErr written = dataset->GetRasterBand(1)->GetMaskBand()->RasterIO(
            GF_Write, 0, 0, number, 4, hidden.data(), number, 4, GDT_Byte, 0, 0, nullptr);
        ASSERT_EQ(written, CE_None);
    }
    std::vector<std::string> Command() const {
        return {ZMC_PROGRAM_PATH, "build",   source,      file,
                "--overwrite",    "--quiet", "--threads", "1"};
    }
    // What is seen of the pyramid: samples, mask and metadata.
    std::string Seen(unsigned flags = 0) const {
        const DatasetPtr dataset = GdalTest::Open(file, flags);
        if (!dataset) return "nothing: " + std::string(CPLGetLastErrorMsg());
        GDALRasterBand& band = *dataset->GetRasterBand(1);
        const char* const number = dataset->GetMetadataItem("NUMBER");
        return std::to_string(GDALChecksumImage(&band, 0, 0, kSide, kSide)) + ' ' +
               std::to_string(GDALChecksumImage(band.GetMaskBand(), 0, 0, kSide, kSide)) + ' ' +
               (number ? number : "-");
    }
    std::string Judge(const DiskState& state) const {
        const std::string seen = Seen();
        if (seen != before && seen != after) return "there is seen " + seen;
        if (state.atEnd && seen != after) return "what was built is gone";
        return Seen(GDAL_OF_UPDATE) == seen ? "" : "who opens for update sees another";
    }

    static constexpr int kSide = 300;
    const Silence silence;
    PowerTrial trial;
    const std::string source = folder / "source.tif", file = trial / "made.pyr";
    std::string before, after;
};

TEST_F(PowerLossInCommands, BuildsWithSidecarAndMask) {
    if (IsSanitized()) GTEST_SKIP() << "a sanitizer's library has to be loaded first";
    for (const int number : {3, 5}) {
        MakeSource(number);
        before = after;
        number == 3 ? static_cast<void>(RunChild(Command())) : trial.Record(Command());
        after = Seen();
    }
    ASSERT_NE(before, after);
    const auto judge = [this](const DiskState& state) { return Judge(state); };
    ASSERT_EQ(trial.Try(judge), "") << "before " << before << ", after " << after;
    ReportPower("a build of the command with sidecar and mask", trial.Figures());
    EXPECT_TRUE(trial.FailsWithoutFlushes(judge));
}

}  // namespace
}  // namespace zmctest
