// Deep Zoom and the IIIF Image API, asked without a socket. What is compared is PNG, whose bytes
// are the same where the pixels are.
#include <nlohmann/json.hpp>

#include <bit>
#include <set>

#include "tests/serve/ServeFixture.h"

namespace zmcserve {
namespace {

using Json = nlohmann::json;
using zmctest::BuildNoise;

class ImagesTest : public zmctest::ServeTest {
protected:
    ImagesTest() {
        BuildNoise<unsigned char>(folder / "a.pyr", 300, 200, 3);
        BuildNoise<unsigned char>(folder / "odd.pyr", 701, 333, 3, 2);
    }
    // "301x200"; the status where it is no picture.
    std::string SizeOf(const std::string& target) {
        const Answer answer = Ask(target);
        if (answer.status != 200) return std::to_string(answer.status);
        const std::string text = answer.Text();
        const auto number = [&](std::size_t at) {
            unsigned value = 0;
            for (std::size_t i = 0; i < 4; ++i)
                value = value * 256 + static_cast<unsigned char>(text.at(at + i));
            return std::to_string(value);
        };
        return number(16) + 'x' + number(20);
    }
    void ExpectSame(const std::string& target, const std::string& other) {
        const Answer one = Ask(target), two = Ask(other);
        EXPECT_EQ(one.status, 200) << target;
        EXPECT_EQ(two.status, 200) << other;
        EXPECT_TRUE(one.Text() == two.Text()) << target << " and " << other;
    }
    Json Info(const std::string& name) { return Json::parse(Ask("/iiif/" + name).Text()); }
    std::string Canonical(const std::string& target) {
        const std::string link(Ask(target).Header("Link"));
        const std::size_t from = link.find(", <"), to = link.find(">;rel=\"canonical\"");
        if (from == link.npos || to == link.npos) return "none: " + link;
        const std::string front = "http://here/iiif/";
        EXPECT_EQ(link.substr(from + 3, front.size()), front);
        return link.substr(from + 3 + front.size(), to - from - 3 - front.size());
    }
};

// --- Deep Zoom ---

TEST_F(ImagesTest, ADescriptorTellsSizeTilesAndFormat) {
    const Answer answer = Ask("/dzi/odd.pyr.dzi");
    EXPECT_EQ(answer.type, "application/xml");
    EXPECT_EQ(answer.Text(),
              "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
              "<Image xmlns=\"http://schemas.microsoft.com/deepzoom/2008\" Format=\"jpg\" "
              "Overlap=\"0\" TileSize=\"256\"><Size Width=\"701\" Height=\"333\"/></Image>\n");
    EXPECT_NE(Ask("/dzi/odd.pyr.dzi?format=webp&bands=1&quality=9").Text().find("Format=\"webp\""),
              std::string::npos);
    EXPECT_EQ(Status("/dzi/odd.pyr.dzi", {{"If-None-Match", std::string(answer.Header("ETag"))}}),
              304);
    EXPECT_NE(answer.Header("ETag"), Ask("/dzi/odd.pyr.dzi?format=png").Header("ETag"));
    EXPECT_EQ(Status("/dzi/odd.pyr.dzi?format=raw"), 400);
    EXPECT_EQ(Status("/dzi/odd.pyr.dzi?colour=red"), 400);
    EXPECT_EQ(Status("/dzi/none.pyr.dzi"), 404);
    EXPECT_EQ(Status("/dzi/odd.pyr"), 404);
    EXPECT_EQ(Status("/dzi/.dzi"), 404);
    EXPECT_EQ(Status("/dzi"), 404);
}

TEST_F(ImagesTest, DeepTilesOfEveryLevelHaveTheSizeThatTheStandardTells) {
    unsigned width = 701, height = 333;
    for (int level = 10; level >= 0; --level) {
        for (unsigned x = 0; x * 256 < width; ++x)
            for (unsigned y = 0; y * 256 < height; ++y)
                EXPECT_EQ(SizeOf("/dzi/odd.pyr_files/" + std::to_string(level) + "/" +
                                 std::to_string(x) + "_" + std::to_string(y) + ".png"),
                          std::to_string(std::min(256u, width - x * 256)) + "x" +
                              std::to_string(std::min(256u, height - y * 256)))
                    << level;
        const std::string front = "/dzi/odd.pyr_files/" + std::to_string(level) + "/";
        EXPECT_EQ(Status(front + std::to_string((width + 255) / 256) + "_0.png"), 404);
        EXPECT_EQ(Status(front + "0_" + std::to_string((height + 255) / 256) + ".png"), 404);
        width = (width + 1) / 2;
        height = (height + 1) / 2;
    }
    EXPECT_EQ(width, 1u);
    EXPECT_EQ(height, 1u);
    EXPECT_EQ(Status("/dzi/odd.pyr_files/11/0_0.png"), 404);
}

TEST_F(ImagesTest, DeepTilesAreThoseOfTheRasterWhereItHasTheLevel) {
    ExpectSame("/dzi/a.pyr_files/9/0_0.png", "/tiles/a.pyr/1/0/0.png");
    ExpectSame("/dzi/a.pyr_files/9/1_0.png", "/tiles/a.pyr/1/1/0.png");
    ExpectSame("/dzi/a.pyr_files/8/0_0.png?stretch=20,90&bands=2",
               "/tiles/a.pyr/0/0/0.png?stretch=20,90&bands=2");
    // The format of the descriptor comes along in the query.
    ExpectSame("/dzi/a.pyr_files/8/0_0.webp?format=webp&quality=100",
               "/tiles/a.pyr/0/0/0.webp?quality=100");
    // Levels beyond those of the file are what the coarsest becomes when it is reduced.
    ExpectSame("/dzi/a.pyr_files/0/0_0.png", "/preview/a.pyr.png?window=0,0,300,200&size=1");
}

TEST_F(ImagesTest, DeepTilesThatCannotBeMeantAreRefused) {
    for (const char* const tile :
         {"9/0.png", "9/0_0_0.png", "9/-1_0.png", "9/0_-1.png", "a/0_0.png", "9/0_a.png",
          "-1/0_0.png", "9/_.png", "9/0_0x0.png", "nan/0_0.png"})
        EXPECT_EQ(Status(std::string("/dzi/a.pyr_files/") + tile), 400) << tile;
    for (const char* const tile :
         {"9/0_0.raw", "9/0_0", "10/0_0.png", "4294967296/0_0.png", "9/99999999999999999999_0.png",
          "9/4294967295_0.png", "9/0_4294967295.png", "9"})
        EXPECT_EQ(Status(std::string("/dzi/a.pyr_files/") + tile), 404) << tile;
    EXPECT_EQ(Status("/dzi/_files/9/0_0.png"), 404);
    EXPECT_EQ(Status("/dzi/a.pyr_files/9/0_0.png?size=9"), 400);
}

TEST_F(ImagesTest, DeepTilesAreKeptAndAskedForAgain) {
    const Answer tile = Ask("/dzi/a.pyr_files/9/0_0.jpg");
    EXPECT_EQ(tile.type, "image/jpeg");
    EXPECT_EQ(tile.Header("Cache-Control"), "public, max-age=0, must-revalidate");
    EXPECT_EQ(
        Status("/dzi/a.pyr_files/9/0_0.jpg", {{"If-None-Match", std::string(tile.Header("ETag"))}}),
        304);
}

// --- IIIF: the description ---

TEST_F(ImagesTest, TheInformationIsThatOfLevelTwo) {
    const Json info = Info("odd.pyr/info.json");
    EXPECT_EQ(info["@context"], "http://iiif.io/api/image/3/context.json");
    EXPECT_EQ(info["id"], "http://here/iiif/odd.pyr");
    EXPECT_EQ(info["type"], "ImageService3");
    EXPECT_EQ(info["protocol"], "http://iiif.io/api/image");
    EXPECT_EQ(info["profile"], "level2");
    EXPECT_EQ(info["width"], 701);
    EXPECT_EQ(info["height"], 333);
    EXPECT_EQ(info["maxWidth"], limits.side);
    EXPECT_EQ(info["maxArea"], limits.pixels);
    EXPECT_EQ(info["tiles"], Json::parse(R"([{"width": 256, "scaleFactors": [1, 2, 4]}])"));
    EXPECT_EQ(info["sizes"], Json::parse(R"([{"width": 176, "height": 84},
        {"width": 351, "height": 167}, {"width": 701, "height": 333}])"));
    for (const char* const feature : {"mirroring", "sizeUpscaling", "canonicalLinkHeader"})
        EXPECT_EQ(std::count(info["extraFeatures"].begin(), info["extraFeatures"].end(), feature),
                  1);
}

TEST_F(ImagesTest, SizesAndTilesStayWithinTheLimits) {
    limits.side = 200;
    limits.pixels = 128 * 128;
    const Json info = Info("odd.pyr/info.json");
    EXPECT_EQ(info["maxWidth"], 200);
    EXPECT_EQ(info["tiles"][0]["width"], 128);
    EXPECT_EQ(info["sizes"].size(), 2u);
    EXPECT_EQ(Status("/iiif/odd.pyr/0,0,128,128/128,128/0/default.png"), 200);
    EXPECT_EQ(Status("/iiif/odd.pyr/0,0,129,128/129,128/0/default.png"), 400);
    EXPECT_EQ(SizeOf("/iiif/odd.pyr/full/max/0/default.png"), "185x88");
    EXPECT_NE(Ask("/dzi/odd.pyr.dzi").Text().find("TileSize=\"128\""), std::string::npos);
    EXPECT_EQ(SizeOf("/dzi/odd.pyr_files/10/0_0.png"), "128x128");
}

TEST_F(ImagesTest, TheInformationComesAsLinkedDataToWhoAsksForThat) {
    const Answer plain = Ask("/iiif/a.pyr/info.json");
    EXPECT_EQ(plain.type, "application/json");
    EXPECT_EQ(plain.Header("Link"),
              "<http://iiif.io/api/image/3/context.json>;"
              "rel=\"http://www.w3.org/ns/json-ld#context\";type=\"application/ld+json\"");
    EXPECT_EQ(plain.Header("Access-Control-Allow-Origin"), "*");
    EXPECT_EQ(plain.Header("Vary"), "Accept");
    const Headers accept = {{"Accept", "text/html;q=0.5, application/LD+json;q=0.9"}};
    const Answer linked = Ask("/iiif/a.pyr/info.json", accept);
    EXPECT_EQ(linked.type,
              "application/ld+json;profile=\"http://iiif.io/api/image/3/context.json\"");
    EXPECT_EQ(linked.Text(), plain.Text());
    EXPECT_NE(linked.Header("ETag"), plain.Header("ETag"));
    for (const char* const other :
         {"*/*", "application/json", "application/ld+json;q=0", "application/ld+json; q=0.000"})
        EXPECT_EQ(Ask("/iiif/a.pyr/info.json", {{"Accept", other}}).type, "application/json")
            << other;
    const Answer known =
        Ask("/iiif/a.pyr/info.json", {{"If-None-Match", std::string(plain.Header("ETag"))}});
    EXPECT_EQ(known.status, 304);
    EXPECT_EQ(known.Header("Vary"), "Accept");
}

TEST_F(ImagesTest, TheBaseOfAnImageLeadsToItsInformation) {
    for (const char* const base : {"/iiif/a.pyr", "/iiif/a.pyr/", "/iiif/a%2Epyr"}) {
        const Answer answer = Ask(base);
        EXPECT_EQ(answer.status, 303) << base;
        EXPECT_EQ(answer.Header("Location"), "http://here/iiif/a.pyr/info.json");
        EXPECT_EQ(answer.Header("Access-Control-Allow-Origin"), "*");
    }
    EXPECT_EQ(Status("/iiif/none.pyr"), 404);
    EXPECT_EQ(Status("/iiif"), 404);
    EXPECT_EQ(Status("/iiif/"), 404);
    EXPECT_EQ(Status("/iiif/none.pyr/info.json"), 404);
    EXPECT_EQ(Status("/iiif/none.pyr/full/max/0/default.jpg"), 404);
    EXPECT_EQ(Status("/iiif/..%2Fa.pyr/info.json"), 400);
}

// --- IIIF: identifiers ---

TEST_F(ImagesTest, NamesOfEveryByteAreIdentifiers) {
    std::string name = "n";
    for (int byte = 1; byte < 256; ++byte)
        if (byte != '/') name += static_cast<char>(byte);
    std::filesystem::create_directory(folder / "sub");
    // Names of this file system have 255 bytes at most.
    for (const std::string& each :
         {name.substr(0, 130), "n" + name.substr(130), std::string("q?bands=1"),
          std::string("sub/info.json"), std::string("sub/a.pyr")}) {
        std::filesystem::copy_file(folder / "a.pyr", folder / each);
        zmctest::MakeOld(folder / each);
        const std::string base = "/iiif/" + PercentEncoded(each);
        EXPECT_EQ(Info(PercentEncoded(each) + "/info.json")["id"], "http://here" + base);
        EXPECT_EQ(Ask(base).Header("Location"), "http://here" + base + "/info.json");
        ExpectSame(base + "/0,0,256,200/256,200/0/default.png", "/tiles/a.pyr/1/0/0.png");
        ExpectSame("/dzi/" + PercentEncoded(each, true) + "_files/9/0_0.png",
                   "/tiles/a.pyr/1/0/0.png");
        EXPECT_EQ(Status("/dzi/" + PercentEncoded(each) + ".dzi"), 200);
    }
    // Clients behind a proxy that decodes slashes are answered too.
    EXPECT_EQ(Info("sub/a.pyr/info.json")["id"], "http://here/iiif/sub%2Fa.pyr");
    EXPECT_EQ(SizeOf("/iiif/sub/a.pyr/full/30,20/0/default.png"), "30x20");
}

TEST_F(ImagesTest, AStyleMayStandInTheIdentifier) {
    const std::string styled = "a.pyr%3Fbands%3D2%26stretch%3D10%252C90";
    EXPECT_EQ(Info("a.pyr/info.json?stretch=10,90&bands=2")["id"], "http://here/iiif/" + styled);
    EXPECT_EQ(Info(styled + "/info.json")["id"], "http://here/iiif/" + styled);
    EXPECT_EQ(Ask("/iiif/a.pyr?bands=2&stretch=10,90").Header("Location"),
              "http://here/iiif/" + styled + "/info.json");
    ExpectSame("/iiif/" + styled + "/full/max/0/default.png",
               "/preview/a.pyr.png?bands=2&stretch=10,90&size=300");
    ExpectSame("/iiif/a.pyr/full/max/0/default.png?bands=2&stretch=10,90",
               "/preview/a.pyr.png?bands=2&stretch=10,90&size=300");
    EXPECT_EQ(Canonical("/iiif/a.pyr/full/max/0/default.jpg?bands=2&stretch=10,90"),
              styled + "/full/max/0/default.jpg");
    EXPECT_EQ(Canonical("/iiif/a.pyr/full/max/0/default.jpg?quality=50"),
              "a.pyr%3Fquality%3D50/full/max/0/default.jpg");
    EXPECT_EQ(Status("/iiif/a.pyr%3Fcolour=red/info.json"), 400);
    EXPECT_EQ(Status("/iiif/a.pyr%3Fbands=1/info.json?bands=2"), 400);
    EXPECT_EQ(Status("/iiif/a.pyr/full/max/0/default.png?bands=9"), 400);
    EXPECT_EQ(Status("/iiif/a.pyr/full/max/0/default.png?size=9"), 400);
    EXPECT_EQ(Status("/iiif/none.pyr%3Fbands=1/info.json"), 404);
}

// --- IIIF: pictures ---

TEST_F(ImagesTest, EveryFormOfRegionAndSizeHasThePixelsOfThePreview) {
    const auto same = [&](const std::string& image, const std::string& preview) {
        ExpectSame("/iiif/a.pyr/" + image + "/0/default.png", "/preview/a.pyr.png?" + preview);
    };
    same("full/max", "size=300");
    same("full/150,100", "size=150");
    same("square/max", "window=50,0,200,200&size=200");
    same("10,20,60,40/max", "window=10,20,60,40&size=60");
    same("pct:10,10,20,20/max", "window=30,20,60,40&size=60");
    same("10,20,60,40/30,", "window=10,20,60,40&size=30");
    same("10,20,60,40/,30", "window=10,20,60,40&size=45");
    same("10,20,60,40/pct:25", "window=10,20,60,40&size=15");
    same("10,20,60,40/!45,99", "window=10,20,60,40&size=45");
    same("10,20,60,40/^120,", "window=10,20,60,40&size=120");
    same("10,20,60,40/^,80", "window=10,20,60,40&size=120");
    same("10,20,60,40/^pct:200", "window=10,20,60,40&size=120");
    same("10,20,60,40/^!120,999", "window=10,20,60,40&size=120");
    same("10,20,60,40/^120,80", "window=10,20,60,40&size=120");
    EXPECT_EQ(SizeOf("/iiif/a.pyr/10,20,60,40/33,7/0/default.png"), "33x7");
    EXPECT_EQ(SizeOf("/iiif/a.pyr/10,20,60,40/^max/0/default.png"), "5016x3344");
}

// As viewers ask for them: the scale factors and the side of the tiles stand in info.json.
TEST_F(ImagesTest, TilesOfViewersAreThoseOfTheRasterAndOfDeepZoom) {
    const unsigned width = 701, height = 333;
    for (unsigned scale = 0; scale < 3; ++scale) {
        const unsigned step = 256u << scale;
        for (unsigned x = 0; x * step < width; ++x)
            for (unsigned y = 0; y * step < height; ++y) {
                const unsigned w = std::min(step, width - x * step);
                const unsigned h = std::min(step, height - y * step);
                const auto text = [](unsigned number) { return std::to_string(number); };
                const auto ceiling = [&](unsigned n) { return ((n - 1) >> scale) + 1; };
                ExpectSame("/iiif/odd.pyr/" + text(x * step) + "," + text(y * step) + "," +
                               text(w) + "," + text(h) + "/" + text(ceiling(w)) + "," +
                               text(ceiling(h)) + "/0/default.png",
                           "/dzi/odd.pyr_files/" + text(10 - scale) + "/" + text(x) + "_" +
                               text(y) + ".png");
            }
    }
    ExpectSame("/iiif/odd.pyr/0,0,256,256/256,256/0/default.png", "/tiles/odd.pyr/2/0/0.png");
}

TEST_F(ImagesTest, PicturesAreMirroredAndTurned) {
    const auto size = [&](const std::string& turn) {
        return SizeOf("/iiif/a.pyr/full/150,100/" + turn + "/default.png");
    };
    std::set<std::string> seen;
    for (const char* const turn : {"0", "90", "180", "270", "!0", "!90", "!180", "!270"}) {
        const bool lies =
            std::string_view(turn).ends_with("90") || std::string_view(turn).ends_with("270");
        EXPECT_EQ(size(turn), lies ? "100x150" : "150x100") << turn;
        seen.insert(Ask("/iiif/a.pyr/full/150,100/" + std::string(turn) + "/default.png").Text());
    }
    EXPECT_EQ(seen.size(), 8u);
    EXPECT_EQ(size("45"), "501");
    EXPECT_EQ(size("-90"), "400");
    EXPECT_EQ(size("!"), "400");
}

TEST_F(ImagesTest, QualitiesAreColourGreyAndTwoTones) {
    const auto text = [&](const std::string& file) {
        return Ask("/iiif/a.pyr/0,0,40,40/max/0/" + file).Text();
    };
    constexpr std::size_t kKind = 25;  // of a PNG: 0 grey, 2 colours
    EXPECT_EQ(text("default.png"), text("color.png"));
    EXPECT_EQ(text("default.png")[kKind], 2);
    EXPECT_EQ(text("gray.png")[kKind], 0);
    EXPECT_EQ(text("bitonal.png")[kKind], 0);
    EXPECT_NE(text("bitonal.png"), text("gray.png"));
    EXPECT_EQ(Ask("/iiif/a.pyr/0,0,4,4/max/0/color.png?bands=1").Text()[kKind], 2);
    EXPECT_EQ(Ask("/iiif/a.pyr/0,0,4,4/max/0/gray.png?bands=1&depth=16").Text()[kKind - 1], 16);
    EXPECT_EQ(Ask("/iiif/a.pyr/0,0,4,4/max/0/default.jpg").type, "image/jpeg");
    EXPECT_EQ(Ask("/iiif/a.pyr/0,0,4,4/max/0/default.webp").type, "image/webp");
    EXPECT_EQ(Status("/iiif/a.pyr/0,0,4,4/max/0/default.tif"), 501);
}

TEST_F(ImagesTest, LinksTellTheOneFormOfAnAddress) {
    EXPECT_EQ(Canonical("/iiif/a.pyr/pct:0,0,100,100/pct:100/360/color.png"),
              "a.pyr/full/max/0/default.png");
    EXPECT_EQ(Canonical("/iiif/a.pyr/square/100,/!90.0/gray.jpg"),
              "a.pyr/50,0,200,200/100,100/!90/gray.jpg");
    EXPECT_EQ(Canonical("/iiif/a.pyr/0,0,900,900/^600,/0/default.webp"),
              "a.pyr/full/^600,400/0/default.webp");
    EXPECT_EQ(Canonical("/iiif/a.pyr/full/max/0/gray.png?bands=1"),
              "a.pyr%3Fbands%3D1/full/max/0/default.png");
    EXPECT_EQ(Ask("/iiif/a.pyr/full/30,/0/default.jpg")
                  .Header("Link")
                  .find("<http://iiif.io/api/image/3/level2.json>;rel=\"profile\""),
              0u);
    // What the form names is the same picture.
    ExpectSame("/iiif/" + Canonical("/iiif/a.pyr/square/100,/!90/gray.png?gamma=2"),
               "/iiif/a.pyr/square/100,/!90/gray.png?gamma=2");
}

TEST_F(ImagesTest, WhatIsMalformedIsToldInOneLineAndCostsNothing) {
    for (const char* const image :
         {"full/max/0/default", "full/max/0/.jpg", "full/max/x/default.jpg", "full/x/0/default.jpg",
          "x/max/0/default.jpg", "0,0,0,0/max/0/default.jpg", "nan,0,9,9/max/0/default.jpg",
          "full/^99999,/0/default.jpg", "full/-5,/0/default.jpg", "full/301,/0/default.jpg",
          "full/max/361/default.jpg", "//0/default.jpg", "full/max//default.jpg",
          "0,0,99999999999999999999,9/max/0/default.jpg", "full/0,0/0/default.jpg"}) {
        const Answer answer = Ask(std::string("/iiif/a.pyr/") + image);
        EXPECT_EQ(answer.status, 400) << image;
        EXPECT_EQ(answer.Text().find('\n'), answer.Text().size() - 1) << image;
        EXPECT_EQ(answer.Header("Access-Control-Allow-Origin"), "*");
    }
    limits.side = 60000;
    limits.pixels = std::uint64_t{1} << 40;
    Serve();
    EXPECT_EQ(Status("/iiif/a.pyr/full/^20000,1/0/default.webp"), 400);
}

TEST_F(ImagesTest, PicturesAreKeptAndAskedForAgain) {
    const Answer picture = Ask("/iiif/a.pyr/full/max/0/default.jpg");
    EXPECT_EQ(picture.Header("Cache-Control"), "public, max-age=0, must-revalidate");
    const Headers known = {{"If-None-Match", std::string(picture.Header("ETag"))}};
    EXPECT_EQ(Status("/iiif/a.pyr/full/max/0/default.jpg", known), 304);
    EXPECT_EQ(Status("/iiif/a.pyr/full/x/0/default.jpg", known), 400);
}

}  // namespace
}  // namespace zmcserve
