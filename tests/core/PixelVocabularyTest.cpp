#include "core/PixelVocabulary.h"

#include <gtest/gtest.h>

namespace zelm {
namespace {

TEST(PixelVocabulary, WordsOfCodesWithoutReader) {
    EXPECT_STREQ(PixelTypeName(95), "Quad");
    EXPECT_STREQ(PixelTypeName(7), "Unknown");
    EXPECT_STREQ(PixelTypeName(0), "Unknown");
    EXPECT_STREQ(PixelTypeName(100), "Unknown");
}

}  // namespace
}  // namespace zelm
