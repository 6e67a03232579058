// Builds on a disk that loses power: no file, the old one or the whole new one.
#include <gtest/gtest.h>

#include <stdexcept>

#include "tests/campaigns/BuildSession.h"
#include "tests/campaigns/PowerTrial.h"
#include "tests/campaigns/Silence.h"
#include "tests/support/CampaignLength.h"

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
        EXPECT_TRUE(trial.FailsWithoutFlushes(judge));
        if (IsFullCampaign()) trial.ReportNeededFlushes("a build", judge);
    }
}

std::string NameOf(const testing::TestParamInfo<Layout>& info) { return info.param.name; }
INSTANTIATE_TEST_SUITE_P(Layouts, PowerLossInBuilds, testing::ValuesIn(kLayouts), NameOf);

}  // namespace
}  // namespace zmctest
