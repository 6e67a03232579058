#include "format/PyramidFront.h"

#include <algorithm>
#include <iterator>

namespace zelm {
namespace {

constexpr std::string_view kByteOrderMark = "\xEF\xBB\xBF";

bool HasMagic(std::string_view start) {
    return start.size() >= PyramidFront::kHeaderOffset &&
           std::equal(std::begin(PyramidFront::kMagic), std::end(PyramidFront::kMagic),
                      start.begin(), [](unsigned char magic, char byte) {
                          return magic == static_cast<unsigned char>(byte);
                      });
}

std::uint64_t DecodeUint64(std::string_view bytes) {
    std::uint64_t value = 0;
    for (std::size_t i = sizeof value; i-- > 0;)
        value = value << 8 | static_cast<unsigned char>(bytes[i]);
    return value;
}

void EncodeUint64(std::uint64_t value, unsigned char* bytes) {
    for (int i = 0; i < 8; ++i) bytes[i] = static_cast<unsigned char>(value >> (8 * i));
}

}  // namespace

void PyramidFront::EncodeOffsets(unsigned char (&bytes)[kOffsetsSize]) const {
    EncodeUint64(tileDataStart, bytes);
    EncodeUint64(metaDocumentOffset, bytes + sizeof tileDataStart);
}

FrontFault DecodeFront(std::string_view start, std::optional<std::uint64_t> fileSize,
                       PyramidFront& front) {
    if (!HasMagic(start)) return FrontFault::NoPyramid;
    const std::string_view offsets = start.substr(PyramidFront::kOffsetsOffset);
    front.tileDataStart = DecodeUint64(offsets);
    front.metaDocumentOffset = DecodeUint64(offsets.substr(sizeof front.tileDataStart));
    const bool holds = fileSize && front.tileDataStart >= PyramidFront::kHeaderOffset &&
                       front.tileDataStart <= *fileSize;
    return holds ? FrontFault::None : FrontFault::NoHeader;
}

bool LooksLikePyramid(std::string_view start) {
    if (!HasMagic(start)) return false;
    std::string_view document = start.substr(PyramidFront::kHeaderOffset);
    if (document.starts_with(kByteOrderMark)) document.remove_prefix(kByteOrderMark.size());
    const auto first = document.find_first_not_of(" \t\r\n");
    if (first == std::string_view::npos) return false;
    document.remove_prefix(first);
    return document.starts_with("<?xml") || document.starts_with("<DATASET") ||
           document.starts_with("<!--");
}

}  // namespace zelm
