// Band: one band of one level.
//
// Statistics, histograms and palettes come from the file, without a scan; where the file has none,
// from the sidecar. In update mode they are stored in the file. The file's records stay what they
// are when pixels change, or when others are wanted than they are; the sidecar then tells how many
// of them, from the first, no longer count, so that those stored later do. Pixels and colours are
// in Band.cpp, the records in BandRecords.cpp.
//
// One thread at a time; any number of them where the dataset is shared.
#ifndef ZMC_GDAL_BAND_H
#define ZMC_GDAL_BAND_H

#include <cpl_string.h>
#include <gdal_pam.h>

#include <memory>
#include <vector>

#include "gdal/Dataset.h"
#include "gdal/SharedBlocks.h"
#include "host/build/FullStatistics.h"

namespace zmcgdal {

class Band final : public SharedBlocks<CompanionBand> {
public:
    // `number` counts from 1, as GDAL does.
    Band(Dataset& dataset, int number);
    ~Band() override;

    Dataset& Owner() { return owner; }

    // The color table need not stand in the sidecar, because the file has it.
    void DropSidecarColors() { CompanionBand::SetColorTable(nullptr); }

    double GetNoDataValue(int* success = nullptr) override;
    std::int64_t GetNoDataValueAsInt64(int* success = nullptr) override;
    std::uint64_t GetNoDataValueAsUInt64(int* success = nullptr) override;
    CPLErr SetNoDataValue(double value) override;
    CPLErr SetNoDataValueAsInt64(std::int64_t value) override;
    CPLErr SetNoDataValueAsUInt64(std::uint64_t value) override;
    CPLErr DeleteNoDataValue() override;

    GDALRasterBand* GetMaskBand() override;
    int GetMaskFlags() override;
    // Whether no object of GDAL's own has to be asked for the mask's pixels.
    bool MaskIsOurs();
    CPLErr CreateMaskBand(int flags) override;

    int GetOverviewCount() override;
    GDALRasterBand* GetOverview(int index) override;

    GDALColorInterp GetColorInterpretation() override;
    GDALColorTable* GetColorTable() override;
    CPLErr SetColorTable(GDALColorTable* table) override;

    // Lets so many records of the file, and no others, count no longer.
    void SetOldRecords(const RecordCounts& counts);
    RecordCounts OldRecords();
    // Those of the file that count; null where there are none.
    const StoredStatistics* Stored();
    const StoredHistogram* CurrentHistogram();
    // Lets what the file and the sidecar have of statistics count no longer.
    void ForgetStatistics() {
        HideStatistics();
        DropSidecarStatistics();
    }
    // These were just stored in the file whose archive that is: they count, and the sidecar keeps
    // what digits the file does not; renewed ones take the place of all that the sidecar has. It
    // is not written yet.
    void KeepFull(const zmchost::FullStatistics& full, Archive& inFile);
    void TakeRenewed(const zmchost::FullStatistics& full);
    // Whether that block waits in GDAL's cache to be written.
    bool HasDirtyBlock(int blockX, int blockY);
    // Of a dataset under creation: writes each block that nobody wrote, with what it holds (no
    // data, or zeros). No block waits in GDAL's cache. Throws zmchost::Error where that fails.
    void WriteUnwritten();
    // Whether pixels were written since the dataset was opened.
    bool IsEdited() const { return edited; }

    char** GetMetadataDomainList() override;
    Items GetMetadata(const char* domain = "") override;
    const char* GetMetadataItem(const char* name, const char* domain = "") override;

    CPLErr SetMetadata(Items items, const char* domain = "") override;
    CPLErr SetMetadataItem(const char* name, const char* value, const char* domain = "") override;

    double GetMinimum(int* success = nullptr) override;
    double GetMaximum(int* success = nullptr) override;
    CPLErr GetStatistics(int approximate, int force, double* minimum, double* maximum, double* mean,
                         double* deviation) override;
    CPLErr ComputeStatistics(int approximate, double* minimum, double* maximum, double* mean,
                             double* deviation, GDALProgressFunc progress,
                             void* progressData) override;
    CPLErr SetStatistics(double minimum, double maximum, double mean, double deviation) override;
    CPLErr GetDefaultHistogram(double* lower, double* upper, int* bucketCount, GUIntBig** counts,
                               int force, GDALProgressFunc progress, void* progressData) override;
    CPLErr SetDefaultHistogram(double lower, double upper, int bucketCount,
                               GUIntBig* counts) override;

    CPLErr AdviseRead(int x, int y, int width, int height, int bufferWidth, int bufferHeight,
                      GDALDataType bufferType, Items options) override;

protected:
    CPLErr IReadBlock(int blockX, int blockY, void* data) override;
    CPLErr IWriteBlock(int blockX, int blockY, void* data) override;
    CPLErr IRasterIO(GDALRWFlag mode, int x, int y, int width, int height, void* data,
                     int bufferWidth, int bufferHeight, GDALDataType bufferType,
                     GSpacing pixelSpace, GSpacing lineSpace, GDALRasterIOExtraArg* extra) override;

private:
    Dataset& owner;
    std::uint32_t index;  // of the band, from 0
    std::unique_ptr<GDALRasterBand> ownMask;
    std::unique_ptr<GDALRasterBand> levelMask;
    CPLStringList statistics;  // as metadata; filled when first asked for
    bool statisticsFetched = false;
    bool computing = false;  // statistics, which are stored on the way
    bool edited = false;
    CPLStringList merged;  // statistics and the sidecar's metadata
    CPLStringList structure;

    struct DropLock {
        void operator()(GDALRasterBlock* block) const { block->DropLock(); }
    };
    using LockedBlock = std::unique_ptr<GDALRasterBlock, DropLock>;
    // A block of another band whose samples go into the file with those of this one. It stays what
    // it was, waiting to be written, until they are there.
    struct WaitingBlock {
        LockedBlock block;
        Band* band;
        void Settle() const;
    };
    using WaitingBlocks = std::vector<WaitingBlock>;

    std::size_t BlockNumber(int blockX, int blockY) const;
    void FillUnwritten(void* samples, std::size_t stride, std::size_t count);
    void CopyFromBlock(const void* block, const zelm::Rectangle& tile, unsigned char* samples,
                       std::size_t stride) const;
    void CompleteTile(int blockX, int blockY, const zelm::Rectangle& tile, unsigned char* samples,
                      std::size_t stride, WaitingBlocks& waiting);
    std::vector<unsigned char> GatherTile(int blockX, int blockY, const zelm::Rectangle& tile,
                                          const void* data, std::vector<std::uint32_t>& bands,
                                          WaitingBlocks& waiting);

    void LetRecordsAge();
    void DropSidecarStatistics();
    std::uint32_t CountOfOld(const char* item);
    void SetCountOfOld(const char* item, std::uint32_t count);
    void HideStatistics(const Archive& inFile);
    void HideStatistics() { HideStatistics(owner.File().archive); }
    void HideHistograms();
    void TakeStatisticsOver();
    CPLErr KeepInMemory(const StoredStatistics& given);
    void KeepInSidecar(const StoredStatistics& given, const Archive& inFile);
    void ForgetInSidecar();
    void KeepDigits(const StoredStatistics& given, Archive& inFile);
    void DropSidecarHistograms();
    CPLErr KeepHistogram(double lower, double upper, int bucketCount, GUIntBig* counts);
    CPLErr KeepColorTable(GDALColorTable* table);
    Band* MainBand();
    bool StoresInFile() const;
    const CPLStringList& StatisticsItems();
    GDALColorInterp DefaultInterpretation();
    bool TellsStructure(const char* domain) const;
    bool UsesOwnMask();
    bool MaskIsBesideTheFile();
};

}  // namespace zmcgdal

#endif
