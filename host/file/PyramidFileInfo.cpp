#include "host/file/PyramidFileInfo.h"

namespace zmchost {
namespace {

// These stand in files.
constexpr std::string_view kMagic = "KOBT";
constexpr std::size_t kHeaderDocumentAt = 20;
constexpr std::string_view kByteOrderMark = "\xEF\xBB\xBF";

// Sizes in pixels shift by the level modulo 32: so files are laid out.
PyramidLevelInfo DescribeLevel(const PyramidHeader& header, std::uint32_t level) {
    const auto tiles = [&](std::uint32_t extent) {
        return extent / header.tileSize + (extent % header.tileSize != 0 ? 1 : 0);
    };
    PyramidLevelInfo info;
    info.level = level;
    info.width = header.width >> (level & 31);
    info.height = header.height >> (level & 31);
    info.tilesAcross = tiles(info.width);
    info.tilesDown = tiles(info.height);
    info.offset = header.LevelOffset(level);
    info.bytes = header.LevelBytes(level);
    return info;
}

bool VersionHasPyramids(const PyramidHeader& header) {
    return header.versionMajor > 1 || (header.versionMajor == 1 && header.versionMinor > 0);
}

}  // namespace

const PyramidLevelInfo* PyramidFileInfo::FindLevel(std::uint32_t level) const {
    for (const PyramidLevelInfo& candidate : levels)
        if (candidate.level == level) return &candidate;
    return nullptr;
}

PyramidFileInfo ReadPyramidFileInfo(const std::string& file) {
    return DescribePyramidFile(PyramidHeader::Read(file));
}

PyramidFileInfo DescribePyramidFile(const PyramidHeader& header) {
    PyramidFileInfo info;
    info.header = header;
    for (std::uint32_t level = header.minLevel; level <= header.maxLevel; ++level)
        info.levels.push_back(DescribeLevel(header, level));
    info.bytesMissing = header.BytesMissing();
    info.complete = VersionHasPyramids(header) && info.bytesMissing == 0;
    return info;
}

bool LooksLikePyramid(std::string_view start) {
    if (start.substr(0, kMagic.size()) != kMagic || start.size() < kHeaderDocumentAt) return false;
    std::string_view document = start.substr(kHeaderDocumentAt);
    if (document.substr(0, kByteOrderMark.size()) == kByteOrderMark)
        document.remove_prefix(kByteOrderMark.size());
    const auto first = document.find_first_not_of(" \t\r\n");
    if (first == std::string_view::npos) return false;
    document.remove_prefix(first);
    for (const std::string_view opening : {"<?xml", "<DATASET", "<!--"})
        if (document.substr(0, opening.size()) == opening) return true;
    return false;
}

}  // namespace zmchost
