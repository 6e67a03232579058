#include "pyramid/PyramidRasterReader.h"

#include <new>
#include <type_traits>

#include "core/ElementTypes.h"
#include "core/NumericConversion.h"
#include "core/PixelVocabulary.h"
#include "dispatch/NoDataMask.h"
#include "pyramid/PyramidDataConnection.h"
#include "raster/RasterPropsCopy.h"

namespace zelm {
namespace {

// What readers tell of the tiles, whatever the size in the file is.
constexpr std::uint32_t kToldTileSize = kWrittenTileSize;

// The georeference is told the size after each change, samples before lines.
void Describe(const PyramidDataset& dataset, const GeoRefPtr& geoRef, const MetadataPtr& metadata,
              RasterProps& props) {
    props.SetGeoRef(geoRef);
    if (metadata) props.metadata = *metadata;
    props.interleave = dataset.Interleave;
    props.SetSamples(dataset.Samples);
    props.tileSamples = kToldTileSize;
    props.SetLines(dataset.Lines);
    props.tileLines = kToldTileSize;
    props.SetBands(dataset.BandCount);
    props.pixelType = dataset.PixelType;
}

// Levels count modulo 32, as in the layout of the file.
std::uint32_t SizeAt(std::uint32_t size, std::int32_t level, bool reduced) {
    return reduced && level > 0 ? LevelGeometry::Shifted(size, static_cast<std::uint32_t>(level))
                                : size;
}

}  // namespace

template <class T>
PyramidRasterReader<T>::PyramidRasterReader(PyramidDataConnection* owner, GeoRefPtr geoRef,
                                            MetadataPtr metadata) {
    if (!owner) return;
    this->connection = owner;
    dataset = owner->GetDataset();
    if (dataset) Describe(*dataset, geoRef, metadata, props);
}

template <class T>
RasterProps PyramidRasterReader<T>::GetRasterProps() const {
    return CopyOfProps(props);
}

template <class T>
std::uint32_t PyramidRasterReader<T>::GetSamples(std::int32_t level) const {
    return SizeAt(props.samples, level, HasPyramid());
}

template <class T>
std::uint32_t PyramidRasterReader<T>::GetLines(std::int32_t level) const {
    return SizeAt(props.lines, level, HasPyramid());
}

template <class T>
std::int32_t PyramidRasterReader<T>::GetMinLevel() const {
    return dataset ? static_cast<std::int32_t>(dataset->LevelMin) : 0;
}

template <class T>
std::int32_t PyramidRasterReader<T>::GetMaxLevel() const {
    return dataset ? static_cast<std::int32_t>(dataset->LevelMax) : 0;
}

template <class T>
bool PyramidRasterReader<T>::BuildPyramid(std::int32_t minLevel, std::int32_t maxLevel,
                                          std::int32_t, const std::int32_t* pair) {
    if (!dataset || !pair || pair[0] != pair[1]) return false;
    dataset->CreateFile(static_cast<std::uint32_t>(minLevel), static_cast<std::uint32_t>(maxLevel));
    return true;
}

template <class T>
bool PyramidRasterReader<T>::DeletePyramid() {
    if (!dataset) return false;
    dataset->DeleteFile();
    return true;
}

template <class T>
bool PyramidRasterReader<T>::RefreshPyramidState() {
    return dataset && dataset->RefreshPyramidState();
}

template <class T>
bool PyramidRasterReader<T>::HasBandStats(std::uint32_t band) const {
    return dataset && dataset->template HasBandStats<T>(band);
}

template <class T>
void PyramidRasterReader<T>::SetNoDataValues(const RasterProps& source) {
    try {
        props.TakeNoDataValues(source);
    } catch (...) {
        // The new values are put together before the old ones go, so nothing has changed.
    }
}

template <class T>
bool PyramidRasterReader<T>::HasPalette(std::uint32_t band) const {
    const PalettePtr palette = GetPalette(band);
    return palette && palette->nextIndex != 0;
}

template <class T>
PalettePtr PyramidRasterReader<T>::GetPalette(std::uint32_t band) const {
    if (dataset) return dataset->template GetPalette<T>(band);
    return PalettePtr(new (std::nothrow) Palette);
}

template <class T>
bool PyramidRasterReader<T>::SetPalette(std::uint32_t band, const Palette& palette) {
    if (!dataset) return false;
    dataset->SetPalette(band, palette);
    return true;
}

template <class T>
RasterBandStats<T> PyramidRasterReader<T>::GetBandStats(std::uint32_t band) const {
    if (!dataset) return RasterBandStats<T>();
    return dataset->template GetBandStats<T>(static_cast<std::int32_t>(band));
}

template <class T>
bool PyramidRasterReader<T>::SetBandStats(const Array<RasterBandStats<T>>& stats) {
    if (!dataset) return false;
    dataset->SetBandStats(stats);
    return true;
}

template <class T>
Array<RasterBandHistogram<T>> PyramidRasterReader<T>::GetHistograms() const {
    if (!dataset) return {};
    return dataset->template GetHistograms<T>();
}

template <class T>
bool PyramidRasterReader<T>::SetHistograms(const Array<RasterBandHistogram<T>>& histograms) {
    if (!dataset) return false;
    dataset->SetHistograms(histograms);
    return true;
}

template <class T>
T PyramidRasterReader<T>::GetNoDataValue(std::uint32_t band) const {
    // The signed types up to 32 bits are cut from an integer of 32 bits, the others from one of 64.
    constexpr bool narrow =
        std::is_integral_v<T> && std::is_signed_v<T> && sizeof(T) <= sizeof(std::int32_t);
    using Wide = std::conditional_t<narrow, std::int32_t, std::int64_t>;
    if (!HasNoDataValue(band)) return T();
    return FromDouble<T, Wide>(props.GetNoDataValue(band));
}

template <class T>
bool PyramidRasterReader<T>::ReadTile(std::int32_t x, std::int32_t y, std::uint32_t width,
                                      std::uint32_t height, const Array<int>& bandList,
                                      std::int32_t level, T* buffer, unsigned char* mask) {
    if (!dataset || !buffer) return false;
    if (width == 0 || height == 0) return true;
    if (x < 0 || y < 0) return false;
    if (!dataset->ReadTile(static_cast<std::uint32_t>(x), static_cast<std::uint32_t>(y), width,
                           height, bandList, level, buffer))
        return false;
    ComputeNoDataMask<T>(*this, width, height, bandList.shape.elements, buffer, mask);
    return true;
}

template <class T>
bool PyramidRasterReader<T>::WriteTile(std::int32_t x, std::int32_t y, std::uint32_t width,
                                       std::uint32_t height, const Array<int>& bandList,
                                       std::int32_t level, T* buffer, unsigned char* mask) {
    if (!dataset || !buffer || !mask) return false;
    if (width == 0 || height == 0) return true;
    if (x < 0 || y < 0) return false;
    const auto left = static_cast<std::uint32_t>(x);
    const auto top = static_cast<std::uint32_t>(y);
    // A refusal leaves the buffer as it was, so it has to come before the stamping.
    if (!dataset->AcceptsTile(left, top, width, height, bandList, level)) return false;
    ApplyNoDataMask<T>(*this, width, height, bandList.shape.elements, buffer, mask);
    if (dataset->TileOrdering <= TileOrder::Blocked)
        return dataset->WriteTileInterleaved(left, top, width, height, bandList, level, buffer);
    return dataset->WriteTileMorton(left, top, width, height, bandList, level, buffer);
}

#define ZMC_X(type, name, code) template class PyramidRasterReader<type>;
ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X

}  // namespace zelm
