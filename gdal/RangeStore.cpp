#include "gdal/RangeStore.h"

#include <algorithm>
#include <cstring>
#include <iterator>
#include <utility>

namespace zmcgdal {

std::vector<ByteRange> Merged(std::vector<ByteRange> ranges, std::uint64_t gap) {
    std::erase_if(ranges, [](const ByteRange& range) { return range.size == 0; });
    std::sort(ranges.begin(), ranges.end(),
              [](const ByteRange& a, const ByteRange& b) { return a.offset < b.offset; });
    std::vector<ByteRange> merged;
    for (const ByteRange& range : ranges) {
        ByteRange* const last = merged.empty() ? nullptr : &merged.back();
        if (last && (range.offset <= last->End() || range.offset - last->End() <= gap))
            last->size = std::max(last->End(), range.End()) - last->offset;
        else
            merged.push_back(range);
    }
    return merged;
}

RangeStore::Parts::const_iterator RangeStore::Find(std::uint64_t offset) const {
    auto part = parts.upper_bound(offset);
    if (part == parts.begin()) return parts.end();
    --part;
    return offset - part->first < part->second.bytes.size() ? part : parts.end();
}

void RangeStore::Insert(std::uint64_t offset, Bytes bytes) {
    held += bytes.size();
    ++now;
    byUse.emplace(now, offset);
    parts.emplace(offset, Part{std::move(bytes), now, now});
}

void RangeStore::Put(std::uint64_t offset, Bytes bytes) {
    const std::uint64_t end = offset + bytes.size();
    if (parts.lower_bound(offset) == parts.lower_bound(end) && Find(offset) == parts.end() &&
        !bytes.empty()) {
        Insert(offset, std::move(bytes));
        return MakeRoom();
    }
    for (std::uint64_t at = offset; at < end;) {
        if (const auto part = Find(at); part != parts.end()) {
            at = part->first + part->second.bytes.size();
            continue;
        }
        const auto next = parts.lower_bound(at);
        const std::uint64_t stop = next == parts.end() ? end : std::min(end, next->first);
        const auto place = [&](std::uint64_t here) {
            return bytes.begin() + static_cast<std::ptrdiff_t>(here - offset);
        };
        Insert(at, Bytes(place(at), place(stop)));
        at = stop;
    }
    MakeRoom();
}

void RangeStore::MakeRoom() {
    for (auto oldest = byUse.begin(); held > most && oldest != byUse.end();) {
        const auto part = parts.find(oldest->second);
        if (part->second.group >= groupBegin) {
            ++oldest;
            continue;
        }
        held -= part->second.bytes.size();
        parts.erase(part);
        oldest = byUse.erase(oldest);
    }
}

std::size_t RangeStore::Read(std::uint64_t offset, void* buffer, std::size_t size) {
    auto* const out = static_cast<unsigned char*>(buffer);
    std::size_t done = 0;
    while (done < size) {
        const auto found = Find(offset + done);
        if (found == parts.end()) break;
        Part& part = parts.find(found->first)->second;
        const auto skipped = static_cast<std::size_t>(offset + done - found->first);
        const std::size_t count = std::min(size - done, part.bytes.size() - skipped);
        std::memcpy(out + done, part.bytes.data() + skipped, count);
        byUse.erase(part.used);
        part.used = ++now;
        byUse.emplace(now, found->first);
        done += count;
    }
    return done;
}

bool RangeStore::Holds(const ByteRange& range) const {
    for (std::uint64_t at = range.offset; at < range.End();) {
        const auto part = Find(at);
        if (part == parts.end()) return false;
        at = part->first + part->second.bytes.size();
    }
    return true;
}

}  // namespace zmcgdal
