#include "colour/NamedColors.h"

#include <gtest/gtest.h>

#include <map>
#include <set>
#include <string>

namespace zelm {
namespace {

std::string NameOf(const NamedColorRow& row) { return row.name.GetUtf8(); }

std::map<std::string, std::uint32_t> ByName() {
    std::map<std::string, std::uint32_t> rows;
    for (std::uint32_t i = 0; i < kNamedColorCount; ++i)
        rows.emplace(NameOf(NamedColors()[i]), NamedColors()[i].rgba);
    return rows;
}

constexpr std::uint32_t Opaque(std::uint32_t r, std::uint32_t g, std::uint32_t b) {
    return r | g << 8 | b << 16 | 0xFF000000u;
}

TEST(NamedColors, TableHasOneHundredAndFortySixDistinctNames) {
    EXPECT_EQ(kNamedColorCount, 146u);
    EXPECT_EQ(ByName().size(), 146u);
}

TEST(NamedColors, EndsWithTheNullColour) {
    const NamedColorRow& last = NamedColors()[kNamedColorCount - 1];
    EXPECT_TRUE(last.name == "null");
    EXPECT_EQ(last.rgba, 0u);
    EXPECT_EQ(last.isNull, 1);
}

TEST(NamedColors, AllOthersAreOpaqueAndLowerCase) {
    for (std::uint32_t i = 0; i + 1 < kNamedColorCount; ++i) {
        const NamedColorRow& row = NamedColors()[i];
        EXPECT_EQ(row.rgba >> 24, 255u);
        EXPECT_EQ(row.isNull, 0);
        for (const char c : NameOf(row)) EXPECT_TRUE(c >= 'a' && c <= 'z') << NameOf(row);
    }
}

TEST(NamedColors, PlacesAndPairs) {
    EXPECT_EQ(NameOf(NamedColors()[0]), "red");
    EXPECT_EQ(NameOf(NamedColors()[13]), "orange");
    EXPECT_EQ(NameOf(NamedColors()[144]), "mediumseagreen");
    auto rows = ByName();
    EXPECT_EQ(rows["red"], Opaque(255, 0, 0));
    EXPECT_EQ(rows["green"], Opaque(0, 128, 0));
    EXPECT_EQ(rows["orange"], Opaque(0xFF, 0x80, 0));
    EXPECT_EQ(rows["peacock"], Opaque(0x33, 0xA1, 0xC9));
    EXPECT_EQ(rows["gray"], rows["grey"]);
    EXPECT_EQ(rows["dimgray"], rows["dimgrey"]);
    EXPECT_EQ(rows["aqua"], rows["cyan"]);
    EXPECT_EQ(rows["fuchsia"], rows["magenta"]);
}

// Files of other hosts refer to these values by name: a changed row must show.
TEST(NamedColors, ChecksumOverAllRowsInOrder) {
    std::uint64_t hash = 1469598103934665603u;
    const auto add = [&hash](unsigned byte) { hash = (hash ^ byte) * 1099511628211u; };
    for (std::uint32_t i = 0; i < kNamedColorCount; ++i) {
        const NamedColorRow& row = NamedColors()[i];
        for (const char c : NameOf(row)) add(static_cast<unsigned char>(c));
        add(0);
        for (unsigned shift = 0; shift < 32; shift += 8) add(row.rgba >> shift & 0xFF);
        add(row.isNull);
    }
    EXPECT_EQ(hash, 0x6f35d62fd288d40cu);
}

}  // namespace
}  // namespace zelm
