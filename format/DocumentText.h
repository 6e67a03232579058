// DocumentText: the text of the document at the end of a file that another process may be writing.
//
// The text is taken twice, from its beginning both times, and the size of the file before and
// after. A store (DocumentStore.h) marks the first byte before it touches the others, and writes
// each of them once: where both readings agree, nothing was under way between them, and the text is
// that of one moment, old or new. Where they do not, they are repeated a few times.
//
// No document has a NUL. Where the file has one the text ends shortly behind it: a hole takes no
// place on the disk, and is to take none in memory.
#ifndef ZMC_FORMAT_DOCUMENTTEXT_H
#define ZMC_FORMAT_DOCUMENTTEXT_H

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>
#include <new>
#include <thread>

#include "format/DocumentLimits.h"

namespace zelm {

struct DocumentText {
    std::unique_ptr<unsigned char[]> bytes;  // null if there is none, or it cannot be had
    std::size_t size = 0;

    // A store is under way, or one never came to its end.
    bool IsUnfinished() const { return bytes && bytes[0] == kUnfinishedDocument; }

    // What the file has behind `offset`. None if that is nothing, or too long, or cannot be read,
    // or does not come to rest, or memory runs out.
    template <class File>
    static DocumentText Take(File& file, std::uint64_t offset) {
        constexpr int kAttempts = 16;
        constexpr int kPatience = 4;  // for a mark, and before others are let go first
        DocumentText text;
        for (int attempt = 0; attempt < kAttempts; ++attempt) {
            if (attempt >= kPatience) std::this_thread::yield();
            std::uint64_t end = 0, endAfter = 0;
            if (!file.TellSize(end) || end <= offset || end - offset > kMaxDocumentBytes ||
                !text.Resize(end - offset))
                return DocumentText();
            const bool settled =
                text.Read(file, offset) && file.TellSize(endAfter) && endAfter == end;
            // The mark of a store under way is worth another look; one that stays is an answer.
            if (settled && (!text.IsUnfinished() || attempt + 1 >= kPatience)) return text;
        }
        return DocumentText();
    }

private:
    bool Resize(std::uint64_t newSize) {
        if (bytes && newSize == size) return true;
        size = static_cast<std::size_t>(newSize);
        bytes.reset(new (std::nothrow) unsigned char[size]);
        return bytes != nullptr;
    }

    template <class File>
    bool ReadUpToNul(File& file, std::uint64_t offset) {
        constexpr std::size_t kPiece = std::size_t{1} << 20;
        for (std::size_t at = 0; at < size; at += kPiece) {
            const std::size_t piece = std::min(size - at, kPiece);
            unsigned char* const to = bytes.get() + at;
            if (file.ReadAt(offset + at, to, piece) != piece) return false;
            if (std::memchr(to, 0, piece)) size = at + piece;
        }
        return true;
    }

    // True if both readings agree.
    template <class File>
    bool Read(File& file, std::uint64_t offset) {
        if (!ReadUpToNul(file, offset)) return false;
        unsigned char again[16384];
        for (std::size_t at = 0; at < size; at += sizeof again) {
            const std::size_t piece = std::min(size - at, sizeof again);
            if (file.ReadAt(offset + at, again, piece) != piece ||
                std::memcmp(bytes.get() + at, again, piece) != 0)
                return false;
        }
        return true;
    }
};

}  // namespace zelm

#endif
