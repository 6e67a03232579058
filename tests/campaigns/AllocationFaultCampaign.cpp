// Every allocation of a host's work fails in turn, once and from then on: of the module, of the
// parser under it, and of the host's library.
#include <gtest/gtest.h>

#include <cstdio>
#include <filesystem>
#include <functional>
#include <map>
#include <new>

#include "tests/campaigns/BuildSession.h"
#include "tests/campaigns/HostSession.h"
#include "tests/campaigns/Silence.h"
#include "tests/support/AllocationFaults.h"
#include "tests/support/CampaignLength.h"

namespace zmctest {
namespace {

class AllocationFaultCampaign : public testing::TestWithParam<Layout> {
protected:
    AllocationFaultCampaign() : session(GetParam()) {}

    // Runs `work` with each `stride`-th allocation failing, and `judge()` after each run, which
    // gives a complaint or "". In the short form the first point is another one for each mode.
    void FailEach(std::size_t shortStride, const std::function<void()>& prepare,
                  const std::function<void()>& work, const std::function<std::string()>& judge) {
        const std::size_t stride = zmctest::CampaignLength<std::size_t>(shortStride, 1);
        for (const FaultMode mode : {FaultMode::Once, FaultMode::FromThenOn})
            for (std::size_t n = mode == FaultMode::Once ? 1 : 1 + stride / 2;; n += stride) {
                prepare();
                const std::size_t descriptors = OpenDescriptors();
                AllocationFaults faults(n, mode, FaultScope::Process);
                try {
                    work();
                } catch (const std::bad_alloc&) {  // of the host's own memory
                }
                faults.Disarm();
                if (faults.Failed() == 0) break;
                ++points;
                const std::string complaint = judge();
                const char* const when = mode == FaultMode::Once ? "" : " and all that follow";
                ASSERT_EQ(complaint, "") << "allocation " << n << when;
                ASSERT_EQ(session.TakeThrows(), 0u) << "allocation " << n << when;
                ASSERT_EQ(OpenDescriptors(), descriptors) << "allocation " << n << when;
            }
    }

    void Report(const char* what) const {
        std::printf("campaign: %s, %s: %zu points of failure: %s\n", what, GetParam().name, points,
                    Figures(outcomes).c_str());
    }

    const Silence silence;
    HostSession session;
    std::size_t points = 0;
    std::map<std::string, std::size_t> outcomes;
};

TEST_P(AllocationFaultCampaign, UpdatesOfFiles) {
    ASSERT_NO_FATAL_FAILURE(FailEach(
        11, [&] { session.Put(session.OldFile()); }, [&] { session.Update(); },
        [&]() -> std::string {
            std::string outcome;
            const std::string fault = session.FaultAfterUpdate(outcome);
            ++outcomes[outcome];
            return fault.empty() && outcome == "damaged" ? "the document was torn" : fault;
        }));
    Report("allocations of an update");
}

TEST_P(AllocationFaultCampaign, NewFiles) {
    ASSERT_NO_FATAL_FAILURE(FailEach(
        11, [&] { std::filesystem::remove(session.Path()); }, [&] { session.Create(); },
        [&] {
            std::string outcome;
            const std::string fault = session.FaultAfterCreate(outcome);
            ++outcomes[outcome];
            return fault;
        }));
    Report("allocations of a new file");
}

TEST_P(AllocationFaultCampaign, DeletedFiles) {
    ASSERT_NO_FATAL_FAILURE(FailEach(
        3, [&] { session.Put(session.OldFile()); }, [&] { session.Delete(); },
        [&]() -> std::string {
            const bool kept = std::filesystem::exists(session.Path());
            ++outcomes[kept ? "kept" : "deleted"];
            return !kept || session.Take() == session.OldFile() ? "" : "the file was changed";
        }));
    Report("allocations of a deletion");
}

// On one thread: what the scheduler's library does with its other threads when its own memory fails
// is its own matter, and it may wait for them for ever.
class BuildAllocationCampaign : public AllocationFaultCampaign {};

TEST_P(BuildAllocationCampaign, Builds) {
    BuildSession build(session.Folder(), GetParam());
    for (const bool withOld : {false, true})
        ASSERT_NO_FATAL_FAILURE(FailEach(
            97, [&] { build.Prepare(withOld); }, [&] { build.Build(); },
            [&]() -> std::string {
                std::string outcome;
                const std::string fault = build.FaultOfBuild(outcome);
                ++outcomes[outcome];
                if (!fault.empty()) return fault;
                return build.Leavings() != 0 ? "temporary files stay" : "";
            }));
    Report("allocations of a build");
}

std::string NameOf(const testing::TestParamInfo<Layout>& info) { return info.param.name; }
INSTANTIATE_TEST_SUITE_P(Layouts, AllocationFaultCampaign, testing::ValuesIn(kLayouts), NameOf);
INSTANTIATE_TEST_SUITE_P(Layouts, BuildAllocationCampaign, testing::ValuesIn(kLayouts), NameOf);

}  // namespace
}  // namespace zmctest
