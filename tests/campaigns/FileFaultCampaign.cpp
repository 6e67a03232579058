// Every file operation of a host's work fails in turn, in every way a disk can fail; and the
// process ends at every write, before it and in the middle of it.
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <filesystem>
#include <functional>

#include "host/PyramidBuilder.h"
#include "tests/campaigns/HostSession.h"
#include "tests/concurrency/CampaignLength.h"
#include "tests/support/FileFaults.h"
#include "tests/support/MemorySource.h"

namespace campaigns {
namespace {

using testsupport::FileFault;
using testsupport::FileFaultAction;
using testsupport::FileFaults;

struct Failing {
    const char* name;
    FileFaultAction action;
    int error;
    bool fromThenOn;
    bool harmless;  // to be got over: the result is as if nothing had happened
    unsigned calls = testsupport::kAnyCall;
};

// A call that a signal interrupts is made again, and no signal interrupts for ever.
constexpr unsigned kInterruptible = testsupport::kOpenCall | testsupport::kReadCall |
                                    testsupport::kWriteCall | testsupport::kResizeCall |
                                    testsupport::kSyncCall;
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

// The parser tells of every malformed document.
class Silence {
public:
    Silence() : kept(dup(2)) {
        std::fflush(stderr);
        if (!std::freopen("/dev/null", "w", stderr)) std::abort();
    }
    ~Silence() {
        std::fflush(stderr);
        dup2(kept, 2);
        close(kept);
    }

private:
    int kept;
};

class FileFaultCampaign : public testing::TestWithParam<Layout> {
protected:
    FileFaultCampaign() : session(GetParam()) {}

    // The short form leaves calls out, above all of the files whose bands lie apart, which take
    // many times as many.
    static std::size_t Stride(std::size_t shortForm = 1) {
        const std::size_t times = GetParam().bands > 8 ? 7 : 1;
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
                FileFaults faults(
                    {session.Folder(), testsupport::kChangingCall, n, false, action, 0});
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

// Builds by the host's library, in place of an old file or of none.
class BuildFaultCampaign : public FileFaultCampaign {
protected:
    static constexpr const char* kOldText = "the old file";

    BuildFaultCampaign()
        : source(HostSession::kSamples, HostSession::kLines, GetParam().bands),
          target(session.Folder() + "/built.pyr") {
        source.FillWithNoise(5);
        options.overwrite = true;
        options.threads = 1;
        options.levels = 1;
        if (GetParam().tileLines == 1) options.ordering = zmchost::Ordering::Scanline;
        std::filesystem::remove(session.Path());
        Build();
        built = support::ReadText(target);
    }

    void Build() {
        failure.clear();
        try {
            builder.Build(source, target, options);
        } catch (const std::exception& error) {
            failure = error.what();
            if (failure.empty()) failure = "without a reason";
        }
    }

    void Prepare(bool withOld) {
        old = withOld;
        for (const auto& entry : std::filesystem::directory_iterator(session.Folder()))
            std::filesystem::remove(entry.path());
        if (old) support::WriteText(target, kOldText);
    }

    // The target is the old file or the new one, whole.
    std::string FaultOfTarget() {
        if (!std::filesystem::exists(target)) {
            ++outcomes["absent"];
            return old ? "the old file is gone" : "";
        }
        const std::string bytes = support::ReadText(target);
        if (bytes == built) {
            ++outcomes["new"];
            return "";
        }
        ++outcomes["old"];
        if (old && bytes == kOldText) return "";
        const auto first = std::mismatch(bytes.begin(), bytes.end(), built.begin(), built.end());
        return "the target of " + std::to_string(bytes.size()) +
               " bytes differs from the new one, of " + std::to_string(built.size()) + ", at " +
               std::to_string(first.first - bytes.begin());
    }

    std::size_t Leavings() const {
        std::size_t count = 0;
        for (const auto& entry : std::filesystem::directory_iterator(session.Folder()))
            count += entry.path().string() != target;
        return count;
    }

    support::MemorySource<unsigned char> source;
    zmchost::PyramidBuilder builder{support::TestModule()};
    zmchost::BuildOptions options;
    std::string target, built, failure;
    bool old = false;
};

TEST_P(BuildFaultCampaign, Builds) {
    for (const bool withOld : {false, true})
        for (const Failing& failing : kFailings) {
            ASSERT_NO_FATAL_FAILURE(FailEach(
                failing, Stride(7), [&] { Prepare(withOld); }, [&] { Build(); },
                [&](bool harmless) -> std::string {
                    const std::string fault = FaultOfTarget();
                    if (!fault.empty()) return fault;
                    const bool isNew = outcomes.contains("new") &&
                                       std::filesystem::exists(target) &&
                                       support::ReadText(target) == built;
                    if (failure.empty() && !isNew) return "success was told without a result";
                    if (harmless && !failure.empty()) return "it was not got over: " + failure;
                    const bool removable = (failedKinds & testsupport::kRemoveCall) == 0;
                    return removable && Leavings() != 0 ? "temporary files stay" : "";
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
                action, [&] { Prepare(withOld); }, [&] { Build(); },
                [&]() -> std::string {
                    const std::string fault = FaultOfTarget();
                    if (!fault.empty() || points % 8 != 0) return fault;
                    ++cleaned;
                    Build();
                    if (!failure.empty()) return "the next build fails: " + failure;
                    return Leavings() == 0 ? "" : "the next build leaves the last one's files";
                }));
        }
    EXPECT_GT(cleaned, 0u);
    Report("ends of the process in a build");
}

std::string NameOf(const testing::TestParamInfo<Layout>& info) { return info.param.name; }
INSTANTIATE_TEST_SUITE_P(Layouts, FileFaultCampaign, testing::ValuesIn(kLayouts), NameOf);
INSTANTIATE_TEST_SUITE_P(Layouts, BuildFaultCampaign, testing::ValuesIn(kLayouts), NameOf);

}  // namespace
}  // namespace campaigns
