// WMTS 1.0.0, at /wmts: by keys (/wmts?SERVICE=WMTS&REQUEST=GetTile&...) and by paths
// (/wmts/1.0.0/LAYER/STYLE/SET/MATRIX/ROW/COLUMN.FORMAT).
//
// What goes wrong is an exception report, in one line. A tile that there is not has the status 400
// where it is named by keys, as the standard's table has it, and 404 where it is named by a path.
#include <algorithm>
#include <utility>

#include "serve/Conditions.h"
#include "serve/Documents.h"
#include "serve/Layer.h"
#include "serve/LayerId.h"
#include "serve/MapTile.h"
#include "serve/Names.h"
#include "serve/Parameters.h"
#include "serve/Services.h"
#include "serve/Tile.h"
#include "serve/Values.h"
#include "serve/WmtsCapabilities.h"

namespace zmcserve {
namespace {

using zmcdescribe::Json;

constexpr std::size_t kMostLayers = 1000;   // of one document
constexpr std::uint32_t kMostBands = 1000;  // of which a pixel's values are told

// --- what goes wrong ---

class Fault : public Refusal {
public:
    Fault(int status, const char* exceptionCode, std::string where, const std::string& text)
        : Refusal(status, text), code(exceptionCode), locator(std::move(where)) {}
    const char* Code() const { return code; }
    const std::string& Locator() const { return locator; }

private:
    const char* code;
    std::string locator;
};

Fault Invalid(const char* key, const std::string& text, int status = 400) {
    return {status, "InvalidParameterValue", key, std::string(key) + ": " + text};
}

const char* CodeOf(int status) {
    return status == 400 || status == 404 ? "InvalidParameterValue" : "NoApplicableCode";
}

// The same answer, with a report for its body.
Answer Report(Answer answer, const char* code, const std::string& locator) {
    std::string text = answer.Text();
    while (!text.empty() && text.back() == '\n') text.pop_back();
    const std::string where =
        locator.empty() ? std::string() : " locator=\"" + Escaped(locator) + '"';
    answer.type = "application/xml";
    answer.body =
        "<?xml version=\"1.0\" encoding=\"UTF-8\"?><ExceptionReport "
        "xmlns=\"http://www.opengis.net/ows/1.1\" version=\"1.1.0\" xml:lang=\"en\">"
        "<Exception exceptionCode=\"" +
        std::string(code) + '"' + where + "><ExceptionText>" + Escaped(text) +
        "</ExceptionText></Exception></ExceptionReport>\n";
    return answer;
}

// Of what is being handled as an exception.
Answer ReportOfException() {
    try {
        throw;
    } catch (const Fault& fault) {
        return Report(ToAnswer(fault), fault.Code(), fault.Locator());
    } catch (...) {
        Answer answer = AnswerOfException();
        const int status = answer.status;
        return Report(std::move(answer), CodeOf(status), {});
    }
}

// What `find` finds; a refusal of it is a fault of that parameter.
template <class Find>
auto Of(const char* key, int status, Find&& find) -> decltype(find()) {
    try {
        return find();
    } catch (const Refusal& refusal) {
        if (refusal.Status() != 400 && refusal.Status() != 404) throw;
        throw Invalid(key, refusal.what(), status);
    }
}

// --- a tile ---

// How a request names one, whichever way.
struct TileWords {
    std::string layer, style, set, matrix, row, column;
    zmcrender::PictureFormat format = zmcrender::PictureFormat::Png;
    int missing = 404;  // the status for what there is not
};

MapTile TileOfWords(const Request& request, const TileWords& words, ServedRaster& raster) {
    if (words.style != kWmtsStyle && !words.style.empty())
        throw Invalid("Style", Quoted(words.style) + " is not " + kWmtsStyle, words.missing);
    MapTile tile;
    tile.isMercator =
        Of("TileMatrixSet", words.missing, [&] { return IsMercatorSet(words.set, raster.Name()); });
    if (tile.isMercator)
        Of("TileMatrixSet", words.missing,
           [&] { static_cast<void>(raster.Borrow(request.deadline)->InMercator()); });
    tile.matrix = Of("TileMatrix", words.missing, [&] { return TileNumber(words.matrix); });
    tile.row = Of("TileRow", words.missing, [&] { return TileNumber(words.row); });
    tile.column = Of("TileCol", words.missing, [&] { return TileNumber(words.column); });
    return tile;
}

ServedRasterPtr RasterOf(Service& service, const TileWords& words) {
    return Of("Layer", words.missing,
              [&] { return service.catalog.Raster(NameOfLayerId(words.layer)); });
}

// What says that there is no such tile.
[[noreturn]] void ThrowOutOfRange(const TileWords& words, const Refusal& refusal) {
    throw Fault(words.missing, "TileOutOfRange", "TileRow", refusal.what());
}

Answer GetTile(const Request& request, Service& service, const TileWords& words, MapLook look) {
    const ServedRasterPtr raster = RasterOf(service, words);
    const MapTile tile = TileOfWords(request, words, *raster);
    look.format = words.format;
    look.quality = QualityOf(request);
    look.resampling = ResamplingOf(request);
    try {
        return MapTileAnswer(request, service, *raster, tile, look);
    } catch (const Refusal& refusal) {
        if (refusal.Status() == 404) ThrowOutOfRange(words, refusal);
        throw;
    }
}

// --- the values of a pixel ---

std::uint32_t PlaceInTile(const char* key, std::string_view text, std::uint32_t side) {
    const auto number = WholeNumber(text, 0xffffffffu);
    if (number && *number < side) return static_cast<std::uint32_t>(*number);
    throw Fault(400, "PointIJOutOfRange", key,
                std::string(key) + ": " + Quoted(text) + " is no pixel of a tile");
}

std::string PlainText(const Json& pixel) {
    std::string text;
    const Json& values = pixel["values"];
    for (std::size_t i = 0; i < values.size(); ++i) {
        const Json& value = values[i];
        text += "Band " + pixel["bands"][i].dump() + ": " +
                (value.is_string() ? value.get<std::string>() : value.dump()) + '\n';
    }
    return text.empty() ? "no raster there\n" : text;
}

Json PixelOf(const Request& request, ServedRaster& raster, const MapTile& tile, std::uint32_t i,
             std::uint32_t j) {
    const auto pixel = PixelOfTile(raster, tile, i, j, request.deadline);
    if (!pixel) return {{"bands", Json::array()}, {"values", Json::array()}};
    if (raster.Header().bandCount > kMostBands)
        throw Refusal(400, "the raster has too many bands to be told");
    return DescribePixel(raster, raster.FinestLevel(), pixel->x, pixel->y,
                         BandsOf(Request(), raster.Header().bandCount), request.deadline);
}

Answer GetFeatureInfo(const Request& request, Service& service, const TileWords& words,
                      std::string_view i, std::string_view j, bool isJson) {
    const ServedRasterPtr raster = RasterOf(service, words);
    const MapTile tile = TileOfWords(request, words, *raster);
    const std::uint32_t side = SideOfTile(*raster, tile);
    const std::uint32_t x = PlaceInTile("I", i, side), y = PlaceInTile("J", j, side);
    const Validators validators{raster->ETagWithCompanions(isJson ? "wj" : "wt"), std::nullopt};
    if (auto answer = AnswerOfConditions(request, validators)) return std::move(*answer);
    Json pixel;
    try {
        pixel = PixelOf(request, *raster, tile, x, y);
    } catch (const Refusal& refusal) {
        if (refusal.Status() == 404) ThrowOutOfRange(words, refusal);
        throw;
    }
    Answer answer = isJson ? JsonAnswer(pixel) : TextAnswer(200, "");
    if (!isJson) answer.body = PlainText(pixel);
    SetValidators(answer, validators);
    return answer;
}

// --- the layers ---

Answer Capabilities(const Request& request, Service& service, std::vector<std::string> names) {
    if (names.size() > kMostLayers) names.resize(kMostLayers);
    Answer answer;
    answer.type = "application/xml";
    answer.compressible = true;
    answer.body = WmtsCapabilities(request.baseUrl, LayersOf(service, names, request.deadline),
                                   LookQueryOf(request));
    return WithTextTag(request, std::move(answer));
}

// --- by keys ---

// Names of the standard; others are a style's, or nobody's, which the standard has ignored.
constexpr std::string_view kKeys[] = {
    "service",    "request", "version", "layer",      "style", "format", "tilematrixset",
    "tilematrix", "tilerow", "tilecol", "infoformat", "i",     "j"};

bool IsStandards(std::string_view key) {
    return std::any_of(std::begin(kKeys), std::end(kKeys),
                       [key](std::string_view name) { return SameWord(key, name); });
}

zmcrender::Style StyleOfKeys(const Request& request) {
    zmcrender::Style style;
    for (const auto& [key, value] : request.query)
        if (!IsStandards(key) && zmcrender::Style::IsKey(key)) style.Set(key, *request.Value(key));
    return style;
}

std::string Needed(const Request& request, const char* key) {
    const auto value = request.ValueOfAnyCase(key);
    if (!value || value->empty())
        throw Fault(400, "MissingParameterValue", key, std::string(key) + ": it is missing");
    return std::string(*value);
}

TileWords WordsOfKeys(const Request& request) {
    TileWords words;
    words.layer = Needed(request, "Layer");
    words.style = request.ValueOfAnyCase("Style").value_or("");
    words.set = Needed(request, "TileMatrixSet");
    words.matrix = Needed(request, "TileMatrix");
    words.row = Needed(request, "TileRow");
    words.column = Needed(request, "TileCol");
    words.missing = 400;
    const std::string format = Needed(request, "Format");
    for (const auto each : {zmcrender::PictureFormat::Png, zmcrender::PictureFormat::Jpeg,
                            zmcrender::PictureFormat::WebP})
        if (SameWord(format, zmcrender::MediaType(each))) {
            words.format = each;
            return words;
        }
    throw Invalid("Format", Quoted(format) + " is none of image/png, image/jpeg, image/webp");
}

void CheckVersion(const Request& request) {
    const auto accepted = request.ValueOfAnyCase("AcceptVersions");
    if (!accepted || accepted->empty()) return;
    const auto all = Split(*accepted, ',');
    if (std::find(all.begin(), all.end(), kWmtsVersion) == all.end())
        throw Fault(400, "VersionNegotiationFailed", "AcceptVersions",
                    "AcceptVersions: the version is 1.0.0");
}

void CheckTileVersion(const Request& request) {
    const std::string version = Needed(request, "Version");
    if (version != kWmtsVersion) throw Invalid("Version", Quoted(version) + " is not 1.0.0");
}

Answer InfoByKeys(const Request& request, Service& service) {
    CheckTileVersion(request);
    const TileWords words = WordsOfKeys(request);
    const std::string format = Needed(request, "InfoFormat");
    const bool isJson = SameWord(format, kInfoFormats[0]);
    if (!isJson && !SameWord(format, kInfoFormats[1]))
        throw Invalid("InfoFormat", Quoted(format) + " is neither application/json nor text/plain");
    return GetFeatureInfo(request, service, words, Needed(request, "I"), Needed(request, "J"),
                          isJson);
}

Answer ByKeys(const Request& request, Service& service) {
    if (const std::string what = Needed(request, "Service"); !SameWord(what, "WMTS"))
        throw Invalid("Service", Quoted(what) + " is not WMTS");
    const std::string operation = Needed(request, "Request");
    if (SameWord(operation, "GetCapabilities")) {
        CheckVersion(request);
        return Capabilities(request, service, service.catalog.List().names);
    }
    if (SameWord(operation, "GetFeatureInfo")) return InfoByKeys(request, service);
    if (!SameWord(operation, "GetTile"))
        throw Fault(501, "OperationNotSupported", "Request",
                    "Request: " + Quoted(operation) + " is no operation of this service");
    CheckTileVersion(request);
    return GetTile(request, service, WordsOfKeys(request), {.style = StyleOfKeys(request)});
}

// --- by paths ---

TileWords WordsOfPath(const std::vector<std::string>& parts, std::string_view column) {
    TileWords words;
    words.layer = parts[2];
    words.style = parts[3];
    words.set = parts[4];
    words.matrix = parts[5];
    words.row = parts[6];
    words.column = column;
    return words;
}

Answer TileByPath(const Request& request, Service& service) {
    const auto [column, ending] = StemAndEnding(request.segments[7]);
    TileWords words = WordsOfPath(request.segments, column);
    const auto format = zmcrender::PictureFormatOfName(ending);
    if (!format) throw Invalid("Format", "the formats of tiles are png, jpg and webp", 404);
    words.format = *format;
    return GetTile(request, service, words, {.style = StyleOf(request, {"quality", "resampling"})});
}

Answer InfoByPath(const Request& request, Service& service) {
    const auto [i, ending] = StemAndEnding(request.segments[9]);
    if (ending != "json" && ending != "txt")
        throw Invalid("InfoFormat", "the formats of values are json and txt", 404);
    return GetFeatureInfo(request, service, WordsOfPath(request.segments, request.segments[7]), i,
                          request.segments[8], ending == "json");
}

Answer ByPath(const Request& request, Service& service) {
    constexpr std::string_view kDocument = "WMTSCapabilities.xml";
    const std::size_t count = request.segments.size();
    const bool isVersion = count > 2 && request.segments[1] == kWmtsVersion;
    if (isVersion && request.segments.back() == kDocument && count <= 4) {
        StyleOf(request, {"quality", "resampling"});
        if (count == 3) return Capabilities(request, service, service.catalog.List().names);
        const std::string name = NameOfLayerId(request.segments[2]);
        static_cast<void>(Of("Layer", 404, [&] { return service.catalog.Raster(name); }));
        return Capabilities(request, service, {name});
    }
    if (isVersion && count == 8) return TileByPath(request, service);
    if (isVersion && count == 10) return InfoByPath(request, service);
    throw Invalid("Request", "there is nothing at this address of the service", 404);
}

Answer HandleWmts(const Request& request, Service& service) try {
    const bool hasPath = request.segments.size() > 2 ||
                         (request.segments.size() == 2 && !request.segments[1].empty());
    return hasPath ? ByPath(request, service) : ByKeys(request, service);
} catch (...) {
    return ReportOfException();
}

}  // namespace

std::vector<Route> WmtsRoutes() {
    return {{"wmts",
             HandleWmts,
             nullptr,
             {{"wmts", "/wmts?SERVICE=WMTS&REQUEST=GetCapabilities",
               "WMTS 1.0.0 of all rasters; style and quality in the query go into the addresses "
               "of tiles"},
              {"wmts-rest", "/wmts/1.0.0/WMTSCapabilities.xml", "the same without keys"},
              {"wmts-layer", "/wmts/1.0.0/{layer}/WMTSCapabilities.xml", "the same of one raster"},
              {"wmts-tiles",
               "/wmts/1.0.0/{layer}/default/{tileMatrixSet}/{tileMatrix}/{tileRow}/{tileCol}."
               "{format}{?quality,resampling}",
               "a tile as png, jpg or webp. Style in the query"}}}};
}

}  // namespace zmcserve
