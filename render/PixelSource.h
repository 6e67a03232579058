// PixelSource: where the renderer takes samples from: levels of a raster, window by window.
//
// Samples are pixel-interleaved, lines from the top, in the raster's own type; bands and levels
// count from 0, the finest, of which every level has half the columns and lines, truncated. Used by
// one thread at a time.
#ifndef ZMC_RENDER_PIXELSOURCE_H
#define ZMC_RENDER_PIXELSOURCE_H

#include <cstdint>
#include <span>
#include <string>

#include "host/raster/Raster.h"

namespace zmcrender {

class PixelSource {
public:
    virtual ~PixelSource() = default;
    virtual std::string Name() const = 0;
    virtual std::uint32_t PixelType() const = 0;
    virtual std::uint32_t Bands() const = 0;
    virtual std::uint32_t MinLevel() const = 0;
    virtual std::uint32_t MaxLevel() const = 0;
    virtual std::uint32_t Width(std::uint32_t level) const = 0;
    virtual std::uint32_t Height(std::uint32_t level) const = 0;
    // Side of the tiles that are moved at once.
    virtual std::uint32_t TileSide() const = 0;
    // The window lies within the level. Throws zmchost::Error, or whatever the source throws.
    virtual void Read(std::uint32_t level, const zmchost::Window& window,
                      std::span<const std::uint32_t> bands, void* pixels) = 0;
    // Whether a mask hides pixels, and the mask: a byte for each pixel of the window, 0 where it is
    // hidden.
    virtual bool HasMask() const { return false; }
    virtual void ReadMask(std::uint32_t, const zmchost::Window&, unsigned char*) {}
};

// All of level 0, as far as the levels tell of it; empty where they have all shrunk to nothing.
zmchost::Window WholeOf(const PixelSource& source);
// The same of a raster whose level has so many pixels.
zmchost::Window WholeOfLevel(std::uint32_t level, std::uint32_t width, std::uint32_t height);

// An open raster, which is borrowed.
class RasterPixels final : public PixelSource {
public:
    explicit RasterPixels(zmchost::Raster& opened) : raster(opened) {}
    std::string Name() const override { return raster.Name(); }
    std::uint32_t PixelType() const override { return raster.PixelType(); }
    std::uint32_t Bands() const override { return raster.Bands(); }
    std::uint32_t MinLevel() const override { return raster.MinLevel(); }
    std::uint32_t MaxLevel() const override { return raster.MaxLevel(); }
    std::uint32_t Width(std::uint32_t level) const override { return raster.Width(level); }
    std::uint32_t Height(std::uint32_t level) const override { return raster.Height(level); }
    std::uint32_t TileSide() const override { return raster.TileSide(); }
    void Read(std::uint32_t level, const zmchost::Window& window,
              std::span<const std::uint32_t> bands, void* pixels) override {
        raster.Read(level, window, bands, pixels);
    }

private:
    zmchost::Raster& raster;
};

}  // namespace zmcrender

#endif
