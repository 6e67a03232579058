// The commands that make pyramids with a sidecar and a mask beside them, on a disk that loses
// power: the driver sees the old pyramid with the old ones or the new one with the new ones.
#include <gdal_alg.h>
#include <gdal_priv.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <string>
#include <vector>

#include "host/journal/UpdateJournal.h"
#include "tests/campaigns/PowerTrial.h"
#include "tests/campaigns/Silence.h"
#include "tests/gdal/GdalTest.h"
#include "tests/support/ChildProcess.h"
#include "tests/support/Sanitizers.h"

namespace zmctest {
namespace {

class PowerLossInCommands : public GdalTest {
protected:
    // The raster of that number, which its samples, its mask and its metadata tell.
    void MakeSource(int number) const {
        const DatasetPtr dataset(
            Driver("GTiff").Create(source.c_str(), kSide, kSide, 1, GDT_Byte, nullptr));
        dataset->GetRasterBand(1)->Fill(number);
        dataset->SetMetadataItem("NUMBER", std::to_string(number).c_str());
        dataset->CreateMaskBand(GMF_PER_DATASET);
        GDALRasterBand& mask = *dataset->GetRasterBand(1)->GetMaskBand();
        mask.Fill(255);
        std::vector<unsigned char> hidden(static_cast<std::size_t>(number) * 4, 0);
        ASSERT_EQ(mask.RasterIO(GF_Write, 0, 0, number, 4, hidden.data(), number, 4, GDT_Byte, 0, 0,
                                nullptr),
                  CE_None);
    }
    std::vector<std::string> Build() const {
        return {ZMC_PROGRAM_PATH, "build",   source,      file,
                "--overwrite",    "--quiet", "--threads", "1"};
    }
    std::vector<std::string> Update() const {
        return {ZMC_PROGRAM_PATH, "update",  file,        source, "--changed",
                "0,0,300,300",    "--quiet", "--threads", "1"};
    }
    // The pyramid of the first raster; `command` on record makes that of the second.
    void Record(const std::vector<std::string>& command) {
        MakeSource(3);
        ASSERT_EQ(RunChild(Build()).status, 0);
        before = Seen();
        MakeSource(5);
        trial.Record(command);
        after = Seen();
        ASSERT_NE(before, after);
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
    std::string JudgeSeen(const std::string& seen, const DiskState& state) const {
        if (seen != before && seen != after)
            return "there is seen " + seen + ", not " + before + " or " + after;
        return state.atEnd && seen != after ? "what was made is gone" : "";
    }
    void Expect(const PowerTrial::Judge& judge, const char* what) {
        ASSERT_EQ(trial.Try(judge), "");
        ReportPower(what, trial.Figures());
        EXPECT_TRUE(trial.FailsWithoutFlushes(judge));
    }

    static constexpr int kSide = 300;
    const Silence silence;
    PowerTrial trial;
    const std::string source = folder / "source.tif", file = trial / "made.pyr";
    std::string before, after;
};

constexpr const char* kPreloaded = "a sanitizer's library would have to be loaded first";

TEST_F(PowerLossInCommands, BuildsWithSidecarAndMask) {
    if (IsSanitized()) GTEST_SKIP() << kPreloaded;
    Record(Build());
    Expect(
        [this](const DiskState& state) -> std::string {
            const std::string seen = Seen(), complaint = JudgeSeen(seen, state);
            if (!complaint.empty()) return complaint;
            return Seen(GDAL_OF_UPDATE) == seen ? "" : "who opens for update sees another";
        },
        "a build of the command with sidecar and mask");
}

TEST_F(PowerLossInCommands, UpdatesWithSidecarAndMask) {
    if (IsSanitized()) GTEST_SKIP() << kPreloaded;
    Record(Update());
    Expect(
        [this](const DiskState& state) -> std::string {
            if (Seen().starts_with("nothing")) return "it does not open";
            Seen(GDAL_OF_UPDATE);
            if (std::filesystem::exists(zmchost::UpdateJournal::PathFor(file)))
                return "the journal stays";
            return JudgeSeen(Seen(), state);
        },
        "an update of the command with sidecar and mask");
}

}  // namespace
}  // namespace zmctest
