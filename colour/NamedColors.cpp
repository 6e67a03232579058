#include "colour/NamedColors.h"

#include <array>

namespace zelm {
namespace {

struct Literal {
    const char* name;
    std::uint32_t rgb;  // 0xRRGGBB, as colours are commonly written
};

constexpr Literal kLiterals[] = {
    {"red", 0xFF0000},
    {"green", 0x008000},
    {"blue", 0x0000FF},
    {"cyan", 0x00FFFF},
    {"magenta", 0xFF00FF},
    {"yellow", 0xFFFF00},
    {"black", 0x000000},
    {"white", 0xFFFFFF},
    {"gray", 0x808080},
    {"grey", 0x808080},
    {"navy", 0x000080},
    {"pink", 0xFFC0CB},
    {"purple", 0x800080},
    {"orange", 0xFF8000},
    {"silver", 0xC0C0C0},
    {"aliceblue", 0xF0F8FF},
    {"antiquewhite", 0xFAEBD7},
    {"aqua", 0x00FFFF},
    {"banana", 0xE3CF57},
    {"beige", 0xF5F5DC},
    {"bisque", 0xFFE4C4},
    {"blanchedalmond", 0xFFEBCD},
    {"blueviolet", 0x8A2BE2},
    {"brick", 0x9C661F},
    {"brown", 0xA52A2A},
    {"burlywood", 0xDEB887},
    {"burntsienna", 0x8A360F},
    {"burntumber", 0x8A3324},
    {"cadetblue", 0x5F9EA0},
    {"cadmiumorange", 0xFF6103},
    {"cadmiumyellow", 0xFF9912},
    {"carrot", 0xED9121},
    {"chocolate", 0xD2691E},
    {"cobalt", 0x3D59AB},
    {"cobaltgreen", 0x3D9140},
    {"coldgrey", 0x808A87},
    {"coral", 0xFF7F50},
    {"cornflowerblue", 0x6495ED},
    {"crimson", 0xDC143C},
    {"darksalmon", 0xE9967A},
    {"dimgray", 0x696969},
    {"dimgrey", 0x696969},
    {"eggshell", 0xFCE6C9},
    {"emeraldgreen", 0x00C957},
    {"firebrick", 0xB22222},
    {"flesh", 0xFF7D40},
    {"floralwhite", 0xFFFAF0},
    {"forestgreen", 0x228B22},
    {"fuchsia", 0xFF00FF},
    {"gainsboro", 0xDCDCDC},
    {"ghostwhite", 0xF8F8FF},
    {"goldenrod", 0xDAA520},
    {"greenyellow", 0xADFF2F},
    {"hotpink", 0xFF69B4},
    {"indianred", 0xCD5C5C},
    {"indigo", 0x4B0082},
    {"ivoryblack", 0x292421},
    {"khaki", 0xF0E68C},
    {"lavender", 0xE6E6FA},
    {"lavenderblush", 0xFFF0F5},
    {"lawngreen", 0x7CFC00},
    {"lightcoral", 0xF08080},
    {"lightsalmon", 0xFFA07A},
    {"limegreen", 0x32CD32},
    {"linen", 0xFAF0E6},
    {"manganeseblue", 0x03A89E},
    {"maroon", 0x800000},
    {"melon", 0xE3A869},
    {"midnightblue", 0x191970},
    {"mint", 0xBDFCC9},
    {"mintcream", 0xF5FFFA},
    {"mistyrose", 0xFFE4E1},
    {"moccasin", 0xFFE4B5},
    {"navajowhite", 0xFFDEAD},
    {"oldlace", 0xFDF5E6},
    {"olive", 0x808000},
    {"olivedrab", 0x6B8E23},
    {"orangered", 0xFF4500},
    {"orchid", 0xDA70D6},
    {"palegoldenrod", 0xEEE8AA},
    {"palegreen", 0x98FB98},
    {"palevioletred", 0xDB7093},
    {"papayawhip", 0xFFEFD5},
    {"peachpuff", 0xFFDAB9},
    {"peacock", 0x33A1C9},
    {"peru", 0xCD853F},
    {"plum", 0xDDA0DD},
    {"powderblue", 0xB0E0E6},
    {"raspberry", 0x872657},
    {"rawsienna", 0x636114},
    {"rosybrown", 0xBC8F8F},
    {"royalblue", 0x4169E1},
    {"saddlebrown", 0x8B4513},
    {"salmon", 0xFA8072},
    {"sandybrown", 0xF4A460},
    {"sapgreen", 0x308014},
    {"seashell", 0xFFF5EE},
    {"sepia", 0x5E2612},
    {"sienna", 0xA0522D},
    {"skyblue", 0x87CEEB},
    {"slateblue", 0x6A5ACD},
    {"slategray", 0x708090},
    {"snow", 0xFFFAFA},
    {"springgreen", 0x00FF7F},
    {"steelblue", 0x4682B4},
    {"tan", 0xD2B48C},
    {"teal", 0x008080},
    {"thistle", 0xD8BFD8},
    {"tomato", 0xFF6347},
    {"turquoise", 0x40E0D0},
    {"turquoiseblue", 0x00C78C},
    {"violet", 0xEE82EE},
    {"violetred", 0xD02090},
    {"warmgrey", 0x808069},
    {"wheat", 0xF5DEB3},
    {"whitesmoke", 0xF5F5F5},
    {"lightpink", 0xFFB6C1},
    {"lightblue", 0xADD8E6},
    {"lightgrey", 0xD3D3D3},
    {"lightslateblue", 0x8470FF},
    {"lightsteelblue", 0xB0C4DE},
    {"lightslategray", 0x778899},
    {"lightskyblue", 0x87CEFA},
    {"lightseagreen", 0x20B2AA},
    {"lightgoldenrodyellow", 0xFAFAD2},
    {"darkred", 0x8B0000},
    {"darkgreen", 0x006400},
    {"darkorange", 0xFF8C00},
    {"darkviolet", 0x9400D3},
    {"darkorchid", 0x9932CC},
    {"darkslateblue", 0x483D8B},
    {"darkgray", 0xA9A9A9},
    {"darkkhaki", 0xBDB76B},
    {"darkturquoise", 0x00CED1},
    {"darkslategray", 0x2F4F4F},
    {"darkolivegreen", 0x556B2F},
    {"darkseagreen", 0x8FBC8F},
    {"darkgoldenrod", 0xB8860B},
    {"mediumorchid", 0xBA55D3},
    {"mediumvioletred", 0xC71585},
    {"mediumpurple", 0x9370DB},
    {"mediumslateblue", 0x7B68EE},
    {"mediumturquoise", 0x48D1CC},
    {"mediumspringgreen", 0x00FA9A},
    {"mediumseagreen", 0x3CB371},
};
static_assert(std::size(kLiterals) == kNamedColorCount - 1);

constexpr std::uint32_t OpaqueRgba(std::uint32_t rgb) {
    return (rgb >> 16 & 0xFF) | (rgb & 0xFF00) | (rgb & 0xFF) << 16 | 0xFF000000u;
}

using Table = std::array<NamedColorRow, kNamedColorCount>;

Table MakeTable() {
    Table table;
    for (std::uint32_t i = 0; i + 1 < kNamedColorCount; ++i)
        table[i] = {kLiterals[i].name, OpaqueRgba(kLiterals[i].rgb), 0};
    table.back() = {"null", 0, 1};
    return table;
}

}  // namespace

const NamedColorRow* NamedColors() {
    static const Table table = MakeTable();
    return table.data();
}

namespace {

// The table stands before the first colour is made, so that no later call pays for it or finds
// memory short.
[[maybe_unused]] const NamedColorRow* const builtAtLoad = NamedColors();

}  // namespace

}  // namespace zelm
