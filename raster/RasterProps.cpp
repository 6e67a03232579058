#include "raster/RasterProps.h"

#include <algorithm>
#include <utility>

#include "core/ObjectCodes.h"

namespace zelm {

const std::uint32_t RasterProps::typeCode = GloballyUniqueObjectTypeCode("RasterProps");

RasterProps::RasterProps(const RasterProps& other)
    : noDataValues(other.noDataValues),
      formatName(other.formatName),
      geoRef(other.geoRef ? other.geoRef->Clone() : nullptr),
      metadata(other.metadata) {
    TakeFields(other);
}

RasterProps& RasterProps::operator=(const RasterProps& other) {
    if (this != &other) *this = RasterProps(other);
    return *this;
}

RasterProps::RasterProps(RasterProps&& other) noexcept : RasterProps() { *this = std::move(other); }

RasterProps& RasterProps::operator=(RasterProps&& other) noexcept {
    noDataValues.swap(other.noDataValues);
    formatName.Swap(other.formatName);
    geoRef.Swap(other.geoRef);
    metadata.impl.Swap(other.metadata.impl);
    TakeFields(other);
    return *this;
}

bool RasterProps::IsValid() const { return pixelType != 0 && !(formatName == "Unknown"); }

bool RasterProps::HasNoDataValue(std::uint32_t band) const {
    return band < bands && noDataValues.count(band) != 0;
}

double& RasterProps::GetNoDataValue(std::uint32_t band) { return noDataValues[band]; }

double RasterProps::GetNoDataValue(std::uint32_t band) const {
    const auto entry = noDataValues.find(band);
    return entry == noDataValues.end() ? 0.0 : entry->second;
}

void RasterProps::SetNoDataFlag(std::uint32_t band, bool on) {
    if (band >= bands) return;
    if (on)
        noDataValues.try_emplace(band, 0.0);
    else
        noDataValues.erase(band);
}

void RasterProps::SetNoDataValue(std::uint32_t band, double value) {
    if (band < bands) noDataValues[band] = value;
}

void RasterProps::TakeNoDataValues(const RasterProps& source) {
    // Only entries count, so that a record that claims thousands of millions of bands costs
    // nothing: bands of ours that `source` has no value for lose theirs.
    std::map<std::uint32_t, double> taken;
    for (const auto& [band, value] : source.noDataValues)
        if (band < bands && source.HasNoDataValue(band)) taken.emplace(band, value);
    noDataValues.erase(noDataValues.begin(), noDataValues.lower_bound(bands));
    noDataValues.merge(taken);
}

void RasterProps::SetGeoRef(GeoRefPtr other) {
    GeoRefPtr own(other ? other->Clone() : nullptr);
    if (own) own->SetRasterSize(samples, lines);
    geoRef.Swap(own);
}

void RasterProps::SetSamples(std::uint32_t value) {
    if (geoRef) geoRef->SetRasterSize(value, lines);
    samples = value;
}

void RasterProps::SetLines(std::uint32_t value) {
    if (geoRef) geoRef->SetRasterSize(samples, value);
    lines = value;
}

void RasterProps::SetBands(std::uint32_t value) {
    bands = value;
    if (bands == 0) noDataValues.clear();
}

void RasterProps::TakeFields(const RasterProps& other) noexcept {
    samples = other.samples;
    lines = other.lines;
    bands = other.bands;
    tileSamples = other.tileSamples;
    tileLines = other.tileLines;
    std::copy(std::begin(other.reserved), std::end(other.reserved), std::begin(reserved));
    interleave = other.interleave;
    pixelType = other.pixelType;
}

}  // namespace zelm
