#include "host/journal/StagedSource.h"

#include <algorithm>
#include <cerrno>
#include <cstddef>
#include <cstring>
#include <utility>

namespace zmchost {

using zelm::files::Identity;
using zelm::files::Transfer;

StagedSource::StagedSource(std::shared_ptr<ByteSource> baseSource,
                           std::shared_ptr<ByteSource> asideSource)
    : base(std::move(baseSource)),
      aside(std::move(asideSource)),
      baseEnd(base->Size()),
      end(baseEnd) {}

StagedSource::~StagedSource() = default;

std::vector<StagedSource::Piece> StagedSource::Pieces() const {
    const std::lock_guard lock(mutex);
    std::vector<Piece> all;
    for (const auto& [offset, piece] : pieces) all.push_back({offset, piece.size, piece.place});
    return all;
}

std::uint64_t StagedSource::AsideSize() const {
    const std::lock_guard lock(mutex);
    return asideEnd;
}

Transfer StagedSource::DoReadAt(std::uint64_t offset, void* buffer, std::size_t size) {
    const std::lock_guard lock(mutex);
    auto* const bytes = static_cast<std::byte*>(buffer);
    std::size_t done = 0;
    while (done < size && offset + done < end) {
        const std::uint64_t at = offset + done;
        std::uint64_t most = std::min<std::uint64_t>(size - done, end - at);
        auto next = pieces.upper_bound(at);
        int error = 0;
        std::size_t moved = 0;
        if (next != pieces.begin() && at < std::prev(next)->first + std::prev(next)->second.size) {
            const auto& [begin, piece] = *std::prev(next);
            most = std::min(most, begin + piece.size - at);
            moved = aside->ReadAt(piece.place + (at - begin), bytes + done,
                                  static_cast<std::size_t>(most), &error);
        } else {
            if (next != pieces.end()) most = std::min(most, next->first - at);
            if (at < baseEnd) {
                most = std::min(most, baseEnd - at);
                moved = base->ReadAt(at, bytes + done, static_cast<std::size_t>(most), &error);
            } else {
                moved = static_cast<std::size_t>(most);
                std::memset(bytes + done, 0, moved);
            }
        }
        done += moved;
        if (moved < most) return {done, error != 0 ? error : EIO, false};
    }
    return {done, 0, done < size};
}

// No piece goes on beyond an offset that lies in it.
void StagedSource::CutAt(std::uint64_t offset) {
    auto piece = pieces.lower_bound(offset);
    if (piece == pieces.begin()) return;
    --piece;
    if (piece->first + piece->second.size <= offset) return;
    const std::uint64_t front = offset - piece->first;
    pieces[offset] = {piece->second.size - front, piece->second.place + front};
    piece->second.size = front;
}

Transfer StagedSource::DoWriteAt(std::uint64_t offset, const void* buffer, std::size_t size) {
    const std::lock_guard lock(mutex);
    int error = 0;
    const auto found = pieces.find(offset);
    const bool again = found != pieces.end() && found->second.size == size;
    const std::uint64_t place = again ? found->second.place : asideEnd;
    if (aside->WriteAt(place, buffer, size, &error) != size)
        return {0, error != 0 ? error : EIO, false};
    if (!again) {
        CutAt(offset);
        CutAt(offset + size);
        pieces.erase(pieces.lower_bound(offset), pieces.lower_bound(offset + size));
        pieces[offset] = {size, place};
        asideEnd += size;
    }
    end = std::max(end, offset + size);
    ++changes;
    return {size, 0, false};
}

int StagedSource::DoTellSize(std::uint64_t& size) const {
    const std::lock_guard lock(mutex);
    size = end;
    return 0;
}

int StagedSource::DoTruncate(std::uint64_t size) {
    const std::lock_guard lock(mutex);
    CutAt(size);
    pieces.erase(pieces.lower_bound(size), pieces.end());
    baseEnd = std::min(baseEnd, size);
    end = size;
    ++changes;
    return 0;
}

Identity StagedSource::DoIdentify() const {
    const std::lock_guard lock(mutex);
    Identity identity = base->Identify();
    identity.size = end;
    identity.modified += changes;
    identity.changed += changes;
    return identity;
}

}  // namespace zmchost
