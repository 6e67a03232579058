// Threads in the driver: those that it reads large windows with, and those that share a dataset.
#include <gdal_priv.h>
#include <gtest/gtest.h>
#include <pthread.h>

#include <algorithm>
#include <atomic>
#include <functional>
#include <map>
#include <new>
#include <numeric>
#include <random>
#include <set>
#include <string>
#include <thread>
#include <tuple>
#include <vector>

#include "gdal/Band.h"
#include "gdal/Dataset.h"
#include "gdal/JobCrew.h"
#include "gdal/WindowParts.h"
#include "tests/gdal/GdalTest.h"

#ifdef __SANITIZE_THREAD__
// GDAL makes each of its mutexes while it holds one of its own, and takes that again with them held
// when it makes the next: on one thread too, which is what the sanitizer reports.
// NOLINTNEXTLINE(bugprone-reserved-identifier): the sanitizer's name.
extern "C" __attribute__((visibility("default"))) const char* __tsan_default_suppressions();
extern "C" const char* __tsan_default_suppressions() {
    return "deadlock:CPLCreateOrAcquireMutexEx\n";
}
#endif

namespace zmcgdal {
namespace {

using zelm::Rectangle;
using zmctest::DatasetPtr;
using Pixels = std::vector<unsigned char>;

constexpr std::uint32_t kThreads = 8;

// One of [0, end).
std::uint32_t Any(std::mt19937& random, std::uint32_t end) {
    return static_cast<std::uint32_t>(random() % end);
}

// What GDAL reports on this thread.
class Told {
public:
    Told() { CPLPushErrorHandlerEx(&Told::Take, this); }
    ~Told() { CPLPopErrorHandler(); }
    Told(const Told&) = delete;
    Told& operator=(const Told&) = delete;
    std::vector<std::string> texts;

private:
    static void CPL_STDCALL Take(CPLErr kind, CPLErrorNum, const char* text) {
        if (kind >= CE_Warning)
            static_cast<Told*>(CPLGetErrorHandlerUserData())->texts.emplace_back(text);
    }
};

// Runs `work(thread)` on so many threads at once.
void AtOnce(const std::function<void(std::uint32_t)>& work) {
    std::atomic<std::uint32_t> waiting{kThreads};
    std::vector<std::thread> threads;
    for (std::uint32_t i = 0; i < kThreads; ++i)
        threads.emplace_back([&, i] {
            for (--waiting; waiting != 0;) std::this_thread::yield();
            work(i);
        });
    for (std::thread& thread : threads) thread.join();
}

// --- jobs ---

Worker Alike(const Worker& worker) { return worker; }

TEST(Jobs, EachIsDoneOnceByWhateverThreads) {
    for (const std::uint32_t threads : {1U, 2U, 7U})
        for (const std::uint64_t jobs : {0U, 1U, 5U, 1000U}) {
            std::vector<std::atomic<int>> done(jobs);
            const Worker count = [&](std::uint64_t job) { return ++done[job] > 0; };
            EXPECT_TRUE(RunJobs(jobs, threads, [&] { return Alike(count); }, {}));
            EXPECT_TRUE(
                std::all_of(done.begin(), done.end(), [](int times) { return times == 1; }));
        }
}

TEST(Jobs, TheFailureOfTheFirstIsToldOnceOnTheThreadThatAsked) {
    const Worker fail = [](std::uint64_t job) {
        if (job % 100 != 37) return true;
        CPLError(CE_Failure, CPLE_NoWriteAccess, "job %d", static_cast<int>(job));
        return false;
    };
    for (int run = 0; run < 50; ++run) {
        CPLErrorReset();
        const Told told;
        EXPECT_FALSE(RunJobs(1000, 4, [&] { return Alike(fail); }, {}));
        EXPECT_EQ(told.texts, std::vector<std::string>{"job 37"});
        EXPECT_EQ(CPLGetLastErrorNo(), CPLE_NoWriteAccess);
        EXPECT_STREQ(CPLGetLastErrorMsg(), "job 37");
    }
}

TEST(Jobs, WarningsAreToldOnceEachOnTheThreadThatAskedBeforeAFailure) {
    const auto warn = [](std::uint64_t job) {
        CPLError(CE_Warning, CPLE_NotSupported, "of %d", static_cast<int>(job % 3));
    };
    const Worker work = [&](std::uint64_t job) {
        warn(job);
        return true;
    };
    const Worker fail = [&](std::uint64_t job) -> bool {
        warn(job);
        throw zmchost::Error("a file", "be read", "of that");
    };
    for (const std::uint32_t threads : {1U, 4U}) {
        const Told told;
        CPLErrorReset();
        EXPECT_TRUE(RunJobs(300, threads, [&] { return Alike(work); }, {}));
        EXPECT_EQ(told.texts, (std::vector<std::string>{"of 0", "of 1", "of 2"}));
        EXPECT_EQ(CPLGetLastErrorType(), CE_Warning);
        EXPECT_EQ(CPLGetLastErrorNo(), CPLE_NotSupported);
    }
    const Told told;
    EXPECT_FALSE(RunJobs(1, 1, [&] { return Alike(fail); }, {}));
    EXPECT_EQ(told.texts, (std::vector<std::string>{"of 0", "a file: cannot be read: of that"}));
}

TEST(Jobs, FailuresWithoutAWordAndExceptionsAreFailures) {
    const Worker silent = [](std::uint64_t job) { return job != 5; };
    const Worker loud = [](std::uint64_t job) -> bool {
        if (job == 5) throw zmchost::Error("a file", "be read", "of that");
        return true;
    };
    for (const Worker& worker : {silent, loud}) {
        const Told told;
        EXPECT_FALSE(RunJobs(9, 3, [&] { return Alike(worker); }, {}));
        EXPECT_EQ(told.texts.size(), 1U);
    }
}

TEST(Jobs, ProgressIsToldOnTheThreadThatAskedGrowsToOneAndEndsTheWork) {
    const auto caller = std::this_thread::get_id();
    const Worker work = [](std::uint64_t) { return true; };
    std::vector<double> shares;
    std::size_t most = 100000;
    const ShareDone share = [&](double done) {
        EXPECT_EQ(std::this_thread::get_id(), caller);
        shares.push_back(done);
        return shares.size() < most;
    };
    EXPECT_TRUE(RunJobs(
        500, 3, [&] { return Alike(work); }, share));
    EXPECT_TRUE(std::is_sorted(shares.begin(), shares.end()));
    EXPECT_EQ(std::set<double>(shares.begin(), shares.end()).size(), shares.size());
    EXPECT_EQ(shares.back(), 1);
    shares.clear();
    most = 1;
    const Told told;
    EXPECT_FALSE(RunJobs(
        500, 3, [&] { return Alike(work); }, share));
    EXPECT_EQ(shares.size(), 1U);
    EXPECT_EQ(told.texts, std::vector<std::string>{"cancelled"});
    EXPECT_EQ(CPLGetLastErrorNo(), CPLE_UserInterrupt);
}

TEST(Jobs, WhatOtherThreadsHaveNoMemoryForIsDoneByTheCaller) {
    const auto caller = std::this_thread::get_id();
    const auto isOther = [&] { return std::this_thread::get_id() != caller; };
    std::vector<std::atomic<int>> done(300);
    const Worker poor = [&](std::uint64_t job) {
        if (isOther()) throw std::bad_alloc();
        return ++done[job] == 1;
    };
    EXPECT_TRUE(RunJobs(300, 5, [&] { return Alike(poor); }, {}));
    EXPECT_TRUE(std::all_of(done.begin(), done.end(), [](int times) { return times == 1; }));
    // Some cannot even begin.
    const MakeWorker make = [&]() -> Worker {
        if (isOther()) throw std::bad_alloc();
        return [](std::uint64_t) { return true; };
    };
    EXPECT_TRUE(RunJobs(300, 5, make, {}));
    // Of the caller it is a failure.
    const Worker none = [](std::uint64_t) -> bool { throw std::bad_alloc(); };
    const Told told;
    EXPECT_FALSE(RunJobs(3, 1, [&] { return Alike(none); }, {}));
    EXPECT_EQ(CPLGetLastErrorNo(), CPLE_OutOfMemory);
    EXPECT_EQ(told.texts.size(), 1U);
}

// New threads of the process have stacks larger than any memory while an object lives.
class NoNewThreads {
public:
    NoNewThreads() {
        pthread_getattr_default_np(&before);
        pthread_attr_t huge;
        pthread_attr_init(&huge);
        pthread_attr_setstacksize(&huge, std::size_t{1} << 50);
        isSet = pthread_setattr_default_np(&huge) == 0;
        pthread_attr_destroy(&huge);
    }
    ~NoNewThreads() {
        pthread_setattr_default_np(&before);
        pthread_attr_destroy(&before);
    }
    bool isSet = false;

private:
    pthread_attr_t before{};
};

TEST(Jobs, TheCallerDoesThemAloneWhereNoThreadCanBeHad) {
    const NoNewThreads none;
    ASSERT_TRUE(none.isSet);
    const auto caller = std::this_thread::get_id();
    std::uint64_t done = 0;
    const Worker alone = [&](std::uint64_t) {
        EXPECT_EQ(std::this_thread::get_id(), caller);
        return ++done > 0;
    };
    EXPECT_TRUE(RunJobs(100, 4, [&] { return Alike(alone); }, {}));
    EXPECT_EQ(done, 100U);
}

// --- parts of windows ---

TEST(Parts, CoverEachPixelOnceAndShareNoTile) {
    std::mt19937 random(3);
    for (int run = 0; run < 300; ++run) {
        const std::uint32_t side = 1 + Any(random, 9);
        const Rectangle window{Any(random, 40), Any(random, 40), 1 + Any(random, 60),
                               1 + Any(random, 60)};
        const std::uint32_t bands = 1 + Any(random, 4);
        const WindowParts parts(window, side, bands, 1 + Any(random, 200));
        std::map<std::tuple<std::uint32_t, std::uint32_t, std::uint32_t>, std::uint64_t> tiles;
        std::uint64_t pixels = 0;
        for (std::uint64_t i = 0; i < parts.Count(); ++i) {
            const WindowParts::Part part = parts.At(i);
            ASSERT_TRUE(window.Contains(part.window));
            ASSERT_FALSE(part.window.IsEmpty());
            const std::uint32_t last = part.bandCount == 0 ? bands : part.bandCount;
            for (std::uint32_t band = 0; band < last; ++band) {
                pixels += part.window.Pixels();
                for (std::uint64_t y = part.window.y / side; y * side < part.window.Bottom(); ++y)
                    for (std::uint64_t x = part.window.x / side; x * side < part.window.Right();
                         ++x)
                        ASSERT_TRUE(
                            tiles.emplace(std::tuple(x, y, part.firstBand + band), i).second);
            }
        }
        EXPECT_EQ(pixels, window.Pixels() * bands);
        EXPECT_EQ(tiles.size(), WindowParts::Tiles(window, side, bands));
    }
}

TEST(Parts, AreManyWhereThereAreManyTiles) {
    // A row of tiles is divided too, and so are the bands that lie apart.
    EXPECT_EQ(WindowParts({0, 0, 64 * 256, 256}, 256, 1, 32).Count(), 32U);
    EXPECT_EQ(WindowParts({0, 0, 256, 64 * 256}, 256, 1, 32).Count(), 64U);
    EXPECT_EQ(WindowParts({0, 0, 256, 256}, 256, 64, 32).Count(), 64U);
    // To the last pixel that a number can tell.
    const std::uint32_t far = UINT32_MAX;
    const WindowParts edge({far - 10, far - 10, 10, 10}, 256, 1, 1);
    EXPECT_EQ(edge.At(edge.Count() - 1).window, (Rectangle{far - 10, far - 10, 10, 10}));
}

// --- datasets ---

class Threads : public zmctest::GdalTest {
protected:
    // A pyramid made on this thread alone; samples are below 251.
    std::string Make(const char* file, int width, int height, int bands, GDALDataType type,
                     const std::function<void(GDALDataset&)>& finish = {}) const {
        const DatasetPtr source(Driver("MEM").Create("", width, height, bands, type, nullptr));
        std::mt19937 random(7);
        Pixels line(static_cast<std::size_t>(width));
        for (int band = 1; band <= bands; ++band)
            for (int y = 0; y < height; ++y) {
                for (unsigned char& sample : line)
                    sample = static_cast<unsigned char>(random() % 251);
                EXPECT_EQ(
                    source->GetRasterBand(band)->RasterIO(GF_Write, 0, y, width, 1, line.data(),
                                                          width, 1, GDT_Byte, 0, 0, nullptr),
                    CE_None);
            }
        if (finish) finish(*source);
        CPLStringList options;
        options.SetNameValue("NUM_THREADS", "1");
        EXPECT_TRUE(DatasetPtr(Driver().CreateCopy((folder / file).c_str(), source.get(), FALSE,
                                                   options.List(), nullptr, nullptr)));
        return folder / file;
    }
    static std::unique_ptr<Dataset> Opened(const std::string& name, bool shared,
                                           std::uint32_t threads = 1,
                                           GDALAccess access = GA_ReadOnly) {
        OpenOptions options;
        options.shared = shared;
        options.threads = threads;
        auto dataset = Dataset::FromFile(std::make_shared<OpenFile>(name, access, options), access);
        dataset->LoadSidecar(name.c_str(), nullptr);
        return dataset;
    }
    static Pixels Read(GDALDataset& dataset, const Rectangle& part) {
        const auto number = [](std::uint32_t value) { return static_cast<int>(value); };
        const int bands = dataset.GetRasterCount();
        Pixels pixels(part.Pixels() * static_cast<std::size_t>(bands));
        EXPECT_EQ(dataset.RasterIO(GF_Read, number(part.x), number(part.y), number(part.width),
                                   number(part.height), pixels.data(), number(part.width),
                                   number(part.height), GDT_Byte, bands, nullptr, 0, 0, 0, nullptr),
                  CE_None);
        return pixels;
    }
    static Pixels Read(GDALRasterBand& band, const Rectangle& part) {
        const auto number = [](std::uint32_t value) { return static_cast<int>(value); };
        Pixels pixels(part.Pixels());
        EXPECT_EQ(band.RasterIO(GF_Read, number(part.x), number(part.y), number(part.width),
                                number(part.height), pixels.data(), number(part.width),
                                number(part.height), GDT_Byte, 0, 0, nullptr),
                  CE_None);
        return pixels;
    }
    static Rectangle WindowIn(GDALRasterBand& band, std::mt19937& random) {
        const auto width = static_cast<std::uint32_t>(band.GetXSize());
        const auto height = static_cast<std::uint32_t>(band.GetYSize());
        const std::uint32_t x = Any(random, width), y = Any(random, height);
        return {x, y, 1 + Any(random, width - x), 1 + Any(random, height - y)};
    }
};

TEST_F(Threads, AreAsManyAsALargeWindowHasWorkFor) {
    const std::string name = Make("a.pyr", 2100, 2100, 3, GDT_Byte);
    const auto of = [&](std::uint32_t threads, const Rectangle& window) {
        const auto dataset = Opened(name, false, threads);
        return dataset->File().tiles.ThreadsFor(window, 3);
    };
    const Rectangle large{0, 0, 2048, 2048};  // 64 tiles
    EXPECT_EQ(of(1, large), 1U);
    EXPECT_EQ(of(2, large), 2U);
    EXPECT_EQ(of(8, large), 8U);
    EXPECT_EQ(of(1024, large), 16U);
    EXPECT_EQ(of(8, {0, 0, 256, 256}), 1U);
    EXPECT_EQ(of(8, {0, 0, 2048, 8}), 1U);  // of eight tiles, but little
}

TEST_F(Threads, OneWindowIsReadByThemAlsoWhereNoneCanBeHad) {
    const std::string name = Make("a.pyr", 2100, 2100, 3, GDT_UInt16);
    const Rectangle window{3, 5, 2050, 2000};
    const Pixels expected = Read(*Opened(name, false), window);
    const auto several = Opened(name, false, 4);
    ASSERT_GT(several->File().tiles.ThreadsFor(window, 3), 1U);
    EXPECT_TRUE(Read(*several, window) == expected);
    EXPECT_TRUE(Read(*several, window) == expected);
    const NoNewThreads none;
    EXPECT_TRUE(Read(*Opened(name, false, 4), window) == expected);
}

TEST_F(Threads, ReadTilesOfOneOpenFileAtOnce) {
    for (const int bands : {3, 10}) {  // together, and apart
        const std::string name = Make("a.pyr", 700, 600, bands, GDT_Byte);
        const auto dataset = Opened(name, true);
        WindowReader& tiles = dataset->File().tiles;
        const Rectangle all{0, 0, 700, 600};
        const Pixels expected = Read(*Opened(name, false), all);
        AtOnce([&](std::uint32_t thread) {
            for (int round = 0; round < 20; ++round) {
                const int band = static_cast<int>(thread + static_cast<unsigned>(round)) % bands;
                Pixels read(all.Pixels());
                EXPECT_TRUE(tiles.Read(0, all, &band, 1, {read.data(), GDT_Byte, 1, 700, 0}));
                EXPECT_TRUE(std::equal(read.begin(), read.end(),
                                       expected.begin() + band * static_cast<int>(read.size())));
            }
        });
    }
}

TEST_F(Threads, ShareADatasetItsBandsLevelsAndMasks) {
    const std::string name = Make("a.pyr", 900, 800, 3, GDT_Byte, [](GDALDataset& source) {
        source.GetRasterBand(2)->SetNoDataValue(5);
    });
    const auto plain = Opened(name, false);
    const auto shared = Opened(name, true);
    ASSERT_TRUE(shared->Share());
    AtOnce([&](std::uint32_t thread) {
        std::mt19937 random(thread);
        // One that nobody shares, for the answers.
        const auto own = Opened(name, false);
        for (int round = 0; round < 12; ++round) {
            const int number = 1 + static_cast<int>(Any(random, 3));
            GDALRasterBand& band = *shared->GetRasterBand(number);
            GDALRasterBand& same = *own->GetRasterBand(number);
            const Rectangle window = WindowIn(band, random);
            EXPECT_TRUE(Read(*shared, window) == Read(*own, window));
            EXPECT_TRUE(Read(band, window) == Read(same, window));
            EXPECT_TRUE(Read(*band.GetMaskBand(), window) == Read(*same.GetMaskBand(), window));
            EXPECT_EQ(band.GetMaskFlags(), same.GetMaskFlags());
            ASSERT_EQ(band.GetOverviewCount(), same.GetOverviewCount());
            GDALRasterBand& level = *band.GetOverview(0);
            const Rectangle part = WindowIn(level, random);
            EXPECT_TRUE(Read(level, part) == Read(*same.GetOverview(0), part));
        }
    });
}

TEST_F(Threads, AskASharedDatasetForAllThatItKnows) {
    GDALColorTable table;
    const GDALColorEntry color{1, 2, 3, 255};
    table.SetColorEntry(1, &color);
    const std::string name = Make("a.pyr", 300, 300, 1, GDT_Byte, [&](GDALDataset& source) {
        source.GetRasterBand(1)->SetColorTable(&table);
        source.GetRasterBand(1)->SetMetadataItem("KEY", "value");
        source.SetMetadataItem("WHOLE", "item");
        double place[] = {10, 1, 0, 20, 0, -1};
        source.SetGeoTransform(place);
    });
    const auto shared = Opened(name, true);
    ASSERT_TRUE(shared->Share());
    GDALRasterBand& band = *shared->GetRasterBand(1);
    AtOnce([&](std::uint32_t) {
        const Items items = band.GetMetadata();
        double mean = 0, place[6] = {};
        EXPECT_EQ(band.GetStatistics(FALSE, FALSE, nullptr, nullptr, &mean, nullptr), CE_None);
        EXPECT_GT(mean, 0);
        EXPECT_EQ(GDALGetGeoTransform(GDALDataset::ToHandle(shared.get()), place), CE_None);
        EXPECT_EQ(place[3], 20);
        ASSERT_TRUE(band.GetColorTable());
        EXPECT_EQ(band.GetColorTable()->GetColorEntry(1)->c3, 3);
        EXPECT_EQ(band.GetColorInterpretation(), GCI_PaletteIndex);
        EXPECT_STREQ(shared->GetMetadataItem("WHOLE"), "item");
        EXPECT_STREQ(shared->GetMetadataItem("ORDERING", "ZMCPYRAMID"), "Blocked");
        double low = 0, high = 0;
        int buckets = 0;
        GUIntBig* counts = nullptr;
        EXPECT_EQ(band.GetDefaultHistogram(&low, &high, &buckets, &counts, FALSE, nullptr, nullptr),
                  CE_None);
        EXPECT_EQ(std::accumulate(counts, counts + buckets, GUIntBig{0}), 90000U);
        CPLFree(counts);
        CSLDestroy(shared->GetFileList());
        // What the first one was given is still there.
        EXPECT_STREQ(CSLFetchNameValue(items, "KEY"), "value");
        EXPECT_TRUE(CSLFetchNameValue(items, "STATISTICS_MEAN"));
    });
}

TEST_F(Threads, ChangeNothingOfASharedDataset) {
    const std::string name = Make("a.pyr", 300, 300, 2, GDT_Byte);
    {
        const auto shared = Opened(name, true);
        ASSERT_TRUE(shared->Share());
        GDALRasterBand& band = *shared->GetRasterBand(1);
        double place[] = {10, 1, 0, 20, 0, -1};
        EXPECT_EQ(GDALSetGeoTransform(GDALDataset::ToHandle(shared.get()), place), CE_Failure);
        EXPECT_EQ(shared->SetMetadataItem("KEY", "value"), CE_Failure);
        EXPECT_EQ(shared->CreateMaskBand(GMF_PER_DATASET), CE_Failure);
        EXPECT_EQ(band.SetNoDataValue(1), CE_Failure);
        EXPECT_EQ(band.SetMetadataItem("KEY", "value"), CE_Failure);
        EXPECT_EQ(band.SetColorTable(nullptr), CE_Failure);
        band.SetDescription("text");
        EXPECT_STREQ(band.GetDescription(), "");
        GUIntBig counts[] = {1, 2, 3};
        EXPECT_EQ(band.SetDefaultHistogram(0, 3, 3, counts), CE_Failure);
        const int factor = 2;
        EXPECT_EQ(shared->BuildOverviews("NEAREST", 1, &factor, 0, nullptr, nullptr, nullptr),
                  CE_Failure);
        // What is computed is answered, and kept nowhere.
        double mean = 0;
        EXPECT_EQ(band.ComputeStatistics(FALSE, nullptr, nullptr, &mean, nullptr, nullptr, nullptr),
                  CE_None);
        EXPECT_GT(mean, 0);
        EXPECT_EQ(band.GetHistogram(0, 9, 3, counts, FALSE, TRUE, nullptr, nullptr), CE_None);
    }
    VSIStatBufL status;
    EXPECT_NE(VSIStatL((name + ".aux.xml").c_str(), &status), 0);
}

TEST_F(Threads, ShareNothingThatNeedsGdalsOwnObjects) {
    const std::string name = Make("a.pyr", 300, 300, 3, GDT_Byte);
    EXPECT_FALSE(Opened(name, true, 1, GA_Update)->Share());
    const auto masked = Make("masked.pyr", 300, 300, 3, GDT_Byte,
                             [](GDALDataset& source) { source.CreateMaskBand(GMF_PER_DATASET); });
    EXPECT_FALSE(Opened(masked, true)->Share());
    const auto values = Make("values.pyr", 300, 300, 3, GDT_Byte, [](GDALDataset& source) {
        source.SetMetadataItem("NODATA_VALUES", "1 2 3");
    });
    EXPECT_FALSE(Opened(values, true)->Share());
    const auto alpha = [](GDALDataset& source) {
        source.GetRasterBand(4)->SetColorInterpretation(GCI_AlphaBand);
    };
    EXPECT_TRUE(Opened(Make("bytes.pyr", 300, 300, 4, GDT_Byte, alpha), true)->Share());
    EXPECT_FALSE(Opened(Make("words.pyr", 300, 300, 4, GDT_UInt16, alpha), true)->Share());
    // It goes on as any other.
    const auto dataset = Opened(masked, true);
    EXPECT_FALSE(dataset->Share());
    EXPECT_EQ(dataset->SetMetadataItem("KEY", "value"), CE_None);
    EXPECT_EQ(Read(*dataset, {0, 0, 300, 300}).size(), 270000U);
}

#if GDAL_VERSION_NUM >= GDAL_COMPUTE_VERSION(3, 10, 0)

TEST_F(Threads, AskGdalForADatasetThatTheyShare) {
    const std::string name = Make("a.pyr", 900, 800, 3, GDT_Byte);
    const DatasetPtr shared = Open(name, GDAL_OF_THREAD_SAFE);
    ASSERT_TRUE(shared);
    EXPECT_TRUE(shared->IsThreadSafe(GDAL_OF_RASTER));
    EXPECT_TRUE(dynamic_cast<Dataset*>(shared.get()));
    EXPECT_FALSE(Open(name)->IsThreadSafe(GDAL_OF_RASTER));
    AtOnce([&](std::uint32_t thread) {
        const DatasetPtr own = Open(name);
        for (int round = 0; round < 8; ++round)
            for (const GDALRIOResampleAlg method : {GRIORA_NearestNeighbour, GRIORA_Bilinear}) {
                GDALRasterIOExtraArg extra;
                INIT_RASTERIO_EXTRA_ARG(extra);
                extra.eResampleAlg = method;
                const int size = 50 + static_cast<int>(thread) * 60 + round;
                Pixels one(static_cast<std::size_t>(size * size) * 3), other(one.size());
                for (auto* const pair : {&one, &other})
                    EXPECT_EQ((pair == &one ? shared : own)
                                  ->RasterIO(GF_Read, 10, 20, 400, 380, pair->data(), size, size,
                                             GDT_Byte, 3, nullptr, 0, 0, 0, &extra),
                              CE_None);
                EXPECT_TRUE(one == other);
            }
        double here = 0, there = 0;
        EXPECT_EQ(shared->GetRasterBand(1)->InterpolateAtPoint(30.5, 40.5, GRIORA_Bilinear, &here),
                  CE_None);
        EXPECT_EQ(own->GetRasterBand(1)->InterpolateAtPoint(30.5, 40.5, GRIORA_Bilinear, &there),
                  CE_None);
        EXPECT_EQ(here, there);
    });
}

TEST_F(Threads, AreGivenADatasetEachByGdalWhereTheyCannotShareOne) {
    const std::string name = Make("a.pyr", 300, 300, 1, GDT_Byte, [](GDALDataset& source) {
        source.CreateMaskBand(GMF_PER_DATASET);
    });
    const DatasetPtr shared = Open(name, GDAL_OF_THREAD_SAFE);
    ASSERT_TRUE(shared);
    EXPECT_TRUE(shared->IsThreadSafe(GDAL_OF_RASTER));
    EXPECT_FALSE(dynamic_cast<Dataset*>(shared.get()));
}

#endif

}  // namespace
}  // namespace zmcgdal
