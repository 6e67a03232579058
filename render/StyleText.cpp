#include "render/StyleText.h"

#include <charconv>
#include <iterator>

#include "render/Colormaps.h"

namespace zmcrender {
namespace {

constexpr const char* kParts[] = {"magnitude", "real", "imaginary", "phase"};
constexpr std::size_t kMostBands = 4;

[[noreturn]] void Refuse(const char* key, std::string_view text, const std::string& reason) {
    throw StyleError(key, Quoted(text) + " " + reason);
}

Range ReadRange(const char* key, std::string_view text) {
    const auto parts = SplitAt(text, ',');
    if (parts.size() != 2) Refuse(key, text, "is no pair MIN,MAX");
    return {ReadNumber(key, parts[0]), ReadNumber(key, parts[1])};
}

Stretch ReadRanges(std::string_view text) {
    Stretch stretch;
    stretch.kind = Stretch::Kind::Ranges;
    const auto pairs = SplitAt(text, ';');
    if (pairs.size() > kMostBands) Refuse("stretch", text, "has more than four pairs");
    for (const std::string_view pair : pairs) stretch.ranges.push_back(ReadRange("stretch", pair));
    return stretch;
}

Stretch ReadPercent(std::string_view text) {
    const Range range = ReadRange("stretch", text.substr(1));
    Stretch stretch;
    stretch.kind = Stretch::Kind::Percent;
    stretch.low = range.minimum.real;
    stretch.high = range.maximum.real;
    if (stretch.low < 0 || stretch.high > 100 || stretch.low >= stretch.high)
        Refuse("stretch", text, "are no per cents from 0 to 100 in their order");
    return stretch;
}

Stretch ReadDeviations(std::string_view text) {
    Stretch stretch;
    stretch.kind = Stretch::Kind::Deviations;
    stretch.deviations = ReadReal("stretch", text.substr(1), 0.01, 100);
    return stretch;
}

std::string TextOf(const Range& range) { return range.minimum.Text() + "," + range.maximum.Text(); }

}  // namespace

std::string Quoted(std::string_view text) {
    constexpr std::size_t kShown = 40;
    std::string shown = "\"";
    for (const char c : text.substr(0, kShown)) shown += c < ' ' || c > '~' || c == '"' ? '?' : c;
    return shown + (text.size() > kShown ? "...\"" : "\"");
}

std::vector<std::string_view> SplitAt(std::string_view text, char separator) {
    std::vector<std::string_view> parts;
    for (std::size_t at = 0;;) {
        const std::size_t end = text.find(separator, at);
        parts.push_back(text.substr(at, end == text.npos ? end : end - at));
        if (end == text.npos) return parts;
        at = end + 1;
    }
}

Number ReadNumber(const char* key, std::string_view text) {
    const auto number = Number::Parse(text);
    if (!number) Refuse(key, text, "is no number");
    return *number;
}

double ReadReal(const char* key, std::string_view text, double least, double most) {
    const double value = ReadNumber(key, text).real;
    if (value < least || value > most)
        Refuse(key, text, "is not from " + TextOf(least) + " to " + TextOf(most));
    return value;
}

bool ReadSwitch(const char* key, std::string_view text) {
    if (text == "1" || text == "true") return true;
    if (text != "0" && text != "false") Refuse(key, text, "is neither 0 nor 1");
    return false;
}

std::vector<std::uint32_t> ReadBands(std::string_view text) {
    std::vector<std::uint32_t> bands;
    const auto parts = SplitAt(text, ',');
    if (parts.size() > kMostBands) Refuse("bands", text, "names more than four bands");
    for (const std::string_view part : parts) {
        std::uint32_t band = 0;
        const auto [end, error] = std::from_chars(part.data(), part.data() + part.size(), band);
        if (error != std::errc() || end != part.data() + part.size() || band == 0)
            Refuse("bands", part, "is no band, which count from 1");
        bands.push_back(band);
    }
    return bands;
}

Stretch ReadStretch(std::string_view text) {
    if (text == "auto") return {};
    if (text == "none") return {.kind = Stretch::Kind::None, .ranges = {}};
    if (text.starts_with('p')) return ReadPercent(text);
    if (text.starts_with('s')) return ReadDeviations(text);
    return ReadRanges(text);
}

NoDataChoice ReadNoData(std::string_view text) {
    if (text == "auto") return {};
    if (text == "none") return {NoDataChoice::Kind::None, {}};
    return {NoDataChoice::Kind::Value, ReadNumber("nodata", text)};
}

std::string ReadColormapName(std::string_view text) {
    if (text == "palette" || FindColormap(text)) return std::string(text);
    std::string names = "palette";
    for (const std::string_view name : ColormapNames()) names.append(", ").append(name);
    Refuse("colormap", text, "is none of " + names);
}

ComplexPart ReadComplexPart(std::string_view text) {
    for (std::size_t i = 0; i < std::size(kParts); ++i)
        if (text == kParts[i]) return static_cast<ComplexPart>(i);
    Refuse("complex", text, "is none of magnitude, real, imaginary, phase");
}

std::string TextOf(double number) { return Number(number).Text(); }

std::string TextOf(const std::vector<std::uint32_t>& bands) {
    std::string text;
    for (const std::uint32_t band : bands)
        text.append(text.empty() ? "" : ",").append(std::to_string(band));
    return text;
}

std::string TextOf(const Stretch& stretch) {
    std::string text;
    switch (stretch.kind) {
        case Stretch::Kind::Auto:
            return "auto";
        case Stretch::Kind::None:
            return "none";
        case Stretch::Kind::Percent:
            return std::string("p")
                .append(TextOf(stretch.low))
                .append(",")
                .append(TextOf(stretch.high));
        case Stretch::Kind::Deviations:
            return std::string("s").append(TextOf(stretch.deviations));
        case Stretch::Kind::Ranges:
            for (const Range& range : stretch.ranges)
                text.append(text.empty() ? "" : ";").append(TextOf(range));
    }
    return text;
}

std::string TextOf(const NoDataChoice& choice) {
    switch (choice.kind) {
        case NoDataChoice::Kind::OfRaster:
            return "auto";
        case NoDataChoice::Kind::None:
            return "none";
        case NoDataChoice::Kind::Value:
            break;
    }
    return choice.value.Text();
}

std::string TextOf(ComplexPart part) { return kParts[static_cast<std::size_t>(part)]; }

}  // namespace zmcrender
