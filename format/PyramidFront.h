// The front of a pyramid file: the magic, and the two offsets behind it. They stand in files and
// never change (docs/format.md).
//
// Decode, judge, then use: DecodeFront is the one function that tells whether a file is a pyramid,
// and where its header document ends. Pure arithmetic on bytes: no file.
#ifndef ZMC_FORMAT_PYRAMIDFRONT_H
#define ZMC_FORMAT_PYRAMIDFRONT_H

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>

namespace zelm {

struct PyramidFront {
    static constexpr unsigned char kMagic[4] = {'K', 'O', 'B', 'T'};
    static constexpr std::uint64_t kOffsetsOffset = sizeof kMagic;
    static constexpr std::size_t kOffsetsSize = 2 * sizeof(std::uint64_t);
    // Where the header document begins, in every file.
    static constexpr std::uint64_t kHeaderOffset = kOffsetsOffset + kOffsetsSize;

    // Where the header document ends and the tiles begin, in bytes from the start of the file.
    std::uint64_t tileDataStart = 0;
    // Where the writer put the metadata document. Readers compute it themselves.
    std::uint64_t metaDocumentOffset = 0;

    std::uint64_t HeaderBytes() const { return tileDataStart - kHeaderOffset; }

    // The two offsets as they stand in files: little-endian, whatever the machine.
    void EncodeOffsets(unsigned char (&bytes)[kOffsetsSize]) const;
};

enum class FrontFault {
    None,
    NoPyramid,  // another kind of file, or one without room for a front
    NoHeader,   // the header document does not lie in the file: damaged, or never finished
};

// Reads the front from the first bytes of a file of that size; nothing if the size is not known.
// Whatever is wrong, `front` holds what stood there, or is as it was without the bytes of a front.
FrontFault DecodeFront(std::string_view start, std::optional<std::uint64_t> fileSize,
                       PyramidFront& front);

// True if these first bytes look like a pyramid: the magic, and the opening of an XML document
// behind the offsets. 32 bytes are enough.
bool LooksLikePyramid(std::string_view start);

}  // namespace zelm

#endif
