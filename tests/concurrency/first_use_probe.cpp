// A process in which eight threads meet the module, and all that it shares with its process, for
// the first time at the same moment. Each begins with another of the first uses.
//
//   first_use_probe FILE ENGINE-DIRECTORY PE-DIRECTORY
// FILE is a GenerationFile with one generation. The exit status is the number of uses that failed.
#include <atomic>
#include <barrier>
#include <cstdio>
#include <functional>
#include <string>
#include <thread>
#include <vector>

#include "colour/NamedColors.h"
#include "coordsys/BindCoordSys.h"
#include "coordsys/CoordSysLog.h"
#include "coordsys/Environment.h"
#include "coordsys/EnvironmentKeys.h"
#include "metadata/Metadata.h"
#include "metadata/MetadataParseLog.h"
#include "tests/concurrency/GenerationFile.h"
#include "tests/support/MemoryRaster.h"
#include "tests/support/MemorySource.h"
#include "zmcg/zmcg.h"
#include "zmcpe/CoordSysImpl.h"

using namespace zelm;

namespace {

constexpr std::size_t kThreads = 8;

bool UseMemoryRaster() {
    std::vector<unsigned char> pixels(24, 7), tile(24);
    const zmchost::ModulePtr module = zmctest::TestModule();
    const auto raster = module->OpenMemoryRaster(zmctest::MemoryRasterText(pixels.data()).Text());
    if (!raster) return false;
    int bands[] = {0, 1};
    const auto dispatch = raster->GetReader();
    return dispatch->As<unsigned char>()->ReadTile(0, 0, 4, 3, Array<int>(bands, ArrayShape(2)), 0,
                                                   tile.data(), nullptr) &&
           tile == pixels;
}

bool UsePyramid(const std::string& path) {
    zmctest::GenerationFile file(zmctest::TestModule(), path);
    if (!file.IsOpen()) return false;
    std::string fault;
    const auto sets = file.Count(1, fault);
    return sets.statistics == 1u && file.Look({0, 10, 20, 300, 250}).fault.empty() && fault.empty();
}

bool UseModuleTwice() {
    for (int i = 0; i < 2; ++i)
        if (!zmctest::TestModule()) return false;
    return true;
}

bool UseMetadata() {
    const Metadata metadata;
    if (!metadata.impl) return false;
    EnterCriticalSection(&metadata.impl->lock);
    ++metadata.impl->root.rows;
    LeaveCriticalSection(&metadata.impl->lock);
    MetadataParseLog::Log(1, L"thread %s\n", L"says something");
    return MetadataParseLog::GetInstance() == gpMetadataParseLogInstance;
}

bool UseCoordSys() {
    const auto geographic = BindCoordSys(4326);
    const auto utm = BindCoordSys("+proj=utm +zone=33 +datum=WGS84");
    CoordSysLog::LogMessage(CoordSysLog::kErrorLevel, u"thread %s", u"says something");
    double x = 15.0, y = 52.5;
    return geographic && utm && geographic->impl->Transform(*utm->impl, 1, &x, &y, nullptr) == 1;
}

// A handle that is bound to nothing comes and goes whatever the others do.
bool UseUnboundCoordSys() {
    const CoordSys handle;
    return handle.id != 0;
}

bool UseRegistry() {
    static const String word("A word of nobody's");
    const unsigned code = GloballyUniqueObjectTypeCode(word);
    const bool settings = !Environment().GetSetting(EnvironmentKeys::kBinDirectory).IsEmpty();
    return settings && code == GloballyUniqueObjectTypeCode("A word of nobody's") &&
           GloballyUniqueObjectErrorCode() != GloballyUniqueObjectErrorCode();
}

bool UseColours() { return NamedColors()[kNamedColorCount - 1].isNull == 1; }

}  // namespace

int main(int, char** argv) {
    const std::string file = argv[1];
    const Environment environment;
    environment.GetSetting(EnvironmentKeys::kBinDirectory) = argv[2];
    environment.GetSetting(EnvironmentKeys::kPeDirectory) = argv[3];
    environment.GetSetting(EnvironmentKeys::kGdalDirectory) = "";
    const std::vector<std::function<bool()>> uses = {
        UseMemoryRaster, [&] { return UsePyramid(file); },
        UseMetadata,     UseCoordSys,
        UseRegistry,     UseColours,
        UseModuleTwice,  UseUnboundCoordSys};
    std::atomic<int> failures{0};
    std::barrier start(kThreads);
    std::vector<std::thread> threads;
    for (std::size_t i = 0; i < kThreads; ++i)
        threads.emplace_back([&, i] {
            start.arrive_and_wait();
            for (std::size_t j = 0; j < uses.size(); ++j)
                if (const std::size_t use = (i + j) % uses.size(); !uses[use]()) {
                    std::fprintf(stderr, "use %zu failed on thread %zu\n", use, i);
                    ++failures;
                }
        });
    for (std::thread& thread : threads) thread.join();
    return failures;
}
