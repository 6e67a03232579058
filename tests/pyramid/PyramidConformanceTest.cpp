#include "pyramid/PyramidDataConnection.h"
#include "tests/support/ElementTypeList.h"
#include "tests/support/PyramidFiles.h"
#include "tests/support/ReaderConformance.h"
#include "tests/support/ScratchDirectory.h"
#include "tests/support/XercesEnvironment.h"

namespace zmctest {

using namespace zelm;
namespace {

// A raster of one edge tile, so that most windows are merged into it.
template <class T>
class PyramidFixture {
public:
    using Element = T;
    static constexpr std::uint32_t kCapabilities = 7;
    static constexpr std::uint32_t kStatsMask = 127;

    static std::vector<std::int32_t> Interleaves() {
        return {std::begin(kInterleaves), std::end(kInterleaves)};
    }
    static std::int32_t TileInterleave(std::int32_t) { return Interleave::BIP; }

    PyramidFixture(std::uint32_t samples, std::uint32_t lines, std::uint32_t bands,
                   std::int32_t interleave) {
        RasterProps props = PyramidProps(samples, lines, bands, ElementTraits<T>::code);
        props.interleave = interleave;
        Array<String> name;
        name.Append((folder / "conformance.pyr").c_str());
        connection.Create(name, props);
        dispatch = connection.GetReader();
        const std::int32_t pair[] = {2, 2};
        Reader().BuildPyramid(0, 0, 0, pair);
    }

    RasterReader<T>& Reader() { return *dispatch->template As<T>(); }

    // A window with the width or the height of the edge tile goes to the tile's start as it lies,
    // and with a band list not even there.
    template <class Window>
    static bool Arrives(const Window& window, std::uint32_t bands) {
        using Suite = ReaderConformance<PyramidFixture>;
        const bool direct =
            window.box.width == Suite::kSamples || window.box.height == Suite::kLines;
        return !direct || (window.list == AllBands(bands) && window.y == 0 &&
                           window.box.width == Suite::kSamples);
    }

private:
    zmctest::ScratchDirectory folder;
    PyramidDataConnection connection;
    RasterReaderDispatchPtr dispatch;
};

template <class List>
struct FixturesOf;
template <class... Ts>
struct FixturesOf<::testing::Types<Ts...>> {
    using Types = ::testing::Types<PyramidFixture<Ts>...>;
};

INSTANTIATE_TYPED_TEST_SUITE_P(Pyramid, ReaderConformance, FixturesOf<AllElementTypes>::Types);

}  // namespace
}  // namespace zmctest
