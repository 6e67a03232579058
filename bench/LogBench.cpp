// What the two logs cost where they are off: a call, and one comparison. Beside them stands a call
// of the same shape that does nothing else, which is the bound, and a log that is on.
#include <benchmark/benchmark.h>

#include <cstdarg>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>

#include "coordsys/CoordSysLog.h"
#include "metadata/MetadataParseLog.h"
#include "zmcg/zmcg.h"

using zelm::CoordSysLog;
using zelm::WideChar;

namespace {

std::uint32_t threshold = 0;

[[gnu::noinline]] void OneComparison(std::uint32_t level, const WideChar*, ...) {
    benchmark::DoNotOptimize(threshold);
    if (level <= threshold) std::abort();
}

void BoundCallWithOneComparison(benchmark::State& state) {
    for (auto _ : state) OneComparison(8192, u"a message (%s) %d", u"with arguments", 5);
}
BENCHMARK(BoundCallWithOneComparison);

void ProjectionLogAbsent(benchmark::State& state) {
    for (auto _ : state) CoordSysLog::LogMessage(8192, u"a message (%s) %d", u"with arguments", 5);
}
BENCHMARK(ProjectionLogAbsent);

// A log in a directory of its own, gone when the benchmark is over.
class WithProjectionLog {
public:
    explicit WithProjectionLog(const char* controlLine) {
        char name[] = "/tmp/zmclogXXXXXX";
        if (mkdtemp(name)) directory = name;
        std::ofstream(directory / "pelog.txt") << controlLine << '\n';
        CoordSysLog::CreateInstance(directory.c_str());
    }
    WithProjectionLog(const WithProjectionLog&) = delete;
    WithProjectionLog& operator=(const WithProjectionLog&) = delete;
    ~WithProjectionLog() {
        delete gpCoordSysLogInstance;
        gpCoordSysLogInstance = nullptr;
        std::filesystem::remove_all(directory);
    }

private:
    std::filesystem::path directory;
};

void ProjectionLogOff(benchmark::State& state) {
    const WithProjectionLog log("0000,0000,0000,0000");
    for (auto _ : state) CoordSysLog::LogMessage(8192, u"a message (%s) %d", u"with arguments", 5);
}
BENCHMARK(ProjectionLogOff);

void ProjectionLogOn(benchmark::State& state) {
    const WithProjectionLog log("0110,0000,0000,0000");
    for (auto _ : state) CoordSysLog::LogMessage(8192, u"a message (%s) %d", u"with arguments", 5);
}
BENCHMARK(ProjectionLogOn);

void ParseLogOff(benchmark::State& state) {
    unsetenv("metadata_parse_log_dir");
    MetadataParseLog::GetInstance();
    for (auto _ : state) MetadataParseLog::Log(1, L"a message (%s) %d", L"with arguments", 5);
}
BENCHMARK(ParseLogOff);

}  // namespace
