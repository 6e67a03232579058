#include "tools/BuildWords.h"

#include <cstdlib>
#include <filesystem>

#include "core/PixelVocabulary.h"
#include "host/raster/NoData.h"
#include "tools/Arguments.h"
#include "tools/GdalWorld.h"
#include "tools/Message.h"
#include "tools/Methods.h"
#include "tools/MosaicSource.h"
#include "tools/RasterView.h"
#include "tools/SceneNames.h"

namespace zmctools {
namespace {

namespace fs = std::filesystem;

bool IsInteger(std::uint32_t pixelType) {
    bool integer = false;
    zelm::VisitElementType(
        pixelType, [&]<class T>(std::type_identity<T>) { integer = std::is_integral_v<T>; });
    return integer;
}

// What is missing reads as zeros, and a few bytes of header can claim terabytes of them.
void CheckComplete(GDALDataset& dataset, const std::string& source) {
    if (const char* const missing = dataset.GetMetadataItem("BYTES_MISSING", "ZMCPYRAMID"))
        FailAsIncomplete(source, missing);
}

}  // namespace

void BuildWords::Describe(OptionTable& table) {
    table
        .Text(
            "SOURCE", source,
            "Raster to read: a file or any other name that GDAL knows; many of them as one: @FILE, "
            "a list of names, or a pattern as 'FOLDER/*.tif'")
        .Required();
    table.Text("TARGET", target, "Pyramid file to make").Required();
    DescribeMaking(table);
    table.Flag("--overwrite", overwrite, "Replace TARGET if it exists");
}

void BuildWords::DescribeMaking(OptionTable& table) {
    table
        .Text("--levels", levels,
              "Coarsest level; 0 makes the finest only, auto goes on until a level fits one "
              "tile (default auto)")
        .Named("auto|N");
    table
        .Text("--resampling", resampling,
              "How levels are reduced (default average, and mode for rasters with a palette)")
        .Named("METHOD")
        .OneOf(MethodNames());
    table
        .Text(
            "--weights", weights,
            "Whether an alpha band and masks weigh the pixels that levels are reduced from; none: "
            "all count alike (default auto)")
        .Named("WEIGHTS")
        .OneOf({"auto", "none"});
    table
        .Text("--ordering", ordering,
              "Order of the tiles in the file; more than eight bands are always in the Morton "
              "ordering (default auto)")
        .Named("ORDERING")
        .OneOf({"auto", "scanline", "blocked"});
    table
        .Text("--nodata", noData,
              "Value that marks samples without data in all bands; none: there is no such "
              "value (default: what the source says)")
        .Named("V|none");
    table
        .Text("--bands", bands,
              "Bands of the source in the order wanted, counted from 1 (default all)")
        .Named("3,2,1")
        .Filled(kNoBands);
    table.Text("--bins", bins, "Bins of a histogram; 8-bit types have one per value (default 256)")
        .Named("N");
    table
        .Text("--overlap", overlap,
              "Where scenes of many lie over each other: which of them is seen, or what is made of "
              "all (default last)")
        .Named("RULE")
        .OneOf({"last", "first", "mean", "min", "max", "median"});
    table
        .Text(
            "--scene-resampling", sceneResampling,
            "How scenes are warped that do not lie on the grid of the first one (default nearest)")
        .Named("METHOD")
        .OneOf({"nearest", "bilinear", "cubic", "cubicspline", "lanczos", "average", "mode"});
    table
        .Text("--resolution", resolution,
              "Side of a pixel of many scenes as one; first, finest: that of such a scene (default "
              "first)")
        .Named("first|finest|N");
    table.Flag("--skip-broken", skipBroken,
               "Leave out scenes of many that cannot be read; reads all of them for that");
    table.Flag("--no-statistics", noStatistics, "Leave out statistics and histograms");
    const std::string memoryHelp = "Memory for pixels, such as 64M or 2G (default " + memory + ')';
    table.Text("--memory", memory, memoryHelp.c_str()).Named("SIZE");
    table.Flag("--embed", embed,
               "Keep georeference, no-data values and other metadata in TARGET itself");
}

zmchost::BuildOptions BuildWords::Options(const zelm::RasterProps& props) const {
    zmchost::BuildOptions options;
    if (levels != "auto")
        options.levels = static_cast<std::uint32_t>(ParseCount("--levels", levels, 31));
    if (!resampling.empty()) options.resampling = zmchost::ParseResampling(resampling);
    options.weights = weights == "auto";
    if (ordering == "scanline") options.ordering = zmchost::Ordering::Scanline;
    if (ordering == "blocked") options.ordering = zmchost::Ordering::Blocked;
    if (noData == "none") options.noData = zmchost::BuildOptions::NoData{};
    if (!noData.empty() && noData != "none") {
        const double value = ParseNumber("--nodata", noData);
        bool holds = false;
        zelm::VisitElementType(props.pixelType, [&]<class T>(std::type_identity<T>) {
            holds = zmchost::HoldsValue<T>(value);
        });
        if (!holds)
            throw UsageError("--nodata", std::string("no sample of type ") +
                                             zelm::PixelTypeName(props.pixelType) + " can be " +
                                             noData);
        options.noData = zmchost::BuildOptions::NoData{value};
        // A long real holds all integers of 64 bits.
        if (std::strtold(noData.c_str(), nullptr) != static_cast<long double>(value) &&
            IsInteger(props.pixelType))
            Warn(target, "a pyramid does not keep the last digits of the no-data value " + noData +
                             " while levels are reduced");
    }
    options.bands = ParseBands(bands, props.bands);
    options.bins = static_cast<std::uint32_t>(ParseCount("--bins", bins, 1 << 24));
    if (options.bins == 0) throw UsageError("--bins", "a histogram has one bin at least");
    options.statistics = !noStatistics;
    options.memory = ParseSize("--memory", memory);
    options.overwrite = overwrite;
    return options;
}

// The builder looks at all of this again; here it is told with what helps.
void BuildWords::CheckTarget() const {
    RefuseElsewhere(target, "pyramids are made in plain folders; copy the finished file there");
    std::error_code ignored;
    if (fs::is_directory(target, ignored))
        throw Failure(target, "it is a folder; name a file in it");
    if (!fs::exists(target, ignored)) return;
    if (fs::equivalent(source, target, ignored))
        throw Failure(target, "it is the source; name another file");
    if (!overwrite) throw Failure(target, "the file exists already; --overwrite replaces it");
}

DatasetPtr BuildWords::OpenSource(bool showsBar, std::string_view known) const {
    auto scenes = SceneNames(source);
    if (scenes && scenes->size() > 1)
        return SurveyScenes(*this, std::move(*scenes), showsBar, known);
    DatasetPtr dataset = OpenDataset(scenes ? scenes->front() : source);
    CheckComplete(*dataset, source);
    return dataset;
}

}  // namespace zmctools
