// BuildSession: builds by the host's library, in place of an old file or of none, that can be
// interrupted anywhere; and what the target may be afterwards.
#ifndef ZMC_TESTS_CAMPAIGNS_BUILDSESSION_H
#define ZMC_TESTS_CAMPAIGNS_BUILDSESSION_H

#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <stdexcept>
#include <string>

#include "host/build/PyramidBuilder.h"
#include "tests/campaigns/HostSession.h"
#include "tests/support/MemorySource.h"

namespace zmctest {

class BuildSession {
public:
    // Has the folder to itself while it builds.
    BuildSession(const std::string& folderName, const Layout& layout)
        : source(HostSession::kSamples, HostSession::kLines, layout.bands),
          folder(folderName),
          target(folderName + "/built.pyr") {
        source.FillWithNoise(5);
        options.overwrite = true;
        options.threads = 1;
        options.levels = 1;
        if (layout.tileLines == 1) options.ordering = zmchost::Ordering::Scanline;
        Prepare(false);
        Build();
        if (!Failure().empty()) throw std::runtime_error(Failure());
        built = zmctest::ReadText(target);
    }

    void Prepare(bool withOld) {
        old = withOld;
        for (const auto& entry : std::filesystem::directory_iterator(folder))
            std::filesystem::remove(entry.path());
        if (old) zmctest::WriteText(target, kOldText);
    }

    void Build() {
        reason[0] = '\0';
        try {
            builder.Build(source, target, options);
        } catch (const std::exception& error) {
            std::snprintf(reason, sizeof reason, "failed: %s", error.what());
        }
    }

    // Why the last build failed; empty if it did not.
    std::string Failure() const { return reason; }

    // The target is the old file or the new one, whole. `outcome` becomes "absent", "old" or "new".
    std::string FaultOfTarget(std::string& outcome) const {
        if (!std::filesystem::exists(target)) {
            outcome = "absent";
            return old ? "the old file is gone" : "";
        }
        const std::string bytes = zmctest::ReadText(target);
        outcome = bytes == built ? "new" : "old";
        if (bytes == built || (old && bytes == kOldText)) return "";
        const auto first = std::mismatch(bytes.begin(), bytes.end(), built.begin(), built.end());
        return "the target of " + std::to_string(bytes.size()) +
               " bytes differs from the new one, of " + std::to_string(built.size()) + ", at " +
               std::to_string(first.first - bytes.begin());
    }

    // The same after a build in this process: success is told of the new file only.
    std::string FaultOfBuild(std::string& outcome) const {
        const std::string fault = FaultOfTarget(outcome);
        if (!fault.empty()) return fault;
        return Failure().empty() && outcome != "new" ? "success was told without a result" : "";
    }

    // Files beside the target.
    std::size_t Leavings() const {
        std::size_t count = 0;
        for (const auto& entry : std::filesystem::directory_iterator(folder))
            count += entry.path().string() != target;
        return count;
    }

private:
    static constexpr const char* kOldText = "the old file";

    zmctest::MemorySource<unsigned char> source;
    zmchost::PyramidBuilder builder{zmctest::TestModule()};
    zmchost::BuildOptions options;
    std::string folder, target, built;
    char reason[200] = {};  // kept without memory
    bool old = false;
};

}  // namespace zmctest

#endif
