// RasterView: the samples of a pyramid, or of any raster that GDAL opens, in one shape.
//
// Samples are pixel-interleaved, lines from the top, in the raster's own type; bands and levels
// count from 0. A pyramid is read through the module, so that its types come unchanged; other
// rasters have level 0 only.
#ifndef ZMC_TOOLS_RASTERVIEW_H
#define ZMC_TOOLS_RASTERVIEW_H

#include <cstddef>
#include <cstdint>
#include <functional>
#include <future>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "format/PyramidHeaderRecord.h"
#include "host/file/PyramidFileInfo.h"
#include "host/raster/Raster.h"
#include "render/PixelSource.h"
#include "render/RasterFacts.h"
#include "tools/TerminalProgress.h"

namespace zmctools {

// Of the files that builds write.
inline constexpr std::uint32_t kUsualTile = zelm::kWrittenTileSize;

// Of so many bytes that are gone through between two looks at whether somebody wants an end, as
// many as take no longer with small tiles: each is moved by itself.
constexpr std::uint64_t BytesAtOnce(std::uint64_t bytes, std::uint32_t tileSide) {
    constexpr std::uint64_t kSmall = 64;
    const std::uint64_t side = tileSide < kSmall ? tileSide : kSmall;
    return bytes / (kSmall * kSmall) * side * side;
}

class RasterView : public zmcrender::PixelSource {
public:
    // Throws Failure if what was read since opening may not be of one file in one state: of a
    // pyramid, if it was written to; of others, which are looked up by name, if they or a file of
    // theirs were replaced as well. A file that takes the name of an open pyramid is not met.
    virtual void CheckUnchanged() const = 0;
    // What is archived of a pyramid; of others type and number of the bands alone.
    virtual zmcrender::RasterFacts Facts() const;
    std::uint32_t TileSide() const override { return kUsualTile; }
    // After a walk that went well: pixels elsewhere in the file may be missing.
    virtual void WarnOfMissing() {}

    // Throws UsageError for a level that there is not.
    void CheckLevel(std::uint32_t level) const;
};

// True if there is a regular file of that name that begins like a pyramid.
bool IsPyramidFile(const std::string& name);

// Throws Failure for names of GDAL's virtual file systems and for URLs.
void RefuseElsewhere(const std::string& name, const char* reason);
// Throws Failure if there is no regular file of that name: opening a pipe would wait for its other
// end, and a device may do anything.
void CheckIsFile(const std::string& name);
// Throws Failure if the name is that of something else than a file or a folder.
void CheckIsNoDevice(const std::string& name);

// Throws the Failure of what did not stay as it was.
[[noreturn]] void FailAsChanged(const std::string& name, const std::string& change);
// Throws the Failure of a pyramid that lacks so many bytes.
[[noreturn]] void FailAsIncomplete(const std::string& name, const std::string& bytes);

// The layout of a pyramid file, with a warning of a store into it that was cut off. Throws Failure,
// or what its reader throws.
zmchost::PyramidFileInfo ReadLayout(const std::string& name);

// Opens a pyramid file, any other raster, or whichever of both the name tells.
zmchost::Raster OpenPyramid(const std::string& name);
std::unique_ptr<RasterView> OpenView(const std::string& name);

// The part of a raster that a command works on.
struct Selection {
    std::uint32_t level = 0;
    zmchost::Window window;
    std::vector<std::uint32_t> bands;
};

// A window that is gone through in strips from the top to the bottom. A strip is whole rows of
// tiles as long as these fit what is held at once; else lines, or parts of a line from the left to
// the right, of a pixel at least.
struct Strips {
    zmchost::Window window;
    std::uint64_t pixelBytes = 1;  // that are held for each pixel
    std::uint64_t bytes = 0;       // to hold at once where tiles are of the usual size, less else
    std::uint32_t tileSide = kUsualTile;

    // Calls take(strip) for each. Throws Interruption, of work on the file `name`.
    void Walk(const std::string& name, TerminalProgress& progress,
              const std::function<void(const zmchost::Window& strip)>& take) const;
};

// Runs `task` in a thread of its own or, where there can be none, before it returns. What it throws
// comes out of the future, which waits for its end.
std::future<void> RunBeside(const std::function<void()>& task);

std::size_t StripBytes(const RasterView& view, const Selection& selection,
                       const zmchost::Window& strip);

// What is read of a strip, of one raster or of two.
struct StripSamples {
    std::vector<unsigned char> first, second;
};

// The same for a part of a view, of which some 32 MiB are held: `read` fills the samples of a
// strip, and in another thread `use` goes through them while the next strip is read. Both are
// called for one strip after the other; what either throws comes out, once no thread is at work any
// more. Throws too where the view lacks some of it.
void WalkStrips(RasterView& view, const Selection& selection, TerminalProgress& progress,
                const std::function<void(const zmchost::Window& strip, StripSamples&)>& read,
                const std::function<void(const zmchost::Window& strip, const StripSamples&)>& use);

}  // namespace zmctools

#endif
