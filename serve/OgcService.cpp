// OGC API - Tiles, at /ogc: rasters as collections, and tiles of maps of each.
#include <algorithm>
#include <array>
#include <utility>

#include "serve/Documents.h"
#include "serve/Layer.h"
#include "serve/LayerId.h"
#include "serve/MapTile.h"
#include "serve/Negotiation.h"
#include "serve/Parameters.h"
#include "serve/Services.h"
#include "serve/Tile.h"

namespace zmcserve {
namespace {

using zmcdescribe::Json;
using zmcrender::PictureFormat;

constexpr const char* kNoResource = "there is nothing of that name below /ogc";
constexpr const char* kTilesets = "http://www.opengis.net/def/rel/ogc/1.0/tilesets-map";
constexpr const char* kScheme = "http://www.opengis.net/def/rel/ogc/1.0/tiling-scheme";
constexpr const char* kSchemes = "http://www.opengis.net/def/rel/ogc/1.0/tiling-schemes";
constexpr const char* kConformance = "http://www.opengis.net/def/rel/ogc/1.0/conformance";
constexpr const char* kData = "http://www.opengis.net/def/rel/ogc/1.0/data";
constexpr std::uint64_t kUsualPage = 100, kLongestPage = 1000;  // collections

// What is held, and nothing else.
constexpr const char* kClasses[] = {
    "http://www.opengis.net/spec/ogcapi-common-1/1.0/conf/core",
    "http://www.opengis.net/spec/ogcapi-common-1/1.0/conf/landing-page",
    "http://www.opengis.net/spec/ogcapi-common-1/1.0/conf/json",
    "http://www.opengis.net/spec/ogcapi-common-2/1.0/conf/collections",
    "http://www.opengis.net/spec/ogcapi-tiles-1/1.0/conf/core",
    "http://www.opengis.net/spec/ogcapi-tiles-1/1.0/conf/tileset",
    "http://www.opengis.net/spec/ogcapi-tiles-1/1.0/conf/tilesets-list",
    "http://www.opengis.net/spec/ogcapi-tiles-1/1.0/conf/geodata-tilesets",
    "http://www.opengis.net/spec/ogcapi-tiles-1/1.0/conf/png",
    "http://www.opengis.net/spec/ogcapi-tiles-1/1.0/conf/jpeg",
    "http://www.opengis.net/spec/tms/2.0/conf/tilematrixset",
    "http://www.opengis.net/spec/tms/2.0/conf/tilematrixsetlimits",
    "http://www.opengis.net/spec/tms/2.0/conf/tilesetmetadata",
    "http://www.opengis.net/spec/tms/2.0/conf/json-tilematrixset",
    "http://www.opengis.net/spec/tms/2.0/conf/json-tilematrixsetlimits",
    "http://www.opengis.net/spec/tms/2.0/conf/json-tilesetmetadata",
};

struct Format {
    PictureFormat format;
    const char* word;  // of f=
};
constexpr Format kFormats[] = {
    {PictureFormat::Png, "png"}, {PictureFormat::Jpeg, "jpeg"}, {PictureFormat::WebP, "webp"}};

// --- links ---

Json Link(const std::string& href, const char* rel, const char* type, const std::string& title) {
    return {{"href", href}, {"rel", rel}, {"type", type}, {"title", title}};
}

Json JsonLink(const std::string& href, const char* rel, const std::string& title) {
    return Link(href, rel, "application/json", title);
}

std::string Root(const Request& request) { return request.baseUrl + "/ogc"; }

std::string CollectionUrl(const Request& request, const std::string& id) {
    return Root(request) + "/collections/" + id;
}

std::string SetUrl(const Request& request, const TileMatrixSet& set) {
    return Root(request) + "/tileMatrixSets/" + set.id;
}

Json SelfOf(const Request& request) {
    return JsonLink(request.baseUrl + request.target, "self", "this document");
}

void WantJson(const Request& request) {
    const auto format = request.Value("f").value_or("json");
    if (format != "json") throw Refusal(400, "f: " + Quoted(format) + " is not json");
}

Answer Document(const Request& request, const Json& document) {
    return WithTextTag(request, JsonAnswer(document));
}

// --- the server ---

Answer Landing(const Request& request) {
    const std::string root = Root(request);
    return Document(
        request,
        {{"title", "zmcraster"},
         {"description", "Pyramid files as tiles of maps"},
         {"links",
          {SelfOf(request),
           Link(root + "/api", "service-desc", "application/vnd.oai.openapi+json;version=3.0",
                "the definition of this API"),
           JsonLink(request.baseUrl + "/api", "service-doc", "all services of the server"),
           JsonLink(root + "/conformance", kConformance, "what of the standards is held"),
           JsonLink(root + "/conformance", "conformance", "what of the standards is held"),
           JsonLink(root + "/collections", kData, "the rasters"),
           JsonLink(root + "/collections", "data", "the rasters"),
           JsonLink(root + "/tileMatrixSets", kSchemes, "the sets of tiles")}}});
}

Answer Conformance(const Request& request) {
    Json classes = Json::array();
    for (const char* const name : kClasses) classes.push_back(name);
    return Document(request, {{"conformsTo", std::move(classes)}});
}

// --- sets of tiles ---

Json SetEntry(const Request& request, const std::string& id, const std::string& title) {
    return {
        {"id", id},
        {"title", title},
        {"links", Json::array({JsonLink(Root(request) + "/tileMatrixSets/" + id, "self", title)})}};
}

Answer Sets(const Request& request, Service& service) {
    const TileMatrixSet& mercator = WebMercatorQuad();
    Json list = Json::array({SetEntry(request, mercator.id, mercator.title)});
    list[0]["uri"] = mercator.uri;
    const Catalog::Listing listing = service.catalog.List();
    for (const std::string& name : listing.names)
        list.push_back(SetEntry(request, OwnSetOf(name), "The own grid of " + name));
    return Document(
        request, {{"tileMatrixSets", std::move(list)}, {"links", Json::array({SelfOf(request)})}});
}

Answer Set(const Request& request, Service& service, const std::string& id) {
    if (id == kMercatorSet) return Document(request, DescribeSet(WebMercatorQuad()));
    const auto name = NameOfOwnSet(id);
    if (!name) throw Refusal(404, Quoted(id) + " is no set of tiles");
    const ServedRasterPtr raster = service.catalog.Raster(*name);
    Answer answer = Document(request, DescribeSet(OwnGrid(*raster)));
    raster->File().CheckUnchanged();
    return answer;
}

// --- rasters ---

Json CollectionOf(const Request& request, const Layer& layer) {
    const std::string url = CollectionUrl(request, layer.id);
    Json document = {{"id", layer.id}, {"title", layer.name}, {"dataType", "map"}};
    if (layer.degrees)
        document["extent"] = {{"spatial",
                               {{"bbox", Json::array({*layer.degrees})},
                                {"crs", "http://www.opengis.net/def/crs/OGC/1.3/CRS84"}}}};
    document["links"] =
        Json::array({JsonLink(url, "self", layer.name),
                     JsonLink(url + "/map/tiles", kTilesets, "its sets of tiles"),
                     Link(request.baseUrl + "/files/" + PercentEncoded(layer.name, true),
                          "enclosure", "application/octet-stream", "the file")});
    return document;
}

std::string PageUrl(const Request& request, std::uint64_t offset, std::uint64_t limit) {
    return Root(request) + "/collections?limit=" + std::to_string(limit) +
           "&offset=" + std::to_string(offset);
}

Answer Collections(const Request& request, Service& service) {
    request.AllowKeys({"f", "limit", "offset"});
    const std::uint64_t limit = request.Count("limit", 0xffffffffu).value_or(kUsualPage);
    const std::uint64_t offset = request.Count("offset", 0xffffffffu).value_or(0);
    if (limit == 0) throw Refusal(400, "limit: it is 1 at least");
    const std::vector<std::string> all = service.catalog.List().names;
    const std::uint64_t first = std::min<std::uint64_t>(offset, all.size());
    const std::uint64_t last =
        std::min<std::uint64_t>(first + std::min(limit, kLongestPage), all.size());
    const std::vector<std::string> page(all.begin() + static_cast<std::ptrdiff_t>(first),
                                        all.begin() + static_cast<std::ptrdiff_t>(last));
    Json list = Json::array();
    for (const Layer& layer : LayersOf(service, page, request.deadline))
        list.push_back(CollectionOf(request, layer));
    Json links = Json::array({SelfOf(request)});
    if (last < all.size())
        links.push_back(JsonLink(PageUrl(request, last, limit), "next", "the next ones"));
    if (first > 0)
        links.push_back(JsonLink(PageUrl(request, first - std::min(first, limit), limit), "prev",
                                 "the ones before"));
    return Document(request, {{"collections", list},
                              {"numberMatched", all.size()},
                              {"numberReturned", list.size()},
                              {"links", std::move(links)}});
}

Layer LayerOfId(const Request& request, Service& service, const std::string& id) {
    const ServedRasterPtr raster = service.catalog.Raster(NameOfLayerId(id));
    Layer layer = LayerOf(*raster, request.deadline);
    raster->File().CheckUnchanged();
    return layer;
}

// --- sets of tiles of a raster ---

Json TilesetLinks(const Request& request, const Layer& layer, const TileMatrixSet& set) {
    const std::string url =
        CollectionUrl(request, layer.id) + "/map/tiles/" + set.id + LookQueryOf(request);
    return Json::array(
        {JsonLink(url, "self", set.title), JsonLink(SetUrl(request, set), kScheme, set.title)});
}

Json TilesetOf(const Request& request, const Layer& layer, const TileMatrixSet& set) {
    Json document = {{"title", layer.name + ": " + set.title},
                     {"dataType", "map"},
                     {"crs", DescribeSystem(set.system)}};
    // By it clients choose, whether it is in the register or not.
    document["tileMatrixSetURI"] = set.uri.empty() ? SetUrl(request, set) : set.uri;
    document["links"] = TilesetLinks(request, layer, set);
    return document;
}

Answer Tilesets(const Request& request, Service& service, const std::string& id) {
    const Layer layer = LayerOfId(request, service, id);
    Json list = Json::array({TilesetOf(request, layer, layer.own)});
    if (layer.plane) list.push_back(TilesetOf(request, layer, WebMercatorQuad()));
    return Document(request,
                    {{"tilesets", std::move(list)}, {"links", Json::array({SelfOf(request)})}});
}

Json ItemLink(const Request& request, const Layer& layer, const TileMatrixSet& set,
              const Format& format) {
    std::string look = LookQueryOf(request);
    if (!look.empty()) look[0] = '&';
    Json link = Link(CollectionUrl(request, layer.id) + "/map/tiles/" + set.id +
                         "/{tileMatrix}/{tileRow}/{tileCol}?f=" + format.word + look,
                     "item", zmcrender::MediaType(format.format), "a tile");
    link["templated"] = true;
    return link;
}

Answer Tileset(const Request& request, Service& service, const std::string& id,
               const std::string& setId) {
    const Layer layer = LayerOfId(request, service, id);
    const bool isMercator = IsMercatorSet(setId, layer.name);
    if (isMercator && !layer.plane) throw Refusal(404, "the raster has no place in Web Mercator");
    const TileMatrixSet& set = isMercator ? WebMercatorQuad() : layer.own;
    Json document = TilesetOf(request, layer, set);
    document["tileMatrixSetLimits"] =
        DescribeLimits(isMercator ? layer.mercatorLimits : layer.ownLimits);
    const Corners corners = isMercator ? CornersOf(*layer.plane) : layer.corners;
    document["boundingBox"] = {
        {"lowerLeft", corners[0]}, {"upperRight", corners[1]}, {"crs", DescribeSystem(set.system)}};
    // The set stands in one place where there is none in the register.
    if (!isMercator) document["tileMatrixSet"] = DescribeSet(set);
    for (const Format& format : kFormats)
        document["links"].push_back(ItemLink(request, layer, set, format));
    return Document(request, document);
}

// --- tiles ---

PictureFormat FormatOf(const Request& request) {
    if (const auto word = request.Value("f")) {
        const auto format = zmcrender::PictureFormatOfName(*word);
        if (!format) throw Refusal(400, "f: " + Quoted(*word) + " is none of png, jpeg, webp");
        return *format;
    }
    std::vector<std::string_view> types;
    for (const Format& format : kFormats) types.push_back(zmcrender::MediaType(format.format));
    const auto chosen = BestOf(request.Header("Accept").value_or("*/*"), types);
    if (!chosen) throw Refusal(406, "tiles are image/png, image/jpeg or image/webp");
    return kFormats[*chosen].format;
}

Answer TileOf(const Request& request, Service& service, const std::vector<std::string>& parts) {
    const std::string name = NameOfLayerId(parts[1]);
    MapTile tile;
    tile.isMercator = IsMercatorSet(parts[4], name);
    tile.matrix = TileNumber(parts[5]);
    tile.row = TileNumber(parts[6]);
    tile.column = TileNumber(parts[7]);
    MapLook look;
    look.style = StyleOf(request, {"f", "quality", "resampling"});
    look.format = FormatOf(request);
    look.quality = QualityOf(request);
    look.resampling = ResamplingOf(request);
    Answer answer = MapTileAnswer(request, service, *service.catalog.Raster(name), tile, look);
    if (!request.Value("f")) answer.Set("Vary", "Accept");
    return answer;
}

// --- the definition ---

Json Operation(const char* summary, std::initializer_list<const char*> names) {
    Json parameters = Json::array();
    for (const char* const name : names)
        parameters.push_back({{"$ref", std::string("#/components/parameters/") + name}});
    Json responses = {{"200", {{"description", "it is there"}}},
                      {"400", {{"description", "one line of text: what cannot be meant"}}},
                      {"404", {{"description", "one line of text: what is not there"}}}};
    return Json::object({{"get",
                          {{"summary", summary},
                           {"parameters", std::move(parameters)},
                           {"responses", std::move(responses)}}}});
}

Json Parameter(const char* name, const char* in, Json schema) {
    Json parameter = {{"name", name}, {"in", in}, {"schema", std::move(schema)}};
    if (std::string_view(in) == "path") parameter["required"] = true;
    return parameter;
}

Json Parameters() {
    const Json text = {{"type", "string"}};
    const Json number = {{"type", "integer"}, {"minimum", 0}};
    return {
        {"collectionId", Parameter("collectionId", "path", text)},
        {"tileMatrixSetId", Parameter("tileMatrixSetId", "path", text)},
        {"tileMatrix", Parameter("tileMatrix", "path", text)},
        {"tileRow", Parameter("tileRow", "path", number)},
        {"tileCol", Parameter("tileCol", "path", number)},
        {"limit", Parameter("limit", "query", number)},
        {"offset", Parameter("offset", "query", number)},
        {"f", Parameter("f", "query", {{"type", "string"}, {"enum", {"png", "jpeg", "webp"}}})},
        {"resampling", Parameter("resampling", "query",
                                 {{"type", "string"}, {"enum", {"nearest", "bilinear", "cubic"}}})},
        {"stretch", Parameter("stretch", "query", text)},
        {"bands", Parameter("bands", "query", text)},
        {"colormap", Parameter("colormap", "query", text)}};
}

Json Paths() {
    const std::string collection = "/collections/{collectionId}";
    const std::string tiles = collection + "/map/tiles", set = tiles + "/{tileMatrixSetId}";
    return {{"/", Operation("links", {})},
            {"/conformance", Operation("what of the standards is held", {})},
            {"/api", Operation("this definition", {})},
            {"/tileMatrixSets", Operation("the sets of tiles", {})},
            {"/tileMatrixSets/{tileMatrixSetId}", Operation("a set of tiles", {"tileMatrixSetId"})},
            {"/collections", Operation("the rasters", {"limit", "offset"})},
            {collection, Operation("a raster", {"collectionId"})},
            {tiles, Operation("its sets of tiles", {"collectionId"})},
            {set, Operation("one of them", {"collectionId", "tileMatrixSetId"})},
            {set + "/{tileMatrix}/{tileRow}/{tileCol}",
             Operation("a tile", {"collectionId", "tileMatrixSetId", "tileMatrix", "tileRow",
                                  "tileCol", "f", "resampling", "stretch", "bands", "colormap"})}};
}

Answer Definition(const Request& request) {
    Json document = {{"openapi", "3.0.3"},
                     {"info", {{"title", "zmcraster: OGC API - Tiles"}, {"version", "1.0"}}},
                     {"servers", Json::array({{{"url", Root(request)}}})},
                     {"paths", Paths()},
                     {"components", {{"parameters", Parameters()}}}};
    Answer answer = JsonAnswer(document);
    answer.type = "application/vnd.oai.openapi+json;version=3.0";
    return WithTextTag(request, std::move(answer));
}

// --- addresses ---

// The parts behind /ogc; a slash at the end counts for nothing.
std::vector<std::string> PartsOf(const Request& request) {
    std::vector<std::string> parts(request.segments.begin() + 1, request.segments.end());
    if (!parts.empty() && parts.back().empty()) parts.pop_back();
    return parts;
}

Answer Plain(const Request& request, Service& service, const std::vector<std::string>& parts) {
    if (parts.size() == 1 && parts[0] == "collections") return Collections(request, service);
    request.AllowKeys({"f"});
    if (parts.empty()) return Landing(request);
    if (parts.size() == 1 && parts[0] == "conformance") return Conformance(request);
    if (parts.size() == 1 && parts[0] == "api") return Definition(request);
    if (parts.size() == 1 && parts[0] == "tileMatrixSets") return Sets(request, service);
    if (parts.size() == 2 && parts[0] == "tileMatrixSets") return Set(request, service, parts[1]);
    if (parts.size() == 2 && parts[0] == "collections")
        return Document(request, CollectionOf(request, LayerOfId(request, service, parts[1])));
    throw Refusal(404, kNoResource);
}

Answer HandleOgc(const Request& request, Service& service) {
    const std::vector<std::string> parts = PartsOf(request);
    const std::size_t count = parts.size();
    const bool isOfTiles =
        count >= 4 && parts[0] == "collections" && parts[2] == "map" && parts[3] == "tiles";
    if (isOfTiles && count == 8) return TileOf(request, service, parts);
    WantJson(request);
    if (!isOfTiles) return Plain(request, service, parts);
    StyleOf(request, {"f", "quality", "resampling"});
    if (count == 4) return Tilesets(request, service, parts[1]);
    if (count == 5) return Tileset(request, service, parts[1], parts[4]);
    throw Refusal(404, kNoResource);
}

}  // namespace

std::vector<Route> OgcRoutes() {
    return {
        {"ogc",
         HandleOgc,
         nullptr,
         {{"ogc", "/ogc", "OGC API - Tiles: the landing page; all below it is told at /ogc/api"},
          {"ogc-collections", "/ogc/collections{?limit,offset}", "the rasters"},
          {"ogc-tilesets", "/ogc/collections/{collection}/map/tiles", "sets of tiles of a raster"},
          {"ogc-tiles",
           "/ogc/collections/{collection}/map/tiles/{tileMatrixSet}/{tileMatrix}/{tileRow}/"
           "{tileCol}{?f,quality,resampling}",
           "a tile as png, jpeg or webp, in the raster's own grid or in WebMercatorQuad. Style in "
           "the query"}}}};
}

}  // namespace zmcserve
