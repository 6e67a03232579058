// CalledSource: samples that a function of Python's gives, as the source of a pyramid.
//
// The function is called with the left column, the top line, the width, the height and a list of
// bands from 1, and answers with an array of NumPy's of shape (bands, height, width). Python's lock
// is held while it works, and not while its samples are put in the order of the builder. What it
// raises ends the build, and is kept for whoever can raise it.
#ifndef ZMC_PYTHON_CALLEDSOURCE_H
#define ZMC_PYTHON_CALLEDSOURCE_H

#include <pybind11/numpy.h>
#include <pybind11/pybind11.h>

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "colour/ColorList.h"
#include "host/raster/RasterSource.h"
#include "python/PythonFailure.h"

namespace zmcpython {

class CalledSource final : public zmchost::RasterSource {
public:
    struct Shape {
        std::string name;
        std::uint32_t width = 0, height = 0, bands = 0, pixelType = 0;
        std::optional<double> noData;
        std::optional<std::uint32_t> alpha;  // band, from 1
        zelm::ColorList palette;             // of the first band; empty: none
    };
    // Both outlive this object.
    CalledSource(Shape sourceShape, pybind11::object function, PythonFailure& keeper)
        : shape(std::move(sourceShape)), read(std::move(function)), failure(keeper) {}

    std::string Name() const override { return shape.name; }
    zelm::RasterProps Props() const override;
    zelm::PalettePtr BandPalette(std::uint32_t band) const override;
    void Read(const zmchost::Window& window, std::span<const std::uint32_t> bands,
              void* pixels) override;

    std::optional<std::uint32_t> AlphaBand(std::uint32_t band) const override;
    void ReadMask(const zmchost::Window& window, std::span<const std::uint32_t> bands,
                  unsigned char* shown) override;

private:
    Shape shape;
    pybind11::object read;
    PythonFailure& failure;

    pybind11::array Call(const zmchost::Window& window, std::span<const std::uint32_t> bands) const;
};

}  // namespace zmcpython

#endif
