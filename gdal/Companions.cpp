#include "gdal/Companions.h"

#include <utility>

#include "gdal/Reporting.h"

namespace zmcgdal {

// What it looks at asks this dataset again.
void CompanionDataset::Load() const {
    if (!waiting) return;
    const std::function<void()> look = std::exchange(waiting, nullptr);
    Reported([&] { look(); });
}

void CompanionBand::Load() const {
    if (poDS) static_cast<CompanionDataset*>(poDS)->Load();
}

bool CompanionDataset::MayChange() const {
    Load();
    if (shared)
        CPLError(CE_Failure, CPLE_NoWriteAccess, "%s: threads share it, nothing of it is changed",
                 GetDescription());
    return !shared;
}

bool CompanionBand::MayChange() const {
    return !poDS || static_cast<CompanionDataset*>(poDS)->MayChange();
}

const OGRSpatialReference* CompanionDataset::GetSpatialRef() const {
    Load();
    return GDALPamDataset::GetSpatialRef();
}

CPLErr CompanionDataset::SetSpatialRef(const OGRSpatialReference* reference) {
    if (!MayChange()) return CE_Failure;
    return GDALPamDataset::SetSpatialRef(reference);
}

CPLErr CompanionDataset::ReadTransform(double* transform) const {
    Load();
    return PlacedDataset::ReadTransform(transform);
}

CPLErr CompanionDataset::StoreTransform(const double* transform) {
    if (!MayChange()) return CE_Failure;
    return PlacedDataset::StoreTransform(transform);
}

int CompanionDataset::GetGCPCount() {
    Load();
    return GDALPamDataset::GetGCPCount();
}

const OGRSpatialReference* CompanionDataset::GetGCPSpatialRef() const {
    Load();
    return GDALPamDataset::GetGCPSpatialRef();
}

const GDAL_GCP* CompanionDataset::GetGCPs() {
    Load();
    return GDALPamDataset::GetGCPs();
}

CPLErr CompanionDataset::SetGCPs(int count, const GDAL_GCP* points,
                                 const OGRSpatialReference* reference) {
    if (!MayChange()) return CE_Failure;
    return GDALPamDataset::SetGCPs(count, points, reference);
}

char** CompanionDataset::GetMetadataDomainList() {
    Load();
    return GDALPamDataset::GetMetadataDomainList();
}

CPLErr CompanionDataset::SetMetadata(Items items, const char* domain) {
    if (!MayChange()) return CE_Failure;
    return GDALPamDataset::SetMetadata(items, domain);
}

CPLErr CompanionDataset::SetMetadataItem(const char* name, const char* value, const char* domain) {
    if (!MayChange()) return CE_Failure;
    return GDALPamDataset::SetMetadataItem(name, value, domain);
}

Items CompanionDataset::GetMetadata(const char* domain) {
    Load();
    return GDALPamDataset::GetMetadata(domain);
}

const char* CompanionDataset::GetMetadataItem(const char* name, const char* domain) {
    Load();
    return GDALPamDataset::GetMetadataItem(name, domain);
}

char** CompanionDataset::GetFileList() {
    Load();
    return GDALPamDataset::GetFileList();
}

void CompanionDataset::ClearStatistics() {
    if (!MayChange()) return;
    return GDALPamDataset::ClearStatistics();
}

const char* CompanionBand::GetDescription() const {
    Load();
    return GDALPamRasterBand::GetDescription();
}

void CompanionBand::SetDescription(const char* text) {
    if (!MayChange()) return;
    return GDALPamRasterBand::SetDescription(text);
}

CPLErr CompanionBand::SetNoDataValue(double value) {
    if (!MayChange()) return CE_Failure;
    return GDALPamRasterBand::SetNoDataValue(value);
}

CPLErr CompanionBand::SetNoDataValueAsInt64(std::int64_t value) {
    if (!MayChange()) return CE_Failure;
    return GDALPamRasterBand::SetNoDataValueAsInt64(value);
}

CPLErr CompanionBand::SetNoDataValueAsUInt64(std::uint64_t value) {
    if (!MayChange()) return CE_Failure;
    return GDALPamRasterBand::SetNoDataValueAsUInt64(value);
}

double CompanionBand::GetNoDataValue(int* success) {
    Load();
    return GDALPamRasterBand::GetNoDataValue(success);
}

std::int64_t CompanionBand::GetNoDataValueAsInt64(int* success) {
    Load();
    return GDALPamRasterBand::GetNoDataValueAsInt64(success);
}

std::uint64_t CompanionBand::GetNoDataValueAsUInt64(int* success) {
    Load();
    return GDALPamRasterBand::GetNoDataValueAsUInt64(success);
}

CPLErr CompanionBand::DeleteNoDataValue() {
    if (!MayChange()) return CE_Failure;
    return GDALPamRasterBand::DeleteNoDataValue();
}

CPLErr CompanionBand::SetColorTable(GDALColorTable* table) {
    if (!MayChange()) return CE_Failure;
    return GDALPamRasterBand::SetColorTable(table);
}

GDALColorTable* CompanionBand::GetColorTable() {
    Load();
    return GDALPamRasterBand::GetColorTable();
}

CPLErr CompanionBand::SetColorInterpretation(GDALColorInterp interpretation) {
    if (!MayChange()) return CE_Failure;
    return GDALPamRasterBand::SetColorInterpretation(interpretation);
}

GDALColorInterp CompanionBand::GetColorInterpretation() {
    Load();
    return GDALPamRasterBand::GetColorInterpretation();
}

const char* CompanionBand::GetUnitType() {
    Load();
    return GDALPamRasterBand::GetUnitType();
}

CPLErr CompanionBand::SetUnitType(const char* unit) {
    if (!MayChange()) return CE_Failure;
    return GDALPamRasterBand::SetUnitType(unit);
}

char** CompanionBand::GetCategoryNames() {
    Load();
    return GDALPamRasterBand::GetCategoryNames();
}

CPLErr CompanionBand::SetCategoryNames(char** names) {
    if (!MayChange()) return CE_Failure;
    return GDALPamRasterBand::SetCategoryNames(names);
}

double CompanionBand::GetOffset(int* success) {
    Load();
    return GDALPamRasterBand::GetOffset(success);
}

CPLErr CompanionBand::SetOffset(double offset) {
    if (!MayChange()) return CE_Failure;
    return GDALPamRasterBand::SetOffset(offset);
}

double CompanionBand::GetScale(int* success) {
    Load();
    return GDALPamRasterBand::GetScale(success);
}

CPLErr CompanionBand::SetScale(double scale) {
    if (!MayChange()) return CE_Failure;
    return GDALPamRasterBand::SetScale(scale);
}

char** CompanionBand::GetMetadataDomainList() {
    Load();
    return GDALPamRasterBand::GetMetadataDomainList();
}

CPLErr CompanionBand::SetMetadata(Items items, const char* domain) {
    if (!MayChange()) return CE_Failure;
    return GDALPamRasterBand::SetMetadata(items, domain);
}

CPLErr CompanionBand::SetMetadataItem(const char* name, const char* value, const char* domain) {
    if (!MayChange()) return CE_Failure;
    return GDALPamRasterBand::SetMetadataItem(name, value, domain);
}

Items CompanionBand::GetMetadata(const char* domain) {
    Load();
    return GDALPamRasterBand::GetMetadata(domain);
}

const char* CompanionBand::GetMetadataItem(const char* name, const char* domain) {
    Load();
    return GDALPamRasterBand::GetMetadataItem(name, domain);
}

CPLErr CompanionBand::GetHistogram(double lower, double upper, int buckets, GUIntBig* counts,
                                   int includeOutside, int approximate, GDALProgressFunc progress,
                                   void* progressData) {
    Load();
    // GDAL's sidecar keeps what was computed.
    if (poDS && static_cast<CompanionDataset*>(poDS)->IsShared())
        // NOLINTNEXTLINE(bugprone-parent-virtual-call): for this reason.
        return GDALRasterBand::GetHistogram(lower, upper, buckets, counts, includeOutside,
                                            approximate, progress, progressData);
    return GDALPamRasterBand::GetHistogram(lower, upper, buckets, counts, includeOutside,
                                           approximate, progress, progressData);
}

CPLErr CompanionBand::GetDefaultHistogram(double* lower, double* upper, int* buckets,
                                          GUIntBig** counts, int force, GDALProgressFunc progress,
                                          void* progressData) {
    Load();
    return GDALPamRasterBand::GetDefaultHistogram(lower, upper, buckets, counts, force, progress,
                                                  progressData);
}

CPLErr CompanionBand::SetDefaultHistogram(double lower, double upper, int buckets,
                                          GUIntBig* counts) {
    if (!MayChange()) return CE_Failure;
    return GDALPamRasterBand::SetDefaultHistogram(lower, upper, buckets, counts);
}

GDALRasterAttributeTable* CompanionBand::GetDefaultRAT() {
    Load();
    return GDALPamRasterBand::GetDefaultRAT();
}

CPLErr CompanionBand::SetDefaultRAT(const GDALRasterAttributeTable* table) {
    if (!MayChange()) return CE_Failure;
    return GDALPamRasterBand::SetDefaultRAT(table);
}

GDALRasterBand* CompanionBand::GetMaskBand() {
    Load();
    return GDALPamRasterBand::GetMaskBand();
}

int CompanionBand::GetMaskFlags() {
    Load();
    return GDALPamRasterBand::GetMaskFlags();
}

int CompanionBand::GetOverviewCount() {
    Load();
    return GDALPamRasterBand::GetOverviewCount();
}

GDALRasterBand* CompanionBand::GetOverview(int number) {
    Load();
    return GDALPamRasterBand::GetOverview(number);
}

}  // namespace zmcgdal
