#include "serve/ServedRaster.h"

#include <algorithm>

#include "core/PixelVocabulary.h"
#include "describe/Place.h"
#include "gdal/ErrorCatcher.h"
#include "host/base/Error.h"
#include "host/file/PyramidFileInfo.h"
#include "serve/Answer.h"
#include "serve/Mercator.h"

namespace zmcserve {
namespace {

zmchost::PyramidHeader HeaderOf(const ServedFile& file) try {
    return zmchost::PyramidHeader::Read(*file.Source(), file.Name());
} catch (const zmchost::Error& error) {
    throw Refusal(500, error.what());
}

// Null where the driver does not show such a pyramid.
std::unique_ptr<zmcgdal::Dataset> OpenDataset(const ServedFile& file, const Companions& beside) {
    const zmcgdal::ErrorCatcher quiet(CE_Failure);
    CPLStringList siblings;
    for (const std::string& name : beside.siblings) siblings.AddString(name.c_str());
    try {
        auto opened =
            std::make_shared<zmcgdal::OpenFile>(beside.path, file.Source(), zmcgdal::OpenOptions{});
        auto dataset = zmcgdal::Dataset::FromFile(std::move(opened), GA_ReadOnly);
        if (dataset) dataset->LoadSidecar(beside.path.c_str(), siblings.List());
        return dataset;
    } catch (const zmchost::Error&) {
        return nullptr;
    }
}

Georeference PlaceOf(GDALDataset& dataset) {
    const zmcgdal::ErrorCatcher quiet(CE_Failure);
    Georeference place;
    if (const OGRSpatialReference* const system = dataset.GetSpatialRef())
        place.wkt = zmcdescribe::WktOf(*system);
    std::array<double, 6> numbers{};
    if (GDALGetGeoTransform(GDALDataset::ToHandle(&dataset), numbers.data()) == CE_None)
        place.transform = numbers;
    return place;
}

}  // namespace

struct ServedRaster::Told {
    zmcrender::RasterFacts facts;
    Georeference place;
    bool hasMask = false;
};

struct ServedRaster::Reader::Tools {
    explicit Tools(zmchost::Raster opened) : raster(std::move(opened)) {}
    zmchost::Raster raster;
    std::unique_ptr<zmcgdal::Dataset> dataset;
    bool lookedForDataset = false;
    std::unique_ptr<MaskedPixels> pixels;
    std::unique_ptr<const Mercator> mercator;
    Deadline deadline;
};

class ServedRaster::Reader::MaskedPixels final : public zmcrender::PixelSource {
public:
    explicit MaskedPixels(Reader& owner) : reader(owner), raster(owner.Raster()) {}
    std::string Name() const override { return raster.Name(); }
    std::uint32_t PixelType() const override { return raster.PixelType(); }
    std::uint32_t Bands() const override { return raster.Bands(); }
    std::uint32_t MinLevel() const override { return reader.raster->FinestLevel(); }
    std::uint32_t MaxLevel() const override { return reader.raster->CoarsestLevel(); }
    std::uint32_t Width(std::uint32_t level) const override { return raster.Width(level); }
    std::uint32_t Height(std::uint32_t level) const override { return raster.Height(level); }
    std::uint32_t TileSide() const override { return raster.TileSide(); }
    void Read(std::uint32_t level, const zmchost::Window& window,
              std::span<const std::uint32_t> bands, void* pixels) override {
        reader.tools->deadline.Check();
        raster.Read(level, window, bands, pixels);
    }
    bool HasMask() const override { return reader.raster->Tell().hasMask; }
    void ReadMask(std::uint32_t level, const zmchost::Window& window,
                  unsigned char* shown) override {
        GDALDataset* const dataset = reader.Dataset();
        if (!dataset) throw zmchost::Error(Name(), "read its mask", "the driver does not show it");
        const zmcgdal::ErrorCatcher quiet(CE_Failure);
        zmcrender::DatasetMask(*dataset).Read(level - MinLevel(), window, shown);
    }

private:
    Reader& reader;
    zmchost::Raster& raster;
};

ServedRaster::ServedRaster(ServedFilePtr opened, Companions beside, zmchost::ModulePtr loaded)
    : file(std::move(opened)),
      companions(std::move(beside)),
      module(std::move(loaded)),
      header(HeaderOf(*file)) {
    const std::uint32_t end = std::min(header.levelMax, zelm::LevelGeometry::kLevelsWithPixels - 1);
    for (std::uint32_t level = header.levelMin; level <= end; ++level) {
        if (zelm::LevelGeometry::LevelPixels(header.width, header.height, level) == 0) break;
        coarsest = level;
        ++levels;
    }
}

ServedRaster::~ServedRaster() = default;

std::uint32_t ServedRaster::SampleBytes() const { return zelm::PixelSize(header.pixelType); }

zmchost::Window ServedRaster::Whole() const {
    const zelm::LevelGeometry finest = Geometry(FinestLevel());
    return zmcrender::WholeOfLevel(FinestLevel(), finest.samples, finest.lines);
}

std::optional<std::uint32_t> ServedRaster::LevelOfZoom(std::uint64_t zoom) const {
    if (zoom >= levels) return std::nullopt;
    return coarsest - static_cast<std::uint32_t>(zoom);
}

std::string ServedRaster::ETagWithCompanions(std::string_view variant) const {
    const std::size_t beside = std::hash<std::string>{}(companions.version);
    return ETag(companions.version.empty() ? std::string(variant)
                                           : std::to_string(beside) + std::string(variant));
}

ServedRaster::Reader::Reader(ServedRaster& owner, const Deadline& deadline)
    : raster(owner.shared_from_this()) {
    {
        const std::lock_guard lock(owner.mutex);
        if (!owner.idle.empty()) {
            tools = std::move(owner.idle.back());
            owner.idle.pop_back();
        }
    }
    if (!tools)
        tools = std::make_unique<Tools>(
            zmchost::Raster::Open(owner.module, owner.file->Source(), owner.Name()));
    tools->deadline = deadline;
}

ServedRaster::Reader::~Reader() {
    if (!tools) return;
    tools->pixels.reset();
    const std::lock_guard lock(raster->mutex);
    if (raster->idle.size() < kMostReaders) raster->idle.push_back(std::move(tools));
}

zmchost::Raster& ServedRaster::Reader::Raster() { return tools->raster; }

zmcrender::PixelSource& ServedRaster::Reader::Pixels() {
    if (!tools->pixels) tools->pixels = std::make_unique<MaskedPixels>(*this);
    return *tools->pixels;
}

GDALDataset* ServedRaster::Reader::Dataset() {
    if (!tools->lookedForDataset) tools->dataset = OpenDataset(*raster->file, raster->companions);
    tools->lookedForDataset = true;
    return tools->dataset.get();
}

const Mercator& ServedRaster::Reader::InMercator() {
    if (!tools->mercator) {
        const zelm::LevelGeometry finest = raster->Geometry(raster->FinestLevel());
        tools->mercator =
            std::make_unique<const Mercator>(raster->Place(), finest.samples, finest.lines);
    }
    return *tools->mercator;
}

std::unique_ptr<ServedRaster::Reader> ServedRaster::Borrow(const Deadline& deadline) {
    return std::make_unique<Reader>(*this, deadline);
}

const ServedRaster::Told& ServedRaster::Tell() {
    const std::lock_guard lock(tellMutex);
    if (told) return *told;
    Reader reader(*this, Deadline());
    auto found = std::make_unique<Told>();
    found->facts = zmcrender::FactsOf(reader.Raster());
    if (GDALDataset* const dataset = reader.Dataset()) {
        const zmcgdal::ErrorCatcher quiet(CE_Failure);
        zmcrender::AddDatasetFacts(*dataset, found->facts);
        found->place = PlaceOf(*dataset);
        found->hasMask =
            levels != 0 && zmcrender::DatasetMask(*dataset).Exists(FinestLevel(), CoarsestLevel());
    }
    file->CheckUnchanged();
    told = std::move(found);
    return *told;
}

const zmcrender::RasterFacts& ServedRaster::Facts() { return Tell().facts; }

const Georeference& ServedRaster::Place() { return Tell().place; }

ServedRaster::RendererPtr ServedRaster::TakeRenderer(const zmcrender::Style& style) {
    const std::lock_guard lock(mutex);
    const auto at = std::find_if(renderers.begin(), renderers.end(),
                                 [&](const auto& each) { return each.first == style; });
    if (at == renderers.end()) return nullptr;
    renderers.splice(renderers.begin(), renderers, at);
    return renderers.front().second;
}

bool ServedRaster::HasRenderer(const zmcrender::Style& style) {
    return TakeRenderer(style) != nullptr;
}

std::shared_ptr<const zmcrender::Renderer> ServedRaster::RendererFor(const zmcrender::Style& style,
                                                                     Reader& reader) {
    if (auto renderer = TakeRenderer(style)) return renderer;
    auto made = std::make_shared<const zmcrender::Renderer>(Facts(), style, reader.Pixels());
    const std::lock_guard lock(mutex);
    renderers.emplace_front(style, made);
    if (renderers.size() > kMostRenderers) renderers.pop_back();
    return made;
}

}  // namespace zmcserve
