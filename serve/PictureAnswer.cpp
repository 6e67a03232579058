#include "serve/PictureAnswer.h"

#include <stdexcept>

#include "render/Expression.h"
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

std::uint64_t PixelsToSample(const zmcrender::PixelSource& source) {
    std::uint64_t most = 0;
    for (const zmchost::Window& window : zmcrender::WindowsToSample(source).windows)
        most = std::max(most, window.Pixels());
    return most;
}

}  // namespace

zmcrender::Picture RenderLevelWindow(const Service& service, ServedRaster& raster,
                                     const zmcrender::Style& style, std::uint32_t level,
                                     const zmchost::Window& window, const Deadline& deadline) {
    const auto reader = raster.Borrow(deadline);
    return RenderLevelWindow(service, raster, *reader, style, level, window, deadline);
}

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
    thread_local zmcrender::SampleBlock block;
    const KeptSmall kept{block};
    const auto renderer = JudgedRenderer(service, raster, style, reader);
    CheckWindow(service, window.Pixels(), renderer->Bands().size() * raster.SampleBytes());
    const zmcrender::Samples samples =
        block.Read(reader.Pixels(), level, window, renderer->Bands(), renderer->Halo());
    raster.File().CheckUnchanged();
    deadline.Check();
    return renderer->Render(samples);
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
