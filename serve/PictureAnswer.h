// PictureAnswer: parts of a raster rendered and coded, for all services that send pictures.
//
// All throw what rendering throws: Refusal, zmcrender::StyleError, zmchost::Error.
#ifndef ZMC_SERVE_PICTUREANSWER_H
#define ZMC_SERVE_PICTUREANSWER_H

#include <cstdint>
#include <memory>

#include "render/Codec.h"
#include "render/PictureSize.h"
#include "render/Renderer.h"
#include "serve/Answer.h"
#include "serve/Request.h"
#include "serve/Service.h"

namespace zmcserve {

// The renderer of a style, which is judged first: one that would have to look at more samples than
// are held at once is refused.
std::shared_ptr<const zmcrender::Renderer> JudgedRenderer(const Service& service,
                                                          ServedRaster& raster,
                                                          const zmcrender::Style& style,
                                                          ServedRaster::Reader& reader);

// The pixels of a window of a level, one to one. The file was unchanged when they were read.
zmcrender::Picture RenderLevelWindow(const Service& service, ServedRaster& raster,
                                     ServedRaster::Reader& reader, const zmcrender::Style& style,
                                     std::uint32_t level, const zmchost::Window& window,
                                     const Deadline& deadline);
// The same with a reader of its own.
zmcrender::Picture RenderLevelWindow(const Service& service, ServedRaster& raster,
                                     const zmcrender::Style& style, std::uint32_t level,
                                     const zmchost::Window& window, const Deadline& deadline);

// The same, coded, as an answer without validators. Samples that are the picture already go from
// where they were read to the codec.
Answer CodedLevelWindow(const Service& service, ServedRaster& raster, const zmcrender::Style& style,
                        std::uint32_t level, const zmchost::Window& window,
                        zmcrender::PictureFormat format, int quality, const Deadline& deadline);

// The pixels of a window of the raster in the scale 1 / 2^level, one to one, whether the raster has
// such a level or not: render/Renderer.h. The file was unchanged when they were read.
zmcrender::Picture RenderScaleWindow(const Service& service, ServedRaster& raster,
                                     const zmcrender::Style& style, std::uint32_t level,
                                     const zmchost::Window& window, const Deadline& deadline);

// A window of level 0 in another size, with a legend under it if that is wanted. The file was
// unchanged when it was read.
zmcrender::Picture RenderPart(const Service& service, ServedRaster& raster,
                              const zmcrender::Style& style, const zmchost::Window& window,
                              const zmcrender::PictureSize& size, const Deadline& deadline,
                              bool legend = false);

// The side of the tiles into which other services cut a raster: that of its own, halved until a
// picture of one is within the limits.
std::uint32_t TileSideOf(const Service& service, const ServedRaster& raster);

// The coded picture as an answer without validators.
Answer CodedAnswer(const zmcrender::Picture& picture, zmcrender::PictureFormat format, int quality);

}  // namespace zmcserve

#endif
