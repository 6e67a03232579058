// Memory rasters as hosts make them: a buffer, and the parameter string that names it.
#ifndef ZMC_TESTS_SUPPORT_MEMORYRASTER_H
#define ZMC_TESTS_SUPPORT_MEMORYRASTER_H

#include <cstdio>
#include <string>

#include "core/Array.h"
#include "core/String.h"

namespace zmctest {

using namespace zelm;

struct MemoryRasterText {
    std::string samples = "4", lines = "3", bands = "2", interleave = "2", pixelType = "1",
                pixelSize = "1,1", tiePoint = "0,0", name = "scene", pixelData;

    explicit MemoryRasterText(const void* pixels) {
        char text[32];
        std::snprintf(text, sizeof text, "%p", pixels);
        pixelData = text;
    }

    MemoryRasterText& Size(std::size_t s, std::size_t l, std::size_t b) {
        samples = std::to_string(s);
        lines = std::to_string(l);
        bands = std::to_string(b);
        return *this;
    }
    MemoryRasterText& Type(std::uint32_t code) {
        pixelType = std::to_string(code);
        return *this;
    }
    MemoryRasterText& Layout(std::int32_t code) {
        interleave = std::to_string(code);
        return *this;
    }

    std::string Text() const {
        return "SAMPLES=" + samples + ";LINES=" + lines + ";BANDS=" + bands +
               ";INTERLEAVE=" + interleave + ";PIXELTYPE=" + pixelType + ";PIXELSIZE=" + pixelSize +
               ";TIEPTMAP=" + tiePoint + ";NAME=" + name + ";PIXELDATA=" + pixelData;
    }
};

inline Array<String> Argument(std::initializer_list<std::string> elements) {
    Array<String> argument;
    for (const std::string& element : elements) argument.Append(element.c_str());
    return argument;
}

}  // namespace zmctest

#endif
