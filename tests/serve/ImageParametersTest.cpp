// The parts of an address of the IIIF Image API: every form, and what is none.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "serve/Answer.h"
#include "serve/ImageParameters.h"

namespace zmcserve {
namespace {

using zmchost::Window;
using zmcrender::PictureSize;

constexpr Window kWhole{0, 0, 300, 200};
constexpr ImageLimits kWide{8192, 1u << 24};

// "x,y,w,h", or the status of the refusal.
std::string Region(const std::string& text, const Window& whole = kWhole) try {
    const Window region = RegionOf(text, whole);
    return std::to_string(region.x) + ',' + std::to_string(region.y) + ',' +
           std::to_string(region.width) + ',' + std::to_string(region.height);
} catch (const Refusal& refusal) {
    return std::to_string(refusal.Status());
}

std::string Size(const std::string& text, const Window& region = kWhole,
                 const ImageLimits& limits = kWide) try {
    const PictureSize size = ImageSizeOf(text, region, limits);
    return std::to_string(size.width) + 'x' + std::to_string(size.height);
} catch (const Refusal& refusal) {
    return std::to_string(refusal.Status());
}

std::string Turn(const std::string& text) try {
    return RotationOf(text).Text();
} catch (const Refusal& refusal) {
    return std::to_string(refusal.Status());
}

int FileStatus(const std::string& text) try {
    static_cast<void>(ImageFileOf(text));
    return 200;
} catch (const Refusal& refusal) {
    return refusal.Status();
}

const std::vector<std::string> kNonsense = {"",
                                            ",",
                                            ",,",
                                            ",,,",
                                            "a",
                                            "1",
                                            "1,2",
                                            "1,2,3",
                                            "1,2,3,4,5",
                                            "-1,0,9,9",
                                            "0,-1,9,9",
                                            "0,0,-9,9",
                                            "0,0,9,-9",
                                            "0,0,nan,9",
                                            "inf,0,9,9",
                                            "0x1,0,9,9",
                                            "1e1,0,9,9",
                                            "1.5,0,9,9",
                                            "+1,0,9,9",
                                            " 1,0,9,9",
                                            "0,0,9,9 ",
                                            "pct:",
                                            "pct:1",
                                            "pct:1,2,3",
                                            "pct:1,2,3,4,5",
                                            "pct:nan,0,9,9",
                                            "pct:-1,0,9,9",
                                            "pct:1e1,0,9,9",
                                            "pct:0,0,inf,9",
                                            "pct:.5,0,9,9",
                                            "pct:5.,0,9,9",
                                            "pct:5..5,0,9,9",
                                            "PCT:0,0,9,9",
                                            "Full",
                                            "full ",
                                            "squares",
                                            "99999999999999999999,0,9,9"};

TEST(ImageRegions, AreThePartThatIsMeant) {
    EXPECT_EQ(Region("full"), "0,0,300,200");
    EXPECT_EQ(Region("square"), "50,0,200,200");
    EXPECT_EQ(Region("square", {0, 0, 3, 8}), "0,2,3,3");
    EXPECT_EQ(Region("125,15,120,140"), "125,15,120,140");
    EXPECT_EQ(Region("pct:41.6,7.5,40,70"), "125,15,120,140");
    EXPECT_EQ(Region("pct:0,0,100,100"), "0,0,300,200");
}

TEST(ImageRegions, AreCutToThePicture) {
    EXPECT_EQ(Region("125,15,200,200"), "125,15,175,185");
    EXPECT_EQ(Region("pct:41.6,7.5,66.6,100"), "125,15,175,185");
    EXPECT_EQ(Region("299,199,1,1"), "299,199,1,1");
    EXPECT_EQ(Region("0,0,18446744073709551615,18446744073709551615"), "0,0,300,200");
    EXPECT_EQ(Region("1,1,18446744073709551615,4294967296"), "1,1,299,199");
    EXPECT_EQ(Region("pct:0,0,99999999999999999999999999,1000"), "0,0,300,200");
    EXPECT_EQ(Region("pct:0,0,0.0001,0.0001"), "0,0,1,1");
    EXPECT_EQ(Region("4294967294,0,9,9", {0, 0, 0xffffffffu, 1}), "4294967294,0,1,1");
    EXPECT_EQ(Region("pct:50,0,50,100", {0, 0, 0xffffffffu, 1}), "2147483648,0,2147483647,1");
}

TEST(ImageRegions, ThatAreEmptyOutsideOrMalformedAreRefused) {
    for (const char* const text :
         {"0,0,0,9", "0,0,9,0", "300,0,9,9", "0,200,9,9", "18446744073709551615,0,9,9",
          "pct:100,0,9,9", "pct:0,101,9,9", "pct:0,0,0,9", "pct:0,0,9,0",
          "pct:9999999999999999999999,0,1,1"})
        EXPECT_EQ(Region(text), "400") << text;
    for (const std::string& text : kNonsense) EXPECT_EQ(Region(text), "400") << text;
}

TEST(ImageSizes, AreThoseThatTheStandardTells) {
    EXPECT_EQ(Size("max"), "300x200");
    EXPECT_EQ(Size("150,"), "150x100");
    EXPECT_EQ(Size(",150"), "225x150");
    EXPECT_EQ(Size("pct:50"), "150x100");
    EXPECT_EQ(Size("pct:33.3"), "100x67");
    EXPECT_EQ(Size("pct:100"), "300x200");
    EXPECT_EQ(Size("225,100"), "225x100");
    EXPECT_EQ(Size("!225,100"), "150x100");
    EXPECT_EQ(Size("!150,190"), "150x100");
    EXPECT_EQ(Size("!600,600"), "300x200");
    EXPECT_EQ(Size("300,200"), "300x200");
    EXPECT_EQ(Size("1,1"), "1x1");
}

TEST(ImageSizes, GrowOnlyWhereThatIsAskedFor) {
    EXPECT_EQ(Size("301,"), "400");
    EXPECT_EQ(Size(",201"), "400");
    EXPECT_EQ(Size("300,201"), "400");
    EXPECT_EQ(Size("pct:100.5"), "400");
    EXPECT_EQ(Size("^600,"), "600x400");
    EXPECT_EQ(Size("^,400"), "600x400");
    EXPECT_EQ(Size("^pct:200"), "600x400");
    EXPECT_EQ(Size("^450,100"), "450x100");
    EXPECT_EQ(Size("^!600,600"), "600x400");
    EXPECT_EQ(Size("^150,"), "150x100");
    EXPECT_EQ(Size("^!30,30"), "30x20");
    EXPECT_EQ(Size("^max", kWhole, {600, 1u << 24}), "600x400");
}

TEST(ImageSizes, StayWithinTheLimits) {
    const ImageLimits sides{100, 1u << 24}, area{8192, 5000};
    EXPECT_EQ(Size("max", kWhole, sides), "100x67");
    EXPECT_EQ(Size("^max", kWhole, sides), "100x67");
    EXPECT_EQ(Size("!200,200", kWhole, sides), "100x67");
    EXPECT_EQ(Size("^!1000,50", kWhole, sides), "75x50");
    EXPECT_EQ(Size("max", kWhole, area), "86x57");
    EXPECT_EQ(Size("!300,300", kWhole, area), "86x57");
    EXPECT_EQ(Size("100,", kWhole, sides), "100x67");
    for (const char* const text : {"101,", ",101", "pct:50", "101,1", "1,101", "^101,"})
        EXPECT_EQ(Size(text, kWhole, sides), "400") << text;
    for (const char* const text : {"100,51", "pct:50", "^,60"})
        EXPECT_EQ(Size(text, kWhole, area), "400") << text;
    EXPECT_EQ(Size("max", {0, 0, 0xffffffffu, 0xffffffffu}), "4096x4096");
    EXPECT_EQ(Size("max", {0, 0, 0xffffffffu, 1}), "8192x1");
    EXPECT_EQ(Size("!4294967295,4294967295", {0, 0, 0xffffffffu, 0xffffffffu}), "4096x4096");
}

TEST(ImageSizes, OfLongRegionsHaveAPixelAcross) {
    EXPECT_EQ(Size("30,", {0, 0, 300, 1}), "30x1");
    EXPECT_EQ(Size(",30", {0, 0, 1, 300}), "1x30");
    EXPECT_EQ(Size("!30,30", {0, 0, 300, 1}), "30x1");
    EXPECT_EQ(Size("pct:10", {0, 0, 300, 1}), "400");
}

TEST(ImageSizes, ThatAreNothingHugeOrMalformedAreRefused) {
    for (const char* const text : {"full",
                                   "0,",
                                   ",0",
                                   "0,0",
                                   "!0,9",
                                   "!9,0",
                                   "^0,",
                                   "pct:0",
                                   "pct:0.1",
                                   "^pct:0",
                                   "^pct:1000000000000",
                                   "4294967296,",
                                   "^4294967295,",
                                   "^4294967295,4294967295",
                                   "99999999999999999999,",
                                   "!9,",
                                   "!,9",
                                   "!9",
                                   "^!9,",
                                   "^",
                                   "^^max",
                                   "!max",
                                   "max!",
                                   "^^9,",
                                   "!^9,9",
                                   "9",
                                   "pct:9,9",
                                   "9x9",
                                   "9,9,9",
                                   "+9,",
                                   "9, ",
                                   "pct:",
                                   "pct:nan",
                                   "pct:-5",
                                   "pct:1e1",
                                   "^pct:inf",
                                   "pct:.5",
                                   "pct: 5"})
        EXPECT_EQ(Size(text), "400") << text;
    for (const std::string& text : kNonsense) {
        if (text == "1,2" || text == "pct:1") continue;
        EXPECT_EQ(Size(text), "400") << text;
    }
}

TEST(ImageSizes, HaveOneFormInLinks) {
    const auto canonical = [](const std::string& text, const ImageLimits& limits = kWide) {
        return CanonicalSize(ImageSizeOf(text, kWhole, limits), kWhole, limits);
    };
    EXPECT_EQ(canonical("300,"), "max");
    EXPECT_EQ(canonical("pct:100"), "max");
    EXPECT_EQ(canonical("150,"), "150,100");
    EXPECT_EQ(canonical("^150,"), "150,100");
    EXPECT_EQ(canonical("^600,"), "^600,400");
    EXPECT_EQ(canonical("^600,", {600, 1u << 24}), "^max");
    EXPECT_EQ(canonical("100,", {100, 1u << 24}), "max");
}

TEST(ImageRotations, AreQuartersWithAMirrorBeforeThem) {
    EXPECT_EQ(Turn("0"), "0");
    EXPECT_EQ(Turn("90"), "90");
    EXPECT_EQ(Turn("180.0"), "180");
    EXPECT_EQ(Turn("270"), "270");
    EXPECT_EQ(Turn("360"), "0");
    EXPECT_EQ(Turn("!0"), "!0");
    EXPECT_EQ(Turn("!270"), "!270");
}

TEST(ImageRotations, ByOtherAnglesAreNotMadeAndOtherTextsAreRefused) {
    for (const char* const text : {"1", "45", "22.5", "!359.9"})
        EXPECT_EQ(Turn(text), "501") << text;
    for (const char* const text : {"", "!", "-90", "361", "360.1", "nan", "inf", "9e1", "!!0", "0!",
                                   " 0", "0x5A", "90,", "99999999999999999999999"})
        EXPECT_EQ(Turn(text), "400") << text;
}

TEST(ImageFiles, HaveAQualityAndAFormat) {
    EXPECT_EQ(ImageFileOf("default.jpg").quality, ImageQuality::Default);
    EXPECT_EQ(ImageFileOf("color.png").quality, ImageQuality::Colour);
    EXPECT_EQ(ImageFileOf("gray.webp").quality, ImageQuality::Grey);
    EXPECT_EQ(ImageFileOf("bitonal.png").format, zmcrender::PictureFormat::Png);
    for (const char* const text : {"default.tif", "gray.jp2", "default.gif", "color.pdf"})
        EXPECT_EQ(FileStatus(text), 501) << text;
    for (const char* const text : {"", ".", "default", "default.", ".jpg", "native.jpg", "grey.jpg",
                                   "default.bmp", "default.jpg.png", "Default.jpg", "default.raw"})
        EXPECT_EQ(FileStatus(text), 400) << text;
}

}  // namespace
}  // namespace zmcserve
