#include "serve/WmtsCapabilities.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <initializer_list>
#include <utility>

#include "render/Codec.h"
#include "serve/Answer.h"

namespace zmcserve {
namespace {

using Attributes = std::initializer_list<std::pair<const char*, std::string>>;

// The first is the usual one.
constexpr zmcrender::PictureFormat kOrder[] = {
    zmcrender::PictureFormat::Png, zmcrender::PictureFormat::Jpeg, zmcrender::PictureFormat::WebP};

// The shortest text that reads as the same number.
std::string Number(double value) {
    std::array<char, 32> text{};
    const auto done = std::to_chars(text.data(), text.data() + text.size(), value);
    return {text.data(), done.ptr};
}

std::string Pair(const std::array<double, 2>& pair) {
    return Number(pair[0]) + ' ' + Number(pair[1]);
}

std::string Open(const char* name, Attributes attributes) {
    std::string text = std::string("<") + name;
    for (const auto& [key, value] : attributes)
        text.append(" ").append(key).append("=\"").append(Escaped(value)).append("\"");
    return text;
}

// An element around others.
std::string Around(const char* name, const std::string& inside, Attributes attributes = {}) {
    return Open(name, attributes) + '>' + inside + "</" + name + '>';
}

std::string Element(const char* name, const std::string& text) {
    return Around(name, Escaped(text));
}

std::string Empty(const char* name, Attributes attributes) { return Open(name, attributes) + "/>"; }

// --- the service ---

std::string Get(const std::string& url, const char* encoding) {
    const std::string allowed = Around("ows:AllowedValues", Element("ows:Value", encoding));
    return Around("ows:Get", Around("ows:Constraint", allowed, {{"name", "GetEncoding"}}),
                  {{"xlink:href", url}});
}

std::string OperationText(const char* name, const std::string& gets) {
    return Around("ows:Operation", Around("ows:DCP", Around("ows:HTTP", gets)), {{"name", name}});
}

std::string Operations(const std::string& baseUrl, const std::string& look) {
    // Where the parameters of a request go.
    const std::string byKeys = baseUrl + "/wmts" + (look.empty() ? "?" : look + '&');
    const std::string byPath = baseUrl + "/wmts/1.0.0";
    return Around("ows:OperationsMetadata",
                  OperationText("GetCapabilities",
                                Get(byKeys, "KVP") +
                                    Get(byPath + "/WMTSCapabilities.xml" + look, "RESTful")) +
                      OperationText("GetTile", Get(byKeys, "KVP")) +
                      OperationText("GetFeatureInfo", Get(byKeys, "KVP")));
}

std::string Identification() {
    return Around("ows:ServiceIdentification",
                  Element("ows:Title", "zmcraster") +
                      Element("ows:Abstract", "Pyramid files as tiles of maps") +
                      Element("ows:ServiceType", "OGC WMTS") +
                      Element("ows:ServiceTypeVersion", kWmtsVersion));
}

// --- layers ---

std::string BoxOf(const char* name, const std::array<double, 2>& lower,
                  const std::array<double, 2>& upper, const std::string& system) {
    const std::string corners =
        Element("ows:LowerCorner", Pair(lower)) + Element("ows:UpperCorner", Pair(upper));
    if (system.empty()) return Around(name, corners);
    return Around(name, corners, {{"crs", system}});
}

// One that lies on both sides of 180 degrees has no box but the widest.
std::string DegreesOf(const Layer& layer) {
    if (!layer.degrees) return {};
    auto [west, south, east, north] = *layer.degrees;
    if (west > east) west = -180, east = 180;
    return BoxOf("ows:WGS84BoundingBox", {west, south}, {east, north}, {});
}

std::string LimitsOf(const std::vector<TileLimits>& limits) {
    std::string text;
    for (const TileLimits& limit : limits)
        text += Around("TileMatrixLimits",
                       Element("TileMatrix", limit.matrix) +
                           Element("MinTileRow", std::to_string(limit.firstRow)) +
                           Element("MaxTileRow", std::to_string(limit.lastRow)) +
                           Element("MinTileCol", std::to_string(limit.firstColumn)) +
                           Element("MaxTileCol", std::to_string(limit.lastColumn)));
    return Around("TileMatrixSetLimits", text);
}

std::string LinkTo(const TileMatrixSet& set, const std::vector<TileLimits>& limits) {
    return Around("TileMatrixSetLink", Element("TileMatrixSet", set.id) + LimitsOf(limits));
}

std::string Resources(const std::string& baseUrl, const Layer& layer, const std::string& look) {
    const std::string tile = baseUrl + "/wmts/1.0.0/" + layer.id +
                             "/{Style}/{TileMatrixSet}/{TileMatrix}/{TileRow}/{TileCol}";
    std::string text;
    for (const zmcrender::PictureFormat format : kOrder)
        text +=
            Empty("ResourceURL", {{"format", zmcrender::MediaType(format)},
                                  {"resourceType", "tile"},
                                  {"template", tile + '.' + zmcrender::EndingOf(format) + look}});
    text += Empty("ResourceURL", {{"format", kInfoFormats[0]},
                                  {"resourceType", "FeatureInfo"},
                                  {"template", tile + "/{J}/{I}.json"}});
    return text + Empty("ResourceURL", {{"format", kInfoFormats[1]},
                                        {"resourceType", "FeatureInfo"},
                                        {"template", tile + "/{J}/{I}.txt"}});
}

std::string LayerText(const std::string& baseUrl, const Layer& layer, const std::string& look) {
    std::string text =
        Element("ows:Title", layer.name) + DegreesOf(layer) + Element("ows:Identifier", layer.id) +
        BoxOf("ows:BoundingBox", layer.corners[0], layer.corners[1], layer.own.system.name) +
        Around("Style", Element("ows:Identifier", kWmtsStyle), {{"isDefault", "true"}});
    for (const zmcrender::PictureFormat format : kOrder)
        text += Element("Format", zmcrender::MediaType(format));
    for (const char* const format : kInfoFormats) text += Element("InfoFormat", format);
    text += LinkTo(layer.own, layer.ownLimits);
    if (layer.plane) text += LinkTo(WebMercatorQuad(), layer.mercatorLimits);
    return Around("Layer", text + Resources(baseUrl, layer, look));
}

// --- sets of tiles ---

std::string MatrixText(const TileMatrixSet& set, const TileMatrix& matrix) {
    return Around(
        "TileMatrix",
        Element("ows:Identifier", matrix.id) + Element("ScaleDenominator", Number(matrix.scale)) +
            Element("TopLeftCorner", Pair(Ordered(set.system, set.corner[0], set.corner[1]))) +
            Element("TileWidth", std::to_string(matrix.side)) +
            Element("TileHeight", std::to_string(matrix.side)) +
            Element("MatrixWidth", std::to_string(matrix.across)) +
            Element("MatrixHeight", std::to_string(matrix.down)));
}

// The first matrices of a set.
std::string SetText(const TileMatrixSet& set, std::size_t count) {
    std::string text = Element("ows:Title", set.title) + Element("ows:Identifier", set.id) +
                       Element("ows:SupportedCRS", set.system.name);
    if (!set.scaleSet.empty())
        text += Element("WellKnownScaleSet", "urn:ogc:def:wkss:OGC:1.0:" + set.scaleSet);
    for (std::size_t i = 0; i < count; ++i) text += MatrixText(set, set.matrices[i]);
    return Around("TileMatrixSet", text);
}

std::string ContentsOf(const std::string& baseUrl, const std::vector<Layer>& layers,
                       const std::string& look) {
    std::string text, sets;
    // Clients take the finest matrix of a set for the size of its layers, whatever their limits.
    std::size_t deepest = 0;
    for (const Layer& layer : layers) {
        text += LayerText(baseUrl, layer, look);
        sets += SetText(layer.own, layer.own.matrices.size());
        deepest = std::max(deepest, layer.mercatorLimits.size());
    }
    if (deepest > 0) sets += SetText(WebMercatorQuad(), deepest);
    return Around("Contents", text + sets);
}

}  // namespace

std::string WmtsCapabilities(const std::string& baseUrl, const std::vector<Layer>& layers,
                             const std::string& look) {
    const std::string url = baseUrl + "/wmts/1.0.0/WMTSCapabilities.xml" + look;
    return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n" +
           Around("Capabilities",
                  Identification() + Operations(baseUrl, look) + ContentsOf(baseUrl, layers, look) +
                      Empty("ServiceMetadataURL", {{"xlink:href", url}}),
                  {{"xmlns", "http://www.opengis.net/wmts/1.0"},
                   {"xmlns:ows", "http://www.opengis.net/ows/1.1"},
                   {"xmlns:xlink", "http://www.w3.org/1999/xlink"},
                   {"version", kWmtsVersion}}) +
           '\n';
}

}  // namespace zmcserve
