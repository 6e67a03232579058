#include "gdal/Mosaic.h"

#include <algorithm>
#include <type_traits>
#include <utility>

#include "gdal/ErrorCatcher.h"
#include "gdal/Reporting.h"
#include "gdal/SampleType.h"
#include "host/base/Error.h"

namespace zmcgdal {

using zelm::Rectangle;

namespace {

constexpr int kBlockSide = 256;
// Of what is read aside before it is laid over or combined.
constexpr std::uint64_t kMostAside = std::uint64_t{32} << 20;

}  // namespace

class MosaicRasterBand final : public GDALRasterBand {
public:
    MosaicRasterBand(Mosaic& owner, int number) : mosaic(owner) {
        poDS = &owner;
        nBand = number;
        nRasterXSize = owner.GetRasterXSize();
        nRasterYSize = owner.GetRasterYSize();
        nBlockXSize = std::min(kBlockSide, nRasterXSize);
        nBlockYSize = std::min(kBlockSide, nRasterYSize);
        eDataType = owner.sampleType;
        GDALRasterBand::SetDescription(Told().description.c_str());
        if (eDataType == GDT_Byte && owner.layout.IsSigned())
            GDALRasterBand::SetMetadataItem("PIXELTYPE", "SIGNEDBYTE", "IMAGE_STRUCTURE");
        for (std::size_t i = 0; i < Told().colors.size(); ++i)
            colors.SetColorEntry(static_cast<int>(i), &Told().colors[i]);
    }

    GDALColorInterp GetColorInterpretation() override {
        return static_cast<GDALColorInterp>(Told().interpretation);
    }
    GDALColorTable* GetColorTable() override { return Told().colors.empty() ? nullptr : &colors; }
    double GetNoDataValue(int* has) override {
        ReportSuccess(has, Told().noData.has_value());
        return Told().noData.value_or(0);
    }
    int64_t GetNoDataValueAsInt64(int* has) override { return NoDataAs<int64_t>(has); }
    uint64_t GetNoDataValueAsUInt64(int* has) override { return NoDataAs<uint64_t>(has); }
    double GetOffset(int* has) override {
        ReportSuccess(has, Told().offset != 0);
        return Told().offset;
    }
    double GetScale(int* has) override {
        ReportSuccess(has, Told().scale != 1);
        return Told().scale;
    }
    const char* GetUnitType() override { return Told().unit.c_str(); }

protected:
    CPLErr IReadBlock(int column, int row, void* data) override {
        return Reporting(CE_Failure, [&] {
            const int x = column * nBlockXSize, y = row * nBlockYSize;
            const Rectangle window{
                static_cast<std::uint32_t>(x), static_cast<std::uint32_t>(y),
                static_cast<std::uint32_t>(std::min(nBlockXSize, nRasterXSize - x)),
                static_cast<std::uint32_t>(std::min(nBlockYSize, nRasterYSize - y))};
            const std::size_t line = window.width * mosaic.sampleSize;
            std::vector<std::byte> pixels(line * window.height);
            const int chosen[] = {nBand};
            mosaic.Compose(window, chosen, pixels.data());
            for (std::size_t i = 0; i < window.height; ++i)
                std::copy_n(pixels.data() + i * line, line,
                            static_cast<std::byte*>(data) +
                                i * static_cast<std::size_t>(nBlockXSize) * mosaic.sampleSize);
            return CE_None;
        });
    }

private:
    Mosaic& mosaic;
    GDALColorTable colors;

    const MosaicBand& Told() const {
        return mosaic.layout.bands[static_cast<std::size_t>(nBand - 1)];
    }
    template <class T>
    T NoDataAs(int* has) {
        const bool holds = Told().noData && zmchost::HoldsValue<T>(*Told().noData);
        ReportSuccess(has, holds);
        return holds ? static_cast<T>(*Told().noData) : T{};
    }
};

// Where a window goes: its samples are pixel-interleaved and without gaps.
class Mosaic::Area {
public:
    Rectangle window;
    std::span<const int> chosen;
    std::byte* pixels;
    std::size_t sampleSize;

    std::size_t PixelBytes() const { return sampleSize * chosen.size(); }
    std::size_t LineBytes() const { return PixelBytes() * window.width; }
    std::byte* At(const Rectangle& part) const {
        return pixels + (part.y - window.y) * LineBytes() + (part.x - window.x) * PixelBytes();
    }
};

Mosaic::Mosaic(const std::string& name, MosaicLayout mosaicLayout, std::size_t mostOpen)
    : layout(std::move(mosaicLayout)),
      sampleType(GdalTypeOf(layout.pixelType,
                            layout.IsSigned() ? SignedByteAs::FlaggedByte : SignedByteAs::Own)),
      most(std::max<std::size_t>(mostOpen, 1)),
      wasRead(layout.scenes.size()) {
    sampleSize = static_cast<std::size_t>(GDALGetDataTypeSizeBytes(sampleType));
    SetDescription(name.c_str());
    nRasterXSize = static_cast<int>(layout.width);
    nRasterYSize = static_cast<int>(layout.height);
    eAccess = GA_ReadOnly;
    system.SetAxisMappingStrategy(OAMS_TRADITIONAL_GIS_ORDER);
    if (!layout.system.empty()) system.importFromWkt(layout.system.c_str());
    for (int number = 1; number <= static_cast<int>(layout.bands.size()); ++number)
        SetBand(number, new MosaicRasterBand(*this, number));
    if (layout.bands.size() > 1) SetMetadataItem("INTERLEAVE", "PIXEL", "IMAGE_STRUCTURE");
    const CPLRectObj everything{0, 0, static_cast<double>(layout.width),
                                static_cast<double>(layout.height)};
    tree.reset(CPLQuadTreeCreate(&everything, nullptr));
    CPLQuadTreeSetMaxDepth(tree.get(),
                           CPLQuadTreeGetAdvisedMaxDepth(static_cast<int>(layout.scenes.size())));
    for (const MosaicScene& scene : layout.scenes) {
        const CPLRectObj bounds{
            static_cast<double>(scene.place.x), static_cast<double>(scene.place.y),
            static_cast<double>(scene.place.Right()), static_cast<double>(scene.place.Bottom())};
        CPLQuadTreeInsertWithBounds(tree.get(), const_cast<MosaicScene*>(&scene), &bounds);
    }
}

void Mosaic::CheckRead() {
    for (std::size_t i = 0; i < wasRead.size(); ++i) {
        if (!wasRead[i]) continue;
        if (layout.scenes[i].StateNow() != layout.scenes[i].state)
            FailScene(layout.scenes[i].name, "it changed since the mosaic was planned");
        wasRead[i] = false;
    }
}

void Mosaic::CheckAll() const {
    for (const MosaicScene& scene : layout.scenes)
        if (scene.StateNow() != scene.state)
            FailScene(scene.name, "it changed since the mosaic was planned");
}

CPLErr Mosaic::GetGeoTransform(double* transform) {
    std::copy(layout.transform.begin(), layout.transform.end(), transform);
    return CE_None;
}

const OGRSpatialReference* Mosaic::GetSpatialRef() const {
    return layout.system.empty() ? nullptr : &system;
}

// Rectangles that only touch come with those that overlap.
std::vector<std::uint32_t> Mosaic::ScenesIn(const Rectangle& window) const {
    const CPLRectObj bounds{static_cast<double>(window.x), static_cast<double>(window.y),
                            static_cast<double>(window.Right()),
                            static_cast<double>(window.Bottom())};
    int count = 0;
    const std::unique_ptr<void*, decltype(&CPLFree)> found(
        CPLQuadTreeSearch(tree.get(), &bounds, &count), &CPLFree);
    std::vector<std::uint32_t> scenes;
    for (int i = 0; i < count; ++i) {
        const auto* const scene = static_cast<const MosaicScene*>(found.get()[i]);
        if (!Intersection(scene->place, window).IsEmpty())
            scenes.push_back(static_cast<std::uint32_t>(scene - layout.scenes.data()));
    }
    std::sort(scenes.begin(), scenes.end());
    return scenes;
}

SceneFile& Mosaic::FileOf(std::uint32_t scene) {
    const auto known = places.find(scene);
    if (known != places.end()) {
        open.splice(open.begin(), open, known->second);
        if (!wasRead[scene] && layout.scenes[scene].StateNow() != layout.scenes[scene].state)
            FailScene(layout.scenes[scene].name, "it changed since the mosaic was planned");
    } else {
        while (open.size() >= most) {
            places.erase(open.back().scene);
            open.pop_back();
        }
        open.push_front({scene, std::make_unique<SceneFile>(layout, layout.scenes[scene])});
        places[scene] = open.begin();
    }
    wasRead[scene] = true;
    return *open.front().file;
}

void Mosaic::Fill(const Rectangle& window, std::span<const int> chosen, std::byte* pixels) const {
    zelm::VisitElementType(layout.pixelType, [&]<class T>(std::type_identity<T>) {
        std::vector<T> pixel;
        for (const int band : chosen)
            pixel.push_back(GapValue<T>(layout.bands[static_cast<std::size_t>(band - 1)].noData));
        FillPixels<T>(pixel, static_cast<std::size_t>(window.Pixels()),
                      reinterpret_cast<T*>(pixels));
    });
}

Layer Mosaic::ReadLayer(std::uint32_t scene, const Rectangle& part, std::span<const int> chosen) {
    Layer layer{part, {}, {}};
    const std::size_t samples = static_cast<std::size_t>(part.Pixels()) * chosen.size();
    const std::size_t pixelBytes = sampleSize * chosen.size();
    layer.samples.resize(samples * sampleSize);
    layer.shown.resize(samples);
    SceneFile& file = FileOf(scene);
    file.Read(part, chosen, layer.samples.data(), static_cast<GSpacing>(pixelBytes),
              static_cast<GSpacing>(pixelBytes) * part.width, static_cast<GSpacing>(sampleSize));
    file.ReadShown(part, chosen, layer.samples.data(), layer.shown.data());
    return layer;
}

void Mosaic::Paint(std::uint32_t scene, const Area& area) {
    const Rectangle part = Intersection(layout.scenes[scene].place, area.window);
    if (SceneFile& file = FileOf(scene); file.IsOpaque(area.chosen))
        return file.Read(part, area.chosen, area.At(part), static_cast<GSpacing>(area.PixelBytes()),
                         static_cast<GSpacing>(area.LineBytes()),
                         static_cast<GSpacing>(sampleSize));
    const std::uint64_t line = part.width * std::uint64_t{area.PixelBytes()};
    const auto lines = static_cast<std::uint32_t>(std::clamp<std::uint64_t>(
        kMostAside / 8 / std::max<std::uint64_t>(line, 1), 1, part.height));
    for (std::uint32_t y = part.y; y < part.Bottom(); y += lines) {
        const Rectangle some{part.x, y, part.width,
                             std::min(lines, static_cast<std::uint32_t>(part.Bottom() - y))};
        const Layer layer = ReadLayer(scene, some, area.chosen);
        zelm::VisitElementType(layout.pixelType, [&]<class T>(std::type_identity<T>) {
            LayOver<T>(layer, area.window, area.chosen.size(), reinterpret_cast<T*>(area.pixels));
        });
    }
}

// In pieces, each small enough for all that its scenes have of it.
void Mosaic::Combine(const Area& area, const Rectangle& block) {
    const std::vector<std::uint32_t> scenes = ScenesIn(block);
    if (scenes.empty()) return;
    if (scenes.size() == 1 && block == area.window) return Paint(scenes.front(), area);
    std::uint64_t bytes = 0;
    for (const std::uint32_t scene : scenes)
        bytes += Intersection(layout.scenes[scene].place, block).Pixels() *
                 (area.PixelBytes() + area.chosen.size());
    if (bytes > kMostAside && block.Pixels() > 1) {
        Rectangle one = block, other = block;
        if (block.width > block.height) {
            one.width /= 2;
            other.x += one.width;
            other.width -= one.width;
        } else {
            one.height /= 2;
            other.y += one.height;
            other.height -= one.height;
        }
        Combine(area, one);
        return Combine(area, other);
    }
    std::vector<Layer> layers;
    for (const std::uint32_t scene : scenes)
        layers.push_back(
            ReadLayer(scene, Intersection(layout.scenes[scene].place, block), area.chosen));
    zelm::VisitElementType(layout.pixelType, [&]<class T>(std::type_identity<T>) {
        std::vector<zelm::NoDataRule<T>> rules;
        for (const int band : area.chosen) {
            const auto& value = layout.bands[static_cast<std::size_t>(band - 1)].noData;
            const bool holds = value && zmchost::HoldsValue<T>(*value);
            rules.push_back({holds, holds ? zelm::FromDouble<T>(*value) : T{}});
        }
        zmcgdal::Combine<T>(layout.overlap, layers, block, rules,
                            reinterpret_cast<T*>(area.At(block)),
                            area.window.width * area.chosen.size());
    });
}

void Mosaic::Compose(const Rectangle& window, std::span<const int> chosen, std::byte* pixels) {
    const Area area{window, chosen, pixels, sampleSize};
    Fill(window, chosen, pixels);
    if (layout.overlap != Overlap::Last && layout.overlap != Overlap::First)
        return Combine(area, window);
    std::vector<std::uint32_t> scenes = ScenesIn(window);
    if (layout.overlap == Overlap::First) std::reverse(scenes.begin(), scenes.end());
    for (const std::uint32_t scene : scenes) Paint(scene, area);
}

CPLErr Mosaic::IRasterIO(GDALRWFlag flag, int x, int y, int width, int height, void* data,
                         int bufferWidth, int bufferHeight, GDALDataType type, int bandCount,
                         int* bandMap, GSpacing pixelSpace, GSpacing lineSpace, GSpacing bandSpace,
                         GDALRasterIOExtraArg* extra) {
    const auto bands = static_cast<std::size_t>(bandCount);
    const auto step = static_cast<GSpacing>(sampleSize);
    const bool laidOutAlike = flag == GF_Read && type == sampleType && bufferWidth == width &&
                              bufferHeight == height && (bandSpace == step || bandCount == 1) &&
                              pixelSpace == step * bandCount && lineSpace == pixelSpace * width;
    if (!laidOutAlike)
        return GDALDataset::IRasterIO(flag, x, y, width, height, data, bufferWidth, bufferHeight,
                                      type, bandCount, bandMap, pixelSpace, lineSpace, bandSpace,
                                      extra);
    return Reporting(CE_Failure, [&] {
        const Rectangle window{static_cast<std::uint32_t>(x), static_cast<std::uint32_t>(y),
                               static_cast<std::uint32_t>(width),
                               static_cast<std::uint32_t>(height)};
        Compose(window, {bandMap, bands}, static_cast<std::byte*>(data));
        return CE_None;
    });
}

}  // namespace zmcgdal
