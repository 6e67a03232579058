// A campaign: very many variants of an attack on one piece of the system, numbered, so that each
// can be made again by its number.
//
// The short form takes every n-th variant, from a first one that changes from day to day, so that
// runs of a month or two cover all; the full form (ZMC_CAMPAIGN=full) takes them all.
// ZMC_CAMPAIGN_PHASE fixes the first one, and ZMC_CAMPAIGN_ONLY=NUMBER takes that variant alone
// and keeps its file as damaged.pyr in the current folder. At the end one line of figures is
// printed, which begins with "campaign: ".
//
// A crash or a sanitizer's report in a variant is followed by the line that makes it again. While
// variants run the standard error stream leads nowhere, because the parser tells of each malformed
// document there.
#ifndef ZMC_TESTS_CAMPAIGNS_CAMPAIGN_H
#define ZMC_TESTS_CAMPAIGNS_CAMPAIGN_H

#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <string>
#include <vector>

namespace zmctest {

// What one variant cost: its slowest request, by the thread's own processor time and by the wall's
// clock, and the most memory of all requests together by MemoryMeter.
struct Cost {
    double cpuSeconds = 0;
    double wallSeconds = 0;
    std::int64_t peakBytes = 0;

    // Runs `call`, one request, on the account of this variant. The memory that it leaves behind
    // still counts in the next.
    template <class Call>
    void Of(Call&& call) {
        Start();
        call();
        Stop();
    }
    static void NewVariant();

private:
    void Start();
    void Stop();
    double cpuStart = 0, wallStart = 0;
};

struct Verdict {
    Cost cost;
    double allowedSeconds = 1;
    std::int64_t allowedBytes = std::int64_t{64} << 20;
    std::vector<std::string> complaints;
    std::vector<std::string> outcomes;  // kinds to be counted

    void Complain(const std::string& text) { complaints.push_back(text); }
    void Count(const std::string& kind) { outcomes.push_back(kind); }
};

class Campaign {
public:
    // `stride` is that of the short form.
    Campaign(std::string campaignName, std::uint64_t stride);
    ~Campaign();  // prints the figures
    Campaign(const Campaign&) = delete;
    Campaign& operator=(const Campaign&) = delete;

    // Set while one variant alone is run.
    static std::optional<std::uint64_t> Only();

    // Runs variants first to first + count - 1 of a part, e.g. one sample; parts follow each other
    // in the numbering. `run(i)` makes variant i of the part, tries it, and judges.
    void Run(const std::string& part, std::uint64_t count,
             const std::function<Verdict(std::uint64_t)>& run);

private:
    void Judge(const std::string& part, std::uint64_t number, const Verdict& verdict);

    std::string name;
    std::uint64_t stride;
    std::uint64_t phase;
    std::uint64_t numbered = 0;  // variants of the parts so far
    std::uint64_t tried = 0;
    std::uint64_t failed = 0;
    std::map<std::string, std::uint64_t> outcomes;
    Cost highest;
    std::uint64_t slowest = 0, largest = 0;  // their numbers
    double seconds = 0;
};

}  // namespace zmctest

#endif
