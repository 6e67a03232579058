// Dataset: one level of a pyramid file as a GDAL dataset.
//
// The main dataset is the finest level that the file holds; it owns the open file and one more
// Dataset for each coarser level, which its bands show as overviews. Georeference, no-data values,
// descriptions and the like live in the sidecar file (.aux.xml), which is written only after
// something has been set, or inside of the file (host/file/EmbeddedItems.h), for what the sidecar
// does not tell.
//
// One thread at a time uses a dataset with all that belongs to it, and large windows are read by
// more of its own (WindowReader.h). One that is shared (Share) is used by any number.
#ifndef ZMC_GDAL_DATASET_H
#define ZMC_GDAL_DATASET_H

#include <cpl_string.h>
#include <gdal_pam.h>

#include <functional>
#include <memory>
#include <mutex>
#include <span>
#include <string>
#include <utility>
#include <vector>

#include "gdal/Archive.h"
#include "gdal/Companions.h"
#include "gdal/LazyRaster.h"
#include "gdal/Options.h"
#include "gdal/WindowReader.h"
#include "host/file/Limits.h"
#include "host/file/PyramidFileInfo.h"

namespace zmcgdal {

class Creation;

// Domain of metadata that tell how samples are stored, for all drivers.
inline constexpr const char* kStructureDomain = "IMAGE_STRUCTURE";
// Of metadata that describe the file; what the sidecar has in it is the driver's own.
inline constexpr const char* kOwnDomain = "ZMCPYRAMID";

// What all levels of an open file share.
class OpenFile {
public:
    // Opens the file once, for all that is read from it and written to it. Throws zmchost::Error if
    // it cannot be opened, is no pyramid, or one that GDAL cannot hold.
    OpenFile(const std::string& fileName, GDALAccess access, const OpenOptions& options);
    // The same of a file that is open already.
    OpenFile(const std::string& fileName, std::shared_ptr<zelm::files::ByteSource> opened,
             const OpenOptions& options);

    // Throws zmchost::Error where a tile of that level, with so many bands, is beyond the limit of
    // those that are held as a whole. `operation` stands behind "cannot".
    void CheckTile(std::uint32_t level, std::uint32_t bands, const char* operation) const;
    // The same of what is read and written as one where some of it changes.
    void CheckBlock(std::uint32_t level) const;

    // Where the tiles are that a window of a level touches; bands count from 1.
    WindowTiles TilesOf(std::uint32_t level, const zelm::Rectangle& window,
                        std::span<const int> bandNumbers) const;
    // Fetches them ahead if the file lies behind a network. Throws zmchost::Error where that fails.
    void Advise(std::uint32_t level, const zelm::Rectangle& window,
                std::span<const int> bandNumbers);

    const std::shared_ptr<zelm::files::ByteSource> source;
    const zmchost::PyramidFileInfo info;
    const zmchost::Limits limits = zmchost::Limits::Current();
    LazyRaster raster;
    LazyRaster pixels;  // without its metadata document if it lies behind a network, else the same
    WindowReader tiles;
    Archive archive;
    const bool renewsStatistics;  // OpenOptions::statistics
    bool isPlanned = false;       // a PlannedRead lives
    // Held while something is made or looked up that threads of a shared dataset may ask for at
    // once and that is not made when it is opened; never while pixels are read.
    std::recursive_mutex late;
};

// As long as it lives, that window is what is read of a file behind a network. One within another
// one does nothing: what is read then is a part of the window outside. Bands count from 1.
class PlannedRead {
public:
    PlannedRead(OpenFile& file, std::uint32_t level, const zelm::Rectangle& window,
                std::span<const int> bandNumbers);
    ~PlannedRead();
    PlannedRead(const PlannedRead&) = delete;
    PlannedRead& operator=(const PlannedRead&) = delete;

private:
    RemoteSource* remote;  // null where there is nothing to plan
    bool& isPlanned;
};

class Dataset final : public CompanionDataset {
public:
    static std::unique_ptr<Dataset> FromFile(std::shared_ptr<OpenFile> file, GDALAccess access);
    // An overview of a raster, counted from 0, as a raster of its own, which keeps that one and
    // shows what it knows of all its pixels. Throws zmchost::Error if there is no such overview.
    static std::unique_ptr<Dataset> FromOverview(std::unique_ptr<Dataset> raster, int overview);
    ~Dataset() override;

    // Lets any number of threads read this dataset, its bands, levels and masks at once, and ask
    // what they know. No lock is held while pixels are read, but for windows that GDAL puts
    // together from its blocks, which are those of another size than their buffer; changes are
    // refused. From GDAL 3.10 on GDAL is told. False, and nothing is different, where that cannot
    // be: the dataset can be written to, lies behind a network, or needs objects of GDAL's own for
    // what stands beside it. Its file was opened with OpenOptions::shared.
    bool Share();

    // Shows no overviews.
    void StandAlone() { overviewsMade = true; }

    OpenFile& File() { return *file; }
    std::uint32_t Level() const { return level; }
    bool IsOverview() const { return main != nullptr; }
    Dataset& Main() { return main ? *main : *this; }
    // From fine to coarse; made when first asked for. Of a raster of very many bands they have
    // those alone that BandOf was asked for.
    const std::vector<std::unique_ptr<Dataset>>& Overviews();
    // A band that the raster has, counted from 1.
    GDALRasterBand* BandOf(int number);

    // A window, and how it is to be read, as GDAL is asked for it.
    struct Shown {
        Shown(int left, int top, int columns, int lines, GDALRasterIOExtraArg& how)
            : x(left), y(top), width(columns), height(lines) {
            GDALCopyRasterIOExtraArg(&extra, &how);
        }
        int x, y, width, height;
        GDALRasterIOExtraArg extra{};
    };
    // The level of ours that GDAL would read such a window from into a buffer of that size, and
    // `shown` is the window in that level then. Null for this one. No band is made for this.
    Dataset* CoarserFor(Shown& shown, int bufferWidth, int bufferHeight);
    // False where a mask can only follow from alpha or from a band's own no-data value.
    bool MayHaveMasks();

    // Reads the sidecar, and looks for other companions, of a file of that name. Those that are
    // staged for it (SidecarStage.h) are given their names first if it is open for update.
    void LoadSidecar(const char* fileName, Items siblings);
    // The same, when something is first asked for that may stand in them. GDAL's list of the folder
    // is what GDAL has asked the server for, or asks it for then.
    void LoadSidecarLater(const char* fileName);

    // What a sidecar would tell of this dataset, as XML; empty if that is nothing. Marks it, so
    // that a sidecar that is made of a dataset which has read it from its file counts for all of
    // it.
    std::string SidecarText();
    // What was set and is not saved yet is not to be saved.
    void ForgetChanges() { nPamFlags &= ~GPF_DIRTY; }

    // True if pixels of this window are better read past GDAL's block cache: it is not a sliver of
    // the tiles that it touches, or these are very large; and no block waits to be written. Of a
    // file that is open for update only windows that several threads read are. Bands count from 1.
    bool ReadsDirectly(int x, int y, int width, int height, std::span<const int> bandNumbers);

    // Tells whoever opens the file from now on that its records may be of other pixels than it
    // has: on the disk before the first pixel is written, until FlushCache has written all. A
    // warning, if that cannot be kept.
    void NoteEditing();
    // The records of all bands that an editing which was cut off has left in doubt.
    RecordCounts OldRecords() const {
        Load();
        return inDoubt;
    }
    // No record is in doubt any more.
    void SettleRecords();

    // Writes what was set for the sidecar, if this raster has one; `kind` is reported and answered
    // where that fails.
    CPLErr SaveSidecarNow(CPLErr kind = CE_Failure);
    void ClearStatistics() override;
    CPLErr CreateMaskBand(int flags) override;

    // Makes this dataset the place where pixels of a new file are gathered; see gdal/Create.h.
    void BeginCreation(std::unique_ptr<Creation> state);
    Creation* UnderCreation() { return creation.get(); }
    // Its file was laid out anew, for the same raster with other levels.
    void Reopen(std::shared_ptr<OpenFile> draft);
    // Runs `make`, which makes a mask of the whole dataset: beside the draft, as long as there is
    // no target.
    CPLErr NamedAsDraft(const std::function<CPLErr()>& make);
    // Ends the use of the mask, so that its file can be moved.
    void CloseMask() { oOvManager.CloseDependentDatasets(); }

    char** GetMetadataDomainList() override;
    Items GetMetadata(const char* domain = "") override;
    const char* GetMetadataItem(const char* name, const char* domain = "") override;

    Flushed FlushCache(bool atClosing) override;

    // Of a coarser level, those of the finest with pixels 2, 4, 8 ... times as large: each covers
    // just so many, and what is over at the right and at the bottom belongs to none.
    CPLErr ReadTransform(double* transform) const override;
    const OGRSpatialReference* GetSpatialRef() const override;
    int GetGCPCount() override;
    const GDAL_GCP* GetGCPs() override;
    const OGRSpatialReference* GetGCPSpatialRef() const override;
    char** GetFileList() override;

    CPLErr IRasterIO(GDALRWFlag mode, int x, int y, int width, int height, void* data,
                     int bufferWidth, int bufferHeight, GDALDataType bufferType, int bandCount,
                     int* bandMap, GSpacing pixelSpace, GSpacing lineSpace, GSpacing bandSpace,
                     GDALRasterIOExtraArg* extra) override;
    // Fetches a window of a file behind a network ahead, on this thread; else nothing.
    CPLErr AdviseRead(int x, int y, int width, int height, int bufferWidth, int bufferHeight,
                      GDALDataType bufferType, int bandCount, int* bandMap, Items options) override;
    CPLErr IBuildOverviews(const char* resampling, int overviewCount, const int* factors,
                           int bandCount, const int* bands, GDALProgressFunc progress,
                           void* progressData, CSLConstList options) override;

protected:
    int CloseDependentDatasets() override;
    CPLErr TrySaveXML() override;
    CPLErr Finish() final;

private:
    Dataset(std::shared_ptr<OpenFile> openFile, std::uint32_t levelShown, GDALAccess access,
            Dataset* mainDataset);
    void AddBands();
    bool IsAllOurs();
    void Prepare();
    bool IsWritten(const zelm::Rectangle& window, std::span<const int> bandNumbers);
    void IgnoreCompanions();
    void TakeEmbedded(Items siblings);
    void AddOverviews();
    void DescribeFile();
    void LoadNote();
    void RenewEdited();
    void EndEditing();
    bool SidecarIsWhole() const;
    // True if whole tiles of this window go into a new file at once (TileWriter.h).
    bool WritesDirectly(int x, int y, int width, int height, std::span<const int> numbers,
                        const GDALRasterIOExtraArg& extra) const;
    // Writes them so, and the rest of the window through GDAL's block cache.
    CPLErr WriteTiles(const zelm::Rectangle& window, const Target& from, int* bandMap,
                      GDALRasterIOExtraArg* extra);
    bool HasWindow(int x, int y, int width, int height) const;
    bool HasBands(std::span<const int> numbers) const;
    CPLStringList* OwnDomain(const char* domain);
    // How many pixels of the finest level one of this covers along a side.
    double Factor() const;
    Items ScaledDomain(const char* domain);
    CPLErr ReadOrWrite(GDALRWFlag mode, int x, int y, int width, int height, void* data,
                       int bufferWidth, int bufferHeight, GDALDataType bufferType, int bandCount,
                       int* bandMap, GSpacing pixelSpace, GSpacing lineSpace, GSpacing bandSpace,
                       GDALRasterIOExtraArg* extra);

    std::shared_ptr<OpenFile> file;
    std::uint32_t level;
    Dataset* main;                  // null in the main dataset
    std::unique_ptr<Dataset> kept;  // `main`, where no other dataset has it
    std::vector<GDAL_GCP> points;   // of a level: names and identifiers are those of `main`
    CPLStringList scaled;           // the domain of a level that was asked for last
    std::vector<std::unique_ptr<Dataset>> overviews;
    bool overviewsMade = false;
    CPLStringList structure;    // domain IMAGE_STRUCTURE, when it was asked for
    CPLStringList description;  // domain ZMCPYRAMID, likewise
    std::unique_ptr<Creation> creation;
    RecordCounts inDoubt;
    bool editing = false;  // the sidecar says so
    bool finished = false;
    // As which a sidecar that cannot be written is reported; CE_None: by the dataset's access.
    CPLErr failureKind = CE_None;
};

}  // namespace zmcgdal

#endif
