#include "core/PixelVocabulary.h"

#include <gtest/gtest.h>

#include <locale>
#include <set>
#include <sstream>
#include <string>
#include <vector>

#include "core/ElementTypes.h"

namespace zelm {
namespace {

std::uint32_t PixelTypeOf(const std::string& text) {
    std::istringstream stream(text);
    std::uint32_t code = 1234;
    ParsePixelType(stream, code);
    return code;
}

std::int32_t InterleaveOf(const std::string& text) {
    std::istringstream stream(text);
    std::int32_t code = 1234;
    ParseInterleave(stream, code);
    return code;
}

std::uint32_t TileOrderOf(const std::string& text) {
    std::istringstream stream(text);
    std::uint32_t code = 1234;
    ParseTileOrder(stream, code);
    return code;
}

TEST(PixelVocabulary, WordsOfCodesWithoutReader) {
    EXPECT_STREQ(PixelTypeName(95), "Quad");
    EXPECT_STREQ(PixelTypeName(96), "ComplexQuad");
    EXPECT_STREQ(PixelTypeName(98), "Bool");
    EXPECT_EQ(PixelTypeOf("Quad"), 95u);
    EXPECT_EQ(PixelTypeOf("ComplexQuad"), 96u);
    EXPECT_EQ(PixelTypeOf("Bool"), 98u);
}

TEST(PixelVocabulary, EveryOtherPixelTypeIsUnknown) {
    const std::set<std::uint32_t> known{1, 2, 3, 4, 5, 6, 9, 12, 13, 14, 15, 95, 96, 98, 99};
    for (std::uint32_t code = 0; code < 300; ++code)
        EXPECT_EQ(std::string(PixelTypeName(code)) != "Unknown", known.count(code) != 0) << code;
    EXPECT_STREQ(PixelTypeName(0xFFFFFFFFu), "Unknown");
}

TEST(PixelVocabulary, WordsOfTheTwelveReadBack) {
#define ZMC_X(type, name, code)                         \
    EXPECT_STREQ(PixelTypeName(code), #name);           \
    EXPECT_EQ(PixelTypeOf(#name), std::uint32_t{code}); \
    EXPECT_EQ(PixelSize(code), sizeof(type));           \
    EXPECT_EQ(CheckedPixelType(code), std::uint32_t{code});
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
}

TEST(PixelVocabulary, SizesAsFilesHaveThem) {
    const std::pair<std::uint32_t, std::uint32_t> sizes[] = {
        {1, 1},  {2, 2},  {3, 4},  {4, 4}, {5, 8},  {6, 8},  {9, 16}, {12, 2}, {13, 4},
        {14, 8}, {15, 8}, {99, 1}, {0, 1}, {95, 1}, {96, 1}, {98, 1}, {7, 1},  {0xFFFFFFFFu, 1}};
    for (const auto& [code, size] : sizes) EXPECT_EQ(PixelSize(code), size) << code;
}

TEST(PixelVocabulary, AliasAndMisspellings) {
    EXPECT_EQ(PixelTypeOf("USHORT"), 12u);
    EXPECT_EQ(PixelTypeOf("UInt16"), 12u);
    EXPECT_EQ(PixelTypeOf("ushort"), 0u);
    EXPECT_EQ(PixelTypeOf(""), 0u);
    EXPECT_EQ(PixelTypeOf("  \r\n"), 0u);
    EXPECT_EQ(PixelTypeOf("Unknown"), 0u);
    EXPECT_EQ(PixelTypeOf("byte"), 0u);
    EXPECT_EQ(PixelTypeOf(" Byte\r\n"), 1u);
    EXPECT_EQ(PixelTypeOf("Byte Int16"), 1u);
}

// A locale in which a carriage return is no white space and ends no token.
class CarriageReturnIsALetter : public std::ctype<char> {
public:
    CarriageReturnIsALetter() : std::ctype<char>(Table()) {}

private:
    static const mask* Table() {
        static const std::vector<mask> table = [] {
            std::vector<mask> made(classic_table(), classic_table() + table_size);
            made[static_cast<unsigned char>('\r')] = alpha;
            return made;
        }();
        return table.data();
    }
};

TEST(PixelVocabulary, WordsAreTrimmedWhateverTheStreamTakesForWhiteSpace) {
    const std::locale odd(std::locale::classic(), new CarriageReturnIsALetter);
    const auto streamOf = [&odd](const char* text) {
        std::istringstream stream(text);
        stream.imbue(odd);
        return stream;
    };
    std::uint32_t pixelType = 1234;
    std::istringstream pixelTypes = streamOf("\rUSHORT\r\n");
    ParsePixelType(pixelTypes, pixelType);
    EXPECT_EQ(pixelType, 12u);
    std::int32_t interleave = 1234;
    std::istringstream interleaves = streamOf("BIP\r");
    ParseInterleave(interleaves, interleave);
    EXPECT_EQ(interleave, 0);
    std::uint32_t order = 1234;
    std::istringstream orders = streamOf("\r\rMorton");
    ParseTileOrder(orders, order);
    EXPECT_EQ(order, 2u);
}

TEST(PixelVocabulary, AWordEndsAtAZero) {
    EXPECT_EQ(PixelTypeOf(std::string("Byte\0x", 6)), 1u);
    EXPECT_EQ(InterleaveOf(std::string("BIP\0", 4)), 0);
    EXPECT_EQ(TileOrderOf(std::string("\0Morton", 7)), 0u);
}

TEST(PixelVocabulary, CodesWithoutReaderAreNotChecked) {
    for (const std::uint32_t code : {0u, 7u, 8u, 95u, 96u, 98u, 100u})
        EXPECT_EQ(CheckedPixelType(code), 0u);
}

TEST(PixelVocabulary, Interleaves) {
    for (const auto& [code, word] :
         {std::pair{-1, "None"}, std::pair{0, "BIP"}, std::pair{1, "BIL"}, std::pair{2, "BSQ"}}) {
        EXPECT_STREQ(InterleaveName(code), word);
        EXPECT_EQ(InterleaveOf(word), code);
    }
    EXPECT_STREQ(InterleaveName(3), "Unknown");
    EXPECT_STREQ(InterleaveName(-2), "Unknown");
    EXPECT_EQ(InterleaveOf("bsq"), -1);
    EXPECT_EQ(InterleaveOf(""), -1);
    EXPECT_EQ(InterleaveOf("  BIP\r\n"), 0);
}

TEST(PixelVocabulary, TileOrders) {
    for (const auto& [code, word] :
         {std::pair{0u, "Scanline"}, std::pair{1u, "Blocked"}, std::pair{2u, "Morton"}}) {
        EXPECT_STREQ(TileOrderName(code), word);
        EXPECT_EQ(TileOrderOf(word), code);
    }
    EXPECT_STREQ(TileOrderName(7), "Scanline");
    EXPECT_EQ(TileOrderOf("morton"), 0u);
    EXPECT_EQ(TileOrderOf(""), 0u);
}

}  // namespace
}  // namespace zelm
