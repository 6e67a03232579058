// Header fields of any value through a file: the module lays one out, or refuses to, and reads its
// header back, all beside a model that counts in 128 bits.
#include <cstddef>
#include <cstdint>
#include <xercesc/util/PlatformUtils.hpp>

#include "format/PyramidLimits.h"
#include "fuzz/support/Expect.h"
#include "fuzz/support/InputBytes.h"
#include "fuzz/support/LayoutFields.h"
#include "fuzz/support/NaiveLayout.h"
#include "fuzz/support/ScratchFolder.h"
#include "pyramid/PyramidDataset.h"

namespace {

using zelm::PyramidDataset;
using zmcfuzz::HeaderFields;
using zmcfuzz::InputBytes;
using zmcfuzz::NaiveLayout;
using zmcfuzz::Wide;

namespace PyramidLimits = zelm::PyramidLimits;

class World {
public:
    World() { xercesc::XMLPlatformUtils::Initialize(); }
    zelm::String NewName() const { return (scratch / "new").c_str(); }

private:
    zmcfuzz::ScratchFolder scratch;
};

const World& TheWorld() {
    static const World world;
    return world;
}

// A file that the module itself lays out, and what another dataset makes of its header.
void ExpectFile(const NaiveLayout& layout) {
    const HeaderFields& f = layout.fields;
    zelm::RasterProps props;
    props.samples = f.samples;
    props.lines = f.lines;
    props.bands = f.bands;
    props.pixelType = f.pixelType;
    PyramidDataset made(TheWorld().NewName(), props);
    ZMC_EXPECT(made.TileSize == 256 && made.TileOrdering == (f.bands > 8 ? 2u : 0u));
    made.TileSize = f.tile;
    made.TileOrdering = f.ordering;
    made.CreateFile(f.levelMin, f.levelMax);
    ZMC_EXPECT((made.File != nullptr) == layout.IsAllowed());
    if (!made.File) return;
    const Wide end = made.TileDataStart + layout.TileDataBytes();
    ZMC_EXPECT(made.TileDataEnd == end && made.MetaDocumentOffset == end);
    ZMC_EXPECT(made.LevelCount == f.levelMax - f.levelMin + 1u);
    ZMC_EXPECT(made.HasPyramid == (made.File->Size() >= end));
    Wide offset = made.TileDataStart;
    for (std::uint32_t above = f.levelMax + 1u; above > f.levelMin; --above) {
        ZMC_EXPECT(made.LevelOffsets[above - 1u] == offset);
        offset += layout.LevelBytes(above - 1u);
    }
    ZMC_EXPECT((made.TileOffsets.data != nullptr) ==
               (layout.IsPlanar() && layout.TableBytes() <= PyramidLimits::kMaxEagerTableBytes));
    PyramidDataset opened(TheWorld().NewName());
    ZMC_EXPECT(!opened.ReadHeader());  // false is success
    ZMC_EXPECT(opened.Samples == f.samples && opened.Lines == f.lines &&
               opened.BandCount == f.bands && opened.TileSize == f.tile &&
               opened.LevelMin == f.levelMin && opened.LevelMax == f.levelMax);
    // An ordering that has no word reads as the first.
    ZMC_EXPECT(opened.TileOrdering == (f.ordering > 2 ? 0 : f.ordering));
    ZMC_EXPECT(opened.PixelType == f.pixelType && opened.TileDataEnd == end);
    ZMC_EXPECT(opened.RefreshPyramidState() && opened.HasPyramid == made.HasPyramid);
    made.DeleteFile();
    ZMC_EXPECT(!made.File && !made.HasPyramid);
    ZMC_EXPECT(opened.RefreshPyramidState() && !opened.HasPyramid && !opened.File);
    ZMC_EXPECT(opened.ReadHeader());
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    InputBytes input(data, size);
    const bool hostile = input.Flag();
    ExpectFile(NaiveLayout(hostile ? zmcfuzz::HostileFields(input) : zmcfuzz::SmallFields(input)));
    return 0;
}
