#include <webp/encode.h>

#include <memory>
#include <new>
#include <stdexcept>
#include <string>

#include "render/Codecs.h"

namespace zmcrender {
namespace {

struct Clear {
    void operator()(WebPMemoryWriter* writer) const { WebPMemoryWriterClear(writer); }
    void operator()(WebPPicture* picture) const { WebPPictureFree(picture); }
};

WebPConfig Configured(int quality) {
    WebPConfig config;
    if (!WebPConfigInit(&config)) throw std::runtime_error("WebP: another version of the library");
    config.method = 1;  // pictures are made while somebody waits
    config.quality = static_cast<float>(quality);
    config.lossless = quality == 100;
    if (config.lossless) config.quality = 20;  // effort, there
    return config;
}

}  // namespace

std::vector<unsigned char> EncodeWebP(const Picture& picture, int quality) {
    const WebPConfig config = Configured(quality);
    WebPMemoryWriter writer;
    WebPMemoryWriterInit(&writer);
    const std::unique_ptr<WebPMemoryWriter, Clear> clearWriter(&writer);
    WebPPicture source;
    if (!WebPPictureInit(&source)) throw std::runtime_error("WebP: another version of the library");
    const std::unique_ptr<WebPPicture, Clear> clearSource(&source);
    source.width = static_cast<int>(picture.width);
    source.height = static_cast<int>(picture.height);
    source.use_argb = config.lossless;
    source.writer = WebPMemoryWrite;
    source.custom_ptr = &writer;
    const int stride = static_cast<int>(picture.LineBytes());
    const auto import = picture.HasAlpha() ? WebPPictureImportRGBA : WebPPictureImportRGB;
    if (!import(&source, picture.bytes.data(), stride)) throw std::bad_alloc();
    if (!WebPEncode(&config, &source))
        throw std::runtime_error("WebP: error " + std::to_string(source.error_code));
    return {writer.mem, writer.mem + writer.size};
}

}  // namespace zmcrender
