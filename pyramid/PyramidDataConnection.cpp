#include "pyramid/PyramidDataConnection.h"

#include <memory>
#include <utility>

#include "dispatch/ConnectionReader.h"
#include "pyramid/PyramidRasterReader.h"
#include "zmcg/zmcg.h"

namespace zelm {
namespace {

// Null if memory ran out; the parsers that a dataset owns throw then.
template <class... Arguments>
PyramidDatasetPtr MakeDataset(Arguments&&... arguments) {
    try {
        return PyramidDatasetPtr(
            std::make_unique<PyramidDataset>(std::forward<Arguments>(arguments)...).release());
    } catch (...) {
        return PyramidDatasetPtr();
    }
}

// Any format of the table will do; that it is ours is the factory's business.
bool IsKnownFormat(const String& name) {
    for (std::int32_t i = 0; i < gCdfFormatRecordCount; ++i)
        if (name == String(gCdfFormatRecords[i].name)) return true;
    return false;
}

}  // namespace

PyramidDataConnection::~PyramidDataConnection() { PyramidDataConnection::Close(); }

bool PyramidDataConnection::Open(const Array<String>& openParameters, GeoRefPtr newGeoRef,
                                 MetadataPtr newMetadata) {
    if (openParameters.shape.elements != 1) return false;
    try {
        const String fileName = openParameters.data[0];
        if (!fileName.IsEmpty()) {
            dataset = MakeDataset(fileName);
            if (dataset) {
                geoRef = newGeoRef;
                metadata = newMetadata;
                // ReadHeader is true for a failure.
                if (!dataset->ReadHeader() && TakeName(fileName)) return true;
            }
        }
    } catch (...) {
        // The host's georeference threw.
    }
    Close();
    return false;
}

void PyramidDataConnection::Close() {
    try {
        dataset.Reset();
        geoRef.Reset();
    } catch (...) {
        // A georeference that throws from its destruction.
    }
    parameters.Clear();
}

bool PyramidDataConnection::IsReadable() {
    // Hosts have never been told yes here, and some count on the reader that the question leaves.
    if (IsOpen()) {
        const RasterReaderDispatchPtr dispatch = GetReader();
        if (dispatch) dispatch->IsValidLevel();
    }
    return false;
}

RasterReaderDispatchPtr PyramidDataConnection::GetReader() {
    return KeptDispatch(reader, GetPixelType(), [this](auto type) {
        return new (std::nothrow)
            PyramidRasterReader<typename decltype(type)::type>(this, geoRef, metadata);
    });
}

RasterProps PyramidDataConnection::GetRasterProps() {
    return RefreshedProps(GetReader(), rasterProps);
}

bool PyramidDataConnection::Create(const Array<String>& createParameters,
                                   const RasterProps& props) {
    if (createParameters.shape.elements == 0) return false;
    try {
        const String fileName = createParameters.data[0];
        const char* narrow = fileName.GetUtf8();
        if (!narrow || narrow[0] == '\0' || !IsKnownFormat(props.formatName)) return false;
        dataset = MakeDataset(fileName, props);
        if (dataset && TakeName(fileName)) return true;
    } catch (...) {
        // The host's georeference threw.
    }
    Close();
    return false;
}

bool PyramidDataConnection::TakeName(const String& fileName) {
    parameters.Clear();
    if (!parameters.Append("Pyramid") || !parameters.Append(fileName)) return false;
    connectionString = String("{PyramidRaster}@") + fileName;
    return true;
}

}  // namespace zelm
