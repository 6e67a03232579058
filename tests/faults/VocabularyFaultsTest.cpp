// The words of pyramid files, read while memory is out.
#include <gtest/gtest.h>

#include <locale>
#include <sstream>

#include "core/ElementTypes.h"
#include "core/PixelVocabulary.h"
#include "tests/support/AllocationFaults.h"

namespace zelm {
namespace {

using zmctest::AllocationFaults;
using zmctest::FaultMode;

// What is read out of a word when no allocation succeeds.
template <class Code>
Code ReadWithoutMemory(void (*parse)(std::istream&, Code&), const char* word, Code before) {
    std::istringstream stream(word);
    stream.imbue(std::locale::classic());
    Code code = before;
    AllocationFaults faults(1, FaultMode::FromThenOn);
    parse(stream, code);
    faults.Disarm();
    return code;
}

TEST(VocabularyFaults, EveryWordIsKnownWithoutMemory) {
    for (const std::uint32_t order : {TileOrder::Scanline, TileOrder::Blocked, TileOrder::Morton})
        EXPECT_EQ(ReadWithoutMemory(ParseTileOrder, TileOrderName(order), 9u), order);
    for (const std::int32_t code :
         {Interleave::None, Interleave::BIP, Interleave::BIL, Interleave::BSQ})
        EXPECT_EQ(ReadWithoutMemory(ParseInterleave, InterleaveName(code), 9), code);
    for (std::uint32_t code = 80; code < 110; ++code) {
        const std::string word = PixelTypeName(code);
        if (word != "Unknown") {
            EXPECT_EQ(ReadWithoutMemory(ParsePixelType, word.c_str(), 9u), code) << word;
        }
    }
    EXPECT_EQ(ReadWithoutMemory(ParsePixelType, "USHORT", 9u), PixelTypeCode::UInt16);
}

// Longer than any word, so that it takes memory: it stays what it is.
TEST(VocabularyFaults, AWordTooLongForAnyIsUnknown) {
    const char* const text = "ScanlineScanlineScanlineScanline";
    EXPECT_EQ(ReadWithoutMemory(ParseTileOrder, text, 9u), 0u);
    EXPECT_EQ(ReadWithoutMemory(ParseInterleave, text, 9), -1);
    EXPECT_EQ(ReadWithoutMemory(ParsePixelType, text, 9u), 0u);
}

}  // namespace
}  // namespace zelm
