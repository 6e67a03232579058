// RasterProps: what a raster is. A plain record with value semantics, copied at every boundary.
//
// Each holder has its own copy with its own clone of the georeference; the metadata tree is shared
// among the copies. A record belongs to one thread at a time.
//
// Copying throws what the host's georeference throws, and std::bad_alloc; so do the operations that
// tell the georeference something. The record is then as it was before. Moving never throws and
// clones nothing.
//
// Whoever changes `samples` or `lines` of a record that holds a georeference calls SetRasterSize
// on it with the new pair right away; whoever sets `bands` to 0 empties `noDataValues`. SetSamples,
// SetLines and SetBands do so.
#ifndef ZMC_RASTER_RASTERPROPS_H
#define ZMC_RASTER_RASTERPROPS_H

#include <cstdint>
#include <map>

#include "core/GeoRef.h"
#include "core/String.h"
#include "metadata/Metadata.h"

namespace zelm {

class RasterProps {
public:
    // cppcheck-suppress duplInheritedMember ; each class has a code of its own by this name
    static const std::uint32_t typeCode;

    std::map<std::uint32_t, double> noDataValues;  // by band; a band without an entry has none
    std::uint32_t samples = 0;                     // pixels per line
    std::uint32_t lines = 0;
    std::uint32_t bands = 0;
    std::uint32_t tileSamples = 0;   // width of a tile, 0 when the raster is not tiled
    std::uint32_t tileLines = 0;     // height of a tile, likewise
    std::uint32_t reserved[6] = {};  // copied with the record; nothing sets or reads them
    std::int32_t interleave = -1;    // interleave code
    std::uint32_t pixelType = 0;     // pixel type code
    String formatName = "Unknown";   // word of the format that the record belongs to
    GeoRefPtr geoRef;
    Metadata metadata;

    RasterProps() = default;
    RasterProps(const RasterProps& other);
    RasterProps& operator=(const RasterProps& other);
    // What is left of a record that was moved from is there to be assigned or destroyed.
    RasterProps(RasterProps&& other) noexcept;
    RasterProps& operator=(RasterProps&& other) noexcept;
    ~RasterProps() = default;

    // True when pixel type and format are both known.
    bool IsValid() const;

    bool HasNoDataValue(std::uint32_t band) const;
    // The band's value; a band without one gets 0.0. Test HasNoDataValue first.
    double& GetNoDataValue(std::uint32_t band);
    double GetNoDataValue(std::uint32_t band) const;  // 0.0 for a band without one
    // Removes the band's value, or makes it 0.0 where there is none. Bands from `bands` up are
    // ignored, here and in SetNoDataValue.
    void SetNoDataFlag(std::uint32_t band, bool on);
    void SetNoDataValue(std::uint32_t band, double value);
    // For each band of this record: the value that `source` has for it, or none.
    void TakeNoDataValues(const RasterProps& source);

    // Takes a clone of what `other` holds, told this record's size; nothing if it holds nothing.
    void SetGeoRef(GeoRefPtr other);

    void SetSamples(std::uint32_t value);
    void SetLines(std::uint32_t value);
    void SetBands(std::uint32_t value);

private:
    void TakeFields(const RasterProps& other) noexcept;
};

}  // namespace zelm

#endif
