// What a file tells of itself: /info, /statistics and /histogram.
#include <cstdint>
#include <span>

#include "describe/Description.h"
#include "describe/Place.h"
#include "gdal/ErrorCatcher.h"
#include "host/file/PyramidFileInfo.h"
#include "serve/Conditions.h"
#include "serve/Documents.h"
#include "serve/Names.h"
#include "serve/Service.h"
#include "serve/Services.h"

namespace zmcserve {
namespace {

using zmcdescribe::Json;

Json PlaceOf(ServedRaster::Reader& reader) {
    GDALDataset* const dataset = reader.Dataset();
    const zmcgdal::ErrorCatcher quiet(CE_Failure);
    return zmcdescribe::DescribePlace(dataset);
}

// Of one document. In the making each is many times as large as in the file.
constexpr std::uint64_t kMostValues = 1 << 20;

void CheckValues(std::uint64_t values) {
    if (values > kMostValues)
        throw Refusal(413, "histograms and palettes of more than " + std::to_string(kMostValues) +
                               " counts and colours stand in no document");
}

using Describe = Json (*)(const Request& request, ServedRaster& raster,
                          ServedRaster::Reader& reader);

Answer DocumentOf(const Request& request, Service& service, Describe describe) {
    const ServedRasterPtr raster = service.catalog.Raster(NameOfRest(request));
    const Validators validators{raster->ETagWithCompanions("d"), std::nullopt};
    if (auto answer = AnswerOfConditions(request, validators)) return std::move(*answer);
    const auto reader = raster->Borrow(request.deadline);
    Answer answer = JsonAnswer(describe(request, *raster, *reader));
    raster->File().CheckUnchanged();
    SetValidators(answer, validators);
    return answer;
}

Json Info(const Request&, ServedRaster& raster, ServedRaster::Reader& reader) {
    Json document =
        zmcdescribe::DescribeLayout(raster.Name(), zmchost::DescribePyramidFile(raster.Header()));
    if (reader.Raster().DocumentFault().empty()) {
        CheckValues(zmcdescribe::RecordValues(reader.Raster()));
        zmcdescribe::AddRecords(reader.Raster(), document);
    }
    document.update(PlaceOf(reader));
    return document;
}

Json Statistics(const Request&, ServedRaster& raster, ServedRaster::Reader& reader) {
    return {{"schema", zmcdescribe::kSchema},
            {"file", raster.Name()},
            {"statistics", zmcdescribe::DescribeStatistics(reader.Raster())}};
}

Json Histograms(const Request& request, ServedRaster& raster, ServedRaster::Reader& reader) {
    const auto band = request.Count("band", raster.Header().bandCount);
    if (band == 0u) throw Refusal(400, "band: bands count from 1");
    std::uint64_t told = 0;
    Json chosen = Json::array();
    for (Json& histogram : zmcdescribe::DescribeHistograms(
             reader.Raster(), [&](Json&one, std::span<const std::uint64_t> counts) {
                 if (band && one["band"] != *band) return;
                 CheckValues(told += counts.size());
                 zmcdescribe::TellAllCounts(one, counts);
             }))
        if (!band || histogram["band"] == *band) chosen.push_back(std::move(histogram));
    return {{"schema", zmcdescribe::kSchema},
            {"file", raster.Name()},
            {"histograms", std::move(chosen)}};
}

Answer HandleInfo(const Request& request, Service& service) {
    request.AllowKeys({});
    return DocumentOf(request, service, Info);
}

Answer HandleStatistics(const Request& request, Service& service) {
    request.AllowKeys({});
    return DocumentOf(request, service, Statistics);
}

Answer HandleHistogram(const Request& request, Service& service) {
    request.AllowKeys({"band"});
    return DocumentOf(request, service, Histograms);
}

}  // namespace

std::vector<Route> RecordRoutes() {
    return {{"info",
             HandleInfo,
             nullptr,
             {{"info", "/info/{+name}", "what `zmcraster info --json` prints of the file"}}},
            {"statistics",
             HandleStatistics,
             nullptr,
             {{"statistics", "/statistics/{+name}", "the archived statistics of all bands"}}},
            {"histogram",
             HandleHistogram,
             nullptr,
             {{"histogram", "/histogram/{+name}{?band}",
               "the archived histograms, of all bands or of one"}}}};
}

}  // namespace zmcserve
