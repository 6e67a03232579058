// Color and RGBAColor: a named colour of four 8-bit components, 0 to 255, as the palette of a band
// holds them. Components are what a display takes, not linear light, and are not multiplied by
// alpha. A colour belongs to one thread at a time.
#ifndef ZMC_COLOUR_COLOR_H
#define ZMC_COLOUR_COLOR_H

#include <cstdint>

#include "core/Array.h"
#include "core/Pointer.h"
#include "core/String.h"

namespace zelm {

class Color {
public:
    String name;  // for display; files do not keep it
    std::uint8_t red;
    std::uint8_t green;
    std::uint8_t blue;
    std::uint8_t alpha;   // 255 is opaque
    std::uint8_t isNull;  // 1 for the null colour, which stands for none at all

    Color();  // the null colour: name "null", all components 0
    Color(const Color&) = default;
    Color& operator=(const Color&) = delete;  // see Assign
    virtual ~Color() = default;

    // Takes name and components of `other`, and whether it is the null colour; assigning a colour
    // to itself changes nothing.
    void Assign(const Color& other);
};

// A colour made from numbers.
class RGBAColor : public Color {
public:
    // Red, green, blue and alpha from the first four elements; missing ones count as 0. The name
    // is "NoName".
    explicit RGBAColor(const Array<unsigned char>& components);
};

// Shares one colour among its copies.
class ColorPtr : public Pointer<Color> {
public:
    using Pointer::Pointer;
};

}  // namespace zelm

#endif
