// PictureAnswer: parts of a raster rendered and coded, for all services that send pictures.
//
// All throw what rendering throws: Refusal, zmcrender::StyleError, zmchost::Error.
#ifndef ZMC_SERVE_PICTUREANSWER_H
#define ZMC_SERVE_PICTUREANSWER_H

#include <cstdint>
#include <memory>

#include "render/Codec.h"
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
                                     const zmcrender::Style& style, std::uint32_t level,
                                     const zmchost::Window& window, const Deadline& deadline);

// The same, coded, as an answer without validators. Samples that are the picture already go from
// where they were read to the codec.
Answer CodedLevelWindow(const Service& service, ServedRaster& raster, const zmcrender::Style& style,
                        std::uint32_t level, const zmchost::Window& window,
                        zmcrender::PictureFormat format, int quality, const Deadline& deadline);

// The coded picture as an answer without validators.
Answer CodedAnswer(const zmcrender::Picture& picture, zmcrender::PictureFormat format, int quality);

}  // namespace zmcserve

#endif
