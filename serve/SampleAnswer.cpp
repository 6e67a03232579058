#include "serve/SampleAnswer.h"

#include <bit>

#include "core/ElementTypes.h"
#include "core/PixelVocabulary.h"

namespace zmcserve {
namespace {

static_assert(std::endian::native == std::endian::little,
              "samples in memory have the byte order of the file format");

constexpr std::size_t kAlignment = 64;      // of the samples in a NumPy file
constexpr char kMagic[] = "\x93NUMPY\x01";  // and a zero: version 1.0

template <class T>
char KindOf() {
    if constexpr (zelm::kIsComplex<T>)
        return 'c';
    else if constexpr (std::is_floating_point_v<T>)
        return 'f';
    else
        return std::is_signed<T>::value ? 'i' : 'u';
}

std::string TypeText(std::uint32_t pixelType) {
    std::string text;
    zelm::VisitElementType(pixelType, [&]<class T>(std::type_identity<T>) {
        text = sizeof(T) == 1 ? '|' : '<';
        text += KindOf<T>();
        text += std::to_string(sizeof(T));
    });
    return text;
}

}  // namespace

std::optional<SampleFormat> SampleFormatOfName(std::string_view name) {
    if (name == "raw") return SampleFormat::Raw;
    if (name == "npy") return SampleFormat::Npy;
    return std::nullopt;
}

std::uint64_t SampleShape::Bytes() const {
    return std::uint64_t{width} * height * bands * zelm::PixelSize(pixelType);
}

std::string NpyHeader(const SampleShape& shape) {
    std::string text = "{'descr': '" + TypeText(shape.pixelType) +
                       "', 'fortran_order': False, 'shape': (" + std::to_string(shape.height) +
                       ", " + std::to_string(shape.width) + ", " + std::to_string(shape.bands) +
                       "), }";
    const std::size_t before = sizeof kMagic + 2;
    const std::size_t end = before + text.size() + 1;
    text.append((kAlignment - end % kAlignment) % kAlignment, ' ');
    text += '\n';
    std::string header(kMagic, sizeof kMagic);
    header += static_cast<char>(text.size() & 0xFF);
    header += static_cast<char>(text.size() >> 8);
    return header + text;
}

const char* MediaType(SampleFormat format) {
    return format == SampleFormat::Npy ? "application/x-npy" : "application/octet-stream";
}

Answer SampleAnswerOf(const SampleShape& shape, SampleFormat format) {
    Answer answer;
    answer.type = MediaType(format);
    answer.compressible = true;
    answer.Set("X-Raster-Type", zelm::PixelTypeName(shape.pixelType));
    answer.Set("X-Raster-Width", std::to_string(shape.width));
    answer.Set("X-Raster-Height", std::to_string(shape.height));
    answer.Set("X-Raster-Bands", std::to_string(shape.bands));
    answer.Set("X-Raster-Order", "pixel");
    return answer;
}

}  // namespace zmcserve
