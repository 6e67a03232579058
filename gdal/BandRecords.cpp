#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <mutex>
#include <string>

#include "gdal/Band.h"
#include "gdal/Create.h"
#include "gdal/Reporting.h"
#include "gdal/Sidecar.h"
#include "raster/RasterBandStats.h"

namespace zmcgdal {
namespace {

// Items of a band in our own domain of the sidecar: so many records of the file, from the first,
// are not of the band's pixels of today, or do not count for another reason.
constexpr const char* kOldStatistics = "OLD_STATISTICS";
constexpr const char* kOldHistograms = "OLD_HISTOGRAMS";

constexpr const char* kStatisticItems[] = {"STATISTICS_MINIMUM", "STATISTICS_MAXIMUM",
                                           "STATISTICS_MEAN", "STATISTICS_STDDEV"};

constexpr std::uint32_t kAllFour = zelm::StatsFlag::Minimum | zelm::StatsFlag::Maximum |
                                   zelm::StatsFlag::Mean | zelm::StatsFlag::StandardDeviation;

bool IsDefaultDomain(const char* domain) { return !domain || *domain == '\0'; }

bool IsStatisticItem(const char* name) {
    return std::any_of(std::begin(kStatisticItems), std::end(kStatisticItems),
                       [&](const char* item) { return EQUAL(name, item); });
}

// The shortest text that reads back as the same number.
std::string NumberText(double value) {
    for (int digits = 15; digits < 17; ++digits) {
        const std::string text = CPLSPrintf("%.*g", digits, value);
        if (CPLAtof(text.c_str()) == value) return text;
    }
    return CPLSPrintf("%.17g", value);
}

// As many digits as GDAL itself writes.
bool IsNear(double stored, double given) {
    constexpr double kError = 1e-14;
    return stored == given || (std::isnan(stored) && std::isnan(given)) ||
           std::fabs(stored - given) <= kError * std::fabs(given);
}

// No sample lies beyond a range that was stored, so that it is kept to its last digit.
bool HasDigitsOf(const StoredStatistics& stored, const StoredStatistics& given) {
    return stored.IsFull() && stored.minimum == given.minimum && stored.maximum == given.maximum &&
           IsNear(stored.mean, given.mean) &&
           IsNear(stored.standardDeviation, given.standardDeviation);
}

}  // namespace

// --- which records count ---

// Storing a document behind unfinished tiles would make the file look finished.
bool Band::StoresInFile() const { return eAccess == GA_Update && owner.File().info.complete; }

std::uint32_t Band::CountOfOld(const char* item) {
    Band& main = owner.IsOverview() ? *MainBand() : *this;
    const char* const text = main.CompanionBand::GetMetadataItem(item, kOwnDomain);
    return text ? static_cast<std::uint32_t>(std::strtoul(text, nullptr, 10)) : 0;
}

RecordCounts Band::OldRecords() {
    const RecordCounts all = owner.Main().OldRecords();
    return {std::max(CountOfOld(kOldStatistics), all.statistics),
            std::max(CountOfOld(kOldHistograms), all.histograms)};
}

void Band::SetCountOfOld(const char* item, std::uint32_t count) {
    if (CountOfOld(item) == count) return;
    CompanionBand::SetMetadataItem(item, count != 0 ? std::to_string(count).c_str() : nullptr,
                                   kOwnDomain);
}

void Band::HideStatistics(const Archive& inFile) {
    SetCountOfOld(kOldStatistics, inFile.Counts().statistics);
    statisticsFetched = false;
}

void Band::HideHistograms() {
    SetCountOfOld(kOldHistograms, owner.File().archive.Counts().histograms);
}

void Band::TakeRenewed(const zmchost::FullStatistics& full) {
    SetOldRecords({});
    DropSidecarStatistics();
    DropSidecarHistograms();
    KeepFull(full, owner.File().archive);
}

void Band::KeepFull(const zmchost::FullStatistics& full, Archive& inFile) {
    if (full.known)
        KeepDigits({kAllFour, full.minimum, full.maximum, full.mean, full.standardDeviation, 0},
                   inFile);
}

void Band::SetOldRecords(const RecordCounts& counts) {
    SetCountOfOld(kOldStatistics, counts.statistics);
    SetCountOfOld(kOldHistograms, counts.histograms);
    statisticsFetched = false;
}

// A sidecar without any is not written for this.
void Band::DropSidecarStatistics() {
    const Items items = CompanionBand::GetMetadata("");
    if (HasStatistics(items)) CompanionBand::SetMetadata(WithoutStatistics(items).List(), "");
}

void Band::DropSidecarHistograms() {
    if (!psPam || !psPam->psSavedHistograms) return;
    CPLDestroyXMLNode(psPam->psSavedHistograms);
    psPam->psSavedHistograms = nullptr;
    MarkPamDirty();
}

// Nobody takes what there is for that of the new pixels, also if the process ends before the last
// of them are written: the note of the dataset is on the disk before the first.
void Band::LetRecordsAge() {
    if (owner.IsOverview() || owner.UnderCreation()) return;
    edited = true;
    const RecordCounts now = owner.File().archive.Counts();
    const RecordCounts old = OldRecords();
    if (old.statistics < now.statistics || old.histograms < now.histograms) {
        owner.NoteEditing();
        HideStatistics();
        HideHistograms();
    }
    DropSidecarStatistics();
    DropSidecarHistograms();
}

// --- statistics and metadata ---

const StoredStatistics* Band::Stored() {
    if (owner.IsOverview()) return nullptr;
    const std::lock_guard lock(owner.File().late);
    const StoredStatistics* const newest = owner.File().archive.Statistics(index);
    return newest && newest->place >= OldRecords().statistics ? newest : nullptr;
}

const StoredHistogram* Band::CurrentHistogram() {
    const std::lock_guard lock(owner.File().late);
    const StoredHistogram* const newest = owner.File().archive.Histogram(index, owner.Level());
    return newest && newest->place >= OldRecords().histograms ? newest : nullptr;
}

const CPLStringList& Band::StatisticsItems() {
    if (statisticsFetched) return statistics;
    statistics.Clear();
    const StoredStatistics* const stored = Stored();
    statisticsFetched = owner.IsOverview() || owner.File().archive.RemembersStatistics(index);
    if (!stored) return statistics;
    const auto set = [&](std::uint32_t flag, const char* name, double value) {
        if (stored->flags & flag) statistics.SetNameValue(name, NumberText(value).c_str());
    };
    set(zelm::StatsFlag::Minimum, kStatisticItems[0], stored->minimum);
    set(zelm::StatsFlag::Maximum, kStatisticItems[1], stored->maximum);
    set(zelm::StatsFlag::Mean, kStatisticItems[2], stored->mean);
    set(zelm::StatsFlag::StandardDeviation, kStatisticItems[3], stored->standardDeviation);
    return statistics;
}

// Whoever reads pixels asks for it: behind a network no sidecar is looked at for this.
bool Band::TellsStructure(const char* domain) const {
    return domain && EQUAL(domain, kStructureDomain) &&
           (structure.Count() > 0 || owner.File().raster.Remote());
}

char** Band::GetMetadataDomainList() {
    return Reporting<char**>(nullptr, [&]() -> char** {
        return BuildMetadataDomainList(CompanionBand::GetMetadataDomainList(), TRUE, "",
                                       kStructureDomain, nullptr);
    });
}

Items Band::GetMetadata(const char* domain) {
    return Reporting<Items>(nullptr, [&]() -> Items {
        const std::lock_guard lock(owner.File().late);
        if (TellsStructure(domain)) return structure.List();
        if (!IsDefaultDomain(domain) || StatisticsItems().Count() == 0)
            return CompanionBand::GetMetadata(domain);
        // Another thread may hold what it was given.
        if (owner.IsShared() && merged.Count() > 0) return merged.List();
        merged = CPLStringList(CSLDuplicate(CompanionBand::GetMetadata(domain)));
        for (int i = 0; i < statistics.Count(); ++i) {
            char* name = nullptr;
            const char* const value = CPLParseNameValue(statistics[i], &name);
            merged.SetNameValue(name, value);
            CPLFree(name);
        }
        return merged.List();
    });
}

const char* Band::GetMetadataItem(const char* name, const char* domain) {
    return Reporting<const char*>(nullptr, [&]() -> const char* {
        const std::lock_guard lock(owner.File().late);
        if (TellsStructure(domain)) return structure.FetchNameValue(name);
        if (IsDefaultDomain(domain) && STARTS_WITH_CI(name, "STATISTICS_"))
            if (const char* const value = StatisticsItems().FetchNameValue(name)) return value;
        return CompanionBand::GetMetadataItem(name, domain);
    });
}

// What the file keeps goes to the sidecar, where it can be changed and removed.
void Band::TakeStatisticsOver() {
    if (!Stored()) return;
    const CPLStringList items(CSLDuplicate(StatisticsItems().List()));
    for (int i = 0; i < items.Count(); ++i) {
        char* name = nullptr;
        const char* const value = CPLParseNameValue(items[i], &name);
        if (name) CompanionBand::SetMetadataItem(name, value, "");
        CPLFree(name);
    }
    HideStatistics();
}

CPLErr Band::SetMetadataItem(const char* name, const char* value, const char* domain) {
    return Reporting(CE_Failure, [&] {
        // As GDAL does when it has computed statistics.
        if (owner.IsShared() && IsDefaultDomain(domain) && STARTS_WITH_CI(name, "STATISTICS_"))
            return CE_None;
        if (IsDefaultDomain(domain) && IsStatisticItem(name)) {
            const char* const shown = GetMetadataItem(name, domain);
            if (shown && value && EQUAL(shown, value)) return CE_None;
            TakeStatisticsOver();
        }
        return CompanionBand::SetMetadataItem(name, value, domain);
    });
}

// Those who add an item give back all that they were shown.
CPLErr Band::SetMetadata(Items items, const char* domain) {
    return Reporting(CE_Failure, [&] {
        if (!IsDefaultDomain(domain) || !Stored() || owner.IsShared())
            return CompanionBand::SetMetadata(items, domain);
        CPLStringList kept(CSLDuplicate(items));
        const CPLStringList& shown = StatisticsItems();
        const bool same =
            std::all_of(std::begin(kStatisticItems), std::end(kStatisticItems), [&](auto name) {
                return std::string(kept.FetchNameValueDef(name, "")) ==
                       shown.FetchNameValueDef(name, "");
            });
        if (same)
            for (const char* const name : kStatisticItems) kept.SetNameValue(name, nullptr);
        else
            HideStatistics();
        return CompanionBand::SetMetadata(kept.List(), domain);
    });
}

double Band::GetMinimum(int* success) {
    ReportSuccess(success, false);
    return Reporting<double>(0.0, [&]() -> double {
        const StoredStatistics* const stored = Stored();
        if (!stored || !(stored->flags & zelm::StatsFlag::Minimum))
            return CompanionBand::GetMinimum(success);
        ReportSuccess(success, true);
        return stored->minimum;
    });
}

double Band::GetMaximum(int* success) {
    ReportSuccess(success, false);
    return Reporting<double>(0.0, [&]() -> double {
        const StoredStatistics* const stored = Stored();
        if (!stored || !(stored->flags & zelm::StatsFlag::Maximum))
            return CompanionBand::GetMaximum(success);
        ReportSuccess(success, true);
        return stored->maximum;
    });
}

CPLErr Band::GetStatistics(int approximate, int force, double* minimum, double* maximum,
                           double* mean, double* deviation) {
    return Reporting(CE_Failure, [&] {
        const StoredStatistics* const stored = Stored();
        if (!stored || !stored->IsFull())
            return CompanionBand::GetStatistics(approximate, force, minimum, maximum, mean,
                                                deviation);
        if (minimum) *minimum = stored->minimum;
        if (maximum) *maximum = stored->maximum;
        if (mean) *mean = stored->mean;
        if (deviation) *deviation = stored->standardDeviation;
        return CE_None;
    });
}

// What it stores on the way, and cannot, is no reason to keep the result back.
CPLErr Band::ComputeStatistics(int approximate, double* minimum, double* maximum, double* mean,
                               double* deviation, GDALProgressFunc progress, void* progressData) {
    if (!owner.IsShared()) computing = true;
    const CPLErr result = Reporting(CE_Failure, [&] {
        return CompanionBand::ComputeStatistics(approximate, minimum, maximum, mean, deviation,
                                                progress, progressData);
    });
    if (!owner.IsShared()) computing = false;
    return result;
}

// A level has no place of its own for them.
CPLErr Band::KeepInMemory(const StoredStatistics& given) {
    CompanionBand::SetStatistics(given.minimum, given.maximum, given.mean, given.standardDeviation);
    ReportError(CE_Warning, CPLE_NotSupported,
                "statistics of a level are kept until it is closed, and not stored");
    return CE_Warning;
}

void Band::KeepInSidecar(const StoredStatistics& given, const Archive& inFile) {
    const double values[] = {given.minimum, given.maximum, given.mean, given.standardDeviation};
    for (std::size_t i = 0; i < std::size(values); ++i)
        CompanionBand::SetMetadataItem(kStatisticItems[i], NumberText(values[i]).c_str(), "");
    HideStatistics(inFile);
}

// The file has them, with all digits.
void Band::ForgetInSidecar() {
    SetCountOfOld(kOldStatistics, 0);
    statisticsFetched = false;
    for (const char* const name : kStatisticItems)
        if (CompanionBand::GetMetadataItem(name, ""))
            CompanionBand::SetMetadataItem(name, nullptr, "");
}

// Where the record cannot be read back, it is not shown either.
void Band::KeepDigits(const StoredStatistics& given, Archive& inFile) {
    const StoredStatistics* const stored = inFile.Statistics(index);
    if (!stored) return;
    if (HasDigitsOf(*stored, given))
        ForgetInSidecar();
    else
        KeepInSidecar(given, inFile);
}

CPLErr Band::SetStatistics(double minimum, double maximum, double mean, double deviation) {
    return Reporting(CE_Failure, [&] {
        if (owner.IsShared()) return CE_None;
        const StoredStatistics given{kAllFour, minimum, maximum, mean, deviation, 0};
        if (owner.IsOverview()) return KeepInMemory(given);
        statisticsFetched = false;
        Archive& archive = owner.File().archive;
        if (!StoresInFile()) {
            KeepInSidecar(given, archive);
        } else if (archive.StoreStatistics(index, given)) {
            KeepDigits(given, archive);
        } else {
            ReportError(CE_Failure, CPLE_FileIO, "the statistics were not stored");
            return CE_Failure;
        }
        return owner.SaveSidecarNow(computing ? CE_Warning : CE_Failure);
    });
}

CPLErr Band::GetDefaultHistogram(double* lower, double* upper, int* bucketCount, GUIntBig** counts,
                                 int force, GDALProgressFunc progress, void* progressData) {
    return Reporting(CE_Failure, [&] {
        const StoredHistogram* const stored = CurrentHistogram();
        if (!stored)
            return CompanionBand::GetDefaultHistogram(lower, upper, bucketCount, counts, force,
                                                      progress, progressData);
        auto* const copy =
            static_cast<GUIntBig*>(VSI_MALLOC2_VERBOSE(stored->counts.size(), sizeof(GUIntBig)));
        if (!copy) return CE_Failure;
        std::copy(stored->counts.begin(), stored->counts.end(), copy);
        *lower = stored->lower;
        *upper = stored->upper;
        *bucketCount = static_cast<int>(stored->counts.size());
        *counts = copy;
        return CE_None;
    });
}

CPLErr Band::KeepHistogram(double lower, double upper, int bucketCount, GUIntBig* counts) {
    if (owner.IsOverview()) {
        ReportError(CE_Failure, CPLE_NoWriteAccess,
                    "histograms of a level are in the file: open it for update");
        return CE_Failure;
    }
    const CPLErr kept = CompanionBand::SetDefaultHistogram(lower, upper, bucketCount, counts);
    if (kept != CE_None) return kept;
    HideHistograms();
    return owner.SaveSidecarNow();
}

CPLErr Band::SetDefaultHistogram(double lower, double upper, int bucketCount, GUIntBig* counts) {
    return Reporting(CE_Failure, [&] {
        if (!owner.MayChange()) return CE_Failure;
        if (!StoresInFile() || bucketCount <= 0)
            return KeepHistogram(lower, upper, bucketCount, counts);
        StoredHistogram histogram{index, owner.Level(), lower, upper, {}, 0};
        histogram.counts.assign(counts, counts + bucketCount);
        if (owner.File().archive.StoreHistogram(histogram)) {
            DropSidecarHistograms();
            return CE_None;
        }
        ReportError(CE_Failure, CPLE_FileIO, "the histogram was not stored");
        return CE_Failure;
    });
}

}  // namespace zmcgdal
