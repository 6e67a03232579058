// Every file operation of a host's work fails in turn, in every way a disk can fail; and the
// process ends at every write, before it and in the middle of it.
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <filesystem>
#include <functional>

#include "tests/campaigns/BuildSession.h"
#include "tests/campaigns/HostSession.h"
#include "tests/campaigns/Silence.h"
#include "tests/support/CampaignLength.h"
#include "tests/support/FileFaults.h"
#include "tests/support/Sanitizers.h"

namespace zmctest {
namespace {

struct Failing {
    const char* name;
    FileFaultAction action;
    int error;
    bool fromThenOn;
    bool harmless;  // to be got over: the result is as if nothing had happened
    unsigned calls = zmctest::kAnyCall;
};

// A call that a signal interrupts is made again, and no signal interrupts for ever.
constexpr unsigned kInterruptible = zmctest::kOpenCall | zmctest::kReadCall | zmctest::kWriteCall |
                                    zmctest::kResizeCall | zmctest::kSyncCall;
constexpr Failing kFailings[] = {
    {"EIO once", FileFaultAction::Error, EIO, false, false},
    {"EIO from then on", FileFaultAction::Error, EIO, true, false},
    {"ENOSPC once", FileFaultAction::Error, ENOSPC, false, false},
    {"ENOSPC from then on", FileFaultAction::Error, ENOSPC, true, false},
    {"EINTR once", FileFaultAction::Error, EINTR, false, true, kInterruptible},
    {"short count once", FileFaultAction::Short, 0, false, true},
    {"short counts from then on", FileFaultAction::Short, 0, true, true},
    {"no count once", FileFaultAction::Nothing, 0, false, false},
    {"no counts from then on", FileFaultAction::Nothing, 0, true, false},
};

class FileFaultCampaign : public testing::TestWithParam<Layout> {
protected:
    FileFaultCampaign() : session(GetParam()) {}

    // The short form leaves calls out, above all of the files whose bands lie apart, which take
    // many times as many.
    static std::size_t Stride(std::size_t shortForm = 1) {
        std::size_t times = GetParam().bands > 8 ? 7 : 1;
        if (GetParam().lent) times *= 5;
        times *= zmctest::WithSanitizers<std::size_t>(3, 1);
        return zmctest::CampaignLength<std::size_t>(shortForm * times, 1);
    }

    // Runs `work` with each `stride`-th call of `failing` going wrong, and `judge(name)` after each
    // run, which gives a complaint or "".
    void FailEach(const Failing& failing, std::size_t stride, const std::function<void()>& prepare,
                  const std::function<void()>& work,
                  const std::function<std::string(bool harmless)>& judge) {
        for (std::size_t n = 1;; n += stride) {
            prepare();
            const std::size_t descriptors = OpenDescriptors();
            bool met = false;
            {
                FileFaults faults({session.Folder(), failing.calls, n, failing.fromThenOn,
                                   failing.action, failing.error});
                work();
                faults.Disarm();
                met = faults.Failed() != 0;
                failedKinds = faults.FailedKinds();
            }
            if (!met) break;
            ++points;
            const std::string complaint = judge(failing.harmless);
            ASSERT_EQ(complaint, "") << failing.name << ", call " << n;
            ASSERT_EQ(OpenDescriptors(), descriptors) << failing.name << ", call " << n;
        }
    }

    // The same with the process ending, at each changing call.
    void KillAtEach(FileFaultAction action, const std::function<void()>& prepare,
                    const std::function<void()>& work, const std::function<std::string()>& judge) {
        for (std::size_t n = 1;; n += Stride()) {
            prepare();
            const pid_t child = fork();
            if (child == 0) {
                FileFaults faults({session.Folder(), zmctest::kChangingCall, n, false, action, 0});
                work();
                _exit(0);
            }
            int status = 0;
            ASSERT_EQ(waitpid(child, &status, 0), child);
            if (WIFEXITED(status)) {
                ASSERT_EQ(WEXITSTATUS(status), 0);
                break;
            }
            ASSERT_EQ(WTERMSIG(status), SIGKILL) << "write " << n;
            ++points;
            const std::string complaint = judge();
            ASSERT_EQ(complaint, "") << "ended at write " << n;
        }
    }

    void Report(const char* what) const {
        std::printf("campaign: %s, %s: %zu points of failure: %s\n", what, GetParam().name, points,
                    Figures(outcomes).c_str());
    }

    std::string JudgeUpdate(bool harmless) {
        std::string outcome;
        const std::string fault = session.FaultAfterUpdate(outcome);
        ++outcomes[outcome];
        if (!fault.empty()) return fault;
        return harmless && session.Take() != session.NewFile() ? "it was not got over" : "";
    }

    const Silence silence;
    HostSession session;
    std::size_t points = 0;
    unsigned failedKinds = 0;
    std::map<std::string, std::size_t> outcomes;
};

TEST_P(FileFaultCampaign, UpdatesOfFiles) {
    for (const Failing& failing : kFailings)
        ASSERT_NO_FATAL_FAILURE(FailEach(
            failing, Stride(), [&] { session.Put(session.OldFile()); }, [&] { session.Update(); },
            [&](bool harmless) { return JudgeUpdate(harmless); }));
    Report("file calls of an update");
}

TEST_P(FileFaultCampaign, NewFiles) {
    for (const Failing& failing : kFailings)
        ASSERT_NO_FATAL_FAILURE(FailEach(
            failing, Stride(), [&] { std::filesystem::remove(session.Path()); },
            [&] { session.Create(); },
            [&](bool harmless) -> std::string {
                std::string outcome;
                const std::string fault = session.FaultAfterCreate(outcome);
                ++outcomes[outcome];
                if (!fault.empty()) return fault;
                return harmless && outcome != "complete" ? "it was not got over" : "";
            }));
    Report("file calls of a new file");
}

TEST_P(FileFaultCampaign, DeletedFiles) {
    for (const Failing& failing : kFailings)
        ASSERT_NO_FATAL_FAILURE(FailEach(
            failing, Stride(), [&] { session.Put(session.OldFile()); }, [&] { session.Delete(); },
            [&](bool harmless) -> std::string {
                if (!std::filesystem::exists(session.Path())) {
                    ++outcomes["deleted"];
                    return "";
                }
                ++outcomes["kept"];
                if (harmless) return "it was not got over";
                return session.Take() == session.OldFile() ? "" : "the file was changed";
            }));
    Report("file calls of a deletion");
}

TEST_P(FileFaultCampaign, ProcessesThatEndInUpdates) {
    for (const FileFaultAction action : {FileFaultAction::Kill, FileFaultAction::KillPartway})
        ASSERT_NO_FATAL_FAILURE(KillAtEach(
            action, [&] { session.Put(session.OldFile()); }, [&] { session.Update(); },
            [&] { return JudgeUpdate(false); }));
    Report("ends of the process in an update");
}

TEST_P(FileFaultCampaign, ProcessesThatEndInNewFiles) {
    for (const FileFaultAction action : {FileFaultAction::Kill, FileFaultAction::KillPartway})
        ASSERT_NO_FATAL_FAILURE(KillAtEach(
            action, [&] { std::filesystem::remove(session.Path()); }, [&] { session.Create(); },
            [&] {
                std::string outcome;
                const std::string fault = session.FaultAfterCreate(outcome);
                ++outcomes[outcome];
                return fault;
            }));
    Report("ends of the process in a new file");
}

class BuildFaultCampaign : public FileFaultCampaign {
protected:
    BuildSession build{session.Folder(), GetParam()};
};

TEST_P(BuildFaultCampaign, Builds) {
    for (const bool withOld : {false, true})
        for (const Failing& failing : kFailings) {
            ASSERT_NO_FATAL_FAILURE(FailEach(
                failing, Stride(7), [&] { build.Prepare(withOld); }, [&] { build.Build(); },
                [&](bool harmless) -> std::string {
                    std::string outcome;
                    const std::string fault = build.FaultOfBuild(outcome);
                    ++outcomes[outcome];
                    if (!fault.empty()) return fault;
                    if (harmless && !build.Failure().empty())
                        return "it was not got over: " + build.Failure();
                    const bool removable = (failedKinds & zmctest::kRemoveCall) == 0;
                    return removable && build.Leavings() != 0 ? "temporary files stay" : "";
                }));
        }
    Report("file calls of a build");
}

TEST_P(BuildFaultCampaign, ProcessesThatEndInBuilds) {
    std::size_t cleaned = 0;
    for (const bool withOld : {false, true})
        for (const FileFaultAction action : {FileFaultAction::Kill, FileFaultAction::KillPartway}) {
            if (!zmctest::IsFullCampaign() && withOld && action == FileFaultAction::Kill) continue;
            ASSERT_NO_FATAL_FAILURE(KillAtEach(
                action, [&] { build.Prepare(withOld); }, [&] { build.Build(); },
                [&]() -> std::string {
                    std::string outcome;
                    const std::string fault = build.FaultOfTarget(outcome);
                    ++outcomes[outcome];
                    if (!fault.empty() || points % 8 != 0) return fault;
                    ++cleaned;
                    build.Build();
                    if (!build.Failure().empty()) return "the next build fails: " + build.Failure();
                    return build.Leavings() == 0 ? ""
                                                 : "the next build leaves the last one's files";
                }));
        }
    EXPECT_GT(cleaned, 0u);
    Report("ends of the process in a build");
}

std::string NameOf(const testing::TestParamInfo<Layout>& info) { return info.param.name; }
INSTANTIATE_TEST_SUITE_P(Layouts, FileFaultCampaign, testing::ValuesIn(kLayouts), NameOf);
INSTANTIATE_TEST_SUITE_P(Lent, FileFaultCampaign, testing::ValuesIn(kLentLayouts), NameOf);
INSTANTIATE_TEST_SUITE_P(Layouts, BuildFaultCampaign, testing::ValuesIn(kLayouts), NameOf);

}  // namespace
}  // namespace zmctest
