// What a document of a pyramid file means, told by the letter of docs/format.md.
//
// A plain reader of XML of its own, sharing no code with the module. It knows what documents of
// this format are made of; of texts whose meaning hangs on more than that (another encoding, names
// outside ASCII, references) it says that it is not sure.
#ifndef ZMC_TESTS_CAMPAIGNS_DOCUMENTORACLE_H
#define ZMC_TESTS_CAMPAIGNS_DOCUMENTORACLE_H

#include <array>
#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <vector>

namespace zmctest {

enum class Trust {
    Sound,      // well-formed, and within the limits
    Malformed,  // to be refused
    Unsure,     // either
};

struct HeaderFields {
    std::uint32_t versionMajor = 0, versionMinor = 0, bands = 0, width = 0, height = 0,
                  tileSize = 0, levelMin = 0, levelMax = 0, pixelType = 0, ordering = 0;
    std::int32_t interleave = 0;
};

struct StatsRecord {
    std::uint32_t band = 0, flags = 0;
    double minimum = 0, maximum = 0, mean = 0, deviation = 0, sum = 0, squares = 0, rms = 0;
};

struct HistogramRecord {
    std::uint32_t band = 0, level = 0, source = 0, binCount = 0;
    double binSize = 0, minimum = 0, maximum = 0;
    std::vector<std::uint64_t> counts;
    bool sure = true;  // the counts are
};

struct PaletteRecord {
    std::vector<std::array<std::uint8_t, 4>> colors;
    bool sure = true;
};

struct MetaRecords {
    std::vector<StatsRecord> stats;
    std::vector<HistogramRecord> histograms;
    std::map<std::uint32_t, PaletteRecord> palettes;
};

// The result of reading one document. Values are as good as `values` says.
struct DocumentOracle {
    Trust trust = Trust::Malformed;
    Trust values = Trust::Sound;
    HeaderFields header;
    MetaRecords meta;
    std::uint64_t nodes = 0;

    explicit DocumentOracle(std::string_view text);
};

// Numbers as documents spell them.
std::uint32_t IntegerOf(std::string_view text);
double RealOf(std::string_view text);

}  // namespace zmctest

#endif
