// PowerTrial: a folder on a disk that loses power at every moment of some work.
//
//     PowerTrial trial;
//     ... files in trial.Folder() ...
//     trial.Record([&] { ... work ... });
//     EXPECT_EQ(trial.Try([&](const DiskState& state) { return ...; }), "");
#ifndef ZMC_TESTS_CAMPAIGNS_POWERTRIAL_H
#define ZMC_TESTS_CAMPAIGNS_POWERTRIAL_H

#include <functional>
#include <string>
#include <vector>

#include "tests/support/DiskModel.h"
#include "tests/support/ScratchDirectory.h"

namespace zmctest {

class PowerTrial {
public:
    // What is wrong with what stands in the folder; empty if nothing is. It may change it.
    using Judge = std::function<std::string(const DiskState&)>;

    PowerTrial();

    const std::string& Folder() const { return folder; }
    std::string operator/(const std::string& name) const { return folder + '/' + name; }

    // Does the work in a process of its own, with what is in the folder now as the disk of before.
    // It must not fail. Behind it the folder has what the work leaves.
    void Record(const std::function<void()>& work);
    // The work of a program.
    void Record(const std::vector<std::string>& command, std::vector<std::string> environment = {});

    // Puts each state that the disk may be in into the folder and asks for it; the first complaint.
    std::string Try(const Judge& judge);
    const DiskFigures& Figures() const { return figures; }
    // Whether there is a complaint if all flushes of the recording are left out.
    bool FailsWithoutFlushes(const Judge& judge);
    // Prints for how many of them there is one if that one alone is left out. Takes its time.
    void ReportNeededFlushes(const char* what, const Judge& judge);

    // Makes the folder hold that.
    void Put(const DiskState& state) const;

private:
    void KeepFiles() const;
    void Clear() const;
    std::string Try(const DiskModel& played, const DiskEffort& effort, const Judge& judge);

    const ScratchDirectory scratch{MemoryFolder()};
    const std::string folder = scratch / "disk", kept = scratch / "kept", log = scratch / "log";
    DiskModel model{{}};
    DiskFigures figures;
};

// "stores by a host: 15 changes and 7 flushes, 2,000 states".
void ReportPower(const char* what, const DiskFigures& figures);

}  // namespace zmctest

#endif
