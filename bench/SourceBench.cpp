// What the abstract source costs: whole tiles of 256 x 256 x 3 bytes out of the page cache, read
// through it, beside the same reads by the class below it and by the system call alone.
//
// Both sides take turns, tile by tile, so that they see the same machine and the same pages. Times
// are lower quartiles, which other work on the machine disturbs least; "ratio" is the bound's time
// as a share of ours, where 1 is as fast as the bound, and "more_ns" what one read costs more.
#include <benchmark/benchmark.h>
#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <memory>
#include <string>
#include <vector>

#include "bench/Comparison.h"
#include "files/FileSource.h"
#include "files/Lending.h"
#include "files/OpenSource.h"
#include "files/RecordingSource.h"
#include "platform/File.h"

namespace {

using namespace zelm::files;

constexpr std::size_t kTile = std::size_t{256} * 256 * 3;
constexpr std::size_t kTiles = 64;

// A file of all tiles, which goes with the program.
class TileFile {
public:
    TileFile() {
        const int made = mkstemp(path.data());
        const std::vector<char> tile(kTile, 'x');
        for (std::size_t i = 0; i < kTiles; ++i)
            if (write(made, tile.data(), kTile) != static_cast<ssize_t>(kTile)) std::abort();
        close(made);
        descriptor = open(path.c_str(), O_RDONLY | O_CLOEXEC);
        file = platform::File::Open(zelm::String(path.c_str()).wide, platform::File::Mode::Read);
    }
    ~TileFile() {
        close(descriptor);
        unlink(path.c_str());
    }

    std::string path = "/tmp/zmcbenchXXXXXX";
    int descriptor = -1;
    std::unique_ptr<platform::File> file;
};

TileFile& Tiles() {
    static TileFile tiles;
    return tiles;
}

// Sources to compare: the plain one, the same with a record, and that through a lent name.
std::shared_ptr<ByteSource> Source(std::int64_t kind) {
    static std::vector<LentName> lent;
    std::shared_ptr<ByteSource> source = OpenSource(Tiles().path.c_str(), OpenMode::Read);
    if (kind >= 1) source = std::make_shared<RecordingSource>(source);
    if (kind == 2) {
        lent.push_back(Lend(source));
        source = OpenSource(lent.back().Text(), OpenMode::Read);
    }
    return source;
}

double LowerQuartile(std::vector<double>& values) {
    const auto place = values.begin() + static_cast<std::ptrdiff_t>(values.size() / 4);
    std::nth_element(values.begin(), place, values.end());
    return *place;
}

// Reads `size` bytes of each tile through the source and by `bound(offset, buffer, size)`.
template <class Bound>
void Compare(benchmark::State& state, std::size_t size, Bound bound) {
    const std::shared_ptr<ByteSource> source = Source(state.range(0));
    std::vector<char> buffer(kTile);
    std::vector<double> ourTimes, boundTimes;
    std::uint64_t turn = 0;
    const auto readOurs = [&](std::uint64_t at) {
        if (source->ReadAt(at, buffer.data(), size) != size) std::abort();
    };
    const auto readBound = [&](std::uint64_t at) {
        if (bound(at, buffer.data(), size) != size) std::abort();
    };
    for (auto _ : state) {
        const std::uint64_t at = ++turn % kTiles * kTile;
        // The one that comes second finds the bytes in the cache: first once, then again.
        readBound(at);
        if (turn / kTiles % 2 == 0) boundTimes.push_back(bench::SecondsOf([&] { readBound(at); }));
        ourTimes.push_back(bench::SecondsOf([&] { readOurs(at); }));
        if (turn / kTiles % 2 != 0) boundTimes.push_back(bench::SecondsOf([&] { readBound(at); }));
        state.SetIterationTime(ourTimes.back());
    }
    const double ours = LowerQuartile(ourTimes), theirs = LowerQuartile(boundTimes);
    state.counters["ratio"] = theirs / ours;
    state.counters["more_ns"] = (ours - theirs) * 1e9;
    state.counters["GB/s"] = static_cast<double>(size) / ours / 1e9;
}

std::size_t ByFile(std::uint64_t at, char* buffer, std::size_t size) {
    return Tiles().file->ReadAt(at, buffer, size);
}

std::size_t BySystemCall(std::uint64_t at, char* buffer, std::size_t size) {
    return static_cast<std::size_t>(
        pread(Tiles().descriptor, buffer, size, static_cast<off_t>(at)));
}

void TilesBesideFile(benchmark::State& state) { Compare(state, kTile, ByFile); }
BENCHMARK(TilesBesideFile)->DenseRange(0, 2)->UseManualTime()->Unit(benchmark::kMicrosecond);

void TilesBesideSystemCall(benchmark::State& state) { Compare(state, kTile, BySystemCall); }
BENCHMARK(TilesBesideSystemCall)->DenseRange(0, 2)->UseManualTime()->Unit(benchmark::kMicrosecond);

// Sixteen bytes, where the way to the system call is all that differs.
void FewBytesBesideFile(benchmark::State& state) { Compare(state, 16, ByFile); }
BENCHMARK(FewBytesBesideFile)->DenseRange(0, 1)->UseManualTime()->Unit(benchmark::kNanosecond);

}  // namespace
