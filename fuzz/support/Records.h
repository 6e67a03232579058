// Statistics, histograms and palettes of a dataset: read as a whole, made up from an input, and how
// what was stored has to come back by the rules of the format. The numbers go through the C
// library here, and not through the module's own conversions.
#ifndef ZMC_FUZZ_SUPPORT_RECORDS_H
#define ZMC_FUZZ_SUPPORT_RECORDS_H

#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>
#include <optional>
#include <string>
#include <type_traits>
#include <vector>

#include "core/ElementTypes.h"
#include "format/PyramidXMLReaderHandlers.h"
#include "fuzz/support/Expect.h"
#include "fuzz/support/InputBytes.h"
#include "pyramid/PyramidDataset.h"
#include "raster/RasterReader.h"

namespace zmcfuzz {

template <class T>
bool SameValue(const T& a, const T& b) {
    if constexpr (zelm::kIsComplex<T>)
        return SameValue(a.re, b.re) && SameValue(a.im, b.im);
    else if constexpr (std::is_floating_point_v<T>)
        // NOLINTNEXTLINE(bugprone-suspicious-memory-comparison): zeros differ by their sign.
        return std::isnan(a) ? std::isnan(b) : std::memcmp(&a, &b, sizeof a) == 0;
    else
        return a == b;
}

template <class T>
bool Same(const zelm::RasterBandStats<T>& a, const zelm::RasterBandStats<T>& b) {
    return a.band == b.band && a.count == b.count && a.flags == b.flags &&
           SameValue(a.minimum, b.minimum) && SameValue(a.maximum, b.maximum) &&
           SameValue(a.mean, b.mean) && SameValue(a.standardDeviation, b.standardDeviation) &&
           SameValue(a.sum, b.sum) && SameValue(a.sumOfSquares, b.sumOfSquares) &&
           SameValue(a.rootMeanSquare, b.rootMeanSquare);
}

template <class T>
bool Same(const zelm::RasterBandHistogram<T>& a, const zelm::RasterBandHistogram<T>& b) {
    const std::uint32_t known = a.counts.data ? a.counts.shape.elements : 0;
    return a.band == b.band && SameValue(a.binSize, b.binSize) && a.binCount == b.binCount &&
           SameValue(a.minimum, b.minimum) && SameValue(a.maximum, b.maximum) &&
           a.source == b.source && a.type == b.type && a.level == b.level &&
           known == (b.counts.data ? b.counts.shape.elements : 0) &&
           (known == 0 ||
            std::memcmp(a.counts.data, b.counts.data, known * sizeof *a.counts.data) == 0);
}

template <class Record>
bool SameFront(const zelm::Array<Record>& front, const zelm::Array<Record>& whole) {
    if (front.shape.elements > whole.shape.elements) return false;
    for (std::uint32_t i = 0; i < front.shape.elements; ++i)
        if (!Same(front.data[i], whole.data[i])) return false;
    return true;
}

template <class Record>
bool SameRecords(const zelm::Array<Record>& a, const zelm::Array<Record>& b) {
    return a.shape.elements == b.shape.elements && SameFront(a, b);
}

inline bool SameColor(const zelm::Color& a, const zelm::Color& b) {
    return a.red == b.red && a.green == b.green && a.blue == b.blue && a.alpha == b.alpha;
}

// Equal up to the length; entries beyond it hold no colour of the file.
inline bool Same(const zelm::Palette& a, const zelm::Palette& b) {
    if (a.nextIndex != b.nextIndex) return false;
    const zelm::Color none;
    const auto at = [&](const zelm::Palette& palette, std::uint32_t i) -> const zelm::Color& {
        const auto entry = palette.colors.find(i);
        return entry != palette.colors.end() && entry->second ? *entry->second : none;
    };
    for (std::uint32_t i = 0; i < a.nextIndex; ++i)
        if (!SameColor(at(a, i), at(b, i))) return false;
    return true;
}

// All that the metadata document of a dataset holds, by one parse.
template <class T>
struct Records {
    bool readable = false;  // there is a document, and it is whole
    zelm::Array<zelm::RasterBandStats<T>> stats;
    zelm::Array<zelm::RasterBandHistogram<T>> histograms;
    std::map<std::uint32_t, zelm::Palette> palettes;

    void Load(zelm::PyramidDataset& dataset) {
        zelm::PyramidXMLReaderHandlers<T> handlers;
        readable = (dataset.MetaLoaded || dataset.LoadMetaDocument()) &&
                   dataset.ParseDocument(&handlers, dataset.MetaSource, dataset.MetaLoaded) ==
                       zelm::PyramidDataset::kParsed;
        Clear();
        if (!readable) return;
        stats = handlers.bandStats;
        histograms = handlers.histograms;
        for (const auto& [band, colors] : handlers.palettes) colors.CopyTo(palettes[band]);
    }
    bool HasStats(std::uint32_t band) const {
        for (std::uint32_t i = 0; i < stats.shape.elements; ++i)
            if (stats.data[i].band == band) return true;
        return false;
    }
    // Palettes of all bands but one.
    bool HasPalettesOf(const Records& other, std::optional<std::uint32_t> except = {}) const {
        for (const auto& [band, palette] : other.palettes) {
            if (band == except) continue;
            const auto own = palettes.find(band);
            if (own == palettes.end() || !Same(own->second, palette)) return false;
        }
        return palettes.size() ==
               other.palettes.size() + (except && !other.palettes.count(*except));
    }
    bool operator==(const Records& other) const {
        return readable == other.readable && SameRecords(stats, other.stats) &&
               SameRecords(histograms, other.histograms) && HasPalettesOf(other);
    }

private:
    void Clear() {
        stats.Clear();
        histograms.Clear();
        palettes.clear();
    }
};

// The answers of a reader for one band have to agree with the whole.
template <class T>
void ExpectAnswers(const zelm::RasterReader<T>& source, const Records<T>& all, std::uint32_t band) {
    ZMC_EXPECT(source.HasBandStats(band) == all.HasStats(band));
    const zelm::RasterBandStats<T> stats = source.GetBandStats(band);
    ZMC_EXPECT(band < all.stats.shape.elements ? Same(stats, all.stats.data[band])
                                               : Same(stats, zelm::RasterBandStats<T>()));
    ZMC_EXPECT(SameRecords(source.GetHistograms(), all.histograms));
    const zelm::PalettePtr palette = source.GetPalette(band);
    const auto known = all.palettes.find(band);
    ZMC_EXPECT(palette);
    ZMC_EXPECT(known == all.palettes.end() ? palette->nextIndex == 0
                                           : Same(*palette, known->second));
    ZMC_EXPECT(source.HasPalette(band) == (palette->nextIndex != 0));
}

inline double TakeDouble(InputBytes& input) {
    static const double edges[] = {
        0,        -0.0,      1,      -1,     0.1,          1e15 + 0.5,
        1e300,    -1e-300,   5e-324, 1e-310, 4294967296.0, 123456789.123456789,
        HUGE_VAL, -HUGE_VAL, NAN,    -2.5};
    const std::uint8_t kind = input.Byte();
    if (kind < 16) return edges[kind];
    if (kind < 128) return kind - 64.0;
    std::uint64_t bits = std::uint64_t{input.Word()} << 32;
    bits |= input.Word();
    double value;
    std::memcpy(&value, &bits, sizeof value);
    return value;
}

template <class T>
T TakePixel(InputBytes& input) {
    if constexpr (zelm::kIsComplex<T>) {
        using Part = decltype(T::re);
        const Part re = static_cast<Part>(TakeDouble(input));
        return T(re, static_cast<Part>(TakeDouble(input)));
    } else if constexpr (std::is_floating_point_v<T>) {
        return static_cast<T>(TakeDouble(input));
    } else {
        std::uint64_t bits = input.Byte();
        if (bits >= 128) bits = (std::uint64_t{input.Word()} << 32) | input.Word();
        return static_cast<T>(bits);
    }
}

template <class T>
zelm::RasterBandStats<T> TakeStats(InputBytes& input) {
    zelm::RasterBandStats<T> stats;
    stats.band = input.Size();
    stats.flags = input.Byte();
    stats.minimum = TakePixel<T>(input);
    stats.maximum = TakePixel<T>(input);
    stats.mean = TakeDouble(input);
    stats.standardDeviation = TakeDouble(input);
    stats.sum = TakeDouble(input);
    stats.sumOfSquares = TakeDouble(input);
    stats.rootMeanSquare = TakeDouble(input);
    return stats;
}

template <class T>
zelm::RasterBandHistogram<T> TakeHistogram(InputBytes& input) {
    zelm::RasterBandHistogram<T> histogram;
    histogram.band = input.Size();
    histogram.level = input.Byte();
    histogram.source = input.UpTo(4);
    histogram.type = input.UpTo(2);
    histogram.binCount = input.UpTo(40);
    histogram.binSize = TakeDouble(input);
    histogram.minimum = TakePixel<T>(input);
    histogram.maximum = TakePixel<T>(input);
    const std::uint32_t known = input.UpTo(44);
    if (known != 0 && histogram.counts.SetShape(zelm::ArrayShape(known)))
        for (std::uint32_t i = 0; i < known; ++i)
            histogram.counts.data[i] = TakePixel<std::uint64_t>(input);
    return histogram;
}

inline void TakePalette(InputBytes& input, zelm::Palette& palette) {
    for (std::uint32_t count = input.UpTo(20); count > 0; --count) {
        zelm::Color color;
        color.red = input.Byte();
        color.alpha = input.Byte();
        palette.AddColor(color);
    }
    if (input.Flag()) palette.colors.erase(input.Byte());
}

// The number that is read where this one was written.
inline double StoredReal(double value, int digits) {
    char text[64];
    static_cast<void>(std::snprintf(text, sizeof text, "%.*g", digits, value));
    return std::strtod(text, nullptr);
}

// None where the number leaves 64 bits on its way through a double.
template <class T>
std::optional<T> StoredPixel(const T& value) {
    if constexpr (zelm::kIsComplex<T>) {
        using Part = decltype(T::re);
        return T(static_cast<Part>(StoredReal(static_cast<double>(value.re), 6)), 0);
    } else if constexpr (std::is_floating_point_v<T>) {
        return static_cast<T>(StoredReal(static_cast<double>(value), sizeof(T) == 4 ? 6 : 15));
    } else {
        const auto through = static_cast<double>(value);
        const double end = std::ldexp(1.0, std::is_signed_v<T> ? 63 : 64);
        if (through >= end) return std::nullopt;
        return static_cast<T>(through);
    }
}

template <class T>
bool CameBackAs(const T& stored, const T& read) {
    const std::optional<T> expected = StoredPixel(stored);
    return !expected || SameValue(*expected, read);
}

template <class T>
bool CameBack(const zelm::RasterBandStats<T>& stored, const zelm::RasterBandStats<T>& read) {
    namespace Flag = zelm::StatsFlag;
    const std::uint32_t flags = stored.flags & Flag::All;
    const auto pixel = [&](std::uint32_t flag, const T& from, const T& to) {
        return flags & flag ? CameBackAs(from, to) : SameValue(T{}, to);
    };
    const auto real = [&](std::uint32_t flag, double from, double to) {
        return SameValue(flags & flag ? StoredReal(from, 15) : 0.0, to);
    };
    return read.band == stored.band && read.count == 0 && read.flags == flags &&
           pixel(Flag::Minimum, stored.minimum, read.minimum) &&
           pixel(Flag::Maximum, stored.maximum, read.maximum) &&
           real(Flag::Mean, stored.mean, read.mean) &&
           real(Flag::StandardDeviation, stored.standardDeviation, read.standardDeviation) &&
           real(Flag::Sum, stored.sum, read.sum) &&
           real(Flag::SumOfSquares, stored.sumOfSquares, read.sumOfSquares) &&
           real(Flag::RootMeanSquare, stored.rootMeanSquare, read.rootMeanSquare);
}

template <class T>
bool CameBack(const zelm::RasterBandHistogram<T>& stored,
              const zelm::RasterBandHistogram<T>& read) {
    const std::uint32_t bins = read.counts.data ? read.counts.shape.elements : 0;
    if (bins != stored.binCount) return false;
    for (std::uint32_t i = 0; i < bins; ++i) {
        const bool known = stored.counts.data && i < stored.counts.shape.elements;
        if (!CameBackAs(known ? stored.counts.data[i] : std::uint64_t{0}, read.counts.data[i]))
            return false;
    }
    return read.band == stored.band && read.level == stored.level && read.type == 0 &&
           read.source == zelm::HistogramSource::ORVA && read.binCount == stored.binCount &&
           SameValue(StoredReal(stored.binSize, 15), read.binSize) &&
           CameBackAs(stored.minimum, read.minimum) && CameBackAs(stored.maximum, read.maximum);
}

// The old records as they were, and behind them the new ones.
template <class Record>
bool CameBackBehind(const zelm::Array<Record>& old, const zelm::Array<Record>& stored,
                    const zelm::Array<Record>& read) {
    if (read.shape.elements != old.shape.elements + stored.shape.elements) return false;
    for (std::uint32_t i = 0; i < stored.shape.elements; ++i)
        if (!CameBack(stored.data[i], read.data[old.shape.elements + i])) return false;
    return SameFront(old, read);
}

// Whether a document is of the plain kind that the module writes: ASCII, no comments, references or
// the like, nothing that is written as a reference, and text in nothing but elements without
// children. Only then has a rewrite to leave the records as they are: the line breaks of a rewrite
// and the text around children mix, and a text in pieces becomes one piece, or the reverse.
inline bool IsPlainDocument(const std::vector<unsigned char>& bytes) {
    const std::string text(bytes.begin(), bytes.end());
    for (const char c : text)
        if (static_cast<unsigned char>(c) >= 0x80 || c == '\0') return false;
    std::size_t at = text.compare(0, 5, "<?xml") == 0 ? text.find("?>") : 0;
    if (at == std::string::npos) return false;
    if (text.find_first_of("&") != text.npos || text.find("<!") != text.npos ||
        text.find("<?", at) != text.npos)
        return false;
    bool opened = false;  // the last tag opened an element
    while ((at = text.find('<', at)) != std::string::npos) {
        const std::size_t end = text.find('>', at);
        if (end == std::string::npos) return false;
        opened = text[at + 1] != '/' && text[end - 1] != '/';
        const std::size_t next = std::min(text.find('<', end), text.size());
        const bool closes = next + 1 < text.size() && text[next + 1] == '/';
        if (text.find('>', end + 1) < next) return false;
        const bool blank = text.find_first_not_of(" \t\r\n", end + 1) >= next;
        // Blank text alone in an element is a value too, and a rewrite may drop it.
        if (opened && closes ? blank && next != end + 1 : !blank) return false;
        at = next;
    }
    return true;
}

}  // namespace zmcfuzz

#endif
