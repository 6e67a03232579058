// Limits: what this library, the driver and the tools take on of a file that others made.
//
// The format lets a header of a few hundred bytes announce four thousand million bands, and tiles
// of gigabytes. What it allows stands in format/PyramidLimits.h and format/DocumentLimits.h, and
// the module serves all of it; what follows from it for memory and time is refused here, in words
// that name the limit, unless whoever starts the process raises it.
//
// Limits are those of the process. Any thread may ask for them and set them. A dataset of the
// driver keeps to those that it was opened by, but for the one of bytes of its metadata document,
// which counts each time that the document is read.
#ifndef ZMC_HOST_FILE_LIMITS_H
#define ZMC_HOST_FILE_LIMITS_H

#include <cstdint>
#include <string>

namespace zmchost {

struct Limits {
    // Of a raster that is opened: all who look at one hold something for each.
    std::uint64_t bands = 65536;
    // Bytes of a tile with all its bands, where it has to be held as a whole, in several copies: to
    // write into it.
    std::uint64_t tile = std::uint64_t{16} << 20;
    // Elements of a metadata document that the driver stores into: each takes half a kilobyte then.
    std::uint64_t elements = 131072;
    // Bytes of a header document.
    std::uint64_t header = std::uint64_t{4} << 20;
    // Bytes of a metadata document that is read; more than the format allows is not.
    std::uint64_t document = std::uint64_t{256} << 20;

    // Those of the process. At first the values above, changed by the environment's ZMC_LIMITS,
    // which is read as by Change. Throws Error if that is not understood.
    static Limits Current();
    // Changes those that a text names, and keeps the others: "bands=100000,tile=1G". Sizes are in
    // bytes, or with K, M or G. Throws Error, and changes nothing, if it is not understood.
    static void Change(const std::string& text);

    // Each with its name, as Change reads them but for the blanks: "bands=65536, tile=16M".
    std::string Text() const;

    // What there is to say where a file claims more than that one of these limits (&Limits::bands),
    // and how to raise it; empty where it does not. `what` is what the file has: "it has 70000
    // bands".
    std::string Judge(std::uint64_t Limits::*which, std::uint64_t claimed,
                      const std::string& what) const;
};

}  // namespace zmchost

#endif
