// Channel: one band of a raster's samples, as levels of a picture or as values.
//
// The type of the samples is chosen once, when a channel is made; its work goes a line at a time.
// Does not change then; any number of threads may use one.
#ifndef ZMC_RENDER_CHANNEL_H
#define ZMC_RENDER_CHANNEL_H

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>

#include "render/Ramp.h"
#include "render/Style.h"
#include "render/Tone.h"

namespace zmcrender {

// Samples of one band in one line, aligned as their type.
struct SampleLine {
    const unsigned char* at = nullptr;
    std::size_t stride = 0;  // bytes from one to the next
    std::uint32_t count = 0;
};

// Samples of all bands in one line, and how to come to others.
struct PixelLine {
    const unsigned char* at = nullptr;  // the first pixel that is shown
    std::size_t pixelBytes = 0;
    std::size_t bandBytes = 0;
    std::size_t lineBytes = 0;
    std::uint32_t count = 0;
    double pixelSide = 1;  // in pixels of level 0

    SampleLine Band(std::size_t place) const { return {at + place * bandBytes, pixelBytes, count}; }
    // One that begins `halo` pixels to the left, `line` lines below, and ends as far to the right.
    PixelLine Around(std::uint32_t halo, int line) const {
        PixelLine moved = *this;
        moved.at += line * static_cast<std::ptrdiff_t>(lineBytes) -
                    static_cast<std::ptrdiff_t>(halo * pixelBytes);
        moved.count = count + 2 * halo;
        return moved;
    }
};

class Channel {
public:
    virtual ~Channel() = default;
    // Whether a sample can be missing.
    virtual bool MayMiss() const = 0;
    // Whether the level of 8 bits of each sample is the sample.
    virtual bool IsPlain() const = 0;
    // Levels, `step` apart; 0 of what is missing. Only in the width that the channel was made for.
    virtual void Levels(const SampleLine& line, std::uint8_t* levels, std::size_t step) const = 0;
    virtual void Levels(const SampleLine& line, std::uint16_t* levels, std::size_t step) const = 0;
    // Makes 255 of what is not missing, and leaves the rest.
    virtual void MarkPresent(const SampleLine& line, unsigned char* present) const = 0;
    // As doubles; a NaN of what is missing.
    virtual void Values(const SampleLine& line, double* values) const = 0;
    // Widens a range by the samples that are not missing and, unless `shown` is null, are not 0
    // there.
    virtual void Widen(const SampleLine& line, const unsigned char* shown,
                       std::optional<Range>& range) const = 0;
};

struct ChannelSettings {
    std::uint32_t pixelType = 0;
    std::optional<Number> noData;
    ComplexPart part = ComplexPart::Magnitude;
    // For levels alone.
    Range range;
    std::shared_ptr<const Tone> tone;  // null: no levels are wanted
    std::uint32_t depth = 8;
};

// Null for a pixel type without a reader.
std::unique_ptr<const Channel> MakeChannel(const ChannelSettings& settings);

// Levels of values; 0 of NaN.
void LevelsOf(const double* values, std::size_t count, const RealRamp& ramp, const Tone& tone,
              std::uint8_t* levels);
void LevelsOf(const double* values, std::size_t count, const RealRamp& ramp, const Tone& tone,
              std::uint16_t* levels);

}  // namespace zmcrender

#endif
