// What each codec writes, decoded by a library that had no part in the writing, or by the codec's
// other half.
#include <gtest/gtest.h>
#include <png.h>
#include <turbojpeg.h>
#include <webp/decode.h>

#include <rapidcheck.h>
#include <cmath>
#include <cstring>
#include <memory>
#include <random>
#include <stdexcept>
#include <thread>
#include <vector>

#include "render/Codec.h"

namespace zmcrender {
namespace {

using Bytes = std::vector<unsigned char>;

Picture Noise(std::mt19937_64& random, std::uint32_t channels, std::uint32_t depth) {
    Picture picture{static_cast<std::uint32_t>(1 + random() % 70),
                    static_cast<std::uint32_t>(1 + random() % 70),
                    channels,
                    depth,
                    {}};
    picture.bytes.resize(picture.LineBytes() * picture.height);
    // Slopes, runs and noise, so that every filter has its lines.
    const unsigned kind = static_cast<unsigned>(random() % 4);
    for (std::size_t i = 0; i < picture.bytes.size(); ++i)
        picture.bytes[i] = static_cast<unsigned char>(kind == 0   ? random()
                                                      : kind == 1 ? i / 3
                                                      : kind == 2 ? i * i / 97
                                                                  : 7);
    return picture;
}

// Colours that change slowly, as photographs do.
Picture Smooth(std::uint32_t channels) {
    Picture picture{128, 96, channels, 8, {}};
    for (std::uint32_t y = 0; y < picture.height; ++y)
        for (std::uint32_t x = 0; x < picture.width; ++x)
            for (std::uint32_t part = 0; part < channels; ++part)
                picture.bytes.push_back(static_cast<unsigned char>(
                    channels % 2 == 0 && part == channels - 1
                        ? 2 * x
                        : 128 + 100 * std::sin((x + 2 * part) / 30.0) * std::cos(y / 25.0)));
    return picture;
}

double MeanError(const Bytes& a, const Bytes& b) {
    if (a.size() != b.size()) return 1e9;
    double sum = 0;
    for (std::size_t i = 0; i < a.size(); ++i) sum += std::abs(a[i] - b[i]);
    return sum / static_cast<double>(a.size());
}

Picture FromPng(const Bytes& file) {
    png_image image{};
    image.version = PNG_IMAGE_VERSION;
    // The simple interface changes samples of 16 bits; only the size and the form are asked of it.
    EXPECT_TRUE(png_image_begin_read_from_memory(&image, file.data(), file.size()));
    png_image_free(&image);
    struct Reader {
        const Bytes& file;
        std::size_t at;
    } reader{file, 0};
    png_structp png = png_create_read_struct(PNG_LIBPNG_VER_STRING, nullptr, nullptr, nullptr);
    png_infop info = png_create_info_struct(png);
    Picture picture;
    if (setjmp(png_jmpbuf(png))) {
        ADD_FAILURE() << "libpng does not read it";
        png_destroy_read_struct(&png, &info, nullptr);
        return picture;
    }
    png_set_read_fn(png, &reader, [](png_structp from, png_bytep to, png_size_t size) {
        auto* const source = static_cast<Reader*>(png_get_io_ptr(from));
        if (size > source->file.size() - source->at) png_error(from, "it ended");
        std::memcpy(to, &source->file[source->at], size);
        source->at += size;
    });
    png_read_info(png, info);
    picture.width = png_get_image_width(png, info);
    picture.height = png_get_image_height(png, info);
    picture.channels = png_get_channels(png, info);
    picture.depth = png_get_bit_depth(png, info);
    picture.bytes.resize(picture.LineBytes() * picture.height);
    png_set_swap(png);
    for (std::size_t y = 0; y < picture.height; ++y)
        png_read_row(png, &picture.bytes[y * picture.LineBytes()], nullptr);
    png_read_end(png, nullptr);
    EXPECT_EQ(reader.at, file.size());
    png_destroy_read_struct(&png, &info, nullptr);
    return picture;
}

struct Destroy {
    void operator()(void* handle) const { tjDestroy(handle); }
};

Picture FromJpeg(const Bytes& file, int* sampling = nullptr) {
    const std::unique_ptr<void, Destroy> handle(tjInitDecompress());
    int width = 0, height = 0, found = 0, space = 0;
    EXPECT_EQ(tjDecompressHeader3(handle.get(), file.data(), file.size(), &width, &height, &found,
                                  &space),
              0);
    if (sampling) *sampling = found;
    const bool grey = space == TJCS_GRAY;
    Picture picture{static_cast<std::uint32_t>(width),
                    static_cast<std::uint32_t>(height),
                    grey ? 1u : 3u,
                    8,
                    {}};
    picture.bytes.resize(picture.LineBytes() * picture.height);
    EXPECT_EQ(tjDecompress2(handle.get(), file.data(), file.size(), picture.bytes.data(), width, 0,
                            height, grey ? TJPF_GRAY : TJPF_RGB, 0),
              0);
    return picture;
}

Picture FromWebP(const Bytes& file) {
    WebPBitstreamFeatures features;
    EXPECT_EQ(WebPGetFeatures(file.data(), file.size(), &features), VP8_STATUS_OK);
    Picture picture{static_cast<std::uint32_t>(features.width),
                    static_cast<std::uint32_t>(features.height),
                    features.has_alpha ? 4u : 3u,
                    8,
                    {}};
    picture.bytes.resize(picture.LineBytes() * picture.height);
    const int stride = static_cast<int>(picture.LineBytes());
    const auto decode = features.has_alpha ? WebPDecodeRGBAInto : WebPDecodeRGBInto;
    EXPECT_NE(decode(file.data(), file.size(), picture.bytes.data(), picture.bytes.size(), stride),
              nullptr);
    return picture;
}

TEST(Png, EveryFormComesBackAsItWas) {
    EXPECT_TRUE(rc::check([](std::uint64_t seed) {
        std::mt19937_64 random(seed);
        for (const std::uint32_t depth : {8u, 16u})
            for (std::uint32_t channels = 1; channels <= 4; ++channels) {
                const Picture picture = Noise(random, channels, depth);
                const Picture back = FromPng(Encode(picture, PictureFormat::Png));
                RC_ASSERT(back.width == picture.width && back.height == picture.height);
                RC_ASSERT(back.channels == channels && back.depth == depth);
                RC_ASSERT(back.bytes == picture.bytes);
            }
    }));
}

TEST(Jpeg, ColoursAndGreyComeBackCloseToWhatTheyWere) {
    for (const std::uint32_t channels : {1u, 3u}) {
        const Picture picture = Smooth(channels);
        const Picture back = FromJpeg(Encode(picture, PictureFormat::Jpeg));
        EXPECT_EQ(back.width, 128u);
        EXPECT_EQ(back.height, 96u);
        EXPECT_EQ(back.channels, channels);
        EXPECT_LT(MeanError(back.bytes, picture.bytes), 2);
    }
}

TEST(Jpeg, AMoreFaithfulOneIsLargerAndCloser) {
    const Picture picture = Smooth(3);
    const Bytes low = Encode(picture, PictureFormat::Jpeg, 30);
    const Bytes high = Encode(picture, PictureFormat::Jpeg, 95);
    EXPECT_LT(low.size(), high.size());
    EXPECT_GT(MeanError(FromJpeg(low).bytes, picture.bytes),
              MeanError(FromJpeg(high).bytes, picture.bytes));
    EXPECT_EQ(Encode(picture, PictureFormat::Jpeg, -5), Encode(picture, PictureFormat::Jpeg, 1));
    EXPECT_EQ(Encode(picture, PictureFormat::Jpeg, 500), Encode(picture, PictureFormat::Jpeg, 100));
}

TEST(Jpeg, ColoursAreHalvedBelowNinety) {
    int sampling = -1;
    FromJpeg(Encode(Smooth(3), PictureFormat::Jpeg, 89), &sampling);
    EXPECT_EQ(sampling, TJSAMP_420);
    FromJpeg(Encode(Smooth(3), PictureFormat::Jpeg, 90), &sampling);
    EXPECT_EQ(sampling, TJSAMP_444);
}

TEST(Jpeg, AlphaIsLaidOverWhite) {
    Picture picture{16, 16, 4, 8, {}};
    for (int i = 0; i < 256; ++i) {
        const unsigned char alpha = i % 16 < 8 ? 0 : 255;
        picture.bytes.insert(picture.bytes.end(), {10, 200, 30, alpha});
    }
    const Picture back = FromJpeg(Encode(picture, PictureFormat::Jpeg, 100));
    ASSERT_EQ(back.channels, 3u);
    EXPECT_NEAR(back.bytes[0], 255, 2);
    EXPECT_NEAR(back.bytes[45], 10, 4);
    EXPECT_NEAR(back.bytes[46], 200, 4);
    Picture grey{16, 16, 2, 8, {}};
    for (int i = 0; i < 256; ++i) grey.bytes.insert(grey.bytes.end(), {55, 128});
    const Picture greyBack = FromJpeg(Encode(grey, PictureFormat::Jpeg, 100));
    ASSERT_EQ(greyBack.channels, 1u);
    EXPECT_NEAR(greyBack.bytes[0], 155, 1);
}

TEST(Jpeg, SixteenBitsBecomeEight) {
    Picture wide{16, 16, 1, 16, {}};
    for (int i = 0; i < 256; ++i) wide.bytes.insert(wide.bytes.end(), {0x34, 0x80});
    EXPECT_NEAR(FromJpeg(Encode(wide, PictureFormat::Jpeg, 100)).bytes[0], 128, 1);
}

TEST(WebP, ComesBackCloseAndAtAHundredAsItWas) {
    for (std::uint32_t channels = 1; channels <= 4; ++channels) {
        const Picture picture = Smooth(channels);
        const Picture back = FromWebP(Encode(picture, PictureFormat::WebP));
        EXPECT_EQ(back.channels, picture.HasAlpha() ? 4u : 3u);
        Picture colours = WithColours(picture);
        if (!picture.HasAlpha()) {
            EXPECT_LT(MeanError(back.bytes, colours.bytes), 4) << channels;
        }
        const Picture exact = FromWebP(Encode(picture, PictureFormat::WebP, 100));
        // A transparent pixel has no colour to keep.
        for (std::size_t i = 0; i < colours.bytes.size() && colours.HasAlpha(); i += 4)
            if (colours.bytes[i + 3] == 0) std::memcpy(&colours.bytes[i], &exact.bytes[i], 3);
        EXPECT_EQ(exact.bytes, colours.bytes) << channels;
    }
}

TEST(WebP, AlphaIsKept) {
    const Picture picture = Smooth(4);
    const Picture back = FromWebP(Encode(picture, PictureFormat::WebP));
    for (std::size_t i = 3; i < picture.bytes.size(); i += 4)
        ASSERT_EQ(back.bytes[i], picture.bytes[i]);
}

TEST(Codec, FormatsGoByTheirNames) {
    EXPECT_EQ(PictureFormatOfName("jpg"), PictureFormat::Jpeg);
    EXPECT_EQ(PictureFormatOfName("JPEG"), PictureFormat::Jpeg);
    EXPECT_EQ(PictureFormatOfName("Png"), PictureFormat::Png);
    EXPECT_EQ(PictureFormatOfName("webp"), PictureFormat::WebP);
    for (const char* name : {"", "gif", "jpe", "png "}) EXPECT_FALSE(PictureFormatOfName(name));
    EXPECT_STREQ(MediaType(PictureFormat::Jpeg), "image/jpeg");
    EXPECT_STREQ(MediaType(PictureFormat::Png), "image/png");
    EXPECT_STREQ(MediaType(PictureFormat::WebP), "image/webp");
}

std::string Refusal(const Picture& picture, PictureFormat format) {
    try {
        static_cast<void>(Encode(picture, format));
    } catch (const std::invalid_argument& error) {
        return error.what();
    }
    return "taken";
}

TEST(Codec, RefusesPicturesThatAreNone) {
    const std::string size = "the picture has not the bytes that its size tells";
    EXPECT_EQ(Refusal({0, 5, 1, 8, {}}, PictureFormat::Png), "the picture is empty");
    EXPECT_EQ(Refusal({2, 2, 3, 8, Bytes(11)}, PictureFormat::Png), size);
    EXPECT_EQ(Refusal({2, 2, 5, 8, Bytes(20)}, PictureFormat::Jpeg), size);
    EXPECT_EQ(Refusal({2, 2, 1, 12, Bytes(4)}, PictureFormat::WebP), size);
    EXPECT_EQ(Refusal({65536, 1, 1, 8, Bytes(65536)}, PictureFormat::Jpeg),
              "JPEG takes no more than 65535 pixels a side");
    EXPECT_EQ(Refusal({1, 16384, 1, 8, Bytes(16384)}, PictureFormat::WebP),
              "WebP takes no more than 16383 pixels a side");
}

TEST(Codec, ThreadsCodeAtOnce) {
    const Picture picture = Smooth(3);
    for (const PictureFormat format :
         {PictureFormat::Jpeg, PictureFormat::Png, PictureFormat::WebP}) {
        const Bytes expected = Encode(picture, format);
        std::vector<Bytes> files(8);
        std::vector<std::thread> threads;
        for (Bytes& file : files)
            threads.emplace_back([&] {
                for (int i = 0; i < 5; ++i) file = Encode(picture, format);
            });
        for (std::thread& thread : threads) thread.join();
        for (const Bytes& file : files) EXPECT_EQ(file, expected);
    }
}

}  // namespace
}  // namespace zmcrender
