#include "host/file/PyramidFileInfo.h"

#include "format/PyramidLayout.h"

namespace zmchost {
namespace {

PyramidLevelInfo DescribeLevel(const PyramidHeader& header, std::uint32_t level) {
    PyramidLevelInfo info;
    info.level = level;
    info.offset = header.LevelOffset(level);
    if (level >= zelm::LevelGeometry::kLevelsWithPixels) return info;
    const zelm::LevelGeometry geometry = header.Geometry(level);
    info.width = geometry.samples;
    info.height = geometry.lines;
    info.tilesAcross = geometry.tilesAcross;
    info.tilesDown = geometry.tilesDown;
    info.bytes = header.LevelBytes(level);
    return info;
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
    for (std::uint32_t level = header.levelMin; level <= header.levelMax; ++level)
        info.levels.push_back(DescribeLevel(header, level));
    info.bytesMissing = header.BytesMissing();
    info.complete = zelm::PyramidLayout::IsComplete(header.versionMajor, header.versionMinor,
                                                    header.tileDataEnd, header.fileSize);
    return info;
}

}  // namespace zmchost
