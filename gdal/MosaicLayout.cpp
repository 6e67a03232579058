#include "gdal/MosaicLayout.h"

#include <algorithm>
#include <bit>
#include <limits>

#include "core/ElementTypes.h"
#include "core/PixelVocabulary.h"
#include "gdal/FileState.h"
#include "host/base/Checksum.h"
#include "host/base/PackedNumbers.h"

namespace zmcgdal {
namespace {

using zmchost::NumberPacker;
using zmchost::NumberUnpacker;

constexpr std::string_view kMagic = "ZMCMOSA2";
constexpr std::uint32_t kMostSide = std::numeric_limits<std::int32_t>::max();

// One walk for both ways: a Packer puts what a Taker takes.
class Packer {
public:
    template <class T>
    void Number(const T& value) {
        numbers.Put(static_cast<std::uint64_t>(value));
    }
    void Real(const double& value) { numbers.Put(std::bit_cast<std::uint64_t>(value)); }
    void Text(const std::string& text) {
        Number(text.size());
        numbers.PutText(text);
    }
    template <class T, class Each>
    void List(const std::vector<T>& list, const Each& each) {
        Number(list.size());
        for (const T& item : list) each(item);
    }
    void Maybe(const std::optional<double>& value) {
        Number(value.has_value());
        Real(value.value_or(0));
    }
    NumberPacker numbers;
};

class Taker {
public:
    explicit Taker(std::string_view bytes) : numbers(bytes) {}

    template <class T>
    void Number(T& value) {
        const std::uint64_t number = numbers.Take();
        value = static_cast<T>(number);
        if (static_cast<std::uint64_t>(value) != number) numbers.Refuse();
    }
    void Real(double& value) { value = std::bit_cast<double>(numbers.Take()); }
    void Text(std::string& text) {
        const std::uint64_t size = numbers.Take();
        if (size > numbers.Rest().size()) numbers.Refuse();
        if (!numbers.Good()) return;
        text = numbers.Rest().substr(0, static_cast<std::size_t>(size));
        numbers = NumberUnpacker(numbers.Rest().substr(static_cast<std::size_t>(size)));
    }
    // An item in memory is many times what it is here, so there is room only for those that were
    // there, and all lists together have no more than a mosaic of some companions a scene.
    template <class T, class Each>
    void List(std::vector<T>& list, const Each& each) {
        const std::uint64_t count = numbers.Take();
        if (count > kMostScenes || (items += count) > kMostItems) numbers.Refuse();
        for (std::uint64_t i = 0; i < count && numbers.Good(); ++i) each(list.emplace_back());
    }
    void Maybe(std::optional<double>& value) {
        double number = 0;
        const bool has = numbers.Take() != 0;
        Real(number);
        value = has ? std::optional(number) : std::nullopt;
    }
    NumberUnpacker numbers;

private:
    static constexpr std::uint64_t kMostItems = 4 * kMostScenes;
    std::uint64_t items = 0;
};

template <class Walk, class Color>
void WalkColor(Walk& walk, Color& color) {
    walk.Number(color.c1);
    walk.Number(color.c2);
    walk.Number(color.c3);
    walk.Number(color.c4);
}

template <class Walk, class Bands>
void WalkBands(Walk& walk, Bands& bands) {
    walk.List(bands, [&](auto& band) {
        walk.Number(band.interpretation);
        walk.Maybe(band.noData);
        walk.List(band.colors, [&](auto& color) { WalkColor(walk, color); });
        walk.Text(band.description);
        walk.Text(band.unit);
        walk.Real(band.offset);
        walk.Real(band.scale);
    });
}

template <class Walk, class Scene>
void WalkScene(Walk& walk, Scene& scene) {
    walk.Text(scene.name);
    walk.List(scene.companions, [&](auto& name) { walk.Text(name); });
    walk.Number(scene.state);
    walk.Number(scene.place.x);
    walk.Number(scene.place.y);
    walk.Number(scene.place.width);
    walk.Number(scene.place.height);
    walk.Number(scene.driver);
    walk.Number(scene.alone);
    walk.Number(scene.warped);
}

template <class Walk, class Layout>
void WalkLayout(Walk& walk, Layout& layout) {
    walk.Number(layout.width);
    walk.Number(layout.height);
    for (auto& number : layout.transform) walk.Real(number);
    walk.Text(layout.system);
    walk.Text(layout.systemKeys);
    walk.Number(layout.pixelType);
    walk.Number(layout.overlap);
    walk.Text(layout.resampling);
    walk.Maybe(layout.hidden);
    WalkBands(walk, layout.bands);
    walk.List(layout.drivers, [&](auto& name) { walk.Text(name); });
    walk.List(layout.scenes, [&](auto& scene) { WalkScene(walk, scene); });
    walk.List(layout.leftOut, [&](auto& each) {
        walk.Text(each.name);
        walk.Text(each.reason);
    });
}

bool CanBe(const MosaicLayout& layout) {
    const auto fits = [&](const MosaicScene& scene) {
        return scene.driver < layout.drivers.size() && scene.place.width > 0 &&
               scene.place.height > 0 && scene.place.Right() <= layout.width &&
               scene.place.Bottom() <= layout.height;
    };
    return layout.width > 0 && layout.width <= kMostSide && layout.height > 0 &&
           layout.height <= kMostSide && !layout.bands.empty() &&
           layout.overlap <= Overlap::Median && !layout.scenes.empty() &&
           layout.scenes.size() <= kMostScenes &&
           zelm::VisitElementType(layout.pixelType, [](auto) {}) &&
           std::all_of(layout.scenes.begin(), layout.scenes.end(), fits);
}

}  // namespace

std::uint64_t MosaicScene::StateNow() const {
    std::string all = FileState(name);
    for (const std::string& companion : companions) all += '\n' + FileState(companion);
    return zmchost::Checksum(all);
}

bool MosaicLayout::IsSigned() const { return pixelType == zelm::PixelTypeCode::Char; }

bool MosaicLayout::HasAlpha() const {
    return std::any_of(bands.begin(), bands.end(),
                       [](const MosaicBand& band) { return band.interpretation == GCI_AlphaBand; });
}

bool MosaicLayout::HasGaps() const {
    const std::uint64_t all = std::uint64_t{width} * height;
    std::uint64_t covered = 0;
    for (const MosaicScene& scene : scenes)
        covered += std::min(all - covered, scene.place.Pixels());
    return covered < all;
}

std::string MosaicLayout::Pack() const {
    Packer packer;
    packer.numbers.PutText(kMagic);
    WalkLayout(packer, *this);
    return packer.numbers.Bytes();
}

std::optional<MosaicLayout> MosaicLayout::Unpack(std::string_view bytes) {
    if (!bytes.starts_with(kMagic)) return std::nullopt;
    Taker taker(bytes.substr(kMagic.size()));
    MosaicLayout layout;
    WalkLayout(taker, layout);
    const bool good = taker.numbers.Good() && taker.numbers.Rest().empty() && CanBe(layout);
    return good ? std::optional(std::move(layout)) : std::nullopt;
}

std::string PackBands(std::uint32_t pixelType, const std::vector<MosaicBand>& bands) {
    Packer packer;
    packer.Number(pixelType);
    WalkBands(packer, bands);
    return packer.numbers.Bytes();
}

}  // namespace zmcgdal
