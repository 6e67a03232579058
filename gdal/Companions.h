// CompanionDataset, CompanionBand: GDAL's datasets and bands with a sidecar, which is looked for at
// once, or when something is first asked for that it may tell.
//
// Behind a network every companion that is looked for costs requests, where most readers want the
// pixels alone. Everything that GDAL answers from the sidecar, or keeps there, passes through here
// first, so that nobody sees a dataset without it.
//
// One thread at a time. Of a shared dataset, whose sidecar was looked for when it was opened, any
// number of threads may ask; what is computed of its pixels is kept nowhere.
#ifndef ZMC_GDAL_COMPANIONS_H
#define ZMC_GDAL_COMPANIONS_H

#include <gdal_pam.h>

#include <cstdint>
#include <functional>
#include <utility>

#include "gdal/Versions.h"

namespace zmcgdal {

class CompanionDataset : public PlacedDataset {
public:
    // Does what was put off. What it throws goes to GDAL as a failure.
    void Load() const;
    // Whether threads share this dataset (Dataset::Share): then nothing of it changes any more.
    bool IsShared() const { return shared; }
    // The same as Load; false, reported to GDAL, where the dataset is shared.
    bool MayChange() const;

    using GDALDataset::SetGCPs;
    const OGRSpatialReference* GetSpatialRef() const override;
    CPLErr SetSpatialRef(const OGRSpatialReference* reference) override;
    CPLErr ReadTransform(double* transform) const override;
    CPLErr StoreTransform(const double* transform) override;
    int GetGCPCount() override;
    const OGRSpatialReference* GetGCPSpatialRef() const override;
    const GDAL_GCP* GetGCPs() override;
    CPLErr SetGCPs(int count, const GDAL_GCP* points,
                   const OGRSpatialReference* reference) override;
    char** GetMetadataDomainList() override;
    CPLErr SetMetadata(Items items, const char* domain = "") override;
    CPLErr SetMetadataItem(const char* name, const char* value, const char* domain = "") override;
    Items GetMetadata(const char* domain = "") override;
    const char* GetMetadataItem(const char* name, const char* domain = "") override;
    char** GetFileList() override;
    void ClearStatistics() override;

protected:
    // `look` is called by the first Load.
    void PutOff(std::function<void()> look) { waiting = std::move(look); }
    void SetShared() { shared = true; }

private:
    bool shared = false;
    mutable std::function<void()> waiting;  // empty once it was done
};

// A band of a CompanionDataset.
class CompanionBand : public GDALPamRasterBand {
public:
    const char* GetDescription() const override;
    void SetDescription(const char* text) override;
    CPLErr SetNoDataValue(double value) override;
    CPLErr SetNoDataValueAsInt64(std::int64_t value) override;
    CPLErr SetNoDataValueAsUInt64(std::uint64_t value) override;
    double GetNoDataValue(int* success = nullptr) override;
    std::int64_t GetNoDataValueAsInt64(int* success = nullptr) override;
    std::uint64_t GetNoDataValueAsUInt64(int* success = nullptr) override;
    CPLErr DeleteNoDataValue() override;
    CPLErr SetColorTable(GDALColorTable* table) override;
    GDALColorTable* GetColorTable() override;
    CPLErr SetColorInterpretation(GDALColorInterp interpretation) override;
    GDALColorInterp GetColorInterpretation() override;
    const char* GetUnitType() override;
    CPLErr SetUnitType(const char* unit) override;
    char** GetCategoryNames() override;
    CPLErr SetCategoryNames(char** names) override;
    double GetOffset(int* success = nullptr) override;
    CPLErr SetOffset(double offset) override;
    double GetScale(int* success = nullptr) override;
    CPLErr SetScale(double scale) override;
    char** GetMetadataDomainList() override;
    CPLErr SetMetadata(Items items, const char* domain = "") override;
    CPLErr SetMetadataItem(const char* name, const char* value, const char* domain = "") override;
    Items GetMetadata(const char* domain = "") override;
    const char* GetMetadataItem(const char* name, const char* domain = "") override;
    CPLErr GetHistogram(double lower, double upper, int buckets, GUIntBig* counts,
                        int includeOutside, int approximate, GDALProgressFunc progress,
                        void* progressData) override;
    CPLErr GetDefaultHistogram(double* lower, double* upper, int* buckets, GUIntBig** counts,
                               int force, GDALProgressFunc progress, void* progressData) override;
    CPLErr SetDefaultHistogram(double lower, double upper, int buckets, GUIntBig* counts) override;
    GDALRasterAttributeTable* GetDefaultRAT() override;
    CPLErr SetDefaultRAT(const GDALRasterAttributeTable* table) override;
    GDALRasterBand* GetMaskBand() override;
    int GetMaskFlags() override;
    int GetOverviewCount() override;
    GDALRasterBand* GetOverview(int number) override;

private:
    void Load() const;
    bool MayChange() const;
};

}  // namespace zmcgdal

#endif
