// PyramidXMLDocument: one DOM document with the root DATASET, as it stands in a pyramid file.
//
// The header document is written once, when a file is laid out; the metadata document grows by one
// element per record and is rewritten whole after every change, in place. Xerces-C++ must have been
// initialised by the host. Failures are written to the standard error stream; nothing throws.
#ifndef ZMC_PYRAMID_PYRAMIDXMLDOCUMENT_H
#define ZMC_PYRAMID_PYRAMIDXMLDOCUMENT_H

#include <cstdint>

#include "colour/Palette.h"
#include "platform/File.h"
#include "pyramid/PyramidHeaderRecord.h"
#include "raster/RasterBandHistogram.h"
#include "raster/RasterBandStats.h"

namespace zelm {

// To be written with its sources: the interface below is fixed, the rest is open.
class PyramidXMLDocument {
public:
    // Makes an empty document with the root DATASET, encoding UTF-8.
    bool CreateDocument();
    // Each appends one element with its children, and is true; without a document, false.
    bool WriteHeaderElement(const PyramidHeaderRecord& header);
    template <class T>
    bool WriteBandStatsElement(const RasterBandStats<T>& stats);
    template <class T>
    bool WriteHistogramElement(const RasterBandHistogram<T>& histogram);
    bool WritePaletteElement(std::uint32_t band, const Palette& palette);
    // Writes the whole document at the offset; false if there is none or it cannot be written.
    bool SerializeDocument(platform::File& file, std::uint64_t offset);
};

}  // namespace zelm

#endif
