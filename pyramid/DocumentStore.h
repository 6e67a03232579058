// DocumentStore: replaces the document at the end of a file, in place, so that what a reader finds
// is the old document, the new one, or something that no parser takes for a document.
//
// In this order: (1) the file grows behind the old document by line ends, which change nothing, so
// that a full disk is met while the old document still stands; (2) the first byte becomes a mark
// that no parser accepts; (3) the rest of the new text is written, and line ends over what the old
// one has beyond it; (4) the first byte is written. Between (2) and (4) the bytes may reach the
// file in any order and in any part. Where there is no document yet, (1) falls away.
//
// A step that fails is taken back: the old text, or the old end of the file. Where that fails too,
// the mark stays.
//
// File is files::ByteSource, or what a test puts in its place. One writer at a time; readers in
// other processes take the text by DocumentText.h.
#ifndef ZMC_PYRAMID_DOCUMENTSTORE_H
#define ZMC_PYRAMID_DOCUMENTSTORE_H

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <new>
#include <string>

#include "format/DocumentLimits.h"

namespace zelm {

template <class File>
class DocumentStore {
public:
    // The document is to stand at `start`. What the file has behind that is the old one.
    DocumentStore(File& target, std::uint64_t start) : file(target), offset(start) {}

    // False if it could not be written whole.
    bool Write(const unsigned char* text, std::size_t length) {
        // Not knowing where the file ends, nothing could be taken back.
        if (length == 0 || !file.TellSize(oldSize)) return false;
        KeepOldText();
        if (!Grow(offset + length)) return CutBack(), false;
        if (file.WriteAt(offset, &kUnfinishedDocument, 1) != 1) return CutBack(), false;
        if (WriteBody(text, length) && file.WriteAt(offset, text, 1) == 1) return true;
        TakeBack();
        return false;
    }

private:
    bool HasOld() const { return oldSize > offset; }
    std::size_t OldLength() const { return static_cast<std::size_t>(oldSize - offset); }

    // A store goes on without it where it cannot be had: it serves for failures alone.
    void KeepOldText() {
        if (!HasOld() || oldSize - offset > kMaxDocumentBytes) return;
        oldText.reset(new (std::nothrow) unsigned char[OldLength()]);
        if (oldText && file.ReadAt(offset, oldText.get(), OldLength()) != OldLength())
            oldText.reset();
    }

    bool Grow(std::uint64_t end) { return !HasOld() || Blank(oldSize, end); }

    bool WriteBody(const unsigned char* text, std::size_t length) {
        return file.WriteAt(offset + 1, text + 1, length - 1) == length - 1 &&
               Blank(offset + length, std::max(oldSize, offset));
    }

    // Fills the file from `begin` to `end` with line ends.
    bool Blank(std::uint64_t begin, std::uint64_t end) {
        if (begin >= end) return true;
        const std::string blank(
            static_cast<std::size_t>(std::min<std::uint64_t>(end - begin, kBlank)), '\n');
        for (; begin < end; begin += blank.size()) {
            const auto size =
                static_cast<std::size_t>(std::min<std::uint64_t>(end - begin, blank.size()));
            if (file.WriteAt(begin, blank.data(), size) != size) return false;
        }
        return true;
    }

    // True if the file ends where it did.
    bool CutBack() {
        std::uint64_t size = 0;
        return file.TellSize(size) && (size == oldSize || file.Truncate(oldSize));
    }

    // The mark stands. It goes last, so that this can be interrupted as well.
    void TakeBack() {
        if (!HasOld()) {
            CutBack();
            return;
        }
        if (!oldText) return;
        std::uint64_t size = 0;
        if (!CutBack() && !(file.TellSize(size) && Blank(oldSize, size))) return;
        const std::size_t rest = OldLength() - 1;
        if (file.WriteAt(offset + 1, oldText.get() + 1, rest) == rest)
            file.WriteAt(offset, oldText.get(), 1);
    }

    static constexpr std::size_t kBlank = 65536;

    File& file;
    const std::uint64_t offset;
    std::uint64_t oldSize = 0;
    std::unique_ptr<unsigned char[]> oldText;
};

}  // namespace zelm

#endif
