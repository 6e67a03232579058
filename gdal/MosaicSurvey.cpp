#include "gdal/MosaicSurvey.h"

#include <cpl_conv.h>
#include <cpl_string.h>
#include <ogr_spatialref.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <map>
#include <memory>
#include <mutex>
#include <new>
#include <numeric>
#include <set>
#include <type_traits>
#include <utility>

#include "core/PixelVocabulary.h"
#include "gdal/ErrorCatcher.h"
#include "gdal/GdalRasterSource.h"
#include "gdal/GeoKeys.h"
#include "gdal/NoDataValues.h"
#include "gdal/SampleType.h"
#include "gdal/SceneFile.h"
#include "host/base/Error.h"
#include "platform/FileSystem.h"

namespace zmcgdal {
namespace {

constexpr double kTolerance = 0.01;  // of a pixel
constexpr const char* kMake = "make a mosaic of it";
constexpr double kLongestSide = std::numeric_limits<std::int32_t>::max();

std::string LowerCase(std::string text) {
    for (char& c : text)
        if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
    return text;
}

// What lies in the folders of the scenes: a file that has no neighbour of its name can be opened
// without GDAL's looking for any.
class Neighbours {
public:
    bool Has(const std::string& path) {
        const std::string folder = platform::FolderOf(path);
        const std::string name = LowerCase(platform::NameOf(path));
        const std::string stem = name.substr(0, name.rfind('.')) + '.';
        const Names names = NamesOf(folder);
        const auto first = std::lower_bound(names->begin(), names->end(), stem);
        // Itself alone; what cannot be listed may have any.
        return first == names->end() || *first != name ||
               (first + 1 != names->end() && (first + 1)->starts_with(stem));
    }

private:
    using Names = std::shared_ptr<const std::vector<std::string>>;
    static constexpr std::size_t kMostNames = std::size_t{1} << 22;

    Names NamesOf(const std::string& folder) {
        const std::lock_guard lock(mutex);
        const auto known = folders.find(folder);
        if (known != folders.end()) return known->second;
        std::vector<std::string> names = platform::ListFolder(folder);
        for (std::string& name : names) name = LowerCase(std::move(name));
        std::sort(names.begin(), names.end());
        if ((kept += names.size() + 1) > kMostNames) {
            folders.clear();
            kept = names.size() + 1;
        }
        return folders[folder] = std::make_shared<const std::vector<std::string>>(std::move(names));
    }

    std::mutex mutex;
    std::map<std::string, Names> folders;
    std::size_t kept = 0;
};

// What bands of scenes tell, kept once for all that tell the same.
struct Kind {
    std::uint32_t pixelType = 0;
    std::vector<MosaicBand> bands;
};

// What was seen of one scene.
struct Finding {
    MosaicScene scene;
    std::uint32_t width = 0;
    std::uint32_t height = 0;
    GeoTransform transform{};
    bool isPlaced = false;
    const Kind* kind = nullptr;
    const std::string* driver = nullptr;
    const std::string* system = nullptr;
    const std::string* keys = nullptr;  // by which a GeoTIFF tells its system; may be null
    std::string failure;                // why it cannot be read
};

bool IsPlace(const GeoTransform& t) {
    const bool finite = std::all_of(t.begin(), t.end(), [](double x) { return std::isfinite(x); });
    const bool plain = t == GeoTransform{0, 1, 0, 0, 0, 1};
    return finite && !plain && t[1] * t[5] - t[2] * t[4] != 0;
}

bool IsUpright(const GeoTransform& t) { return t[2] == 0 && t[4] == 0 && t[1] > 0 && t[5] < 0; }

// All but the unit, which may follow from the coordinate system and then takes long.
MosaicBand TellBand(GDALRasterBand& band) {
    MosaicBand told;
    told.interpretation = band.GetColorInterpretation();
    told.noData = NoDataAsDouble(band);
    if (const GDALColorTable* const table = band.GetColorTable())
        for (int i = 0; i < table->GetColorEntryCount(); ++i)
            told.colors.push_back(*table->GetColorEntry(i));
    told.description = band.GetDescription();
    told.offset = band.GetOffset();
    told.scale = band.GetScale();
    return told;
}

// Looks at scenes, on any number of threads.
class Surveyor {
public:
    explicit Surveyor(bool readsAll) : readAll(readsAll) {}

    // What GeoTIFFs with these keys tell, which is not looked up then.
    void Know(const std::string& keys, const std::string& system) {
        systems[keys] = &*texts.insert(system).first;
    }

    void LookAt(Finding& finding) {
        try {
            Look(finding);
        } catch (const zmchost::Error& error) {
            finding.failure = error.Reason();
        }
    }

private:
    ScenePtr Open(Finding& finding) {
        MosaicScene& scene = finding.scene;
        if (platform::StatusOf(scene.name).IsSpecial())
            FailScene(scene.name, "it is not a regular file");
        scene.alone = !neighbours.Has(scene.name);
        try {
            if (scene.alone) return OpenScene(scene.name, "GTiff", true);
        } catch (const zmchost::Error&) {
            scene.alone = false;
        }
        return OpenScene(scene.name, "", false);
    }

    void Look(Finding& finding) {
        MosaicScene& scene = finding.scene;
        const ScenePtr opened = Open(finding);
        GDALDataset& dataset = *opened;
        if (const char* const missing = dataset.GetMetadataItem("BYTES_MISSING", "ZMCPYRAMID"))
            FailScene(scene.name, std::string("it lacks ") + missing + " bytes");
        GdalRasterSource source(dataset);
        const zelm::RasterProps props = source.Props();
        finding.width = props.samples;
        finding.height = props.lines;
        finding.isPlaced = dataset.GetGeoTransform(finding.transform.data()) == CE_None &&
                           IsPlace(finding.transform);
        TakeCompanions(dataset, scene);
        scene.state = scene.StateNow();
        KeepShared(dataset, props.pixelType, finding);
        if (readAll) ReadAll(source, props);
    }

    static void TakeCompanions(GDALDataset& dataset, MosaicScene& scene) {
        if (scene.alone) return;
        const CPLStringList files(dataset.GetFileList());
        for (int i = 0; i < files.Count(); ++i)
            if (scene.name != files[i]) scene.companions.emplace_back(files[i]);
    }

    void KeepShared(GDALDataset& dataset, std::uint32_t pixelType, Finding& finding) {
        Kind kind{pixelType, {}};
        for (int number = 1; number <= dataset.GetRasterCount(); ++number)
            kind.bands.push_back(TellBand(*dataset.GetRasterBand(number)));
        std::string packed = PackBands(pixelType, kind.bands);
        const GDALDriver* const driver = dataset.GetDriver();
        FindSystem(dataset, finding);
        const std::lock_guard lock(mutex);
        finding.kind = &kinds.try_emplace(std::move(packed), std::move(kind)).first->second;
        finding.driver = &*texts.insert(driver ? driver->GetDescription() : "").first;
    }

    void FindSystem(GDALDataset& dataset, Finding& finding) {
        const auto keys = finding.scene.alone ? GeoKeysOf(finding.scene.name) : std::nullopt;
        if (keys) {
            const std::lock_guard lock(mutex);
            const auto known = systems.find(*keys);
            if (known != systems.end()) {
                finding.keys = &known->first;
                finding.system = known->second;
                return;
            }
        }
        std::string system;
        if (const OGRSpatialReference* const reference = dataset.GetSpatialRef()) {
            char* text = nullptr;
            if (reference->exportToWkt(&text) == OGRERR_NONE) system = text;
            CPLFree(text);
        }
        const std::lock_guard lock(mutex);
        finding.system = &*texts.insert(std::move(system)).first;
        if (keys) finding.keys = &systems.try_emplace(*keys, finding.system).first->first;
    }

    static void ReadAll(GdalRasterSource& source, const zelm::RasterProps& props) {
        std::vector<std::uint32_t> bands(props.bands);
        std::iota(bands.begin(), bands.end(), 0);
        std::uint64_t size = 1;
        zelm::VisitElementType(props.pixelType,
                               [&]<class T>(std::type_identity<T>) { size = sizeof(T); });
        const std::uint64_t line = size * props.samples * props.bands;
        const auto lines = static_cast<std::uint32_t>(
            std::clamp<std::uint64_t>((std::uint64_t{1} << 22) / line, 1, props.lines));
        std::vector<std::byte> pixels(static_cast<std::size_t>(line * lines));
        std::vector<unsigned char> shown;
        for (std::uint32_t y = 0; y < props.lines; y += lines) {
            const zmchost::Window window{0, y, props.samples, std::min(lines, props.lines - y)};
            source.Read(window, bands, pixels.data());
            if (!source.HasMask(0)) continue;
            const std::uint32_t first[] = {0};
            shown.resize(static_cast<std::size_t>(window.Pixels()));
            source.ReadMask(window, first, shown.data());
        }
    }

    const bool readAll;
    Neighbours neighbours;
    std::mutex mutex;  // guards what follows
    std::map<std::string, Kind> kinds;
    std::set<std::string> texts;
    std::map<std::string, const std::string*> systems;  // by what tells them in GeoTIFFs
};

struct Bounds {
    double left = std::numeric_limits<double>::infinity();
    double right = -std::numeric_limits<double>::infinity();
    double bottom = std::numeric_limits<double>::infinity();
    double top = -std::numeric_limits<double>::infinity();

    void Take(double x, double y) {
        left = std::min(left, x);
        right = std::max(right, x);
        bottom = std::min(bottom, y);
        top = std::max(top, y);
    }
};

// From the systems of scenes to that of the first one.
class Systems {
public:
    using Transformation = std::unique_ptr<OGRCoordinateTransformation>;

    explicit Systems(const Finding& firstScene) : first(firstScene), target(Parse(*first.system)) {}

    // Null where the scene is in the same one.
    OGRCoordinateTransformation* From(const Finding& finding) {
        const auto known = ways.find(finding.system);
        if (known != ways.end()) return known->second.get();
        if (finding.system->empty() != first.system->empty())
            FailScene(finding.scene.name,
                      finding.system->empty()
                          ? "it has no coordinate system, and " + first.scene.name + " has one"
                          : "it has a coordinate system, and " + first.scene.name + " has none");
        Transformation& way = ways[finding.system];
        const OGRSpatialReference source = Parse(*finding.system);
        if (finding.system->empty() || source.IsSame(&target)) return nullptr;
        const ErrorCatcher errors(CE_Failure);
        way.reset(OGRCreateCoordinateTransformation(&source, &target));
        if (!way)
            FailScene(finding.scene.name,
                      "its coordinate system does not lead to that of " + first.scene.name);
        return way.get();
    }

private:
    static OGRSpatialReference Parse(const std::string& text) {
        OGRSpatialReference system;
        system.SetAxisMappingStrategy(OAMS_TRADITIONAL_GIS_ORDER);
        if (!text.empty()) system.importFromWkt(text.c_str());
        return system;
    }

    const Finding& first;
    OGRSpatialReference target;
    std::map<const std::string*, Transformation> ways;
};

// Of the edges of a scene, in the system that `way` leads to.
Bounds BoundsOf(const Finding& finding, OGRCoordinateTransformation* way) {
    constexpr int kSteps = 20;
    const GeoTransform& t = finding.transform;
    std::vector<double> xs, ys;
    for (int step = 0; step <= kSteps; ++step) {
        const double across = finding.width * (static_cast<double>(step) / kSteps);
        const double down = finding.height * (static_cast<double>(step) / kSteps);
        const double right = finding.width, bottom = finding.height;
        for (const auto& [column, line] :
             {std::pair(across, 0.0), {across, bottom}, {0.0, down}, {right, down}}) {
            xs.push_back(t[0] + t[1] * column + t[2] * line);
            ys.push_back(t[3] + t[4] * column + t[5] * line);
        }
    }
    std::vector<int> known(xs.size(), TRUE);
    if (way) {
        const ErrorCatcher errors(CE_Failure);
        // The number of points has another type in the class from version to version, and the same
        // one here.
        OCTTransformEx(OGRCoordinateTransformation::ToHandle(way), static_cast<int>(xs.size()),
                       xs.data(), ys.data(), nullptr, known.data());
    }
    Bounds bounds;
    for (std::size_t i = 0; i < xs.size(); ++i) {
        if (!known[i] || !std::isfinite(xs[i]) || !std::isfinite(ys[i]))
            FailScene(finding.scene.name, "parts of it have no place in the system of the mosaic");
        bounds.Take(xs[i], ys[i]);
    }
    return bounds;
}

// Lays the scenes that were seen out on one grid.
class Laying {
public:
    Laying(const MosaicWishes& given, std::vector<Finding>& seen, const Finding& firstScene)
        : wishes(given), findings(seen), first(firstScene), systems(firstScene) {}

    MosaicLayout Lay() {
        layout.overlap = wishes.overlap;
        layout.resampling = wishes.resampling;
        layout.hidden = wishes.noData;
        layout.system = *first.system;
        if (first.keys) layout.systemKeys = *first.keys;
        layout.pixelType = first.kind->pixelType;
        TakeBands();
        TakeUnits();
        CheckScenes();
        FindGrid();
        PlaceScenes();
        return std::move(layout);
    }

private:
    // In pixels of the grid, from its corner, which lies somewhere in the first scene.
    struct Place {
        double left, top, right, bottom;
    };

    void TakeBands() {
        layout.bands = first.kind->bands;
        const auto marked = std::find_if(findings.begin(), findings.end(), [](const Finding& each) {
            return each.kind &&
                   std::any_of(each.kind->bands.begin(), each.kind->bands.end(),
                               [](const MosaicBand& b) { return b.noData.has_value(); });
        });
        for (std::size_t i = 0; i < layout.bands.size(); ++i) {
            std::optional<double>& value = layout.bands[i].noData;
            if (wishes.noNoData)
                value.reset();
            else if (wishes.noData)
                value = wishes.noData;
            else if (marked != findings.end() && i < marked->kind->bands.size())
                value = marked->kind->bands[i].noData;
        }
    }

    // Why the bands of a scene cannot be those of the first one.
    std::string Difference(const Kind& kind) const {
        const Kind& wanted = *first.kind;
        const std::string& name = first.scene.name;
        if (kind.bands.size() != wanted.bands.size())
            return "it has " + std::to_string(kind.bands.size()) + " bands, and " + name + " has " +
                   std::to_string(wanted.bands.size());
        if (kind.pixelType != wanted.pixelType)
            return std::string("its samples are of type ") + zelm::PixelTypeName(kind.pixelType) +
                   ", and those of " + name + " of type " + zelm::PixelTypeName(wanted.pixelType);
        for (std::size_t i = 0; i < kind.bands.size(); ++i) {
            const MosaicBand &a = kind.bands[i], &b = wanted.bands[i];
            if (!std::equal(a.colors.begin(), a.colors.end(), b.colors.begin(), b.colors.end(),
                            [](const GDALColorEntry& c, const GDALColorEntry& d) {
                                return c.c1 == d.c1 && c.c2 == d.c2 && c.c3 == d.c3 && c.c4 == d.c4;
                            }))
                return "its palette is not that of " + name;
            if (a.offset != b.offset || a.scale != b.scale)
                return "its offset or scale is not that of " + name;
            if ((a.interpretation == GCI_AlphaBand) != (b.interpretation == GCI_AlphaBand))
                return "its alpha band is not that of " + name;
        }
        return "";
    }

    void TakeUnits() {
        const ScenePtr opened = OpenScene(first.scene.name, *first.driver, first.scene.alone);
        for (std::size_t i = 0; i < layout.bands.size(); ++i)
            layout.bands[i].unit = opened->GetRasterBand(static_cast<int>(i) + 1)->GetUnitType();
    }

    void CheckScenes() const {
        std::map<const Kind*, std::string> known;
        for (const Finding& each : findings) {
            if (!each.kind) continue;
            const auto [found, isNew] = known.try_emplace(each.kind);
            if (isNew) found->second = Difference(*each.kind);
            if (!found->second.empty()) FailScene(each.scene.name, found->second);
            if (!each.isPlaced) FailScene(each.scene.name, "it has no georeference");
        }
    }

    void FindGrid() {
        const GeoTransform& t = first.transform;
        const Bounds bounds = BoundsOf(first, nullptr);
        double width = IsUpright(t) ? t[1] : std::hypot(t[1], t[4]);
        double height = IsUpright(t) ? -t[5] : std::hypot(t[2], t[5]);
        if (wishes.finest)
            for (const Finding& each : findings)
                if (each.kind && !systems.From(each)) {
                    width = std::min(width, std::hypot(each.transform[1], each.transform[4]));
                    height = std::min(height, std::hypot(each.transform[2], each.transform[5]));
                }
        if (wishes.resolution) width = height = *wishes.resolution;
        layout.transform = {IsUpright(t) ? t[0] : bounds.left, width, 0,
                            IsUpright(t) ? t[3] : bounds.top,  0,     -height};
    }

    Place ToGrid(const Bounds& bounds) const {
        const GeoTransform& t = layout.transform;
        return {(bounds.left - t[0]) / t[1], (bounds.top - t[3]) / t[5],
                (bounds.right - t[0]) / t[1], (bounds.bottom - t[3]) / t[5]};
    }

    // The place, and whether the scene's own pixels are those of the grid.
    std::pair<Place, bool> PlaceOf(const Finding& finding) {
        OGRCoordinateTransformation* const way = systems.From(finding);
        const Place place = ToGrid(BoundsOf(finding, way));
        const Place nearest{std::round(place.left), std::round(place.top),
                            std::round(place.left) + finding.width,
                            std::round(place.top) + finding.height};
        const auto near = [](double a, double b) { return std::fabs(a - b) < kTolerance; };
        if (!way && IsUpright(finding.transform) && near(place.left, nearest.left) &&
            near(place.top, nearest.top) && near(place.right, nearest.right) &&
            near(place.bottom, nearest.bottom))
            return {nearest, true};
        const double left = std::floor(place.left + kTolerance);
        const double top = std::floor(place.top + kTolerance);
        return {{left, top, std::max(left + 1, std::ceil(place.right - kTolerance)),
                 std::max(top + 1, std::ceil(place.bottom - kTolerance))},
                false};
    }

    void PlaceScenes() {
        std::vector<Place> places;
        Place all{0, 0, 0, 0};
        bool any = false;
        const std::string reason = WhyNotWarped(layout.pixelType);
        for (Finding& each : findings) {
            if (!each.kind) {
                if (!each.failure.empty())
                    layout.leftOut.push_back({each.scene.name, each.failure});
                continue;
            }
            const auto [place, fits] = PlaceOf(each);
            if (!fits && !reason.empty()) FailScene(each.scene.name, reason);
            all = any ? Place{std::min(all.left, place.left), std::min(all.top, place.top),
                              std::max(all.right, place.right), std::max(all.bottom, place.bottom)}
                      : place;
            any = true;
            if (all.right - all.left > kLongestSide || all.bottom - all.top > kLongestSide)
                FailScene(each.scene.name, "it lies too far from those before it");
            each.scene.warped = !fits;
            places.push_back(place);
        }
        TakePlaces(places, all);
    }

    void TakePlaces(const std::vector<Place>& places, const Place& all) {
        GeoTransform& t = layout.transform;
        t[0] += t[1] * all.left;
        t[3] += t[5] * all.top;
        layout.width = static_cast<std::uint32_t>(all.right - all.left);
        layout.height = static_cast<std::uint32_t>(all.bottom - all.top);
        std::map<const std::string*, std::uint32_t> drivers;
        auto place = places.begin();
        for (Finding& each : findings) {
            if (!each.kind) continue;
            const auto number = [](double x) { return static_cast<std::uint32_t>(x); };
            each.scene.place = {number(place->left - all.left), number(place->top - all.top),
                                number(place->right - place->left),
                                number(place->bottom - place->top)};
            ++place;
            const auto [driver, isNew] =
                drivers.try_emplace(each.driver, static_cast<std::uint32_t>(drivers.size()));
            if (isNew) layout.drivers.push_back(*each.driver);
            each.scene.driver = driver->second;
            layout.scenes.push_back(std::move(each.scene));
        }
    }

    const MosaicWishes& wishes;
    std::vector<Finding>& findings;
    const Finding& first;
    Systems systems;
    MosaicLayout layout;
};

// What is seen of scenes, in their order. One that cannot be read is told in what was found where
// such are left out, and refused otherwise.
std::vector<Finding> LookAtAll(Surveyor& surveyor, const std::string& name,
                               std::vector<std::string> scenes, const MosaicWishes& wishes) {
    std::vector<Finding> findings(scenes.size());
    for (std::size_t i = 0; i < scenes.size(); ++i) findings[i].scene.name = std::move(scenes[i]);
    const auto look = [&](std::uint64_t job) {
        Finding& finding = findings[static_cast<std::size_t>(job)];
        surveyor.LookAt(finding);
        if (!finding.failure.empty()) finding.kind = nullptr;
        return finding.failure.empty() || wishes.skipBroken;
    };
    {
        const ErrorCatcher errors(CE_Failure);
        const bool done = RunJobs(
            findings.size(), std::max(wishes.threads, 1u), [&] { return Worker(look); },
            wishes.progress);
        if (!done && errors.Number() == CPLE_UserInterrupt) throw zmchost::Cancelled(name, kMake);
        if (!done && errors.Number() == CPLE_OutOfMemory) throw std::bad_alloc();
    }
    if (!wishes.skipBroken)
        for (const Finding& each : findings)
            if (!each.failure.empty()) FailScene(each.scene.name, each.failure);
    return findings;
}

// The numbers of scenes whose files are not as they were. All scenes are looked at, few or many of
// them changed, so that threads share it.
std::vector<std::size_t> ChangedScenes(const std::vector<MosaicScene>& scenes,
                                       std::uint32_t threads) {
    constexpr std::size_t kAtOnce = 256;
    std::vector<char> isChanged(scenes.size());
    const auto look = [&](std::uint64_t job) {
        const std::size_t from = static_cast<std::size_t>(job) * kAtOnce;
        for (std::size_t i = from; i < std::min(from + kAtOnce, scenes.size()); ++i)
            isChanged[i] = scenes[i].StateNow() == scenes[i].state ? '\0' : '\1';
        return true;
    };
    if (!RunJobs((scenes.size() + kAtOnce - 1) / kAtOnce, std::max(threads, 1u),
                 [&] { return Worker(look); }, {}))
        throw std::bad_alloc();
    std::vector<std::size_t> changed;
    for (std::size_t i = 0; i < isChanged.size(); ++i)
        if (isChanged[i] != '\0') changed.push_back(i);
    return changed;
}

// Whether a scene that has changed surely is what it was to the mosaic, so that the first scene,
// which made the grid, need not be seen again. Half of the tolerance is left to the rounding of the
// corners.
bool IsSurelyAlike(const Finding& now, const MosaicScene& before, const MosaicLayout& layout,
                   const MosaicWishes& wishes) {
    if (wishes.finest || before.warped || !now.isPlaced || !IsUpright(now.transform) ||
        *now.system != layout.system || *now.driver != layout.drivers[before.driver] ||
        now.width != before.place.width || now.height != before.place.height ||
        now.kind->bands.size() != layout.bands.size())
        return false;
    std::vector<MosaicBand> bands = now.kind->bands;
    for (std::size_t i = 0; i < bands.size(); ++i) {
        bands[i].unit = layout.bands[i].unit;  // that of the first scene, whatever others have
        if (wishes.noNoData || wishes.noData) bands[i].noData = layout.bands[i].noData;
    }
    if (PackBands(now.kind->pixelType, bands) != PackBands(layout.pixelType, layout.bands))
        return false;
    const GeoTransform &t = now.transform, &grid = layout.transform;
    const auto near = [](double place, double wanted) {
        return std::fabs(place - wanted) < kTolerance / 2;
    };
    const zelm::Rectangle& place = before.place;
    return near((t[0] - grid[0]) / grid[1], place.x) && near((t[3] - grid[3]) / grid[5], place.y) &&
           near((t[0] + t[1] * now.width - grid[0]) / grid[1],
                static_cast<double>(place.Right())) &&
           near((t[3] + t[5] * now.height - grid[3]) / grid[5],
                static_cast<double>(place.Bottom()));
}

}  // namespace

MosaicLayout SurveyMosaic(const std::string& name, std::vector<std::string> scenes,
                          const MosaicWishes& wishes) {
    if (scenes.empty()) throw zmchost::Error(name, kMake, "it names no scene");
    if (scenes.size() > kMostScenes)
        throw zmchost::Error(name, kMake,
                             "it names more than " + std::to_string(kMostScenes) + " scenes");
    Surveyor surveyor(wishes.skipBroken);
    std::vector<Finding> findings = LookAtAll(surveyor, name, std::move(scenes), wishes);
    const auto first = std::find_if(findings.begin(), findings.end(),
                                    [](const Finding& each) { return each.kind != nullptr; });
    if (first == findings.end())
        throw zmchost::Error(
            name, kMake,
            "none of its " + std::to_string(findings.size()) +
                " scenes can be read; of the first one: " + findings.front().failure);
    const bool ordered = wishes.overlap == Overlap::Minimum || wishes.overlap == Overlap::Maximum ||
                         wishes.overlap == Overlap::Median;
    bool isComplex = false;
    zelm::VisitElementType(first->kind->pixelType, [&]<class T>(std::type_identity<T>) {
        isComplex = zelm::kIsComplex<T>;
    });
    if (ordered && isComplex)
        throw zmchost::Error(name, kMake, "complex samples have no minimum, maximum or median");
    // What is told of the scenes refers to the first one, whose texts move when they are laid out.
    const Finding leading = *first;
    return Laying(wishes, findings, leading).Lay();
}

std::optional<MosaicLayout> RenewLayout(MosaicLayout known, const std::vector<std::string>& scenes,
                                        const MosaicWishes& wishes) {
    const auto isOf = [](const MosaicScene& scene, const std::string& name) {
        return scene.name == name;
    };
    if (wishes.skipBroken || !known.leftOut.empty() ||
        !std::equal(known.scenes.begin(), known.scenes.end(), scenes.begin(), scenes.end(), isOf))
        return std::nullopt;
    const std::vector<std::size_t> changed = ChangedScenes(known.scenes, wishes.threads);
    if (changed.empty()) return known;
    if (changed.front() == 0) return std::nullopt;
    std::vector<std::string> names;
    for (const std::size_t i : changed) names.push_back(scenes[i]);
    Surveyor surveyor(wishes.skipBroken);
    if (!known.systemKeys.empty()) surveyor.Know(known.systemKeys, known.system);
    std::vector<Finding> findings = LookAtAll(surveyor, scenes.front(), names, wishes);
    if (std::equal(findings.begin(), findings.end(), changed.begin(),
                   [&](const Finding& now, std::size_t i) {
                       return IsSurelyAlike(now, known.scenes[i], known, wishes);
                   })) {
        for (std::size_t k = 0; k < changed.size(); ++k) {
            MosaicScene& old = known.scenes[changed[k]];
            MosaicScene& now = findings[k].scene;
            now.place = old.place;
            now.driver = old.driver;
            old = std::move(now);
        }
        return known;
    }
    names.insert(names.begin(), scenes.front());
    // The first scene makes the grid of both.
    const MosaicLayout seen = SurveyMosaic(scenes.front(), std::move(names), wishes);
    if (seen.system != known.system || seen.transform[1] != known.transform[1] ||
        seen.transform[5] != known.transform[5] ||
        PackBands(seen.pixelType, seen.bands) != PackBands(known.pixelType, known.bands))
        return std::nullopt;
    const zelm::Rectangle& before = known.scenes.front().place;
    const zelm::Rectangle& now = seen.scenes.front().place;
    for (std::size_t k = 0; k < changed.size(); ++k) {
        MosaicScene scene = seen.scenes[k + 1];
        MosaicScene& old = known.scenes[changed[k]];
        // Differences of places, as both count from corners of their own.
        const bool lies = scene.place.x - now.x == old.place.x - before.x &&
                          scene.place.y - now.y == old.place.y - before.y &&
                          scene.place.width == old.place.width &&
                          scene.place.height == old.place.height;
        if (!lies || scene.warped != old.warped ||
            seen.drivers[scene.driver] != known.drivers[old.driver])
            return std::nullopt;
        scene.place = old.place;
        scene.driver = old.driver;
        old = std::move(scene);
    }
    return known;
}

}  // namespace zmcgdal
