// Everything that threads may do at the same time, done at the same time by eight of them: meant
// for the thread sanitizer, which takes no suppressions for this code.
#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <mutex>
#include <random>
#include <thread>

#include "colour/NamedColors.h"
#include "coordsys/BindCoordSys.h"
#include "coordsys/CoordSysLog.h"
#include "coordsys/Environment.h"
#include "coordsys/EnvironmentKeys.h"
#include "metadata/Metadata.h"
#include "metadata/MetadataParseLog.h"
#include "tests/concurrency/GenerationFile.h"
#include "tests/support/CampaignLength.h"
#include "tests/support/ChildProcess.h"
#include "tests/support/MemoryRaster.h"
#include "tests/support/MemorySource.h"
#include "tests/support/ScratchDirectory.h"
#include "zmcg/zmcg.h"
#include "zmcpe/CoordSysImpl.h"

namespace zmctest {
namespace {

using namespace zelm;

constexpr std::uint32_t kThreads = 8;

struct Counted : Object {
    static inline std::atomic<int> living{0};
    Counted() { ++living; }
    ~Counted() override { --living; }
};
struct Derived : Counted {};

// Things that go from one thread to another: whoever lets go last destroys them.
template <class T>
class Box {
public:
    T Exchange(const T& thing) {
        const std::lock_guard<std::mutex> lock(mutex);
        T held(inside);
        inside = thing;
        return held;
    }

private:
    std::mutex mutex;
    T inside;
};

void PrepareFile(const zmchost::ModulePtr& module, const std::string& path, const FileKind& kind) {
    GenerationFile file(module, kind, path);
    ASSERT_TRUE(file.IsOpen());
    ASSERT_TRUE(file.StoreStatistics(1) && file.StoreHistograms(1) && file.StorePalette(1));
}

// What the threads share.
struct World {
    zmctest::ScratchDirectory folder;
    zmchost::ModulePtr module = zmctest::TestModule();
    std::string sharedFile = folder / "shared.pyr";
    Pointer<Derived> object{new Derived};
    Box<Pointer<Counted>> objects;
    Box<Metadata> trees;
    Box<PalettePtr> palettes;
    Box<RasterDataConnectionPtr> rasters;
    Metadata tree;
    Array<int> numbers;
    Array<String> words;
    RasterProps props;
    Palette palette;
    std::vector<unsigned char> pixels = std::vector<unsigned char>(24, 7);

    World() {
        for (int i = 0; i < 20; ++i) {
            numbers.Append(i);
            words.Append("a word");
            palette.AddColor(Color());
        }
        props.SetBands(3);
        props.SetNoDataValue(1, 4.0);
        PrepareFile(module, sharedFile, kFileKinds[1]);
    }
};

// One of the threads.
struct Worker {
    World& world;
    std::uint32_t number;
    std::mt19937 random;

    std::string OwnFile() const { return world.folder / ("own" + std::to_string(number) + ".pyr"); }
};

bool CopyPointers(Worker& me) {
    for (int i = 0; i < 200; ++i) {
        Pointer<Derived> copy(me.world.object);
        const Pointer<Counted> base(copy);
        Pointer<Derived> other;
        other = copy;
        copy.Reset(new Derived);
        const Pointer<Counted> taken = me.world.objects.Exchange(Pointer<Counted>(copy));
        if (taken && !taken->IsKindOf(Object::typeCode)) return false;
    }
    return true;
}

bool CopyArrays(Worker& me) {
    Array<String> words(me.world.words);
    Array<int> numbers;
    numbers = me.world.numbers;
    const Object object(me.world.words);
    words.Append("another");
    return numbers.shape.elements == 20 && numbers.data[19] == 19 && words.data[3] == "a word" &&
           object.ToString().length > 10 && words.IsKindOf(Array<String>::typeCode);
}

bool ShareMetadata(Worker& me) {
    const Metadata copy(me.world.tree);
    EnterCriticalSection(&copy.impl->lock);
    auto& children = copy.impl->root.children;
    const std::wstring key = std::to_wstring(me.random() % 10);
    auto& child = children[key];
    delete child;
    child = new MetadataContainer;
    child->rows = copy.impl->root.rows++;
    const std::wstring text = copy.impl->root.Format(L"root");
    LeaveCriticalSection(&copy.impl->lock);
    const Metadata taken = me.world.trees.Exchange(Metadata());
    return taken.IsValid() && !copy.ToString().IsEmpty();
}

bool CopyProps(Worker& me) {
    RasterProps copy(me.world.props), other;
    other = copy;
    other.SetNoDataValue(0, 1.0);
    return other.HasNoDataValue(1) && copy.metadata.impl;
}

bool ShareColours(Worker& me) {
    const PalettePtr mine(new Palette);
    me.world.palette.CopyTo(*mine);
    const PalettePtr taken = me.world.palettes.Exchange(mine);
    const NamedColorRow& row = NamedColors()[me.random() % kNamedColorCount];
    return mine->nextIndex == 20 && (!taken || taken->nextIndex == 20) && !row.name.IsEmpty();
}

bool ReadMemoryRaster(Worker& me) {
    World& world = me.world;
    const std::string text = zmctest::MemoryRasterText(world.pixels.data()).Text();
    const RasterDataConnectionPtr raster = world.module->OpenMemoryRaster(text);
    if (!raster) return false;
    int bands[] = {1, 0};
    std::vector<unsigned char> tile(24), mask(24);
    const RasterReaderDispatchPtr dispatch = raster->GetReader();
    const bool read = dispatch->As<unsigned char>()->ReadTile(
        0, 0, 4, 3, Array<int>(bands, ArrayShape(2)), 0, tile.data(), mask.data());
    const RasterProps props = raster->GetRasterProps();
    // The raster of another thread ends here.
    const RasterDataConnectionPtr taken = world.rasters.Exchange(raster);
    return read && tile == world.pixels && props.samples == 4 && (!taken || taken->IsOpen());
}

bool MakePyramid(Worker& me) {
    const FileKind& kind = kFileKinds[me.random() % 2];
    GenerationFile file(me.world.module, kind, me.OwnFile());
    if (!file.IsOpen() || !file.WriteMoving(0, 5) || !file.StoreStatistics(1)) return false;
    const GenerationFile::Seen seen = file.Look({0, 200, 100, 300, 200});
    std::string fault;
    return seen.fault.empty() && seen.lowest[0] == 5 && seen.highest[0] == 5 &&
           file.Count(0, fault).statistics == 1u && fault.empty();
}

bool ReadPyramid(Worker& me) {
    GenerationFile file(me.world.module, me.world.sharedFile);
    std::string fault;
    return file.IsOpen() && file.Look({1, 3, 5, 250, 140}).fault.empty() &&
           file.Count(1, fault).palettes == 1u && fault.empty();
}

bool LoadModule(Worker& me) {
    const zmchost::ModulePtr again = zmctest::TestModule();
    const std::string text = zmctest::MemoryRasterText(me.world.pixels.data()).Text();
    const RasterDataConnectionPtr raster = again->OpenMemoryRaster(text);
    return raster && raster->IsReadable();
}

bool UseCoordSys(Worker& me) {
    const auto geographic = BindCoordSys(4326);
    const auto utm = BindCoordSys(32601 + static_cast<int>(me.random() % 60));
    double x = 15.0, y = 52.5;
    if (!geographic || !utm) return false;
    CoordSysLog::LogMessage(CoordSysLog::kErrorLevel, u"thread %d bound two", me.number);
    geographic->impl->Transform(*utm->impl, 1, &x, &y, nullptr);
    return geographic->id != utm->id;
}

bool WriteLogs(Worker& me) {
    for (int i = 0; i < 20; ++i) {
        MetadataParseLog::Log(1, L"thread %u line %d\n", me.number, i);
        MetadataParseLog::Log(9, L"above the level\n");
        CoordSysLog::LogMessage(CoordSysLog::kErrorLevel, u"thread %u line %d", me.number, i);
    }
    return true;
}

bool UseRegistry(Worker& me) {
    const std::string word = "word " + std::to_string(me.random() % 100);
    const unsigned code = GloballyUniqueObjectTypeCode(String(word.c_str()));
    const String pe = Environment().GetSetting(EnvironmentKeys::kPeDirectory);
    return code == GloballyUniqueObjectTypeCode(String(word.c_str())) && !pe.IsEmpty() &&
           GloballyUniqueObjectErrorCode() != 0;
}

struct Work {
    const char* name;
    bool (*run)(Worker&);
    int times = 1;  // at a time: more for what is over soon
};
constexpr Work kWork[] = {{"pointers", CopyPointers, 5},   {"arrays", CopyArrays, 20},
                          {"metadata", ShareMetadata, 20}, {"properties", CopyProps, 20},
                          {"colours", ShareColours, 20},   {"memory rasters", ReadMemoryRaster, 20},
                          {"new pyramids", MakePyramid},   {"one pyramid", ReadPyramid},
                          {"module", LoadModule, 10},      {"coordinate systems", UseCoordSys},
                          {"logs", WriteLogs, 5},          {"registry", UseRegistry, 50}};

class ThreadsCampaign : public testing::Test {
protected:
    zmctest::ScratchDirectory folder;

    ThreadsCampaign() { zmctest::WriteText(folder / "pelog.txt", "0110,0000,0000,0000\n"); }

    void FillSettings() const {
        const Environment environment;
        environment.GetSetting(EnvironmentKeys::kBinDirectory) = ZMC_ENGINE_DIRECTORY;
        environment.GetSetting(EnvironmentKeys::kPeDirectory) = folder.String().c_str();
        environment.GetSetting(EnvironmentKeys::kGdalDirectory) = "";
    }

    std::vector<std::string> ParseLogOn() const {
        return {"metadata_parse_log_dir=" + folder.String(), "metadata_parse_log_level=1",
                "metadata_parse_log_console=0"};
    }
};

TEST_F(ThreadsCampaign, EverythingAtOnce) {
    for (const std::string& entry : ParseLogOn()) {
        const std::size_t equals = entry.find('=');
        setenv(entry.substr(0, equals).c_str(), entry.c_str() + equals + 1, 1);
    }
    FillSettings();
    const auto end = std::chrono::steady_clock::now() +
                     CampaignLength(std::chrono::seconds(5), std::chrono::seconds(60));
    std::atomic<std::uint64_t> done[std::size(kWork)] = {}, failed[std::size(kWork)] = {};
    {
        World world;
        std::vector<std::thread> threads;
        for (std::uint32_t i = 0; i < kThreads; ++i)
            threads.emplace_back([&, i] {
                Worker me{world, i, std::mt19937(i)};
                while (std::chrono::steady_clock::now() < end) {
                    const std::size_t work = me.random() % std::size(kWork);
                    for (int time = 0; time < kWork[work].times; ++time, ++done[work])
                        if (!kWork[work].run(me)) ++failed[work];
                }
            });
        for (std::thread& thread : threads) thread.join();
        EXPECT_EQ(world.object.record->count, 1u);
    }
    EXPECT_EQ(Counted::living, 0);
    for (std::size_t i = 0; i < std::size(kWork); ++i) {
        std::printf("%s: %ju\n", kWork[i].name, std::uintmax_t{done[i]});
        EXPECT_EQ(failed[i], 0u) << kWork[i].name;
    }
}

// What happens once in a process needs a process each time.
TEST_F(ThreadsCampaign, FirstUsesAtTheSameMoment) {
    const std::string file = folder / "first.pyr";
    PrepareFile(zmctest::TestModule(), file, kFileKinds[1]);
    const int rounds = CampaignLength(4, 100);
    for (int i = 0; i < rounds && !HasFailure(); ++i) {
        std::vector<std::string> environment = ParseLogOn();
        if (i % 2 != 0) environment = {"metadata_parse_log_dir"};
        const zmctest::ChildResult result = zmctest::RunChild(
            {ZMC_FIRST_USE_PROBE, file, ZMC_ENGINE_DIRECTORY, folder.String()}, environment);
        EXPECT_EQ(result.status, 0) << "round " << i << ":\n" << result.err;
    }
    std::printf("%d processes\n", rounds);
}

}  // namespace
}  // namespace zmctest
