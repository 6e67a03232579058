#include "connection/MemoryRasterDataConnection.h"
#include "tests/support/ElementTypeList.h"
#include "tests/support/MemoryRaster.h"
#include "tests/support/ReaderConformance.h"

namespace zmctest {

using namespace zelm;
namespace {

template <class T>
class MemoryFixture {
public:
    using Element = T;
    static constexpr std::uint32_t kCapabilities = 1;
    static constexpr std::uint32_t kStatsMask = 0;

    static std::vector<std::int32_t> Interleaves() {
        return {std::begin(kInterleaves), std::end(kInterleaves)};
    }
    static std::int32_t TileInterleave(std::int32_t interleave) { return interleave; }

    MemoryFixture(std::uint32_t samples, std::uint32_t lines, std::uint32_t bands,
                  std::int32_t interleave)
        : pixels(std::size_t{samples} * lines * bands) {
        MemoryRasterText text(pixels.data());
        text.Size(samples, lines, bands).Layout(interleave).Type(ElementTraits<T>::code);
        connection.Open(Argument({text.Text()}), GeoRefPtr(), MetadataPtr());
        dispatch = connection.GetReader();
    }

    RasterReader<T>& Reader() { return *dispatch->template As<T>(); }

private:
    std::vector<T> pixels;
    MemoryRasterDataConnection connection;
    RasterReaderDispatchPtr dispatch;
};

template <class List>
struct FixturesOf;
template <class... Ts>
struct FixturesOf<::testing::Types<Ts...>> {
    using Types = ::testing::Types<MemoryFixture<Ts>...>;
};

INSTANTIATE_TYPED_TEST_SUITE_P(Memory, ReaderConformance, FixturesOf<AllElementTypes>::Types);

}  // namespace
}  // namespace zmctest
