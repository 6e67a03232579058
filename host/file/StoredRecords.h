// StoredRecords: what the metadata document of a pyramid file keeps of its bands, parsed once.
//
// The module parses the whole document for each record that it is asked for, and tells one at a
// time; a host that wants those of many bands reads the text itself, by the same parser, and has
// all of them for the price of one. A document that is malformed keeps nothing, as for the module.
//
// Bands count from 0 and are taken as the document tells them, those that the raster does not have
// included. Nothing here changes once it is read; any number of threads may look.
#ifndef ZMC_HOST_FILE_STOREDRECORDS_H
#define ZMC_HOST_FILE_STOREDRECORDS_H

#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <unordered_map>

#include "colour/ColorList.h"
#include "files/ByteSource.h"
#include "raster/RasterBandHistogram.h"
#include "raster/RasterBandStats.h"

namespace zelm {
struct DocumentText;
template <class T>
class PyramidXMLReaderHandlers;
}  // namespace zelm

namespace zmchost {

// The part that does not depend on the pixel type.
class DocumentRecords {
public:
    virtual ~DocumentRecords() = default;
    virtual bool HasStatistics(std::uint32_t band) const = 0;
    // The last one stored; null where there is none, or one without colours, which hides those
    // before it. Owned by this object.
    virtual const zelm::ColorList* BandPalette(std::uint32_t band) const = 0;
    // What is wrong with the form of the document, as JudgeMetadata tells it; empty if nothing, or
    // if there is none. One of another root keeps its records all the same.
    virtual const std::string& Fault() const = 0;
    // Elements of the text, malformed or not.
    virtual std::uint64_t Elements() const = 0;
    // Whether the text came to rest: one that is missing, or that a store has marked as unfinished,
    // may be another a moment later.
    virtual bool IsSettled() const = 0;
};

// T is the pixel type of the raster.
template <class T>
class StoredRecords : public DocumentRecords {
public:
    // Reads what stands behind `offset`, where the tiles end. A source that fails tells whoever
    // records its failures, and gives no records. Throws std::bad_alloc.
    static std::shared_ptr<const StoredRecords> Read(zelm::files::ByteSource& source,
                                                     std::uint64_t offset);
    StoredRecords();
    ~StoredRecords() override;

    // In the order of the document, in which they were stored.
    std::span<const zelm::RasterBandStats<T>> Statistics() const;
    std::span<const zelm::RasterBandHistogram<T>> Histograms() const;
    // The record of a band that was stored first, or that has been stored last and says anything.
    // Null if there is none; else in Statistics().
    const zelm::RasterBandStats<T>* FirstStatistics(std::uint32_t band) const;
    const zelm::RasterBandStats<T>* NewestStatistics(std::uint32_t band) const;

    bool HasStatistics(std::uint32_t band) const override { return FirstStatistics(band); }
    const zelm::ColorList* BandPalette(std::uint32_t band) const override;
    const std::string& Fault() const override { return fault; }
    std::uint64_t Elements() const override { return elements; }
    bool IsSettled() const override { return settled; }

private:
    using Places = std::unordered_map<std::uint32_t, std::uint32_t>;

    void Parse(zelm::DocumentText text);
    void MapPlaces();
    const zelm::RasterBandStats<T>* At(const Places& places, std::uint32_t band) const;

    std::unique_ptr<zelm::PyramidXMLReaderHandlers<T>> kept;  // null if nothing is
    Places first, newest;                                     // in Statistics(), by band
    std::string fault;
    std::uint64_t elements = 0;
    bool settled = false;
};

}  // namespace zmchost

#endif
