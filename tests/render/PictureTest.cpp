// Pictures in another depth, and with colours.
#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <vector>

#include "render/Picture.h"

namespace zmcrender {
namespace {

using Bytes = std::vector<unsigned char>;

Picture Sixteen(const std::vector<std::uint16_t>& levels, std::uint32_t channels) {
    Picture picture{static_cast<std::uint32_t>(levels.size()) / channels, 1, channels, 16, {}};
    picture.bytes.resize(2 * levels.size());
    std::memcpy(picture.bytes.data(), levels.data(), picture.bytes.size());
    return picture;
}

TEST(Picture, SixteenBitsAreRoundedToEight) {
    for (unsigned level = 0; level < 65536; ++level) {
        const Picture narrow = WithEightBits(Sixteen({static_cast<std::uint16_t>(level)}, 1));
        ASSERT_EQ(narrow.bytes,
                  (Bytes{static_cast<unsigned char>(std::floor(255.0 * level / 65535 + 0.5))}));
        ASSERT_EQ(narrow.depth, 8u);
    }
}

TEST(Picture, EightBitsBecomeSixteenAndComeBack) {
    Picture picture{256, 1, 1, 8, {}};
    for (unsigned i = 0; i < 256; ++i) picture.bytes.push_back(static_cast<unsigned char>(i));
    const Picture wide = WithSixteenBits(picture);
    for (unsigned i = 0; i < 256; ++i)
        ASSERT_EQ(wide.bytes[2 * i] + 256u * wide.bytes[2 * i + 1], 257 * i);
    EXPECT_EQ(WithEightBits(wide).bytes, picture.bytes);
}

TEST(Picture, GreyBecomesThreeEqualColours) {
    EXPECT_EQ(WithColours({2, 1, 1, 8, {7, 9}}).bytes, (Bytes{7, 7, 7, 9, 9, 9}));
    EXPECT_EQ(WithColours({2, 1, 2, 8, {7, 255, 9, 0}}).bytes, (Bytes{7, 7, 7, 255, 9, 9, 9, 0}));
    EXPECT_EQ(WithColours({1, 1, 3, 8, {1, 2, 3}}).bytes, (Bytes{1, 2, 3}));
    EXPECT_EQ(WithColours(Sixteen({1000, 2000}, 2)).bytes,
              Sixteen({1000, 1000, 1000, 2000}, 4).bytes);
}

TEST(Picture, ColoursBecomeTheGreyThatTheEyeSees) {
    const Picture colours{2, 1, 4, 8, {255, 0, 0, 7, 10, 20, 30, 255}};
    const Picture grey = InGrey(colours);
    EXPECT_EQ(grey.channels, 2u);
    EXPECT_EQ(grey.bytes, (Bytes{76, 7, 18, 255}));
    EXPECT_EQ(InGrey(grey).bytes, grey.bytes);
    EXPECT_EQ(InGrey(Sixteen({65535, 65535, 65535, 0, 0, 1000}, 3)).bytes,
              Sixteen({65535, 114}, 1).bytes);
}

TEST(Picture, BlackAndWhiteHasTwoLevelsAndItsAlpha) {
    EXPECT_EQ(InBlackAndWhite({4, 1, 1, 8, {0, 127, 128, 255}}).bytes, (Bytes{0, 0, 255, 255}));
    EXPECT_EQ(InBlackAndWhite({1, 1, 4, 8, {200, 200, 200, 9}}).bytes, (Bytes{255, 9}));
    EXPECT_EQ(InBlackAndWhite(Sixteen({32639, 32896}, 1)).bytes, (Bytes{0, 255}));
}

TEST(Picture, TurnsGoClockwiseAndComeAfterTheMirror) {
    const Picture picture{3, 2, 1, 8, {1, 2, 3, 4, 5, 6}};
    const auto turned = [&](bool mirrored, unsigned quarters) {
        const Picture made = Turned(picture, mirrored, quarters);
        EXPECT_EQ(made.width, quarters % 2 ? 2u : 3u);
        EXPECT_EQ(made.height, quarters % 2 ? 3u : 2u);
        return made.bytes;
    };
    EXPECT_EQ(turned(false, 0), (Bytes{1, 2, 3, 4, 5, 6}));
    EXPECT_EQ(turned(false, 1), (Bytes{4, 1, 5, 2, 6, 3}));
    EXPECT_EQ(turned(false, 2), (Bytes{6, 5, 4, 3, 2, 1}));
    EXPECT_EQ(turned(false, 3), (Bytes{3, 6, 2, 5, 1, 4}));
    EXPECT_EQ(turned(true, 0), (Bytes{3, 2, 1, 6, 5, 4}));
    EXPECT_EQ(turned(true, 1), (Bytes{6, 3, 5, 2, 4, 1}));
    EXPECT_EQ(Turned({2, 1, 3, 8, {1, 2, 3, 4, 5, 6}}, true, 0).bytes, (Bytes{4, 5, 6, 1, 2, 3}));
    EXPECT_EQ(Turned(Sixteen({1, 2}, 1), false, 2).bytes, Sixteen({2, 1}, 1).bytes);
}

}  // namespace
}  // namespace zmcrender
