// RangeStore: parts of a file that were fetched, for whoever asks for them next.
//
// Bounded in bytes: the parts that were not looked at for the longest time go first, and those that
// were put in together with the newest never. Parts do not overlap: what is held already stays, and
// the rest of a newer answer is laid around it.
//
// Ranges are in bytes and half-open. One thread at a time.
#ifndef ZMC_GDAL_RANGESTORE_H
#define ZMC_GDAL_RANGESTORE_H

#include <cstddef>
#include <cstdint>
#include <map>
#include <vector>

namespace zmcgdal {

struct ByteRange {
    std::uint64_t offset = 0;
    std::uint64_t size = 0;

    std::uint64_t End() const { return offset + size; }
    friend bool operator==(const ByteRange&, const ByteRange&) = default;
};

using Bytes = std::vector<unsigned char>;

// The same bytes in as few ranges as cover them without a gap of more than `gap` bytes in any, from
// the lowest offset on. Empty ones count for nothing.
std::vector<ByteRange> Merged(std::vector<ByteRange> ranges, std::uint64_t gap);

class RangeStore {
public:
    explicit RangeStore(std::uint64_t mostBytes) : most(mostBytes) {}

    // Keeps what of these bytes is not held yet. Throws std::bad_alloc.
    void Put(std::uint64_t offset, Bytes bytes);
    // What is put in from here on stays until this is called again.
    void BeginGroup() { groupBegin = now + 1; }

    // Copies the bytes from `offset` on, as many of `size` as are held in a row, and returns their
    // number.
    std::size_t Read(std::uint64_t offset, void* buffer, std::size_t size);
    // Whether all bytes of the range are held.
    bool Holds(const ByteRange& range) const;
    std::uint64_t Held() const { return held; }

private:
    struct Part {
        Bytes bytes;
        std::uint64_t used = 0;   // when it was looked at last
        std::uint64_t group = 0;  // when it was put in
    };
    using Parts = std::map<std::uint64_t, Part>;  // by offset

    // The part that has the byte at `offset`, or the end.
    Parts::const_iterator Find(std::uint64_t offset) const;
    void Insert(std::uint64_t offset, Bytes bytes);
    void MakeRoom();

    const std::uint64_t most;
    std::uint64_t held = 0;
    std::uint64_t now = 0;
    std::uint64_t groupBegin = 0;
    Parts parts;
    std::map<std::uint64_t, std::uint64_t> byUse;  // offsets of parts by `used`
};

}  // namespace zmcgdal

#endif
