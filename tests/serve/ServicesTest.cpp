// The services, asked without a socket.
#include <nlohmann/json.hpp>

#include <cstring>

#include "core/PixelVocabulary.h"
#include "render/Codec.h"
#include "serve/Pages.h"
#include "serve/SampleAnswer.h"
#include "tests/serve/ServeFixture.h"
#include "tests/support/ElementTypeList.h"

namespace zmcserve {
namespace {

using Json = nlohmann::json;
using zmctest::BuildNoise;

class ServicesTest : public zmctest::ServeTest {
protected:
    ServicesTest() : source(BuildNoise<unsigned char>(folder / "a.pyr", 300, 200, 3)) {}
    Json Document(const std::string& target) { return Json::parse(Ask(target).Text()); }

    zmctest::MemorySource<unsigned char> source;
};

// --- files ---

TEST_F(ServicesTest, AFileIsHandedOutByteByByte) {
    const std::string bytes = BytesOf(folder / "a.pyr");
    const Answer whole = Ask("/files/a.pyr");
    EXPECT_EQ(whole.status, 200);
    EXPECT_EQ(whole.Text(), bytes);
    EXPECT_EQ(whole.Header("Accept-Ranges"), "bytes");
    const Answer part = Ask("/files/a.pyr", {{"Range", "bytes=5-14"}});
    EXPECT_EQ(part.status, 206);
    EXPECT_EQ(part.Text(), bytes.substr(5, 10));
    EXPECT_EQ(part.Header("Content-Range"), "bytes 5-14/" + std::to_string(bytes.size()));
    const Answer none = Ask("/files/a.pyr", {{"Range", "bytes=99999999-"}});
    EXPECT_EQ(none.status, 416);
    EXPECT_EQ(none.Header("Content-Range"), "bytes */" + std::to_string(bytes.size()));
    EXPECT_EQ(Ask("/files/a.pyr", {{"Range", "bytes=0-1"}}, Method::Head).status, 200);
}

TEST_F(ServicesTest, ConditionsAreHeldToTheStateOfTheFile) {
    const Answer whole = Ask("/files/a.pyr");
    const std::string tag(whole.Header("ETag")), date(whole.Header("Last-Modified"));
    const std::string old = "Sun, 06 Nov 1994 08:49:37 GMT";
    EXPECT_EQ(Status("/files/a.pyr", {{"If-None-Match", tag}}), 304);
    EXPECT_EQ(Status("/files/a.pyr", {{"If-None-Match", "\"x\", W/" + tag}}), 304);
    EXPECT_EQ(Status("/files/a.pyr", {{"If-None-Match", "*"}}), 304);
    EXPECT_EQ(Status("/files/a.pyr", {{"If-None-Match", "\"x\""}, {"If-Modified-Since", date}}),
              200);
    EXPECT_EQ(Status("/files/a.pyr", {{"If-Modified-Since", date}}), 304);
    EXPECT_EQ(Status("/files/a.pyr", {{"If-Modified-Since", old}}), 200);
    EXPECT_EQ(Status("/files/a.pyr", {{"If-Modified-Since", "yesterday"}}), 200);
    EXPECT_EQ(Status("/files/a.pyr", {{"If-Match", tag}}), 200);
    EXPECT_EQ(Status("/files/a.pyr", {{"If-Match", "W/" + tag}}), 412);
    EXPECT_EQ(Status("/files/a.pyr", {{"If-Unmodified-Since", old}}), 412);
    EXPECT_EQ(Status("/files/a.pyr", {{"If-Unmodified-Since", date}}), 200);
    EXPECT_EQ(Ask("/files/a.pyr", {{"If-None-Match", tag}}).Header("ETag"), tag);
}

TEST_F(ServicesTest, IfRangeGivesAPartOfTheSameStateAlone) {
    const Answer whole = Ask("/files/a.pyr");
    const std::string tag(whole.Header("ETag")), date(whole.Header("Last-Modified"));
    const auto status = [&](const std::string& condition) {
        return Status("/files/a.pyr", {{"Range", "bytes=0-1"}, {"If-Range", condition}});
    };
    EXPECT_EQ(status(tag), 206);
    EXPECT_EQ(status(date), 206);
    EXPECT_EQ(status("W/" + tag), 200);
    EXPECT_EQ(status("\"other\""), 200);
    EXPECT_EQ(status("Sun, 06 Nov 1994 08:49:37 GMT"), 200);
}

// --- tiles ---

template <class T>
class SampleTiles : public zmctest::ServeTest {};
TYPED_TEST_SUITE(SampleTiles, zmctest::AllElementTypes, zmctest::ElementTypeNames);

TYPED_TEST(SampleTiles, AreThoseOfTheModuleInEveryOrdering) {
    using T = TypeParam;
    for (const auto ordering :
         {zmchost::Ordering::Scanline, zmchost::Ordering::Blocked, zmchost::Ordering::Morton}) {
        const std::string file = this->folder / "a.pyr";
        // Of nine bands and more files are in Morton order, of fewer in none of it.
        const std::uint32_t bands = ordering == zmchost::Ordering::Morton ? 9 : 2;
        BuildNoise<T>(file, 600, 300, bands, 5, ordering);
        this->Serve();
        zmchost::Raster raster =
            zmchost::Raster::Open(zmctest::TestModule(), file, zmchost::Access::Read);
        for (std::uint32_t level = 0; level <= raster.MaxLevel(); ++level)
            for (std::uint32_t x = 0; x < raster.TilesAcross(level); ++x) {
                const zmchost::Window tile = raster.Tile(level, x, 0);
                std::vector<T> samples(tile.Pixels() * bands);
                raster.Read(level, tile, raster.AllBands(), samples.data());
                const std::string expected(reinterpret_cast<const char*>(samples.data()),
                                           samples.size() * sizeof(T));
                const std::string at = "/tiles/a.pyr/" + std::to_string(raster.MaxLevel() - level) +
                                       "/" + std::to_string(x) + "/0.";
                const Answer raw = this->Ask(at + "raw");
                ASSERT_EQ(raw.status, 200);
                EXPECT_EQ(raw.Text(), expected);
                EXPECT_EQ(raw.Header("X-Raster-Type"), zelm::ElementTraits<T>::word);
                EXPECT_EQ(raw.Header("X-Raster-Width"), std::to_string(tile.width));
                EXPECT_EQ(raw.Header("X-Raster-Height"), std::to_string(tile.height));
                const SampleShape shape{zelm::ElementTraits<T>::code, tile.width, tile.height,
                                        bands};
                EXPECT_EQ(this->Ask(at + "npy").Text(), NpyHeader(shape) + expected);
            }
    }
}

TEST_F(ServicesTest, RawTilesComeStraightOutOfTheFile) {
    const Answer tile = Ask("/tiles/a.pyr/1/1/0.raw");
    EXPECT_TRUE(std::holds_alternative<FileRange>(tile.body));
    EXPECT_EQ(tile.Size(), 44u * 200 * 3);
    const Answer band = Ask("/tiles/a.pyr/1/1/0.raw?bands=2");
    EXPECT_EQ(band.Size(), 44u * 200);
    EXPECT_EQ(band.Text()[0], static_cast<char>(source.pixels[256 * 3 + 1]));
}

TEST_F(ServicesTest, WhatNeedsNoWorkIsAnsweredAtOnce) {
    Serve();
    const auto quickly = [&](const std::string& target, Headers headers = {}) {
        Request request = Request::Parse(Method::Get, target);
        request.headers = std::move(headers);
        return service->router.HandleQuickly(request, *service);
    };
    EXPECT_FALSE(quickly("/tiles/a.pyr/1/1/0.raw"));  // it is not open yet
    service->catalog.Raster("a.pyr");
    EXPECT_EQ(quickly("/tiles/a.pyr/1/1/0.raw")->Text(), Ask("/tiles/a.pyr/1/1/0.raw").Text());
    EXPECT_EQ(quickly("/tiles/a.pyr/1/2/0.raw")->status, 404);
    EXPECT_FALSE(quickly("/tiles/a.pyr/1/1/0.raw", {{"Accept-Encoding", "gzip"}}));
    EXPECT_FALSE(quickly("/tiles/a.pyr/1/1/0.jpg"));
    EXPECT_EQ(quickly("/files/a.pyr")->status, 200);
    EXPECT_EQ(quickly("/healthz")->status, 200);
    EXPECT_FALSE(quickly("/api"));
}

TEST_F(ServicesTest, SmallJpegTilesAreMadeAtOnceWhereNobodyWaitsForIt) {
    Serve();
    const auto quickly = [&](const std::string& target, bool mayCompute = true) {
        Request request = Request::Parse(Method::Get, target);
        request.mayCompute = mayCompute;
        return service->router.HandleQuickly(request, *service);
    };
    const std::string tile = "/tiles/a.pyr/1/1/0.jpg", styled = tile + "?bands=1&colormap=turbo";
    EXPECT_FALSE(quickly(tile));  // the raster is not open yet
    service->catalog.Raster("a.pyr");
    EXPECT_FALSE(quickly(tile));  // and then its style may need pixels of a coarser level
    const Answer answer = Ask(tile);
    EXPECT_EQ(quickly(tile)->Text(), answer.Text());
    EXPECT_EQ(quickly(tile)->Header("ETag"), answer.Header("ETag"));
    EXPECT_EQ(quickly(tile + "?quality=10")->Text(), Ask(tile + "?quality=10").Text());
    EXPECT_FALSE(quickly(styled));
    const std::string expected = Ask(styled).Text();
    EXPECT_EQ(quickly(styled)->Text(), expected);
    EXPECT_FALSE(quickly(tile, false));
    EXPECT_EQ(quickly("/tiles/a.pyr/1/2/0.jpg")->status, 404);
    EXPECT_EQ(quickly(tile + "?quality=0")->status, 400);
    EXPECT_EQ(quickly(tile + "?nothing=1")->status, 400);
    for (const char* const longer : {"/tiles/a.pyr/1/1/0.png", "/tiles/a.pyr/1/1/0.webp"}) {
        EXPECT_EQ(Ask(longer).status, 200);
        EXPECT_FALSE(quickly(longer)) << longer;
    }
    for (const std::string style : {"?expression=b1*2&stretch=0,9", "?bands=1&hillshade=1"}) {
        EXPECT_EQ(Ask(tile + style).status, 200) << style;
        EXPECT_FALSE(quickly(tile + style)) << style;
    }
    zmctest::WriteText(folder / "a.pyr.aux.xml", "<PAMDataset/>");
    EXPECT_FALSE(quickly(tile));  // what stands beside it may tell other colours
}

TEST_F(ServicesTest, LargeJpegTilesAreLeftToWorkers) {
    BuildNoise<std::uint8_t>(folder / "b.pyr", 300, 300, 8, 5, zmchost::Ordering::Scanline);
    Serve();
    const auto isQuick = [&](const std::string& tile) {
        Request request = Request::Parse(Method::Get, tile);
        request.mayCompute = true;
        EXPECT_EQ(Ask(tile).status, 200);
        return service->router.HandleQuickly(request, *service).has_value();
    };
    EXPECT_TRUE(isQuick("/tiles/b.pyr/1/0/0.jpg"));
    BuildNoise<double>(folder / "c.pyr", 300, 300, 3, 5, zmchost::Ordering::Scanline);
    Serve();
    EXPECT_FALSE(isQuick("/tiles/c.pyr/1/0/0.jpg"));
}

TEST_F(ServicesTest, PictureTilesHaveTheSizeOfTheirTileAndAType) {
    const Answer png = Ask("/tiles/a.pyr/1/1/0.png");
    EXPECT_EQ(png.type, "image/png");
    const std::string bytes = png.Text();
    EXPECT_EQ(bytes.substr(0, 4), "\x89PNG");
    EXPECT_EQ(bytes.substr(16, 8), std::string("\0\0\0\x2C\0\0\0\xC8", 8));
    EXPECT_EQ(Ask("/tiles/a.pyr/0/0/0.jpg").type, "image/jpeg");
    EXPECT_EQ(Ask("/tiles/a.pyr/0/0/0.webp").type, "image/webp");
    EXPECT_NE(Ask("/tiles/a.pyr/0/0/0.png?bands=1&colormap=turbo").Text(),
              Ask("/tiles/a.pyr/0/0/0.png").Text());
    EXPECT_LT(Ask("/tiles/a.pyr/1/0/0.jpg?quality=10").Size(),
              Ask("/tiles/a.pyr/1/0/0.jpg?quality=95").Size());
    const std::string tag(png.Header("ETag"));
    EXPECT_EQ(Status("/tiles/a.pyr/1/1/0.png", {{"If-None-Match", tag}}), 304);
}

TEST_F(ServicesTest, PictureTilesAreTheCodedSamplesWhateverTileCameBefore) {
    for (const char* const tile : {"1/0/0", "1/1/0", "0/0/0", "1/0/0"}) {
        const std::string at = std::string("/tiles/a.pyr/") + tile;
        const Answer raw = Ask(at + ".raw");
        const std::string samples = raw.Text();
        const auto side = [&](const char* name) {
            return static_cast<std::uint32_t>(std::stoul(std::string(raw.Header(name))));
        };
        const zmcrender::Picture picture{side("X-Raster-Width"),
                                         side("X-Raster-Height"),
                                         3,
                                         8,
                                         {samples.begin(), samples.end()}};
        for (const auto& [ending, format] : {std::pair(".jpg", zmcrender::PictureFormat::Jpeg),
                                             std::pair(".png", zmcrender::PictureFormat::Png),
                                             std::pair(".webp", zmcrender::PictureFormat::WebP)}) {
            const auto coded = zmcrender::Encode(picture, format);
            EXPECT_EQ(Ask(at + ending).Text(), std::string(coded.begin(), coded.end()))
                << tile << ending;
            EXPECT_NE(Ask(at + ending + "?stretch=0,100").Text(), Ask(at + ending).Text());
        }
    }
}

TEST_F(ServicesTest, TilesThatThereAreNotAreNotFound) {
    for (const char* const tile :
         {"2/0/0.png", "0/1/0.png", "0/0/1.png", "0/0/4294967296.png",
          "18446744073709551616/0/0.raw", "0/0/0.tif", "0/0/0", "99999999999999999999999/0/0.jpg"})
        EXPECT_EQ(Status(std::string("/tiles/a.pyr/") + tile), 404) << tile;
    for (const char* const tile : {"-1/0/0.png", "0/-1/0.png", "a/0/0.png", "0//0.png", "0/0/.png",
                                   "0/0/1e3.png", "+0/0/0.png", "0/0/0x0.png"})
        EXPECT_EQ(Status(std::string("/tiles/a.pyr/") + tile), 400) << tile;
    EXPECT_EQ(Status("/tiles/a.pyr"), 404);
    EXPECT_EQ(Status("/tiles"), 404);
}

TEST_F(ServicesTest, WhatAStyleCannotBeIsToldInOneLine) {
    for (const char* const query : {"colormap=none-such", "bands=9", "bands=0", "gamma=0",
                                    "stretch=2,", "colourmap=turbo", "quality=0", "quality=101",
                                    "bands=1&bands=2", "expression=b1%2b", "nodata=x&gamma=nan"}) {
        const Answer answer = Ask(std::string("/tiles/a.pyr/0/0/0.png?") + query);
        EXPECT_EQ(answer.status, 400) << query;
        const std::string text = answer.Text();
        EXPECT_EQ(text.find('\n'), text.size() - 1) << text;
    }
}

TEST_F(ServicesTest, TileJsonTellsTheGrid) {
    const Json document = Document("/tiles/a.pyr/tile.json");
    EXPECT_EQ(document["tilejson"], "3.0.0");
    EXPECT_EQ(document["tiles"][0], "http://here/tiles/a.pyr/{z}/{x}/{y}.png");
    EXPECT_EQ(document["maxzoom"], 1);
    EXPECT_EQ(document["format"], "png");
    const Json formats = Document("/tiles/a.pyr/tile.json?gamma=2")["formats"];
    std::vector<std::string> names, types;
    for (const Json& format : formats) {
        names.push_back(format["format"]);
        types.push_back(format["type"]);
        std::string tile = format["tiles"][0];
        for (const char* const part : {"{z}", "{x}", "{y}"}) tile.replace(tile.find(part), 3, "0");
        const Answer answer = Ask(tile.substr(std::string("http://here").size()));
        EXPECT_EQ(answer.status, 200) << tile;
        EXPECT_EQ(answer.type, types.back()) << tile;
    }
    EXPECT_EQ(names, (std::vector<std::string>{"jpg", "png", "webp", "raw", "npy"}));
    EXPECT_EQ(formats[1]["tiles"][0], "http://here/tiles/a.pyr/{z}/{x}/{y}.png?gamma=2");
    EXPECT_EQ(formats[3]["tiles"][0], "http://here/tiles/a.pyr/{z}/{x}/{y}.raw");
    EXPECT_EQ(document["levels"][0]["width"], 150);
    EXPECT_EQ(document["levels"][1]["tilesAcross"], 2);
    EXPECT_EQ(Document("/tiles/a.pyr/tile.json?gamma=2")["tiles"][0],
              "http://here/tiles/a.pyr/{z}/{x}/{y}.png?gamma=2");
}

// --- pictures and values ---

TEST_F(ServicesTest, PreviewsHaveTheSizeThatIsAskedFor) {
    const auto size = [&](const std::string& query) {
        return Ask("/preview/a.pyr.png" + query).Text().substr(16, 8);
    };
    EXPECT_EQ(size(""), std::string("\0\0\x01\x2C\0\0\0\xC8", 8));
    EXPECT_EQ(size("?size=30"), std::string("\0\0\0\x1E\0\0\0\x14", 8));
    EXPECT_EQ(size("?window=10,20,5,10&size=40"), std::string("\0\0\0\x14\0\0\0\x28", 8));
    for (const char* const query :
         {"?size=0", "?size=99999", "?size=-1", "?window=0,0,301,1", "?window=0,0,0,1",
          "?window=1,2,3", "?window=4294967295,0,4294967295,1", "?legend=maybe", "?size=8192"})
        EXPECT_EQ(Status(std::string("/preview/a.pyr.png") + query), 400) << query;
    EXPECT_EQ(Status("/preview/a.pyr"), 404);
}

TEST_F(ServicesTest, APictureOfAScreenLiesWhereTheScreenShowsTheRaster) {
    const auto place = [&](const std::string& query) {
        return std::string(Ask("/view/a.pyr" + query).Header("X-Picture-Place"));
    };
    // The whole raster fills 94 per cent of the narrower side, here at 0.47 pixels for each of its.
    EXPECT_EQ(place("?screen=150,150"), "5,28,141,94");
    EXPECT_EQ(place("?screen=600,400"), "18,12,564,376");
    EXPECT_EQ(place("?screen=100,80&at=0,0&zoom=0.5"), "50,40,50,40");
    EXPECT_EQ(place("?screen=100,80&at=300,200&zoom=0.5"), "0,0,50,40");
    EXPECT_EQ(place("?screen=10,10&at=150,100&zoom=1"), "0,0,10,10");
    // From farther away than the coarsest level.
    EXPECT_EQ(place("?screen=100,80&at=150,100&zoom=0.21"), "19,19,63,42");
    // Whole pixels, which reach beyond the screen.
    EXPECT_EQ(place("?screen=10,10&at=20.5,20.5&zoom=4"), "-1,-1,12,12");
    EXPECT_EQ(Status("/view/a.pyr?screen=10,10&at=-100,20&zoom=1"), 404);
    EXPECT_EQ(Status("/view/b.pyr?screen=10,10"), 404);
}

TEST_F(ServicesTest, APictureOfAScreenIsThePreviewOfItsPart) {
    const auto same = [&](const std::string& query, const std::string& preview) {
        EXPECT_EQ(Ask("/view/a.pyr?" + query).Text(), Ask("/preview/a.pyr.jpg?" + preview).Text())
            << query;
    };
    same("screen=100,80&at=0,0&zoom=0.5", "window=0,0,100,80&size=50");
    same("screen=100,80&at=150,100&zoom=0.21", "size=63");
    same("screen=600,400", "size=300");
    same("screen=10,10&at=20.5,20.5&zoom=4", "window=19,19,3,3&size=3");
    same("screen=100,80&at=0,0&zoom=0.5&bands=2&stretch=10,90&gamma=2&quality=40",
         "window=0,0,100,80&size=50&bands=2&stretch=10,90&gamma=2&quality=40");
}

TEST_F(ServicesTest, APictureOfAScreenHasAFormatThatKeepsWhatIsInIt) {
    EXPECT_EQ(Ask("/view/a.pyr?screen=90,90").type, "image/jpeg");
    EXPECT_EQ(Ask("/view/a.pyr?screen=600,400&bands=1&nodata=7").type, "image/webp");
    zmctest::MemorySource<unsigned char> indices(20, 10, 1);
    zmchost::PyramidBuilder(zmctest::TestModule()).Build(indices, folder / "i.pyr");
    {
        auto raster =
            zmchost::Raster::Open(zmctest::TestModule(), folder / "i.pyr", zmchost::Access::Update);
        zelm::Palette palette;
        zelm::Color colour;
        colour.red = 10, colour.green = 20, colour.blue = 30, colour.alpha = 255, colour.isNull = 0;
        palette.AddColor(colour);
        raster.SetBandPalette(0, palette);
    }
    EXPECT_EQ(Ask("/view/i.pyr?screen=90,90").type, "image/png");
    EXPECT_EQ(Ask("/view/i.pyr?screen=90,90&stretch=0,9").type, "image/jpeg");
}

TEST_F(ServicesTest, AScreenThatIsNoneIsRefused) {
    for (const char* const query :
         {"", "?screen=5", "?screen=0,5", "?screen=5,-1", "?screen=1.5,5", "?screen=9000,5",
          "?screen=5,5&at=1,1", "?screen=5,5&zoom=1", "?screen=5,5&at=1&zoom=1",
          "?screen=5,5&at=1,1&zoom=0", "?screen=5,5&at=1,1&zoom=129", "?screen=5,5&at=1,nan&zoom=1",
          "?screen=5,5&colour=red", "?screen=5,5&bands=4", "?screen=5,5&quality=0"})
        EXPECT_EQ(Status(std::string("/view/a.pyr") + query), 400) << query;
    limits.pixels = 100;
    Serve();
    EXPECT_EQ(Status("/view/a.pyr?screen=10,10"), 200);
    EXPECT_EQ(Status("/view/a.pyr?screen=10,11"), 400);
}

TEST_F(ServicesTest, APictureOfAScreenIsKeptByItsTag) {
    const std::string tag(Ask("/view/a.pyr?screen=90,90").Header("ETag"));
    EXPECT_EQ(Status("/view/a.pyr?screen=90,90", {{"If-None-Match", tag}}), 304);
    EXPECT_NE(Ask("/api").Header("Access-Control-Expose-Headers").find("X-Picture-Place"),
              std::string::npos);
}

TEST_F(ServicesTest, APointHasItsExactValues) {
    const Json point = Document("/point/a.pyr?x=299&y=199");
    for (std::size_t band = 0; band < 3; ++band)
        EXPECT_EQ(point["values"][band], source.pixels[(199 * 300 + 299) * 3 + band]);
    EXPECT_EQ(point["coordinates"], nullptr);
    for (const char* const query : {"?x=300&y=0", "?x=0", "?x=-1&y=0", "?x=0&y=1e9",
                                    "?x=&y=", "?x=0&y=0&bands=4", "?x=0&y=0&z=1"})
        EXPECT_EQ(Status(std::string("/point/a.pyr") + query), 400) << query;
    EXPECT_EQ(Status("/point/a.pyr?x=0&y=0&level=2"), 404);
}

TEST_F(ServicesTest, IntegersOf64BitsAreTexts) {
    zmctest::MemorySource<std::int64_t> large(2, 2, 1);
    large.pixels = {std::numeric_limits<std::int64_t>::min(), 5, 6, 9007199254740993};
    zmchost::PyramidBuilder(zmctest::TestModule()).Build(large, folder / "l.pyr");
    EXPECT_EQ(Document("/point/l.pyr?x=0&y=0")["values"][0], "-9223372036854775808");
    EXPECT_EQ(Document("/point/l.pyr?x=1&y=0")["values"][0], "5");
    EXPECT_EQ(Document("/point/l.pyr?x=1&y=1")["values"][0], "9007199254740993");
}

TEST_F(ServicesTest, AProfileHasTheValuesAlongItsLine) {
    const Json profile = Document("/profile/a.pyr?line=0.5,0.5,299.5,0.5&bands=2");
    ASSERT_EQ(profile["values"].size(), 300u);
    for (std::size_t i = 0; i < 300; ++i)
        EXPECT_EQ(profile["values"][i][0], source.pixels[i * 3 + 1]) << i;
    EXPECT_EQ(Document("/profile/a.pyr?line=0,0,10,10&samples=3")["values"].size(), 3u);
    for (const char* const query :
         {"", "?line=0,0,1", "?line=0,0,301,0", "?line=-1,0,1,1", "?line=nan,0,1,1",
          "?line=0,0,1,1&samples=1", "?line=0,0,1,1&samples=100000", "?line=0,0,1e400,1"})
        EXPECT_EQ(Status(std::string("/profile/a.pyr") + query), 400) << query;
}

TEST_F(ServicesTest, AWindowHasItsSamples) {
    const std::string raw = Ask("/window/a.pyr.raw?window=250,100,20,2").Text();
    std::string expected;
    for (std::size_t y = 100; y < 102; ++y)
        for (std::size_t i = 250 * 3; i < 270 * 3; ++i)
            expected += static_cast<char>(source.pixels[y * 300 * 3 + i]);
    EXPECT_EQ(raw, expected);
    EXPECT_EQ(Ask("/window/a.pyr.npy?window=250,100,20,2").Text(),
              NpyHeader({1, 20, 2, 3}) + expected);
    EXPECT_EQ(Status("/window/a.pyr.png"), 404);
}

TEST_F(ServicesTest, LimitsAreHeldAndNamed) {
    limits.window = 300 * 200 * 3 - 1;
    limits.pixels = 100;
    Serve();
    EXPECT_EQ(Status("/window/a.pyr.raw"), 400);
    EXPECT_EQ(Status("/window/a.pyr.raw?bands=1,2"), 200);
    EXPECT_EQ(Status("/preview/a.pyr.png?size=30"), 400);
    EXPECT_EQ(Status("/preview/a.pyr.png?size=12"), 200);
}

TEST_F(ServicesTest, WhatTakesTooLongIsRefused) {
    Serve();
    Request request = Request::Parse(Method::Get, "/preview/a.pyr.png?size=20");
    request.deadline = Deadline(std::chrono::seconds(0));
    const Answer answer = service->Handle(request);
    EXPECT_EQ(answer.status, 503);
    EXPECT_EQ(answer.Header("Retry-After"), "10");
}

// --- documents ---

TEST_F(ServicesTest, RecordsAreThoseOfTheFile) {
    const Json info = Document("/info/a.pyr");
    EXPECT_EQ(info["file"], "a.pyr");
    EXPECT_EQ(info["statistics"].size(), 3u);
    EXPECT_EQ(Document("/statistics/a.pyr")["statistics"], info["statistics"]);
    EXPECT_EQ(Document("/histogram/a.pyr?band=2")["histograms"][0], info["histograms"][1]);
    EXPECT_EQ(Document("/histogram/a.pyr?band=2")["histograms"].size(), 1u);
    EXPECT_EQ(Status("/histogram/a.pyr?band=4"), 400);
    EXPECT_EQ(Status("/histogram/a.pyr?band=0"), 400);
    EXPECT_EQ(Status("/info/b.pyr"), 404);
}

TEST_F(ServicesTest, DocumentsOfMoreThanAMillionCountsAreRefused) {
    zmctest::MemorySource<unsigned short> noise(4, 4, 17);
    noise.FillWithNoise(1);
    zmchost::BuildOptions options;
    options.bins = 65536;
    zmchost::PyramidBuilder(zmctest::TestModule()).Build(noise, folder / "deep.pyr", options);
    zmctest::MakeOld(folder / "deep.pyr");
    EXPECT_EQ(Status("/info/deep.pyr"), 413);
    EXPECT_EQ(Status("/histogram/deep.pyr"), 413);
    EXPECT_EQ(Document("/histogram/deep.pyr?band=17")["histograms"][0]["counts"].size(), 65536u);
    EXPECT_EQ(Document("/statistics/deep.pyr")["statistics"].size(), 17u);
}

TEST_F(ServicesTest, TheListTellsEveryRouteAndFile) {
    const Json api = Document("/api");
    EXPECT_EQ(api["files"][0], (Json{{"name", "a.pyr"},
                                     {"url", "http://here/files/a.pyr"},
                                     {"preview", "http://here/preview/a.pyr.webp?size=480"}}));
    EXPECT_EQ(Ask("/preview/a.pyr.webp?size=480").type, "image/webp");
    for (const Route& route : service->router.Routes())
        for (const Endpoint& endpoint : route.endpoints) {
            const Json told = {{"name", endpoint.name},
                               {"url", "http://here" + endpoint.url},
                               {"description", endpoint.description}};
            EXPECT_NE(std::find(api["services"].begin(), api["services"].end(), told),
                      api["services"].end())
                << endpoint.name;
        }
    EXPECT_EQ(Ask("/metrics").Text().find("# HELP zmcraster_requests_total"), 0u);
    EXPECT_EQ(Ask("/healthz").Text(), "ok\n");
}

TEST_F(ServicesTest, NamesOfAnyBytesReachPagesAndDocumentsEscaped) {
    const std::string name = "<script>alert(1)</script>\xFF&\".pyr";
    const std::string flat = "x" + name.substr(0, 16) + name.substr(26);
    std::filesystem::copy_file(folder / "a.pyr", folder / flat);
    const std::string page = Ask("/list").Text();
    EXPECT_EQ(page.find("<script"), std::string::npos);
    EXPECT_NE(page.find("&lt;script&gt;"), std::string::npos);
    EXPECT_NE(Ask("/list").Header("Content-Security-Policy").find("default-src 'none'"),
              std::string::npos);
    EXPECT_NO_THROW(Document("/api"));
    EXPECT_EQ(Status("/info/" + PercentEncoded(flat)), 200);
}

TEST_F(ServicesTest, TheRootIsTheViewerOrSaysThatThereIsNone) {
    const Answer root = Ask("/");
    const std::string page = root.Text();
    EXPECT_EQ(root.type, "text/html; charset=utf-8");
    EXPECT_NE(root.Header("Content-Security-Policy").find("script-src 'self'"), std::string::npos);
    if (Pages().empty()) {
        EXPECT_NE(page.find("built without the viewer"), std::string::npos);
        EXPECT_NE(page.find("/preview/a.pyr.png"), std::string::npos);
        return;
    }
    for (const std::string file : {"first.js", "viewer.js", "viewer.css"}) {
        EXPECT_NE(page.find('"' + file + '"'), std::string::npos);
        const Answer part = Ask("/" + file);
        EXPECT_EQ(part.status, 200);
        EXPECT_GT(part.Size(), 1000u);
        EXPECT_EQ(Status("/" + file, {{"If-None-Match", std::string(part.Header("ETag"))}}), 304);
    }
    EXPECT_EQ(page.find("src=\"http"), std::string::npos);
    EXPECT_EQ(page.find("href=\"http"), std::string::npos);
}

TEST_F(ServicesTest, OtherMethodsAndAddressesAreRefused) {
    EXPECT_EQ(Ask("/api", {}, Method::Other).status, 405);
    EXPECT_EQ(Ask("/api", {}, Method::Other).Header("Allow"), "GET, HEAD, OPTIONS");
    const Answer options = Ask("/files/a.pyr", {}, Method::Options);
    EXPECT_EQ(options.status, 204);
    EXPECT_NE(options.Header("Access-Control-Allow-Headers").find("Range"), std::string::npos);
    EXPECT_EQ(Status("/nothing"), 404);
    EXPECT_EQ(Ask("/files/a.pyr").Header("Access-Control-Allow-Origin"), "*");
    EXPECT_NE(Ask("/api").Header("Access-Control-Expose-Headers").find("Content-Range"),
              std::string::npos);
}

// --- bad files ---

TEST_F(ServicesTest, ADamagedHeaderIsToldInOneLine) {
    std::string bytes = BytesOf(folder / "a.pyr");
    bytes[30] ^= 0x55;
    std::ofstream(folder / "bad.pyr", std::ios::binary) << bytes;
    const Answer answer = Ask("/tiles/bad.pyr/0/0/0.png");
    EXPECT_EQ(answer.status, 500);
    EXPECT_EQ(answer.Text().find('\n'), answer.Size() - 1);
    EXPECT_EQ(Status("/info/bad.pyr"), 500);
}

TEST_F(ServicesTest, TilesThatAnIncompleteFileLacksAreNotThere) {
    const std::string bytes = BytesOf(folder / "a.pyr");
    std::ofstream(folder / "cut.pyr", std::ios::binary) << bytes.substr(0, 110000);
    EXPECT_EQ(Status("/tiles/cut.pyr/0/0/0.raw"), 200);
    EXPECT_EQ(Status("/tiles/cut.pyr/1/1/0.raw"), 404);
    EXPECT_GE(Status("/tiles/cut.pyr/1/1/0.png"), 400);
}

// The file of an entry of the curve's table would be four gigabytes; its places are computed.
TEST_F(ServicesTest, AMortonFileWithAHugeTableCostsNoMemoryOfThatSize) {
    std::string bytes = BytesOf(folder / "a.pyr");
    zmctest::MemorySource<unsigned char> small(10, 10, 9);
    zmchost::PyramidBuilder(zmctest::TestModule()).Build(small, folder / "m.pyr");
    std::string file = BytesOf(folder / "m.pyr");
    const auto replace = [&](const std::string& name, const std::string& value) {
        const std::size_t at = file.find("<" + name + ">");
        ASSERT_NE(at, std::string::npos) << name;
        const std::size_t start = at + name.size() + 2, end = file.find('<', start);
        file.replace(start, end - start, value);
    };
    replace("HEADER_PIXEL_WIDTH", "10000000");
    replace("HEADER_PIXEL_HEIGHT", "10000000");
    std::ofstream(folder / "huge.pyr", std::ios::binary) << file;
    for (const char* const target :
         {"/info/huge.pyr", "/tiles/huge.pyr/0/0/0.raw", "/tiles/huge.pyr/0/0/0.png",
          "/tiles/huge.pyr/0/39000/39000.jpg", "/preview/huge.pyr.png?size=100",
          "/window/huge.pyr.raw", "/point/huge.pyr?x=9999999&y=0"}) {
        const Answer answer = Ask(target);
        EXPECT_LT(answer.Size(), 100000u) << target;
    }
}

}  // namespace
}  // namespace zmcserve
