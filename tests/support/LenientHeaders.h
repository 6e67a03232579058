// Headers that a strict reader would refuse, or read otherwise, and what the module reads in them.
// Whoever reads headers has to agree with it: a size that is read otherwise is a buffer of the
// wrong size.
#ifndef ZMC_TESTS_SUPPORT_LENIENTHEADERS_H
#define ZMC_TESTS_SUPPORT_LENIENTHEADERS_H

#include <algorithm>
#include <cstdint>
#include <ostream>
#include <string>

#include "tests/support/PyramidFiles.h"

namespace zmctest {

struct LenientHeader {
    const char* name;  // of the test
    const char* from;  // what is replaced in the plain text, once,
    const char* to;    // and by what
    // What is read; all else is that of the plain header.
    std::uint32_t width = 600, height = 500, levelMin = 0, levelMax = 1;
    std::uint32_t pixelType = 1, sampleBytes = 1;

    static constexpr std::uint32_t kBands = 2;

    std::string Text() const {
        zmctest::HeaderText plain;
        plain.width = 600;
        plain.height = 500;
        plain.bands = kBands;
        plain.levelMax = 1;
        std::string text = plain.Text();
        const std::string part = from;
        text.replace(text.find(part), part.size(), to);
        return text;
    }
    std::uint64_t TileBytes() const {
        std::uint64_t bytes = 0;
        for (std::uint32_t level = levelMin; level <= std::min(levelMax, 31u); ++level)
            bytes += std::uint64_t{width >> level} * (height >> level) * kBands * sampleBytes;
        return bytes;
    }
    // A complete file, every byte of whose tiles is 1.
    std::string File() const {
        return zmctest::FileWithHeader(Text()) + std::string(TileBytes(), '\1');
    }
};

inline std::ostream& operator<<(std::ostream& stream, const LenientHeader& header) {
    return stream << header.name;
}

inline constexpr LenientHeader kLenientHeaders[] = {
    {"ALetterBehindANumber", ">600<", ">600x<"},
    {"AnUnknownElement", "<HEADER_BANDS>",
     "<HEADER_MOOD><GOOD>5</GOOD></HEADER_MOOD><HEADER_BANDS>"},
    {"NoFirstLevel", "<HEADER_LEVELMIN>0</HEADER_LEVELMIN>", ""},
    {"TextBetweenElements", "<HEADER_BANDS>", "between<HEADER_BANDS>"},
    {"ACharacterReference", "<HEADER_LEVELMAX>1<", "<HEADER_LEVELMAX>&#49;<"},
    {"ACdataSection", ">600<", "><![CDATA[600]]><"},
    {"APlus", ">600<", ">+600<"},
    {"Level70", "<HEADER_LEVELMAX>1<", "<HEADER_LEVELMAX>70<", 600, 500, 0, 70},
    // Behind the header, and inside of an element that nobody knows.
    {"ASecondPixelType", "</HEADER></DATASET>",
     "</HEADER><OTHER><HEADER_PIXEL_TYPE>UInt16</HEADER_PIXEL_TYPE></OTHER></DATASET>", 600, 500, 0,
     1, 12, 2},
    // Of a number in pieces the last one counts.
    {"ANumberInPieces", ">600<", ">600<!-- or -->512<", 512},
    {"ALevelThatLooksLikeTheFirst", "<HEADER_LEVELMAX>1<", "<HEADER_LEVELMAX>32<", 600, 500, 0, 32},
};

}  // namespace zmctest

#endif
