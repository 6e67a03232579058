// Facts: what is told of a raster beside its pixels, by callers and to them, and how GDAL's
// datasets keep it.
//
// Plain values; any thread.
#ifndef ZMC_PYTHON_FACTS_H
#define ZMC_PYTHON_FACTS_H

#include <gdal_priv.h>

#include <array>
#include <cstdint>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <utility>
#include <variant>
#include <vector>

namespace zmcpython {

// An argument that fits no raster, or not this one.
class BadArgument : public std::invalid_argument {
public:
    explicit BadArgument(const std::string& text) : std::invalid_argument(text) {}
};

// A value in the form that holds it as it is.
using Number = std::variant<double, std::int64_t, std::uint64_t>;
double AsDouble(const Number& number);

// x is [0] + [1] column + [2] row, y is [3] + [4] column + [5] row.
using Transform = std::array<double, 6>;
using Items = std::vector<std::pair<std::string, std::string>>;

struct BandFacts {
    std::string description;
    std::string unit;
    std::string interpretation;  // GDAL's word
    double scale = 1;
    double offset = 0;
    std::optional<Number> noData;
    Items items;
};
struct Facts {
    std::string crs;  // as WKT; empty where nothing is known
    std::optional<Transform> transform;
    Items items;
    std::vector<BandFacts> bands;
};

// What a dataset tells; of as many bands as it has.
Facts FactsOf(GDALDataset& dataset);

// What callers tell of a raster that is made, all of it optional.
struct GivenFacts {
    std::string crs;  // WKT, or a name of an authority's: "EPSG:4326"
    std::optional<Transform> transform;
    std::optional<Number> noData;  // of all bands
    std::vector<std::string> descriptions;
    std::optional<std::uint32_t> alpha;  // band, from 1
    Items items;
};
// Throws BadArgument for a reference that is not understood, a description of no band, an alpha
// band that there is not.
void Tell(const GivenFacts& facts, GDALDataset& dataset);

// A dataset without pixels that keeps what is told.
std::unique_ptr<GDALDataset> OutlineOf(const GivenFacts& facts, std::uint32_t width,
                                       std::uint32_t height, std::uint32_t bands,
                                       std::uint32_t pixelType);

}  // namespace zmcpython

#endif
