// The services of the OGC's standards, asked without a socket.
#include <nlohmann/json.hpp>

#include <cmath>
#include <thread>

#include "serve/Documents.h"
#include "serve/LayerId.h"
#include "serve/MapTile.h"
#include "serve/Negotiation.h"
#include "serve/TileMatrixSet.h"
#include "tests/serve/ServeFixture.h"
#include "tests/support/PyramidFiles.h"

namespace zmcserve {
namespace {

using Json = nlohmann::json;
using zmctest::BuildNoise;
using zmctest::PlaceRaster;

constexpr const char* kUtm = "EPSG:32633";
// A picture's width and height, as a PNG tells them.
std::string SizeInPng(const Answer& answer) { return answer.Text().substr(16, 8); }
const std::string k256 = std::string("\0\0\1\0\0\0\1\0", 8);

class StandardsTest : public zmctest::ServeTest {
protected:
    StandardsTest() {
        BuildNoise<unsigned char>(folder / "a.pyr", 600, 300, 3);
        PlaceRaster(folder / "a.pyr", kUtm, 400000, 5000000, 10, 10);
        BuildNoise<unsigned char>(folder / "plain.pyr", 300, 200, 1);
    }

    Json Document(const std::string& target) { return Json::parse(Ask(target).Text()); }
    std::string Text(const std::string& target) { return Ask(target).Text(); }
    // Short words that differ where answers do: pictures are no text to read.
    std::string Mark(const std::string& target) {
        const Answer answer = Ask(target);
        return std::to_string(answer.status) + ' ' + answer.type + ' ' + VariantOf(answer.Text());
    }
    std::unique_ptr<const Mercator> PlaneOf(const std::string& name) {
        if (!service) Serve();
        const ServedRasterPtr raster = service->catalog.Raster(name);
        const zelm::LevelGeometry finest = raster->Geometry(raster->FinestLevel());
        return std::make_unique<const Mercator>(raster->Place(), finest.samples, finest.lines);
    }
    // The zoom-z tile in which a place of the plane lies.
    static std::string TileAt(std::uint32_t zoom, double x, double y) {
        const double side = Mercator::CellOf(zoom) * Mercator::kTileSide;
        const auto part = [&](double metres) {
            return std::to_string(static_cast<std::uint64_t>(std::floor(metres / side)));
        };
        return "/" + std::to_string(zoom) + "/" + part(Mercator::kEdge - y) + "/" +
               part(x + Mercator::kEdge);
    }
};

TEST_F(StandardsTest, PlacesAreThoseOfTheFinestLevelThatIsThere) {
    const zmctest::HeaderText header{.width = 40, .height = 20, .levelMin = 1, .levelMax = 1};
    const std::string file = folder / "half.pyr";
    std::ofstream(file, std::ios::binary)
        << zmctest::FileWithHeader(header.Text()) << std::string(20 * 10, '\7');
    zmctest::MakeOld(file);
    PlaceRaster(file, "EPSG:4326", 10, 50, 0.5, 0.5);
    EXPECT_EQ(Document("/point/half.pyr?x=0&y=0&level=1")["coordinates"], Json({10.25, 49.75}));
    EXPECT_EQ(Document("/tiles/half.pyr/tile.json")["bounds"], Json({10, 45, 20, 50}));
    EXPECT_EQ(Document("/ogc/collections/half.pyr")["extent"]["spatial"]["bbox"][0],
              Json({10, 45, 20, 50}));
}

const std::string kTiles = "/ogc/collections/a.pyr/map/tiles";
const std::string kPlainTiles = "/ogc/collections/plain.pyr/map/tiles";

// --- identifiers ---

TEST(LayerIdTest, IsMadeOfLettersThatEveryAddressHolds) {
    EXPECT_EQ(LayerIdOf("scene.pyr"), "scene.pyr");
    EXPECT_EQ(LayerIdOf("sub/a b~.pyr"), "sub~2Fa~20b~7E.pyr");
    EXPECT_EQ(LayerIdOf("<&\"'>%\xFF"), "~3C~26~22~27~3E~25~FF");
    std::string all;
    for (int byte = 1; byte < 256; ++byte) all += static_cast<char>(byte);
    EXPECT_EQ(NameOfLayerId(LayerIdOf(all)), all);
    EXPECT_EQ(NameOfLayerId("sub/a b~zz~2"), "sub/a b~zz~2");
}

TEST(NegotiationTest, TheTypeThatIsLikedMostIsChosen) {
    const std::vector<std::string_view> types = {"image/png", "image/jpeg", "image/webp"};
    EXPECT_EQ(BestOf("*/*", types), 0u);
    EXPECT_EQ(BestOf("image/jpeg", types), 1u);
    EXPECT_EQ(BestOf("IMAGE/*;q=0.5, image/webp", types), 2u);
    EXPECT_EQ(BestOf("image/png;q=0, image/*", types), 1u);
    EXPECT_EQ(BestOf("text/html, */*;q=0.1, image/webp;q=0.2", types), 2u);
    EXPECT_EQ(BestOf("text/html", types), std::nullopt);
    EXPECT_EQ(BestOf("", types), std::nullopt);
}

// --- OGC API: documents ---

TEST_F(StandardsTest, TheLandingPageLeadsToWhatThereIs) {
    const Json landing = Document("/ogc");
    std::vector<std::string> relations;
    for (const Json& link : landing["links"]) {
        const std::string href = link["href"];
        ASSERT_EQ(href.find("http://here/"), 0u) << href;
        EXPECT_EQ(Status(href.substr(11)), 200) << href;
        relations.push_back(link["rel"]);
    }
    for (const char* const relation : {"self", "service-desc", "conformance",
                                       "http://www.opengis.net/def/rel/ogc/1.0/conformance",
                                       "http://www.opengis.net/def/rel/ogc/1.0/data",
                                       "http://www.opengis.net/def/rel/ogc/1.0/tiling-schemes"})
        EXPECT_NE(std::find(relations.begin(), relations.end(), relation), relations.end())
            << relation;
    EXPECT_EQ(Text("/ogc/"), Ask("/ogc/").Text());
    const Json classes = Document("/ogc/conformance")["conformsTo"];
    for (const char* const name :
         {"http://www.opengis.net/spec/ogcapi-tiles-1/1.0/conf/core",
          "http://www.opengis.net/spec/ogcapi-tiles-1/1.0/conf/tilesets-list",
          "http://www.opengis.net/spec/tms/2.0/conf/json-tilematrixset"})
        EXPECT_NE(std::find(classes.begin(), classes.end(), name), classes.end()) << name;
}

TEST_F(StandardsTest, TheDefinitionHasTheAddressesThatAreAnswered) {
    const Answer answer = Ask("/ogc/api");
    EXPECT_EQ(answer.type, "application/vnd.oai.openapi+json;version=3.0");
    const Json document = Json::parse(answer.Text());
    EXPECT_EQ(document["openapi"], "3.0.3");
    const std::map<std::string, std::string> values = {{"{collectionId}", "a.pyr"},
                                                       {"{tileMatrixSetId}", "own-a.pyr"},
                                                       {"{tileMatrix}", "0"},
                                                       {"{tileRow}", "0"},
                                                       {"{tileCol}", "0"}};
    for (const auto& [path, operations] : document["paths"].items()) {
        std::string address = path;
        for (const auto& [name, value] : values)
            if (const std::size_t at = address.find(name); at != address.npos)
                address.replace(at, name.size(), value);
        EXPECT_EQ(Status("/ogc" + address), 200) << address;
        for (const Json& parameter : operations["get"]["parameters"]) {
            const std::string reference = parameter["$ref"];
            EXPECT_TRUE(document["components"]["parameters"].contains(
                reference.substr(reference.rfind('/') + 1)))
                << reference;
        }
    }
}

TEST_F(StandardsTest, CollectionsAreToldInPages) {
    const Json all = Document("/ogc/collections");
    ASSERT_EQ(all["collections"].size(), 2u);
    EXPECT_EQ(all["numberMatched"], 2);
    const Json& first = all["collections"][0];
    EXPECT_EQ(first["id"], "a.pyr");
    EXPECT_EQ(first, Document("/ogc/collections/a.pyr"));
    const Json box = first["extent"]["spatial"]["bbox"][0];
    EXPECT_NEAR(box[0], 13.73, 0.01);  // 400,000 m of zone 33 in 45 degrees north
    EXPECT_NEAR(box[3], 45.15, 0.01);
    EXPECT_FALSE(all["collections"][1].contains("extent"));
    const Json page = Document("/ogc/collections?limit=1");
    EXPECT_EQ(page["collections"].size(), 1u);
    EXPECT_EQ(page["links"][1]["rel"], "next");
    const std::string next = page["links"][1]["href"];
    const Json last = Document(next.substr(11));
    EXPECT_EQ(last["collections"][0]["id"], "plain.pyr");
    EXPECT_EQ(last["links"][1]["rel"], "prev");
    for (const char* const query : {"?limit=0", "?limit=-1", "?limit=nan", "?offset=1e3", "?x=1",
                                    "?limit=1&limit=1", "?f=html"})
        EXPECT_EQ(Status(std::string("/ogc/collections") + query), 400) << query;
    EXPECT_EQ(Document("/ogc/collections?offset=4294967295")["collections"].size(), 0u);
}

TEST_F(StandardsTest, TilesetsOfARasterAreItsOwnAndWebMercator) {
    const Json list = Document(kTiles)["tilesets"];
    ASSERT_EQ(list.size(), 2u);
    EXPECT_EQ(list[0]["crs"], "http://www.opengis.net/def/crs/EPSG/0/32633");
    EXPECT_EQ(list[0]["dataType"], "map");
    EXPECT_EQ(list[0]["tileMatrixSetURI"], "http://here/ogc/tileMatrixSets/own-a.pyr");
    EXPECT_EQ(list[1]["tileMatrixSetURI"],
              "http://www.opengis.net/def/tilematrixset/OGC/1.0/WebMercatorQuad");
    for (const Json& tileset : list) {
        const std::string self = tileset["links"][0]["href"], scheme = tileset["links"][1]["href"];
        EXPECT_EQ(tileset["links"][1]["rel"],
                  "http://www.opengis.net/def/rel/ogc/1.0/tiling-scheme");
        EXPECT_EQ(Status(scheme.substr(11)), 200) << scheme;
        const Json document = Document(self.substr(11));
        EXPECT_EQ(document["crs"], tileset["crs"]);
        for (const Json& limit : document["tileMatrixSetLimits"]) {
            EXPECT_LE(limit["minTileRow"], limit["maxTileRow"]);
            EXPECT_LE(limit["minTileCol"], limit["maxTileCol"]);
            std::string tile = document["links"][2]["href"];
            EXPECT_EQ(document["links"][2]["templated"], true);
            for (const auto& [name, value] :
                 {std::pair("{tileMatrix}", limit["tileMatrix"].get<std::string>()),
                  std::pair("{tileRow}", limit["maxTileRow"].dump()),
                  std::pair("{tileCol}", limit["minTileCol"].dump())})
                tile.replace(tile.find(name), std::string(name).size(), value);
            EXPECT_EQ(Ask(tile.substr(11)).type, "image/png") << tile;
        }
    }
}

TEST_F(StandardsTest, TheLookOfADocumentsAddressGoesIntoThoseOfItsTiles) {
    const Json document = Document(kTiles + "/own-a.pyr?stretch=p2,98&quality=70&f=json");
    EXPECT_EQ(document["links"][2]["href"],
              "http://here/ogc/collections/a.pyr/map/tiles/own-a.pyr/"
              "{tileMatrix}/{tileRow}/{tileCol}?f=png&stretch=p2%2C98&quality=70");
    EXPECT_EQ(Status(kTiles + "/own-a.pyr?colourmap=turbo"), 400);
    const std::string capabilities =
        Text("/wmts?service=WMTS&request=GetCapabilities&gamma=2&Other=%22%3E");
    EXPECT_NE(capabilities.find("{TileCol}.png?gamma=2\""), std::string::npos);
    EXPECT_NE(capabilities.find("\"http://here/wmts?gamma=2&amp;\""), std::string::npos);
    EXPECT_EQ(capabilities.find("Other"), std::string::npos);
}

TEST_F(StandardsTest, TheOwnGridHasAMatrixForEachLevel) {
    const Json set = Document("/ogc/tileMatrixSets/own-a.pyr");
    EXPECT_EQ(set["id"], "own-a.pyr");
    EXPECT_EQ(set["crs"], "http://www.opengis.net/def/crs/EPSG/0/32633");
    ASSERT_EQ(set["tileMatrices"].size(), 3u);
    for (std::size_t z = 0; z < 3; ++z) {
        const Json& matrix = set["tileMatrices"][z];
        const double cell = std::ldexp(10, 2 - static_cast<int>(z));
        EXPECT_EQ(matrix["id"], std::to_string(z));
        EXPECT_EQ(matrix["cellSize"], cell);
        EXPECT_DOUBLE_EQ(matrix["scaleDenominator"], cell / 0.00028);
        EXPECT_EQ(matrix["cornerOfOrigin"], "topLeft");
        EXPECT_EQ(matrix["pointOfOrigin"], Json({400000.0, 5000000.0}));
        EXPECT_EQ(matrix["tileWidth"], 256);
        EXPECT_EQ(matrix["tileHeight"], 256);
        EXPECT_EQ(matrix["matrixWidth"], z == 2 ? 3 : z == 1 ? 2 : 1);
        EXPECT_EQ(matrix["matrixHeight"], z == 2 ? 2 : 1);
    }
}

TEST_F(StandardsTest, WebMercatorQuadIsTheOneThatIsRegistered) {
    const Json set = Document("/ogc/tileMatrixSets/WebMercatorQuad");
    EXPECT_EQ(set["uri"], "http://www.opengis.net/def/tilematrixset/OGC/1.0/WebMercatorQuad");
    EXPECT_EQ(set["crs"], "http://www.opengis.net/def/crs/EPSG/0/3857");
    EXPECT_EQ(set["wellKnownScaleSet"],
              "http://www.opengis.net/def/wkss/OGC/1.0/GoogleMapsCompatible");
    ASSERT_EQ(set["tileMatrices"].size(), 25u);
    const Json& first = set["tileMatrices"][0];
    EXPECT_NEAR(first["scaleDenominator"], 559082264.028717, 1e-5);
    EXPECT_NEAR(first["cellSize"], 156543.033928041, 1e-8);
    EXPECT_NEAR(first["pointOfOrigin"][0], -20037508.3427892, 1e-6);
    EXPECT_NEAR(first["pointOfOrigin"][1], 20037508.3427892, 1e-6);
    const Json& last = set["tileMatrices"][24];
    EXPECT_NEAR(last["scaleDenominator"], 33.3238997477482, 1e-9);
    EXPECT_EQ(last["matrixWidth"], 1 << 24);
}

TEST_F(StandardsTest, CapabilitiesHaveTheMatricesThatTheLayersNeed) {
    const auto matrices = [&](const std::string& target) {
        const std::string text = Text(target);
        const std::string set = text.substr(text.rfind("<TileMatrixSet><ows:Title>Web Mercator"));
        std::size_t count = 0;
        for (std::size_t at = 0; (at = set.find("<TileMatrix>", at)) != set.npos; ++at) ++count;
        return count;
    };
    BuildNoise<unsigned char>(folder / "coarse.pyr", 100, 80, 1);
    PlaceRaster(folder / "coarse.pyr", kUtm, 400000, 5000000, 1000, 1000);
    const std::size_t fine = PlaneOf("a.pyr")->Zoom() + 1,
                      coarse = PlaneOf("coarse.pyr")->Zoom() + 1;
    EXPECT_GT(fine, coarse);
    EXPECT_EQ(matrices("/wmts/1.0.0/WMTSCapabilities.xml"), fine);
    EXPECT_EQ(matrices("/wmts/1.0.0/a.pyr/WMTSCapabilities.xml"), fine);
    EXPECT_EQ(matrices("/wmts/1.0.0/coarse.pyr/WMTSCapabilities.xml"), coarse);
    // Finer tiles than those are answered all the same.
    EXPECT_EQ(Status("/wmts/1.0.0/coarse.pyr/default/WebMercatorQuad/24/0/0.png"), 200);
}

TEST_F(StandardsTest, CoordinatesStandInTheOrderOfTheirSystem) {
    BuildNoise<unsigned char>(folder / "d.pyr", 100, 80, 1);
    PlaceRaster(folder / "d.pyr", "EPSG:4326", 10, 50, 0.01, 0.01);
    const Json set = Document("/ogc/tileMatrixSets/own-d.pyr");
    EXPECT_EQ(set["tileMatrices"][0]["pointOfOrigin"], Json({50.0, 10.0}));
    EXPECT_NEAR(set["tileMatrices"][0]["scaleDenominator"], 0.01 * 111319.49079327358 / 0.00028,
                1e-6);
    EXPECT_NE(
        Text("/wmts/1.0.0/d.pyr/WMTSCapabilities.xml").find("<TopLeftCorner>50 10</TopLeftCorner>"),
        std::string::npos);
}

TEST_F(StandardsTest, WithoutUprightSquaresTheOwnGridIsInPixels) {
    BuildNoise<unsigned char>(folder / "oblong.pyr", 300, 200, 1);
    PlaceRaster(folder / "oblong.pyr", kUtm, 400000, 5000000, 10, 20);
    for (const char* const name : {"plain.pyr", "oblong.pyr"}) {
        const Json set = Document(std::string("/ogc/tileMatrixSets/own-") + name);
        EXPECT_EQ(set["crs"]["wkt"]["type"], "EngineeringCRS") << name;
        EXPECT_EQ(set["tileMatrices"][1]["cellSize"], 1.0);
        EXPECT_EQ(set["tileMatrices"][0]["cellSize"], 2.0);
        EXPECT_EQ(set["tileMatrices"][0]["pointOfOrigin"], Json({0.0, 0.0}));
        EXPECT_EQ(
            Document(std::string("/ogc/collections/") + name + "/map/tiles")["tilesets"].size(),
            name[0] == 'p' ? 1u : 2u);
    }
}

TEST_F(StandardsTest, ASystemWithoutARegisteredNameIsToldAsItsText) {
    BuildNoise<unsigned char>(folder / "w.pyr", 100, 80, 1);
    PlaceRaster(folder / "w.pyr", "+proj=laea +lat_0=10 +lon_0=20 +datum=WGS84", 0, 0, 1000, 1000);
    EXPECT_EQ(Document("/ogc/tileMatrixSets/own-w.pyr")["crs"]["wkt"]["type"], "ProjectedCRS");
    EXPECT_NE(Text("/wmts/1.0.0/w.pyr/WMTSCapabilities.xml").find("<ows:SupportedCRS>PROJCS["),
              std::string::npos);
}

TEST_F(StandardsTest, DocumentsHaveTagsAndAreAskedForAgain) {
    for (const char* const target :
         {"/ogc", "/ogc/conformance", "/ogc/api", "/ogc/collections", "/ogc/collections/a.pyr",
          "/ogc/tileMatrixSets", "/ogc/tileMatrixSets/own-a.pyr",
          "/ogc/collections/a.pyr/map/tiles", "/ogc/collections/a.pyr/map/tiles/WebMercatorQuad",
          "/wmts/1.0.0/WMTSCapabilities.xml", "/wmts/1.0.0/a.pyr/default/own-a.pyr/0/0/0/1/1.json",
          "/wmts/1.0.0/a.pyr/default/own-a.pyr/0/0/0.png",
          "/ogc/collections/a.pyr/map/tiles/WebMercatorQuad/0/0/0"}) {
        const Answer answer = Ask(target);
        EXPECT_EQ(answer.status, 200) << target;
        const std::string tag(answer.Header("ETag"));
        EXPECT_FALSE(tag.empty()) << target;
        EXPECT_EQ(answer.Header("Cache-Control"), "public, max-age=0, must-revalidate") << target;
        EXPECT_EQ(Status(target, {{"If-None-Match", tag}}), 304) << target;
    }
}

// --- tiles ---

TEST_F(StandardsTest, OwnTilesAreThoseOfTheRasterInTheirWholeSize) {
    EXPECT_EQ(Mark(kTiles + "/own-a.pyr/2/0/1?f=png"), Mark("/tiles/a.pyr/2/1/0.png"));
    EXPECT_NE(Mark(kTiles + "/own-a.pyr/2/1/0?f=png"), Mark("/tiles/a.pyr/2/1/0.png"));
    for (const char* const tile : {"/2/1/2", "/1/0/1", "/0/0/0"}) {
        const Answer png = Ask(kTiles + "/own-a.pyr" + tile + "?f=png");
        EXPECT_EQ(SizeInPng(png), k256) << tile;
        EXPECT_EQ(png.Text()[25], 6) << "colours and alpha";
    }
    EXPECT_EQ(Mark("/wmts/1.0.0/a.pyr/default/own-a.pyr/2/1/2.png"),
              Mark(kTiles + "/own-a.pyr/2/1/2?f=png"));
    EXPECT_EQ(Mark("/wmts?SERVICE=WMTS&REQUEST=GetTile&VERSION=1.0.0&LAYER=a.pyr&STYLE=default&"
                   "FORMAT=image/png&TILEMATRIXSET=own-a.pyr&TILEMATRIX=2&TILEROW=1&TILECOL=2"),
              Mark(kTiles + "/own-a.pyr/2/1/2?f=png"));
}

TEST_F(StandardsTest, TilesHaveTheSideThatTheFileTellsUpToALimit) {
    BuildNoise<unsigned char>(folder / "small.pyr", 10, 8, 1);
    const std::string bytes = BytesOf(folder / "small.pyr"), name = "<HEADER_TILESIZE>";
    const std::size_t at = bytes.find(name) + name.size();
    ASSERT_EQ(bytes.substr(at, 4), "256<");
    const auto tile = [&](const std::string& side) {
        std::string changed = bytes;
        std::ofstream(folder / "side.pyr", std::ios::binary) << changed.replace(at, 3, side);
        zmctest::MakeOld(folder / "side.pyr");
        Serve();
        return Ask("/ogc/collections/side.pyr/map/tiles/own-side.pyr/0/0/0?f=png");
    };
    EXPECT_EQ(SizeInPng(tile("512")), std::string("\0\0\2\0\0\0\2\0", 8));
    EXPECT_EQ(Document("/ogc/tileMatrixSets/own-side.pyr")["tileMatrices"][0]["tileHeight"], 512);
    limits.pixels = 512 * 512;
    EXPECT_EQ(tile("512").status, 200);
    EXPECT_EQ(tile("513").status, 400);
    limits = {};
    limits.side = 600;
    EXPECT_EQ(tile("600").status, 200);
    EXPECT_EQ(tile("601").status, 400);
}

TEST_F(StandardsTest, TheFormatIsThatOfTheKeyOrTheHeader) {
    const std::string tile = kTiles + "/WebMercatorQuad/0/0/0";
    EXPECT_EQ(Ask(tile).type, "image/png");
    EXPECT_EQ(Ask(tile).Header("Vary"), "Accept");
    EXPECT_EQ(Ask(tile, {{"Accept", "image/jpeg"}}).type, "image/jpeg");
    EXPECT_EQ(Ask(tile, {{"Accept", "image/webp,*/*;q=0.8"}}).type, "image/webp");
    EXPECT_NE(Ask(tile).Header("ETag"), Ask(tile, {{"Accept", "image/jpeg"}}).Header("ETag"));
    EXPECT_EQ(Status(tile, {{"Accept", "text/html"}}), 406);
    const Answer chosen = Ask(tile + "?f=jpeg", {{"Accept", "image/png"}});
    EXPECT_EQ(chosen.type, "image/jpeg");
    EXPECT_EQ(chosen.Header("Vary"), "");
    EXPECT_EQ(Status(tile + "?f=tiff"), 400);
    EXPECT_EQ(Status(tile + "?f=png&f=png"), 400);
}

TEST_F(StandardsTest, TilesThatASetDoesNotHaveAreNotFound) {
    for (const char* const tile :
         {"/own-a.pyr/3/0/0", "/own-a.pyr/0/1/0", "/own-a.pyr/0/0/1",
          "/own-a.pyr/99999999999999999999/0/0", "/WebMercatorQuad/25/0/0",
          "/WebMercatorQuad/0/1/0", "/WebMercatorQuad/1/0/2", "/WebMercatorQuad/24/0/16777216",
          "/WebMercatorQuad/4294967295/0/0", "/WebMercatorQuad/0/4294967295/0",
          "/own-plain.pyr/0/0/0", "/WorldCRS84Quad/0/0/0", "/own-/0/0/0", "/%FF/0/0/0",
          "/WebMercatorQuad/0/0/"})
        EXPECT_EQ(Status(kTiles + tile), 404) << tile;
    for (const char* const tile :
         {"/own-a.pyr/-1/0/0", "/own-a.pyr/0/nan/0", "/own-a.pyr/0/0/1e0",
          "/WebMercatorQuad/inf/0/0", "/WebMercatorQuad/0/+0/0", "/WebMercatorQuad/0/0/0.png"})
        EXPECT_EQ(Status(kTiles + tile), 400) << tile;
    EXPECT_EQ(Status("/ogc/collections/none.pyr/map/tiles/WebMercatorQuad/0/0/0"), 404);
    EXPECT_EQ(Status(kTiles + "/WebMercatorQuad/0/0/0?resampling=lanczos"), 400);
    EXPECT_EQ(Status(kTiles + "/WebMercatorQuad/0/0/0?bands=9"), 400);
    EXPECT_EQ(Status(kTiles + "/WebMercatorQuad/24/0/0?bands=9"), 400) << "where it is empty";
    for (const char* const target :
         {"/ogc/x", "/ogc/collections/a.pyr/tiles", "/ogc/collections/a.pyr/map",
          "/ogc/collections/a.pyr/map/tiles/own-a.pyr/0", "/ogc/conformance/x",
          "/ogc/tileMatrixSets/x", "/ogc/tileMatrixSets/own-none"})
        EXPECT_EQ(Status(target), 404) << target;
}

// --- Web Mercator ---

TEST_F(StandardsTest, WhereThereIsNoRasterATileIsTransparent) {
    const Answer tile = Ask(kTiles + "/WebMercatorQuad/3/0/0?f=png");
    EXPECT_EQ(tile.status, 200);
    EXPECT_EQ(SizeInPng(tile), k256);
    EXPECT_LT(tile.Size(), 1500u);
    const auto plane = PlaneOf("a.pyr");
    const PlaneExtent& bounds = plane->Bounds();
    const std::string inside =
        TileAt(plane->Zoom(), (bounds.west + bounds.east) / 2, (bounds.south + bounds.north) / 2);
    EXPECT_GT(Ask(kTiles + "/WebMercatorQuad" + inside + "?f=png").Size(), 20000u);
}

// Pixels of a raster that are those of tiles are neither moved nor mixed, by any method.
TEST_F(StandardsTest, PixelsThatFitTheTilesAreThoseOfTheRaster) {
    BuildNoise<unsigned char>(folder / "fit.pyr", 512, 512, 3);
    const double cell = Mercator::CellOf(10);
    PlaceRaster(folder / "fit.pyr", "EPSG:3857", 512 * cell, 1024 * cell, cell, cell);
    EXPECT_EQ(PlaneOf("fit.pyr")->Zoom(), 10u);
    for (const char* const how : {"nearest", "bilinear", "cubic"}) {
        const std::string key = std::string("?f=png&resampling=") + how;
        for (std::uint32_t x : {0u, 1u})
            for (std::uint32_t y : {0u, 1u})
                EXPECT_EQ(Mark("/ogc/collections/fit.pyr/map/tiles/WebMercatorQuad/10/" +
                               std::to_string(508 + y) + "/" + std::to_string(514 + x) + key),
                          Mark("/tiles/fit.pyr/1/" + std::to_string(x) + "/" + std::to_string(y) +
                               ".png"))
                    << how;
        EXPECT_EQ(Mark("/ogc/collections/fit.pyr/map/tiles/WebMercatorQuad/9/254/257" + key),
                  Mark("/tiles/fit.pyr/0/0/0.png"))
            << how;
    }
    const Json ranges =
        Document("/ogc/collections/fit.pyr/map/tiles/WebMercatorQuad")["tileMatrixSetLimits"];
    ASSERT_EQ(ranges.size(), 11u);
    EXPECT_LE(ranges[10]["minTileRow"], 508);
    EXPECT_GE(ranges[10]["maxTileCol"], 515);
}

TEST_F(StandardsTest, ATileCostsAboutTheSameAtEveryZoom) {
    BuildNoise<unsigned char>(folder / "large.pyr", 3000, 2500, 1);
    for (const char* const system : {kUtm, "EPSG:3857", "EPSG:3035"}) {
        PlaceRaster(folder / "large.pyr", system, 4500000 - 4100000 * (system == kUtm), 3000000, 10,
                    10);
        Serve();
        const ServedRasterPtr raster = service->catalog.Raster("large.pyr");
        const auto plane = PlaneOf("large.pyr");
        const double x = plane->Spots()[220].x, y = plane->Spots()[220].y;
        for (std::uint32_t zoom = 0; zoom <= Mercator::kMostZoom; ++zoom) {
            const double side = Mercator::CellOf(zoom) * Mercator::kTileSide;
            const auto source =
                SourceOf(*raster, *plane,
                         Mercator::ExtentOfTile(
                             zoom, static_cast<std::uint64_t>((x + Mercator::kEdge) / side),
                             static_cast<std::uint64_t>((Mercator::kEdge - y) / side)),
                         Mercator::kTileSide, 1u << 30);
            ASSERT_TRUE(source) << system << zoom;
            EXPECT_LE(source->window.Pixels(), 4 * 512u * 512u) << system << zoom;
            if (zoom >= plane->Zoom()) {
                EXPECT_EQ(source->level, 0u) << system << zoom;
            }
            if (zoom < 5) {
                EXPECT_EQ(source->level, raster->CoarsestLevel()) << system << zoom;
            }
        }
    }
}

TEST_F(StandardsTest, WhatIsHeldForATileIsBounded) {
    // Pixels that are a hundred times as high as wide: no level suits both directions.
    BuildNoise<unsigned char>(folder / "thin.pyr", 8000, 600, 1);
    PlaceRaster(folder / "thin.pyr", "EPSG:3857", 0, 100000, 1, 100);
    Serve();
    const ServedRasterPtr raster = service->catalog.Raster("thin.pyr");
    const auto plane = PlaneOf("thin.pyr");
    const PlaneExtent all{0, 92000, 8000, 100000};
    const auto source = SourceOf(*raster, *plane, all, 256, 1u << 30);
    const auto bounded = SourceOf(*raster, *plane, all, 256, 100000);
    ASSERT_TRUE(source && bounded);
    EXPECT_GT(bounded->level, source->level);
    EXPECT_LE(bounded->window.Pixels(), 100000u);
    limits.window = 70000;
    Serve();
    const auto tile = TileAt(12, 4000, 96000);
    EXPECT_EQ(Status("/ogc/collections/thin.pyr/map/tiles/WebMercatorQuad" + tile), 200);
}

TEST_F(StandardsTest, ARasterOnBothSidesOfTheDateLineIsFoundOnBoth) {
    BuildNoise<unsigned char>(folder / "date.pyr", 200, 100, 1);
    const auto size = [&](const std::string& tile) {
        return Ask("/ogc/collections/date.pyr/map/tiles/WebMercatorQuad" + tile + "?f=png").Size();
    };
    const double edge = Mercator::kEdge;
    for (const auto& [system, west, north, cell] :
         {std::tuple("EPSG:4326", 170.0, 5.0, 0.1), std::tuple("EPSG:4326", -190.0, 5.0, 0.1),
          std::tuple("EPSG:32660", -200000.0 + 1000000, 500000.0, 10000.0)}) {
        PlaceRaster(folder / "date.pyr", system, west, north, cell, cell);
        Serve();
        EXPECT_GT(size(TileAt(6, edge - 300000, 100000)), 3000u) << system << west;
        EXPECT_GT(size(TileAt(6, 300000 - edge, 100000)), 3000u) << system << west;
        EXPECT_LT(size(TileAt(6, 0, 100000)), 1500u) << system << west;
        EXPECT_GT(size("/0/0/0"), 300u);
    }
}

TEST_F(StandardsTest, ARasterThatCountsFrom0To360IsFoundAllAround) {
    BuildNoise<unsigned char>(folder / "round.pyr", 720, 360, 1);
    PlaceRaster(folder / "round.pyr", "EPSG:4326", 0, 90, 0.5, 0.5);
    for (const double x : {-19e6, -10e6, -1e5, 1e5, 10e6, 19e6})
        EXPECT_GT(Ask("/ogc/collections/round.pyr/map/tiles/WebMercatorQuad" + TileAt(3, x, 1e6) +
                      "?f=png")
                      .Size(),
                  5000u)
            << x;
    const Json ranges =
        Document("/ogc/collections/round.pyr/map/tiles/WebMercatorQuad")["tileMatrixSetLimits"];
    EXPECT_EQ(ranges[1]["minTileCol"], 0);
    EXPECT_EQ(ranges[1]["maxTileCol"], 1);
    EXPECT_EQ(ranges[1]["maxTileRow"], 1);
}

TEST_F(StandardsTest, ARasterAroundThePoleIsShownAsFarAsThePlaneGoes) {
    BuildNoise<unsigned char>(folder / "pole.pyr", 500, 500, 1);
    PlaceRaster(folder / "pole.pyr", "EPSG:3413", -2500000, 2500000, 10000, 10000);
    const auto plane = PlaneOf("pole.pyr");
    EXPECT_EQ(plane->Bounds().west, -Mercator::kEdge);
    EXPECT_EQ(plane->Bounds().east, Mercator::kEdge);
    EXPECT_EQ(plane->Bounds().north, Mercator::kEdge);
    const auto tile = [&](double x, double y) {
        return Ask("/ogc/collections/pole.pyr/map/tiles/WebMercatorQuad" + TileAt(4, x, y) +
                   "?f=png");
    };
    for (const double x : {-19e6, -8e6, 1e5, 8e6, 19e6}) {
        EXPECT_GT(tile(x, 19e6).Size(), 5000u) << x;
        EXPECT_LT(tile(x, -1e6).Size(), 1500u) << x;
    }
}

TEST_F(StandardsTest, WhatHasNoPlaceInThePlaneIsToldInOneLine) {
    BuildNoise<unsigned char>(folder / "bad.pyr", 300, 200, 1);
    const auto refused = [&](const std::string& name) {
        const Answer answer = Ask("/ogc/collections/" + name + "/map/tiles/WebMercatorQuad/0/0/0");
        EXPECT_EQ(answer.status, 404);
        return answer.Text();
    };
    EXPECT_EQ(refused("plain.pyr"),
              "the raster has no place in Web Mercator: it is not georeferenced\n");
    for (const auto& [system, why] :
         {std::pair("LOCAL_CS[\"works\",UNIT[\"metre\",1]]", "there is no way into it"),
          std::pair("GEOGCS[\"Mars\",DATUM[\"Mars\",SPHEROID[\"Mars\",3396190,169.89]],"
                    "PRIMEM[\"0\",0],UNIT[\"degree\",0.0174532925199433]]",
                    "there is no way into it"),
          std::pair("nonsense<&\"", "it has no system of coordinates")}) {
        PlaceRaster(folder / "bad.pyr", system, 0, 0, 1, 1);
        Serve();
        EXPECT_NE(refused("bad.pyr").find(why), std::string::npos) << refused("bad.pyr");
        EXPECT_EQ(Status("/ogc/collections/bad.pyr/map/tiles/WebMercatorQuad"), 404);
        EXPECT_EQ(Status("/ogc/collections/bad.pyr/map/tiles/own-bad.pyr/0/0/0"), 200);
        EXPECT_EQ(Text("/wmts/1.0.0/bad.pyr/WMTSCapabilities.xml").find("WebMercatorQuad"),
                  std::string::npos);
    }
    PlaceRaster(folder / "bad.pyr", "EPSG:4326", 0, 0, 0, 1);
    Serve();
    EXPECT_NE(refused("bad.pyr").find("cannot be inverted"), std::string::npos);
    PlaceRaster(folder / "bad.pyr", "EPSG:4326", 0, -86, 0.001, 0.001);
    Serve();
    EXPECT_NE(refused("bad.pyr").find("it lies beyond the edges"), std::string::npos);
    PlaceRaster(folder / "bad.pyr", "EPSG:4326", 1e300, 1e300, 1, 1);
    Serve();
    EXPECT_NE(refused("bad.pyr").find("no place"), std::string::npos);
}

TEST_F(StandardsTest, StylesAndDepthsAreThoseOfOtherTiles) {
    const auto plane = PlaneOf("a.pyr");
    const std::string tile = kTiles + "/WebMercatorQuad" +
                             TileAt(12, plane->Spots()[220].x, plane->Spots()[220].y) + "?f=png";
    EXPECT_NE(Mark(tile), Mark(tile + "&bands=1&colormap=turbo"));
    EXPECT_NE(Mark(tile), Mark(tile + "&resampling=nearest"));
    EXPECT_GT(Ask(tile).Size(), 5000u);
    EXPECT_EQ(Ask(tile + "&depth=16").Text()[24], 16);
    EXPECT_EQ(Ask(tile + "&bands=2&hillshade=1").status, 200);
    EXPECT_EQ(Ask(tile + "&expression=b1-b2&stretch=-9,9").status, 200);
    EXPECT_EQ(Ask(kTiles + "/own-a.pyr/0/0/0?f=png&depth=16").Text()[24], 16);
}

TEST_F(StandardsTest, AnyNumberOfThreadsGetTheSameTiles) {
    Serve();
    const auto plane = PlaneOf("a.pyr");
    std::vector<std::string> targets, alone;
    for (std::uint32_t zoom = 0; zoom <= 16; zoom += 2)
        targets.push_back(kTiles + "/WebMercatorQuad" +
                          TileAt(zoom, plane->Spots()[220].x, plane->Spots()[220].y));
    for (const std::string& target : targets) alone.push_back(Mark(target));
    Serve();
    std::vector<std::vector<std::string>> found(8);
    {
        std::vector<std::jthread> threads;
        for (auto& marks : found)
            threads.emplace_back([&] {
                for (const std::string& target : targets) marks.push_back(Mark(target));
            });
    }
    for (const auto& marks : found) EXPECT_EQ(marks, alone);
}

// --- WMTS ---

const std::string kGetTile =
    "/wmts?service=WMTS&request=GetTile&version=1.0.0&layer=a.pyr&style=default&"
    "format=image/png&tilematrixset=own-a.pyr";

TEST_F(StandardsTest, NamesOfKeysAreTakenInAnyCase) {
    const std::string tile = Mark(kGetTile + "&tilematrix=0&tilerow=0&tilecol=0");
    EXPECT_EQ(tile.substr(0, 3), "200");
    EXPECT_EQ(Mark("/wmts?SeRvIcE=wmts&ReQuEsT=gettile&VERSION=1.0.0&Layer=a.pyr&Style=&FORMAT="
                   "IMAGE/PNG&TileMatrixSet=own-a.pyr&TILEMATRIX=0&tileROW=0&TileCol=0&token=9"),
              tile);
    EXPECT_NE(Mark(kGetTile + "&tilematrix=0&tilerow=0&tilecol=0&gamma=3"), tile);
}

TEST_F(StandardsTest, WhatGoesWrongIsAReportWithACode) {
    const std::string all = kGetTile + "&tilematrix=0&tilerow=0&tilecol=0";
    const auto without = [&](const std::string& part) {
        std::string target = all;
        return target.erase(target.find(part), part.size());
    };
    for (const auto& [target, status, code, locator] :
         std::vector<std::tuple<std::string, int, std::string, std::string>>{
             {"/wmts", 400, "MissingParameterValue", "Service"},
             {"/wmts?service=WMS&request=GetTile", 400, "InvalidParameterValue", "Service"},
             {"/wmts?service=WMTS", 400, "MissingParameterValue", "Request"},
             {"/wmts?service=WMTS&request=GetMap", 501, "OperationNotSupported", "Request"},
             {"/wmts?service=WMTS&request=GetCapabilities&acceptversions=2.0.0,1.1.0", 400,
              "VersionNegotiationFailed", "AcceptVersions"},
             {without("&version=1.0.0"), 400, "MissingParameterValue", "Version"},
             {without("&layer=a.pyr"), 400, "MissingParameterValue", "Layer"},
             {without("&tilecol=0"), 400, "MissingParameterValue", "TileCol"},
             {without("&format=image/png"), 400, "MissingParameterValue", "Format"},
             {all + "&LAYER=b", 400, "InvalidParameterValue", ""},
             {without("a.pyr") + "x", 400, "MissingParameterValue", "Layer"},
             {kGetTile + "x&tilematrix=0&tilerow=0&tilecol=0", 400, "InvalidParameterValue",
              "TileMatrixSet"},
             {kGetTile + "&tilematrix=9&tilerow=0&tilecol=0", 400, "TileOutOfRange", "TileRow"},
             {kGetTile + "&tilematrix=0&tilerow=1&tilecol=0", 400, "TileOutOfRange", "TileRow"},
             {kGetTile + "&tilematrix=nan&tilerow=0&tilecol=0", 400, "InvalidParameterValue",
              "TileMatrix"},
             {kGetTile + "&tilematrix=0&tilerow=-1&tilecol=0", 400, "InvalidParameterValue",
              "TileRow"},
             {kGetTile + "&tilematrix=0&tilerow=0&tilecol=99999999999999999999", 400,
              "InvalidParameterValue", "TileCol"},
             {all + "&gamma=nan", 400, "InvalidParameterValue", ""},
             {"/wmts/1.0.0/none/default/own-none/0/0/0.png", 404, "InvalidParameterValue", "Layer"},
             {"/wmts/1.0.0/a.pyr/other/own-a.pyr/0/0/0.png", 404, "InvalidParameterValue", "Style"},
             {"/wmts/1.0.0/a.pyr/default/own-a.pyr/0/0/0.tif", 404, "InvalidParameterValue",
              "Format"},
             {"/wmts/1.0.0/a.pyr/default/own-a.pyr/0/0/7.png", 404, "TileOutOfRange", "TileRow"},
             {"/wmts/1.0.0/a.pyr/default/own-a.pyr/0/0/0/256/0.json", 400, "PointIJOutOfRange",
              "J"},
             {"/wmts/1.0.0/a.pyr/default/own-a.pyr/0/0/0/0/-1.json", 400, "PointIJOutOfRange", "I"},
             {"/wmts/2.0.0/WMTSCapabilities.xml", 404, "InvalidParameterValue", "Request"},
             {"/wmts/1.0.0/..%2Fa/WMTSCapabilities.xml", 404, "InvalidParameterValue", "Layer"},
             {"/wmts/1.0.0/%3C%26%22'%FF/default/x/0/0/0.png", 404, "InvalidParameterValue",
              "Layer"}}) {
        const Answer answer = Ask(target);
        EXPECT_EQ(answer.status, status) << target << answer.Text();
        EXPECT_EQ(answer.type, "application/xml");
        const std::string text = answer.Text();
        EXPECT_NE(text.find("exceptionCode=\"" + code + '"'), std::string::npos) << text;
        EXPECT_EQ(text.find("locator=\"" + locator + '"') != text.npos, !locator.empty()) << text;
        EXPECT_EQ(text.find('\n'), text.size() - 1);
    }
}

TEST_F(StandardsTest, APixelHasTheValuesOfTheRaster) {
    const std::string at = "/wmts/1.0.0/a.pyr/default/own-a.pyr/2/1/2/";
    const Json point = Document("/point/a.pyr?x=522&y=266");
    EXPECT_EQ(Document(at + "10/10.json"), point);
    EXPECT_EQ(Text(at + "10/10.txt").substr(0, 8), "Band 1: ");
    EXPECT_EQ(Document("/wmts?service=WMTS&request=GetFeatureInfo&version=1.0.0&layer=a.pyr&"
                       "style=default&format=image/png&tilematrixset=own-a.pyr&tilematrix=2&"
                       "tilerow=1&tilecol=2&i=10&j=10&infoformat=application/json"),
              point);
    EXPECT_EQ(Document(at + "255/255.json")["values"], Json::array());
    EXPECT_EQ(Text(at + "255/255.txt"), "no raster there\n");
    // A coarse pixel has the value of the finest in its middle.
    EXPECT_EQ(Document("/wmts/1.0.0/a.pyr/default/own-a.pyr/0/0/0/3/5.json"),
              Document("/point/a.pyr?x=22&y=14"));
    double x = 100.5, y = 50.5;
    PlaneOf("a.pyr")->ToPlane(1, &x, &y);
    const double cell = Mercator::CellOf(16), side = 256 * cell;
    const auto pixel = [&](double metres) {
        return std::to_string(static_cast<int>(std::floor(std::fmod(metres, side) / cell)));
    };
    EXPECT_EQ(Document("/wmts/1.0.0/a.pyr/default/WebMercatorQuad" + TileAt(16, x, y) + "/" +
                       pixel(Mercator::kEdge - y) + "/" + pixel(x + Mercator::kEdge) + ".json"),
              Document("/point/a.pyr?x=100&y=50"));
}

TEST_F(StandardsTest, NamesOfAnyBytesAreLayersAndCollections) {
    const std::string name = "a <b>&\"'~%\xFF\xC3\xA4.pyr", id = LayerIdOf(name);
    std::filesystem::create_directory(folder / "sub");
    std::filesystem::copy_file(folder / "a.pyr", folder / ("sub/" + name));
    const std::string nested = LayerIdOf("sub/" + name);
    const std::string capabilities = Text("/wmts/1.0.0/WMTSCapabilities.xml");
    EXPECT_NE(capabilities.find("<ows:Identifier>" + nested + "</ows:Identifier>"),
              std::string::npos);
    EXPECT_NE(capabilities.find("<ows:Title>sub/a &lt;b&gt;&amp;&quot;&#39;~%\xEF\xBF\xBD\xC3\xA4"
                                ".pyr</ows:Title>"),
              std::string::npos);
    EXPECT_EQ(Status("/wmts/1.0.0/" + nested + "/default/own-" + nested + "/0/0/0.png"), 200);
    EXPECT_EQ(Status("/ogc/collections/" + nested + "/map/tiles/own-" + nested + "/0/0/0"), 200);
    EXPECT_EQ(Document("/ogc/collections/" + nested)["id"], nested);
    EXPECT_EQ(Status("/ogc/tileMatrixSets/own-" + nested), 200);
    EXPECT_NO_THROW(Document("/ogc/tileMatrixSets"));
}

TEST_F(StandardsTest, WhatIsDamagedIsNoLayerAndHurtsNoOther) {
    std::string bytes = BytesOf(folder / "a.pyr");
    bytes[30] ^= 0x55;
    std::ofstream(folder / "bad.pyr", std::ios::binary) << bytes;
    const std::string capabilities = Text("/wmts/1.0.0/WMTSCapabilities.xml");
    EXPECT_EQ(capabilities.find("bad.pyr"), std::string::npos);
    EXPECT_NE(capabilities.find("<ows:Identifier>a.pyr<"), std::string::npos);
    EXPECT_EQ(Document("/ogc/collections")["numberReturned"], 2);
    EXPECT_EQ(Status("/ogc/collections/bad.pyr"), 500);
    const Answer report = Ask("/wmts/1.0.0/bad.pyr/default/own-bad.pyr/0/0/0.png");
    EXPECT_EQ(report.status, 500);
    EXPECT_NE(report.Text().find("NoApplicableCode"), std::string::npos);
}

TEST_F(StandardsTest, ListsAndValuesAreBounded) {
    for (int i = 0; i < 1000; ++i)
        std::filesystem::create_hard_link(folder / "plain.pyr",
                                          folder / ("b" + std::to_string(i) + ".pyr"));
    const std::string capabilities = Text("/wmts/1.0.0/WMTSCapabilities.xml");
    std::size_t layers = 0;
    for (std::size_t at = 0; (at = capabilities.find("<Layer>", at)) != capabilities.npos; ++at)
        ++layers;
    EXPECT_EQ(layers, 1000u);
    const Json page = Document("/ogc/collections?limit=4294967295");
    EXPECT_EQ(page["numberReturned"], 1000);
    EXPECT_EQ(page["numberMatched"], 1002);
    EXPECT_EQ(Document("/ogc/collections")["numberReturned"], 100);
    BuildNoise<unsigned char>(folder / "many.pyr", 1, 1, 1001);
    EXPECT_EQ(Status("/wmts/1.0.0/many.pyr/default/own-many.pyr/0/0/0/0/0.json"), 400);
    BuildNoise<unsigned char>(folder / "many.pyr", 1, 1, 1000);
    EXPECT_EQ(Document("/wmts/1.0.0/many.pyr/default/own-many.pyr/0/0/0/0/0.json")["values"].size(),
              1000u);
}

TEST_F(StandardsTest, ListsThatTakeTooLongAreRefused) {
    Serve();
    for (const char* const target : {"/ogc/collections", "/wmts/1.0.0/WMTSCapabilities.xml",
                                     "/wmts/1.0.0/a.pyr/default/WebMercatorQuad/0/0/0.png"}) {
        Request request = Request::Parse(Method::Get, target);
        request.deadline = Deadline(std::chrono::seconds(0));
        const Answer answer = service->Handle(request);
        EXPECT_EQ(answer.status, 503) << target;
        EXPECT_EQ(answer.Header("Retry-After"), "10") << target;
    }
}

}  // namespace
}  // namespace zmcserve
