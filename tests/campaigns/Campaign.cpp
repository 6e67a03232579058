#include "tests/campaigns/Campaign.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <link.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <utility>

#include "tests/support/CampaignLength.h"
#include "tests/support/MemoryMeter.h"
#include "tests/support/Sanitizers.h"

namespace zmctest {
namespace {

constexpr std::uint64_t kMostFailuresTold = 10;
constexpr unsigned kHangSeconds = 900;

double Seconds(clockid_t clock) {
    timespec now{};
    clock_gettime(clock, &now);
    return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) * 1e-9;
}

const char* Environment(const char* name) {
    const char* value = std::getenv(name);
    return value ? value : "";
}

// The line that makes the variant in hand again, ready for a signal handler.
char again[512];

void TellAgain() {
    const std::size_t length = std::strlen(again);
    if (write(STDERR_FILENO, again, length) < 0) return;
}

void OnSignal(int number) {
    TellAgain();
    if (number == SIGALRM) _exit(3);
    std::signal(number, SIG_DFL);
    std::raise(number);
}

// Calls a function of the sanitizers' interface in each of their libraries that is there: each has
// one of its own.
template <class Function, class Argument>
void ForSanitizers(const char* name, Argument argument) {
    struct Call {
        const char* name;
        Argument argument;
    } call{name, argument};
    const auto visit = [](dl_phdr_info* info, std::size_t, void* data) {
        if (!std::strstr(info->dlpi_name, "san.so")) return 0;
        const auto& what = *static_cast<const Call*>(data);
        void* const library = dlopen(info->dlpi_name, RTLD_LAZY | RTLD_NOLOAD);
        if (!library) return 0;
        if (const auto function = reinterpret_cast<Function>(dlsym(library, what.name)))
            function(what.argument);
        dlclose(library);
        return 0;
    };
    dl_iterate_phdr(visit, &call);
}

// Whose reports come with the line, once for each. Without sanitizers the faults do it.
void CatchDeath() {
    std::signal(SIGALRM, OnSignal);
    std::signal(SIGABRT, OnSignal);
    ForSanitizers<void (*)(void (*)())>("__sanitizer_set_death_callback", &TellAgain);
    if (zmctest::IsSanitized()) return;
    for (const int number : {SIGSEGV, SIGBUS, SIGFPE, SIGILL}) std::signal(number, OnSignal);
}

// The C stream leads nowhere while one of these lives. Sanitizers and the C library do not go
// through it.
class Silence {
public:
    Silence() : told(stderr), nowhere(std::fopen("/dev/null", "we")) {
        if (nowhere) stderr = nowhere;
    }
    ~Silence() {
        stderr = told;
        if (nowhere) std::fclose(nowhere);
    }
    Silence(const Silence&) = delete;
    Silence& operator=(const Silence&) = delete;

private:
    std::FILE* told;
    std::FILE* nowhere;
};

std::uint64_t FirstVariant(std::uint64_t stride) {
    const char* fixed = Environment("ZMC_CAMPAIGN_PHASE");
    const std::uint64_t day = static_cast<std::uint64_t>(std::time(nullptr)) / 86400;
    return (*fixed ? std::strtoull(fixed, nullptr, 10) : day) % stride;
}

std::string Megabytes(std::int64_t bytes) {
    char text[32];
    std::snprintf(text, sizeof text, "%.1f MiB", static_cast<double>(bytes) / 1048576);
    return text;
}

}  // namespace

void Cost::NewVariant() { zmctest::MemoryMeter::Reset(); }

void Cost::Start() {
    wallStart = Seconds(CLOCK_MONOTONIC);
    cpuStart = Seconds(CLOCK_THREAD_CPUTIME_ID);
    zmctest::MemoryMeter::Switch(true);
}

void Cost::Stop() {
    zmctest::MemoryMeter::Switch(false);
    cpuSeconds = std::max(cpuSeconds, Seconds(CLOCK_THREAD_CPUTIME_ID) - cpuStart);
    wallSeconds = std::max(wallSeconds, Seconds(CLOCK_MONOTONIC) - wallStart);
    peakBytes = std::max(peakBytes, zmctest::MemoryMeter::Peak());
}

std::optional<std::uint64_t> Campaign::Only() {
    const char* only = Environment("ZMC_CAMPAIGN_ONLY");
    if (!*only) return std::nullopt;
    return std::strtoull(only, nullptr, 10);
}

Campaign::Campaign(std::string campaignName, std::uint64_t shortStride)
    : name(std::move(campaignName)),
      stride(zmctest::IsFullCampaign() || Only()
                 ? 1
                 : zmctest::WithSanitizers<std::uint64_t>(4, 1) * shortStride),
      phase(FirstVariant(stride)) {
    CatchDeath();
}

Campaign::~Campaign() {
    std::string kinds;
    for (const auto& [kind, count] : outcomes) kinds += ", " + kind + " " + std::to_string(count);
    std::printf(
        "campaign: %s: %s form%s, %llu of %llu variants, %llu failed%s; slowest request %.1f ms of "
        "processor time (variant %llu, %.1f ms on the wall), most memory %s (variant %llu), "
        "%.1f s of processor time in all\n",
        name.c_str(), zmctest::IsFullCampaign() ? "full" : "short",
        stride == 1 ? "" : (", phase " + std::to_string(phase)).c_str(),
        static_cast<unsigned long long>(tried), static_cast<unsigned long long>(numbered),
        static_cast<unsigned long long>(failed), kinds.c_str(), highest.cpuSeconds * 1e3,
        static_cast<unsigned long long>(slowest), highest.wallSeconds * 1e3,
        Megabytes(highest.peakBytes).c_str(), static_cast<unsigned long long>(largest), seconds);
    std::fflush(stdout);
}

void Campaign::Run(const std::string& part, std::uint64_t count,
                   const std::function<Verdict(std::uint64_t)>& run) {
    const double start = Seconds(CLOCK_THREAD_CPUTIME_ID);
    const std::uint64_t first = numbered;
    numbered += count;
    const auto only = Only();
    const std::string test =
        std::string(testing::UnitTest::GetInstance()->current_test_info()->test_suite_name()) +
        "." + testing::UnitTest::GetInstance()->current_test_info()->name();
    for (std::uint64_t i = 0; i < count && failed < kMostFailuresTold; ++i) {
        const std::uint64_t number = first + i;
        if (only ? number != *only : number % stride != phase) continue;
        std::snprintf(again, sizeof again,
                      "\n%s, variant %llu of %s. Again with: ZMC_CAMPAIGN_ONLY=%llu %s "
                      "--gtest_filter=%s\n",
                      name.c_str(), static_cast<unsigned long long>(i), part.c_str(),
                      static_cast<unsigned long long>(number), program_invocation_name,
                      test.c_str());
        alarm(kHangSeconds);
        Cost::NewVariant();
        Verdict verdict;
        {
            const std::optional<Silence> silence =
                only ? std::nullopt : std::make_optional<Silence>();
            verdict = run(i);
        }
        alarm(0);
        Judge(part, number, verdict);
    }
    seconds += Seconds(CLOCK_THREAD_CPUTIME_ID) - start;
}

void Campaign::Judge(const std::string& part, std::uint64_t number, const Verdict& verdict) {
    ++tried;
    std::vector<std::string> complaints = verdict.complaints;
    if (verdict.cost.cpuSeconds > verdict.allowedSeconds)
        complaints.push_back("a request took " + std::to_string(verdict.cost.cpuSeconds) + " s");
    if (verdict.cost.peakBytes > verdict.allowedBytes)
        complaints.push_back("took " + Megabytes(verdict.cost.peakBytes) + " where " +
                             Megabytes(verdict.allowedBytes) + " are allowed");
    for (const std::string& kind : verdict.outcomes) ++outcomes[kind];
    if (verdict.cost.cpuSeconds > highest.cpuSeconds) {
        highest.cpuSeconds = verdict.cost.cpuSeconds;
        highest.wallSeconds = verdict.cost.wallSeconds;
        slowest = number;
    }
    if (verdict.cost.peakBytes > highest.peakBytes) {
        highest.peakBytes = verdict.cost.peakBytes;
        largest = number;
    }
    if (complaints.empty()) return;
    ++failed;
    std::string text = part + ":";
    for (const std::string& complaint : complaints) text += "\n  " + complaint;
    ADD_FAILURE() << text << again;
}

}  // namespace zmctest
