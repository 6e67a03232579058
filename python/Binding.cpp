// The extension module `zmcraster._zmcraster`: what the package zmcraster of Python stands on. What
// its functions mean for callers, the package tells; here are arguments and locks. Python's lock is
// given up wherever files or pixels are touched.
#include <pybind11/numpy.h>
#include <pybind11/pybind11.h>
#include <pybind11/stl.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <climits>
#include <cstdlib>
#include <exception>
#include <future>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "gdal/ErrorCatcher.h"
#include "gdal/Fetcher.h"
#include "gdal/GdalRasterSource.h"
#include "gdal/VsiSource.h"
#include "host/base/Error.h"
#include "host/base/ScaledNumber.h"
#include "host/file/Limits.h"
#include "host/raster/NoData.h"
#include "platform/FileSystem.h"
#include "python/ArrayTypes.h"
#include "python/BuildTask.h"
#include "python/CalledSource.h"
#include "python/OpenRaster.h"
#include "python/PythonSource.h"

namespace py = pybind11;

namespace zmcpython {
namespace {

// --- failures ---

py::object ErrorType(const char* name) {
    return py::module_::import("zmcraster._errors").attr(name);
}

void Raise(const char* type, const char* text) { PyErr_SetString(ErrorType(type).ptr(), text); }

void Translate(std::exception_ptr thrown) {
    try {
        if (thrown) std::rethrow_exception(thrown);
    } catch (const BadArgument& wrong) {
        Raise("ArgumentError", wrong.what());
    } catch (const zmchost::Cancelled& cancelled) {
        Raise("Cancelled", cancelled.what());
    } catch (const zmchost::Error& error) {
        Raise("FileError", error.what());
    }
}

// What GDAL reported as a failure, in one line that begins with the name.
class Reported : public zmchost::Error {
public:
    Reported(const std::string& name, const std::string& text)
        : Error(name, "do it", text), line(text.starts_with(name) ? text : name + ": " + text) {
        std::replace(line.begin(), line.end(), '\n', ' ');
    }
    const char* what() const noexcept override { return line.c_str(); }

private:
    std::string line;
};

void Warn(const std::vector<zmcgdal::CaughtWarning>& warnings) {
    if (warnings.empty()) return;
    const py::object type = ErrorType("RasterWarning");
    for (const zmcgdal::CaughtWarning& warning : warnings)
        if (PyErr_WarnEx(type.ptr(), warning.text.c_str(), 2) != 0) throw py::error_already_set();
}

// Runs work without Python's lock. What it reports to GDAL as a failure is thrown.
template <class Work>
void Unlocked(const std::string& name, Work&& work) {
    std::vector<zmcgdal::CaughtWarning> warnings;
    {
        const py::gil_scoped_release others;
        const zmcgdal::ErrorCatcher errors(CE_Failure, &warnings);
        try {
            std::forward<Work>(work)();
        } catch (const zmchost::Error&) {
            if (errors.Text().empty()) throw;
        }
        if (!errors.Text().empty()) throw Reported(name, errors.Text());
    }
    Warn(warnings);
}

// --- rasters ---

struct Area {
    std::uint32_t x, y, width, height;
    zelm::Rectangle Rectangle() const { return {x, y, width, height}; }
};

// As one value of Python's, which may be shared by threads.
class File {
public:
    File(std::shared_ptr<OpenRaster> opened, std::shared_ptr<PythonSource> readBy)
        : raster(std::move(opened)), source(std::move(readBy)) {}
    // What was written is brought to the disk, and whether that went well nobody asks.
    // NOLINTNEXTLINE(bugprone-exception-escape): to give a lock up throws nothing.
    ~File() {
        const py::gil_scoped_release others;
        const zmcgdal::ErrorCatcher quiet(CE_Failure);
        try {
            if (raster) raster->Close();
        } catch (...) {
            CPLDebug("ZMCPyramid", "a raster that nobody closed could not be finished");
        }
        raster.reset();
    }
    File(const File&) = delete;
    File& operator=(const File&) = delete;

    std::shared_ptr<OpenRaster> Get() const {
        if (!raster) throw BadArgument("the raster is closed");
        return raster;
    }
    bool IsClosed() const { return !raster; }

    // Works with the raster, without Python's lock. What a file object has raised is raised as the
    // cause of the failure.
    template <class Work>
    void With(Work&& work) const {
        const std::shared_ptr<OpenRaster> held = Get();
        const std::shared_ptr<PythonSource> reader = source;
        try {
            Unlocked(held->Name(), [&] { work(*held); });
        } catch (const zmchost::Error& error) {
            if (reader) reader->Failure().RaiseAsCauseOf(ErrorType("FileError"), error.what());
            throw;
        }
    }

    void Close(bool keep) {
        if (!raster) return;
        const std::shared_ptr<OpenRaster> closing = std::exchange(raster, nullptr);
        source.reset();
        Unlocked(closing->Name(), [&] { closing->Close(keep); });
    }

private:
    std::shared_ptr<OpenRaster> raster;  // null once it is closed
    std::shared_ptr<PythonSource> source;
};

using FilePtr = std::unique_ptr<File>;

FilePtr OpenNamed(const std::string& name, bool update, bool renews, const std::string& resampling,
                  std::uint32_t threads, bool missingAsZeros) {
    std::shared_ptr<OpenRaster> opened;
    Unlocked(name, [&] {
        opened = OpenRaster::Open(name, {update, renews, resampling, threads, missingAsZeros});
    });
    return std::make_unique<File>(std::move(opened), nullptr);
}

FilePtr OpenObject(const py::object& object, const std::string& name, std::uint32_t threads,
                   bool missingAsZeros) {
    const auto source = std::make_shared<PythonSource>(object);
    OpenRaster::Manner manner;
    manner.threads = threads;
    manner.missingAsZeros = missingAsZeros;
    std::shared_ptr<OpenRaster> opened;
    try {
        Unlocked(name, [&] { opened = OpenRaster::Open(source, name, manner); });
    } catch (const zmchost::Error& error) {
        source->Failure().RaiseAsCauseOf(ErrorType("FileError"), error.what());
        throw;
    }
    return std::make_unique<File>(std::move(opened), source);
}

std::uint32_t CheckedPixelType(const py::dtype& type) {
    const std::uint32_t pixelType = PixelTypeOf(type);
    if (pixelType == 0)
        throw BadArgument("no pyramid holds samples of type " +
                          std::string(py::str(py::handle(type))));
    return pixelType;
}

// GDAL counts pixels and bands with a sign.
void CheckShape(std::uint64_t width, std::uint64_t height, std::uint64_t bands) {
    if (width == 0 || height == 0 || bands == 0) throw BadArgument("a raster has pixels and bands");
    if (width > INT_MAX || height > INT_MAX || bands > INT_MAX ||
        bands > zmchost::Limits::Current().bands)
        throw BadArgument("the raster is too large");
}

FilePtr CreateNamed(const std::string& name, std::uint64_t width, std::uint64_t height,
                    std::uint64_t bands, const py::dtype& type,
                    const std::vector<std::string>& options, const GivenFacts& facts) {
    CheckShape(width, height, bands);
    const OpenRaster::NewRaster raster{static_cast<std::uint32_t>(width),
                                       static_cast<std::uint32_t>(height),
                                       static_cast<std::uint32_t>(bands),
                                       CheckedPixelType(type),
                                       options,
                                       facts};
    std::shared_ptr<OpenRaster> made;
    Unlocked(name, [&] { made = OpenRaster::Create(name, raster); });
    if (!made) throw zmchost::Error(name, "create it", "GDAL gives no reason");
    return std::make_unique<File>(std::move(made), nullptr);
}

// Where the samples of an array of (bands, lines, columns) lie.
zmcgdal::Target PlaceOf(const py::array& array, const OpenRaster& raster, const Area& area,
                        std::size_t bands, void* data) {
    const OpenRaster::Layout& shape = raster.Shape();
    if (array.ndim() != 3 || array.shape(0) != static_cast<py::ssize_t>(bands) ||
        array.shape(1) != static_cast<py::ssize_t>(area.height) ||
        array.shape(2) != static_cast<py::ssize_t>(area.width))
        throw BadArgument("the array has not the shape of the window: (bands, rows, columns)");
    if (!array.dtype().equal(ShownDtypeOf(shape.pixelType, raster.SampleType())))
        throw BadArgument("the array has not the type of the raster");
    // Where there is one only, how far the next would be means nothing.
    const auto space = [&](int axis, GSpacing usual) {
        return array.shape(axis) == 1 ? usual : GSpacing{array.strides(axis)};
    };
    const GSpacing pixel = space(2, static_cast<GSpacing>(raster.SampleSize()));
    const GSpacing line = space(1, pixel * area.width);
    const GSpacing band = space(0, line * area.height);
    if (pixel == 0 || line == 0 || band == 0)
        throw BadArgument("samples of the array lie upon each other");
    // GDAL counts the bytes between two pixels as an int.
    if (std::llabs(pixel) > INT_MAX) throw BadArgument("the pixels of the array lie too far apart");
    return {data, raster.SampleType(), pixel, line, band};
}

py::array ReadPixels(const File& file, std::uint32_t level, const Area& area,
                     const std::vector<int>& bands, const std::optional<py::array>& out) {
    const auto raster = file.Get();
    raster->Judge(level, area.Rectangle(), bands);
    py::array array = out ? *out
                          : py::array(ShownDtypeOf(raster->Shape().pixelType, raster->SampleType()),
                                      {static_cast<py::ssize_t>(bands.size()),
                                       static_cast<py::ssize_t>(area.height),
                                       static_cast<py::ssize_t>(area.width)});
    if (!array.writeable()) throw BadArgument("the array cannot be written to");
    const zmcgdal::Target target =
        PlaceOf(array, *raster, area, bands.size(), array.mutable_data());
    file.With([&](OpenRaster& opened) { opened.Read(level, area.Rectangle(), bands, target); });
    return array;
}

// None where no sample can be masked.
std::optional<py::array_t<std::uint8_t>> ReadValid(const File& file, std::uint32_t level,
                                                   const Area& area,
                                                   const std::vector<int>& bands) {
    const auto raster = file.Get();
    raster->Judge(level, area.Rectangle(), bands);
    bool masked = false;
    file.With([&](OpenRaster& opened) { masked = opened.HasMask(bands); });
    if (!masked) return std::nullopt;
    py::array_t<std::uint8_t> valid({static_cast<py::ssize_t>(bands.size()),
                                     static_cast<py::ssize_t>(area.height),
                                     static_cast<py::ssize_t>(area.width)});
    unsigned char* const bytes = valid.mutable_data();
    file.With([&](OpenRaster& opened) { opened.ReadMask(level, area.Rectangle(), bands, bytes); });
    return valid;
}

void WritePixels(const File& file, const Area& area, const std::vector<int>& bands,
                 const py::array& array) {
    const auto raster = file.Get();
    raster->Judge(raster->Shape().levels.front().number, area.Rectangle(), bands);
    const zmcgdal::Target from =
        PlaceOf(array, *raster, area, bands.size(), const_cast<void*>(array.data()));
    file.With([&](OpenRaster& opened) { opened.Write(area.Rectangle(), bands, from); });
}

py::dict ItemsAsDict(const Items& items) {
    py::dict dict;
    for (const auto& [name, value] : items) dict[py::str(name)] = value;
    return dict;
}

py::dict FactsAsDict(const File& file) {
    Facts facts;
    file.With([&](OpenRaster& opened) { facts = opened.Told(); });
    py::list bands;
    for (const BandFacts& band : facts.bands)
        bands.append(
            py::dict(py::arg("description") = band.description, py::arg("unit") = band.unit,
                     py::arg("interpretation") = band.interpretation, py::arg("scale") = band.scale,
                     py::arg("offset") = band.offset, py::arg("nodata") = band.noData,
                     py::arg("metadata") = ItemsAsDict(band.items)));
    return py::dict(
        py::arg("crs") = facts.crs.empty() ? py::object(py::none()) : py::str(facts.crs),
        py::arg("transform") = facts.transform, py::arg("metadata") = ItemsAsDict(facts.items),
        py::arg("bands") = bands);
}

py::object StatisticsOf(const File& file, int band) {
    std::optional<OpenRaster::Statistics> told;
    file.With([&](OpenRaster& opened) { told = opened.StatisticsOf(band); });
    if (!told) return py::none();
    return py::make_tuple(told->minimum, told->maximum, told->mean, told->standardDeviation);
}

py::object HistogramOf(const File& file, int band) {
    std::optional<OpenRaster::Histogram> told;
    file.With([&](OpenRaster& opened) { told = opened.HistogramOf(band); });
    if (!told) return py::none();
    return py::make_tuple(py::array_t<std::uint64_t>(static_cast<py::ssize_t>(told->counts.size()),
                                                     told->counts.data()),
                          told->lower, told->upper);
}

py::object PaletteOf(const File& file, int band) {
    std::vector<std::uint8_t> told;
    file.With([&](OpenRaster& opened) { told = opened.PaletteOf(band); });
    if (told.empty()) return py::none();
    constexpr py::ssize_t kChannels = 4;
    return py::array_t<std::uint8_t>({static_cast<py::ssize_t>(told.size()) / kChannels, kChannels},
                                     told.data());
}

py::list LevelsOf(const File& file) {
    py::list levels;
    for (const OpenRaster::Level& level : file.Get()->Shape().levels)
        levels.append(py::make_tuple(level.number, level.width, level.height));
    return levels;
}

// --- builds ---

// What callers say of a build, with the names of the command line's options.
struct BuildWords {
    std::string target;
    std::optional<std::uint32_t> levels;
    std::string resampling;
    std::string ordering;
    std::string noData;  // a number, "none", or nothing
    std::vector<std::uint32_t> bands;
    std::uint32_t bins = 256;
    std::string memory;
    std::uint32_t threads = 0;
    bool weights = true;
    bool noStatistics = false;
    bool overwrite = false;
    bool embed = false;
};

zmchost::Ordering OrderingOf(const std::string& word) {
    if (word == "auto") return zmchost::Ordering::Auto;
    if (word == "scanline") return zmchost::Ordering::Scanline;
    if (word == "blocked") return zmchost::Ordering::Blocked;
    throw BadArgument("ordering is auto, scanline or blocked, not " + word);
}

double NoDataFor(const std::string& text, std::uint32_t pixelType) {
    const double value = std::strtod(text.c_str(), nullptr);
    bool holds = false;
    zelm::VisitElementType(
        pixelType, [&]<class T>(std::type_identity<T>) { holds = zmchost::HoldsValue<T>(value); });
    if (!holds) throw BadArgument("no sample of this type can have the no-data value " + text);
    return value;
}

BuildTask TaskOf(const BuildWords& words, const zelm::RasterProps& props) {
    BuildTask task;
    task.target = words.target;
    task.noData = words.noData;
    task.embed = words.embed;
    zmchost::BuildOptions& options = task.options;
    options.levels = words.levels;
    if (!words.resampling.empty()) {
        options.resampling = zmchost::ParseResampling(words.resampling);
        if (!options.resampling)
            throw BadArgument("there is no method of resampling " + words.resampling);
    }
    options.ordering = OrderingOf(words.ordering);
    if (words.noData == "none") options.noData = zmchost::BuildOptions::NoData{};
    if (!words.noData.empty() && words.noData != "none")
        options.noData = zmchost::BuildOptions::NoData{NoDataFor(words.noData, props.pixelType)};
    for (const std::uint32_t band : words.bands) {
        if (band == 0 || band > props.bands)
            throw BadArgument("the source has no band " + std::to_string(band));
        options.bands.push_back(band - 1);
    }
    if (words.bins == 0) throw BadArgument("a histogram has one bin at least");
    options.bins = words.bins;
    const auto memory = zmchost::ParseScaled(words.memory, "KMGkmg");
    if (!memory) throw BadArgument("memory is a size such as 64M or 2G, not " + words.memory);
    options.memory = *memory;
    options.threads = words.threads;
    options.weights = words.weights;
    options.statistics = !words.noStatistics;
    options.overwrite = words.overwrite;
    return task;
}

// Runs work on a thread of its own and looks for signals meanwhile, whose handlers run on Python's
// main thread alone. What a handler raises ends the work, by `cancelled`, and is raised then.
template <class Work>
void RunInterruptibly(std::atomic<bool>& cancelled, Work&& work) {
    constexpr std::chrono::milliseconds kBetweenLooks(50);
    PythonFailure raised;
    std::future<void> done = std::async(std::launch::async, std::forward<Work>(work));
    for (bool ready = false; !ready;) {
        {
            const py::gil_scoped_release others;
            ready = done.wait_for(kBetweenLooks) == std::future_status::ready;
        }
        if (ready || PyErr_CheckSignals() == 0) continue;
        raised.Keep(py::error_already_set());
        cancelled = true;
    }
    try {
        done.get();
    } catch (const zmchost::Error&) {
        raised.Raise();
        throw;
    }
    raised.Raise();
}

py::dict ReportAsDict(const zmchost::BuildReport& report) {
    return py::dict(py::arg("width") = report.width, py::arg("height") = report.height,
                    py::arg("bands") = report.bands, py::arg("max_level") = report.maxLevel,
                    py::arg("resampling") = zmchost::ResamplingName(report.resampling),
                    py::arg("file_size") = report.fileSize, py::arg("seconds") = report.seconds);
}

// `progress` is called with the pixels that are done and those of all the build, on threads of the
// build; an answer of False ends it.
py::dict RunBuild(BuildTask task, zmchost::RasterSource& pixels, GDALDataset& facts,
                  const py::object& progress, PythonFailure& failure) {
    std::atomic<bool> cancelled = false;
    task.options.progress = [&](const zmchost::BuildProgress& state) {
        if (cancelled || progress.is_none()) return !cancelled;
        const py::gil_scoped_acquire python;
        try {
            return progress(state.done, state.total).ptr() != Py_False;
        } catch (const py::error_already_set& raised) {
            failure.Keep(raised);
            return false;
        }
    };
    zmchost::BuildReport report;
    std::vector<zmcgdal::CaughtWarning> warnings;
    try {
        RunInterruptibly(cancelled, [&] {
            const zmcgdal::ErrorCatcher errors(CE_Failure, &warnings);
            report = Build(task, pixels, facts);
        });
    } catch (const zmchost::Error&) {
        failure.Raise();
        throw;
    }
    Warn(warnings);
    return ReportAsDict(report);
}

py::dict BuildFromCalls(const CalledSource::Shape& shape, const py::object& read,
                        const GivenFacts& facts, const BuildWords& words,
                        const py::object& progress) {
    PythonFailure failure;
    CalledSource pixels(shape, read, failure);
    const auto outline = OutlineOf(facts, shape.width, shape.height, shape.bands, shape.pixelType);
    return RunBuild(TaskOf(words, pixels.Props()), pixels, *outline, progress, failure);
}

// A raster that GDAL reads, as a source.
class NamedSource {
public:
    explicit NamedSource(const std::string& name) {
        if (platform::StatusOf(name).IsSpecial())
            throw zmchost::Error(name, "read the source", "it is not a regular file");
        Unlocked(name, [&] {
            dataset.reset(GDALDataset::Open(name.c_str(), GDAL_OF_RASTER | GDAL_OF_VERBOSE_ERROR));
            if (!dataset) throw zmchost::Error(name, "read the source", "GDAL does not open it");
            // What is missing reads as zeros.
            if (dataset->GetMetadataItem("BYTES_MISSING", zmcgdal::kOwnDomain))
                throw zmchost::Error(name, "read the source", "the pyramid is incomplete");
            source = std::make_unique<zmcgdal::GdalRasterSource>(*dataset);
        });
    }
    py::tuple Shape() const {
        const zelm::RasterProps props = source->Props();
        return py::make_tuple(props.samples, props.lines, props.bands, DtypeOf(props.pixelType));
    }
    py::dict Build(const BuildWords& words, const py::object& progress) {
        PythonFailure failure;
        std::vector<zmcgdal::CaughtWarning> losses;
        for (const std::string& loss : source->Losses())
            losses.push_back({CPLE_None, source->Name() + ": a pyramid does not keep " + loss});
        const BuildTask task = TaskOf(words, source->Props());
        Warn(losses);
        return RunBuild(task, *source, *dataset, progress, failure);
    }

private:
    std::unique_ptr<GDALDataset> dataset;
    std::unique_ptr<zmcgdal::GdalRasterSource> source;
};

// --- the module ---

zelm::ColorList ColorsOf(
    const py::array_t<std::uint8_t, py::array::c_style | py::array::forcecast>& palette) {
    if (palette.ndim() != 2 || palette.shape(1) != 4)
        throw BadArgument("a palette has red, green, blue and alpha for each colour");
    zelm::ColorList colors;
    for (py::ssize_t i = 0; i < palette.shape(0); ++i)
        colors.Add(zelm::ColorList::Pack(palette.at(i, 0), palette.at(i, 1), palette.at(i, 2),
                                         palette.at(i, 3)));
    return colors;
}

GivenFacts MakeFacts(const std::string& crs, const std::optional<Transform>& transform,
                     const std::optional<Number>& noData,
                     const std::vector<std::string>& descriptions,
                     std::optional<std::uint32_t> alpha,
                     const std::map<std::string, std::string>& items) {
    return {crs, transform, noData, descriptions, alpha, {items.begin(), items.end()}};
}

CalledSource::Shape MakeShape(
    const std::string& name, std::uint64_t width, std::uint64_t height, std::uint64_t bands,
    const py::dtype& type, const GivenFacts& facts,
    const std::optional<py::array_t<std::uint8_t, py::array::c_style | py::array::forcecast>>&
        palette) {
    CheckShape(width, height, bands);
    CalledSource::Shape shape;
    shape.name = name;
    shape.width = static_cast<std::uint32_t>(width);
    shape.height = static_cast<std::uint32_t>(height);
    shape.bands = static_cast<std::uint32_t>(bands);
    shape.pixelType = CheckedPixelType(type);
    if (facts.noData) shape.noData = AsDouble(*facts.noData);
    shape.alpha = facts.alpha;
    if (palette) shape.palette = ColorsOf(*palette);
    return shape;
}

void DefineFile(py::module_& module) {
    py::class_<File>(module, "File", "An open pyramid. Any number of threads may use one.")
        .def_property_readonly("name", [](const File& file) { return file.Get()->Name(); })
        .def_property_readonly("closed", &File::IsClosed)
        .def_property_readonly("width", [](const File& file) { return file.Get()->Shape().width; })
        .def_property_readonly("height",
                               [](const File& file) { return file.Get()->Shape().height; })
        .def_property_readonly("bands", [](const File& file) { return file.Get()->Shape().bands; })
        .def_property_readonly(
            "dtype", [](const File& file) { return DtypeOf(file.Get()->Shape().pixelType); })
        .def_property_readonly("sample_dtype",
                               [](const File& file) {
                                   const auto raster = file.Get();
                                   return ShownDtypeOf(raster->Shape().pixelType,
                                                       raster->SampleType());
                               })
        .def_property_readonly("tile",
                               [](const File& file) { return file.Get()->Shape().tileSize; })
        .def_property_readonly("ordering",
                               [](const File& file) { return file.Get()->Shape().ordering; })
        .def_property_readonly("bytes_missing",
                               [](const File& file) { return file.Get()->Shape().bytesMissing; })
        .def_property_readonly("levels", &LevelsOf)
        .def("facts", &FactsAsDict)
        .def("read", &ReadPixels, py::arg("level"), py::arg("area"), py::arg("bands"),
             py::arg("out") = py::none())
        .def("valid", &ReadValid, py::arg("level"), py::arg("area"), py::arg("bands"))
        .def("write", &WritePixels, py::arg("area"), py::arg("bands"), py::arg("array"))
        .def("statistics", &StatisticsOf, py::arg("band"))
        .def("histogram", &HistogramOf, py::arg("band"))
        .def("palette", &PaletteOf, py::arg("band"))
        .def("close", &File::Close, py::arg("keep") = true);
    py::class_<Area>(module, "Area", "A window: left column, top line, width and height.")
        .def(py::init<std::uint32_t, std::uint32_t, std::uint32_t, std::uint32_t>(), py::arg("x"),
             py::arg("y"), py::arg("width"), py::arg("height"));
}

void DefineBuilds(py::module_& module) {
    py::class_<GivenFacts>(module, "Facts", "What is told of a raster that is made.")
        .def(py::init(&MakeFacts), py::arg("crs"), py::arg("transform"), py::arg("nodata"),
             py::arg("descriptions"), py::arg("alpha"), py::arg("metadata"));
    py::class_<CalledSource::Shape>(module, "Shape", "Of a raster that a function gives.")
        .def(py::init(&MakeShape), py::arg("name"), py::arg("width"), py::arg("height"),
             py::arg("bands"), py::arg("dtype"), py::arg("facts"), py::arg("palette"));
    py::class_<BuildWords>(module, "BuildWords", "What is told of a build.")
        .def(py::init([](const std::string& target) {
                 BuildWords words;
                 words.target = target;
                 return words;
             }),
             py::arg("target"))
        .def_readwrite("levels", &BuildWords::levels)
        .def_readwrite("resampling", &BuildWords::resampling)
        .def_readwrite("ordering", &BuildWords::ordering)
        .def_readwrite("nodata", &BuildWords::noData)
        .def_readwrite("bands", &BuildWords::bands)
        .def_readwrite("bins", &BuildWords::bins)
        .def_readwrite("memory", &BuildWords::memory)
        .def_readwrite("threads", &BuildWords::threads)
        .def_readwrite("weights", &BuildWords::weights)
        .def_readwrite("no_statistics", &BuildWords::noStatistics)
        .def_readwrite("overwrite", &BuildWords::overwrite)
        .def_readwrite("embed", &BuildWords::embed);
    py::class_<NamedSource>(module, "Source", "A raster that GDAL reads.")
        .def(py::init<const std::string&>(), py::arg("name"))
        .def_property_readonly("shape", &NamedSource::Shape)
        .def("build", &NamedSource::Build, py::arg("words"), py::arg("progress"));
    module.def("build", &BuildFromCalls, py::arg("shape"), py::arg("read"), py::arg("facts"),
               py::arg("words"), py::arg("progress"));
}

}  // namespace
}  // namespace zmcpython

PYBIND11_MODULE(_zmcraster, module) {
    using namespace zmcpython;
    module.doc() = "What the package zmcraster stands on.";
    module.attr("version") = ZMC_VERSION;
    py::register_exception_translator(&Translate);
    StartLibraries();
    DefineFile(module);
    DefineBuilds(module);
    module.def("open", &OpenNamed, py::arg("name"), py::arg("update"), py::arg("refresh"),
               py::arg("resampling"), py::arg("threads"), py::arg("missing_as_zeros"));
    module.def("open_object", &OpenObject, py::arg("object"), py::arg("name"), py::arg("threads"),
               py::arg("missing_as_zeros"));
    module.def(
        "is_virtual",
        [](const std::string& name) { return zmcgdal::IsVirtualName(zmcgdal::NameOfUrl(name)); },
        py::arg("name"), "Whether GDAL reads it by a file system of its own, as it does URLs.");
    module.def("create", &CreateNamed, py::arg("name"), py::arg("width"), py::arg("height"),
               py::arg("bands"), py::arg("dtype"), py::arg("options"), py::arg("facts"));
}
