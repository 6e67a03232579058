// LazyRaster: the module's view of a file, made when it is first needed.
//
// GDAL opens many files only to look at their size and place, and the header tells those; the
// module reads the file's statistics as well. What it refuses then fails the read that asked. The
// bytes come from the source that the header came from, so that a file that takes the name in
// between is not met; and what the module finds in it has to be what the header said.
//
// One thread at a time, but for the name, the size and the network. Several may each have one of
// the same file (Again).
#ifndef ZMC_GDAL_LAZYRASTER_H
#define ZMC_GDAL_LAZYRASTER_H

#include <memory>
#include <optional>
#include <string>
#include <utility>

#include "gdal/RemoteSource.h"
#include "gdal/Reporting.h"
#include "host/raster/Raster.h"

namespace zmcgdal {

// The module, loaded once per process.
inline const zmchost::ModulePtr& SharedModule() {
    static const zmchost::ModulePtr module = zmchost::Module::Load();
    return module;
}

class LazyRaster {
public:
    // `told` is the header in the source. With `keepCopies` stores into a plain file keep the
    // document of before until they have reached the disk.
    LazyRaster(std::string fileName, std::shared_ptr<zelm::files::ByteSource> byteSource,
               const zmchost::PyramidHeader& told, bool keepCopies)
        : name(std::move(fileName)),
          source(std::move(byteSource)),
          remote(ClippedSource::RemoteOf(source)),
          header(told),
          keepsCopies(keepCopies) {}

    const std::string& Name() const { return name; }
    // Of the file, now; 0 where that cannot be told.
    std::uint64_t FileSize() const {
        std::uint64_t size = 0;
        return source->TellSize(size) ? size : 0;
    }

    // Throws zmchost::Error, each time anew, if the module does not open the file, or as another
    // raster than the header told.
    zmchost::Raster& Get() {
        if (!raster) {
            zmchost::Raster opened = zmchost::Raster::Open(SharedModule(), source, name);
            if (!IsTheOneTold(opened))
                throw zmchost::Error(name, "open the raster", "it has changed since it was opened");
            raster.emplace(std::move(opened));
            raster->KeepCopies(keepsCopies);
        }
        return *raster;
    }

    // What the module remembers of the file is no longer so: the next call opens it anew.
    void Forget() { raster.reset(); }

    // Calls visit(zelm::RasterReader<T>&) with the module's reader. What is thrown goes to GDAL as
    // a failure, as does what the source told of the disk, and the answer is false.
    template <class Visitor>
    bool Visit(Visitor&& visit) {
        return Reported([&] {
            try {
                Get().Visit(std::forward<Visitor>(visit));
                raster->CheckDisk("read it");
            } catch (const zmchost::Error&) {
                CheckNetwork();
                throw;
            }
        });
    }

    // Throws what a fetch told since the last call.
    void CheckNetwork() const {
        if (const std::string reason = remote ? remote->TakeTrouble() : ""; !reason.empty())
            throw zmchost::Error(name, "read it", reason);
    }
    // The source as far as its tiles reach, of a file behind a network: the module reads the
    // metadata document of every file that it opens. Else the source.
    std::shared_ptr<zelm::files::ByteSource> WithoutDocument() const {
        if (!remote) return source;
        return std::make_shared<ClippedSource>(remote, header.tileDataEnd);
    }
    // The raster once more, with a reader of its own, as far as its tiles reach.
    LazyRaster Again() const {
        return {name, std::make_shared<ClippedSource>(source, header.tileDataEnd), header, false};
    }
    // Null where the file lies behind no network.
    RemoteSource* Remote() const { return remote.get(); }

private:
    // Buffers are made by the header that was told.
    bool IsTheOneTold(const zmchost::Raster& opened) const {
        const zmchost::PyramidHeader& now = opened.Header();
        return opened.PixelType() == header.pixelType && opened.Bands() == header.bandCount &&
               opened.Props().samples == header.width && opened.Props().lines == header.height &&
               now.tileSize == header.tileSize && now.tileOrdering == header.tileOrdering &&
               now.levelMin == header.levelMin && now.levelMax == header.levelMax &&
               now.tileDataStart == header.tileDataStart &&
               now.BytesMissing() <= header.BytesMissing();
    }

    std::string name;
    std::shared_ptr<zelm::files::ByteSource> source;
    std::shared_ptr<RemoteSource> remote;  // the same, if it is one
    zmchost::PyramidHeader header;
    bool keepsCopies;
    std::optional<zmchost::Raster> raster;
};

}  // namespace zmcgdal

#endif
