#include "gdal/RemoteSource.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <utility>

#include "gdal/SourceNumber.h"

namespace zmcgdal {
namespace {

using zelm::files::Transfer;

constexpr std::uint64_t kLeastAhead = 65536;
constexpr std::uint64_t kDocumentAtOnce = std::uint64_t{1} << 20;
// Twice this is less than one answer of GDAL's HTTP client can hold.
constexpr std::uint64_t kMostAtOnce = std::uint64_t{1} << 29;

}  // namespace

RemoteSource::RemoteSource(std::unique_ptr<Fetcher> byFetcher, std::uint64_t storeBytes)
    : number(NextSourceNumber()),
      groupBytes(std::clamp<std::uint64_t>(storeBytes / 2, 1, kMostAtOnce)),
      fetcher(std::move(byFetcher)),
      front(fetcher->FetchFront()),
      store(storeBytes) {}

void RemoteSource::Plan(WindowTiles tiles) {
    const std::lock_guard lock(mutex);
    plan.emplace(std::move(tiles));
}

void RemoteSource::EndPlan() {
    const std::lock_guard lock(mutex);
    plan.reset();
}

bool RemoteSource::Advise(WindowTiles tiles) {
    const std::lock_guard lock(mutex);
    std::vector<ByteRange> ranges = tiles.First(groupBytes);
    if (!ranges.empty()) ranges.front().size = std::min(ranges.front().size, groupBytes);
    return FetchMissing(std::move(ranges));
}

void RemoteSource::SetDocument(std::uint64_t offset) {
    const std::lock_guard lock(mutex);
    documentBegin = offset;
}

std::string RemoteSource::TakeTrouble() {
    const std::lock_guard lock(mutex);
    return std::exchange(trouble, "");
}

std::size_t RemoteSource::ReadHeld(std::uint64_t offset, unsigned char* buffer, std::size_t size) {
    if (offset >= front.size()) return store.Read(offset, buffer, size);
    const std::size_t count = std::min<std::size_t>(size, front.size() - offset);
    std::memcpy(buffer, front.data() + offset, count);
    return count;
}

ByteRange RemoteSource::Ahead(std::uint64_t offset, std::uint64_t size) const {
    const std::uint64_t least = offset >= documentBegin ? kDocumentAtOnce : kLeastAhead;
    const std::uint64_t wanted = std::min(std::max(size, least), kMostAtOnce);
    return {offset, std::min(wanted, fetcher->Size() - offset)};
}

void RemoteSource::Keep(const std::vector<ByteRange>& ranges, std::vector<Bytes> fetched) {
    store.BeginGroup();
    for (std::size_t i = 0; i < ranges.size(); ++i)
        store.Put(ranges[i].offset, std::move(fetched[i]));
}

bool RemoteSource::FetchMissing(std::vector<ByteRange> ranges) {
    for (ByteRange& range : ranges) {
        // What an incomplete file lacks is not asked for, nor what is held.
        const std::uint64_t end = std::min(range.End(), fetcher->Size());
        const std::uint64_t begin = std::max<std::uint64_t>(range.offset, front.size());
        range = begin < end ? ByteRange{begin, end - begin} : ByteRange{};
        if (store.Holds(range)) range.size = 0;
    }
    // All gaps together have no more bytes than a group.
    const std::uint64_t gap = groupBytes / std::max<std::size_t>(ranges.size(), 1);
    const std::vector<ByteRange> missing = Merged(std::move(ranges), std::min(kGap, gap));
    if (missing.empty()) return true;
    try {
        Keep(missing, fetcher->Fetch(missing));
    } catch (const FetchError& error) {
        trouble = error.what();
        return false;
    }
    return true;
}

bool RemoteSource::FetchAt(std::uint64_t offset, std::uint64_t size) {
    std::vector<ByteRange> ranges;
    if (plan) ranges = plan->From(offset, groupBytes);
    // Of a tile that has more than a group, what is asked for is enough.
    if (ranges.empty() || ranges.front().size > groupBytes) ranges = {Ahead(offset, size)};
    return FetchMissing(std::move(ranges));
}

Transfer RemoteSource::DoReadAt(std::uint64_t offset, void* buffer, std::size_t size) {
    const std::lock_guard lock(mutex);
    auto* const out = static_cast<unsigned char*>(buffer);
    Transfer done;
    while (done.bytes < size) {
        const std::uint64_t at = offset + done.bytes;
        done.end = at >= fetcher->Size();
        if (done.end) break;
        const std::size_t count = ReadHeld(at, out + done.bytes, size - done.bytes);
        done.bytes += count;
        if (count != 0 || FetchAt(at, size - done.bytes)) continue;
        done.error = EIO;
        break;
    }
    return done;
}

int RemoteSource::DoTellSize(std::uint64_t& size) const {
    const std::lock_guard lock(mutex);
    size = fetcher->Size();
    return 0;
}

zelm::files::Identity RemoteSource::DoIdentify() const {
    const std::lock_guard lock(mutex);
    return {true, kNoVolume, number, fetcher->Size(), 0, 0};
}

std::shared_ptr<RemoteSource> ClippedSource::RemoteOf(
    const std::shared_ptr<zelm::files::ByteSource>& source) {
    const auto* const clipped = dynamic_cast<ClippedSource*>(source.get());
    return std::dynamic_pointer_cast<RemoteSource>(clipped ? clipped->source : source);
}

Transfer ClippedSource::DoReadAt(std::uint64_t offset, void* buffer, std::size_t size) {
    Transfer done;
    const std::uint64_t left = offset < end ? end - offset : 0;
    const std::size_t count = std::min<std::uint64_t>(size, left);
    done.bytes = source->ReadAt(offset, buffer, count, &done.error);
    done.end = done.error == 0 && done.bytes < size;
    return done;
}

int ClippedSource::DoTellSize(std::uint64_t& size) const {
    int error = 0;
    if (source->TellSize(size, &error)) size = std::min(size, end);
    return error;
}

zelm::files::Identity ClippedSource::DoIdentify() const {
    zelm::files::Identity identity = source->Identify();
    identity.size = std::min(identity.size, end);
    return identity;
}

}  // namespace zmcgdal
