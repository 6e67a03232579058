// Versions: what GDAL calls its drivers with differs between its versions; it is told here alone.
//
// 3.6 is the oldest version, and what was built for one works with that alone. Since 3.7 GDAL calls
// Close before it deletes a dataset, since 3.12 a georeference is an object, and since 3.13 lists
// of items are constant and Close saves the sidecar.
#ifndef ZMC_GDAL_VERSIONS_H
#define ZMC_GDAL_VERSIONS_H

#include <gdal_pam.h>
#include <gdal_version.h>

#include <algorithm>
#include <utility>

namespace zmcgdal {

#if GDAL_VERSION_NUM >= GDAL_COMPUTE_VERSION(3, 13, 0)
// Metadata, options and names of siblings: "NAME=VALUE" or plain texts, behind them null. Whoever
// made it owns it.
using Items = CSLConstList;
#else
using Items = char**;
#endif

// Flushes answer nothing before 3.7.
using Flushed = decltype(std::declval<GDALPamDataset&>().FlushCache(false));

// GDALPamDataset, whose georeference is six numbers in every version: x and y are [0] + [1] column
// + [2] row and [3] + [4] column + [5] row; and whose last work has one name. GDAL's own functions
// lead to those that are virtual here.
class PlacedDataset : public GDALPamDataset {
public:
    virtual CPLErr ReadTransform(double* transform) const;
    virtual CPLErr StoreTransform(const double* transform);

#if GDAL_VERSION_NUM >= GDAL_COMPUTE_VERSION(3, 12, 0)
    CPLErr GetGeoTransform(GDALGeoTransform& transform) const final {
        return ReadTransform(transform.data());
    }
    CPLErr SetGeoTransform(const GDALGeoTransform& transform) final {
        return StoreTransform(transform.data());
    }
#else
    CPLErr GetGeoTransform(double* transform) final { return ReadTransform(transform); }
    CPLErr SetGeoTransform(double* transform) final { return StoreTransform(transform); }
#endif

#if GDAL_VERSION_NUM >= GDAL_COMPUTE_VERSION(3, 13, 0)
    CPLErr Close(GDALProgressFunc progress = nullptr, void* progressData = nullptr) final {
        const CPLErr finished = Finish();
        return std::max(finished, GDALPamDataset::Close(progress, progressData));
    }
#elif GDAL_VERSION_NUM >= GDAL_COMPUTE_VERSION(3, 7, 0)
    CPLErr Close() final {
        const CPLErr finished = Finish();
        return std::max(finished, GDALPamDataset::Close());
    }
#endif

protected:
    // What is left to do when the dataset goes, before GDAL's own part of that. The destructor
    // calls it too, so only the first call does anything. Throws nothing; what fails is reported.
    virtual CPLErr Finish() = 0;
};

#if GDAL_VERSION_NUM >= GDAL_COMPUTE_VERSION(3, 12, 0)
inline CPLErr PlacedDataset::ReadTransform(double* transform) const {
    GDALGeoTransform read;
    const CPLErr result = GDALPamDataset::GetGeoTransform(read);
    std::copy_n(read.data(), 6, transform);
    return result;
}

inline CPLErr PlacedDataset::StoreTransform(const double* transform) {
    GDALGeoTransform stored;
    std::copy_n(transform, 6, stored.data());
    return GDALPamDataset::SetGeoTransform(stored);
}
#else
// GDAL reads without changing a thing, and does not say so.
inline CPLErr PlacedDataset::ReadTransform(double* transform) const {
    return const_cast<PlacedDataset*>(this)->GDALPamDataset::GetGeoTransform(transform);
}

inline CPLErr PlacedDataset::StoreTransform(const double* transform) {
    double stored[6];
    std::copy_n(transform, 6, stored);
    return GDALPamDataset::SetGeoTransform(stored);
}
#endif

}  // namespace zmcgdal

#endif
