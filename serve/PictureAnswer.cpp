#include "serve/PictureAnswer.h"

#include <stdexcept>

#include "render/Expression.h"
#include "render/Legend.h"
#include "render/SampleBlock.h"
#include "serve/Parameters.h"

namespace zmcserve {
namespace {

// Of memory that a thread keeps for its next picture.
constexpr std::size_t kKeptBytes = std::size_t{16} << 20;

// Gives the memory back that only a large picture needed.
struct KeptSmall {
    zmcrender::SampleBlock& block;
    ~KeptSmall() {
        if (block.pixels.capacity() + block.mask.capacity() > kKeptBytes) block = {};
    }
};

// Where the thread reads samples: memory that is there already costs less than new memory.
zmcrender::SampleBlock& BlockOfThread() {
    thread_local zmcrender::SampleBlock block;
    return block;
}

struct PictureSamples {
    std::shared_ptr<const zmcrender::Renderer> renderer;
    zmcrender::Samples samples;  // in the block of the thread
};

PictureSamples ReadForPicture(const Service& service, ServedRaster& raster,
                              ServedRaster::Reader& reader, const zmcrender::Style& style,
                              std::uint32_t level, const zmchost::Window& window,
                              const Deadline& deadline) {
    auto renderer = JudgedRenderer(service, raster, style, reader);
    CheckWindow(service, window.Pixels(), renderer->Bands().size() * raster.SampleBytes());
    const zmcrender::Samples samples =
        BlockOfThread().Read(reader.Pixels(), level, window, renderer->Bands(), renderer->Halo());
    raster.File().CheckUnchanged();
    deadline.Check();
    return {std::move(renderer), samples};
}

std::uint64_t PixelsToSample(const zmcrender::PixelSource& source) {
    std::uint64_t most = 0;
    for (const zmchost::Window& window : zmcrender::WindowsToSample(source).windows)
        most = std::max(most, window.Pixels());
    return most;
}

// Whether a window lies in a level of the raster, and is small enough to be read at once.
bool IsTileOfLevel(const ServedRaster& raster, std::uint32_t level, const zmchost::Window& window) {
    if (level < raster.FinestLevel() || level > raster.CoarsestLevel()) return false;
    const zelm::LevelGeometry geometry = raster.Geometry(level);
    const std::uint64_t side = raster.Header().tileSize;
    return window.Right() <= geometry.samples && window.Bottom() <= geometry.lines &&
           window.Pixels() <= side * side;
}

}  // namespace

std::shared_ptr<const zmcrender::Renderer> JudgedRenderer(const Service& service,
                                                          ServedRaster& raster,
                                                          const zmcrender::Style& style,
                                                          ServedRaster::Reader& reader) {
    if (!style.expression.empty()) {
        const auto bands = zmcrender::Expression::Parse(style.expression).Bands().size();
        CheckWindow(service, PixelsToSample(reader.Pixels()), bands * raster.SampleBytes());
    }
    return raster.RendererFor(style, reader);
}

zmcrender::Picture RenderLevelWindow(const Service& service, ServedRaster& raster,
                                     ServedRaster::Reader& reader, const zmcrender::Style& style,
                                     std::uint32_t level, const zmchost::Window& window,
                                     const Deadline& deadline) {
    const KeptSmall kept{BlockOfThread()};
    const PictureSamples read =
        ReadForPicture(service, raster, reader, style, level, window, deadline);
    return read.renderer->Render(read.samples);
}

Answer CodedLevelWindow(const Service& service, ServedRaster& raster, const zmcrender::Style& style,
                        std::uint32_t level, const zmchost::Window& window,
                        zmcrender::PictureFormat format, int quality, const Deadline& deadline) {
    zmcrender::SampleBlock& block = BlockOfThread();
    const KeptSmall kept{block};
    // Others may have the reader while the picture is made.
    const auto [renderer, samples] =
        ReadForPicture(service, raster, *raster.Borrow(deadline), style, level, window, deadline);
    if (!renderer->IsCopy(samples)) return CodedAnswer(renderer->Render(samples), format, quality);
    zmcrender::Picture picture{samples.width, samples.height, renderer->Colours(), 8,
                               std::move(block.pixels)};
    Answer answer = CodedAnswer(picture, format, quality);
    block.pixels = std::move(picture.bytes);
    return answer;
}

zmcrender::Picture RenderLevelWindow(const Service& service, ServedRaster& raster,
                                     const zmcrender::Style& style, std::uint32_t level,
                                     const zmchost::Window& window, const Deadline& deadline) {
    const auto reader = raster.Borrow(deadline);
    return RenderLevelWindow(service, raster, *reader, style, level, window, deadline);
}

zmcrender::Picture RenderScaleWindow(const Service& service, ServedRaster& raster,
                                     const zmcrender::Style& style, std::uint32_t level,
                                     const zmchost::Window& window, const Deadline& deadline) {
    if (IsTileOfLevel(raster, level, window))
        return RenderLevelWindow(service, raster, style, level, window, deadline);
    const auto reader = raster.Borrow(deadline);
    const auto renderer = JudgedRenderer(service, raster, style, *reader);
    zmcrender::Picture picture =
        zmcrender::RenderInScale(*renderer, reader->Pixels(), level, window);
    raster.File().CheckUnchanged();
    deadline.Check();
    return picture;
}

zmcrender::Picture RenderPart(const Service& service, ServedRaster& raster,
                              const zmcrender::Style& style, const zmchost::Window& window,
                              const zmcrender::PictureSize& size, const Deadline& deadline,
                              bool legend) {
    const auto reader = raster.Borrow(deadline);
    const auto renderer = JudgedRenderer(service, raster, style, *reader);
    zmcrender::Picture picture =
        zmcrender::RenderWindow(*renderer, reader->Pixels(), window, size.width, size.height);
    if (legend) picture = zmcrender::WithLegend(std::move(picture), *renderer);
    raster.File().CheckUnchanged();
    deadline.Check();
    return picture;
}

std::uint32_t TileSideOf(const Service& service, const ServedRaster& raster) {
    std::uint32_t side = std::max(raster.Header().tileSize, 1u);
    while (side > 1 &&
           (side > service.limits.side || std::uint64_t{side} * side > service.limits.pixels))
        side /= 2;
    return side;
}

Answer CodedAnswer(const zmcrender::Picture& picture, zmcrender::PictureFormat format,
                   int quality) try {
    Answer answer;
    answer.type = zmcrender::MediaType(format);
    answer.body = zmcrender::Encode(picture, format, quality);
    return answer;
} catch (const std::invalid_argument& error) {
    throw Refusal(400, error.what());
}

}  // namespace zmcserve
