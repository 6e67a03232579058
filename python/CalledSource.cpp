#include "python/CalledSource.h"

#include <algorithm>
#include <cstddef>
#include <cstring>
#include <new>

#include "core/ElementTypes.h"
#include "core/PixelVocabulary.h"
#include "host/base/Error.h"
#include "python/ArrayTypes.h"

namespace zmcpython {

namespace py = pybind11;
using zmchost::Window;

namespace {

// An array of three dimensions, whose strides may be anything.
struct Planes {
    const std::byte* data;
    std::ptrdiff_t band, line, pixel;  // bytes from one to the next

    explicit Planes(const py::array& array)
        : data(static_cast<const std::byte*>(array.data())),
          band(array.strides(0)),
          line(array.strides(1)),
          pixel(array.strides(2)) {}
    const std::byte* Line(std::size_t bandAt, std::uint32_t lineAt) const {
        return data + static_cast<std::ptrdiff_t>(bandAt) * band +
               static_cast<std::ptrdiff_t>(lineAt) * line;
    }
};

// Some pixels at a time, so that those of all bands meet in the processor's cache.
template <std::size_t kSize>
void Interleave(const Planes& from, const Window& window, std::size_t bands, std::byte* to) {
    constexpr std::uint32_t kRun = 512;
    for (std::uint32_t y = 0; y < window.height; ++y)
        for (std::uint32_t x = 0; x < window.width; x += kRun) {
            const std::uint32_t count = std::min(kRun, window.width - x);
            for (std::size_t band = 0; band < bands; ++band) {
                const std::byte* sample =
                    from.Line(band, y) + static_cast<std::ptrdiff_t>(x) * from.pixel;
                std::byte* place =
                    to + ((std::size_t{y} * window.width + x) * bands + band) * kSize;
                for (std::uint32_t i = 0; i < count; ++i) {
                    std::memcpy(place, sample, kSize);
                    sample += from.pixel;
                    place += bands * kSize;
                }
            }
        }
}

void InterleaveOfSize(std::size_t size, const Planes& from, const Window& window, std::size_t bands,
                      std::byte* to) {
    if (size == 1) return Interleave<1>(from, window, bands, to);
    if (size == 2) return Interleave<2>(from, window, bands, to);
    if (size == 4) return Interleave<4>(from, window, bands, to);
    if (size == 8) return Interleave<8>(from, window, bands, to);
    Interleave<16>(from, window, bands, to);
}

bool IsShown(const std::byte* sample, std::uint32_t pixelType) {
    bool shown = false;
    zelm::VisitElementType(pixelType, [&]<class T>(std::type_identity<T>) {
        if constexpr (!zelm::kIsComplex<T>) {
            T value;
            std::memcpy(&value, sample, sizeof value);
            shown = value > T{};
        }
    });
    return shown;
}

}  // namespace

zelm::RasterProps CalledSource::Props() const {
    zelm::RasterProps props;
    props.SetSamples(shape.width);
    props.SetLines(shape.height);
    props.SetBands(shape.bands);
    props.interleave = zelm::Interleave::BIP;
    props.pixelType = shape.pixelType;
    for (std::uint32_t band = 0; shape.noData && band < shape.bands; ++band)
        props.SetNoDataValue(band, *shape.noData);
    return props;
}

zelm::PalettePtr CalledSource::BandPalette(std::uint32_t band) const {
    if (band != 0 || shape.palette.Colors().empty()) return zelm::PalettePtr();
    zelm::PalettePtr palette(new zelm::Palette);
    if (!palette) throw std::bad_alloc();
    shape.palette.CopyTo(*palette);
    return palette;
}

// Python's lock is held.
py::array CalledSource::Call(const Window& window, std::span<const std::uint32_t> bands) const {
    py::list numbers;
    for (const std::uint32_t band : bands) numbers.append(band + 1);
    const py::object answer = read(window.x, window.y, window.width, window.height, numbers);
    if (!py::isinstance<py::array>(answer)) throw py::type_error("a source gave no array");
    auto array = py::reinterpret_borrow<py::array>(answer);
    if (array.ndim() != 3 || array.shape(0) != static_cast<py::ssize_t>(bands.size()) ||
        array.shape(1) != static_cast<py::ssize_t>(window.height) ||
        array.shape(2) != static_cast<py::ssize_t>(window.width) ||
        !array.dtype().equal(DtypeOf(shape.pixelType)))
        throw py::value_error("a source gave an array of another shape or type than it told");
    return array;
}

void CalledSource::Read(const Window& window, std::span<const std::uint32_t> bands, void* pixels) {
    const py::gil_scoped_acquire python;
    try {
        const py::array array = Call(window, bands);
        const Planes planes(array);
        const py::gil_scoped_release others;
        InterleaveOfSize(zelm::PixelSize(shape.pixelType), planes, window, bands.size(),
                         static_cast<std::byte*>(pixels));
    } catch (const py::error_already_set& raised) {
        failure.Keep(raised);
    } catch (const py::builtin_exception& wrong) {
        throw zmchost::Error(shape.name, "read the source", wrong.what());
    }
    if (failure) throw zmchost::Error(shape.name, "read the source", "Python raised an exception");
}

std::optional<std::uint32_t> CalledSource::AlphaBand(std::uint32_t band) const {
    if (!shape.alpha || *shape.alpha == band + 1) return std::nullopt;
    return *shape.alpha - 1;
}

void CalledSource::ReadMask(const Window& window, std::span<const std::uint32_t> bands,
                            unsigned char* shown) {
    const std::size_t size = zelm::PixelSize(shape.pixelType);
    const std::uint32_t alpha = shape.alpha.value() - 1;
    std::vector<std::byte> samples(window.Pixels() * size);
    Read(window, std::span(&alpha, 1), samples.data());
    for (std::size_t pixel = 0; pixel < window.Pixels(); ++pixel)
        std::fill_n(shown + pixel * bands.size(), bands.size(),
                    IsShown(samples.data() + pixel * size, shape.pixelType) ? 1 : 0);
}

}  // namespace zmcpython
