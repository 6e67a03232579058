#include "format/PyramidFront.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>

namespace zelm {
namespace {

std::string Front(std::uint64_t tileDataStart, std::uint64_t metaDocumentOffset = 0) {
    unsigned char offsets[PyramidFront::kOffsetsSize];
    PyramidFront{tileDataStart, metaDocumentOffset}.EncodeOffsets(offsets);
    return "KOBT" + std::string(reinterpret_cast<const char*>(offsets), sizeof offsets);
}

TEST(PyramidFront, StandsInFilesByteByByte) {
    EXPECT_EQ(Front(0x0102030405060708, 0xFFEEDDCCBBAA9988),
              "KOBT\x08\x07\x06\x05\x04\x03\x02\x01\x88\x99\xAA\xBB\xCC\xDD\xEE\xFF");
    EXPECT_EQ(PyramidFront::kHeaderOffset, 20u);
    PyramidFront front;
    EXPECT_EQ(DecodeFront(Front(700, 0xFFEEDDCCBBAA9988) + "<", 700, front), FrontFault::None);
    EXPECT_EQ(front.tileDataStart, 700u);
    EXPECT_EQ(front.metaDocumentOffset, 0xFFEEDDCCBBAA9988);
    EXPECT_EQ(front.HeaderBytes(), 680u);
}

TEST(PyramidFront, IsJudgedAgainstTheFile) {
    const auto fault = [](std::uint64_t start, std::optional<std::uint64_t> size) {
        PyramidFront front;
        return DecodeFront(Front(start), size, front);
    };
    EXPECT_EQ(fault(20, 20), FrontFault::None);
    EXPECT_EQ(fault(19, 20), FrontFault::NoHeader);
    EXPECT_EQ(fault(0, 20), FrontFault::NoHeader);
    EXPECT_EQ(fault(21, 20), FrontFault::NoHeader);
    EXPECT_EQ(fault(~std::uint64_t{0}, 20), FrontFault::NoHeader);
    EXPECT_EQ(fault(20, std::nullopt), FrontFault::NoHeader);
}

TEST(PyramidFront, OtherFilesHaveNone) {
    const std::string whole = Front(20, 5);
    PyramidFront front{3, 4};
    for (std::size_t size = 0; size < whole.size(); ++size)
        EXPECT_EQ(DecodeFront(whole.substr(0, size), 20, front), FrontFault::NoPyramid) << size;
    for (std::size_t at = 0; at < 4; ++at) {
        std::string other = whole;
        other[at] = static_cast<char>(other[at] ^ 0x80);
        EXPECT_EQ(DecodeFront(other, 20, front), FrontFault::NoPyramid) << at;
    }
    EXPECT_EQ(front.tileDataStart, 3u);
    EXPECT_EQ(front.metaDocumentOffset, 4u);
}

TEST(PyramidFront, PyramidsAreKnownByTheirStart) {
    for (const char* document : {"<?xml version", "<DATASET>", "<!-- -->", " \t\r\n<DATASET/>",
                                 "\xEF\xBB\xBF<?xml", "\xEF\xBB\xBF\n<DATASET"})
        EXPECT_TRUE(LooksLikePyramid(Front(0) + document)) << document;
    for (const char* document : {"", " ", "\xEF\xBB\xBF", "<", "<dataset>", "text", "<A/>"})
        EXPECT_FALSE(LooksLikePyramid(Front(0) + document)) << document;
    EXPECT_FALSE(LooksLikePyramid("KOBU" + Front(0).substr(4) + "<DATASET>"));
    EXPECT_FALSE(LooksLikePyramid("KOBT<DATASET>"));
}

}  // namespace
}  // namespace zelm
