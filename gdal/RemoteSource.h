// RemoteSource: a file behind a network as a byte source that asks for much at once.
//
// The first bytes of the file are fetched when it is opened, and stay. What a window needs is told
// beforehand (Plan); the first read that meets bytes which are not there fetches as much of the
// plan, from those bytes on, as half of the store holds: the ranges of the tiles, joined over small
// gaps, in one group of requests. Reads outside of any plan fetch a little more than they ask for.
//
// What is held is of the file as it was opened, and so is what is fetched: from one that has
// changed on its server since, no fetch gets anything. Any thread may call; one fetches at a time.
#ifndef ZMC_GDAL_REMOTESOURCE_H
#define ZMC_GDAL_REMOTESOURCE_H

#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "files/ByteSource.h"
#include "gdal/Fetcher.h"
#include "gdal/RangeStore.h"
#include "gdal/WindowTiles.h"

namespace zmcgdal {

class RemoteSource final : public zelm::files::ByteSource {
public:
    // Bytes that are fetched in vain rather than with a request more: what a usual network brings
    // in the time that a request waits for its answer is several times this.
    static constexpr std::uint64_t kGap = 65536;

    // Fetches the first bytes. Throws FetchError, NoRanges too.
    RemoteSource(std::unique_ptr<Fetcher> byFetcher, std::uint64_t storeBytes);

    // What is read until EndPlan.
    void Plan(WindowTiles tiles);
    void EndPlan();
    // Fetches what is going to be read, as much as a read at its beginning would. False, with a
    // reason for TakeTrouble, where that fails.
    bool Advise(WindowTiles tiles);
    // What lies from there on is read from its beginning to its end or not at all.
    void SetDocument(std::uint64_t offset);
    // Why a fetch failed since the last call, in words; empty if none did.
    std::string TakeTrouble();

protected:
    zelm::files::Transfer DoReadAt(std::uint64_t offset, void* buffer, std::size_t size) override;
    int DoTellSize(std::uint64_t& size) const override;
    zelm::files::Identity DoIdentify() const override;

private:
    // All with the lock held.
    std::size_t ReadHeld(std::uint64_t offset, unsigned char* buffer, std::size_t size);
    bool FetchAt(std::uint64_t offset, std::uint64_t size);
    bool FetchMissing(std::vector<ByteRange> ranges);
    void Keep(const std::vector<ByteRange>& ranges, std::vector<Bytes> fetched);
    ByteRange Ahead(std::uint64_t offset, std::uint64_t size) const;

    const std::uint64_t number;
    const std::uint64_t groupBytes;
    std::unique_ptr<Fetcher> fetcher;
    Bytes front;
    mutable std::mutex mutex;  // guards what follows, and the fetcher
    RangeStore store;
    std::optional<WindowTiles> plan;
    std::uint64_t documentBegin = ~std::uint64_t{0};
    std::string trouble;
};

// Another source that ends at `end` at the latest, for reading. Any thread, if it may call that
// one.
class ClippedSource final : public zelm::files::ByteSource {
public:
    ClippedSource(std::shared_ptr<zelm::files::ByteSource> whole, std::uint64_t endOffset)
        : source(std::move(whole)), end(endOffset) {}

    // The remote source that a source is, or a part of; else null.
    static std::shared_ptr<RemoteSource> RemoteOf(
        const std::shared_ptr<zelm::files::ByteSource>& source);

protected:
    zelm::files::Transfer DoReadAt(std::uint64_t offset, void* buffer, std::size_t size) override;
    int DoTellSize(std::uint64_t& size) const override;
    zelm::files::Identity DoIdentify() const override;

private:
    const std::shared_ptr<zelm::files::ByteSource> source;
    const std::uint64_t end;
};

}  // namespace zmcgdal

#endif
