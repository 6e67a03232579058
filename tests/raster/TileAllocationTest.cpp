// What a tile of a memory raster costs in heap allocations: nothing, and with a mask the properties
// that the mask step asks the reader for.
#include <gtest/gtest.h>

#include <vector>

#include "connection/MemoryRasterDataConnection.h"
#include "core/ElementTypes.h"
#include "tests/support/AllocationFaults.h"
#include "tests/support/MemoryRaster.h"
#include "tests/support/TileModel.h"

namespace zmctest {

using namespace zelm;
namespace {

template <class T>
void ExpectNoAllocations(std::int32_t interleave) {
    std::vector<T> pixels = Samples<T>(16 * 9 * 3), tile(pixels.size());
    std::vector<unsigned char> mask(pixels.size(), 0);
    MemoryRasterDataConnection connection;
    const String text = MemoryRasterText(pixels.data())
                            .Size(16, 9, 3)
                            .Layout(interleave)
                            .Type(ElementTraits<T>::code)
                            .Text()
                            .c_str();
    Array<String> argument;
    argument.Append(text);
    ASSERT_TRUE(connection.Open(argument, GeoRefPtr(), MetadataPtr()));
    const RasterReaderDispatchPtr dispatch = connection.GetReader();
    RasterReader<T>& reader = *dispatch->template As<T>();
    RasterProps noData;
    noData.SetBands(3);
    noData.SetNoDataValue(1, 5);
    reader.SetNoDataValues(noData);
    std::vector<int> list{2, 0};
    const Array<int> bands = ListView(list);

    const std::size_t ofProps = CountAllocations([&] { reader.GetRasterProps(); });
    EXPECT_GT(ofProps, 0u) << "the counter counts";
    EXPECT_EQ(
        CountAllocations([&] { reader.ReadTile(1, 1, 14, 7, bands, 0, tile.data(), nullptr); }),
        0u);
    EXPECT_EQ(
        CountAllocations([&] { reader.ReadTile(1, 1, 14, 7, bands, 0, tile.data(), mask.data()); }),
        ofProps);
    EXPECT_EQ(CountAllocations(
                  [&] { reader.WriteTile(1, 1, 14, 7, bands, 0, tile.data(), mask.data()); }),
              ofProps);
}

TEST(TileAllocations, NoneBeyondTheProperties) {
    for (const std::int32_t interleave : kInterleaves) {
#define ZMC_X(type, name, code) ExpectNoAllocations<type>(interleave);
        ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
    }
}

}  // namespace
}  // namespace zmctest
