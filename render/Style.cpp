#include "render/Style.h"

#include <algorithm>
#include <array>

#include "render/Expression.h"
#include "render/StyleText.h"

namespace zmcrender {
namespace {

struct Key {
    const char* name;
    void (*set)(Style&, std::string_view);
    std::string (*text)(const Style&);
};

std::string Switch(bool on) { return on ? "1" : "0"; }

void SetZFactor(Style& style, std::string_view text) {
    style.light.zFactor.reset();
    if (text != "auto") style.light.zFactor = ReadReal("zfactor", text, 1e-12, 1e12);
}

void SetDepth(Style& style, std::string_view text) {
    if (text != "8" && text != "16")
        throw StyleError("depth", Quoted(text) + " is neither 8 nor 16");
    style.depth = text == "8" ? 8 : 16;
}

void SetExpression(Style& style, std::string_view text) {
    static_cast<void>(Expression::Parse(text));
    style.expression = text;
}

using Text = std::string_view;
constexpr Key kKeys[] = {
    {"bands", [](Style& style, Text text) { style.bands = ReadBands(text); },
     [](const Style& style) { return TextOf(style.bands); }},
    {"stretch", [](Style& style, Text text) { style.stretch = ReadStretch(text); },
     [](const Style& style) { return TextOf(style.stretch); }},
    {"gamma", [](Style& style, Text text) { style.gamma = ReadReal("gamma", text, 0.01, 100); },
     [](const Style& style) { return TextOf(style.gamma); }},
    {"colormap", [](Style& style, Text text) { style.colormap = ReadColormapName(text); },
     [](const Style& style) { return style.colormap; }},
    {"nodata", [](Style& style, Text text) { style.noData = ReadNoData(text); },
     [](const Style& style) { return TextOf(style.noData); }},
    {"expression", SetExpression, [](const Style& style) { return style.expression; }},
    {"complex", [](Style& style, Text text) { style.complex = ReadComplexPart(text); },
     [](const Style& style) { return TextOf(style.complex); }},
    {"hillshade", [](Style& style, Text text) { style.hillshade = ReadSwitch("hillshade", text); },
     [](const Style& style) { return Switch(style.hillshade); }},
    {"azimuth",
     [](Style& style, Text text) { style.light.azimuth = ReadReal("azimuth", text, -360, 360); },
     [](const Style& style) { return TextOf(style.light.azimuth); }},
    {"altitude",
     [](Style& style, Text text) { style.light.altitude = ReadReal("altitude", text, 0, 90); },
     [](const Style& style) { return TextOf(style.light.altitude); }},
    {"zfactor", SetZFactor,
     [](const Style& style) {
         return style.light.zFactor ? TextOf(*style.light.zFactor) : std::string("auto");
     }},
    {"depth", SetDepth, [](const Style& style) { return std::to_string(style.depth); }},
};

constexpr auto NamesOfKeys() {
    std::array<const char*, std::size(kKeys)> names{};
    for (std::size_t i = 0; i < names.size(); ++i) names[i] = kKeys[i].name;
    return names;
}
constexpr auto kNames = NamesOfKeys();

const Key* Find(std::string_view name) {
    const auto found = std::find_if(std::begin(kKeys), std::end(kKeys),
                                    [&](const Key& key) { return key.name == name; });
    return found == std::end(kKeys) ? nullptr : found;
}

}  // namespace

std::span<const char* const> Style::Keys() { return kNames; }

bool Style::IsKey(std::string_view key) { return Find(key) != nullptr; }

void Style::Set(std::string_view key, std::string_view value) {
    const Key* const known = Find(key);
    if (!known) throw StyleError(Quoted(key), "there is no such key");
    if (value.empty()) throw StyleError(known->name, "has no value");
    if (value.size() > kLongestValue)
        throw StyleError(known->name, "has more than " + std::to_string(kLongestValue) + " bytes");
    known->set(*this, value);
}

std::string Style::Value(std::string_view key) const {
    const Key* const known = Find(key);
    if (!known) return {};
    const std::string value = known->text(*this);
    return value == known->text(Style()) ? std::string() : value;
}

std::string Style::Text() const {
    std::string text;
    for (const Key& key : kKeys)
        if (const std::string value = Value(key.name); !value.empty())
            text.append(text.empty() ? "" : "&").append(key.name).append("=").append(value);
    return text;
}

}  // namespace zmcrender
