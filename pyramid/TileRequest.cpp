#include "pyramid/TileRequest.h"

#include <initializer_list>

#include "core/CheckedArithmetic.h"
#include "core/PixelVocabulary.h"
#include "format/PyramidLimits.h"

namespace zelm {
namespace {

constexpr std::uint64_t kTransferLimit = std::uint64_t{1} << 32;

bool IsIdentity(const Array<int>& bandList, std::uint32_t bandCount) {
    if (bandList.shape.elements != bandCount) return false;
    for (std::uint32_t i = 0; i < bandCount; ++i)
        if (bandList.data[i] != static_cast<int>(i)) return false;
    return true;
}

bool HoldsBands(const Array<int>& bandList, std::uint32_t bandCount) {
    if (bandList.shape.elements == 0) return true;
    if (!bandList.data) return false;
    const auto outside = [&](int band) {
        return band < 0 || static_cast<std::uint32_t>(band) >= bandCount;
    };
    return std::none_of(bandList.data, bandList.data + bandList.shape.elements, outside);
}

// The second test is for sizes so close to 2^32 that the tile count wraps.
bool Contains(const LevelGeometry& level, const Rectangle& rect) {
    return level.Whole().Contains(rect) &&
           level.HasTile((rect.x + rect.width - 1u) / level.tileSize,
                         (rect.y + rect.height - 1u) / level.tileSize);
}

bool StaysInRange(std::initializer_list<std::uint64_t> factors) {
    return FitsWithin(CheckedProduct(factors), kTransferLimit - 1u);
}

}  // namespace

bool TileRequest::IsServed(const PyramidHeaderRecord& header, const Rectangle& rect,
                           const Array<int>& bandList, std::int32_t level) {
    const auto at = static_cast<std::uint32_t>(level);
    const bool planar = header.IsPlanar();
    if (header.bandCount == 0 || header.tileSize == 0 ||
        header.tileSize > PyramidLimits::kMaxTileSize || level < 0 || at < header.levelMin ||
        at > header.levelMax || at >= LevelGeometry::kLevelsWithPixels)
        return false;
    // In the ordering Morton tiles that shrink to nothing have no address.
    if (planar && (header.tileSize >> at == 0 || bandList.shape.elements == 0)) return false;
    const std::uint64_t sampleBytes = PixelSize(header.pixelType);
    const std::uint64_t listed = bandList.shape.elements;
    const std::uint64_t wide = std::max<std::uint64_t>(listed, planar ? 0 : header.bandCount);
    const LevelGeometry base = header.Geometry(0);
    return Contains(header.Geometry(at), rect) && base.tilesAcross != 0 && base.tilesDown != 0 &&
           HoldsBands(bandList, header.bandCount) &&
           StaysInRange({rect.width, rect.height, wide, sampleBytes}) &&
           StaysInRange({header.tileSize, planar ? 1 : header.bandCount, sampleBytes});
}

TileRequest::TileRequest(const PyramidHeaderRecord& header, const Rectangle& rectangle,
                         const Array<int>& bandList, std::uint32_t atLevel)
    : geometry(header.Geometry(atLevel)),
      rect(rectangle),
      level(atLevel),
      planar(header.IsPlanar()),
      list(bandList.data),
      allInOrder(bandList.shape.elements == 0 || IsIdentity(bandList, header.bandCount)),
      bands(allInOrder ? header.bandCount : bandList.shape.elements),
      planes(planar ? bands : 1),
      sampleBytes(PixelSize(header.pixelType)),
      tilePixelBytes(std::uint64_t{planar ? 1 : header.bandCount} * sampleBytes),
      bufferPixelBytes(std::uint64_t{bands} * sampleBytes) {}

std::uint64_t TileRequest::RunBytes() const {
    const bool oneColumn =
        rect.x % geometry.tileSize == 0 && rect.width == geometry.TileWidth(FirstTileX());
    if (LiesAlike() && (block || oneColumn)) return 0;
    const std::uint64_t row = std::uint64_t{block ? rect.width : geometry.tileSize} * sampleBytes;
    if (!planar) return kRunBytes;
    const std::uint64_t together = std::min(planes, planesTogether);
    return std::max(kPlanesRunBytes, row * together) + together * kPlaneGap;
}

}  // namespace zelm
