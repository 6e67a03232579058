#include "connection/MemoryRasterDataConnection.h"

#include <new>
#include <string_view>

#include "connection/ConnectionStrings.h"
#include "core/PixelVocabulary.h"
#include "dispatch/ConnectionReader.h"
#include "raster/ReaderRasterMemory.h"

namespace zelm {
namespace {

constexpr char kFormatWord[] = "MemoryRaster";
constexpr std::string_view kConnectionPrefix = "{MemoryRaster}@";

}  // namespace

void* MemoryRasterPixels(RasterDataConnection* connection) {
    const auto* memory = dynamic_cast<MemoryRasterDataConnection*>(connection);
    return memory ? memory->pixelData : nullptr;
}

MemoryRasterDataConnection::~MemoryRasterDataConnection() { MemoryRasterDataConnection::Close(); }

bool MemoryRasterDataConnection::Open(const Array<String>& openParameters, GeoRefPtr geoRef,
                                      MetadataPtr) {
    if (openParameters.shape.elements != 1) return false;
    try {
        const String source = openParameters.data[0];
        if (!source.IsEmpty() && ParseMemoryParameters(source, geoRef) && TakeParameters(source))
            return true;
    } catch (...) {
        // The host's georeference threw.
    }
    Close();
    return false;
}

void MemoryRasterDataConnection::Close() {
    try {
        rasterProps = RasterProps();
    } catch (...) {
        // A georeference that throws from its destruction; the buffer goes all the same.
    }
    pixelData = nullptr;
    parameters.Clear();
}

bool MemoryRasterDataConnection::IsOpen() { return pixelData && rasterProps.IsValid(); }

Array<String> MemoryRasterDataConnection::GetParameters() { return parameters; }

String MemoryRasterDataConnection::GetConnectionString() { return connectionString; }

bool MemoryRasterDataConnection::IsAvailable() { return initialised && IsOpen(); }

std::uint32_t MemoryRasterDataConnection::GetPixelType() {
    return initialised && IsOpen() ? rasterProps.pixelType : 0;
}

bool MemoryRasterDataConnection::IsReadable() { return initialised && IsOpen(); }

RasterReaderDispatchPtr MemoryRasterDataConnection::GetReader() {
    return KeptDispatch(reader, GetPixelType(), [this](auto type) {
        return new (std::nothrow)
            ReaderRasterMemory<typename decltype(type)::type>(this, rasterProps);
    });
}

RasterProps MemoryRasterDataConnection::GetRasterProps() {
    return RefreshedProps(GetReader(), rasterProps);
}

// The name and the address are stored as they are read, the rest once all nine keys are known.
bool MemoryRasterDataConnection::ParseMemoryParameters(const String& source,
                                                       const GeoRefPtr& geoRef) {
    std::uint32_t samples = 0, lines = 0, bands = 0, pixelType = 0;
    std::int32_t interleave = 0;
    double unused[2];
    const bool complete = ReadUnsignedParameter(source, "SAMPLES", samples) &&
                          ReadUnsignedParameter(source, "LINES", lines) &&
                          ReadUnsignedParameter(source, "BANDS", bands) &&
                          ReadSignedParameter(source, "INTERLEAVE", interleave) &&
                          IsInterleave(interleave) &&
                          ReadPixelTypeParameter(source, "PIXELTYPE", pixelType) &&
                          ReadDoublePairParameter(source, "PIXELSIZE", unused[0], unused[1]) &&
                          ReadDoublePairParameter(source, "TIEPTMAP", unused[0], unused[1]) &&
                          FindParameterValue(source, "NAME", name) &&
                          ReadPointerParameter(source, "PIXELDATA", &pixelData);
    if (!complete) return false;
    rasterProps.SetSamples(samples);
    rasterProps.SetLines(lines);
    rasterProps.SetBands(bands);
    rasterProps.interleave = interleave;
    rasterProps.pixelType = pixelType;
    rasterProps.formatName = kFormatWord;
    rasterProps.SetGeoRef(geoRef);
    // Entries are few, while a string may claim thousands of millions of bands.
    auto& values = rasterProps.noDataValues;
    values.erase(values.begin(), values.lower_bound(bands));
    return rasterProps.formatName.wide != nullptr;
}

// Texts that memory ran out for are null or cut short, and a connection with such is none.
bool MemoryRasterDataConnection::TakeParameters(const String& source) {
    parameters.Clear();
    if (!parameters.Append(kFormatWord) || !parameters.Append(source)) return false;
    if (!parameters.data[0].wide || !parameters.data[1].wide) return false;
    const String text = String(kConnectionPrefix.data()) + source;
    if (text.View().size() != kConnectionPrefix.size() + source.View().size()) return false;
    connectionString = text;
    return connectionString.wide != nullptr;
}

}  // namespace zelm
