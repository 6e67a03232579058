// Headers that claim anything: every pair of fields, with values at the borders of what they mean.
#include <gtest/gtest.h>

#include <array>
#include <string>
#include <vector>

#include "tests/campaigns/Campaign.h"
#include "tests/campaigns/FileTrial.h"
#include "tests/campaigns/Samples.h"
#include "tests/support/CampaignLength.h"
#include "tests/support/PyramidFiles.h"
#include "tests/support/Sanitizers.h"
#include "tests/support/XercesEnvironment.h"

namespace zmctest {
namespace {

constexpr std::size_t kFields = 11;
constexpr std::size_t kValues = 25;
using Values = std::array<const char*, kValues>;

constexpr std::array<const char*, kFields> kNames{
    "VERSION_MAJOR", "VERSION_MINOR", "BANDS",      "PIXEL_HEIGHT", "PIXEL_WIDTH", "LEVELMIN",
    "LEVELMAX",      "TILESIZE",      "INTERLEAVE", "BUILD_METHOD", "PIXEL_TYPE"};

// Borders of levels, tiles, 16 and 32 bits and the documented limits, and texts that are no number.
constexpr Values kNumbers{
    "0",          "1",          "2",          "3",     "5",
    "15",         "16",         "17",         "31",    "32",
    "33",         "255",        "256",        "1023",  "1024",
    "2047",       "2048",       "2049",       "65535", "65537",
    "2147483647", "2147483648", "4294967295", "-1",    "99999999999999999999"};
constexpr Values kInterleaves{"BIP",  "BIL",     "BSQ",   "None",    "bip", "BIP ", " BIL",
                              "BI",   "BIPP",    "",      " ",       "0",   "1",    "2",
                              "-1",   "BSQ BIP", "\tBSQ", "\nBIL",   "|",   "B",    "NONE",
                              "none", "BIP,BIL", "&amp;", "\xC3\xA4"};
constexpr Values kOrderings{"Scanline", "Blocked", "Morton",    "scanline", "blocked",
                            "morton",   " Morton", "Morton ",   "\nMorton", "Morton Blocked",
                            "Mortons",  "Mort",    "",          " ",        "0",
                            "1",        "2",       "3",         "-1",       "Hilbert",
                            "Tiled",    "&lt;",    "Blocked\t", "MORTON",   "\xC3\xA4"};
constexpr Values kTypes{"Byte",          "Char",          "UInt16", "Int16",       "UInt32",
                        "Int32",         "UInt64",        "Int64",  "Single",      "Double",
                        "ComplexSingle", "ComplexDouble", "Quad",   "ComplexQuad", "Bool",
                        "USHORT",        "byte",          "",       " ",           "Byte ",
                        " Double",       "Float",         "1",      "99",          "Byte Double"};

const Values& ValuesOf(std::size_t field) {
    if (field == 8) return kInterleaves;
    if (field == 9) return kOrderings;
    return field == 10 ? kTypes : kNumbers;
}

// The sample with another header: its tile data and document follow the new text.
Bytes WithHeader(const Sample& sample, const std::array<std::string, kFields>& values) {
    std::string text = "<DATASET><HEADER>";
    for (std::size_t i = 0; i < kFields; ++i)
        text +=
            std::string("<HEADER_") + kNames[i] + ">" + values[i] + "</HEADER_" + kNames[i] + ">";
    text += "</HEADER></DATASET>";
    const std::string front = zmctest::FileWithHeader(text, sample.model.tileDataEnd);
    Bytes file(front.begin(), front.end());
    const Bytes old = sample.File();
    file.insert(file.end(), old.begin() + static_cast<std::ptrdiff_t>(sample.model.tileDataStart),
                old.end());
    return file;
}

std::array<std::string, kFields> FieldsOf(const Sample& sample) {
    const zmctest::PyramidDescription& d = sample.model.d;
    return {std::to_string(d.versionMajor),
            std::to_string(d.versionMinor),
            std::to_string(d.bands),
            std::to_string(d.lines),
            std::to_string(d.samples),
            std::to_string(d.levelMin),
            std::to_string(d.levelMax),
            std::to_string(d.tile),
            "BIP",
            sample.name,
            zmctest::FindModelType(d.type).word};
}

TEST(HeaderFields, EveryPairAtTheBorders) {
    FileTrial trial;
    Campaign campaign("HeaderFields.EveryPairAtTheBorders", 37);
    for (const Sample& sample : Samples())
        for (std::size_t first = 0; first < kFields; ++first)
            for (std::size_t second = first + 1; second < kFields; ++second)
                campaign.Run(sample.name + ", " + kNames[first] + " and " + kNames[second],
                             kValues * kValues, [&](std::uint64_t i) {
                                 std::array<std::string, kFields> values = FieldsOf(sample);
                                 values[first] = ValuesOf(first)[i / kValues];
                                 values[second] = ValuesOf(second)[i % kValues];
                                 return trial.Try(WithHeader(sample, values), {});
                             });
}

// Headers of some hundred bytes whose tables of tile offsets are as large as they may be, asked for
// their first tiles.
TEST(HeaderFields, LargeTables) {
    FileTrial trial;
    Campaign campaign("HeaderFields.LargeTables", 1);
    struct Table {
        std::uint32_t width, height, bands, levelMax, tile;
    };
    std::vector<Table> tables{{2048, 2048, 1, 0, 1},
                              {65536, 512, 1, 0, 1},
                              {16, 16, 4194304, 0, 16},
                              {64, 64, 2048, 1023, 16},
                              {1, 65536, 16, 31, 1}};
    if (zmctest::IsFullCampaign() && !zmctest::IsSanitized()) {
        const Table full[] = {{16384, 16384, 1, 0, 1},    {8190, 65536, 1, 0, 1},
                              {65536, 8190, 1, 0, 1},     {65536, 8192, 1, 0, 1},
                              {16, 16, 536870000, 0, 16}, {1024, 1024, 127, 1023, 16}};
        tables.insert(tables.end(), std::begin(full), std::end(full));
    }
    const Sample sample = Samples().back();
    campaign.Run("Morton", tables.size(), [&](std::uint64_t i) {
        std::array<std::string, kFields> values = FieldsOf(sample);
        values[2] = std::to_string(tables[i].bands);
        values[3] = std::to_string(tables[i].height);
        values[4] = std::to_string(tables[i].width);
        values[6] = std::to_string(tables[i].levelMax);
        values[7] = std::to_string(tables[i].tile);
        return trial.Try(WithHeader(sample, values), {.tables = true, .stores = false});
    });
}

}  // namespace
}  // namespace zmctest
