// Tiles of memory rasters against a naive index model, for every element type and interleave.
#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>

#include <algorithm>

#include "connection/MemoryRasterDataConnection.h"
#include "tests/support/ElementTypeList.h"
#include "tests/support/MemoryRaster.h"
#include "tests/support/TileModel.h"

namespace zmctest {

using namespace zelm;
namespace {

struct Case {
    std::int32_t interleave;
    Box raster;
    std::size_t x, y;
    Box tile;
    std::vector<int> list;
};

// Shapes in which whole lines, whole rasters and neighbouring bands are frequent, and bands that
// are named twice or in disorder occur. Lists of many bands reach the copies of blocks of bands.
Case MakeCase(std::uint32_t seed) {
    Random random(seed);
    Case c;
    c.interleave = kInterleaves[random.Between(0, 3)];
    const std::size_t most = random.OneIn(6) ? 90 : 6;
    c.raster = {random.Between(1, 9), random.Between(1, 7), random.Between(1, most)};
    c.tile.width = random.OneIn(2) ? c.raster.width : random.Between(0, c.raster.width);
    c.tile.height = random.OneIn(2) ? c.raster.height : random.Between(0, c.raster.height);
    c.x = random.Between(0, c.raster.width - c.tile.width);
    c.y = random.Between(0, c.raster.height - c.tile.height);
    const std::size_t first = random.OneIn(2) ? 0 : random.Between(0, c.raster.bands - 1);
    const std::size_t end =
        random.OneIn(2) ? c.raster.bands : random.Between(first, c.raster.bands);
    for (std::size_t b = first; b < end; ++b) c.list.push_back(static_cast<int>(b));
    const std::size_t extra = random.OneIn(2) ? random.Between(0, 7) : 0;
    for (std::size_t i = 0; i < extra; ++i)
        c.list.insert(c.list.begin() + static_cast<long>(random.Between(0, c.list.size())),
                      static_cast<int>(random.Between(0, c.raster.bands - 1)));
    c.tile.bands = c.list.size();
    return c;
}

// Calls visit(index in the raster, index in the tile), bands in the order of the list.
template <class Visit>
void ForEachPair(const Case& c, Visit&& visit) {
    const bool planar = c.interleave == Interleave::None;
    for (std::size_t k = 0; k < (planar ? 1 : c.tile.bands); ++k)
        for (std::size_t l = 0; l < c.tile.height; ++l)
            for (std::size_t s = 0; s < c.tile.width; ++s)
                visit(c.raster.Index(c.interleave, planar ? 0 : static_cast<std::size_t>(c.list[k]),
                                     c.y + l, c.x + s),
                      c.tile.Index(c.interleave, k, l, s));
}

// A raster and a tile between guards, which no copy may touch.
template <class T>
struct Scene {
    static constexpr std::size_t kGuard = 8;

    explicit Scene(const Case& shape)
        : c(shape),
          pixels(Samples<T>(c.raster.Elements(c.interleave) + 2 * kGuard, 1)),
          tile(Samples<T>(c.tile.Elements(c.interleave) + 2 * kGuard, 1000)),
          mask(tile.size(), 0) {
        MemoryRasterText text(pixels.data() + kGuard);
        text.Size(c.raster.width, c.raster.height, c.raster.bands)
            .Layout(c.interleave)
            .Type(ElementTraits<T>::code);
        RC_ASSERT(connection.Open(Argument({text.Text()}), GeoRefPtr(), MetadataPtr()));
        dispatch = connection.GetReader();
    }

    bool Read() {
        return Reader().ReadTile(X(), Y(), Width(), Height(), ListView(c.list), 0,
                                 tile.data() + kGuard, nullptr);
    }
    bool Write() {
        return Reader().WriteTile(X(), Y(), Width(), Height(), ListView(c.list), 0,
                                  tile.data() + kGuard, mask.data());
    }

    RasterReader<T>& Reader() { return *dispatch->template As<T>(); }
    int X() const { return static_cast<int>(c.x); }
    int Y() const { return static_cast<int>(c.y); }
    std::uint32_t Width() const { return static_cast<std::uint32_t>(c.tile.width); }
    std::uint32_t Height() const { return static_cast<std::uint32_t>(c.tile.height); }

    Case c;
    std::vector<T> pixels, tile;
    std::vector<unsigned char> mask;
    MemoryRasterDataConnection connection;
    RasterReaderDispatchPtr dispatch;
};

template <class T>
class MemoryTiles : public ::testing::Test {};

TYPED_TEST_SUITE(MemoryTiles, AllElementTypes, ElementTypeNames);

TYPED_TEST(MemoryTiles, AreReadAsTheModelSays) {
    EXPECT_TRUE(rc::check([](std::uint32_t seed) {
        Scene<TypeParam> scene(MakeCase(seed));
        auto expected = scene.tile;
        ForEachPair(scene.c, [&](std::size_t inRaster, std::size_t inTile) {
            expected[scene.kGuard + inTile] = scene.pixels[scene.kGuard + inRaster];
        });
        const auto kept = scene.pixels;
        RC_ASSERT(scene.Read());
        RC_ASSERT(SameBits(scene.tile, expected));
        RC_ASSERT(SameBits(scene.pixels, kept));
    }));
}

TYPED_TEST(MemoryTiles, AreWrittenAsTheModelSays) {
    EXPECT_TRUE(rc::check([](std::uint32_t seed) {
        Scene<TypeParam> scene(MakeCase(seed));
        auto expected = scene.pixels;
        ForEachPair(scene.c, [&](std::size_t inRaster, std::size_t inTile) {
            expected[scene.kGuard + inRaster] = scene.tile[scene.kGuard + inTile];
        });
        const auto kept = scene.tile;
        RC_ASSERT(scene.Write());
        RC_ASSERT(SameBits(scene.pixels, expected));
        RC_ASSERT(SameBits(scene.tile, kept));
    }));
}

}  // namespace
}  // namespace zmctest
