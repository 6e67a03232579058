#include "tests/campaigns/PowerTrial.h"

#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <filesystem>
#include <stdexcept>

#include "tests/support/CampaignLength.h"
#include "tests/support/ChildProcess.h"
#include "tests/support/Sanitizers.h"

namespace zmctest {
namespace {

namespace fs = std::filesystem;

DiskEffort Effort() {
    using Count = std::size_t;
    if (IsFullCampaign()) return {WithSanitizers<Count>(8, 12), WithSanitizers<Count>(50, 500)};
    return {WithSanitizers<Count>(3, 7), WithSanitizers<Count>(2, 16)};
}

// To find one complaint some states are enough.
constexpr DiskEffort kSearch{7, 8};

std::string Text(const std::exception& error) { return std::string("it fails: ") + error.what(); }

}  // namespace

PowerTrial::PowerTrial() {
    fs::create_directory(folder);
    fs::create_directory(kept);
}

// Further names elsewhere, so that a file comes back under its number in the file system, by which
// journals know it.
void PowerTrial::KeepFiles() const {
    for (const auto& entry : fs::directory_iterator(folder)) {
        struct stat status {};
        if (stat(entry.path().c_str(), &status) != 0) continue;
        const std::string name = kept + '/' + std::to_string(status.st_ino);
        if (!fs::exists(name)) fs::create_hard_link(entry.path(), name);
    }
}

void PowerTrial::Clear() const {
    for (const auto& entry : fs::directory_iterator(folder)) fs::remove_all(entry.path());
}

void PowerTrial::Put(const DiskState& state) const {
    Clear();
    std::map<std::uint64_t, std::string> made;
    for (const auto& [name, number] : state.names) {
        const std::string path = folder + '/' + name;
        const std::string source =
            made.count(number) != 0 ? made[number] : kept + '/' + std::to_string(number);
        if (made.emplace(number, path).second) {
            const bool isKept = fs::exists(source);
            WriteText(isKept ? source : path, state.files.at(number));
            if (isKept) fs::create_hard_link(source, path);
        } else {
            fs::create_hard_link(source, path);
        }
    }
}

void PowerTrial::Record(const std::function<void()>& work) {
    KeepFiles();
    std::fflush(stdout);
    const pid_t child = fork();
    if (child == 0) {
        int status = 1;
        try {
            const DiskRecording recording(folder, log);
            work();
            status = 0;
        } catch (const std::exception& error) {
            std::printf("%s\n", Text(error).c_str());
        }
        std::fflush(stdout);
        _exit(status);
    }
    int status = 0;
    if (waitpid(child, &status, 0) != child || status != 0)
        throw std::runtime_error("the work that is recorded failed");
    KeepFiles();
    model = DiskModel(DiskRecording::Read(log));
}

void PowerTrial::Record(const std::vector<std::string>& command,
                        std::vector<std::string> environment) {
    KeepFiles();
    for (const std::string& each : DiskRecording::ForChild(folder, log))
        environment.push_back(each);
    const ChildResult result = RunChild(command, environment);
    if (result.status != 0) throw std::runtime_error("what is recorded failed: " + result.err);
    KeepFiles();
    model = DiskModel(DiskRecording::Read(log));
}

std::string PowerTrial::Try(const DiskModel& played, const DiskEffort& effort, const Judge& judge) {
    std::string complaint;
    figures = played.Visit(effort, [&](const DiskState& state) {
        Put(state);
        try {
            complaint = judge(state);
        } catch (const std::exception& error) {
            complaint = Text(error);
        }
        if (complaint.empty()) return true;
        complaint += state.atEnd ? "; at the end, with" : "; with";
        for (const auto& [name, number] : state.names) complaint += ' ' + name;
        return false;
    });
    return complaint;
}

std::string PowerTrial::Try(const Judge& judge) { return Try(model, Effort(), judge); }

void PowerTrial::ReportNeededFlushes(const char* what, const Judge& judge) {
    const std::vector<std::size_t> flushes = model.Flushes();
    std::size_t needed = 0;
    for (const std::size_t place : flushes)
        if (!Try(model.Without({place}), kSearch, judge).empty()) ++needed;
    std::printf("campaign: %s: without any one of %zu of its %zu flushes a promise is broken\n",
                what, needed, flushes.size());
}

bool PowerTrial::FailsWithoutFlushes(const Judge& judge) {
    return !Try(model.Without(model.Flushes()), kSearch, judge).empty();
}

void ReportPower(const char* what, const DiskFigures& figures) {
    std::printf("campaign: power lost in %s: %zu changes, %zu flushes: %zu states, %zu different\n",
                what, figures.changes, figures.flushes, figures.made, figures.different);
}

}  // namespace zmctest
