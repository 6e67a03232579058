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

}  // namespace
}  // namespace zmcrender
