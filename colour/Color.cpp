#include "colour/Color.h"

#include "colour/NamedColors.h"

namespace zelm {
namespace {

std::uint8_t ComponentOf(const Array<unsigned char>& components, std::uint32_t index) {
    return components.data && index < components.shape.elements ? components.data[index]
                                                                : std::uint8_t{0};
}

std::uint8_t ByteOf(std::uint32_t rgba, unsigned index) {
    return static_cast<std::uint8_t>(rgba >> (8 * index));
}

}  // namespace

Color::Color() {
    const NamedColorRow& row = NamedColors()[kNamedColorCount - 1];
    name = row.name;
    red = ByteOf(row.rgba, 0);
    green = ByteOf(row.rgba, 1);
    blue = ByteOf(row.rgba, 2);
    alpha = ByteOf(row.rgba, 3);
    isNull = row.isNull;
}

void Color::Assign(const Color& other) {
    if (this == &other) return;
    name = other.name;
    red = other.red;
    green = other.green;
    blue = other.blue;
    alpha = other.alpha;
    isNull = other.isNull;
}

RGBAColor::RGBAColor(const Array<unsigned char>& components) {
    name = "NoName";
    red = ComponentOf(components, 0);
    green = ComponentOf(components, 1);
    blue = ComponentOf(components, 2);
    alpha = ComponentOf(components, 3);
    isNull = 0;
}

}  // namespace zelm
