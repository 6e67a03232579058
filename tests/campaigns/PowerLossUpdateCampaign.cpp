// Updates of pyramids on a disk that loses power: the old file or the new one comes back, and
// pixels that are not being written never change.
#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>

#include "host/build/PyramidUpdate.h"
#include "host/file/PyramidRecords.h"
#include "host/journal/UpdateJournal.h"
#include "host/raster/Raster.h"
#include "tests/campaigns/PowerTrial.h"
#include "tests/campaigns/Silence.h"
#include "tests/support/CampaignLength.h"
#include "tests/support/ChildProcess.h"
#include "tests/support/MemorySource.h"

namespace zmctest {
namespace {

using zmchost::Access;
using zmchost::Raster;
using zmchost::Window;

class PowerLossInUpdates : public testing::Test {
protected:
    static constexpr std::uint32_t kWidth = 560, kHeight = 300;

    PowerLossInUpdates() {
        source.FillWithNoise(3);
        options.threads = 1;
        zmchost::PyramidBuilder(module).Build(source, file, options);
        Update().KeepRecords("");
        before = ReadText(file);
        tilesEnd = zmchost::PyramidHeader::Read(file).tileDataEnd;
        for (std::uint32_t y = window.y; y < window.Bottom(); ++y)
            std::fill_n(source.pixels.begin() + std::ptrdiff_t{y} * kWidth + window.x, window.width,
                        static_cast<unsigned char>(y));
    }

    zmchost::PyramidUpdate Update() { return {module, source, file, options}; }
    void Record() {
        trial.Record([this] { Update().Run({window}, {true, true, ""}); });
        after = ReadText(file);
        ASSERT_NE(before, after);
    }

    std::string Judge(const DiskState& state) {
        const std::string found = ReadText(file);
        if (const std::string complaint = JudgePixels(found); !complaint.empty()) return complaint;
        const bool whole = found == before || found == after;
        {
            const Raster raster = Raster::Open(module, file, Access::Read);
            if (!whole && raster.RecoveryNote().empty()) return "who reads is told of nothing";
        }
        if (++looked % commandEvery == 0)
            if (const std::string complaint = JudgeByCommands(whole); !complaint.empty())
                return complaint;
        Raster::Open(module, file);
        const std::string recovered = ReadText(file);
        if (recovered != before && recovered != after)
            return "it is neither the old nor the new one";
        if (state.atEnd && recovered != after) return "what was updated is gone";
        if (std::filesystem::exists(zmchost::UpdateJournal::PathFor(file)))
            return "the journal stays";
        return looked % 48 == 0 ? JudgeNextUpdate() : "";
    }
    // With the records that are left, where they are believed.
    std::string JudgeNextUpdate() {
        const bool records = HasRecords();
        withRecords += records ? 1 : 0;
        Update().Run({window}, {records, records, ""});
        if (ReadText(file) != after) return "the next update makes another file";
        const auto files = std::distance(std::filesystem::directory_iterator(trial.Folder()), {});
        return files == (records ? 2 : 1) ? "" : "the next update leaves the last one's files";
    }
    bool HasRecords() const {
        try {
            return zmchost::PyramidRecords::Find(file) != nullptr;
        } catch (const zmchost::Error&) {
            return false;
        }
    }
    std::string JudgePixels(const std::string& found) const {
        if (found.size() < tilesEnd) return "the file was cut";
        for (std::size_t i = 0; i < tilesEnd; ++i)
            if (found[i] != before[i] && found[i] != after[i])
                return "byte " + std::to_string(i) + " is neither the old nor the new one";
        return "";
    }
    std::string JudgeByCommands(bool whole) const {
        for (const char* const command : {"info", "recover", "verify"}) {
            const ChildResult result =
                RunChild({ZMC_PROGRAM_PATH, command, file}, {"ZMCRASTER_MODULE=" ZMC_MODULE_PATH});
            const bool told = result.status > 0 && !(result.err + result.out).empty();
            const bool mustDoWell = whole || std::string(command) != "info";
            if (result.status != 0 && (mustDoWell || !told))
                return std::string(command) + " ends with " + std::to_string(result.status) + ": " +
                       result.err;
        }
        return "";
    }

    const Silence silence;
    PowerTrial trial;
    const zmchost::ModulePtr module = TestModule();
    MemorySource<unsigned char> source{kWidth, kHeight, 1};
    zmchost::BuildOptions options;
    const std::string file = trial / "made.pyr";
    const Window window{250, 20, 30, 40};  // over the edge of a tile
    std::string before, after;
    std::uint64_t tilesEnd = 0;
    std::size_t looked = 0, withRecords = 0, commandEvery = CampaignLength<std::size_t>(150, 60);
};

TEST_F(PowerLossInUpdates, OfAHost) {
    Record();
    ASSERT_EQ(trial.Try([this](const DiskState& state) { return Judge(state); }), "");
    ReportPower("an update", trial.Figures());
    EXPECT_GT(withRecords, 0u) << "the statistics of records were not looked at";
}

TEST_F(PowerLossInUpdates, FlushesThatAreLeftOutAreMissed) {
    Record();
    commandEvery = ~std::size_t{0};
    const auto judge = [this](const DiskState& state) { return Judge(state); };
    EXPECT_TRUE(trial.FailsWithoutFlushes(judge));
    if (IsFullCampaign()) trial.ReportNeededFlushes("an update", judge);
}

TEST_F(PowerLossInUpdates, Recoveries) {
    Record();
    std::vector<DiskState> broken;
    const std::size_t most = CampaignLength<std::size_t>(2, 12);
    ASSERT_EQ(trial.Try([&](const DiskState& state) {
        const std::string found = ReadText(file);
        const bool whole = found == before || found == after;
        if (!whole && ++looked % 40 == 1 && broken.size() < most) broken.push_back(state);
        return "";
    }),
              "");
    ASSERT_EQ(broken.size(), most);
    commandEvery = ~std::size_t{0};
    DiskFigures sum;
    for (const DiskState& state : broken) {
        trial.Put(state);
        trial.Record([&] { zmchost::RecoverUpdate(file); });
        ASSERT_EQ(trial.Try([this](const DiskState& found) { return Judge(found); }), "");
        sum.changes += trial.Figures().changes;
        sum.flushes += trial.Figures().flushes;
        sum.made += trial.Figures().made;
        sum.different += trial.Figures().different;
    }
    ReportPower("recoveries of updates", sum);
}

}  // namespace
}  // namespace zmctest
