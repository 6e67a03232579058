#include "tools/PartQueue.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <set>
#include <stdexcept>
#include <string_view>

#include "platform/ChildProcesses.h"
#include "platform/FileSystem.h"
#include "platform/Program.h"
#include "platform/Terminal.h"
#include "tools/Message.h"

namespace zmctools {
namespace {

constexpr std::size_t kDigits = 8;
constexpr auto kBetweenReports = std::chrono::milliseconds(100);
constexpr std::string_view kDone = "done ";
constexpr std::string_view kPassed = "passed ";
constexpr std::string_view kProgram = "zmcraster: ";

// Lines as they come in pieces.
class Lines {
public:
    template <class Take>
    void Add(const std::string& text, const Take& take) {
        rest += text;
        std::size_t begin = 0;
        for (std::size_t end = rest.find('\n'); end != rest.npos; end = rest.find('\n', begin)) {
            take(std::string_view(rest).substr(begin, end - begin));
            begin = end + 1;
        }
        rest.erase(0, begin);
    }

private:
    std::string rest;
};

std::uint64_t NumberBehind(std::string_view line, std::string_view word) {
    return std::strtoull(std::string(line.substr(word.size())).c_str(), nullptr, 10);
}

// One crew of processes on one list of parts.
class Crew {
public:
    Crew(const LocalParts& wanted, std::vector<std::uint64_t> list)
        : job(wanted), parts(std::move(list)), open(parts.begin(), parts.end()) {}

    // The parts that are not done when all processes have ended.
    std::vector<std::uint64_t> Run();

private:
    const LocalParts& job;
    std::vector<std::uint64_t> parts;
    std::set<std::uint64_t> open;
    std::size_t fed = 0;
    platform::ChildProcesses children;
    Lines output, errors;
    std::string failure;

    void Start();
    void Feed();
    void Hear(std::string_view line);
    void HearError(std::string_view line);
};

std::vector<std::uint64_t> Crew::Run() {
    Start();
    bool failed = false;
    while (children.Running() != 0 && !failed) {
        Feed();
        const platform::ChildProcesses::News news = children.Wait(100);
        errors.Add(news.errors, [this](std::string_view line) { HearError(line); });
        output.Add(news.output, [this](std::string_view line) { Hear(line); });
        // One that was asked to end, and not by us, is made up for like one that was killed.
        for (const auto& end : news.ended)
            failed = failed ||
                     (end.status != 0 && end.status != static_cast<int>(ExitStatus::Interrupted));
        if (job.passed(0)) continue;
        children.EndAll();
        throw Interruption(job.target);
    }
    if (failed) {
        children.EndAll();
        throw std::runtime_error(failure.empty() ? job.target + ": a process failed" : failure);
    }
    return {open.begin(), open.end()};
}

void Crew::Start() {
    std::vector<std::string> arguments = {"part", job.plan, "--queue", "--threads",
                                          std::to_string(job.threads)};
    if (job.count) arguments.emplace_back("--count");
    const std::size_t count = std::min<std::size_t>(job.processes, parts.size());
    const std::string program = platform::FileOfProgram();
    if (program.empty() || !children.Start(program, arguments, count))
        throw Failure(job.target, "no process can be started: " + platform::LastErrorText());
}

void Crew::Feed() {
    while (fed < parts.size() && children.Feed(PartQueue::Piece(parts[fed]))) ++fed;
    if (fed == parts.size()) children.EndQueue();
}

void Crew::Hear(std::string_view line) {
    if (line.starts_with(kDone)) open.erase(NumberBehind(line, kDone));
    if (line.starts_with(kPassed)) job.passed(NumberBehind(line, kPassed));
}

void Crew::HearError(std::string_view line) {
    if (line.starts_with(kProgram)) line.remove_prefix(kProgram.size());
    if (line.find(": warning: ") != line.npos)
        WarnAgain(std::string(line));
    else if (failure.empty() && !line.ends_with(": interrupted"))
        failure = line;
}

}  // namespace

std::string PartQueue::Piece(std::uint64_t part) {
    const std::string number = std::to_string(part);
    return std::string(kDigits - std::min(kDigits, number.size()), '0') + number + '\n';
}

std::string PartQueue::Take() { return platform::ReadPiece(kDigits + 1).substr(0, kDigits); }

void PartQueue::Reports::Passed(std::uint64_t pixels) {
    passed = pixels;
    if (Clock::now() >= next) Report();
}

void PartQueue::Reports::Done(std::uint64_t part) {
    Report();
    reported = passed = 0;
    platform::WriteAtOnce(platform::StandardStream::Output,
                          std::string(kDone) + std::to_string(part) + '\n');
}

void PartQueue::Reports::Report() {
    next = Clock::now() + kBetweenReports;
    if (passed <= reported) return;
    platform::WriteAtOnce(platform::StandardStream::Output,
                          std::string(kPassed) + std::to_string(passed - reported) + '\n');
    reported = passed;
}

void LocalParts::Make(std::vector<std::uint64_t> parts) const {
    constexpr int kTries = 3;
    for (int i = 0; i < kTries && !parts.empty(); ++i) parts = Crew(*this, std::move(parts)).Run();
    if (!parts.empty()) throw Failure(target, "its processes are ended again and again");
}

}  // namespace zmctools
