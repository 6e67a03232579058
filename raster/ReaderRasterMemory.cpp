#include "raster/ReaderRasterMemory.h"

#include "core/ElementTypes.h"
#include "core/NumericConversion.h"
#include "core/PixelVocabulary.h"
#include "dispatch/NoDataMask.h"
#include "raster/RasterPropsCopy.h"

namespace zelm {
namespace {

ArrayShape ShapeOf(const RasterProps& props) {
    switch (props.interleave) {
        case Interleave::BIP:
            return ArrayShape(props.lines, props.samples, props.bands);
        case Interleave::BIL:
            return ArrayShape(props.lines, props.bands, props.samples);
        case Interleave::BSQ:
            return ArrayShape(props.bands, props.lines, props.samples);
        default:
            return ArrayShape(props.lines, props.samples);
    }
}

// Sizes of 0 count as 1, as they do in the shape of the view.
std::uint32_t AtLeastOne(std::uint32_t size) { return size == 0 ? 1 : size; }

}  // namespace

template <class T>
ReaderRasterMemory<T>::ReaderRasterMemory(RasterDataConnection* owner,
                                          const RasterProps& rasterProps)
    : props(rasterProps) {
    if (!owner) return;
    this->connection = owner;
    void* const pixels = MemoryRasterPixels(owner);
    if (!pixels || !HasLayout()) return;
    data = Array<T>(static_cast<T*>(pixels), ShapeOf(props));
}

template <class T>
RasterProps ReaderRasterMemory<T>::GetRasterProps() const {
    return CopyOfProps(props);
}

template <class T>
void ReaderRasterMemory<T>::SetNoDataValues(const RasterProps& source) {
    try {
        props.TakeNoDataValues(source);
    } catch (...) {
        // The new values are put together before the old ones go, so nothing has changed.
    }
}

template <class T>
RasterBandStats<T> ReaderRasterMemory<T>::GetBandStats(std::uint32_t band) const {
    RasterBandStats<T> stats;
    stats.band = band;
    return stats;
}

template <class T>
T ReaderRasterMemory<T>::GetNoDataValue(std::uint32_t band) const {
    return props.HasNoDataValue(band) ? FromDouble<T>(props.GetNoDataValue(band)) : T{};
}

template <class T>
bool ReaderRasterMemory<T>::ReadTile(std::int32_t x, std::int32_t y, std::uint32_t width,
                                     std::uint32_t height, const Array<int>& bandList,
                                     std::int32_t level, T* buffer, unsigned char* mask) {
    if (!CanMoveTiles(level)) return false;
    const std::uint32_t bands = bandList.shape.elements;
    if (HasLayout())
        CopyTileFromRaster(Layout(), {x, y, width, height}, {bandList.data, bands}, sizeof(T),
                           data.data, buffer);
    ComputeNoDataMask<T>(*this, width, height, bands, buffer, mask);
    return true;
}

template <class T>
bool ReaderRasterMemory<T>::WriteTile(std::int32_t x, std::int32_t y, std::uint32_t width,
                                      std::uint32_t height, const Array<int>& bandList,
                                      std::int32_t level, T* buffer, unsigned char* mask) {
    if (!buffer || !mask || !CanMoveTiles(level)) return false;
    const std::uint32_t bands = bandList.shape.elements;
    ApplyNoDataMask<T>(*this, width, height, bands, buffer, mask);
    if (HasLayout())
        CopyTileToRaster(Layout(), {x, y, width, height}, {bandList.data, bands}, sizeof(T),
                         data.data, buffer);
    return true;
}

template <class T>
bool ReaderRasterMemory<T>::HasLayout() const {
    return IsInterleave(props.interleave);
}

// An interleave that is not known moves no pixel and succeeds at it, so it needs no pixels either.
template <class T>
bool ReaderRasterMemory<T>::CanMoveTiles(std::int32_t level) const {
    return data.IsValid() && level <= 0 && (data.data || !HasLayout());
}

template <class T>
RasterLayout ReaderRasterMemory<T>::Layout() const {
    return {props.interleave, AtLeastOne(props.samples), AtLeastOne(props.lines),
            AtLeastOne(props.bands)};
}

#define ZMC_X(type, name, code) template class ReaderRasterMemory<type>;
ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X

}  // namespace zelm
