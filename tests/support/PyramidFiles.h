// Pyramid files for tests: properties, files made by the module, and files made by hand.
#ifndef ZMC_TESTS_SUPPORT_PYRAMIDFILES_H
#define ZMC_TESTS_SUPPORT_PYRAMIDFILES_H

#include <cstdint>
#include <string>
#include <type_traits>
#include <vector>

#include "core/ElementTypes.h"
#include "raster/RasterProps.h"

namespace zmctest {

using namespace zelm;

// Calls visit(std::type_identity<T>{}) for each of the twelve element types.
template <class Visit>
void ForEachElementType(Visit visit) {
#define ZMC_X(type, name, code) visit(std::type_identity<type>{});
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
}

inline RasterProps PyramidProps(std::uint32_t samples, std::uint32_t lines, std::uint32_t bands,
                                std::uint32_t pixelType, std::uint32_t tileLines = 256) {
    RasterProps props;
    props.samples = samples;
    props.lines = lines;
    props.bands = bands;
    props.pixelType = pixelType;
    props.tileSamples = props.tileLines = tileLines;
    props.interleave = 0;
    props.formatName = "Pyramid";
    return props;
}

// Text of a document without its declaration and without the white space between elements.
inline std::string Compact(const std::string& text) {
    std::string compact;
    std::size_t position = text.compare(0, 5, "<?xml") == 0 ? text.find("?>") + 2 : 0;
    while (position < text.size()) {
        const std::size_t end = text.find_first_not_of(" \r\n\t", position);
        const bool between = (compact.empty() || compact.back() == '>') &&
                             (end == std::string::npos || text[end] == '<');
        if (between) position = end == std::string::npos ? text.size() : end;
        if (position < text.size()) compact += text[position++];
    }
    return compact;
}

// What stands between <name> and </name>, in document order.
inline std::vector<std::string> ValuesOf(const std::string& text, const std::string& name) {
    std::vector<std::string> values;
    const std::string open = "<" + name + ">", close = "</" + name + ">";
    for (std::size_t at = text.find(open); at != std::string::npos; at = text.find(open, at)) {
        at += open.size();
        values.push_back(text.substr(at, text.find(close, at) - at));
    }
    return values;
}

inline std::string Bytes8(std::uint64_t value) {
    std::string bytes;
    for (int i = 0; i < 8; ++i) bytes += static_cast<char>(value >> (8 * i));
    return bytes;
}

// The front of a file with the given header document.
inline std::string FileWithHeader(const std::string& document, std::uint64_t metaOffset = 0) {
    return "KOBT" + Bytes8(20 + document.size()) + Bytes8(metaOffset) + document;
}

struct HeaderText {
    std::uint32_t versionMajor = 1, versionMinor = 1, bands = 1, width = 10, height = 6,
                  tileSize = 256, levelMin = 0, levelMax = 0;
    std::string interleave = "BIP", ordering = "Blocked", pixelType = "Byte";

    std::string Text() const {
        const auto leaf = [](const char* name, const std::string& value) {
            return std::string("<HEADER_") + name + ">" + value + "</HEADER_" + name + ">";
        };
        return "<DATASET><HEADER>" + leaf("VERSION_MAJOR", std::to_string(versionMajor)) +
               leaf("VERSION_MINOR", std::to_string(versionMinor)) +
               leaf("BANDS", std::to_string(bands)) + leaf("PIXEL_HEIGHT", std::to_string(height)) +
               leaf("PIXEL_WIDTH", std::to_string(width)) +
               leaf("LEVELMIN", std::to_string(levelMin)) +
               leaf("LEVELMAX", std::to_string(levelMax)) +
               leaf("TILESIZE", std::to_string(tileSize)) + leaf("INTERLEAVE", interleave) +
               leaf("BUILD_METHOD", ordering) + leaf("PIXEL_TYPE", pixelType) +
               "</HEADER></DATASET>";
    }
    // A complete file of one level with every byte of tile data 1, for one byte per sample.
    std::string File() const {
        const std::string front = FileWithHeader(Text());
        return front + std::string(std::size_t{width} * height * bands, '\1');
    }
};

}  // namespace zmctest

#endif
