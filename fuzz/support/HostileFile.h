// What targets share that meet a whole file beside the module: the file as a source, its header,
// and whether a run has the memory for what it claims.
#ifndef ZMC_FUZZ_SUPPORT_HOSTILEFILE_H
#define ZMC_FUZZ_SUPPORT_HOSTILEFILE_H

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "files/MemorySource.h"
#include "format/PyramidLimits.h"
#include "fuzz/support/FileAndScript.h"
#include "host/base/Error.h"
#include "host/file/PyramidFileInfo.h"
#include "host/raster/Module.h"

namespace zmcfuzz {

// It grows no further than a run has memory for, as a disk that is full.
inline std::shared_ptr<zelm::files::MemorySource> SourceOf(const std::string& bytes) {
    using zelm::files::MemorySource;
    constexpr std::uint64_t kLimit = 16 << 20;
    return std::make_shared<MemorySource>(MemorySource::Bytes(bytes.begin(), bytes.end()),
                                          MemorySource::Access::Writable, kLimit);
}

// The header, if it is one.
inline std::optional<zmchost::PyramidHeader> HeaderIn(const std::string& bytes) {
    try {
        return zmchost::PyramidHeader::Read(*SourceOf(bytes), "a.pyr");
    } catch (const zmchost::Error&) {
        return std::nullopt;
    }
}

// Within the limits of the format a header may ask for more than a run has the memory or the time
// for: tiles of gigabytes, tables of as much, millions of bands.
inline bool IsAffordable(const zmchost::PyramidHeader& header) {
    const std::uint64_t tile = std::uint64_t{header.tileSize} * header.tileSize;
    const zelm::LevelGeometry finest = header.Geometry(0);
    const std::uint64_t tiles = std::uint64_t{finest.tilesAcross} * finest.tilesDown;
    return header.bandCount <= 300 &&
           tile * header.bandCount * zelm::PixelSize(header.pixelType) <= (4u << 20) &&
           (!header.IsPlanar() || zelm::PyramidLimits::TileTableBytes(
                                      tiles, header.bandCount, header.levelMax) <= (8u << 20));
}

// Where whoever loads the module finds it. Before any thread is started.
inline void TellModulePath() {
    setenv("ZMCRASTER_MODULE", ZMC_MODULE_PATH, 1);  // NOLINT(concurrency-mt-unsafe): one thread
}

// The module, loaded once.
inline const zmchost::ModulePtr& TheModule() {
    static const zmchost::ModulePtr module = [] {
        TellModulePath();
        return zmchost::Module::Load();
    }();
    return module;
}

}  // namespace zmcfuzz

#endif
