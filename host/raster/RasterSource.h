// RasterSource: where a builder takes its pixels from.
//
// Anything that can describe itself and fill a buffer with a rectangle of itself. All operations
// are called by one thread at a time, though not always by the same one, and may throw: a builder
// then leaves nothing behind and lets the exception through.
#ifndef ZMC_HOST_RASTER_RASTERSOURCE_H
#define ZMC_HOST_RASTER_RASTERSOURCE_H

#include <cstdint>
#include <optional>
#include <span>
#include <string>

#include "colour/Palette.h"
#include "format/Rectangle.h"
#include "raster/RasterProps.h"

namespace zmchost {

// Columns [x, x + width) and lines [y, y + height) of a level or of a source, in pixels.
using Window = zelm::Rectangle;

// What tells that samples of a raster do not all count alike when levels are reduced (see
// host/reduce/Weighing.h), beside no-data values. By default nothing does.
class SampleWeights {
public:
    virtual ~SampleWeights() = default;

    // The band whose samples are the alpha of this one; never itself.
    virtual std::optional<std::uint32_t> AlphaBand(std::uint32_t band) const {
        static_cast<void>(band);
        return std::nullopt;
    }

    // Whether a mask hides samples of the band; bands may have one in common.
    virtual bool HasMask(std::uint32_t band) const {
        static_cast<void>(band);
        return false;
    }

    // Fills `shown` with a window of the finest level, one byte for each sample in the order of
    // RasterSource::Read: 0 where the mask of the band hides it, anything else where it does not.
    // Of a band without a mask it tells where its alpha band is 0. Asked only for bands that have
    // one of both, for any window within the raster, and for the same one as often as it is needed.
    // Throws as Read does.
    virtual void ReadMask(const Window& window, std::span<const std::uint32_t> bands,
                          unsigned char* shown) {
        static_cast<void>(window);
        static_cast<void>(bands);
        static_cast<void>(shown);
    }
};

class RasterSource : public SampleWeights {
public:
    // Name for messages, a file name as a rule.
    virtual std::string Name() const = 0;

    // Size, bands, pixel type and no-data values; what else the record holds is not looked at.
    virtual zelm::RasterProps Props() const = 0;

    // The palette of a band, or an empty pointer.
    virtual zelm::PalettePtr BandPalette(std::uint32_t band) const {
        static_cast<void>(band);
        return zelm::PalettePtr();
    }

    // Fills `pixels` with the window: its lines from the top, without gaps, each pixel the samples
    // of `bands` in that order (pixel-interleaved), in the source's pixel type. The window lies
    // within the raster and holds whole lines, from the top, each once; only where a raster is too
    // wide for the memory of a build it is asked for column by column, each from the top, and
    // kernels that look beyond a column have its edges asked for twice.
    virtual void Read(const Window& window, std::span<const std::uint32_t> bands, void* pixels) = 0;
};

}  // namespace zmchost

#endif
